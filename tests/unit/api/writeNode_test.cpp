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

using WriteNode = OverForms;
INSTANTIATE_TEST_SUITE_P(Forms, WriteNode, ::testing::ValuesIn(allForms()), kFormName);

TEST_P(WriteNode, WritesAtThePositionAndMovesNothingElse)
{
  StreamWriter writer(GetParam());
  fillStorage(writer, 0xEE);
  TAVHeader header = header64(3, TAV_TYPE_BINARY, kBlob);
  Bytes payload{1, 2, 3};
  uint64_t position = 40;
  ASSERT_EQ(tavWriteNodeInt(0, writer.handle(), &header, &position, payload.data(), 3), TAV_RC_OK);
  EXPECT_EQ(position, GetParam().align ? 64U : 59U);
  EXPECT_EQ(header.nodeOffset, 0U);
  EXPECT_EQ(writer.handle()->streamBytes, 0U);
  EXPECT_EQ(writer.handle()->pHdrStack->count, 0U);
  writer.handle()->streamBytes = 59;
  const Bytes all = writer.bytes();
  const char* const big = GetParam().align ? "00 00 00 00 00 00 00 03 00 10 00 00 00 65 EA 61 01 02 03"
                                           : "00 00 00 00 00 00 00 03 00 00 00 00 00 65 EA 61 01 02 03";
  const char* const little = GetParam().align ? "03 00 00 00 00 00 00 00 00 00 10 00 65 00 61 EA 01 02 03"
                                              : "03 00 00 00 00 00 00 00 00 00 00 00 65 00 61 EA 01 02 03";
  EXPECT_EQ(toHex({all.begin() + 40, all.end()}), rows(isBigEndian(GetParam()) ? big : little));
  EXPECT_EQ(Bytes(all.begin(), all.begin() + 40), Bytes(40, 0xEE));
}

TEST_P(WriteNode, WritesTheHeaderAloneWithoutPayload)
{
  StreamWriter writer(GetParam());
  TAVHeader header = header64(3, TAV_TYPE_BINARY, kBlob, TAV_INFO_EYE_SIZE);
  uint64_t position = 0;
  ASSERT_EQ(tavWriteNodeInt(0, writer.handle(), &header, &position, nullptr, 0), TAV_RC_OK);
  EXPECT_EQ(position, 16U); // neither padding nor pair
}

TEST_P(WriteNode, WritesOfAGroupTheHeaderAlone)
{
  StreamWriter writer(GetParam());
  TAVHeader header = header64(3, TAV_TYPE_HEADER64, kRoot, TAV_INFO_EYE_SIZE);
  Bytes payload{1, 2, 3};
  uint64_t position = 0;
  ASSERT_EQ(tavWriteNodeInt(0, writer.handle(), &header, &position, payload.data(), 3), TAV_RC_OK);
  EXPECT_EQ(position, 16U);
}

TEST(WriteNodeHeader, IsNotCheckedAgainstTheOpenGroup)
{
  StreamWriter writer;
  writer.add(group64(kRoot));
  TAVHeader header = header32(0, TAV_TYPE_HEADER32, kBlob);
  uint64_t position = 16;
  EXPECT_EQ(tavWriteNodeInt(0, writer.handle(), &header, &position, nullptr, 0), TAV_RC_OK);
  EXPECT_EQ(position, 24U);
}

TEST(WriteNodeHeader, TakesAnyOptionsAndAnyMode)
{
  Bytes stream(64);
  StreamReader reader(stream);
  TAVHeader header = header32(0, TAV_TYPE_HEADER32, kBlob);
  uint64_t position = 0;
  EXPECT_EQ(tavWriteNodeInt(~uint64_t{0}, reader.handle(), &header, &position, nullptr, 0), TAV_RC_OK);
  EXPECT_EQ(position, 8U);
}

