#include "api/uncalledOperations.h"

#include <cstdint>
#include <memory>
#include <utility>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "support/byteRows.h"
#include "support/rows.h"
#include "support/streams.h"
#include "support/traceLog.h"
#include "tav/probes.h"
#include "tav/tav.h"

namespace
{

using namespace tav;
using namespace test;

constexpr uint32_t kId = probe::getNextDataBuffer;
constexpr uint32_t kRefused = 0x90000035;
const Failure kNoMore{kId, 40, TAV_RC_NO_MORE_DATA};

Bytes counting(uint8_t count)
{
  Bytes bytes;
  for (uint8_t i = 0; i < count; ++i)
  {
    bytes.push_back(i);
  }
  return bytes;
}

Form pages(uint64_t pageBytes, uint64_t count)
{
  Form form;
  form.buffered = true;
  form.pageBytes = pageBytes;
  form.ringBytes = pageBytes * count;
  return form;
}

/// A stream of the bytes 0, 1, 2, … 99. Where a descriptor leads is told by the byte there.
class NextDataBuffer : public ::testing::TestWithParam<Form>
{
protected:
  /// A node at offset 10 of whose data the part from `offset` on, `part` bytes long, is at hand.
  static TAVHeaderData nodeWith(uint64_t size, uint64_t offset, uint64_t part, bool wide = true)
  {
    TAVHeaderData node{};
    node.header = wide ? header64(size, TAV_TYPE_BINARY, 1, 0, 10)
                       : header32(static_cast<uint32_t>(size), TAV_TYPE_BINARY, 1, 10);
    node.dataBufOffset = offset;
    node.dataBufSize = part;
    return node;
  }
  uint32_t next(TAVHeaderData& node) { return tavGetNextDataBuffer(0, reader.handle(), &node); }

