/// What the circular buffer hands out.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "storage/ringFixture.h"
#include "support/rows.h"

namespace
{

using namespace test;
using testing::ElementsAre;
using testing::IsEmpty;

constexpr uint64_t kMax = ~uint64_t{0};

TEST(GetChunk, NeedsAnArea)
{
  SmallRing small(100);
  TraceLog trace;
  EXPECT_EQ(small.ring.getChunk(0, 1, nullptr, false, true), TAV_RC_BAD_PARAM);
  EXPECT_THAT(trace.failuresOf(tav::probe::cbGetChunk),
              ElementsAre(Failure{tav::probe::cbGetChunk, 10, TAV_RC_BAD_PARAM}));
}

TEST(GetChunk, NeedsADestinationWhenCopying)
{
  SmallRing small(100);
  TAVCBUserArea area{7, nullptr, 9};
  TraceLog trace;
  EXPECT_EQ(small.ring.getChunk(0, 1, &area, false, true), TAV_RC_BAD_PARAM);
  EXPECT_THAT(trace.failuresOf(tav::probe::cbGetChunk),
              ElementsAre(Failure{tav::probe::cbGetChunk, 20, TAV_RC_BAD_PARAM}));
  EXPECT_EQ(area.chunkOffset, 7U);
  EXPECT_EQ(area.chunkLength, 9U);
  EXPECT_THAT(small.storage.takeLog(), IsEmpty());
}

TEST(GetChunk, PointsIntoTheRing)
{
  SmallRing small(100);
  ASSERT_EQ(small.chunk(5, 7), TAV_RC_OK);
  EXPECT_EQ(small.area.pChunk, small.ring.pRing);
  EXPECT_EQ(small.area.chunkOffset, 5U);
  EXPECT_EQ(small.bytes(), pattern(5, 7));
}

TEST(GetChunk, CopiesToTheDestination)
{
  SmallRing small(100);
  std::vector<uint8_t> to(7);
  TAVCBUserArea area{0, to.data(), 0};
  ASSERT_EQ(small.ring.getChunk(5, 7, &area, false, true), TAV_RC_OK);
  EXPECT_EQ(area.pChunk, to.data());
  EXPECT_EQ(to, pattern(5, 7));
}

TEST(GetChunk, OfACachedOffsetAsksTheStorageForNothing)
{
  SmallRing small(100);
  small.cache(0, 40, 24);
  ASSERT_EQ(small.chunk(63, 50), TAV_RC_OK);
  EXPECT_EQ(small.area.chunkLength, 1U) << "shorter than asked: callers loop";
  EXPECT_THAT(small.storage.takeLog(), IsEmpty());
}

TEST(GetChunk, TracesArgumentsAndResult)
{
  SmallRing small(100);
  TAVCBUserArea area{};
  TAVCBUserArea* const pArea = &area;
  TraceLog trace;
  ASSERT_EQ(small.ring.getChunk(5, 7, &area, false, false), TAV_RC_OK);
  EXPECT_THAT(trace.dump(tav::probe::cbGetChunk, 0).items,
              ElementsAre(bytesOf(uint64_t{5}), bytesOf(uint64_t{7}), bytesOf(pArea), bytesOf(false), bytesOf(false)));
  EXPECT_THAT(trace.dump(tav::probe::cbGetChunk, 100).items, ElementsAre(bytesOf(area)));
  EXPECT_EQ(trace.recordsOf(tav::probe::cbGetChunk).back().kind, KOR_TRACE_EXIT);
}

struct ForwardRow : Row
{
  uint64_t index; ///< where 40 is cached
  uint64_t count;
  uint64_t offset;
  uint64_t length;
  uint64_t at; ///< the ring index where the chunk begins
  uint64_t delivered;
};

class ForwardChunk : public testing::TestWithParam<ForwardRow>
{};

TEST_P(ForwardChunk, IsWhatStandsTogetherInTheRing)
{
  const ForwardRow& row = GetParam();
  SmallRing small(100);
  small.cache(row.index, 40, row.count);
  ASSERT_EQ(small.chunk(row.offset, row.length), TAV_RC_OK);
  EXPECT_EQ(small.area.pChunk, small.ring.pRing + row.at);
  EXPECT_EQ(small.area.chunkOffset, row.offset);
  EXPECT_EQ(small.bytes(), pattern(row.offset, row.delivered));
}

INSTANTIATE_TEST_SUITE_P(Rows, ForwardChunk,
                         testing::Values(ForwardRow{"Whole", 0, 24, 41, 5, 1, 5},
                                         ForwardRow{"CutAtTheTail", 0, 16, 50, 9, 10, 6},
                                         ForwardRow{"CutAtTheEndOfTheRing", 16, 24, 43, 9, 19, 5},
                                         ForwardRow{"BehindTheEndOfTheRing", 16, 24, 48, 99, 0, 16},
                                         ForwardRow{"NoBytes", 0, 16, 41, 0, 1, 0},
                                         ForwardRow{"LastByteOfTheRing", 16, 24, 47, 9, 23, 1},
                                         ForwardRow{"OneByteCached", 5, 1, 40, 9, 5, 1}),
                         kRowName);

struct BackwardRow : Row
{
  uint64_t head;
  uint64_t headOffset;
  uint64_t count;
  uint64_t offset;
  uint64_t length;
  uint64_t delivered;
  uint64_t chunkOffset;
};

class BackwardChunk : public testing::TestWithParam<BackwardRow>
{};

TEST_P(BackwardChunk, EndsAtItsOffset)
{
  const BackwardRow& row = GetParam();
  SmallRing small(1000);
  small.cache(row.head, row.headOffset, row.count);
  ASSERT_EQ(small.chunk(row.offset, row.length, true), TAV_RC_OK);
  EXPECT_EQ(small.bytes(), pattern(row.offset + 1 - row.delivered, row.delivered));
  EXPECT_EQ(small.area.chunkOffset, row.chunkOffset) << "an arithmetic of its own, not where the chunk starts";
  EXPECT_THAT(small.storage.takeLog(), IsEmpty());
}

// With the head below the tail: headOffset - head + offset. With the head above it the same while the offset is above
// the tail, else ringSize more. With one cached byte: headOffset, when the offset is 1.
INSTANTIATE_TEST_SUITE_P(Rows, BackwardChunk,
                         testing::Values(BackwardRow{"HeadBelowTail", 0, 100, 16, 110, 4, 4, 210},
                                         BackwardRow{"HeadBelowTailElsewhere", 8, 100, 16, 110, 40, 11, 202},
                                         BackwardRow{"HeadBelowTailFromOffsetZero", 8, 0, 16, 4, 2, 2, kMax - 3},
                                         BackwardRow{"OffsetBelowHeadIndex", 8, 3, 9, 6, 2, 2, 1},
                                         BackwardRow{"HeadAboveTail", 16, 100, 16, 104, 9, 5, 188},
                                         BackwardRow{"BehindTheEndOfTheRing", 16, 100, 16, 110, 9, 3, 194},
                                         BackwardRow{"OffsetNotAboveTail", 20, 0, 16, 5, 9, 2, 9},
                                         BackwardRow{"OffsetOfTheTail", 20, 0, 16, 11, 4, 4, 15},
                                         BackwardRow{"AtTheHead", 8, 40, 8, 40, 8, 1, 72},
                                         BackwardRow{"AtTheHeadOfAWrappedRange", 16, 100, 16, 100, 9, 1, 184},
                                         BackwardRow{"OneByteAtOffsetOne", 3, 1, 1, 1, 9, 1, 1},
                                         BackwardRow{"NoBytes", 0, 100, 16, 110, 0, 0, 210}),
                         kRowName);

TEST(GetChunk, BackwardOfOneCachedByteElsewhereThanAtOneHasNoOffset)
{
  SmallRing small(100);
  small.cache(3, 7, 1);
  small.area = {55, nullptr, 66};
  TraceLog trace;
  EXPECT_EQ(small.ring.getChunk(7, 9, &small.area, true, false), TAV_RC_CB_STATE);
  EXPECT_EQ(small.bytes(), pattern(7, 1)) << "the fields that are set stay set";
  EXPECT_EQ(small.area.chunkOffset, 55U);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{tav::probe::cbIndexToOffset, 10, TAV_RC_CB_STATE},
                                            Failure{tav::probe::cbGetChunk, 50, TAV_RC_CB_STATE}));
}

