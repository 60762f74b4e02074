#include <cstdint>
#include <memory>
#include <string>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "support/traceLog.h"
#include "support/writing.h"
#include "tav/probes.h"
#include "tav/tav.h"

namespace
{

using namespace tav;
using namespace test;

constexpr uint64_t kBefore = 0xABCDEF;

/// A call of tavAddElement that must fail: checks that neither the handle nor the descriptor's offset moved.
uint32_t failToAdd(StreamWriter& writer, TAVHeader header, uint8_t* payload, uint64_t length, uint64_t options = 0)
{
  header.nodeOffset = kBefore;
  TAVHeaderData data{header, payload, length, 0};
  const uint64_t before = writer.length();
  const uint32_t open = writer.handle()->pHdrStack != nullptr ? writer.handle()->pHdrStack->count : 0;
  const uint32_t code = tavAddElement(options, writer.handle(), &data);
  EXPECT_EQ(writer.length(), before);
  EXPECT_EQ(data.header.nodeOffset, kBefore);
  EXPECT_EQ(writer.handle()->pHdrStack != nullptr ? writer.handle()->pHdrStack->count : 0, open);
  return code;
}

TEST(AddElementChecks, RefuseANullHandleFirst)
{
  TraceLog trace;
  EXPECT_EQ(tavAddElement(7, nullptr, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::addElement, 10, TAV_RC_BAD_PARAM}));
}

TEST(AddElementChecks, RefuseANullDescriptorBeforeTheMode)
{
  StreamReader reader({0, 0});
  TraceLog trace;
  EXPECT_EQ(tavAddElement(7, reader.handle(), nullptr), TAV_RC_BAD_PARAM);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::addElement, 20, TAV_RC_BAD_PARAM}));
}

TEST(AddElementChecks, RefuseAReadHandleBeforeTheOptions)
{
  StreamReader reader({0, 0});
  TAVHeaderData data{header64(0, TAV_TYPE_HEADER64, kRoot, 0, kBefore), nullptr, 0, 0};
  TraceLog trace;
  EXPECT_EQ(tavAddElement(7, reader.handle(), &data), TAV_RC_WRONG_MODE);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::addElement, 30, TAV_RC_WRONG_MODE}));
  EXPECT_EQ(data.header.nodeOffset, kBefore);
}

TEST(AddElementChecks, RefuseOptionsBeforeTheHeaderForm)
{
  StreamWriter writer;
  TAVHeader header = header64(0, TAV_TYPE_HEADER64, kRoot);
  header.hdrType = 9;
  for (const uint64_t options : {uint64_t{1}, uint64_t{1} << 63U})
  {
    TraceLog trace;
    EXPECT_EQ(failToAdd(writer, header, nullptr, 0, options), TAV_RC_BAD_OPTIONS);
    EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::addElement, 40, TAV_RC_BAD_OPTIONS}));
  }
}

TEST(AddElementChecks, RefuseTheHeaderFormBeforeAMissingPayload)
{
  StreamWriter writer;
  TraceLog trace;
  EXPECT_EQ(failToAdd(writer, header64(4, TAV_TYPE_BINARY, kBlob), nullptr, 0), TAV_RC_BAD_CHILD_HDR);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::validateChild, 20, TAV_RC_BAD_CHILD_HDR},
                                            Failure{probe::addElement, 50, TAV_RC_BAD_CHILD_HDR}));
}

TEST(AddElementChecks, RefuseADataElementWithoutPayloadEvenOfNoBytes)
{
  StreamWriter writer;
  writer.add(group64(kRoot));
  for (const uint64_t size : {uint64_t{0}, uint64_t{4}})
  {
    TraceLog trace;
    EXPECT_EQ(failToAdd(writer, header64(size, TAV_TYPE_BINARY, kBlob), nullptr, size), TAV_RC_BAD_PARAM);
    EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::addElement, 60, TAV_RC_BAD_PARAM}));
  }
}

