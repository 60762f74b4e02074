/// What a write brings into the ring before it copies, when its first byte is cached and its last is not.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "storage/ringFixture.h"
#include "support/rows.h"

namespace
{

using namespace test;
using testing::ElementsAre;
using testing::IsEmpty;

/// What a storage was asked to read.
std::vector<std::string> readsOf(const std::vector<std::string>& log)
{
  std::vector<std::string> reads;
  for (const std::string& line : log)
  {
    if (line.starts_with("read"))
    {
      reads.push_back(line);
    }
  }
  return reads;
}

struct Cached : Row
{
  uint64_t index; ///< of the first cached byte, in a ring of 4 pages of 8 bytes
  uint64_t count; ///< from offset 16 on
  uint64_t offset;
  uint64_t length;
  std::vector<std::string> reads;
};

class WriteBehindACachedByte : public testing::TestWithParam<Cached>
{};

TEST_P(WriteBehindACachedByte, ReadsThePagesThatAreMissingUpToTheEndOfTheRing)
{
  const Cached& row = GetParam();
  SmallRing small(100, 4);
  small.cache(row.index, 16, row.count);
  ASSERT_EQ(small.write(row.offset, std::vector<uint8_t>(row.length, 0xEE)), TAV_RC_OK);
  EXPECT_EQ(readsOf(small.storage.takeLog()), row.reads);
  ASSERT_EQ(small.ring.reset(), TAV_RC_OK);
  std::vector<uint8_t> expected = pattern(0, 100);
  std::fill_n(expected.begin() + static_cast<ptrdiff_t>(row.offset), row.length, uint8_t{0xEE});
  EXPECT_EQ(small.storage.bytes, expected);
}

INSTANTIATE_TEST_SUITE_P(
    Rows, WriteBehindACachedByte,
    testing::Values(Cached{"AsManyAsItIsLong", 0, 8, 20, 20, {"read 24+8", "read 32+8", "read 40+8"}},
                    Cached{"NoMoreThanTheRingHasRoomFor", 0, 21, 34, 23, {"read 37+3", "read 40+8"}},
                    Cached{"TheLastByteOfTheLastPage", 0, 31, 36, 17, {"read 47+1"}},
                    Cached{"NoneIntoAFullRing", 0, 32, 36, 17, {}},
                    Cached{"NoneWhereEnoughPagesFollow", 0, 9, 23, 3, {}},
                    Cached{"NoneWhereTheRangeGoesOnAtTheRingsStart", 24, 20, 20, 10, {}},
                    Cached{"NoneWhereTheEndsOfTheRangeNearlyMeet", 28, 26, 16, 10, {}},
                    Cached{"TwoBehindTheLastCachedByte", 0, 8, 23, 9, {"read 24+8", "read 32+8"}},
                    Cached{"TwoWhereTheNextPageIsNeeded", 0, 9, 23, 9, {"read 25+7", "read 32+8"}}),
    kRowName);

// --- a page before the cached range that lies across the ring's end ---

TEST(Fill, BackwardReadsAPageAcrossTheEndOfTheRing)
{
  SmallRing small(100, 4);
  small.cache(3, 40, 8);
  std::fill_n(small.ring.pRing, 3, uint8_t{0xFF});
  ASSERT_EQ(small.chunk(39, 1, true), TAV_RC_OK);
  EXPECT_EQ(small.bytes(), pattern(39, 1));
  EXPECT_EQ(small.ring.headOffset, 24U) << "the gap and the page that was wanted";
  EXPECT_EQ(std::vector<uint8_t>(small.ring.pRing + 27, small.ring.pRing + 32), pattern(32, 5));
  EXPECT_EQ(std::vector<uint8_t>(small.ring.pRing, small.ring.pRing + 3), pattern(37, 3));
}

TEST(FillAtTheEnd, BackwardZeroesFromTheRingsStartWhenTheStorageEndsAtTheRingsEnd)
{
  SmallRing small(37, 4);
  small.cache(3, 40, 8);
  std::fill_n(small.ring.pRing, 3, uint8_t{0xFF});
  std::fill_n(small.ring.pRing + 27, 5, uint8_t{0xFF});
  ASSERT_EQ(small.chunk(36, 1, true), TAV_RC_OK);
  EXPECT_EQ(small.ring.headOffset, 32U);
  EXPECT_EQ(std::vector<uint8_t>(small.ring.pRing + 27, small.ring.pRing + 32), pattern(32, 5));
  EXPECT_THAT(std::vector<uint8_t>(small.ring.pRing, small.ring.pRing + 3), ElementsAre(0, 0, 0));
  EXPECT_THAT(small.flags(), ElementsAre(1, 0, 0, 0)) << "the page that was cleared is pending";
}

TEST(FillAtTheEnd, BackwardZeroesWhatAWritableStorageLostOfAPageThatLiesInTwo)
{
  SmallRing small(33, 4);
  small.cache(19, 40, 8);
  std::fill_n(small.ring.pRing, 19, uint8_t{0xFF});
  ASSERT_EQ(small.chunk(36, 1, true), TAV_RC_OK);
  EXPECT_EQ(small.ring.headOffset, 32U);
  EXPECT_EQ(std::vector<uint8_t>(small.ring.pRing, small.ring.pRing + 11), std::vector<uint8_t>(11, 0xFF));
  EXPECT_THAT(std::vector<uint8_t>(small.ring.pRing + 11, small.ring.pRing + 19),
              ElementsAre(byteAt(32), 0, 0, 0, 0, 0, 0, 0));
  EXPECT_THAT(small.flags(), ElementsAre(0, 1, 1, 0));
}

// --- which steps are taken ---

TEST(CachedOffset, BeforeTheCachedRangeIsRefusedWithoutCounting)
{
  SmallRing small(100);
  small.cache(0, 40, 8);
  TraceLog trace;
  EXPECT_FALSE(small.ring.isCached(39));
  EXPECT_THAT(trace.recordsOf(tav::probe::cbCachedCount), IsEmpty());
}

TEST(CachedOffset, InAnEmptyRingIsRefusedWithoutCounting)
{
  SmallRing small(100);
  TraceLog trace;
  EXPECT_FALSE(small.ring.isCached(0));
  EXPECT_THAT(trace.recordsOf(tav::probe::cbCachedCount), IsEmpty());
}

TEST(CircularBuf, ThatWasRefusedHasNoSizes)
{
  uint32_t rc = TAV_RC_OK;
  const TAVCircularBuf ring(nullptr, 64, &rc);
  EXPECT_EQ(rc, TAV_RC_BAD_PARAM);
  EXPECT_EQ(ring.pRing, nullptr);
  EXPECT_EQ(ring.pPageFlags, nullptr);
  EXPECT_EQ(ring.pStorage, nullptr);
  EXPECT_EQ(ring.ringSize, 0U);
  EXPECT_EQ(ring.pageSize, 0U);
  EXPECT_EQ(ring.pageCount, 0U);
  EXPECT_EQ(ring.head, 0U);
  EXPECT_EQ(ring.tail, 0U);
  EXPECT_EQ(ring.headOffset, 0U);
  EXPECT_EQ(ring.storageWritable, 0U);
  EXPECT_EQ(ring.empty, 1U);
}

} // namespace
