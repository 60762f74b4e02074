#include <cstdint>
#include <cstring>
#include <optional>
#include <ostream>
#include <string>
#include <vector>

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

constexpr uint16_t kGroup = 60100; // 0xEAC4

using CloseHeader = OverForms;
INSTANTIATE_TEST_SUITE_P(Forms, CloseHeader, ::testing::ValuesIn(allForms()), kFormName);

/// The rows of one form.
const char* pick(const Form& form, const char* little, const char* littleAligned, const char* big,
                 const char* bigAligned)
{
  if (isBigEndian(form))
  {
    return form.align ? bigAligned : big;
  }
  return form.align ? littleAligned : little;
}

TEST_P(CloseHeader, WritesTheSizeOfA64BitGroup)
{
  StreamWriter writer(GetParam());
  writer.add(group64(kRoot));
  writer.add(binary(kBlob, {0xAA}));
  const uint64_t before = writer.length();
  writer.close();
  EXPECT_EQ(writer.length(), before);
  EXPECT_EQ(writer.handle()->pHdrStack->count, 0U);
  EXPECT_EQ(toHex(writer.bytes()),
            rows(pick(GetParam(),
                      "11 00 00 00 00 00 00 00 00 00 00 00 02 00 14 00"
                      "01 00 00 00 00 00 00 00 00 00 00 00 65 00 61 EA AA",
                      "18 00 00 00 00 00 00 00 00 00 10 00 02 00 14 00"
                      "01 00 00 00 00 00 00 00 00 00 10 00 65 00 61 EA AA 00 00 00 00 00 00 00",
                      "00 00 00 00 00 00 00 11 00 00 00 00 00 02 00 14"
                      "00 00 00 00 00 00 00 01 00 00 00 00 00 65 EA 61 AA",
                      "00 00 00 00 00 00 00 18 00 10 00 00 00 02 00 14"
                      "00 00 00 00 00 00 00 01 00 10 00 00 00 65 EA 61 AA 00 00 00 00 00 00 00")));
}

TEST_P(CloseHeader, WritesTheSizesOfNested32BitGroups)
{
  StreamWriter writer(GetParam());
  writer.add(group32(kRoot));
  writer.add(group32(kGroup, 0xFFFFFFFF));
  writer.add(binary(kBlob, {0xAA}, false));
  writer.close();
  EXPECT_EQ(writer.handle()->pHdrStack->count, 1U);
  writer.close();
  EXPECT_EQ(toHex(writer.bytes()),
            rows(pick(GetParam(),
                      "11 00 00 00 01 00 14 00 09 00 00 00 01 00 C4 EA 01 00 00 00 65 00 61 EA AA",
                      "18 00 00 00 01 00 14 00 10 00 00 00 01 00 C4 EA 01 00 00 00 65 00 61 EA AA 00 00 00 00 00 00 00",
                      "00 00 00 11 00 01 00 14 00 00 00 09 00 01 EA C4 00 00 00 01 00 65 EA 61 AA",
                      "00 00 00 18 00 01 00 14 00 00 00 10 00 01 EA C4"
                      "00 00 00 01 00 65 EA 61 AA 00 00 00 00 00 00 00")));
}

