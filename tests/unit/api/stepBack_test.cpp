#include <algorithm>
#include <cstdint>
#include <memory>
#include <utility>
#include <vector>

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

constexpr uint32_t kId = probe::getPrevNode;
constexpr uint32_t kRefused = 0x90000035;

TAVHeaderData at(uint64_t offset, bool wide = true)
{
  TAVHeaderData node{};
  node.header = wide ? header64(0, TAV_TYPE_BINARY, 1, 0, offset) : header32(0, TAV_TYPE_BINARY, 1, offset);
  return node;
}

class PreviousNode : public ::testing::TestWithParam<Form>
{
protected:
  uint32_t before(TAVHeaderData reference)
  {
    if (reader == nullptr)
    {
      reader = std::make_unique<StreamReader>(rows.bytes, GetParam());
    }
    out = untouched();
    trace.clear();
    return tavGetPrevNode(0, reader->handle(), &reference, &out);
  }
  void reverseBytes(ptrdiff_t from, ptrdiff_t length)
  {
    std::reverse(rows.bytes.begin() + from, rows.bytes.begin() + from + length);
  }
  [[nodiscard]] std::vector<Failure> failures() const { return trace.failuresOf(kId); }
  static std::vector<Failure> one(uint32_t point, uint32_t code) { return {{kId, point, code}}; }

  ByteRows rows{GetParam().swap};
  std::unique_ptr<StreamReader> reader;
  TAVHeaderData out = untouched();
  TraceLog trace;
};

TEST_P(PreviousNode, IsTheElementWhosePairEndsAtTheReference)
{
  rows.fill(7).h64(4, TAV_INFO_EYE_SIZE, TAV_TYPE_UINT32, 5).data(hex("01 02 03 04")).pair(20); // at 7
  rows.h64(0, 0, TAV_TYPE_HEADER64, 6);                                                         // at 43
  ASSERT_EQ(before(at(43)), TAV_RC_OK);
  EXPECT_EQ(out.header.nodeOffset, 7U);
  EXPECT_EQ(out.header.hdrType, TAV_HDR_64);
  EXPECT_EQ(out.header.hdr64.elm, 5U);
  EXPECT_EQ(payloadOf(out, 4), hex("01 02 03 04"));
}

TEST_P(PreviousNode, IsTheGroupThatAnEndElementLeadsTo)
{
  rows.h64(32, TAV_INFO_EYE_SIZE, TAV_TYPE_HEADER64, 5).end64(32).h64(0, 0, TAV_TYPE_HEADER64, 6);
  ASSERT_EQ(before(at(48)), TAV_RC_OK);
  EXPECT_EQ(out.header.nodeOffset, 0U);
  EXPECT_EQ(out.header.hdr64.elm, 5U);
  EXPECT_EQ(out.pDataBuf, nullptr);
}

TEST_P(PreviousNode, IsReadWithANarrowHeaderForANarrowReference)
{
  rows.h32(4, TAV_TYPE_UINT32, 5).data(hex("01 02 03 04")).pair(12).h32(0, TAV_TYPE_HEADER32, 6);
  ASSERT_EQ(before(at(28, false)), TAV_RC_OK);
  EXPECT_EQ(out.header.hdrType, TAV_HDR_32);
  EXPECT_EQ(out.header.hdr32.elm, 5U);
}

TEST_P(PreviousNode, MayStandBeforeTheEndOfTheStream)
{
  rows.h64(0, TAV_INFO_EYE_SIZE, TAV_TYPE_BINARY, 5).pair(16);
  ASSERT_EQ(before(at(32)), TAV_RC_OK);
  EXPECT_EQ(out.header.hdr64.elm, 5U);
}

TEST_P(PreviousNode, TakesOnlyThePlaceFromTheReference)
{
  rows.h64(0, TAV_INFO_EYE_SIZE, TAV_TYPE_BINARY, 5).pair(16).fill(16);
  TAVHeaderData reference = untouched();
  reference.header.nodeOffset = 32;
  reference.header.hdrType = TAV_HDR_64;
  EXPECT_EQ(before(reference), TAV_RC_OK);
}

