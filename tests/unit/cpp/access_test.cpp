/// How a reader gets at a file: mapped, or through a ring.
#include <memory>
#include <utility>

#include "cpp/layer.h"

using namespace test;

namespace
{

Bytes sample(uint32_t first = 1)
{
  tav::Writer writer;
  {
    tav::Group system = writer.group(TAV_ELM_CMN_SYSTEM);
    tav::Group host = system.group(TAV_ELM_CMN_HOST);
    host.add(TAV_ELM_CMN_HOST_NAME, "ada");
    host.add(TAV_ELM_CMN_CPU_ONLINE, first);
  }
  writer.finish();
  return bytesOf(writer.bytes());
}

bool isMapped(const tav::Reader& reader)
{
  return reader.handle()->pCircularBuf == nullptr;
}

uint32_t rootsOf(const tav::Reader& reader)
{
  uint32_t roots = 0;
  for (const tav::Node& root : reader.roots())
  {
    EXPECT_EQ(root.path("host/cpuOnline")->as<uint32_t>(), ++roots);
  }
  return roots;
}

} // namespace

TEST(LayerAccess, AFileIsMappedUnlessARingIsAskedFor)
{
  const StreamFile file(sample());
  EXPECT_TRUE(isMapped(tav::Reader(file.path())));
  EXPECT_TRUE(isMapped(tav::Reader(file.path(), {.access = tav::Access::mapped})));
  EXPECT_FALSE(isMapped(tav::Reader(file.path(), {.access = tav::Access::ring})));
}

TEST(LayerAccess, NothingOfAMappedFileIsCopied)
{
  const StreamFile file(sample());
  const tav::Reader reader(file.path());
  const tav::PayloadView first = reader.path("system/host/hostName")->payload();
  const tav::PayloadView again = reader.path("system/host/hostName")->payload();
  EXPECT_EQ(first.data(), again.data());
}

TEST(LayerAccess, PayloadsOfAMappedFileLastAsLongAsTheReader)
{
  const StreamFile file(sample());
  tav::Reader reader(file.path());
  const tav::Node name = *reader.path("system/host/hostName");
  const tav::PayloadView payload = name.payload();
  const auto text = name.as<std::string_view>();
  const tav::Reader moved = std::move(reader);
  moved.validate();
  EXPECT_EQ(bytesOf(payload), hex("61 64 61"));
  EXPECT_EQ(text, "ada");
}

TEST(LayerAccess, AMappedFileCanBeRenamedAndIsReadOn)
{
  const StreamFile file(sample());
  const TemporaryPath other;
  const tav::Reader reader(file.path());
  std::error_code refused; // a system may keep a file at its name while it is mapped
  std::filesystem::rename(file.path(), other.path, refused);
  EXPECT_EQ(reader.path("system/host/hostName")->as<std::string>(), "ada");
}

TEST(LayerAccess, EmptyFileHasNoRootAndCannotBeMapped)
{
  const StreamFile file{Bytes()};
  EXPECT_EQ(thrownBy([&] { tav::Reader(file.path(), {.access = tav::Access::mapped}); }), TAV_RC_NOT_SUPPORTED);
  for (const tav::Access access : {tav::Access::automatic, tav::Access::ring})
  {
    const tav::Reader reader(file.path(), {.access = access});
    EXPECT_FALSE(isMapped(reader));
    EXPECT_EQ(thrownBy([&] { static_cast<void>(reader.root()); }), TAV_RC_NO_MORE_CHILDREN);
    EXPECT_EQ(rootsOf(reader), 0U);
  }
}

TEST(LayerAccess, MissingFileIsToldAsSuch)
{
  const TemporaryPath missing;
  for (const tav::Access access : {tav::Access::automatic, tav::Access::mapped, tav::Access::ring})
  {
    EXPECT_EQ(thrownBy([&] { tav::Reader(missing.path, {.access = access}); }), KOR_RC_NO_SUCH_FILE);
  }
}

TEST(LayerAccess, AMappedReaderHasTheFileAsLongAsItWas)
{
  const StreamFile file(sample(1));
  const tav::Reader mapped(file.path());
  const tav::Reader ring(file.path(), {.access = tav::Access::ring});
  file.append(sample(2));
  EXPECT_EQ(rootsOf(mapped), 1U);
  EXPECT_EQ(rootsOf(ring), 2U);
  EXPECT_EQ(rootsOf(tav::Reader(file.path())), 2U);
}

