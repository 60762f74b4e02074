#include <cstdint>
#include <memory>
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

constexpr uint64_t kAfter = 0x4;
constexpr uint32_t kId = probe::findNodeFromIndex;

/// The points of the dumps that tell why a group was or was not taken.
std::vector<uint32_t> decisions(const TraceLog& trace)
{
  std::vector<uint32_t> points;
  for (const Record& record : trace.recordsOf(kId))
  {
    if (record.kind == KOR_TRACE_VAR && record.point > 100)
    {
      points.push_back(record.point);
    }
  }
  return points;
}

class NodeFromIndex : public ::testing::TestWithParam<Form>
{
protected:
  /// Finds in what `rows` holds; a byte is added so that a block, too, shows a pair at the end.
  uint32_t find(uint64_t options, uint64_t index, uint64_t length = 0)
  {
    Bytes bytes = rows.bytes;
    bytes.push_back(0);
    reader = std::make_unique<StreamReader>(bytes, GetParam());
    out = untouched();
    trace.clear();
    return tavFindNodeFromIndex(options, reader->handle(), index, length, &out);
  }
  /// An element of 8 bytes of data with its pair: 40 bytes.
  uint64_t addElement(uint16_t elm, uint64_t distance = 24)
  {
    const uint64_t offset = rows.at();
    rows.h64(8, TAV_INFO_EYE_SIZE, TAV_TYPE_UINT64, elm).fill(8, 0x11).pair(distance);
    return offset;
  }
  /// A group with one 16-byte element that holds a pair, as its end element does.
  uint64_t addGroup(uint64_t size, uint64_t trailerSize, uint16_t trailerElm, uint64_t distance)
  {
    const uint64_t offset = rows.at();
    rows.h64(size, 0, TAV_TYPE_HEADER64, 0x77).h64(trailerSize, 0, TAV_TYPE_BINARY, trailerElm).pair(distance);
    return offset;
  }
  [[nodiscard]] std::vector<Failure> failures() const { return trace.failuresOf(kId); }

  ByteRows rows{GetParam().swap};
  std::unique_ptr<StreamReader> reader;
  TAVHeaderData out = untouched();
  TraceLog trace;
};

TEST_P(NodeFromIndex, ReadsAWideNodeAtTheIndex)
{
  rows.fill(7).h64(4, 9, TAV_TYPE_UINT32, 5).data(hex("01 02 03 04"));
  for (const uint64_t options : {0x1U, 0x5U})
  {
    ASSERT_EQ(find(options, 7), TAV_RC_OK);
    EXPECT_EQ(out.header.hdrType, TAV_HDR_64);
    EXPECT_EQ(out.header.hdr64.elm, 5U);
    EXPECT_EQ(out.header.nodeOffset, 7U);
    EXPECT_EQ(payloadOf(out, 4), hex("01 02 03 04"));
  }
}

TEST_P(NodeFromIndex, ReadsANarrowNodeAtTheIndex)
{
  rows.fill(7).h32(4, TAV_TYPE_UINT32, 5).data(hex("01 02 03 04"));
  for (const uint64_t options : {0x2U, 0x6U})
  {
    ASSERT_EQ(find(options, 7), TAV_RC_OK);
    EXPECT_EQ(out.header.hdrType, TAV_HDR_32);
    EXPECT_EQ(out.header.hdr32.elm, 5U);
    EXPECT_EQ(payloadOf(out, 4), hex("01 02 03 04"));
  }
}

TEST_P(NodeFromIndex, PassesTheReadersCodeOnWhenItReadsAtTheIndex)
{
  rows.h64(400, 9, TAV_TYPE_UINT32, 5);
  EXPECT_EQ(find(0x1, 0), TAV_RC_DATA_TOO_LARGE);
  EXPECT_THAT(failures(), ElementsAre(Failure{kId, 50, TAV_RC_DATA_TOO_LARGE}));
}

