// Walks over files of several streams, each in its own form.
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "inspect/streams.h"

using namespace tav::inspect;
using test::Bytes;

namespace
{

/// A system with a host of this name.
Bytes hostStream(const std::string& name, const tav::StreamOptions& options)
{
  tav::Writer writer(options);
  {
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
    tav::Group host = root.group(TAV_ELM_CMN_HOST);
    host.add(TAV_ELM_CMN_HOST_NAME, name);
    host.add(TAV_ELM_CMN_CPU_ONLINE, uint32_t{3});
  }
  writer.finish();
  const auto* const first = reinterpret_cast<const uint8_t*>(writer.bytes().data());
  return {first, first + writer.bytes().size()};
}

const tav::StreamOptions kPadded{.byteOrder = tav::ByteOrder::swapped, .align8 = true};

/// Three streams, of which that in the middle has another byte order, and is padded.
Bytes threeStreams()
{
  Bytes bytes = hostStream("ada", {});
  for (const Bytes& more : {hostStream("grace", kPadded), hostStream("hedy", {})})
  {
    bytes.insert(bytes.end(), more.begin(), more.end());
  }
  return bytes;
}

/// The names of hosts, in the order of the file.
template<class Walk>
std::string namesBy(Walk& walk, ByteSource& source, const auto& formOf)
{
  PathMatcher matcher(pathOf("/system/host/hostName"));
  std::string names;
  for (Event event; goToMatch(walk, matcher, event);)
  {
    names += valueText(source, formOf(walk), event.node, 100) + " ";
  }
  return names;
}

TEST(StreamWalk, ReadsEachStreamInItsOwnForm)
{
  const Bytes bytes = threeStreams();
  ByteSource source("x", std::span<const uint8_t>(bytes));
  std::vector<std::string> passed;
  StreamWalk walk(source, {}, [&](const PassedOver& place) { passed.push_back(place.sentence); });
  EXPECT_EQ(namesBy(walk, source, [](const StreamWalk& at) { return at.form(); }), R"("ada" "grace" "hedy" )");
  EXPECT_TRUE(passed.empty()) << passed.front();
}

TEST(StreamWalk, TellsNobodyWithoutASink)
{
  Bytes bytes = threeStreams();
  bytes.insert(bytes.end(), 40, uint8_t{0xA5});
  ByteSource source("x", std::span<const uint8_t>(bytes));
  StreamWalk walk(source, {});
  EXPECT_EQ(namesBy(walk, source, [](const StreamWalk& at) { return at.form(); }), R"("ada" "grace" "hedy" )");
}

TEST(StreamWalk, AWalkInOneFormFindsThatOnesStreams)
{
  const Bytes bytes = threeStreams();
  ByteSource source("x", std::span<const uint8_t>(bytes));
  Walker walker(source, {});
  EXPECT_EQ(namesBy(walker, source, [](const Walker& at) { return at.form(); }), R"("ada" "hedy" )");
}

TEST(StreamFormAt, TellsThePaddingByTheStreamsOwnBytes)
{
  const Bytes bytes = threeStreams();
  ByteSource source("x", std::span<const uint8_t>(bytes));
  const uint64_t second = hostStream("ada", {}).size();
  const std::optional<Form> form = streamFormAt(source, {}, second);
  ASSERT_TRUE(form);
  EXPECT_EQ(*form, (Form{.swapped = true, .root64 = true, .aligned = true}));
  EXPECT_FALSE(streamFormAt(source, {}, second + 1));
  EXPECT_FALSE(streamFormAt(source, {}, 16)) << "a node in this form";
}

} // namespace