TEST_P(CloseHeader, AppendsAn64BitEndElementToAGroupThatAsksForIt)
{
  StreamWriter writer(GetParam());
  writer.add(group64(kRoot, TAV_TYPE_HEADER64, TAV_INFO_EYE_SIZE));
  writer.add(binary(kBlob, {0xAA}));
  writer.close();
  EXPECT_EQ(writer.handle()->pHdrStack->count, 0U);
  EXPECT_EQ(toHex(writer.bytes()),
            rows(pick(GetParam(),
                      "31 00 00 00 00 00 00 00 00 00 40 00 02 00 14 00"
                      "01 00 00 00 00 00 00 00 00 00 00 00 65 00 61 EA AA"
                      "10 00 00 00 00 00 00 00 00 00 00 00 65 00 E9 FD ED 0D EC DD EE D5 DE C0 31 00 00 00 00 00 00 00",
                      "38 00 00 00 00 00 00 00 00 00 50 00 02 00 14 00"
                      "01 00 00 00 00 00 00 00 00 00 10 00 65 00 61 EA AA 00 00 00 00 00 00 00"
                      "10 00 00 00 00 00 00 00 00 00 10 00 65 00 E9 FD ED 0D EC DD EE D5 DE C0 38 00 00 00 00 00 00 00",
                      "00 00 00 00 00 00 00 31 00 40 00 00 00 02 00 14"
                      "00 00 00 00 00 00 00 01 00 00 00 00 00 65 EA 61 AA"
                      "00 00 00 00 00 00 00 10 00 00 00 00 00 65 FD E9 C0 DE D5 EE DD EC 0D ED 00 00 00 00 00 00 00 31",
                      "00 00 00 00 00 00 00 38 00 50 00 00 00 02 00 14"
                      "00 00 00 00 00 00 00 01 00 10 00 00 00 65 EA 61 AA 00 00 00 00 00 00 00"
                      "00 00 00 00 00 00 00 10 00 10 00 00 00 65 FD E9"
                      "C0 DE D5 EE DD EC 0D ED 00 00 00 00 00 00 00 38")));
}

TEST_P(CloseHeader, AppendsA32BitEndElementWhoseDistanceIs8ShortToAGroupOfType1)
{
  StreamWriter writer(GetParam());
  writer.add(group64(kRoot, TAV_TYPE_HEADER32, TAV_INFO_EYE_SIZE));
  writer.add(binary(kBlob, {0xAA}, false));
  writer.close();
  EXPECT_EQ(toHex(writer.bytes()),
            rows(pick(GetParam(),
                      "21 00 00 00 00 00 00 00 00 00 40 00 01 00 14 00"
                      "01 00 00 00 65 00 61 EA AA"
                      "10 00 00 00 65 00 E9 FD ED 0D EC DD EE D5 DE C0 19 00 00 00 00 00 00 00",
                      "28 00 00 00 00 00 00 00 00 00 50 00 01 00 14 00"
                      "01 00 00 00 65 00 61 EA AA 00 00 00 00 00 00 00"
                      "10 00 00 00 65 00 E9 FD ED 0D EC DD EE D5 DE C0 20 00 00 00 00 00 00 00",
                      "00 00 00 00 00 00 00 21 00 40 00 00 00 01 00 14"
                      "00 00 00 01 00 65 EA 61 AA"
                      "00 00 00 10 00 65 FD E9 C0 DE D5 EE DD EC 0D ED 00 00 00 00 00 00 00 19",
                      "00 00 00 00 00 00 00 28 00 50 00 00 00 01 00 14"
                      "00 00 00 01 00 65 EA 61 AA 00 00 00 00 00 00 00"
                      "00 00 00 10 00 65 FD E9 C0 DE D5 EE DD EC 0D ED 00 00 00 00 00 00 00 20")));
}

TEST_P(CloseHeader, LeavesAnEmptyGroupASizeOf0)
{
  StreamWriter writer(GetParam());
  writer.add(group64(kRoot));
  writer.close();
  EXPECT_EQ(writer.length(), 16U);
  const Bytes all = writer.bytes();
  EXPECT_EQ(Bytes(all.begin(), all.begin() + 8), Bytes(8, 0));
}

TEST_P(CloseHeader, CountsInAnEmptyGroupTheEndElementAlone)
{
  for (const uint16_t type : {TAV_TYPE_HEADER32, TAV_TYPE_HEADER64})
  {
    StreamWriter writer(GetParam());
    writer.add(group64(kRoot, type, TAV_INFO_EYE_SIZE));
    writer.close();
    const bool wide = type == TAV_TYPE_HEADER64;
    EXPECT_EQ(writer.length(), wide ? 16U + 32 : 16U + 24);
    const Bytes all = writer.bytes();
    const char* const size = pick(GetParam(), wide ? "20 00 00 00 00 00 00 00" : "18 00 00 00 00 00 00 00",
                                  wide ? "20 00 00 00 00 00 00 00" : "18 00 00 00 00 00 00 00",
                                  wide ? "00 00 00 00 00 00 00 20" : "00 00 00 00 00 00 00 18",
                                  wide ? "00 00 00 00 00 00 00 20" : "00 00 00 00 00 00 00 18");
    const char* const distance = pick(GetParam(), wide ? "20 00 00 00 00 00 00 00" : "10 00 00 00 00 00 00 00",
                                      wide ? "20 00 00 00 00 00 00 00" : "10 00 00 00 00 00 00 00",
                                      wide ? "00 00 00 00 00 00 00 20" : "00 00 00 00 00 00 00 10",
                                      wide ? "00 00 00 00 00 00 00 20" : "00 00 00 00 00 00 00 10");
    EXPECT_EQ(toHex({all.begin(), all.begin() + 8}), rows(size));
    EXPECT_EQ(toHex({all.end() - 8, all.end()}), rows(distance));
  }
}

