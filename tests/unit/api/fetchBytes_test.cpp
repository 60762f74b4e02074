/// Fetching through a ring whose chunks end anywhere.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "api/fetchBytes.h"
#include "api/rawWrite.h"
#include "storage/ringFixture.h"
#include "support/streams.h"

namespace
{

using namespace test;
using testing::ElementsAre;
using testing::IsEmpty;

TEST(FetchBytes, CompletesACopyFromAsManyChunksAsItTakes)
{
  SmallRing small(100);
  small.storage.longestTransfer = 3;
  std::vector<uint8_t> to(30);
  ASSERT_EQ(tav::inside::fetchBytes(small.ring, 7, to.data(), to.size()), TAV_RC_OK);
  EXPECT_EQ(to, pattern(7, 30)) << "more than the ring holds";
}

TEST(FetchBytes, EndsWhereTheStorageEnds)
{
  SmallRing small(10);
  std::vector<uint8_t> to(8);
  EXPECT_EQ(tav::inside::fetchBytes(small.ring, 5, to.data(), to.size()), TAV_RC_END_OF_STORAGE);
}

TEST(FetchBytes, EndsWhereOffsetsEnd)
{
  constexpr uint64_t last = ~uint64_t{0};
  SmallRing small(0, 3, VectorStorage::kReadOnly);
  small.cache(0, last - 7, 8);
  std::vector<uint8_t> to(16);
  EXPECT_EQ(tav::inside::fetchBytes(small.ring, last - 7, to.data(), to.size()), TAV_RC_END_OF_STORAGE);
}

TEST(FetchBytes, OfNoBytesAsksForNothing)
{
  SmallRing small(10);
  EXPECT_EQ(tav::inside::fetchBytes(small.ring, 5, nullptr, 0), TAV_RC_OK);
  EXPECT_THAT(small.storage.takeLog(), IsEmpty());
}

TEST(FetchData, OfNoBytesIsAPointerToNothing)
{
  SmallRing small(10);
  TAVCBUserArea area{};
  EXPECT_EQ(tav::inside::fetchData(small.ring, 10, 0, area), TAV_RC_OK);
  EXPECT_NE(area.pChunk, nullptr);
  EXPECT_EQ(area.chunkLength, 0U);
  EXPECT_THAT(small.storage.takeLog(), IsEmpty());
}

TEST(FetchData, BringsAnElementThatIsCutIntoTheRingWhole)
{
  SmallRing small(100, 3, VectorStorage::kReadOnly);
  small.cache(16, 40, 24);
  TAVCBUserArea area{};
  ASSERT_EQ(tav::inside::fetchData(small.ring, 44, 24, area), TAV_RC_OK);
  EXPECT_EQ(std::vector<uint8_t>(area.pChunk, area.pChunk + area.chunkLength), pattern(44, 24));
  EXPECT_EQ(small.ring.headOffset, 44U);
}

TEST(FetchData, LeavesAnElementThatIsWholeWhereItIs)
{
  SmallRing small(100);
  small.cache(16, 40, 24);
  TAVCBUserArea area{};
  ASSERT_EQ(tav::inside::fetchData(small.ring, 44, 4, area), TAV_RC_OK);
  EXPECT_EQ(area.pChunk, small.ring.pRing + 20);
  EXPECT_THAT(small.storage.takeLog(), IsEmpty());
}

TEST(FetchData, LargerThanTheRingIsNotBroughtInAnew)
{
  SmallRing small(100);
  small.cache(16, 40, 24);
  TAVCBUserArea area{};
  ASSERT_EQ(tav::inside::fetchData(small.ring, 44, 25, area), TAV_RC_OK);
  EXPECT_EQ(area.chunkLength, 4U) << "the part at hand";
  EXPECT_EQ(small.ring.headOffset, 40U);
  EXPECT_THAT(small.storage.takeLog(), IsEmpty());
}

TEST(FetchData, ReadsOnWhereTheStorageDeliversPieces)
{
  for (const uint64_t pages : {1U, 2U, 3U})
  {
    for (uint64_t piece = 1; piece < 10; ++piece)
    {
      SmallRing small(100, pages);
      small.storage.longestTransfer = piece;
      TAVCBUserArea area{};
      ASSERT_EQ(tav::inside::fetchData(small.ring, 13, pages * 8, area), TAV_RC_OK);
      EXPECT_EQ(std::vector<uint8_t>(area.pChunk, area.pChunk + area.chunkLength), pattern(13, pages * 8))
          << pages << " pages in pieces of " << piece;
    }
  }
}

TEST(FetchData, OfMorePagesThanARepositionTakesComesWhole)
{
  SmallRing small(5000, 600, VectorStorage::kReadOnly);
  TAVCBUserArea area{};
  ASSERT_EQ(small.chunk(0, 1), TAV_RC_OK);
  ASSERT_EQ(tav::inside::fetchData(small.ring, 1, 4800, area), TAV_RC_OK);
  EXPECT_EQ(std::vector<uint8_t>(area.pChunk, area.pChunk + area.chunkLength), pattern(1, 4800));
}

TEST(FetchData, BehindTheEndComesShort)
{
  SmallRing small(20);
  TAVCBUserArea area{};
  ASSERT_EQ(tav::inside::fetchData(small.ring, 15, 9, area), TAV_RC_OK);
  EXPECT_EQ(std::vector<uint8_t>(area.pChunk, area.pChunk + area.chunkLength), pattern(15, 5));
}

TEST(FetchData, KeepsACodeMetWhileReadingOn)
{
  SmallRing small(100, 3, VectorStorage::kReadOnly);
  small.storage.longestTransfer = 2;
  TAVCBUserArea area{};
  small.storage.failAt(4, KOR_RC_IO_ERROR);
  EXPECT_EQ(tav::inside::fetchData(small.ring, 0, 24, area), KOR_RC_IO_ERROR);
}

TEST(RawWrite, OfNoBytesSucceedsWithoutTheRing)
{
  StreamWriter writer({.buffered = true});
  const uint64_t calls = writer.vectorStorage().calls();
  uint64_t position = 5;
  TraceLog trace;
  EXPECT_EQ(tav::inside::rawWrite(*writer.handle(), position, nullptr, 0), TAV_RC_OK);
  EXPECT_EQ(position, 5U);
  EXPECT_EQ(writer.vectorStorage().calls(), calls);
  EXPECT_THAT(trace.recordsOf(tav::probe::cbWrite), IsEmpty());
}

TEST(BufferedReader, ReadsAnElementOfTheRingsSizeAndRefusesALargerOne)
{
  Form form{.buffered = true, .pageBytes = 64, .ringBytes = 128};
  StreamWriter writer(form);
  writer.add(group64(1));
  const uint64_t fits = writer.add(binary(2, pattern(0, 128))).nodeOffset;
  const uint64_t larger = writer.add(binary(3, pattern(0, 129))).nodeOffset;
  writer.close();
  StreamReader reader(writer.bytes(), form);
  TAVHeaderData node{};
  ASSERT_EQ(tavReadNodeInt(0, reader.handle(), fits, true, &node), TAV_RC_OK);
  EXPECT_EQ(Bytes(node.pDataBuf, node.pDataBuf + node.dataBufSize), pattern(0, 128));
  EXPECT_EQ(tavReadNodeInt(0, reader.handle(), larger, true, &node), TAV_RC_DATA_TOO_LARGE);
  EXPECT_EQ(node.header.hdr64.size, 129U) << "its header can be walked past";
}

TEST(BufferedReader, AnswersBeforeAnyFetchWhatLiesBeforeTheStream)
{
  StreamReader reader(Bytes(64), {.buffered = true});
  TAVHeaderData from{header64(0, TAV_TYPE_BINARY, 5, 0, 15), nullptr, 0, 0};
  TAVHeaderData out{};
  EXPECT_EQ(tavGetPrevNode(0, reader.handle(), &from, &out), TAV_RC_NO_MEMORY);
  EXPECT_EQ(reader.vectorStorage().calls(), 0U);
}

TEST(BufferedReader, FetchesNoNodeForADistanceThatLeavesTheStream)
{
  Bytes bytes(64);
  const uint64_t pair[] = {TAV_EYE_CATCHER, 17};
  std::memcpy(bytes.data() + 16, pair, sizeof pair);
  StreamReader reader(bytes, {.buffered = true});
  TAVHeaderData from{header64(0, TAV_TYPE_BINARY, 5, 0, 32), nullptr, 0, 0};
  TAVHeaderData out{};
  TraceLog trace;
  EXPECT_EQ(tavGetPrevNode(0, reader.handle(), &from, &out), TAV_RC_NO_MEMORY);
  EXPECT_THAT(trace.recordsOf(tav::probe::readNode), IsEmpty());
}

} // namespace