TEST(AddElementChecks, RefuseAPayloadShorterThanItsSize)
{
  uint8_t bytes[4] = {};
  StreamWriter writer;
  writer.add(group64(kRoot));
  TraceLog trace;
  EXPECT_EQ(failToAdd(writer, header64(4, TAV_TYPE_BINARY, kBlob), bytes, 3), TAV_RC_BAD_PAYLOAD);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::writeNode, 40, TAV_RC_BAD_PAYLOAD},
                                            Failure{probe::addElement, 70, TAV_RC_BAD_PAYLOAD}));
}

TEST(AddElementChecks, WriteNothingWhenTheyRefuse)
{
  uint8_t bytes[4] = {};
  StreamWriter writer;
  writer.add(group64(kRoot));
  fillStorage(writer, 0xEE);
  failToAdd(writer, header32(4, TAV_TYPE_BINARY, kBlob), bytes, 4);
  failToAdd(writer, header64(4, TAV_TYPE_BINARY, kBlob), bytes, 3);
  failToAdd(writer, header64(4, TAV_TYPE_BINARY, kBlob), nullptr, 0);
  EXPECT_EQ(Bytes(writer.handle()->pDirectData, writer.handle()->pDirectData + 64), Bytes(64, 0xEE));
}

TEST(AddElementRoom, EndsBeforeTheLastByteOfTheBlock)
{
  uint8_t bytes[4] = {1, 2, 3, 4};
  for (const bool wide : {false, true})
  {
    const uint64_t root = wide ? 16 : 8;
    const TAVHeader header = wide ? header64(4, TAV_TYPE_BINARY, kBlob) : header32(4, TAV_TYPE_BINARY, kBlob);
    StreamWriter full({}, 2 * root + 4);
    full.add(wide ? group64(kRoot) : group32(kRoot));
    TraceLog trace;
    EXPECT_EQ(failToAdd(full, header, bytes, 4), TAV_RC_END_OF_STORAGE);
    EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::writeNode, 50, TAV_RC_END_OF_STORAGE},
                                              Failure{probe::addElement, 70, TAV_RC_END_OF_STORAGE}));

    StreamWriter enough({}, 2 * root + 5);
    enough.add(wide ? group64(kRoot) : group32(kRoot));
    TAVHeaderData data{header, bytes, 4, 0};
    EXPECT_EQ(tavAddElement(0, enough.handle(), &data), TAV_RC_OK);
    EXPECT_EQ(enough.length(), 2 * root + 4);
  }
}

TEST(AddElementRoom, OfAGroupIsItsHeaderAlone)
{
  StreamWriter full({}, 16);
  EXPECT_EQ(failToAdd(full, header64(0, TAV_TYPE_HEADER64, kRoot), nullptr, 0), TAV_RC_END_OF_STORAGE);
  StreamWriter enough({}, 17);
  EXPECT_EQ(enough.add(group64(kRoot, TAV_TYPE_HEADER64, 0, 1000)).nodeOffset, 0U);
}

TEST(AddElementRoom, OfASizeThatPasses64BitsIsRefused)
{
  uint8_t byte = 0;
  StreamWriter writer;
  writer.add(group64(kRoot));
  for (const uint64_t size : {~uint64_t{0}, ~uint64_t{0} - 15, ~uint64_t{0} - 31, ~uint64_t{0} - 32})
  {
    EXPECT_EQ(failToAdd(writer, header64(size, TAV_TYPE_BINARY, kBlob), &byte, size), TAV_RC_END_OF_STORAGE);
  }
}

TEST(AddElementRoom, DoesNotCountThePairSoThatHeaderAndPayloadStay)
{
  uint8_t bytes[4] = {1, 2, 3, 4};
  StreamWriter writer(lowFirst(), 16 + 20 + 16); // the pair would end at the block's end
  writer.add(group64(kRoot));
  TraceLog trace;
  EXPECT_EQ(failToAdd(writer, header64(4, TAV_TYPE_BINARY, kBlob, TAV_INFO_EYE_SIZE), bytes, 4),
            TAV_RC_END_OF_STORAGE);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::rawWrite, 30, TAV_RC_END_OF_STORAGE},
                                            Failure{probe::writeNode, 70, TAV_RC_END_OF_STORAGE},
                                            Failure{probe::addElement, 70, TAV_RC_END_OF_STORAGE}));
  const uint8_t* const block = writer.handle()->pDirectData;
  EXPECT_EQ(toHex(Bytes(block + 16, block + 52)), rows("04 00 00 00 00 00 00 00 00 00 40 00 65 00 61 EA 01 02 03 04"
                                                       "00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00"));
}