TEST(WriteNodeHeader, Of32BitsCarriesNoAlignmentBit)
{
  StreamWriter writer(lowFirst({.align = true}));
  TAVHeader header = header32(0, TAV_TYPE_HEADER32, kBlob);
  uint64_t position = 0;
  ASSERT_EQ(tavWriteNodeInt(0, writer.handle(), &header, &position, nullptr, 0), TAV_RC_OK);
  EXPECT_EQ(toHex(Bytes(writer.handle()->pDirectData, writer.handle()->pDirectData + 8)),
            rows("00 00 00 00 01 00 61 EA"));
  EXPECT_EQ(header.hdr64.info, 0U); // the bytes that the 32-bit form leaves unused
}

TEST(WriteNodeHeader, KeepsTheAlignmentBitThatAPackedHandleIsGiven)
{
  StreamWriter writer;
  TAVHeader header = header64(1, TAV_TYPE_BINARY, kBlob, TAV_INFO_ALIGNED8);
  uint8_t byte = 7;
  uint64_t position = 0;
  ASSERT_EQ(tavWriteNodeInt(0, writer.handle(), &header, &position, &byte, 1), TAV_RC_OK);
  EXPECT_EQ(position, 17U); // the handle's flag pads, not the header's bit
}

TEST(WriteNodeHeader, GetsTheAlignmentBitBeforeTheRoomIsChecked)
{
  StreamWriter writer({.align = true}, 8);
  TAVHeader header = header64(0, TAV_TYPE_HEADER64, kBlob);
  uint64_t position = 0;
  EXPECT_EQ(tavWriteNodeInt(0, writer.handle(), &header, &position, nullptr, 0), TAV_RC_END_OF_STORAGE);
  EXPECT_EQ(header.hdr64.info, TAV_INFO_ALIGNED8);
}

TEST(WriteNodeHeader, GetsNoAlignmentBitWhenThePayloadIsRefused)
{
  StreamWriter writer({.align = true});
  TAVHeader header = header64(4, TAV_TYPE_BINARY, kBlob);
  uint64_t position = 0;
  EXPECT_EQ(tavWriteNodeInt(0, writer.handle(), &header, &position, nullptr, 4), TAV_RC_BAD_PAYLOAD);
  EXPECT_EQ(header.hdr64.info, 0U);
}

// Which payloads fit which header.
struct Payload : Row
{
  uint16_t type;
  uint64_t size;
  bool given;
  uint64_t length;
  uint32_t code;
};

constexpr Payload kPayloads[] = {
    {"Whole", 101, 4, true, 4, TAV_RC_OK},
    {"Longer", 101, 4, true, 5, TAV_RC_OK},
    {"Shorter", 101, 4, true, 3, TAV_RC_BAD_PAYLOAD},
    {"PointerWithoutLength", 101, 4, true, 0, TAV_RC_BAD_PAYLOAD},
    {"PointerWithoutLengthToNothing", 101, 0, true, 0, TAV_RC_OK},
    {"LengthWithoutPointer", 101, 4, false, 4, TAV_RC_BAD_PAYLOAD},
    {"LengthWithoutPointerOfNothing", 101, 0, false, 1, TAV_RC_BAD_PAYLOAD},
    {"Neither", 101, 4, false, 0, TAV_RC_OK},
    {"GroupWithShorter", 2, 4, true, 3, TAV_RC_OK},
    {"GroupWithLengthWithoutPointer", 1, 4, false, 4, TAV_RC_OK},
};

class WriteNodePayload : public ::testing::TestWithParam<std::tuple<Payload, bool>>
{
};

TEST_P(WriteNodePayload, IsWholeOrAbsent)
{
  const auto& [row, wide] = GetParam();
  uint8_t bytes[8] = {};
  StreamWriter writer;
  TAVHeader header = wide ? header64(row.size, row.type, kBlob)
                          : header32(static_cast<uint32_t>(row.size), row.type, kBlob);
  uint64_t position = 8;
  TraceLog trace;
  EXPECT_EQ(tavWriteNodeInt(0, writer.handle(), &header, &position, row.given ? bytes : nullptr, row.length), row.code);
  if (row.code == TAV_RC_OK)
  {
    EXPECT_THAT(trace.failures(), IsEmpty());
    return;
  }
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::writeNode, 40, row.code}));
  EXPECT_EQ(position, 8U);
}