TEST(GetChunk, BackwardCopies)
{
  SmallRing small(100);
  std::vector<uint8_t> to(6);
  TAVCBUserArea area{0, to.data(), 0};
  ASSERT_EQ(small.ring.getChunk(50, 6, &area, true, true), TAV_RC_OK);
  EXPECT_EQ(to, pattern(45, 6));
}

TEST(GetChunk, BehindTheStoragesEndIsTheEnd)
{
  SmallRing small(20);
  TraceLog trace;
  EXPECT_EQ(small.chunk(20, 1), TAV_RC_END_OF_STORAGE);
  EXPECT_THAT(trace.failuresOf(tav::probe::cbGetChunk),
              ElementsAre(Failure{tav::probe::cbGetChunk, 40, TAV_RC_END_OF_STORAGE}));
}

TEST(GetChunk, KeepsTheCodeOfAFailedRead)
{
  SmallRing small(100);
  small.storage.failAt(1, KOR_RC_IO_ERROR);
  TraceLog trace;
  EXPECT_EQ(small.chunk(0, 1), KOR_RC_IO_ERROR);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{tav::probe::cbReadPages, 10, KOR_RC_IO_ERROR},
                                            Failure{tav::probe::cbFill, 10, KOR_RC_IO_ERROR},
                                            Failure{tav::probe::cbGetChunk, 30, KOR_RC_IO_ERROR}));
}

