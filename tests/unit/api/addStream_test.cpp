#include <cstdint>
#include <ostream>
#include <string>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "support/rows.h"
#include "support/traceLog.h"
#include "support/writing.h"
#include "tav/probes.h"
#include "tav/tav.h"

namespace
{

using namespace tav;
using namespace test;

using AddStream = OverForms;
INSTANTIATE_TEST_SUITE_P(Forms, AddStream, ::testing::ValuesIn(allForms()), kFormName);

TEST_P(AddStream, CopiesTheBytesWithoutSwapOrPadding)
{
  StreamWriter writer(GetParam());
  writer.add(group64(kRoot));
  Bytes bytes = hex("02 00 00 00 00 00 00 00 00 00 40 00 35 00 CE EA 11 22 33");
  ASSERT_EQ(tavAddStream(0, writer.handle(), TAV_HDR_64, bytes.data(), bytes.size()), TAV_RC_OK);
  EXPECT_EQ(writer.length(), 16U + 19);
  const Bytes all = writer.bytes();
  EXPECT_EQ(toHex({all.begin() + 16, all.end()}), toHex(bytes));
}

TEST_P(AddStream, GoesOnWhereTheLastOneEnded)
{
  StreamWriter writer(GetParam());
  writer.add(group32(kRoot));
  Bytes bytes{1, 2, 3};
  for (int i = 0; i < 100; ++i)
  {
    ASSERT_EQ(tavAddStream(0, writer.handle(), TAV_HDR_32, bytes.data(), bytes.size()), TAV_RC_OK);
  }
  EXPECT_EQ(writer.length(), 8U + 300);
  const Bytes all = writer.bytes();
  EXPECT_EQ(Bytes(all.begin() + 302, all.end()), (Bytes{1, 2, 3, 1, 2, 3}));
}

TEST_P(AddStream, OfNoBytesChangesNothing)
{
  StreamWriter writer(GetParam());
  writer.add(group64(kRoot));
  uint8_t byte = 7;
  TraceLog trace;
  EXPECT_EQ(tavAddStream(0, writer.handle(), TAV_HDR_64, &byte, 0), TAV_RC_OK);
  EXPECT_THAT(trace.failures(), IsEmpty());
  EXPECT_EQ(writer.length(), 16U);
}

TEST_P(AddStream, OpensNoGroup)
{
  StreamWriter writer(GetParam());
  writer.add(group64(kRoot));
  Bytes bytes = hex("00 00 00 00 00 00 00 00 00 00 00 00 02 00 14 00");
  ASSERT_EQ(tavAddStream(0, writer.handle(), TAV_HDR_64, bytes.data(), bytes.size()), TAV_RC_OK);
  EXPECT_EQ(writer.handle()->pHdrStack->count, 1U);
}

// Which header kind fits which open group.
struct Kind : Row
{
  uint16_t parentHdr; // 0: no group is open
  uint16_t parentType;
  uint32_t kind;
  uint32_t code;
  uint32_t point;
};

constexpr Kind kKinds[] = {
    {"Kind1Under32", 1, 1, 1, TAV_RC_OK, 0},
    {"Kind2Under32", 1, 1, 2, TAV_RC_BAD_CHILD_HDR, 60},
    {"Kind1Under32OfType2", 1, 2, 1, TAV_RC_BAD_CHILD_HDR, 60},
    {"Kind2Under32OfType2", 1, 2, 2, TAV_RC_BAD_CHILD_HDR, 60},
    {"Kind1Under64OfType1", 2, 1, 1, TAV_RC_OK, 0},
    {"Kind2Under64OfType1", 2, 1, 2, TAV_RC_BAD_CHILD_HDR, 60},
    {"Kind1Under64OfType2", 2, 2, 1, TAV_RC_BAD_CHILD_HDR, 60},
    {"Kind2Under64OfType2", 2, 2, 2, TAV_RC_OK, 0},
    {"Kind1WithoutGroup", 0, 0, 1, TAV_RC_BAD_CHILD_HDR, 60},
    {"Kind2WithoutGroup", 0, 0, 2, TAV_RC_BAD_CHILD_HDR, 60},
    {"Kind0", 2, 2, 0, TAV_RC_BAD_PARAM, 50},
    {"Kind3", 2, 2, 3, TAV_RC_BAD_PARAM, 50},
    {"KindWithHighBits", 2, 2, 0x10002, TAV_RC_BAD_PARAM, 50},
    {"Kind3WithoutGroup", 0, 0, 3, TAV_RC_BAD_PARAM, 50},
};

class StreamKind : public ::testing::TestWithParam<Kind>
{
};

TEST_P(StreamKind, IsTheOneOfTheOpenGroup)
{
  const Kind& row = GetParam();
  StreamWriter writer;
  if (row.parentHdr != 0)
  {
    writer.add(row.parentHdr == TAV_HDR_64 ? group64(kRoot, row.parentType) : group32(kRoot));
    if (row.parentHdr == TAV_HDR_32 && row.parentType != TAV_TYPE_HEADER32)
    {
      writer.add({header32(0, row.parentType, kRoot), {}}); // such a group cannot be a root
    }
  }
  const uint64_t before = writer.length();
  Bytes bytes{1, 2, 3};
  TraceLog trace;
  EXPECT_EQ(tavAddStream(0, writer.handle(), row.kind, bytes.data(), bytes.size()), row.code);
  if (row.code == TAV_RC_OK)
  {
    EXPECT_THAT(trace.failures(), IsEmpty());
    EXPECT_EQ(writer.length(), before + 3);
    return;
  }
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::addStream, row.point, row.code}));
  EXPECT_EQ(writer.length(), before);
}

