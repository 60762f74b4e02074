/// Finding places in a stream, and the names that elements and places have.
#include <memory>
#include <string>
#include <vector>

#include <gmock/gmock.h>

#include "inspect/streams.h"
#include "tav/dictionary.hpp"
#include "tav/inspect/locate.hpp"
#include "tav/inspect/phrases.hpp"

using namespace tav::inspect;
using test::Bytes;

namespace
{

class Places : public testing::TestWithParam<bool>
{
protected:
  Places()
  {
    tav::Writer writer({.byteOrder = GetParam() ? tav::ByteOrder::swapped : tav::ByteOrder::native});
    {
      tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
      {
        tav::Group host = root.group(TAV_ELM_CMN_HOST); // at 16
        host.add(TAV_ELM_CMN_CPU_ONLINE, uint32_t{1});  // at 32
        host.add(TAV_ELM_CMN_CPU_ONLINE, uint32_t{2});  // at 52
      }
      root.add(TAV_ELM_CMN_CPU_ONLINE, uint32_t{3}); // at 72
    }
    writer.finish();
    const auto view = writer.bytes();
    const auto* const first = reinterpret_cast<const uint8_t*>(view.data());
    bytes = Bytes(first, first + view.size());
    source = std::make_unique<ByteSource>("x", std::span<const uint8_t>(bytes));
  }

  /// The path of what is found, and the hint or the refusal.
  std::string at(uint64_t offset)
  {
    Walker walker(*source, form);
    Event event;
    seen = 0;
    try
    {
      const auto hint = findOffset(*source, walker, event, offset, [this](const Event&) { ++seen; });
      return walker.path(event, PathStyle::brief) + (hint ? ", " + *hint : "");
    }
    catch (const Error& error)
    {
      EXPECT_EQ(error.problem().code, TAV_RC_NOT_FOUND);
      EXPECT_EQ(error.problem().offset, offset);
      return error.problem().sentence + ", " + error.problem().hint;
    }
  }

  Form form{.swapped = GetParam(), .root64 = true, .aligned = false};
  Bytes bytes{};
  std::unique_ptr<ByteSource> source{};
  uint64_t seen = 0;
};

} // namespace

INSTANTIATE_TEST_SUITE_P(ByteOrders, Places, testing::Bool());

TEST_P(Places, AreFoundOnTheWayToThemAlone)
{
  EXPECT_EQ(at(0), "/system");
  EXPECT_EQ(seen, 1U);
  EXPECT_EQ(at(16), "/system/host");
  EXPECT_EQ(at(32), "/system/host/cpuOnline");
  EXPECT_EQ(at(52), "/system/host/cpuOnline[2]");
  const uint64_t within = seen;
  EXPECT_EQ(at(72), "/system/cpuOnline");
  EXPECT_LT(seen, within) << "what is in the host is not looked at";
}

TEST_P(Places, WithinANodeNameTheNodeThatTheyAreIn)
{
  EXPECT_EQ(at(70), "/system/host/cpuOnline[2], the node before it begins at 0x34: /system/host/cpuOnline[2]");
  EXPECT_EQ(at(91), "/system/cpuOnline, the node before it begins at 0x48: /system/cpuOnline");
}

TEST_P(Places, BehindTheEndNameTheLastNode)
{
  EXPECT_EQ(bytes.size(), 92U);
  // Of groups that end before the place only the headers were looked at.
  EXPECT_EQ(at(92), "lies behind the end of the file, the node before it begins at 0x0: /system");
  EXPECT_EQ(at(~uint64_t{0}), "lies behind the end of the file, the node before it begins at 0x0: /system");
}

TEST_P(Places, WithoutANodeAreRefusedByThoseWhoWantOne)
{
  Walker walker(*source, form);
  Event event;
  uint64_t told = 0;
  goToOffset(*source, walker, event, 32, [&](const Event&) { ++told; });
  EXPECT_EQ(walker.path(event), "/system/host/cpuOnline");
  EXPECT_GT(told, 2U);
  Walker again(*source, form);
  try
  {
    goToOffset(*source, again, event, 33);
    FAIL() << "there is no node";
  }
  catch (const Error& error)
  {
    EXPECT_EQ(error.problem().sentence, "no node begins there");
    EXPECT_EQ(error.problem().offset, 33U);
    EXPECT_EQ(error.problem().remedy, Remedy::showBytes);
  }
}

