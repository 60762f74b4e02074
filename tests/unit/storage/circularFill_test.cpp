/// How pages come into the ring.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "storage/ringFixture.h"
#include "support/rows.h"
#include "tav/probes.h"

namespace
{

using namespace test;
using testing::Contains;
using testing::ElementsAre;
using testing::IsEmpty;

constexpr uint64_t kMax = ~uint64_t{0};
constexpr uint64_t kReadWriteNoSeek = VectorStorage::kReadWrite & ~TAV_ATTR_SEEK;

// --- where the storage's cursor is ---

TEST(Fill, BringsTheStorageToThePageForAnEmptyRing)
{
  SmallRing small(100);
  small.storage.position = 33;
  ASSERT_EQ(small.chunk(0, 4), TAV_RC_OK);
  EXPECT_EQ(small.bytes(), pattern(0, 4));
  EXPECT_THAT(small.storage.takeLog(), ElementsAre("seek 0", "read 0+8", "read 8+8"));
  EXPECT_EQ(small.storage.lastHint, 1U);
}

TEST(Fill, BringsTheStorageToThePageBehindTheCachedRange)
{
  SmallRing small(100);
  small.cache(0, 40, 16);
  small.storage.position = 3;
  ASSERT_EQ(small.chunk(56, 1), TAV_RC_OK);
  EXPECT_EQ(small.bytes(), pattern(56, 1));
  EXPECT_EQ(small.storage.takeLog().front(), "seek 56");
}

TEST(Fill, DoesNotSeekWhileItReadsOn)
{
  SmallRing small(400, 3, VectorStorage::kReadOnly);
  for (uint64_t offset = 0; offset < 400; offset += 4)
  {
    ASSERT_EQ(small.chunk(offset, 4), TAV_RC_OK);
    ASSERT_EQ(small.bytes(), pattern(offset, 4));
  }
  EXPECT_EQ(small.storage.seeks, 0U);
  EXPECT_EQ(small.storage.bytesRead, 400U) << "every byte once";
}

TEST(Fill, RefusesAStorageThatLandsElsewhere)
{
  SmallRing small(100);
  small.storage.seekError = 1;
  TraceLog trace;
  EXPECT_EQ(small.chunk(40, 4), TAV_RC_NO_MEMORY);
  EXPECT_THAT(small.storage.takeLog(), ElementsAre("seek 40"));
  EXPECT_THAT(trace.failuresOf(tav::probe::cbReadPages),
              ElementsAre(Failure{tav::probe::cbReadPages, 10, TAV_RC_NO_MEMORY}));
}

TEST(Fill, KeepsTheCodeOfTheStoragesPosition)
{
  SmallRing small(100);
  small.storage.positionCode = KOR_RC_NOT_OPEN;
  EXPECT_EQ(small.chunk(40, 4), KOR_RC_NOT_OPEN);
  EXPECT_THAT(small.storage.takeLog(), IsEmpty());
}

TEST(Fill, CopiesForwardFromTheStorage)
{
  SmallRing small(100);
  small.storage.seekError = 0;
  ASSERT_EQ(small.chunk(43, 1), TAV_RC_OK);
  ASSERT_EQ(small.chunk(42, 1, true), TAV_RC_OK);
  EXPECT_FALSE(small.storage.everBackward) << "a storage may ignore the direction";
  EXPECT_FALSE(small.storage.everZeroCopy);
}

// --- an empty ring ---

TEST(Fill, OfAnEmptyRingBeginsAtTheOffset)
{
  SmallRing small(100);
  ASSERT_EQ(small.chunk(43, 1), TAV_RC_OK);
  EXPECT_EQ(small.ring.headOffset, 43U) << "not at a multiple of the page size";
  EXPECT_EQ(small.ring.head, 0U);
  EXPECT_EQ(small.count(), 16U) << "the page of the offset and the one that was wanted";
}

TEST(Fill, OfAnEmptyRingReadsNoMoreThanTheRing)
{
  SmallRing small(100);
  ASSERT_EQ(small.chunk(43, kMax), TAV_RC_OK);
  EXPECT_EQ(small.count(), 24U);
  EXPECT_EQ(small.bytes(), pattern(43, 24)) << "an element of exactly the ring's size fits";
}

struct EmptyBackward : Row
{
  uint64_t offset;
  uint64_t length;
  uint64_t headOffset;
  uint64_t delivered;
};

class BackwardIntoAnEmptyRing : public testing::TestWithParam<EmptyBackward>
{};

TEST_P(BackwardIntoAnEmptyRing, EndsWithTheOffsetsPage)
{
  const EmptyBackward& row = GetParam();
  SmallRing small(100);
  ASSERT_EQ(small.chunk(row.offset, row.length, true), TAV_RC_OK);
  EXPECT_EQ(small.ring.headOffset, row.headOffset);
  EXPECT_EQ(small.bytes(), pattern(row.offset + 1 - row.delivered, row.delivered));
}

INSTANTIATE_TEST_SUITE_P(
    Rows, BackwardIntoAnEmptyRing,
    testing::Values(EmptyBackward{"OnePage", 50, 3, 43, 3}, EmptyBackward{"NoBytesWanted", 50, 0, 43, 0},
                    EmptyBackward{"TwoPages", 50, 9, 35, 9}, EmptyBackward{"TheWholeRing", 50, 24, 27, 24},
                    EmptyBackward{"MoreThanTheRing", 50, 99, 27, 24}, EmptyBackward{"NearTheFirstByte", 5, 9, 0, 6},
                    EmptyBackward{"ExactlyToTheFirstByte", 7, 8, 0, 8}),
    kRowName);

// --- sizes ---

TEST(Fill, TakesASizeOfAllOnes)
{
  SmallRing small(100);
  small.cache(0, 40, 8);
  ASSERT_EQ(small.chunk(48, kMax), TAV_RC_OK);
  EXPECT_EQ(small.bytes(), pattern(48, 16));
}

TEST(Fill, ComparesOffsetsWithoutAdding)
{
  SmallRing small(100);
  small.cache(0, kMax - 7, 8);
  EXPECT_TRUE(small.ring.isCached(kMax));
  EXPECT_FALSE(small.ring.isCached(0));
  EXPECT_FALSE(small.ring.isCached(kMax - 8));
  small.ring.empty = 1;
  EXPECT_FALSE(small.ring.isCached(kMax));
}

// --- around the cached range ---

TEST(Fill, BehindTheCachedRangeReadsTheGapAndWhatIsWanted)
{
  SmallRing small(100, 4);
  small.cache(0, 16, 8);
  small.storage.position = 24;
  ASSERT_EQ(small.chunk(33, 8), TAV_RC_OK);
  EXPECT_THAT(small.storage.takeLog(), ElementsAre("read 24+8", "read 32+8", "read 40+8"));
  EXPECT_EQ(small.ring.headOffset, 16U);
  EXPECT_EQ(small.count(), 32U);
}

TEST(Fill, BehindTheCachedRangeReadsTheGapAloneWhenItLooksBack)
{
  SmallRing small(100, 4);
  small.cache(0, 16, 8);
  small.storage.position = 24;
  ASSERT_EQ(small.chunk(32, 8, true), TAV_RC_OK);
  EXPECT_THAT(small.storage.takeLog(), ElementsAre("read 24+8", "read 32+8"))
      << "a gap of one page, and one page until the offset is cached";
}

TEST(Fill, OverARingOfOnePageReadsOnePageAtATime)
{
  SmallRing small(100, 1);
  small.cache(0, 16, 8);
  small.storage.position = 24;
  ASSERT_EQ(small.chunk(24, 99), TAV_RC_OK);
  EXPECT_EQ(small.storage.reads, 1U);
  EXPECT_EQ(small.ring.headOffset, 24U);
}

TEST(Fill, OverARingOfOnePageReadsBackwardOnce)
{
  SmallRing small(100, 1, VectorStorage::kReadOnly);
  small.cache(0, 16, 8);
  ASSERT_EQ(small.chunk(15, 1, true), TAV_RC_OK);
  EXPECT_THAT(small.storage.takeLog(), ElementsAre("seek 8", "read 8+8"));
  EXPECT_EQ(small.ring.headOffset, 8U);
  EXPECT_EQ(small.count(), 8U);
  EXPECT_EQ(small.bytes(), pattern(15, 1));
}

TEST(Fill, MakesRoomAtTheHeadForPagesAtTheTail)
{
  SmallRing small(100, 3, VectorStorage::kReadOnly);
  small.cache(0, 16, 24);
  ASSERT_EQ(small.chunk(40, 8), TAV_RC_OK);
  EXPECT_EQ(small.ring.headOffset, 32U);
  EXPECT_EQ(small.count(), 24U);
  EXPECT_EQ(small.bytes(), pattern(40, 8));
}

TEST(Fill, NeverGivesUpThePageThatItWasAskedFor)
{
  SmallRing small(100, 3);
  small.cache(0, 16, 24);
  ASSERT_EQ(small.chunk(40, 99), TAV_RC_OK); // wants more pages than there are
  EXPECT_TRUE(small.ring.isCached(40));
}

TEST(Fill, BeforeTheCachedRangeReadsBackward)
{
  SmallRing small(100, 3, VectorStorage::kReadOnly);
  ASSERT_EQ(small.chunk(43, 1), TAV_RC_OK);
  small.storage.takeLog();
  ASSERT_EQ(small.chunk(42, 1, true), TAV_RC_OK);
  EXPECT_EQ(small.bytes(), pattern(42, 1));
  EXPECT_EQ(small.ring.headOffset, 27U) << "the gap and the page that was wanted";
  EXPECT_EQ(small.count(), 24U) << "the last page has made room";
  EXPECT_THAT(small.storage.takeLog(), ElementsAre("seek 35", "read 35+8", "seek 27", "read 27+8"));
}

TEST(Fill, BeforeTheCachedRangeReadsTheGapAloneForALookForward)
{
  SmallRing small(100, 3, VectorStorage::kReadOnly);
  small.cache(0, 43, 8);
  ASSERT_EQ(small.chunk(36, 20), TAV_RC_OK);
  EXPECT_EQ(small.ring.headOffset, 35U);
  EXPECT_EQ(small.bytes(), pattern(36, 7)) << "cut where the range wraps in the ring";
}

TEST(Fill, BackwardReadsOnlyWhatStandsBefore)
{
  SmallRing small(100, 3, VectorStorage::kReadOnly);
  ASSERT_EQ(small.chunk(3, 1), TAV_RC_OK);
  small.storage.takeLog();
  ASSERT_EQ(small.chunk(2, 9, true), TAV_RC_OK);
  EXPECT_EQ(small.bytes(), pattern(0, 3));
  EXPECT_EQ(small.ring.headOffset, 0U);
  EXPECT_EQ(small.ring.head, 21U);
  EXPECT_THAT(small.storage.takeLog(), ElementsAre("seek 0", "read 0+3"));
}

TEST(Fill, BackwardEndsAtTheFirstByteWithoutAFailure)
{
  SmallRing small(100, 3, VectorStorage::kReadOnly);
  ASSERT_EQ(small.chunk(3, 1), TAV_RC_OK);
  TraceLog trace;
  ASSERT_EQ(small.chunk(2, 9, true), TAV_RC_OK);
  EXPECT_EQ(small.ring.headOffset, 0U);
  EXPECT_THAT(trace.failures(), IsEmpty());
}

TEST(Fill, WalksOverTheEndsOfTheRingForwardAndBackward)
{
  SmallRing small(200, 3, VectorStorage::kReadOnly);
  for (uint64_t offset = 0; offset < 200; ++offset)
  {
    ASSERT_EQ(small.chunk(offset, 1), TAV_RC_OK);
    ASSERT_EQ(small.bytes(), pattern(offset, 1));
  }
  for (uint64_t offset = 199; offset != 0; --offset)
  {
    ASSERT_NE(small.chunk(offset, 1, true), TAV_RC_END_OF_STORAGE);
    ASSERT_EQ(small.bytes(), pattern(offset, 1));
  }
  for (uint64_t offset = 0; offset < 200; ++offset)
  {
    ASSERT_EQ(small.chunk(offset, 1), TAV_RC_OK);
    ASSERT_EQ(small.bytes(), pattern(offset, 1));
  }
}

// --- jumps ---

TEST(Fill, JumpsWhereReadingThroughWouldTakeTwoRings)
{
  SmallRing small(400);
  small.cache(0, 0, 8);
  ASSERT_EQ(small.chunk(48, 8), TAV_RC_OK); // 5 pages and 1
  EXPECT_EQ(small.ring.headOffset, 48U);
  EXPECT_EQ(small.count(), 24U);
  EXPECT_THAT(small.storage.takeLog(), ElementsAre("write 0+8", "seek 48", "read 48+8", "read 56+8", "read 64+8"));
}

TEST(Fill, ReadsThroughWhatIsNearer)
{
  SmallRing small(400, 3, VectorStorage::kReadOnly);
  small.cache(0, 0, 8);
  small.storage.position = 8;
  ASSERT_EQ(small.chunk(40, 8), TAV_RC_OK); // 4 pages and 1
  EXPECT_EQ(small.storage.seeks, 0U);
  EXPECT_EQ(small.storage.reads, 5U);
  EXPECT_EQ(small.ring.headOffset, 24U);
}

TEST(Fill, ReadsThroughWhereTheStorageDoesNotOfferJumps)
{
  SmallRing small(400, 3, VectorStorage::kReadOnly & ~TAV_ATTR_SEEK);
  small.cache(0, 0, 8);
  small.storage.position = 8;
  ASSERT_EQ(small.chunk(300, 8), TAV_RC_OK);
  EXPECT_EQ(small.bytes(), pattern(300, 8));
  EXPECT_EQ(small.storage.seeks, 0U);
}

struct JumpBack : Row
{
  uint64_t offset;
  uint64_t headOffset;
};

class FillJumpsBack : public testing::TestWithParam<JumpBack>
{};

TEST_P(FillJumpsBack, SoThatTheOffsetIsTheLastByteWhereARingFitsBefore)
{
  const JumpBack& row = GetParam();
  SmallRing small(400);
  small.cache(0, 300, 8);
  ASSERT_EQ(small.chunk(row.offset, 8, true), TAV_RC_OK);
  EXPECT_EQ(small.ring.headOffset, row.headOffset);
  EXPECT_EQ(small.bytes(), pattern(row.offset - 7, 8));
}

INSTANTIATE_TEST_SUITE_P(Rows, FillJumpsBack,
                         testing::Values(JumpBack{"FarFromTheFront", 100, 77}, JumpBack{"ToTheSecondByte", 24, 1},
                                         JumpBack{"ToTheFirstByte", 23, 0}, JumpBack{"NearTheFront", 10, 0}),
                         kRowName);

TEST(Fill, ReportsAFailureBehindThePlan)
{
  SmallRing small(100);
  small.storage.longestTransfer = 3;
  ASSERT_EQ(small.chunk(0, 1), TAV_RC_OK);
  small.storage.failAt(2, KOR_RC_IO_ERROR);
  const TraceLog trace;
  EXPECT_EQ(small.chunk(9, 1), KOR_RC_IO_ERROR);
  const std::vector<Failure> failures = trace.failuresOf(tav::probe::cbFill);
  ASSERT_EQ(failures.size(), 1U);
  EXPECT_EQ(failures.front(), (Failure{tav::probe::cbFill, 20, KOR_RC_IO_ERROR}));
}

TEST(Fill, DoesNotJumpWhenThePagesCannotBeWritten)
{
  SmallRing small(400);
  small.cache(0, 0, 8);
  small.storage.longestWrite = 5;
  EXPECT_EQ(small.chunk(300, 8), TAV_RC_NO_MEMORY);
  EXPECT_EQ(small.count(), 8U);
  EXPECT_EQ(small.ring.headOffset, 0U);
}

TEST(Fill, ReadsOnAfterAJumpUntilTheOffsetIsCached)
{
  SmallRing small(400);
  small.cache(0, 300, 8);
  small.storage.longestTransfer = 3; // page by page, each in pieces
  ASSERT_EQ(small.chunk(100, 4, true), TAV_RC_OK);
  EXPECT_EQ(small.bytes(), pattern(97, 4));
}

TEST(Fill, TracesItsArgumentsAndThoseOfThePageRead)
{
  SmallRing small(100);
  TraceLog trace;
  ASSERT_EQ(small.chunk(43, 9), TAV_RC_OK);
  EXPECT_THAT(trace.dump(tav::probe::cbFill, 0).items,
              ElementsAre(bytesOf(uint64_t{43}), bytesOf(uint64_t{2}), bytesOf(false)));
  EXPECT_THAT(trace.dump(tav::probe::cbReadPages, 0).items, ElementsAre(bytesOf(uint64_t{3}), bytesOf(false)));
  EXPECT_THAT(trace.failures(), IsEmpty());
}

TEST(Fill, TracesTheInlineSteps)
{
  SmallRing small(100);
  TraceLog trace;
  ASSERT_EQ(small.chunk(43, 9), TAV_RC_OK);
  for (const uint32_t probe : {0x88A0036U, 0x88A003FU, 0x88A0041U})
  {
    EXPECT_THAT(trace.recordsOf(probe), Contains(testing::Field(&Record::kind, KOR_TRACE_ENTRY)));
    EXPECT_THAT(trace.recordsOf(probe), Contains(testing::Field(&Record::kind, KOR_TRACE_EXIT)));
  }
}

TEST(Fill, WritesAStreamOverAStorageWithoutJumps)
{
  SmallRing small(0, 3, kReadWriteNoSeek);
  for (uint64_t offset = 0; offset < 100; offset += 5)
  {
    ASSERT_EQ(small.write(offset, pattern(offset, 5)), TAV_RC_OK);
  }
  ASSERT_EQ(small.write(0, pattern(0, 1)), TAV_RC_OK);
  ASSERT_EQ(small.ring.reset(), TAV_RC_OK);
  EXPECT_EQ(std::vector<uint8_t>(small.storage.bytes.begin(), small.storage.bytes.begin() + 100), pattern(0, 100));
}

} // namespace