TEST_P(CloseHeader, CountsTheEndElementOfAnInnerGroupInTheOuter)
{
  StreamWriter writer(GetParam());
  writer.add(group64(kRoot, TAV_TYPE_HEADER64, TAV_INFO_EYE_SIZE));
  writer.add(group64(kGroup, TAV_TYPE_HEADER64, TAV_INFO_EYE_SIZE));
  writer.close();
  writer.close();
  EXPECT_EQ(writer.length(), 96U);
  const Bytes all = writer.bytes();
  EXPECT_EQ(toHex({all.begin(), all.begin() + 8}),
            rows(isBigEndian(GetParam()) ? "00 00 00 00 00 00 00 50" : "50 00 00 00 00 00 00 00"));
  EXPECT_EQ(toHex({all.end() - 8, all.end()}),
            rows(isBigEndian(GetParam()) ? "00 00 00 00 00 00 00 50" : "50 00 00 00 00 00 00 00"));
}

TEST_P(CloseHeader, ReplacesTheSizeThatAGroupWasOpenedWith)
{
  StreamWriter writer(GetParam());
  writer.add(group64(kRoot, TAV_TYPE_HEADER64, 0, 0x1122334455667788));
  writer.close();
  const Bytes all = writer.bytes();
  EXPECT_EQ(Bytes(all.begin(), all.begin() + 8), Bytes(8, 0));
}

TEST_P(CloseHeader, AbandonsAGroupAsIfItHadNotBeenOpened)
{
  StreamWriter writer(GetParam());
  writer.add(group64(kRoot));
  const TAVHeader group = writer.add(group64(kGroup, TAV_TYPE_HEADER64, TAV_INFO_EYE_SIZE));
  writer.add(binary(kBlob, {1, 2, 3, 4, 5, 6, 7, 8}));
  writer.abandon();
  EXPECT_EQ(writer.length(), group.nodeOffset);
  EXPECT_EQ(writer.handle()->pHdrStack->count, 1U);
  EXPECT_EQ(writer.add(binary(kBlob, {9})).nodeOffset, group.nodeOffset);
}

/// A group whose header was overwritten since, and which is abandoned then: its header is `bytes`.
void expectSizePutBack(const Form& form, const Element& group, uint64_t headerBytes, const char* bytes)
{
  StreamWriter writer(form);
  writer.add(group);
  uint64_t position = 0;
  const Bytes other(headerBytes, 0xEE);
  check(writer.handle()->pCircularBuf != nullptr
            ? writer.handle()->pCircularBuf->write(position, other.data(), other.size(), false)
            : (std::copy(other.begin(), other.end(), writer.handle()->pDirectData), TAV_RC_OK),
        "write");
  writer.abandon();
  EXPECT_EQ(writer.length(), 0U);
  writer.handle()->streamBytes = headerBytes;
  EXPECT_EQ(toHex(writer.bytes()), rows(bytes));
}

TEST_P(CloseHeader, PutsTheOpeningSizeBackIntoAnAbandonedGroup)
{
  expectSizePutBack(GetParam(), group64(kRoot, TAV_TYPE_HEADER64, 0, 0x1122334455667788), 16,
                    isBigEndian(GetParam()) ? "11 22 33 44 55 66 77 88 EE EE EE EE EE EE EE EE"
                                            : "88 77 66 55 44 33 22 11 EE EE EE EE EE EE EE EE");
}

