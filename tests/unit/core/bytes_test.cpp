/// The bytes that the fast ways go over: what lies in them and what does not, to the byte.
#include <gtest/gtest.h>

#include "core/bytes.h"
#include "core/stack.h"
#include "support/elements.h"
#include "support/streams.h"
#include "tav/core/step.hpp"

namespace
{

using namespace test;
using namespace tav::core;

constexpr uint64_t kNowhere = ~uint64_t{0};

/// A handle over a block of memory, without a storage.
struct Block
{
  explicit Block(size_t size)
      : bytes(size)
  {
    handle.options = TAV_OPT_DIRECT;
    handle.pDirectData = bytes.data();
    handle.directDataSize = size;
  }

  Bytes bytes;
  TAVHandle handle{};
};

TEST(BlockBytes, FindWhatLiesInThemToTheLastByte)
{
  const Block block(100);
  const BlockBytes<HostForm> bytes(block.handle);
  Place place{};
  ASSERT_TRUE(bytes.find(84, 16, place));
  EXPECT_EQ(place.offset, 84U);
  EXPECT_EQ(place.header, block.bytes.data() + 84);
  EXPECT_EQ(place.room, 0U);
  ASSERT_TRUE(bytes.find(0, 16, place));
  EXPECT_EQ(place.room, 84U);
  EXPECT_TRUE((BlockBytes<HostForm>::holds(84, place)));
  EXPECT_FALSE((BlockBytes<HostForm>::holds(85, place)));
  EXPECT_FALSE(bytes.find(85, 16, place));
  EXPECT_FALSE(bytes.find(kNowhere, 16, place));
  EXPECT_FALSE(bytes.find(101, 0, place));
}

/// The last byte is never used, so that what is behind a place can be looked at.
TEST(BlockBytes, HaveRoomUpToTheLastByte)
{
  const Block block(100);
  const BlockBytes<AnyForm> bytes(block.handle);
  EXPECT_EQ(bytes.placeFor(83, 16, 0), block.bytes.data() + 83);
  EXPECT_EQ(bytes.placeFor(84, 16, 0), nullptr);
  EXPECT_EQ(bytes.placeFor(0, 16, 83), block.bytes.data());
  EXPECT_EQ(bytes.placeFor(0, 16, 84), nullptr);
  EXPECT_EQ(bytes.placeFor(0, 101, 0), nullptr);
  EXPECT_EQ(bytes.placeFor(0, 16, 101), nullptr);
  EXPECT_EQ(bytes.placeFor(kNowhere, 16, 0), nullptr);
  EXPECT_EQ(bytes.placeFor(0, 16, kNowhere), nullptr);
  EXPECT_TRUE(hasRoom(100, 99, 0));
  EXPECT_FALSE(hasRoom(100, 100, 0));
}

TEST(BlockBytes, AreReadFromTheStreamsStartAlone)
{
  Block block(100);
  EXPECT_TRUE((BlockBytes<HostForm>::canRead(block.handle)));
  EXPECT_TRUE((BlockBytes<AnyForm>::canRead(block.handle)));
  block.handle.curOffset = 16;
  EXPECT_FALSE((BlockBytes<HostForm>::canRead(block.handle)));
  EXPECT_FALSE((BlockBytes<AnyForm>::canRead(block.handle)));
  EXPECT_TRUE((BlockBytes<HostForm>::canWrite(block.handle)));
  EXPECT_TRUE((BlockBytes<AnyForm>::canWrite(block.handle)));
  block.handle.pDirectData = nullptr;
  EXPECT_FALSE((BlockBytes<HostForm>::canWrite(block.handle)));
  EXPECT_FALSE((BlockBytes<AnyForm>::canWrite(block.handle)));
}

TEST(BlockBytes, AreThoseOfADirectHandle)
{
  Block block(100);
  EXPECT_TRUE(isDirect(block.handle));
  EXPECT_FALSE(isReadOnly(block.handle));
  block.handle.options = TAV_OPT_READ;
  EXPECT_FALSE(isDirect(block.handle));
  EXPECT_TRUE(isReadOnly(block.handle));
  EXPECT_FALSE((BlockBytes<AnyForm>::canWrite(block.handle)));
  EXPECT_FALSE((RingBytes<AnyForm>::canRead(block.handle))) << "without a ring";
}

TEST(RingBytes, AreThoseOfABufferedHandleHoweverItWasOpened)
{
  StreamWriter writer({.buffered = true});
  TAVHandle handle = *writer.handle();
  for (const uint64_t mode : {TAV_OPT_READ, TAV_OPT_WRITE, TAV_OPT_WRITE | TAV_OPT_ROOT32})
  {
    handle.options = mode;
    EXPECT_TRUE((RingOf<HostForm, LibraryWay>::canRead(handle)));
    EXPECT_TRUE((RingOf<HostForm, PlainWay>::canRead(handle)));
    EXPECT_TRUE((RingOf<AnyForm, PlainWay>::canWrite(handle)));
  }
  handle.options = TAV_OPT_READ | TAV_OPT_DIRECT;
  EXPECT_FALSE((RingOf<HostForm, LibraryWay>::canRead(handle)));
  EXPECT_FALSE((RingOf<HostForm, PlainWay>::canRead(handle)));
  EXPECT_FALSE((RingOf<AnyForm, PlainWay>::canRead(handle)));
  handle.options = TAV_OPT_READ;
  handle.swapBytes = 1;
  EXPECT_FALSE((RingOf<HostForm, PlainWay>::canRead(handle)));
  EXPECT_TRUE((RingOf<AnyForm, PlainWay>::canRead(handle)));
}

TEST(BlockBytes, HoldDataOfEveryTypeButGroups)
{
  EXPECT_FALSE((BlockBytes<HostForm>::hasData<true>(TAV_TYPE_HEADER32)));
  EXPECT_FALSE((BlockBytes<HostForm>::hasData<true>(TAV_TYPE_HEADER64)));
  EXPECT_TRUE((BlockBytes<HostForm>::hasData<true>(TAV_TYPE_UINT32)));
  EXPECT_FALSE((BlockBytes<HostForm>::hasData<false>(TAV_TYPE_HEADER32)));
  EXPECT_TRUE((BlockBytes<HostForm>::hasData<false>(TAV_TYPE_HEADER64))) << "a data element under a 32-bit header";
  EXPECT_FALSE((RingBytes<HostForm>::hasData<false>(TAV_TYPE_HEADER64)));
}

TEST(BlockBytes, KnowTheFormOfTheirHandle)
{
  Block block(100);
  EXPECT_FALSE(AnyForm(block.handle).swap);
  EXPECT_FALSE(AnyForm(block.handle).alignAll);
  block.handle.swapBytes = 1;
  EXPECT_TRUE(AnyForm(block.handle).swap);
  EXPECT_FALSE(AnyForm(block.handle).alignAll);
  block.handle.swapBytes = 0;
  block.handle.alignMode = 1;
  EXPECT_FALSE(AnyForm(block.handle).swap);
  EXPECT_TRUE(AnyForm(block.handle).alignAll);
}

/// A ring of four pages of 64 bytes, of which all are cached, and the place that the stream's first byte has in it.
class CachedRing : public testing::TestWithParam<uint64_t>
{
protected:
  CachedRing()
      : writer({.buffered = true, .pageBytes = 64, .ringBytes = 256})
  {
    TAVCircularBuf& ring = *writer.handle()->pCircularBuf;
    ring.head = GetParam();
    ring.tail = (GetParam() + 255) % 256;
    ring.headOffset = 1000;
    ring.empty = 0;
    ring.storageWritable = 1;
  }
  ~CachedRing() override
  {
    writer.handle()->pCircularBuf->empty = 1; // nothing of this was written
  }
  CachedRing(const CachedRing&) = delete;
  CachedRing& operator=(const CachedRing&) = delete;