TEST_P(NodeFromIndex, GivesTheNodeThatEndsAtTheNextEyeCatcher)
{
  addElement(1);
  const uint64_t second = addElement(2);
  const uint64_t third = addElement(3);
  for (uint64_t index = 0; index <= 24; ++index)
  {
    ASSERT_EQ(find(0, index), TAV_RC_OK) << index;
    EXPECT_EQ(out.header.hdr64.elm, 1U) << index;
    EXPECT_EQ(out.header.nodeOffset, 0U);
  }
  for (uint64_t index = 25; index <= 64; ++index)
  {
    ASSERT_EQ(find(0, index), TAV_RC_OK) << index;
    EXPECT_EQ(out.header.hdr64.elm, 2U) << index;
    EXPECT_EQ(out.header.nodeOffset, second);
  }
  ASSERT_EQ(find(0, 65), TAV_RC_OK);
  EXPECT_EQ(out.header.nodeOffset, third);
}

TEST_P(NodeFromIndex, GivesTheNodeBeforeAPairAndNotTheOneThatHoldsTheIndex)
{
  addElement(1);
  rows.h64(8, 0, TAV_TYPE_UINT64, 2).fill(8); // no pair: cannot be found
  addElement(3);
  ASSERT_EQ(find(0, 41), TAV_RC_OK);
  EXPECT_EQ(out.header.hdr64.elm, 3U);
}

TEST_P(NodeFromIndex, GivesTheDataOfTheNode)
{
  rows.h64(3, TAV_INFO_EYE_SIZE, TAV_TYPE_BINARY, 1).data(hex("0A 0B 0C")).pair(19);
  ASSERT_EQ(find(0, 0), TAV_RC_OK);
  EXPECT_EQ(payloadOf(out, 3), hex("0A 0B 0C"));
  EXPECT_EQ(out.header.hdr64.size, 3U);
}

TEST_P(NodeFromIndex, ScansToTheEndWithoutALength)
{
  rows.fill(1000, 0x22);
  const uint64_t offset = addElement(9);
  ASSERT_EQ(find(0, 0), TAV_RC_OK);
  EXPECT_EQ(out.header.nodeOffset, offset);
}

TEST_P(NodeFromIndex, ScansNoFurtherThanTheLength)
{
  addElement(1);
  EXPECT_EQ(find(0, 0, 31), TAV_RC_NOT_FOUND);
  EXPECT_EQ(find(0, 0, 32), TAV_RC_OK);
  EXPECT_EQ(find(0, 20, 11), TAV_RC_NOT_FOUND);
  EXPECT_EQ(find(0, 20, 12), TAV_RC_OK);
}

TEST_P(NodeFromIndex, TakesALengthThatPasses64BitsForTheRestOfTheStream)
{
  addElement(1);
  EXPECT_EQ(find(0, 10, ~uint64_t{0}), TAV_RC_OK);
  EXPECT_EQ(out.header.nodeOffset, 0U);
}

TEST_P(NodeFromIndex, FindsNothingBehindTheLastPair)
{
  addElement(1);
  EXPECT_EQ(find(0, 25), TAV_RC_NOT_FOUND);
  EXPECT_EQ(failures().size(), 2U) << "the scan's own code, and the result";
  EXPECT_EQ(failures().front().point, 70U);
  EXPECT_EQ(failures().front().code, GetParam().buffered ? TAV_RC_END_OF_STORAGE : TAV_RC_NOT_FOUND);
  EXPECT_EQ(failures().back(), (Failure{kId, 60, TAV_RC_NOT_FOUND}));
}

TEST_P(NodeFromIndex, FindsNothingFromTheLastOffsetOn)
{
  addElement(1);
  EXPECT_EQ(find(0, ~uint64_t{0}), TAV_RC_NOT_FOUND);
  EXPECT_THAT(failures(), ElementsAre(Failure{kId, 60, TAV_RC_NOT_FOUND})) << "there is nothing to scan";
}

TEST_P(NodeFromIndex, HidesTheScansCodeForAnIndexBeyondTheStream)
{
  addElement(1);
  EXPECT_EQ(find(0, 5000), TAV_RC_NOT_FOUND);
}

TEST_P(NodeFromIndex, TakesAnElementWhoseSizeDoesNotFitTheDistance)
{
  rows.h64(3, TAV_INFO_EYE_SIZE, TAV_TYPE_BINARY, 1).fill(8).pair(24);
  ASSERT_EQ(find(0, 0), TAV_RC_OK);
  EXPECT_EQ(out.header.hdr64.size, 3U);
}