TEST(LayerAccess, WhatIsNotInTheFileAnyMoreGivesACodeThroughARing)
{
  const StreamFile file(sample());
  const tav::Reader reader(file.path(), {.access = tav::Access::ring});
  std::filesystem::resize_file(file.path(), 20);
  EXPECT_EQ(givenBy([&](std::error_code& ec) { static_cast<void>(reader.path("system/host/hostName", ec)); }),
            TAV_RC_END_OF_STORAGE);
}

TEST(LayerAccess, StreamsThatAreCutOffEndAlikeInMemoryAndMapped)
{
  const Bytes whole = sample();
  for (size_t length = 1; length < whole.size(); ++length)
  {
    const Bytes cut(whole.begin(), whole.begin() + static_cast<ptrdiff_t>(length));
    const StreamFile file(cut);
    const tav::Reader memory(spanOf(cut));
    const tav::Reader mapped(file.path(), {.access = tav::Access::mapped});
    EXPECT_EQ(thrownBy([&] { mapped.validate(); }), thrownBy([&] { memory.validate(); })) << length;
  }
}

TEST(LayerAccess, ThePairAtTheEndOfAFileLeadsBackInEitherWay)
{
  tav::Writer writer;
  writer.group(TAV_ELM_CMN_SYSTEM, {.eyeSize = true}).add(TAV_ELM_CMN_HOST_NAME, "ada", {.eyeSize = true});
  writer.finish();
  const StreamFile file(bytesOf(writer.bytes()));
  for (const tav::Access access : {tav::Access::mapped, tav::Access::ring})
  {
    const tav::Reader reader(file.path(), {.access = access});
    const uint64_t pair = writer.size() - 16;
    ASSERT_TRUE(reader.endingAfter(pair));
    EXPECT_EQ(reader.endingAfter(pair)->elm(), TAV_ELM_CMN_SYSTEM);
    EXPECT_EQ(reader.endingAfter(0)->elm(), TAV_ELM_CMN_HOST_NAME);
    EXPECT_FALSE(reader.endingAfter(pair + 1));
    EXPECT_FALSE(reader.endingAfter(writer.size()));
  }
}

namespace
{

/// Groups of a long element each, and a number behind them.
Bytes longGroups()
{
  tav::Writer writer;
  {
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
    for (uint32_t i = 0; i < 75; ++i)
    {
      root.group(TAV_ELM_CMN_HOST).add(TAV_ELM_CMN_HOST_NAME, std::string(100 * 1000, 'x'));
    }
    root.add(TAV_ELM_CMN_CPU_ONLINE, uint32_t{7});
  }
  writer.finish();
  return bytesOf(writer.bytes());
}

} // namespace

TEST(LayerRing, APathReadsAPageOrTwoForEachGroupThatItPasses)
{
  constexpr uint64_t page = 0x1000;
  VectorStorage storage(page, longGroups(), VectorStorage::kReadOnly);
  const tav::Reader reader(storage, {.ringBytes = 1U << 20U});
  EXPECT_EQ(reader.path("system/cpuOnline")->as<uint32_t>(), 7U);
  EXPECT_LE(storage.bytesRead, 80 * 2 * page);
}

TEST(LayerRing, ALookAtAPlaceReadsAPageOrTwo)
{
  constexpr uint64_t page = 0x1000;
  VectorStorage storage(page, longGroups(), VectorStorage::kReadOnly);
  const tav::Reader reader(storage, {.ringBytes = 1U << 20U});
  const uint64_t last = reader.path("system/cpuOnline")->offset();
  storage.bytesRead = 0;
  EXPECT_EQ(reader.at(0).elm(), TAV_ELM_CMN_SYSTEM);
  EXPECT_EQ(reader.at(last).as<uint32_t>(), 7U);
  EXPECT_LE(storage.bytesRead, 4 * page);
}

TEST(LayerRing, AWalkReadsEachByteOnce)
{
  const Bytes stream = longGroups();
  VectorStorage storage(0x1000, stream, VectorStorage::kReadOnly);
  const tav::Reader reader(storage, {.ringBytes = 1U << 20U});
  uint64_t size = 0;
  for (const tav::Node& node : reader.root().descendants())
  {
    size += node.payload().size();
  }
  EXPECT_EQ(size, 75 * 100 * 1000 + sizeof(uint32_t));
  EXPECT_LE(storage.bytesRead, stream.size() + stream.size() / 10);
}