TEST_P(PreviousNode, IsNotFoundWithoutAnEyeCatcher)
{
  rows.h64(16, 0, TAV_TYPE_BINARY, 5).fill(16, 0x33);
  EXPECT_EQ(before(at(32)), TAV_RC_NOT_FOUND);
  EXPECT_EQ(failures(), one(60, TAV_RC_NOT_FOUND));
  EXPECT_TRUE(sameBytes(out, untouched()));
  EXPECT_THAT(trace.recordsOf(probe::readNode), IsEmpty());
}

TEST_P(PreviousNode, IsNotFoundWhenOneByteOfTheEyeCatcherIsOff)
{
  rows.h64(0, TAV_INFO_EYE_SIZE, TAV_TYPE_BINARY, 5).pair(16);
  for (size_t i = 16; i < 24; ++i)
  {
    rows.bytes[i] ^= 1;
    reader.reset();
    EXPECT_EQ(before(at(32)), TAV_RC_NOT_FOUND) << i;
    rows.bytes[i] ^= 1;
  }
}

TEST_P(PreviousNode, PairInTheOtherByteOrderDoesNotLeadBackwards)
{
  rows.h64(0, TAV_INFO_EYE_SIZE, TAV_TYPE_BINARY, 5).pair(16);
  reverseBytes(16, 8);
  reverseBytes(24, 8);
  EXPECT_EQ(before(at(32)), TAV_RC_NOT_FOUND);
  EXPECT_EQ(failures(), one(60, TAV_RC_NOT_FOUND));
}

TEST_P(PreviousNode, OfTheFirstNodeLiesOutsideTheStream)
{
  rows.h64(0, TAV_INFO_EYE_SIZE, TAV_TYPE_BINARY, 5).pair(16);
  for (uint64_t offset = 0; offset < 16; ++offset)
  {
    EXPECT_EQ(before(at(offset)), TAV_RC_NO_MEMORY) << offset;
    EXPECT_EQ(failures(), one(50, TAV_RC_NO_MEMORY));
    EXPECT_THAT(trace.recordsOf(probe::cbGetChunk), IsEmpty()) << "nothing to fetch";
  }
  EXPECT_EQ(before(at(16)), TAV_RC_NOT_FOUND);
}

TEST_P(PreviousNode, OfAReferenceBehindTheStreamHasNoPair)
{
  rows.h64(0, TAV_INFO_EYE_SIZE, TAV_TYPE_BINARY, 5).pair(16);
  const uint32_t expected = GetParam().buffered ? TAV_RC_END_OF_STORAGE : TAV_RC_NO_MEMORY;
  for (const uint64_t offset : {uint64_t{33}, uint64_t{48}, uint64_t{49}, ~uint64_t{0}})
  {
    EXPECT_EQ(before(at(offset)), expected) << offset;
    EXPECT_EQ(failures(), one(50, expected));
  }
}

TEST_P(PreviousNode, ThatWouldLieBeforeTheStreamIsAnsweredBeforeAnyRead)
{
  for (const uint64_t distance : {uint64_t{17}, ~uint64_t{0}, ~uint64_t{0} - 15})
  {
    rows.bytes.clear();
    reader.reset();
    rows.h64(0, TAV_INFO_EYE_SIZE, TAV_TYPE_BINARY, 5).pair(distance);
    EXPECT_EQ(before(at(32)), TAV_RC_NO_MEMORY);
    EXPECT_EQ(failures(), one(70, TAV_RC_NO_MEMORY));
    EXPECT_THAT(trace.recordsOf(probe::readNode), IsEmpty());
  }
}

TEST_P(PreviousNode, PassesTheReadersCodeOn)
{
  rows.h64(999, TAV_INFO_EYE_SIZE, TAV_TYPE_BINARY, 5).pair(16);
  EXPECT_EQ(before(at(32)), TAV_RC_DATA_TOO_LARGE);
  EXPECT_EQ(failures(), one(70, TAV_RC_DATA_TOO_LARGE));
}

TEST_P(PreviousNode, WithADistanceOf0IsWhatThePairItselfReadsAs)
{
  rows.fill(16).pair(0).fill(4);
  EXPECT_EQ(before(at(32)), TAV_RC_DATA_TOO_LARGE) << "the eye catcher taken for a size";
}