TEST_P(NodeFromIndex, FollowsAPairInTheOtherByteOrder)
{
  ByteRows other(!GetParam().swap);
  other.pair(24);
  rows.h64(8, TAV_INFO_EYE_SIZE, TAV_TYPE_UINT64, 6).fill(8).data(other.bytes);
  ASSERT_EQ(find(0, 0), TAV_RC_OK);
  EXPECT_EQ(out.header.hdr64.elm, 6U);
}

TEST_P(NodeFromIndex, GivesUpWhenThePairLeadsBeforeTheStream)
{
  addElement(1, 25);
  addElement(2);
  EXPECT_EQ(find(0, 0), TAV_RC_NOT_FOUND);
  EXPECT_THAT(failures(), ElementsAre(Failure{kId, 60, TAV_RC_NOT_FOUND}));
}

TEST_P(NodeFromIndex, GivesUpWhenTheNodeCannotBeReadThoughALaterPairWouldDo)
{
  rows.h64(4000, TAV_INFO_EYE_SIZE, TAV_TYPE_UINT64, 1).fill(8).pair(24);
  addElement(2);
  EXPECT_EQ(find(0, 0), TAV_RC_NOT_FOUND);
  EXPECT_EQ(find(0, 25), TAV_RC_OK);
}

TEST_P(NodeFromIndex, TakesAGroupThatItsEndElementFits)
{
  const uint64_t offset = addGroup(32, 16, TAV_ELM_CMN_END_HDR_EYE_SIZE, 32);
  ASSERT_EQ(find(0, 0), TAV_RC_OK);
  EXPECT_EQ(out.header.nodeOffset, offset);
  EXPECT_EQ(out.header.hdr64.elm, 0x77U);
  EXPECT_EQ(out.pDataBuf, nullptr);
  EXPECT_THAT(decisions(trace), IsEmpty());
}

TEST_P(NodeFromIndex, TakesAGroupOfUnknownSizeThatAnEndElementLeadsTo)
{
  addGroup(TAV_SIZE_UNKNOWN, 16, TAV_ELM_CMN_END_HDR_EYE_SIZE, 32);
  ASSERT_EQ(find(0, 0), TAV_RC_OK);
  EXPECT_EQ(out.header.hdr64.size, TAV_SIZE_UNKNOWN);
}

TEST_P(NodeFromIndex, PassesOverAGroupThatItsEndElementDoesNotFit)
{
  for (const uint64_t size : {31U, 33U})
  {
    rows.bytes.clear();
    addGroup(size, 16, TAV_ELM_CMN_END_HDR_EYE_SIZE, 32);
    const uint64_t next = addElement(2);
    ASSERT_EQ(find(0, 0), TAV_RC_OK);
    EXPECT_EQ(out.header.nodeOffset, next);
    EXPECT_THAT(decisions(trace), ElementsAre(230));
  }
}

TEST_P(NodeFromIndex, TakesAGroupThatIsLargeEnoughForItsEyeSizeElement)
{
  for (const uint64_t size : {uint64_t{32}, uint64_t{33}, TAV_SIZE_UNKNOWN})
  {
    rows.bytes.clear();
    addGroup(size, 16, TAV_ELM_CMN_EYE_SIZE, 32);
    ASSERT_EQ(find(0, 0), TAV_RC_OK);
    EXPECT_EQ(out.header.hdr64.elm, 0x77U);
    EXPECT_THAT(decisions(trace), IsEmpty());
  }
}

TEST_P(NodeFromIndex, PassesOverAGroupThatIsTooSmallForItsEyeSizeElement)
{
  addGroup(31, 16, TAV_ELM_CMN_EYE_SIZE, 32);
  EXPECT_EQ(find(0, 0), TAV_RC_NOT_FOUND);
  EXPECT_THAT(decisions(trace), ElementsAre(220));
}