INSTANTIATE_TEST_SUITE_P(Rows, StreamKind, ::testing::ValuesIn(kKinds),
                         kRowName);

TEST(AddStreamChecks, RefuseANullHandleFirst)
{
  TraceLog trace;
  EXPECT_EQ(tavAddStream(1, nullptr, 9, nullptr, 0), TAV_RC_BAD_PARAM);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::addStream, 10, TAV_RC_BAD_PARAM}));
}

TEST(AddStreamChecks, RefuseNullBytesBeforeTheMode)
{
  StreamReader reader(Bytes(64));
  TraceLog trace;
  EXPECT_EQ(tavAddStream(1, reader.handle(), 9, nullptr, 0), TAV_RC_BAD_PARAM);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::addStream, 20, TAV_RC_BAD_PARAM}));
}

TEST(AddStreamChecks, RefuseAReadHandleBeforeTheOptions)
{
  StreamReader reader(Bytes(64));
  uint8_t byte = 0;
  TraceLog trace;
  EXPECT_EQ(tavAddStream(1, reader.handle(), 9, &byte, 1), TAV_RC_WRONG_MODE);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::addStream, 30, TAV_RC_WRONG_MODE}));
}

TEST(AddStreamChecks, RefuseOptionsBeforeTheKind)
{
  StreamWriter writer;
  uint8_t byte = 0;
  TraceLog trace;
  EXPECT_EQ(tavAddStream(1, writer.handle(), 9, &byte, 1), TAV_RC_BAD_OPTIONS);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::addStream, 40, TAV_RC_BAD_OPTIONS}));
}

TEST(AddStreamChecks, RefuseAHandleWithoutHeaderStackAsOneWithoutGroup)
{
  StreamWriter writer({}, 0x100, TAV_OPT_WRITE | TAV_OPT_NO_HDR_STACK);
  ASSERT_EQ(writer.handle()->pHdrStack, nullptr);
  uint8_t byte = 0;
  EXPECT_EQ(tavAddStream(0, writer.handle(), TAV_HDR_64, &byte, 1), TAV_RC_BAD_CHILD_HDR);
}

TEST(AddStreamRoom, EndsBeforeTheLastByteOfTheBlock)
{
  StreamWriter writer({}, 20);
  writer.add(group64(kRoot));
  Bytes bytes{1, 2, 3, 4};
  for (const uint64_t length : {uint64_t{4}, uint64_t{5}, ~uint64_t{0} - 15, ~uint64_t{0}})
  {
    TraceLog trace;
    EXPECT_EQ(tavAddStream(0, writer.handle(), TAV_HDR_64, bytes.data(), length), TAV_RC_END_OF_STORAGE);
    EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::rawWrite, 30, TAV_RC_END_OF_STORAGE},
                                              Failure{probe::addStream, 70, TAV_RC_END_OF_STORAGE}));
    EXPECT_EQ(writer.length(), 16U);
  }
  EXPECT_EQ(tavAddStream(0, writer.handle(), TAV_HDR_64, bytes.data(), 3), TAV_RC_OK);
  EXPECT_EQ(Bytes(writer.handle()->pDirectData + 16, writer.handle()->pDirectData + 20), (Bytes{1, 2, 3, 0}));
}