  RingBytes<HostForm> bytes() { return RingBytes<HostForm>(*writer.handle()); }

  StreamWriter writer;
};

INSTANTIATE_TEST_SUITE_P(Heads, CachedRing, testing::Values(uint64_t{0}, uint64_t{64}, uint64_t{192}));

TEST_P(CachedRing, IsARunUpToTheRingsEnd)
{
  const TAVCircularBuf& ring = *writer.handle()->pCircularBuf;
  EXPECT_EQ(cachedBytes(ring), 256U);
  const uint64_t first = 256 - GetParam(); // bytes up to the ring's end
  for (const uint64_t distance : {uint64_t{0}, uint64_t{1}, first - 1, first % 256, uint64_t{255}})
  {
    const CachedRun run = runAt(ring, 1000 + distance);
    EXPECT_EQ(run.index, (GetParam() + distance) % 256) << distance;
    EXPECT_EQ(run.length, distance < first ? first - distance : 256 - distance) << distance;
  }
  EXPECT_EQ(runAt(ring, 999).length, 0U);
  EXPECT_EQ(runAt(ring, 1256).length, 0U);
}

TEST_P(CachedRing, HasAPlaceForWhatLiesInOnePage)
{
  const TAVCircularBuf& ring = *writer.handle()->pCircularBuf;
  EXPECT_EQ(bytes().placeFor(1000, 16, 47), ring.pRing + GetParam());
  EXPECT_EQ(ring.pPageFlags[2 * (GetParam() / 64)], 1) << "its page is marked";
  EXPECT_EQ(bytes().placeFor(1000, 16, 48), nullptr) << "the byte behind is another page's";
  EXPECT_EQ(bytes().placeFor(1048, 16, 0), nullptr);
  EXPECT_EQ(bytes().placeFor(1000, 16, kNowhere), nullptr);
  writer.handle()->pCircularBuf->storageWritable = 0;
  EXPECT_EQ(bytes().placeFor(1000, 16, 0), nullptr);
}

TEST_P(CachedRing, FindsAHeaderInOneRun)
{
  Place place{};
  const uint64_t first = 256 - GetParam();
  ASSERT_TRUE(bytes().find(1000 + first - 16, 16, place));
  EXPECT_EQ(place.room, 0U);
  EXPECT_EQ(place.offset, 1000 + first - 16);
  EXPECT_EQ(place.header, writer.handle()->pCircularBuf->pRing + 240);
  EXPECT_FALSE(bytes().find(1000 + first - 15, 16, place));
  ASSERT_TRUE(bytes().find(1000, 16, place));
  EXPECT_EQ(place.room, first - 16);
  EXPECT_TRUE((RingBytes<HostForm>::holds(place.room, place)));
  EXPECT_FALSE((RingBytes<HostForm>::holds(place.room + 1, place)));
  EXPECT_FALSE((RingBytes<HostForm>::holds(0, place))) << "no data have a place by the ring's own step only";
}

TEST_P(CachedRing, HandsDataOutAsTheHandlesLastChunk)
{
  Place place{};
  ASSERT_TRUE(bytes().find(1000, 16, place));
  EXPECT_EQ((RingBytes<HostForm>::take(*writer.handle(), place, 16, 5)), 5U);
  EXPECT_EQ(writer.handle()->curOffset, 1016U);
  EXPECT_EQ(writer.handle()->pDirectData, place.header + 16);
  EXPECT_EQ(writer.handle()->directDataSize, 5U);
}

TEST(RingBytes, OfOddPagesAreLeftToTheOperation)
{
  StreamWriter writer({.buffered = true, .pageBytes = 48, .ringBytes = 96});
  TAVCircularBuf& ring = *writer.handle()->pCircularBuf;
  ring.empty = 0;
  ring.head = 0;
  ring.tail = 95;
  EXPECT_EQ(pageOfIndex(ring, 47), 0U);
  EXPECT_EQ(pageOfIndex(ring, 48), 1U);
  EXPECT_EQ(takeInPage(ring, 0, 4), nullptr);
  ring.empty = 1;
  EXPECT_EQ(cachedBytes(ring), 0U);
  EXPECT_EQ(runAt(ring, 0).length, 0U);
}

TEST(HeaderStack, IsPushedToWhereItHasRoom)
{
  TAVHdrStack stack;
  ASSERT_GT(stack.capacity, 1U);
  TAVHeader header{};
  for (uint32_t i = 0; i < stack.capacity; ++i)
  {
    header.nodeOffset = i;
    EXPECT_TRUE(push(stack, header));
    EXPECT_EQ(stack.count, i + 1);
    EXPECT_EQ(stack.pEntries[i].nodeOffset, i);
  }
  EXPECT_FALSE(push(stack, header));
  EXPECT_EQ(stack.count, stack.capacity);
}

/// A level's places are those where a whole header lies in the block before the level's end.
TEST(BlockLevel, HasPlacesBeforeItsEndAndTheBlocks)
{
  const Block block(100);
  const BlockBytes<HostForm> bytes(block.handle);
  Place place{};
  const BlockLevel closed(bytes, 50);
  EXPECT_TRUE(closed.find(closed.at(49), place));
  EXPECT_EQ(place.offset, 49U);
  EXPECT_EQ(place.room, 35U);
  EXPECT_FALSE(closed.find(closed.at(50), place));
  EXPECT_FALSE(closed.find(closed.at(kNowhere), place));
  const BlockLevel open(bytes, kNowhere);
  EXPECT_TRUE(open.find(open.at(84), place));
  EXPECT_EQ(place.room, 0U);
  EXPECT_FALSE(open.find(open.at(85), place));
  const Block small(15);
  const BlockLevel none(BlockBytes<HostForm>(small.handle), kNowhere);
  EXPECT_FALSE(none.find(none.at(0), place));
  const Block exact(16);
  const BlockLevel one(BlockBytes<HostForm>(exact.handle), kNowhere);
  EXPECT_TRUE(one.find(one.at(0), place));
}

} // namespace