  StreamReader reader{counting(100), GetParam()};
  TraceLog trace;
};

TEST_P(NextDataBuffer, EndsWhenAllDataIsAtHand)
{
  const std::pair<uint64_t, uint64_t> parts[] = {
      {0, 40},
      {30, 10},
      {40, 0},
      {30, 11},
      {~uint64_t{0}, 1},
      {1, ~uint64_t{0}},
  };
  for (const auto& [offset, part] : parts)
  {
    TAVHeaderData node = nodeWith(40, offset, part);
    const TAVHeaderData before = node;
    trace.clear();
    EXPECT_EQ(next(node), TAV_RC_NO_MORE_DATA) << offset << " " << part;
    EXPECT_TRUE(sameBytes(node, before));
    EXPECT_THAT(trace.failures(), ElementsAre(kNoMore));
  }
}

TEST_P(NextDataBuffer, EndsForDataOfSize0)
{
  TAVHeaderData node = nodeWith(0, 0, 0);
  EXPECT_EQ(next(node), TAV_RC_NO_MORE_DATA);
}

TEST_P(NextDataBuffer, TakesTheSizeOfTheHeadersOwnForm)
{
  for (const bool wide : {true, false})
  {
    TAVHeaderData node = nodeWith(40, 0, 39, wide);
    EXPECT_EQ(next(node), TAV_RC_OK);
    EXPECT_EQ(node.dataBufSize, 1U);
    node = nodeWith(40, 0, 40, wide);
    EXPECT_EQ(next(node), TAV_RC_NO_MORE_DATA);
  }
}

TEST_P(NextDataBuffer, SeeksTheNextPartAtTheOldOffsetFromTheNodesStart)
{
  TAVHeaderData node = nodeWith(40, 5, 20);
  ASSERT_EQ(next(node), TAV_RC_OK);
  EXPECT_EQ(node.pDataBuf[0], 15U) << "neither the header nor the part at hand are added";
  EXPECT_EQ(node.dataBufOffset, 25U);
  EXPECT_EQ(node.dataBufSize, 15U);
  EXPECT_EQ(node.header.nodeOffset, 10U);
  EXPECT_EQ(node.header.hdr64.size, 40U);
}

TEST_P(NextDataBuffer, BeginsAtTheNodesStartWithNothingAtHand)
{
  TAVHeaderData node = nodeWith(8, 0, 0);
  ASSERT_EQ(next(node), TAV_RC_OK);
  EXPECT_EQ(payloadOf(node, 8), hex("0A 0B 0C 0D 0E 0F 10 11"));
  EXPECT_EQ(node.dataBufOffset, 0U);
  EXPECT_EQ(node.dataBufSize, 8U);
  EXPECT_EQ(next(node), TAV_RC_NO_MORE_DATA);
}

TEST_P(NextDataBuffer, GivesNoMoreThanTheStreamHas)
{
  TAVHeaderData node = nodeWith(1000, 80, 10);
  ASSERT_EQ(next(node), TAV_RC_OK);
  EXPECT_EQ(payloadOf(node, node.dataBufSize), hex("5A 5B 5C 5D 5E 5F 60 61 62 63"));
  EXPECT_EQ(node.dataBufOffset, 90U);
}

TEST_P(NextDataBuffer, RefusesANextPartBehindTheStream)
{
  const uint32_t expected = GetParam().buffered ? TAV_RC_END_OF_STORAGE : TAV_RC_NO_MEMORY;
  for (const uint64_t offset : {uint64_t{91}, uint64_t{500}, ~uint64_t{0} - 12})
  {
    TAVHeaderData node = nodeWith(TAV_SIZE_UNKNOWN, offset, 1);
    trace.clear();
    EXPECT_EQ(next(node), expected) << offset;
    EXPECT_THAT(trace.failuresOf(kId), ElementsAre(Failure{kId, 50, expected}));
    EXPECT_EQ(node.dataBufOffset, offset + 1);
  }
}

TEST_P(NextDataBuffer, TracesEntryArgumentsResultAndExit)
{
  TAVHeaderData node = nodeWith(40, 5, 20);
  const TAVHeaderData before = node;
  ASSERT_EQ(next(node), TAV_RC_OK);
  EXPECT_THAT(trace.stepsOf(kId), ElementsAre(Step{KOR_TRACE_ENTRY, kId, 0}, Step{KOR_TRACE_VAR, kId, 0},
                                              Step{KOR_TRACE_VAR, kId, 100}, Step{KOR_TRACE_EXIT, kId, 0}));
  EXPECT_THAT(trace.dump(kId, 0).items, ElementsAre(bytesOf(uint64_t{0}), bytesOf(reader.handle()),
                                                    "Input/Output header", bytesOf(before)));
  EXPECT_THAT(trace.dump(kId, 100).items, ElementsAre(bytesOf(node)));
}

Form direct()
{
  return {};
}

INSTANTIATE_TEST_SUITE_P(Access, NextDataBuffer, ::testing::Values(direct(), pages(128, 1)), kFormName);

TEST(NextDataBufferOverMemory, NeedsTheBlock)
{
  StreamReader reader(Bytes(64));
  reader.handle()->pDirectData = nullptr;
  TAVHeaderData node{};
  node.header = header64(8, TAV_TYPE_BINARY, 1);
  TraceLog trace;
  EXPECT_EQ(tavGetNextDataBuffer(0, reader.handle(), &node), TAV_RC_NO_MEMORY);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{kId, 50, TAV_RC_NO_MEMORY}));
}

TEST(NextDataBufferOverMemory, NeedsANodeInsideTheBlock)
{
  StreamReader reader(counting(64));
  reader.handle()->curOffset = 100;
  const std::pair<uint64_t, uint32_t> places[] = {
      {99, TAV_RC_NO_MEMORY}, {100, TAV_RC_OK}, {164, TAV_RC_OK}, {165, TAV_RC_NO_MEMORY}};
  for (const auto& [offset, rc] : places)
  {
    TAVHeaderData node{};
    node.header = header64(8, TAV_TYPE_BINARY, 1, 0, offset);
    EXPECT_EQ(tavGetNextDataBuffer(0, reader.handle(), &node), rc) << offset;
    if (rc == TAV_RC_OK)
    {
      EXPECT_EQ(node.pDataBuf, reader.handle()->pDirectData + (offset - 100));
      EXPECT_EQ(node.dataBufSize, offset == 164 ? 0U : 8U);
    }
  }
}

TEST(NextDataBufferThroughARing, NeedsTheRing)
{
  StreamReader reader(Bytes(64), pages(16, 1));
  TAVCircularBuf* const ring = std::exchange(reader.handle()->pCircularBuf, nullptr);
  TAVHeaderData node{};
  node.header = header64(8, TAV_TYPE_BINARY, 1);
  TraceLog trace;
  EXPECT_EQ(tavGetNextDataBuffer(0, reader.handle(), &node), TAV_RC_NO_CIRCULAR_BUF);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{kId, 50, TAV_RC_NO_CIRCULAR_BUF}));
  reader.handle()->pCircularBuf = ring;
}