TEST_P(Places, ThatAPathLeadsToAreFoundOneAfterTheOther)
{
  Walker walker(*source, form);
  PathMatcher matcher(pathOf("/system/cpuOnline"));
  Event event;
  uint64_t told = 0;
  const Seen count = [&](const Event&) { ++told; };
  ASSERT_TRUE(goToMatch(walker, matcher, event, count));
  EXPECT_EQ(event.offset, 72U);
  const uint64_t before = told;
  EXPECT_FALSE(goToMatch(walker, matcher, event, count));
  EXPECT_GT(told, before);
}

TEST_P(Places, AreNamedByStepsAndByOffsets)
{
  Walker walker(*source, form);
  std::string steps;
  std::vector<std::string> brief;
  for (Event event; walker.next(event);)
  {
    if (event.what == What::nodeBegin)
    {
      appendStep(steps, event.node);
      brief.push_back(offsetPath(event.node));
    }
  }
  EXPECT_EQ(steps, "/system/host/cpuOnline/cpuOnline[2]/cpuOnline");
  EXPECT_THAT(brief, testing::ElementsAre("/**/system[@0x0]", "/**/host[@0x10]", "/**/cpuOnline[@0x20]",
                                          "/**/cpuOnline[@0x34]", "/**/cpuOnline[@0x48]"));
  EXPECT_EQ(offsetPath(tav::inspect::Node{}), "/**");
}

TEST_P(Places, MatchAPathThatDoesNotLookAheadWithoutAWalk)
{
  Walker walker(*source, form);
  PathMatcher matcher(pathOf("/system/*/cpuOnline"));
  std::vector<uint64_t> found;
  for (Event event; walker.next(event);)
  {
    if (event.what == What::nodeBegin && matcher.matches(event.node))
    {
      found.push_back(event.offset);
    }
  }
  EXPECT_THAT(found, testing::ElementsAre(32, 52));
}

TEST(Names, MeanTheirElements)
{
  EXPECT_THAT(idsOf("cpuOnline"), testing::ElementsAre(TAV_ELM_CMN_CPU_ONLINE));
  EXPECT_THAT(idsOf("#12"), testing::ElementsAre(12));
  EXPECT_THAT(idsOf("12"), testing::ElementsAre(12));
  EXPECT_THAT(idsOf("no such name"), testing::IsEmpty());
  EXPECT_EQ(similarNames("cpuOnlin"), "cpuOnline, cpuConfig");
  EXPECT_EQ(similarNames("no such name at all"), "");
  EXPECT_EQ(similarNames(std::string(65, 'c')), "") << "nobody means such a word";
  EXPECT_EQ(xmlNameOf(TAV_ELM_CMN_HOST), "host");
  EXPECT_EQ(xmlNameOf(40001), "element");
  EXPECT_EQ(elementText(40001), "#40001");
}

TEST(Names, OfOwnElementsComeFirst)
{
  MemoryText text("n.json", R"({"40001": {"tag": "queueDepth"}})");
  const Dictionary own = Dictionary::read(text);
  EXPECT_THAT(idsOf("queueDepth", own), testing::ElementsAre(40001));
  EXPECT_EQ(similarNames("queueDept", own), "queueDepth");
  EXPECT_EQ(xmlNameOf(40001, own), "queueDepth");
  EXPECT_EQ(elementText(40001, own), "queueDepth");
  MemoryText document("document", R"({"system": {"queueDepth": 7}})");
  test::Made made;
  fromJson(document, made.file(), {.dictionary = own});
  const Bytes bytes = made.bytes();
  ByteSource source("x", std::span<const uint8_t>(bytes));
  PathSearch search(source, {}, pathOf("/system/#40001"));
  Event event;
  EXPECT_TRUE(search.next(event));
}

TEST(Names, ThatSeveralElementsHaveAreRefused)
{
  size_t ambiguous = 0;
  for (const auto& entry : tav::dictionary::entries())
  {
    const std::vector<uint16_t> ids = idsOf(entry.tag);
    if (ids.size() < 2)
    {
      continue;
    }
    ++ambiguous;
    std::string list;
    for (const uint16_t id : ids)
    {
      list += (list.empty() ? "#" : ", #") + std::to_string(id);
    }
    try
    {
      test::bytesOfJson("{\"" + std::string(entry.tag) + "\": 1}");
      ADD_FAILURE() << entry.tag << " was taken";
    }
    catch (const Error& error)
    {
      EXPECT_EQ(error.problem().sentence,
                "several elements have the name \"" + std::string(entry.tag) + "\": " + list);
    }
  }
  EXPECT_GT(ambiguous, 0U);
}

TEST(Phrases, SayThatACodeIsNotKnown)
{
  EXPECT_EQ(codeSentence(0xFFFFFFFF), "unknown code");
  EXPECT_NE(codeSentence(TAV_RC_NOT_FOUND), "unknown code");
}