TEST(AddElementRoom, OfPaddingIsNotNeeded)
{
  Bytes byte{1};
  StreamWriter writer({false, false, true}, 16 + 17 + 1);
  writer.add(group64(kRoot));
  TAVHeaderData data{header64(1, TAV_TYPE_BINARY, kBlob), byte.data(), 1, 0};
  EXPECT_EQ(tavAddElement(0, writer.handle(), &data), TAV_RC_OK);
  EXPECT_EQ(writer.length(), 40U);
}

TEST(AddElementSink, WithoutBlockIsRefused)
{
  StreamWriter writer;
  writer.handle()->pDirectData = nullptr;
  TraceLog trace;
  EXPECT_EQ(failToAdd(writer, header64(0, TAV_TYPE_HEADER64, kRoot), nullptr, 0), TAV_RC_NO_MEMORY);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::writeNode, 50, TAV_RC_NO_MEMORY},
                                            Failure{probe::addElement, 70, TAV_RC_NO_MEMORY}));
}

TEST(AddElementSink, WithoutRingIsRefused)
{
  StreamWriter writer({.buffered = true});
  const WithoutRing guard(writer.handle());
  TraceLog trace;
  EXPECT_EQ(failToAdd(writer, header64(0, TAV_TYPE_HEADER64, kRoot), nullptr, 0), TAV_RC_NO_CIRCULAR_BUF);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::writeNode, 50, TAV_RC_NO_CIRCULAR_BUF},
                                            Failure{probe::addElement, 70, TAV_RC_NO_CIRCULAR_BUF}));
}

TEST(AddElementSink, ThatIsNotWritableIsRefusedByTheRing)
{
  VectorStorage storage(64, {}, VectorStorage::kReadOnly);
  Handle handle(storage, TAV_OPT_WRITE, {.buffered = true});
  TAVHeaderData data{header64(0, TAV_TYPE_HEADER64, kRoot, 0, kBefore), nullptr, 0, 0};
  TraceLog trace;
  EXPECT_EQ(tavAddElement(0, handle.get(), &data), TAV_RC_NOT_SUPPORTED);
  EXPECT_THAT(trace.failuresOf(probe::rawWrite), ElementsAre(Failure{probe::rawWrite, 40, TAV_RC_NOT_SUPPORTED}));
  EXPECT_THAT(trace.failuresOf(probe::writeNode), ElementsAre(Failure{probe::writeNode, 70, TAV_RC_NOT_SUPPORTED}));
  EXPECT_THAT(trace.failuresOf(probe::addElement), ElementsAre(Failure{probe::addElement, 70, TAV_RC_NOT_SUPPORTED}));
  EXPECT_EQ(handle->streamBytes, 0U);
  EXPECT_EQ(data.header.nodeOffset, kBefore);
}

TEST(AddElementSink, ThatFailsHandsItsCodeUpUnchanged)
{
  StreamWriter writer({.buffered = true});
  writer.add(group64(kRoot));
  Bytes large(640); // as large as the ring: what does not fit goes straight to the storage
  writer.vectorStorage().failAt(1, kStorageCode);
  TraceLog trace;
  EXPECT_EQ(failToAdd(writer, header64(640, TAV_TYPE_BINARY, kBlob), large.data(), 640), kStorageCode);
  EXPECT_THAT(trace.failuresOf(probe::rawWrite), ElementsAre(Failure{probe::rawWrite, 40, kStorageCode}));
  EXPECT_THAT(trace.failuresOf(probe::writeNode), ElementsAre(Failure{probe::writeNode, 70, kStorageCode}));
  EXPECT_THAT(trace.failuresOf(probe::addElement), ElementsAre(Failure{probe::addElement, 70, kStorageCode}));
}