TEST(NextDataBufferThroughARing, GivesTheChunkThatTheRingHas)
{
  StreamReader reader(counting(64), pages(16, 1));
  TAVHeaderData node{};
  node.header = header64(40, TAV_TYPE_BINARY, 1);
  ASSERT_EQ(tavGetNextDataBuffer(0, reader.handle(), &node), TAV_RC_OK);
  EXPECT_EQ(node.dataBufSize, 16U);
  EXPECT_EQ(payloadOf(node, 16), counting(16));
  EXPECT_EQ(reader.handle()->pDirectData, node.pDataBuf);
  EXPECT_EQ(reader.handle()->directDataSize, 16U);
}

TEST(NextDataBufferThroughARing, PassesTheCodeOfTheFetchOn)
{
  StreamReader reader(counting(64), pages(16, 1));
  reader.vectorStorage().failAt(1, kRefused);
  TAVHeaderData node{};
  node.header = header64(40, TAV_TYPE_BINARY, 1);
  TraceLog trace;
  EXPECT_EQ(tavGetNextDataBuffer(0, reader.handle(), &node), kRefused);
  EXPECT_THAT(trace.failuresOf(kId), ElementsAre(Failure{kId, 50, kRefused}));
}

struct Fault : Row
{
  bool handle;
  bool node;
  uint64_t options;
  uint32_t point;
  uint32_t code;
};

/// Each row has the faults of all later rows, too: the first one gives code and point.
const Fault kFaults[] = {
    {"Handle", false, false, 1, 10, TAV_RC_BAD_PARAM},
    {"Node", true, false, 1, 20, TAV_RC_BAD_PARAM},
    {"Options", true, true, 1, 30, TAV_RC_BAD_PARAM},
    {"HighOptions", true, true, uint64_t{1} << 63, 30, TAV_RC_BAD_PARAM},
};

class NextDataBufferFault : public ::testing::TestWithParam<Fault>
{
};

TEST_P(NextDataBufferFault, IsFoundInTheOrderOfTheArguments)
{
  const Fault& fault = GetParam();
  StreamReader reader(Bytes(64));
  TAVHeaderData node{};
  const TAVHeaderData before = node;
  TraceLog trace;
  EXPECT_EQ(tavGetNextDataBuffer(fault.options, fault.handle ? reader.handle() : nullptr,
                                 fault.node ? &node : nullptr),
            fault.code);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{kId, fault.point, fault.code}));
  EXPECT_EQ(trace.records().back().code, fault.code);
  EXPECT_TRUE(sameBytes(node, before));
}

INSTANTIATE_TEST_SUITE_P(Rows, NextDataBufferFault, ::testing::ValuesIn(kFaults),
                         kRowName);

TEST(PlaceholderOperation, IsNeverSupported)
{
  StreamReader reader(Bytes(64));
  EXPECT_EQ(tavPlaceholderOp(0, reader.handle(), nullptr, nullptr), TAV_RC_NOT_SUPPORTED);
  EXPECT_EQ(tavPlaceholderOp(7, nullptr, nullptr, nullptr), TAV_RC_NOT_SUPPORTED);
}

TEST(PlaceholderOperation, TracesItsArgumentsAndNoFailure)
{
  int first = 0;
  int second = 0;
  void* const pFirst = &first;
  void* const pSecond = &second;
  TAVHandle* const handle = nullptr;
  TraceLog trace;
  tavPlaceholderOp(3, handle, pFirst, pSecond);
  constexpr uint32_t id = probe::placeholderOp;
  EXPECT_THAT(trace.steps(), ElementsAre(Step{KOR_TRACE_ENTRY, id, 0}, Step{KOR_TRACE_VAR, id, 0},
                                         Step{KOR_TRACE_EXIT, id, 0}));
  EXPECT_THAT(trace.dump(id, 0).items,
              ElementsAre(bytesOf(uint64_t{3}), bytesOf(handle), bytesOf(pFirst), bytesOf(pSecond)));
  EXPECT_EQ(trace.records().back().code, TAV_RC_NOT_SUPPORTED);
}

} // namespace
