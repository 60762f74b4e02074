/// How pages leave the ring.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "storage/ringFixture.h"
#include "support/rows.h"

namespace
{

using namespace test;
using testing::Each;
using testing::ElementsAre;
using testing::IsEmpty;

TEST(Reset, OfAnEmptyRingTouchesNothing)
{
  SmallRing small(100);
  small.storage.positionCode = KOR_RC_IO_ERROR;
  small.ring.headOffset = 33;
  EXPECT_EQ(small.ring.reset(), TAV_RC_OK);
  EXPECT_THAT(small.storage.takeLog(), IsEmpty());
  EXPECT_EQ(small.ring.headOffset, 33U);
}

TEST(Reset, LeavesTheRingEmpty)
{
  SmallRing small(100);
  small.cache(16, 40, 20);
  EXPECT_EQ(small.ring.reset(), TAV_RC_OK);
  EXPECT_EQ(small.ring.empty, 1);
  EXPECT_EQ(small.ring.head, 0U);
  EXPECT_EQ(small.ring.tail, 0U);
  EXPECT_EQ(small.ring.headOffset, 60U) << "behind what was cached";
  EXPECT_EQ(small.count(), 0U);
}

TEST(Reset, WritesEveryPageBackToAWritableStorage)
{
  SmallRing small(100);
  small.cache(16, 40, 20);
  EXPECT_EQ(small.ring.reset(), TAV_RC_OK);
  EXPECT_THAT(small.storage.takeLog(), ElementsAre("seek 40", "write 40+8", "write 48+8", "write 56+4"));
}

TEST(Reset, DoesNotSeekAStorageThatStandsAtTheHead)
{
  SmallRing small(100);
  small.cache(0, 40, 8);
  small.storage.position = 40;
  EXPECT_EQ(small.ring.reset(), TAV_RC_OK);
  EXPECT_THAT(small.storage.takeLog(), ElementsAre("write 40+8"));
}

TEST(Reset, WritesNothingToAReadOnlyStorage)
{
  SmallRing small(100, 3, VectorStorage::kReadOnly);
  small.cache(16, 40, 20);
  EXPECT_EQ(small.ring.reset(), TAV_RC_OK);
  EXPECT_THAT(small.storage.takeLog(), IsEmpty());
  EXPECT_EQ(small.ring.empty, 1);
}

TEST(Reset, WritesAMarkedPageEvenSoAndSeeksOverTheOthers)
{
  SmallRing small(100, 3, VectorStorage::kReadOnly);
  small.cache(0, 40, 24);
  small.ring.pPageFlags[0] = 1;
  small.ring.pPageFlags[4] = 1;
  small.storage.position = 40;
  EXPECT_EQ(small.ring.reset(), TAV_RC_OK);
  EXPECT_THAT(small.storage.takeLog(), ElementsAre("write 40+8", "seek 56", "write 56+8"));
  EXPECT_THAT(small.flags(), Each(0));
}

TEST(Reset, ClearsTheMarksOfWhatItWrites)
{
  SmallRing small(100);
  small.cache(0, 40, 24);
  ASSERT_EQ(small.ring.markPages(40, 24), TAV_RC_OK);
  EXPECT_EQ(small.ring.reset(), TAV_RC_OK);
  EXPECT_THAT(small.flags(), Each(0));
}

TEST(Reset, ReleasesBothEndsThatShareAPage)
{
  SmallRing small(100);
  small.cache(5, 40, 22); // three bytes of the first page are the end of the range
  EXPECT_EQ(small.ring.reset(), TAV_RC_OK);
  EXPECT_THAT(small.storage.takeLog(), ElementsAre("seek 40", "write 40+3", "write 43+8", "write 51+8", "write 59+3"));
  EXPECT_EQ(small.ring.empty, 1);
}

TEST(Reset, OfHeadAndTailInOnePageIsOnePiece)
{
  SmallRing small(100);
  small.cache(9, 40, 5);
  EXPECT_EQ(small.ring.reset(), TAV_RC_OK);
  EXPECT_THAT(small.storage.takeLog(), ElementsAre("seek 40", "write 40+5"));
}

struct ReleaseFailure : Row
{
  uint32_t point;
  uint32_t code;
  void (*arrange)(SmallRing&);
  uint64_t stillCached;
};

class ResetFails : public testing::TestWithParam<ReleaseFailure>
{};

TEST_P(ResetFails, AndKeepsWhatIsNotWritten)
{
  SmallRing small(100);
  small.cache(0, 40, 24);
  GetParam().arrange(small);
  TraceLog trace;
  EXPECT_EQ(small.ring.reset(), GetParam().code);
  EXPECT_EQ(small.count(), GetParam().stillCached);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{tav::probe::cbReleasePages, GetParam().point, GetParam().code},
                                            Failure{tav::probe::cbReset, 10, GetParam().code}));
}