TEST(AddStreamRoom, IsNotThereBehindPaddingThatLeftTheBlock)
{
  StreamWriter writer({.align = true}, 16 + 17 + 1);
  writer.add(group64(kRoot));
  writer.add(binary(kBlob, {1}));
  ASSERT_EQ(writer.length(), 40U); // past the block of 34 bytes
  uint8_t byte = 0;
  EXPECT_EQ(tavAddStream(0, writer.handle(), TAV_HDR_64, &byte, 1), TAV_RC_END_OF_STORAGE);
  EXPECT_EQ(tavAddStream(0, writer.handle(), TAV_HDR_64, &byte, 0), TAV_RC_END_OF_STORAGE);
  EXPECT_EQ(writer.length(), 40U);
}

TEST(AddStreamSink, WithoutBlockIsRefused)
{
  StreamWriter writer;
  writer.add(group64(kRoot));
  writer.handle()->pDirectData = nullptr;
  uint8_t byte = 0;
  TraceLog trace;
  EXPECT_EQ(tavAddStream(0, writer.handle(), TAV_HDR_64, &byte, 1), TAV_RC_NO_MEMORY);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::rawWrite, 20, TAV_RC_NO_MEMORY},
                                            Failure{probe::addStream, 70, TAV_RC_NO_MEMORY}));
}

TEST(AddStreamSink, WithoutRingIsRefused)
{
  StreamWriter writer({.buffered = true});
  writer.add(group64(kRoot));
  const WithoutRing guard(writer.handle());
  uint8_t byte = 0;
  TraceLog trace;
  EXPECT_EQ(tavAddStream(0, writer.handle(), TAV_HDR_64, &byte, 1), TAV_RC_NO_CIRCULAR_BUF);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::rawWrite, 10, TAV_RC_NO_CIRCULAR_BUF},
                                            Failure{probe::addStream, 70, TAV_RC_NO_CIRCULAR_BUF}));
}

TEST(AddStreamSink, ThatFailsHandsItsCodeUpUnchanged)
{
  StreamWriter writer({.buffered = true});
  writer.add(group64(kRoot));
  Bytes large(640);
  writer.vectorStorage().failAt(1, kStorageCode);
  TraceLog trace;
  EXPECT_EQ(tavAddStream(0, writer.handle(), TAV_HDR_64, large.data(), large.size()), kStorageCode);
  EXPECT_THAT(trace.failuresOf(probe::addStream), ElementsAre(Failure{probe::addStream, 70, kStorageCode}));
  EXPECT_EQ(writer.length(), 16U);
}

TEST(AddStreamTrace, ShowsArgumentsAndTheNewPosition)
{
  StreamWriter writer;
  writer.add(group64(kRoot));
  TAVHandle* const handle = writer.handle();
  Bytes bytes{1, 2, 3};
  TraceLog trace;
  ASSERT_EQ(tavAddStream(0, handle, TAV_HDR_64, bytes.data(), 3), TAV_RC_OK);
  EXPECT_THAT(trace.dump(probe::addStream, 0).items,
              ElementsAre(bytesOf(uint64_t{0}), bytesOf(handle), bytesOf(uint32_t{2}), bytesOf(bytes.data()),
                          bytesOf(uint64_t{3})));
  EXPECT_THAT(trace.dump(probe::addStream, 100).items, ElementsAre(bytesOf(uint64_t{19})));
  EXPECT_THAT(trace.stepsOf(probe::addStream),
              ElementsAre(Step{KOR_TRACE_ENTRY, probe::addStream, 0}, Step{KOR_TRACE_VAR, probe::addStream, 0},
                          Step{KOR_TRACE_VAR, probe::addStream, 100}, Step{KOR_TRACE_EXIT, probe::addStream, 0}));
}

TEST(AddStreamTrace, CarriesItsProbe)
{
  EXPECT_EQ(probe::addStream, 0x088A000AU);
}

} // namespace