TEST(AddElementAfterAFailure, ContinuesWhereTheStreamEnded)
{
  uint8_t bytes[4] = {1, 2, 3, 4};
  StreamWriter writer;
  writer.add(group64(kRoot));
  failToAdd(writer, header64(4, TAV_TYPE_BINARY, kBlob), bytes, 3);
  EXPECT_EQ(writer.add(binary(kBlob, {9})).nodeOffset, 16U);
}

/// A stream in cached bytes that may not be written any more.
class RingThatIsNotWritable : public ::testing::Test
{
protected:
  void SetUp() override
  {
    writer_.add(group64(kRoot, TAV_TYPE_HEADER64, 0, 0));
    ring().storageWritable = 0;
    content_.assign(ring().pRing, ring().pRing + ring().ringSize);
  }
  void TearDown() override
  {
    EXPECT_EQ(Bytes(ring().pRing, ring().pRing + ring().ringSize), content_) << "no byte was changed";
  }
  TAVCircularBuf& ring() { return *writer_.handle()->pCircularBuf; }

  StreamWriter writer_{Form{.buffered = true}};
  Bytes content_;
};

TEST_F(RingThatIsNotWritable, RefusesAnElementBehindCachedBytes)
{
  uint8_t bytes[4] = {1, 2, 3, 4};
  EXPECT_EQ(failToAdd(writer_, header64(4, TAV_TYPE_BINARY, kBlob), bytes, 4), TAV_RC_NOT_SUPPORTED);
}

TEST_F(RingThatIsNotWritable, RefusesAGroupBehindCachedBytes)
{
  EXPECT_EQ(failToAdd(writer_, header64(0, TAV_TYPE_HEADER64, kBlob), nullptr, 0), TAV_RC_NOT_SUPPORTED);
}

TEST_F(RingThatIsNotWritable, RefusesToCloseAGroupInCachedBytes)
{
  EXPECT_EQ(tavCloseHeader(0, writer_.handle()), TAV_RC_NOT_SUPPORTED);
  EXPECT_EQ(writer_.handle()->pHdrStack->count, 1U);
}

TEST(AddElementNesting, KeepsAGroupThatCannotBeOpenedInTheStream)
{
  StreamWriter writer({}, 0x20000);
  for (int depth = 0; depth < 4000; ++depth)
  {
    writer.add(group64(kRoot));
  }
  TAVHeaderData data{header64(0, TAV_TYPE_HEADER64, kBlob, 0, kBefore), nullptr, 0, 0};
  TraceLog trace;
  EXPECT_EQ(tavAddElement(0, writer.handle(), &data), TAV_RC_NO_MEMORY);
  EXPECT_THAT(trace.failuresOf(probe::addElement), ElementsAre(Failure{probe::addElement, 80, TAV_RC_NO_MEMORY}));
  EXPECT_EQ(writer.length(), 4001U * 16);
  EXPECT_EQ(data.header.nodeOffset, 4000U * 16);
  EXPECT_EQ(writer.handle()->pHdrStack->count, 4000U);
  EXPECT_EQ(writer.handle()->pHdrStack->top()->nodeOffset, 3999U * 16);
}

TEST(AddElementNesting, PutsTheGroupWithItsOffsetOnTheStack)
{
  StreamWriter writer({.align = true});
  writer.add(group64(kRoot));
  writer.add(group64(kBlob, TAV_TYPE_HEADER32, 0x42, 99));
  ASSERT_EQ(writer.handle()->pHdrStack->count, 2U);
  const TAVHeader& top = *writer.handle()->pHdrStack->top();
  EXPECT_EQ(top.nodeOffset, 16U);
  EXPECT_EQ(top.hdr64.size, 99U);
  EXPECT_EQ(top.hdr64.info, 0x42 | TAV_INFO_ALIGNED8);
}

TEST(AddElementNesting, PutsNoDataElementOnTheStack)
{
  StreamWriter writer;
  writer.add(group64(kRoot));
  writer.add(binary(kBlob, {1}));
  EXPECT_EQ(writer.handle()->pHdrStack->count, 1U);
}

