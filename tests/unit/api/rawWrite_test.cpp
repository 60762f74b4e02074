#include <cstdint>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "api/rawWrite.h"
#include "support/rows.h"
#include "support/traceLog.h"
#include "support/writing.h"
#include "tav/probes.h"
#include "tav/tav.h"

namespace
{

using namespace tav;
using namespace tav::inside;
using namespace test;

using RawWriteStep = OverForms;
INSTANTIATE_TEST_SUITE_P(Forms, RawWriteStep, ::testing::ValuesIn(allForms()), kFormName);

TEST_P(RawWriteStep, PutsTheBytesAtThePositionAndMovesPastThem)
{
  StreamWriter writer(GetParam());
  fillStorage(writer, 0xEE);
  const Bytes bytes{1, 2, 3};
  uint64_t position = 5;
  EXPECT_EQ(rawWrite(*writer.handle(), position, bytes.data(), 3), TAV_RC_OK);
  EXPECT_EQ(position, 8U);
  EXPECT_EQ(writer.length(), 0U); // the write offset is its caller's
  writer.handle()->streamBytes = 10;
  EXPECT_EQ(toHex(writer.bytes()), rows("EE EE EE EE EE 01 02 03 EE EE"));
}

TEST_P(RawWriteStep, OfNoBytesWritesNothing)
{
  StreamWriter writer(GetParam());
  fillStorage(writer, 0xEE, 16);
  uint64_t position = 5;
  TraceLog trace;
  EXPECT_EQ(rawWrite(*writer.handle(), position, nullptr, 0), TAV_RC_OK);
  EXPECT_EQ(position, 5U);
  EXPECT_THAT(trace.failures(), IsEmpty());
  EXPECT_THAT(trace.recordsOf(probe::cbWrite), IsEmpty());
  writer.handle()->streamBytes = 16;
  EXPECT_EQ(writer.bytes(), Bytes(16, 0xEE));
}

TEST_P(RawWriteStep, TracesItsArgumentsAndTheNewPosition)
{
  StreamWriter writer(GetParam());
  const Bytes bytes{1, 2, 3};
  uint64_t position = 5;
  TraceLog trace;
  ASSERT_EQ(rawWrite(*writer.handle(), position, bytes.data(), 3), TAV_RC_OK);
  EXPECT_THAT(trace.dump(probe::rawWrite, 0).items,
              ElementsAre(bytesOf(uint64_t{5}), bytesOf(bytes.data()), bytesOf(uint64_t{3})));
  EXPECT_THAT(trace.stepsOf(probe::rawWrite),
              ElementsAre(Step{KOR_TRACE_ENTRY, probe::rawWrite, 0}, Step{KOR_TRACE_VAR, probe::rawWrite, 0},
                          Step{KOR_TRACE_VAR, probe::rawWrite, 100}, Step{KOR_TRACE_EXIT, probe::rawWrite, 0}));
  EXPECT_THAT(trace.dump(probe::rawWrite, 100).items, ElementsAre(bytesOf(uint64_t{8})));
}

TEST_P(RawWriteStep, TracesThePositionThatNoBytesLeave)
{
  StreamWriter writer(GetParam());
  uint64_t position = 5;
  TraceLog trace;
  ASSERT_EQ(rawWrite(*writer.handle(), position, nullptr, 0), TAV_RC_OK);
  EXPECT_THAT(trace.dump(probe::rawWrite, 100).items, ElementsAre(bytesOf(uint64_t{5})));
}

TEST(RawWriteBuffered, GivesTheRingTheOffsetTheBytesTheLengthAndNoDirectFlag)
{
  StreamWriter writer({.buffered = true});
  const Bytes bytes{1, 2, 3};
  uint64_t position = 5;
  TraceLog trace;
  ASSERT_EQ(rawWrite(*writer.handle(), position, bytes.data(), 3), TAV_RC_OK);
  EXPECT_THAT(trace.dump(probe::cbWrite, 0).items,
              ElementsAre(bytesOf(uint64_t{5}), bytesOf(static_cast<const void*>(bytes.data())), bytesOf(uint64_t{3}),
                          bytesOf(false)));
}

TEST(RawWriteBuffered, MarksWhatItChanged)
{
  StreamWriter writer({.buffered = true});
  fillStorage(writer, 0xEE, 512);
  uint64_t position = 100;
  ASSERT_EQ(rawWrite(*writer.handle(), position, "abc", 3), TAV_RC_OK);
  ASSERT_TRUE(writer.handle()->pCircularBuf->isCached(100));
  EXPECT_EQ(writer.handle()->pCircularBuf->pPageFlags[0], 1);
}

/// A writer without its sink refuses to write anything, nothing included.
void expectRefusals(StreamWriter& writer, uint32_t point, uint32_t code)
{
  for (const uint64_t length : {uint64_t{0}, uint64_t{3}})
  {
    uint64_t position = 5;
    TraceLog trace;
    EXPECT_EQ(rawWrite(*writer.handle(), position, "abc", length), code);
    EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::rawWrite, point, code}));
    EXPECT_EQ(position, 5U);
  }
}

