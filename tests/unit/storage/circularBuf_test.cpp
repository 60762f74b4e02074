/// Construction, end, writes and marks of the circular buffer.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <memory>
#include <string_view>

#include "storage/ringFixture.h"
#include "support/rows.h"

namespace
{

using namespace test;
using testing::Each;
using testing::ElementsAre;
using testing::IsEmpty;

constexpr uint64_t kMax = ~uint64_t{0};

struct BadRing : Row
{
  bool storage;
  uint32_t storageStatus;
  uint64_t ioUnit;
  uint64_t size;
  uint32_t point;
};

class RefusedRing : public testing::TestWithParam<BadRing>
{};

TEST_P(RefusedRing, HasTheCodeInStatusAndAnswer)
{
  const BadRing& bad = GetParam();
  VectorStorage storage(bad.ioUnit);
  storage.status = bad.storageStatus;
  uint32_t rc = 77;
  TraceLog trace;
  const TAVCircularBuf ring(bad.storage ? &storage : nullptr, bad.size, &rc);
  EXPECT_EQ(rc, TAV_RC_BAD_PARAM);
  EXPECT_EQ(ring.status, TAV_RC_BAD_PARAM);
  EXPECT_EQ(ring.pRing, nullptr);
  EXPECT_EQ(ring.pPageFlags, nullptr);
  EXPECT_EQ(ring.empty, 1);
  EXPECT_THAT(trace.failuresOf(tav::probe::circularBuf),
              ElementsAre(Failure{tav::probe::circularBuf, bad.point, TAV_RC_BAD_PARAM}));
}

INSTANTIATE_TEST_SUITE_P(Rows, RefusedRing,
                         testing::Values(BadRing{"NullStorage", false, 0, 8, 80, 10},
                                         BadRing{"UnusableStorage", true, TAV_RC_NO_MEMORY, 8, 80, 10},
                                         BadRing{"UnusableStorageAndSizeZero", true, TAV_RC_NO_MEMORY, 8, 0, 10},
                                         BadRing{"PageThatRoundsToZero", true, 0, kMax, 80, 20},
                                         BadRing{"PageThatRoundsToZeroByOne", true, 0, kMax - 6, 80, 20},
                                         BadRing{"PageThatRoundsToZeroAndSizeZero", true, 0, kMax - 6, 0, 20},
                                         BadRing{"SizeZero", true, 0, 8, 0, 30}),
                         kRowName);

struct Shape
{
  uint64_t ioUnit;
  uint64_t size;
  uint64_t pageSize;
  uint64_t pageCount;
};

class RingShape : public testing::TestWithParam<Shape>
{};

TEST_P(RingShape, ComesFromUnitAndSize)
{
  const Shape& shape = GetParam();
  VectorStorage storage(shape.ioUnit);
  uint32_t rc = 77;
  const TAVCircularBuf ring(&storage, shape.size, &rc);
  EXPECT_EQ(rc, TAV_RC_OK);
  EXPECT_EQ(ring.pageSize, shape.pageSize);
  EXPECT_EQ(ring.pageCount, shape.pageCount);
  EXPECT_EQ(ring.ringSize, shape.pageSize * shape.pageCount);
}

INSTANTIATE_TEST_SUITE_P(Rows, RingShape,
                         testing::Values(Shape{0, 0x20000, 0x10000, 2}, // no unit: 64 KiB
                                         Shape{12, 32, 16, 2},          // rounded up to a multiple of 8
                                         Shape{1, 8, 8, 1},             //
                                         Shape{8, 17, 8, 3},            // the rest gets a page
                                         Shape{8, 16, 8, 2},            //
                                         Shape{64, 1, 64, 1},           //
                                         Shape{0x100000, 0xA00000, 0x100000, 10}));

TEST(CircularBuf, ThatWasRefusedServesNothing)
{
  VectorStorage storage(8, pattern(0, 100));
  TAVCircularBuf ring(&storage, 0, nullptr);
  TAVCBUserArea area{};
  EXPECT_EQ(ring.getChunk(0, 1, &area, false, false), TAV_RC_BAD_PARAM);
  EXPECT_EQ(ring.reposition(0, 0, 1), TAV_RC_BAD_PARAM);
  EXPECT_EQ(ring.write(0, "a", 1, false), TAV_RC_BAD_PARAM);
  EXPECT_EQ(ring.markPages(0, 1), TAV_RC_BAD_PARAM);
  EXPECT_EQ(ring.reset(), TAV_RC_OK);
  EXPECT_EQ(storage.calls(), 0U);
}

TEST(CircularBuf, StartsEmptyWithNothingPending)
{
  SmallRing small(100);
  EXPECT_EQ(small.ring.status, TAV_RC_OK);
  EXPECT_EQ(small.ring.empty, 1);
  EXPECT_EQ(small.ring.head, 0U);
  EXPECT_EQ(small.ring.tail, 0U);
  EXPECT_EQ(small.ring.headOffset, 0U);
  EXPECT_EQ(small.ring.pStorage, &small.storage);
  EXPECT_EQ(small.ring.storageWritable, 1);
  EXPECT_THAT(small.flags(), Each(0));
  EXPECT_EQ(small.storage.calls(), 0U);
}

TEST(CircularBuf, IsWritableWhenItsStorageIs)
{
  SmallRing readOnly(100, 3, VectorStorage::kReadOnly);
  EXPECT_EQ(readOnly.ring.storageWritable, 0);
}

TEST(CircularBuf, TracesItsConstructionAndItsEnd)
{
  VectorStorage storage(8);
  TraceLog trace;
  {
    uint32_t rc = 77;
    const TAVCircularBuf ring(&storage, 24, &rc);
    const Record entry = trace.dump(tav::probe::circularBuf, 0);
    TAVSideStorage* const pStorage = &storage;
    uint32_t* const pRc = &rc;
    EXPECT_THAT(entry.items, ElementsAre(bytesOf(pStorage), bytesOf(uint64_t{24}), bytesOf(pRc)));
  }
  EXPECT_THAT(trace.stepsOf(tav::probe::circularBuf), ElementsAre(Step{KOR_TRACE_ENTRY, tav::probe::circularBuf, 0},
                                                                  Step{KOR_TRACE_VAR, tav::probe::circularBuf, 0},
                                                                  Step{KOR_TRACE_VAR, tav::probe::circularBuf, 100},
                                                                  Step{KOR_TRACE_EXIT, tav::probe::circularBuf, 0}));
  EXPECT_THAT(trace.stepsOf(tav::probe::circularBufEnd),
              ElementsAre(Step{KOR_TRACE_ENTRY, tav::probe::circularBufEnd, 0},
                          Step{KOR_TRACE_EXIT, tav::probe::circularBufEnd, 0}));
}

TEST(CircularBuf, WritesAllPagesAtItsEnd)
{
  VectorStorage storage(8, pattern(0, 20));
  {
    TAVCircularBuf ring(&storage, 24, nullptr);
    EXPECT_EQ(ring.write(4, "abc", 3, false), TAV_RC_OK);
    EXPECT_EQ(storage.bytesWritten, 0U);
  }
  EXPECT_EQ(std::string(storage.bytes.begin() + 4, storage.bytes.begin() + 7), "abc");
}

TEST(CircularBuf, EndsEvenWhenItsLastWriteFails)
{
  VectorStorage storage(8, pattern(0, 20));
  TraceLog trace;
  {
    TAVCircularBuf ring(&storage, 24, nullptr);
    EXPECT_EQ(ring.write(4, "abc", 3, false), TAV_RC_OK);
    storage.failAt(1, KOR_RC_NO_SPACE);
  }
  EXPECT_THAT(trace.failuresOf(tav::probe::circularBufEnd),
              ElementsAre(Failure{tav::probe::circularBufEnd, 10, KOR_RC_NO_SPACE}));
}

// --- write ---

TEST(CircularBufWrite, NeedsAWritableStorageWhateverTheArguments)
{
  SmallRing small(100, 3, VectorStorage::kReadOnly);
  TraceLog trace;
  EXPECT_EQ(small.ring.write(0, nullptr, 0, false), TAV_RC_NOT_SUPPORTED);
  EXPECT_THAT(trace.failuresOf(tav::probe::cbWrite),
              ElementsAre(Failure{tav::probe::cbWrite, 10, TAV_RC_NOT_SUPPORTED}));
  EXPECT_EQ(small.storage.calls(), 0U);
}

TEST(CircularBufWrite, RefusesNullData)
{
  SmallRing small(100);
  TraceLog trace;
  EXPECT_EQ(small.ring.write(0, nullptr, 0, false), TAV_RC_BAD_PARAM);
  EXPECT_THAT(trace.failuresOf(tav::probe::cbWrite), ElementsAre(Failure{tav::probe::cbWrite, 20, TAV_RC_BAD_PARAM}));
}

TEST(CircularBufWrite, RefusesNoBytes)
{
  SmallRing small(100);
  TraceLog trace;
  EXPECT_EQ(small.ring.write(0, "", 0, true), TAV_RC_BAD_PARAM);
  EXPECT_THAT(trace.failuresOf(tav::probe::cbWrite), ElementsAre(Failure{tav::probe::cbWrite, 30, TAV_RC_BAD_PARAM}));
  EXPECT_EQ(small.storage.calls(), 0U);
}

TEST(CircularBufWrite, TracesItsArguments)
{
  SmallRing small(100);
  const char* const data = "abcd";
  TraceLog trace;
  EXPECT_EQ(small.ring.write(2, data, 4, true), TAV_RC_OK);
  EXPECT_THAT(trace.dump(tav::probe::cbWrite, 0).items,
              ElementsAre(bytesOf(uint64_t{2}), bytesOf(data), bytesOf(uint64_t{4}), bytesOf(true)));
}

TEST(CircularBufWrite, ReadsThePagesFirstAndMarksNothing)
{
  SmallRing small(100);
  EXPECT_EQ(small.write(3, {0xAA, 0xBB}), TAV_RC_OK);
  EXPECT_THAT(small.storage.takeLog(), ElementsAre("seek 3", "read 3+8", "read 11+8"));
  EXPECT_THAT(small.flags(), Each(0));
  EXPECT_EQ(small.ring.pRing[0], 0xAA);
  EXPECT_EQ(small.ring.pRing[1], 0xBB);
  EXPECT_EQ(small.ring.pRing[2], byteAt(5));
}

TEST(CircularBufWrite, CopiesAtOnceWhatFitsIntoTheCachedRange)
{
  SmallRing small(100);
  ASSERT_EQ(small.chunk(0, 16), TAV_RC_OK);
  small.storage.takeLog();
  TraceLog trace;
  EXPECT_EQ(small.write(1, pattern(50, 15)), TAV_RC_OK);
  EXPECT_THAT(small.storage.takeLog(), IsEmpty());
  EXPECT_THAT(trace.recordsOf(tav::probe::cbFill), IsEmpty());
}

TEST(CircularBufWrite, CopiesAcrossTheEndOfTheRing)
{
  SmallRing small(100);
  small.cache(16, 40, 24);
  EXPECT_EQ(small.write(46, pattern(0, 4)), TAV_RC_OK);
  EXPECT_EQ(small.ring.pRing[22], byteAt(0));
  EXPECT_EQ(small.ring.pRing[23], byteAt(1));
  EXPECT_EQ(small.ring.pRing[0], byteAt(2));
  EXPECT_EQ(small.ring.pRing[1], byteAt(3));
}

TEST(CircularBufWrite, SendsWhatRunsPastTheCachedEndStraightToTheStorage)
{
  SmallRing small(100);
  small.cache(0, 16, 8);
  EXPECT_EQ(small.write(20, pattern(0, 16)), TAV_RC_OK); // large: 16 is ring less page
  EXPECT_THAT(small.storage.takeLog(), ElementsAre("seek 16", "write 16+8", "write 24+12"));
  EXPECT_EQ(small.ring.empty, 1);
  EXPECT_EQ(small.ring.headOffset, 36U) << "grows by the piece released and by the bytes written straight";
  EXPECT_EQ(std::vector<uint8_t>(small.storage.bytes.begin() + 20, small.storage.bytes.begin() + 36), pattern(0, 16));
}

TEST(CircularBufWrite, LeavesTheHeadOffsetWhenADirectWriteRunsPastTheCachedEnd)
{
  SmallRing small(100);
  small.cache(0, 16, 8);
  EXPECT_EQ(small.write(20, pattern(0, 16), true), TAV_RC_OK);
  EXPECT_EQ(small.ring.headOffset, 24U);
}

TEST(CircularBufWrite, KeepsTheCodeWhenThePagesBeforeTheRestFail)
{
  SmallRing small(100);
  small.cache(0, 16, 8);
  small.storage.position = 16;
  small.storage.failAt(1, KOR_RC_IO_ERROR);
  TraceLog trace;
  EXPECT_EQ(small.write(20, pattern(0, 16)), KOR_RC_IO_ERROR);
  EXPECT_THAT(trace.failuresOf(tav::probe::cbWrite), ElementsAre(Failure{tav::probe::cbWrite, 40, KOR_RC_IO_ERROR}));
  EXPECT_THAT(small.storage.takeLog(), ElementsAre("write 16+8"));
}

TEST(CircularBufWrite, GoesStraightForALargePieceThatIsNotCached)
{
  SmallRing small(100);
  small.cache(0, 16, 8);
  EXPECT_EQ(small.write(40, pattern(0, 16)), TAV_RC_OK);
  EXPECT_THAT(small.storage.takeLog(), ElementsAre("seek 16", "write 16+8", "seek 40", "write 40+16"));
  EXPECT_EQ(small.storage.lastHint, 1U);
}

TEST(CircularBufWrite, OverARingOfOnePageIsAlwaysLarge)
{
  SmallRing small(100, 1);
  EXPECT_EQ(small.write(5, {7}), TAV_RC_OK);
  EXPECT_THAT(small.storage.takeLog(), ElementsAre("seek 5", "write 5+1"));
}

TEST(CircularBufWrite, DirectAndSmallLeavesTheRingAlone)
{
  SmallRing small(100);
  small.cache(0, 16, 8);
  EXPECT_EQ(small.write(40, {7}, true), TAV_RC_OK);
  EXPECT_THAT(small.storage.takeLog(), ElementsAre("seek 40", "write 40+1"));
  EXPECT_EQ(small.count(), 8U);
}

TEST(CircularBufWrite, DirectAndOverlappingReleasesTheCachedRangeFirst)
{
  SmallRing small(100);
  small.cache(0, 16, 8);
  EXPECT_EQ(small.write(10, pattern(0, 8), true), TAV_RC_OK);
  EXPECT_THAT(small.storage.takeLog(), ElementsAre("seek 16", "write 16+8", "seek 10", "write 10+8"));
  EXPECT_EQ(small.ring.empty, 1);
}

TEST(CircularBufWrite, DirectUpToTheCachedRangeDoesNotOverlap)
{
  SmallRing small(100);
  small.cache(0, 16, 8);
  EXPECT_EQ(small.write(10, pattern(0, 6), true), TAV_RC_OK);
  EXPECT_THAT(small.storage.takeLog(), ElementsAre("seek 10", "write 10+6"));
  EXPECT_EQ(small.count(), 8U);
}

TEST(CircularBufWrite, DoesNotSeekAStorageThatStandsThere)
{
  SmallRing small(100);
  small.storage.position = 40;
  EXPECT_EQ(small.write(40, {7}, true), TAV_RC_OK);
  EXPECT_THAT(small.storage.takeLog(), ElementsAre("write 40+1"));
}

TEST(CircularBufWrite, SmallIsRefusedWhereNoPageCanBeRead)
{
  SmallRing small(100);
  small.storage.failAt(1, KOR_RC_IO_ERROR); // of the fill: its code is not the write's
  TraceLog trace;
  EXPECT_EQ(small.write(40, {7}), TAV_RC_BAD_PARAM);
  EXPECT_THAT(trace.failuresOf(tav::probe::cbWrite), ElementsAre(Failure{tav::probe::cbWrite, 50, TAV_RC_BAD_PARAM}));
}

struct StraightFailure : Row
{
  uint32_t point;
  uint32_t code;
  void (*arrange)(SmallRing&);
};

class StraightWriteFails : public testing::TestWithParam<StraightFailure>
{};

TEST_P(StraightWriteFails, WithTheStoragesCode)
{
  SmallRing small(100);
  small.cache(0, 16, 8);
  GetParam().arrange(small);
  TraceLog trace;
  EXPECT_EQ(small.write(40, pattern(0, 16)), GetParam().code);
  EXPECT_THAT(trace.failuresOf(tav::probe::cbWrite),
              ElementsAre(Failure{tav::probe::cbWrite, GetParam().point, GetParam().code}));
}

INSTANTIATE_TEST_SUITE_P(
    Rows, StraightWriteFails,
    testing::Values(
        StraightFailure{"Release", 60, KOR_RC_NO_SPACE,
                        [](SmallRing& small) { small.storage.failAt(2, KOR_RC_NO_SPACE); }},
        StraightFailure{"Seek", 70, KOR_RC_NOT_SEEKABLE,
                        [](SmallRing& small) { small.storage.failAt(3, KOR_RC_NOT_SEEKABLE); }},
        StraightFailure{"Write", 70, KOR_RC_IO_ERROR,
                        [](SmallRing& small) { small.storage.failAt(4, KOR_RC_IO_ERROR); }},
        StraightFailure{"ShortWrite", 70, TAV_RC_NO_MEMORY, [](SmallRing& small) { small.storage.longestWrite = 8; }},
        StraightFailure{"ShortRelease", 60, TAV_RC_NO_MEMORY, [](SmallRing& small) { small.storage.longestWrite = 7; }},
        StraightFailure{"Position", 60, KOR_RC_IO_ERROR,
                        [](SmallRing& small) { small.storage.positionCode = KOR_RC_IO_ERROR; }}),
    kRowName);

// --- marks ---

TEST(MarkPages, NeedsAWritableStorage)
{
  SmallRing small(100, 3, VectorStorage::kReadOnly);
  TraceLog trace;
  EXPECT_EQ(small.ring.markPages(0, 1), TAV_RC_NOT_SUPPORTED);
  EXPECT_THAT(trace.failuresOf(tav::probe::cbMarkPages),
              ElementsAre(Failure{tav::probe::cbMarkPages, 10, TAV_RC_NOT_SUPPORTED}));
}

TEST(MarkPages, NeedsACachedByte)
{
  SmallRing small(100);
  TraceLog trace;
  EXPECT_EQ(small.ring.markPages(0, 1), TAV_RC_BAD_PARAM);
  EXPECT_THAT(trace.failuresOf(tav::probe::cbMarkPages),
              ElementsAre(Failure{tav::probe::cbMarkPages, 20, TAV_RC_BAD_PARAM}));
}

struct Marked : Row
{
  uint64_t index; ///< where 40 is cached
  uint64_t count;
  uint64_t offset;
  uint64_t length;
  std::vector<int> flags;
};

class MarkedPages : public testing::TestWithParam<Marked>
{};

TEST_P(MarkedPages, AreThoseOfTheRangeWithItsEnd)
{
  const Marked& row = GetParam();
  SmallRing small(100);
  small.cache(row.index, 40, row.count);
  TraceLog trace;
  EXPECT_EQ(small.ring.markPages(row.offset, row.length), TAV_RC_OK);
  EXPECT_EQ(small.flags(), row.flags);
  EXPECT_THAT(trace.dump(tav::probe::cbMarkPages, 0).items, ElementsAre(bytesOf(row.offset), bytesOf(row.length)));
}

INSTANTIATE_TEST_SUITE_P(Rows, MarkedPages,
                         testing::Values(Marked{"OnePage", 0, 24, 41, 3, {1, 0, 0}},
                                         Marked{"EndOnTheNextPage", 0, 24, 41, 7, {1, 1, 0}},
                                         Marked{"Middle", 0, 24, 48, 4, {0, 1, 0}},
                                         Marked{"All", 0, 24, 40, 23, {1, 1, 1}},
                                         Marked{"EndBeyondTheCachedRange", 0, 16, 49, 100, {0, 1, 0}},
                                         Marked{"EndThatPassesTheLastOffset", 0, 24, 49, kMax, {0, 1, 1}},
                                         Marked{"BeginBeforeTheCachedRange", 0, 24, 30, 12, {1, 0, 0}},
                                         Marked{"BeginBeforeWithItsEndAtTheHead", 0, 24, 30, 10, {1, 0, 0}},
                                         Marked{"AcrossTheEndOfTheRing", 16, 24, 47, 4, {1, 0, 1}},
                                         Marked{"AllAcrossTheEnd", 16, 24, 40, 50, {1, 1, 1}}),
                         kRowName);

TEST(MarkPages, RefusesARangeThatEndsBeforeTheCachedOne)
{
  SmallRing small(100);
  small.cache(0, 40, 24);
  TraceLog trace;
  EXPECT_EQ(small.ring.markPages(30, 9), TAV_RC_BAD_PARAM);
  EXPECT_THAT(trace.failuresOf(tav::probe::cbMarkPages),
              ElementsAre(Failure{tav::probe::cbMarkPages, 30, TAV_RC_BAD_PARAM}));
  EXPECT_THAT(small.flags(), Each(0));
}

TEST(MarkPages, RefusesARangeBehindTheCachedOne)
{
  SmallRing small(100);
  small.cache(0, 40, 24);
  EXPECT_EQ(small.ring.markPages(64, 1), TAV_RC_BAD_PARAM);
  EXPECT_THAT(small.flags(), Each(0));
}

} // namespace