TEST_P(NodeFromIndex, PassesOverAGroupWhosePairStandsInAnElementOfAnotherSize)
{
  for (const uint16_t elm : {TAV_ELM_CMN_EYE_SIZE, TAV_ELM_CMN_END_HDR_EYE_SIZE, uint16_t{5}})
  {
    rows.bytes.clear();
    addGroup(32, 15, elm, 32);
    const uint64_t next = addElement(2);
    ASSERT_EQ(find(0, 0), TAV_RC_OK);
    EXPECT_EQ(out.header.nodeOffset, next);
    EXPECT_THAT(decisions(trace), ElementsAre(200));
  }
}

TEST_P(NodeFromIndex, TakesAGroupThatAnyOtherElementOf16BytesLeadsTo)
{
  addGroup(1, 16, 5, 32);
  ASSERT_EQ(find(0, 0), TAV_RC_OK);
  EXPECT_EQ(out.header.hdr64.elm, 0x77U);
  EXPECT_THAT(decisions(trace), ElementsAre(240));
}

TEST_P(NodeFromIndex, TakesAGroupBeforeWhosePairNoElementCanBeRead)
{
  addGroup(1, 0x7FFFFFFF, 5, 32);
  ASSERT_EQ(find(0, 0), TAV_RC_OK);
  EXPECT_EQ(out.header.hdr64.elm, 0x77U);
  EXPECT_THAT(decisions(trace), ElementsAre(240));
}

TEST_P(NodeFromIndex, TakesAGroupWhosePairIsItsWholeContent)
{
  rows.h64(1, 0, TAV_TYPE_HEADER64, 0x77).pair(16); // the group's header is taken for the element: no size of 16
  EXPECT_EQ(find(0, 0), TAV_RC_NOT_FOUND);
  EXPECT_THAT(decisions(trace), ElementsAre(200));
  rows.bytes.clear();
  rows.h64(16, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_END_HDR_EYE_SIZE).pair(16);
  EXPECT_EQ(find(0, 0), TAV_RC_OK);
}

TEST_P(NodeFromIndex, GivesTheNodeRightAfterThePair)
{
  addElement(1);
  const uint64_t second = addElement(2);
  rows.h64(3, 0, TAV_TYPE_BINARY, 3).data(hex("07 08 09"));
  ASSERT_EQ(find(kAfter, 0), TAV_RC_OK);
  EXPECT_EQ(out.header.nodeOffset, second);
  ASSERT_EQ(find(kAfter, 25), TAV_RC_OK);
  EXPECT_EQ(out.header.nodeOffset, 80U);
  EXPECT_EQ(payloadOf(out, 3), hex("07 08 09"));
}

TEST_P(NodeFromIndex, DoesNotFollowTheDistanceOnTheWayToTheNodeAfter)
{
  rows.fill(3).pair(~uint64_t{0}).h64(0, 0, TAV_TYPE_HEADER64, 4);
  ASSERT_EQ(find(kAfter, 0), TAV_RC_OK);
  EXPECT_EQ(out.header.hdr64.elm, 4U);
  EXPECT_EQ(out.header.nodeOffset, 19U);
}

TEST_P(NodeFromIndex, GoesOnWhenTheNodeAfterAPairCannotBeRead)
{
  rows.pair(0).h64(5000, 0, TAV_TYPE_BINARY, 1).pair(0).h64(0, 0, TAV_TYPE_HEADER64, 2);
  ASSERT_EQ(find(kAfter, 0), TAV_RC_OK);
  EXPECT_EQ(out.header.hdr64.elm, 2U);
}

TEST_P(NodeFromIndex, FindsNoNodeAfterTheLastPair)
{
  addElement(1);
  EXPECT_EQ(find(kAfter, 0), TAV_RC_NOT_FOUND);
}

TEST_P(NodeFromIndex, LimitsTheEyeCatcherAndNotTheNodeAfterIt)
{
  addElement(1);
  addElement(2);
  EXPECT_EQ(find(kAfter, 0, 31), TAV_RC_NOT_FOUND);
  EXPECT_EQ(find(kAfter, 0, 32), TAV_RC_OK);
}