INSTANTIATE_TEST_SUITE_P(Rows, WriteNodePayload, ::testing::Combine(::testing::ValuesIn(kPayloads), ::testing::Bool()),
                         kRowNameUnder);

TEST(WriteNodeChecks, RefuseANullHandleFirst)
{
  TraceLog trace;
  EXPECT_EQ(tavWriteNodeInt(0, nullptr, nullptr, nullptr, nullptr, 9), TAV_RC_BAD_PARAM);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::writeNode, 10, TAV_RC_BAD_PARAM}));
}

TEST(WriteNodeChecks, RefuseANullHeaderNext)
{
  StreamWriter writer;
  TraceLog trace;
  EXPECT_EQ(tavWriteNodeInt(0, writer.handle(), nullptr, nullptr, nullptr, 9), TAV_RC_BAD_PARAM);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::writeNode, 20, TAV_RC_BAD_PARAM}));
}

TEST(WriteNodeChecks, RefuseANullPositionBeforeThePayload)
{
  StreamWriter writer;
  TAVHeader header = header64(4, TAV_TYPE_BINARY, kBlob);
  TraceLog trace;
  EXPECT_EQ(tavWriteNodeInt(0, writer.handle(), &header, nullptr, nullptr, 9), TAV_RC_BAD_PARAM);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::writeNode, 30, TAV_RC_BAD_PARAM}));
}

TEST(WriteNodeChecks, RefuseThePayloadBeforeTheMissingBlock)
{
  StreamWriter writer;
  writer.handle()->pDirectData = nullptr;
  TAVHeader header = header64(4, TAV_TYPE_BINARY, kBlob);
  uint64_t position = 0;
  TraceLog trace;
  EXPECT_EQ(tavWriteNodeInt(0, writer.handle(), &header, &position, nullptr, 9), TAV_RC_BAD_PAYLOAD);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::writeNode, 40, TAV_RC_BAD_PAYLOAD}));
}

TEST(WriteNodeChecks, RefuseAMissingSinkBeforeTheHeaderForm)
{
  TAVHeader header = header64(0, TAV_TYPE_HEADER64, kBlob);
  header.hdrType = 3;
  uint64_t position = 5;
  StreamWriter direct;
  direct.handle()->pDirectData = nullptr;
  EXPECT_EQ(tavWriteNodeInt(0, direct.handle(), &header, &position, nullptr, 0), TAV_RC_NO_MEMORY);
  StreamWriter buffered({.buffered = true});
  const WithoutRing guard(buffered.handle());
  TraceLog trace;
  EXPECT_EQ(tavWriteNodeInt(0, buffered.handle(), &header, &position, nullptr, 0), TAV_RC_NO_CIRCULAR_BUF);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::writeNode, 50, TAV_RC_NO_CIRCULAR_BUF}));
  EXPECT_EQ(position, 5U);
}

TEST(WriteNodeChecks, RefuseAFullBlockBeforeTheHeaderForm)
{
  StreamWriter writer({}, 16);
  TAVHeader header = header32(0, TAV_TYPE_HEADER32, kBlob);
  header.hdrType = 3; // counts as 16 bytes
  uint64_t position = 0;
  TraceLog trace;
  EXPECT_EQ(tavWriteNodeInt(0, writer.handle(), &header, &position, nullptr, 0), TAV_RC_END_OF_STORAGE);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::writeNode, 50, TAV_RC_END_OF_STORAGE}));
}