TEST_P(ResetFails, AndSucceedsWhenTheStorageRecovers)
{
  SmallRing small(100);
  small.cache(0, 40, 24);
  for (uint64_t i = 0; i < 24; ++i)
  {
    small.ring.pRing[i] = 0xA5;
  }
  GetParam().arrange(small);
  ASSERT_EQ(small.ring.reset(), GetParam().code);
  small.storage.longestWrite = ~uint64_t{0};
  small.storage.seekError = 0;
  small.storage.positionCode = TAV_RC_OK;
  EXPECT_EQ(small.ring.reset(), TAV_RC_OK);
  EXPECT_EQ(small.ring.empty, 1);
  EXPECT_THAT(std::vector<uint8_t>(small.storage.bytes.begin() + 40, small.storage.bytes.begin() + 64), Each(0xA5));
  EXPECT_EQ(std::vector<uint8_t>(small.storage.bytes.begin(), small.storage.bytes.begin() + 40), pattern(0, 40));
}

INSTANTIATE_TEST_SUITE_P(
    Rows, ResetFails,
    testing::Values(ReleaseFailure{"Position", 10, KOR_RC_NOT_OPEN,
                                   [](SmallRing& small) { small.storage.positionCode = KOR_RC_NOT_OPEN; }, 24},
                    ReleaseFailure{"Seek", 20, KOR_RC_NOT_SEEKABLE,
                                   [](SmallRing& small) { small.storage.failAt(1, KOR_RC_NOT_SEEKABLE); }, 24},
                    ReleaseFailure{"SeekElsewhere", 20, TAV_RC_NO_MEMORY,
                                   [](SmallRing& small) { small.storage.seekError = 5; }, 24},
                    ReleaseFailure{"FirstWrite", 20, KOR_RC_NO_SPACE,
                                   [](SmallRing& small) { small.storage.failAt(2, KOR_RC_NO_SPACE); }, 24},
                    ReleaseFailure{"SecondWrite", 20, KOR_RC_NO_SPACE,
                                   [](SmallRing& small) { small.storage.failAt(3, KOR_RC_NO_SPACE); }, 16},
                    ReleaseFailure{"ShortWrite", 20, TAV_RC_NO_MEMORY,
                                   [](SmallRing& small) { small.storage.longestWrite = 7; }, 24}),
    kRowName);

TEST(Release, AtTheTailWritesThePieceWhereItBelongs)
{
  SmallRing small(100);
  ASSERT_EQ(small.chunk(43, 17), TAV_RC_OK);
  ASSERT_EQ(small.count(), 24U);
  small.storage.takeLog();
  ASSERT_EQ(small.chunk(42, 1, true), TAV_RC_OK); // two pages to the front, two from the end
  EXPECT_THAT(small.storage.takeLog(), ElementsAre("seek 59", "write 59+8", "seek 35", "read 35+8", "seek 51",
                                                   "write 51+8", "seek 27", "read 27+8"));
  EXPECT_EQ(small.ring.headOffset, 27U);
  EXPECT_EQ(small.storage.bytes, pattern(0, 100));
}

TEST(Release, AtTheTailSeeksAlsoWhereTheStorageStandsAtTheHead)
{
  SmallRing small(100);
  ASSERT_EQ(small.chunk(43, 17), TAV_RC_OK);
  small.storage.takeLog();
  small.storage.position = 43;
  ASSERT_EQ(small.chunk(42, 0, true), TAV_RC_OK);
  EXPECT_THAT(small.storage.takeLog(), ElementsAre("seek 59", "write 59+8", "seek 35", "read 35+8"));
}

TEST(Release, AtTheTailTakesAPartOfAPageFirst)
{
  SmallRing small(62, 3, VectorStorage::kReadOnly);
  ASSERT_EQ(small.chunk(43, 24), TAV_RC_OK);
  ASSERT_EQ(small.count(), 19U);
  ASSERT_EQ(small.chunk(42, 0, true), TAV_RC_OK);
  EXPECT_EQ(small.ring.headOffset, 35U);
  EXPECT_EQ(small.count(), 24U) << "the three bytes of the last page have made room";
  ASSERT_EQ(small.chunk(58, 9), TAV_RC_OK);
  EXPECT_EQ(small.bytes(), pattern(58, 1));
}

TEST(Release, AtTheTailFailsWithTheStoragesCode)
{
  SmallRing small(100);
  ASSERT_EQ(small.chunk(43, 17), TAV_RC_OK);
  small.storage.longestWrite = 7;
  EXPECT_EQ(small.chunk(42, 1, true), TAV_RC_NO_MEMORY);
  EXPECT_EQ(small.ring.headOffset, 43U);
  EXPECT_EQ(small.count(), 24U);
}

TEST(Release, AtTheHeadMakesRoomForOnePage)
{
  SmallRing small(100);
  small.cache(0, 16, 24);
  ASSERT_EQ(small.chunk(40, 0), TAV_RC_OK);
  EXPECT_THAT(small.storage.takeLog(), ElementsAre("seek 16", "write 16+8", "seek 40", "read 40+8"));
}

TEST(Release, TracesPagesAndDirection)
{
  SmallRing small(100);
  small.cache(0, 16, 24);
  TraceLog trace;
  EXPECT_EQ(small.ring.reset(), TAV_RC_OK);
  EXPECT_THAT(trace.dump(tav::probe::cbReleasePages, 0).items, ElementsAre(bytesOf(uint64_t{3}), bytesOf(false)));
  EXPECT_THAT(trace.stepsOf(tav::probe::cbReset),
              ElementsAre(Step{KOR_TRACE_ENTRY, tav::probe::cbReset, 0}, Step{KOR_TRACE_EXIT, tav::probe::cbReset, 0}));
}

} // namespace