TEST_P(PreviousNode, MayBePutWhereTheReferenceIs)
{
  rows.h64(0, TAV_INFO_EYE_SIZE, TAV_TYPE_BINARY, 5).pair(16).h64(0, TAV_INFO_EYE_SIZE, TAV_TYPE_BINARY, 6).pair(16);
  StreamReader both(rows.bytes, GetParam());
  TAVHeaderData node = at(64);
  ASSERT_EQ(tavGetPrevNode(0, both.handle(), &node, &node), TAV_RC_OK);
  EXPECT_EQ(node.header.hdr64.elm, 6U);
  ASSERT_EQ(tavGetPrevNode(0, both.handle(), &node, &node), TAV_RC_OK);
  EXPECT_EQ(node.header.hdr64.elm, 5U);
  EXPECT_EQ(tavGetPrevNode(0, both.handle(), &node, &node), TAV_RC_NO_MEMORY);
}

TEST_P(PreviousNode, DoesNotAskForAHandleForReading)
{
  StreamWriter writer(GetParam());
  writer.add(group64(1));
  writer.add(u32(2, 7, true, TAV_INFO_EYE_SIZE));
  const TAVHeader third = writer.add(u32(3, 8));
  TAVHeaderData reference = at(third.nodeOffset);
  ASSERT_EQ(tavGetPrevNode(0, writer.handle(), &reference, &out), GetParam().align ? TAV_RC_NOT_FOUND : TAV_RC_OK);
  EXPECT_EQ(out.header.hdr64.elm, 2U);
}

TEST_P(PreviousNode, TracesEntryArgumentsResultAndExit)
{
  rows.h64(0, TAV_INFO_EYE_SIZE, TAV_TYPE_BINARY, 5).pair(16);
  const TAVHeaderData reference = at(32);
  ASSERT_EQ(before(reference), TAV_RC_OK);
  EXPECT_THAT(trace.stepsOf(kId), ElementsAre(Step{KOR_TRACE_ENTRY, kId, 0}, Step{KOR_TRACE_VAR, kId, 0},
                                              Step{KOR_TRACE_VAR, kId, 100}, Step{KOR_TRACE_EXIT, kId, 0}));
  EXPECT_THAT(trace.dump(kId, 0).items,
              ElementsAre(bytesOf(uint64_t{0}), bytesOf(reader->handle()), bytesOf(reference), bytesOf(&out)));
  EXPECT_THAT(trace.dump(kId, 100).items, ElementsAre(bytesOf(out)));
  EXPECT_EQ(trace.recordsOf(kId).back().code, TAV_RC_OK);
}

INSTANTIATE_TEST_SUITE_P(Forms, PreviousNode, ::testing::ValuesIn(accessAndOrder()), kFormName);

TEST(PreviousNodeOverMemory, NeedsTheBlock)
{
  StreamReader reader(Bytes(64));
  reader.handle()->pDirectData = nullptr;
  TAVHeaderData reference = at(32);
  TAVHeaderData out = untouched();
  TraceLog trace;
  EXPECT_EQ(tavGetPrevNode(0, reader.handle(), &reference, &out), TAV_RC_NO_MEMORY);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{kId, 50, TAV_RC_NO_MEMORY}));
}

TEST(PreviousNodeOverMemory, CountsFromTheBlocksOffset)
{
  StreamReader reader(ByteRows().h64(0, TAV_INFO_EYE_SIZE, TAV_TYPE_BINARY, 5).pair(16).fill(100).bytes);
  reader.handle()->curOffset = 50;
  TAVHeaderData out = untouched();
  TAVHeaderData reference = at(82);
  EXPECT_EQ(tavGetPrevNode(0, reader.handle(), &reference, &out), TAV_RC_OK);
  EXPECT_EQ(out.header.nodeOffset, 50U);
  EXPECT_EQ(out.header.hdr64.elm, 5U);
  reference = at(65);
  TraceLog trace;
  EXPECT_EQ(tavGetPrevNode(0, reader.handle(), &reference, &out), TAV_RC_NO_MEMORY) << "the pair begins before";
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{kId, 50, TAV_RC_NO_MEMORY}));
}