TEST_P(NodeFromIndex, ReadsNodesWithoutOptions)
{
  addGroup(32, 16, TAV_ELM_CMN_END_HDR_EYE_SIZE, 32);
  ASSERT_EQ(find(0, 0), TAV_RC_OK);
  uint64_t reads = 0;
  for (const Record& record : trace.recordsOf(probe::readNode))
  {
    if (record.kind != KOR_TRACE_VAR || record.point != 0)
    {
      continue;
    }
    ++reads;
    EXPECT_EQ(record.items.at(0), bytesOf(uint64_t{0}));
  }
  EXPECT_GE(reads, 2U) << "the group, and the element that holds its pair";
}

TEST_P(NodeFromIndex, TracesEntryArgumentsResultAndExit)
{
  addElement(1);
  ASSERT_EQ(find(0, 3, 77), TAV_RC_OK);
  EXPECT_THAT(trace.stepsOf(kId), ElementsAre(Step{KOR_TRACE_ENTRY, kId, 0}, Step{KOR_TRACE_VAR, kId, 0},
                                              Step{KOR_TRACE_VAR, kId, 100}, Step{KOR_TRACE_EXIT, kId, 0}));
  EXPECT_THAT(trace.dump(kId, 0).items, ElementsAre(bytesOf(uint64_t{0}), bytesOf(reader->handle()),
                                                    bytesOf(uint64_t{3}), bytesOf(uint64_t{77}), bytesOf(&out)));
  EXPECT_THAT(trace.dump(kId, 100).items, ElementsAre(bytesOf(out)));
  EXPECT_EQ(trace.recordsOf(kId).back().code, TAV_RC_OK);
}

TEST_P(NodeFromIndex, PassesItsTrueOnToTheScan)
{
  addElement(1);
  ASSERT_EQ(find(0, 3, 77), TAV_RC_OK);
  EXPECT_EQ(trace.dump(probe::findEyeSizeCombo, 0).items.at(1), bytesOf(uint64_t{3}));
  EXPECT_EQ(trace.dump(probe::findEyeSizeCombo, 0).items.at(2), bytesOf(uint64_t{77}));
  EXPECT_EQ(trace.dump(probe::findEyeSizeCombo, 0).items.at(3), bytesOf(true));
}

INSTANTIATE_TEST_SUITE_P(Forms, NodeFromIndex, ::testing::ValuesIn(accessAndOrder()), kFormName);

struct Fault : Row
{
  bool handle;
  bool out;
  uint64_t options;
  bool forReading;
  uint32_t point;
  uint32_t code;
};

/// Each row has the faults of all later rows, too: the first one gives code and point.
const Fault kFaults[] = {
    {"Handle", false, false, 8, false, 10, TAV_RC_BAD_PARAM},
    {"Descriptor", true, false, 8, false, 20, TAV_RC_BAD_PARAM},
    {"Options", true, true, 8, false, 30, TAV_RC_BAD_OPTIONS},
    {"BothWidths", true, true, 3, false, 30, TAV_RC_BAD_OPTIONS},
    {"BothWidthsAndAfter", true, true, 7, false, 30, TAV_RC_BAD_OPTIONS},
    {"HighOptions", true, true, uint64_t{1} << 63, false, 30, TAV_RC_BAD_OPTIONS},
    {"Mode", true, true, 0, false, 40, TAV_RC_WRONG_MODE},
};

class NodeFromIndexFault : public ::testing::TestWithParam<Fault>
{
};

TEST_P(NodeFromIndexFault, IsFoundInTheOrderOfTheArguments)
{
  const Fault& fault = GetParam();
  StreamWriter writer;
  writer.add(group64(1));
  TAVHeaderData out = untouched();
  TraceLog trace;
  EXPECT_EQ(tavFindNodeFromIndex(fault.options, fault.handle ? writer.handle() : nullptr, 0, 0,
                                 fault.out ? &out : nullptr),
            fault.code);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{kId, fault.point, fault.code}));
  EXPECT_EQ(trace.records().back().code, fault.code);
  EXPECT_TRUE(sameBytes(out, untouched()));
}

INSTANTIATE_TEST_SUITE_P(Rows, NodeFromIndexFault, ::testing::ValuesIn(kFaults),
                         kRowName);

} // namespace