TEST(AddElementTrace, RunsThroughItsStepsInOrder)
{
  StreamWriter writer;
  writer.add(group64(kRoot));
  TraceLog trace;
  writer.add(binary(kBlob, {1}, true, TAV_INFO_EYE_SIZE));
  std::vector<Step> steps;
  for (const Step& step : trace.steps())
  {
    if (step.probe != probe::hdrStackTop)
    {
      steps.push_back(step);
    }
  }
  EXPECT_THAT(steps,
              ElementsAre(Step{KOR_TRACE_ENTRY, probe::addElement, 0}, Step{KOR_TRACE_VAR, probe::addElement, 0},
                          Step{KOR_TRACE_ENTRY, probe::validateChild, 0}, Step{KOR_TRACE_VAR, probe::validateChild, 0},
                          Step{KOR_TRACE_EXIT, probe::validateChild, 0}, Step{KOR_TRACE_ENTRY, probe::writeNode, 0},
                          Step{KOR_TRACE_VAR, probe::writeNode, 0}, Step{KOR_TRACE_ENTRY, probe::rawWrite, 0},
                          Step{KOR_TRACE_VAR, probe::rawWrite, 0}, Step{KOR_TRACE_VAR, probe::rawWrite, 100},
                          Step{KOR_TRACE_EXIT, probe::rawWrite, 0}, Step{KOR_TRACE_ENTRY, probe::rawWrite, 0},
                          Step{KOR_TRACE_VAR, probe::rawWrite, 0}, Step{KOR_TRACE_VAR, probe::rawWrite, 100},
                          Step{KOR_TRACE_EXIT, probe::rawWrite, 0}, Step{KOR_TRACE_ENTRY, probe::rawWrite, 0},
                          Step{KOR_TRACE_VAR, probe::rawWrite, 0}, Step{KOR_TRACE_VAR, probe::rawWrite, 100},
                          Step{KOR_TRACE_EXIT, probe::rawWrite, 0},
                          Step{KOR_TRACE_VAR, probe::writeNode, 100}, Step{KOR_TRACE_EXIT, probe::writeNode, 0},
                          Step{KOR_TRACE_VAR, probe::addElement, 100}, Step{KOR_TRACE_EXIT, probe::addElement, 0}));
}

TEST(AddElementTrace, ShowsArgumentsAndResult)
{
  StreamWriter writer;
  Element root = group64(kRoot);
  TAVHeaderData data = root.data();
  const TAVHeaderData before = data;
  TAVHandle* const handle = writer.handle();
  TraceLog trace;
  ASSERT_EQ(tavAddElement(0, handle, &data), TAV_RC_OK);
  EXPECT_THAT(trace.dump(probe::addElement, 0).items,
              ElementsAre(bytesOf(uint64_t{0}), bytesOf(handle), "Element to be appended", bytesOf(before)));
  EXPECT_THAT(trace.dump(probe::addElement, 100).items, ElementsAre(bytesOf(uint64_t{0}), bytesOf(uint64_t{16})));
}

TEST(AddElementTrace, ShowsNothingForANullDescriptor)
{
  StreamWriter writer;
  TraceLog trace;
  EXPECT_EQ(tavAddElement(0, writer.handle(), nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(trace.dump(probe::addElement, 0).items.back(), "");
}

TEST(AddElementTrace, EndsWithTheCode)
{
  TraceLog trace;
  tavAddElement(0, nullptr, nullptr);
  EXPECT_EQ(trace.records().back().kind, KOR_TRACE_EXIT);
  EXPECT_EQ(trace.records().back().code, TAV_RC_BAD_PARAM);
}

TEST(AddElementProbes, AreTheirNumbers)
{
  EXPECT_EQ(probe::addElement, 0x088A0007U);
  EXPECT_EQ(probe::writeNode, 0x088A0024U);
  EXPECT_EQ(probe::validateChild, 0x088A0029U);
  EXPECT_EQ(probe::rawWrite, 0x088A002AU);
}

} // namespace