TEST(PreviousNodeThroughARing, NeedsTheRingBeforeAnythingElse)
{
  StreamReader reader(Bytes(64), onePage());
  TAVCircularBuf* const ring = std::exchange(reader.handle()->pCircularBuf, nullptr);
  for (const uint64_t offset : {0U, 32U})
  {
    TAVHeaderData reference = at(offset);
    TAVHeaderData out = untouched();
    TraceLog trace;
    EXPECT_EQ(tavGetPrevNode(0, reader.handle(), &reference, &out), TAV_RC_NO_CIRCULAR_BUF);
    EXPECT_THAT(trace.failures(), ElementsAre(Failure{kId, 50, TAV_RC_NO_CIRCULAR_BUF}));
  }
  reader.handle()->pCircularBuf = ring;
}

TEST(PreviousNodeThroughARing, CompletesAPairThatPagesCut)
{
  for (uint64_t before = 0; before < 16; ++before)
  {
    StreamReader reader(
        ByteRows().fill(before).h64(0, TAV_INFO_EYE_SIZE, TAV_TYPE_BINARY, 5).pair(16).fill(20).bytes, onePage());
    TAVHeaderData out = untouched();
    ASSERT_EQ(tavReadNodeInt(0, reader.handle(), 0, false, &out), TAV_RC_OK); // where the pages begin
    TAVHeaderData reference = at(before + 32);
    ASSERT_EQ(tavGetPrevNode(0, reader.handle(), &reference, &out), TAV_RC_OK) << before;
    EXPECT_EQ(out.header.nodeOffset, before);
    EXPECT_EQ(out.header.hdr64.elm, 5U);
  }
}

TEST(PreviousNodeThroughARing, PassesTheCodesOfBothFetchesOn)
{
  const std::pair<uint64_t, uint32_t> rows[] = {{1, 50}, {2, 50}, {3, 70}, {4, 70}};
  for (const auto& [nth, point] : rows)
  {
    StreamReader reader(ByteRows().h64(0, TAV_INFO_EYE_SIZE, TAV_TYPE_BINARY, 5).pair(16).bytes, onePage());
    reader.vectorStorage().failAt(nth, kRefused);
    TAVHeaderData reference = at(32);
    TAVHeaderData out = untouched();
    TraceLog trace;
    EXPECT_EQ(tavGetPrevNode(0, reader.handle(), &reference, &out), kRefused) << nth;
    EXPECT_THAT(trace.failuresOf(kId), ElementsAre(Failure{kId, point, kRefused}));
  }
}

struct Fault : Row
{
  bool handle;
  bool reference;
  bool out;
  uint64_t options;
  uint32_t point;
  uint32_t code;
};

/// Each row has the faults of all later rows, too: the first one gives code and point.
const Fault kFaults[] = {
    {"Handle", false, false, false, 1, 10, TAV_RC_BAD_PARAM},
    {"Reference", true, false, false, 1, 20, TAV_RC_BAD_PARAM},
    {"Descriptor", true, true, false, 1, 30, TAV_RC_BAD_PARAM},
    {"Options", true, true, true, 1, 40, TAV_RC_BAD_OPTIONS},
    {"HighOptions", true, true, true, uint64_t{1} << 63, 40, TAV_RC_BAD_OPTIONS},
};

class PreviousNodeFault : public ::testing::TestWithParam<Fault>
{
};

TEST_P(PreviousNodeFault, IsFoundInTheOrderOfTheArguments)
{
  const Fault& fault = GetParam();
  StreamReader reader(Bytes(64));
  TAVHeaderData reference = at(0);
  TAVHeaderData out = untouched();
  TraceLog trace;
  EXPECT_EQ(tavGetPrevNode(fault.options, fault.handle ? reader.handle() : nullptr,
                           fault.reference ? &reference : nullptr, fault.out ? &out : nullptr),
            fault.code);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{kId, fault.point, fault.code}));
  EXPECT_EQ(trace.records().back().code, fault.code);
  EXPECT_TRUE(sameBytes(out, untouched()));
}

INSTANTIATE_TEST_SUITE_P(Rows, PreviousNodeFault, ::testing::ValuesIn(kFaults),
                         kRowName);

} // namespace