TEST(GetChunk, ServesACachedOffsetAlthoughTheEndWasMet)
{
  SmallRing small(20);
  EXPECT_EQ(small.chunk(18, 24), TAV_RC_OK);
  EXPECT_EQ(small.bytes(), pattern(18, 2));
}

TEST(GetChunk, AfterAFailureServesAgain)
{
  SmallRing small(100);
  small.storage.failAt(2, KOR_RC_IO_ERROR); // the second page
  EXPECT_EQ(small.chunk(0, 16), KOR_RC_IO_ERROR);
  EXPECT_EQ(small.chunk(0, 16), TAV_RC_OK);
  EXPECT_EQ(small.bytes(), pattern(0, 8)) << "the page that had come";
  EXPECT_EQ(small.chunk(8, 16), TAV_RC_OK);
  EXPECT_EQ(small.bytes(), pattern(8, 16));
}

TEST(Reposition, BeginsAnewAtTheOffset)
{
  SmallRing small(100);
  small.cache(3, 40, 10);
  EXPECT_EQ(small.ring.reposition(51, 0, 2), TAV_RC_OK);
  EXPECT_EQ(small.ring.headOffset, 51U);
  EXPECT_EQ(small.ring.head, 0U);
  EXPECT_EQ(small.count(), 24U) << "the page of the offset and two more";
  EXPECT_EQ(small.chunk(51, 24), TAV_RC_OK);
  EXPECT_EQ(small.bytes(), pattern(51, 24));
}

TEST(Reposition, AddsTheSignedAdjustment)
{
  SmallRing small(300);
  EXPECT_EQ(small.ring.reposition(51, -3, 0), TAV_RC_OK);
  EXPECT_EQ(small.ring.headOffset, 48U);
  EXPECT_EQ(small.count(), 8U);
  EXPECT_EQ(small.ring.reposition(51, 127, 0), TAV_RC_OK);
  EXPECT_EQ(small.ring.headOffset, 178U);
  EXPECT_EQ(small.ring.reposition(130, -128, 1), TAV_RC_OK);
  EXPECT_EQ(small.ring.headOffset, 2U);
}

TEST(Reposition, TracesItsArgumentsAndSteps)
{
  SmallRing small(100);
  TraceLog trace;
  EXPECT_EQ(small.ring.reposition(51, -3, 2), TAV_RC_OK);
  EXPECT_THAT(trace.dump(tav::probe::cbReposition, 0).items,
              ElementsAre(bytesOf(uint64_t{51}), bytesOf(int8_t{-3}), bytesOf(uint8_t{2})));
  EXPECT_THAT(trace.dump(tav::probe::cbFill, 0).items,
              ElementsAre(bytesOf(uint64_t{48}), bytesOf(uint64_t{2}), bytesOf(false)));
}

TEST(Reposition, StopsWhereThePagesCannotBeWritten)
{
  SmallRing small(100);
  small.cache(0, 40, 10);
  small.storage.longestWrite = 3;
  TraceLog trace;
  EXPECT_EQ(small.ring.reposition(0, 0, 1), TAV_RC_NO_MEMORY);
  EXPECT_EQ(small.count(), 10U);
  EXPECT_THAT(trace.failuresOf(tav::probe::cbReposition),
              ElementsAre(Failure{tav::probe::cbReposition, 10, TAV_RC_NO_MEMORY}));
}

TEST(Reposition, SucceedsWhereTheStorageEndsWithAPage)
{
  for (const uint64_t attributes : {VectorStorage::kReadOnly, VectorStorage::kReadWrite})
  {
    SmallRing small(32, 4, attributes);
    EXPECT_EQ(small.ring.reposition(24, 0, 1), TAV_RC_OK) << "of two pages the storage has one";
    EXPECT_EQ(small.count(), 8U);
    EXPECT_EQ(small.ring.reposition(8, 0, 3), TAV_RC_OK);
    EXPECT_EQ(small.count(), 24U);
  }
}

TEST(Reposition, BehindTheEndGivesTheEnd)
{
  SmallRing small(100);
  TraceLog trace;
  EXPECT_EQ(small.ring.reposition(100, 0, 1), TAV_RC_END_OF_STORAGE);
  EXPECT_EQ(small.ring.empty, 1);
  EXPECT_EQ(small.storage.bytes.size(), 100U);
  EXPECT_THAT(trace.failuresOf(tav::probe::cbReposition),
              ElementsAre(Failure{tav::probe::cbReposition, 20, TAV_RC_END_OF_STORAGE}));
}

TEST(Reposition, BeforeTheFirstByteFindsNothing)
{
  SmallRing small(100);
  EXPECT_EQ(small.ring.reposition(0, -1, 1), TAV_RC_END_OF_STORAGE);
  EXPECT_EQ(small.ring.empty, 1);
}

} // namespace