TEST_P(CloseHeader, PutsFourBytesOfSizeBackIntoAnAbandoned32BitGroup)
{
  expectSizePutBack(GetParam(), group32(kRoot, 0x11223344), 8,
                    isBigEndian(GetParam()) ? "11 22 33 44 EE EE EE EE" : "44 33 22 11 EE EE EE EE");
}

TEST_P(CloseHeader, AllowsAnotherRootBehindTheFirst)
{
  StreamWriter writer(GetParam());
  writer.add(group64(kRoot));
  writer.close();
  EXPECT_EQ(writer.add(group32(kRoot)).nodeOffset, 16U);
}

TEST(CloseHeaderSize, IsCutTo32BitsInANarrowHeaderAlone)
{
  struct Row
  {
    Element group;
    uint64_t headerBytes;
    const char* bytes;
  };
  for (const Row& row :
       {Row{group32(kRoot), 8, "07 00 00 00 01 00 14 00"}, Row{group64(kRoot), 16, "07 00 00 00 05 00 00 00"}})
  {
    StreamWriter writer(lowFirst());
    writer.add(row.group);
    writer.handle()->streamBytes = row.headerBytes + 0x500000007;
    EXPECT_EQ(tavCloseHeader(0, writer.handle()), TAV_RC_OK);
    EXPECT_EQ(toHex(Bytes(writer.handle()->pDirectData, writer.handle()->pDirectData + 8)), rows(row.bytes));
  }
}

TEST(CloseHeaderSize, StaysInTheEntryThatWasTakenOffTheStack)
{
  for (const bool traced : {false, true})
  {
    StreamWriter writer;
    writer.add(group64(kRoot));
    writer.add(u32(kRoot, 1));
    std::optional<TraceLog> trace;
    if (traced)
    {
      trace.emplace();
    }
    ASSERT_EQ(tavCloseHeader(0, writer.handle()), TAV_RC_OK);
    const TAVHdrStack& stack = *writer.handle()->pHdrStack;
    EXPECT_EQ(stack.count, 0U);
    EXPECT_EQ(stack.pEntries[0].hdr64.size, 20U) << "traced: " << traced;
  }
}

TEST(CloseHeaderChecks, RefuseANullHandleFirst)
{
  TraceLog trace;
  EXPECT_EQ(tavCloseHeader(2, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::closeHeader, 10, TAV_RC_BAD_PARAM}));
}

TEST(CloseHeaderChecks, RefuseAReadHandleBeforeTheOptions)
{
  StreamReader reader(Bytes(64));
  TraceLog trace;
  EXPECT_EQ(tavCloseHeader(2, reader.handle()), TAV_RC_WRONG_MODE);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::closeHeader, 20, TAV_RC_WRONG_MODE}));
}

TEST(CloseHeaderChecks, RefuseOptionsBeforeTheMissingGroup)
{
  StreamWriter writer;
  for (const uint64_t options : {uint64_t{2}, uint64_t{3}, uint64_t{1} << 32U})
  {
    TraceLog trace;
    EXPECT_EQ(tavCloseHeader(options, writer.handle()), TAV_RC_BAD_OPTIONS);
    EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::closeHeader, 30, TAV_RC_BAD_OPTIONS}));
  }
}

TEST(CloseHeaderChecks, RefuseOptionsWithAGroupOpen)
{
  StreamWriter writer;
  writer.add(group64(kRoot));
  EXPECT_EQ(tavCloseHeader(2, writer.handle()), TAV_RC_BAD_OPTIONS);
  EXPECT_EQ(writer.handle()->pHdrStack->count, 1U);
}

TEST(CloseHeaderChecks, RefuseToCloseOrAbandonWithNothingOpen)
{
  StreamWriter writer;
  writer.add(group64(kRoot));
  writer.close();
  for (const uint64_t options : {uint64_t{0}, uint64_t{1}})
  {
    TraceLog trace;
    EXPECT_EQ(tavCloseHeader(options, writer.handle()), TAV_RC_NOT_FOUND);
    EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::closeHeader, 40, TAV_RC_NOT_FOUND}));
    EXPECT_EQ(writer.length(), 16U);
  }
}

TEST(CloseHeaderChecks, RefuseAHandleWithoutHeaderStackAsOneWithNothingOpen)
{
  StreamWriter writer({}, 0x100, TAV_OPT_WRITE | TAV_OPT_NO_HDR_STACK);
  EXPECT_EQ(tavCloseHeader(0, writer.handle()), TAV_RC_NOT_FOUND);
}