TEST(RawWriteBuffered, NeedsTheRingEvenForNoBytes)
{
  StreamWriter writer({.buffered = true});
  const WithoutRing guard(writer.handle());
  expectRefusals(writer, 10, TAV_RC_NO_CIRCULAR_BUF);
}

TEST(RawWriteBuffered, LeavesThePositionWhenTheRingRefuses)
{
  VectorStorage storage(64, {}, VectorStorage::kReadOnly);
  Handle handle(storage, TAV_OPT_WRITE, {.buffered = true});
  uint64_t position = 5;
  TraceLog trace;
  EXPECT_EQ(rawWrite(*handle.get(), position, "abc", 3), TAV_RC_NOT_SUPPORTED);
  EXPECT_THAT(trace.failuresOf(probe::rawWrite), ElementsAre(Failure{probe::rawWrite, 40, TAV_RC_NOT_SUPPORTED}));
  EXPECT_EQ(position, 5U);
}

TEST(RawWriteDirect, NeedsTheBlockEvenForNoBytes)
{
  StreamWriter writer;
  writer.handle()->pDirectData = nullptr;
  expectRefusals(writer, 20, TAV_RC_NO_MEMORY);
}

// The last byte of the block is never used.
struct ByteRun : Row
{
  uint64_t position;
  uint64_t length;
  bool fits;
};

constexpr ByteRun kRuns[] = {
    {"EndsBeforeTheLastByte", 0, 15, true},
    {"EndsWithTheLastByte", 0, 16, false},
    {"EndsPastTheLastByte", 0, 17, false},
    {"IsTheLastByte", 15, 1, false},
    {"BeginsBehindTheBlock", 17, 1, false},
    {"IsTheLastByteThatMayBeUsed", 14, 1, true},
    {"IsEmptyAtTheLastByte", 15, 0, true},
    {"IsEmptyAtTheEnd", 16, 0, false},
    {"EndsWithTheLastOffset", 1, ~uint64_t{0} - 1, false},
    {"Passes64Bits", 1, ~uint64_t{0}, false},
    {"BeginsAtTheLastOffset", ~uint64_t{0}, 1, false},
};

class DirectRun : public ::testing::TestWithParam<ByteRun>
{
};

TEST_P(DirectRun, StaysBeforeTheLastByteOfTheBlock)
{
  const ByteRun& row = GetParam();
  StreamWriter writer({}, 16);
  fillStorage(writer, 0xEE, 16);
  const Bytes bytes(16, 1);
  uint64_t position = row.position;
  TraceLog trace;
  EXPECT_EQ(rawWrite(*writer.handle(), position, bytes.data(), row.length),
            row.fits ? TAV_RC_OK : TAV_RC_END_OF_STORAGE);
  EXPECT_EQ(position, row.fits ? row.position + row.length : row.position);
  if (!row.fits)
  {
    EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::rawWrite, 30, TAV_RC_END_OF_STORAGE}));
    EXPECT_EQ(Bytes(writer.handle()->pDirectData, writer.handle()->pDirectData + 16), Bytes(16, 0xEE));
  }
  EXPECT_EQ(writer.handle()->pDirectData[15], 0xEE);
}

INSTANTIATE_TEST_SUITE_P(Rows, DirectRun, ::testing::ValuesIn(kRuns),
                         kRowName);

TEST(RawWriteDirect, CopiesBytesOfTheBlockItself)
{
  StreamWriter writer({}, 16);
  uint8_t* const block = writer.handle()->pDirectData;
  for (uint8_t i = 0; i < 16; ++i)
  {
    block[i] = i;
  }
  uint64_t position = 4;
  EXPECT_EQ(rawWrite(*writer.handle(), position, block + 2, 8), TAV_RC_OK);
  EXPECT_EQ(toHex(Bytes(block, block + 16)), rows("00 01 02 03 02 03 04 05 06 07 08 09 0C 0D 0E 0F"));
}

} // namespace