TEST_P(WriteNode, RefusesAnUnknownHeaderFormBeforeAnyByte)
{
  StreamWriter writer(GetParam());
  fillStorage(writer, 0xEE);
  for (const auto form : {uint16_t{0}, uint16_t{3}, uint16_t{65535}})
  {
    TAVHeader header = header32(0, TAV_TYPE_HEADER32, kBlob);
    header.hdrType = form;
    uint64_t position = 5;
    TraceLog trace;
    EXPECT_EQ(tavWriteNodeInt(0, writer.handle(), &header, &position, nullptr, 0), TAV_RC_BAD_HDR_TYPE);
    EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::writeNode, 60, TAV_RC_BAD_HDR_TYPE}));
    EXPECT_EQ(position, 5U);
  }
  writer.handle()->streamBytes = 40;
  EXPECT_EQ(writer.bytes(), Bytes(40, 0xEE));
}

TEST(WriteNodeRoom, IsCountedFromThePosition)
{
  StreamWriter writer({}, 64);
  Bytes payload(4);
  TAVHeader header = header64(4, TAV_TYPE_BINARY, kBlob);
  for (const uint64_t start : {uint64_t{44}, uint64_t{45}, uint64_t{64}, uint64_t{65}})
  {
    uint64_t position = start;
    EXPECT_EQ(tavWriteNodeInt(0, writer.handle(), &header, &position, payload.data(), 4), TAV_RC_END_OF_STORAGE);
    EXPECT_EQ(position, start);
  }
  uint64_t position = 43;
  EXPECT_EQ(tavWriteNodeInt(0, writer.handle(), &header, &position, payload.data(), 4), TAV_RC_OK);
}

TEST(WriteNodeRoom, IsCountedForAPayloadThatTheCallerWrites)
{
  StreamWriter writer({}, 20);
  TAVHeader header = header64(4, TAV_TYPE_BINARY, kBlob);
  uint64_t position = 0;
  EXPECT_EQ(tavWriteNodeInt(0, writer.handle(), &header, &position, nullptr, 0), TAV_RC_END_OF_STORAGE);
  header.hdr64.size = 3;
  EXPECT_EQ(tavWriteNodeInt(0, writer.handle(), &header, &position, nullptr, 0), TAV_RC_OK);
}

TEST(WriteNodeRoom, DoesNotWrapAroundAPositionNearTheLast)
{
  StreamWriter writer({}, 64);
  TAVHeader header = header64(4, TAV_TYPE_HEADER64, kBlob);
  for (const uint64_t start : {~uint64_t{0}, ~uint64_t{0} - 15, ~uint64_t{0} - 8})
  {
    uint64_t position = start;
    EXPECT_EQ(tavWriteNodeInt(0, writer.handle(), &header, &position, nullptr, 0), TAV_RC_END_OF_STORAGE);
    EXPECT_EQ(position, start);
  }
}

TEST(WriteNodeTrace, ShowsArgumentsAndTheNewPosition)
{
  StreamWriter writer;
  TAVHandle* const handle = writer.handle();
  TAVHeader header = header64(2, TAV_TYPE_BINARY, kBlob);
  Bytes payload{1, 2};
  uint64_t position = 4;
  TraceLog trace;
  ASSERT_EQ(tavWriteNodeInt(9, handle, &header, &position, payload.data(), 2), TAV_RC_OK);
  EXPECT_THAT(trace.dump(probe::writeNode, 0).items,
              ElementsAre(bytesOf(uint64_t{9}), bytesOf(handle), "Node to be written", bytesOf(header),
                          bytesOf(&position), bytesOf(payload.data()), bytesOf(uint64_t{2})));
  EXPECT_THAT(trace.dump(probe::writeNode, 100).items, ElementsAre(bytesOf(uint64_t{22})));
  EXPECT_THAT(trace.stepsOf(probe::writeNode),
              ElementsAre(Step{KOR_TRACE_ENTRY, probe::writeNode, 0}, Step{KOR_TRACE_VAR, probe::writeNode, 0},
                          Step{KOR_TRACE_VAR, probe::writeNode, 100}, Step{KOR_TRACE_EXIT, probe::writeNode, 0}));
}

} // namespace