TEST(CloseHeaderChecks, RefuseAnUnknownHeaderFormAndWriteNothing)
{
  for (const uint64_t options : {uint64_t{0}, uint64_t{1}})
  {
    StreamWriter writer;
    writer.add(group64(kRoot));
    writer.add(binary(kBlob, {1}));
    writer.handle()->pHdrStack->top()->hdrType = 3;
    fillStorage(writer, 0xEE);
    TraceLog trace;
    EXPECT_EQ(tavCloseHeader(options, writer.handle()), TAV_RC_BAD_HDR_TYPE);
    EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::closeHeader, 50, TAV_RC_BAD_HDR_TYPE}));
    EXPECT_EQ(writer.handle()->pHdrStack->count, 1U);
    EXPECT_EQ(writer.length(), 33U);
    EXPECT_EQ(writer.bytes(), Bytes(33, 0xEE));
  }
}

TEST(CloseHeaderTrace, ShowsArgumentsAndTheWriteOffset)
{
  StreamWriter writer;
  writer.add(group64(kRoot));
  TAVHandle* const handle = writer.handle();
  TraceLog trace;
  ASSERT_EQ(tavCloseHeader(0, handle), TAV_RC_OK);
  EXPECT_THAT(trace.dump(probe::closeHeader, 0).items, ElementsAre(bytesOf(uint64_t{0}), bytesOf(handle)));
  EXPECT_THAT(trace.dump(probe::closeHeader, 100).items, ElementsAre(bytesOf(uint64_t{16})));
  EXPECT_THAT(trace.stepsOf(probe::closeHeader),
              ElementsAre(Step{KOR_TRACE_ENTRY, probe::closeHeader, 0}, Step{KOR_TRACE_VAR, probe::closeHeader, 0},
                          Step{KOR_TRACE_VAR, probe::closeHeader, 100}, Step{KOR_TRACE_EXIT, probe::closeHeader, 0}));
  EXPECT_THAT(trace.dump(probe::hdrStackPop, 0).items, ElementsAre(bytesOf(uint32_t{1})));
  EXPECT_THAT(trace.dump(probe::hdrStackPop, 100).items, ElementsAre(bytesOf(uint32_t{0})));
}

TEST(CloseHeaderTrace, WritesTheSizeBeforeTheEndElementAndPopsLast)
{
  StreamWriter writer;
  writer.add(group64(kRoot, TAV_TYPE_HEADER64, TAV_INFO_EYE_SIZE));
  TraceLog trace;
  writer.close();
  std::vector<uint32_t> entries;
  for (const Step& step : trace.steps())
  {
    if (step.kind == KOR_TRACE_ENTRY && step.probe != probe::hdrStackTop)
    {
      entries.push_back(step.probe);
    }
  }
  EXPECT_THAT(entries,
              ElementsAre(probe::closeHeader, probe::rawWrite, probe::addElement, probe::validateChild,
                          probe::writeNode, probe::rawWrite, probe::rawWrite, probe::hdrStackPop));
}

TEST(CloseHeaderTrace, ShowsTheEndElementWithTheLengthOfItsPair)
{
  StreamWriter writer;
  writer.add(group64(kRoot, TAV_TYPE_HEADER64, TAV_INFO_EYE_SIZE));
  TraceLog trace;
  writer.close();
  const std::vector<std::string> items = trace.dump(probe::addElement, 0).items;
  ASSERT_EQ(items.size(), 4U);
  ASSERT_EQ(items[3].size(), sizeof(TAVHeaderData));
  TAVHeaderData element;
  std::memcpy(&element, items[3].data(), sizeof element);
  EXPECT_EQ(element.header.hdr64.elm, TAV_ELM_CMN_END_HDR_EYE_SIZE);
  EXPECT_EQ(element.header.hdr64.size, 16U);
  EXPECT_EQ(element.dataBufSize, 16U);
}

TEST(CloseHeaderTrace, CarriesItsProbe)
{
  EXPECT_EQ(probe::closeHeader, 0x088A000DU);
}

} // namespace
