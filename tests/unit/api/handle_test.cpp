#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>
#include <cstring>

#include "support/failingNew.h"
#include "support/streams.h"
#include "support/traceLog.h"
#include "support/vectorStorage.h"

namespace
{

using namespace test;
using namespace tav;
using testing::ElementsAre;
using testing::IsEmpty;

constexpr uint64_t kRead = 0x1;
constexpr uint64_t kWrite = 0x2;
constexpr uint64_t kUpdate = 0x4;
constexpr uint64_t kNoHdrStack = 0x8;
constexpr uint64_t kDirect = 0x100000000;

/// A storage with direct memory whose getMemory can refuse.
class RefusingMemory : public TAVSSMemory
{
public:
  using TAVSSMemory::TAVSSMemory;

  uint32_t getMemory(void** ppData, uint64_t* pSize) override
  {
    return refusal != TAV_RC_OK ? refusal : TAVSSMemory::getMemory(ppData, pSize);
  }

  uint32_t refusal = TAV_RC_OK;
};

class HandleTest : public testing::Test
{
protected:
  ~HandleTest() override
  {
    if (handle != nullptr)
    {
      tavTermHandle(&handle);
    }
  }

  uint32_t open(TAVSideStorage& storage, uint64_t options)
  {
    TAVInitParam param(&storage, options, 640, 0, 0, 0);
    return tavInitHandle(&handle, &param);
  }

  std::array<uint8_t, 100> block{};
  RefusingMemory memory{block.data(), block.size()};
  VectorStorage paged{64};
  TAVHandle* handle = nullptr;
};

/// A pointer that no operation may leave as it is.
TAVHandle* garbage()
{
  static TAVHandle somewhere;
  return &somewhere;
}

TEST_F(HandleTest, OverMemoryTakesTheBlockAndMakesNoRing)
{
  ASSERT_EQ(open(memory, kRead), TAV_RC_OK);
  EXPECT_EQ(handle->initVersion, 0x09050000U);
  EXPECT_EQ(handle->version, 0x09050000U);
  EXPECT_EQ(handle->curOffset, 0U);
  EXPECT_EQ(handle->pDirectData, block.data());
  EXPECT_EQ(handle->directDataSize, block.size());
  EXPECT_EQ(handle->streamBytes, 0U);
  EXPECT_EQ(handle->pCircularBuf, nullptr);
  EXPECT_EQ(handle->pSideStorage, &memory);
  EXPECT_EQ(handle->pHdrStack, nullptr);
  EXPECT_EQ(handle->options, kRead | kNoHdrStack | kDirect);
  EXPECT_EQ(handle->alignMode, 0U);
  EXPECT_EQ(handle->swapBytes, 0U);
}

TEST_F(HandleTest, OverPagesMakesARingOfTheSizeAsked)
{
  ASSERT_EQ(open(paged, kRead), TAV_RC_OK);
  EXPECT_EQ(handle->pDirectData, nullptr);
  EXPECT_EQ(handle->directDataSize, 0U);
  ASSERT_NE(handle->pCircularBuf, nullptr);
  EXPECT_EQ(handle->pCircularBuf->ringSize, 640U);
  EXPECT_EQ(handle->pCircularBuf->pStorage, &paged);
  EXPECT_EQ(handle->pHdrStack, nullptr);
  EXPECT_EQ(handle->options, kRead | kNoHdrStack);
}

TEST_F(HandleTest, ForWritingAndUpdatingHasAHeaderStack)
{
  for (const uint64_t mode : {kWrite, kUpdate})
  {
    ASSERT_EQ(open(memory, mode), TAV_RC_OK);
    EXPECT_EQ(handle->options, mode | kDirect);
    ASSERT_NE(handle->pHdrStack, nullptr);
    EXPECT_EQ(handle->pHdrStack->count, 0U);
    ASSERT_EQ(tavTermHandle(&handle), TAV_RC_OK);
  }
  ASSERT_EQ(open(paged, kWrite), TAV_RC_OK);
  EXPECT_NE(handle->pHdrStack, nullptr);
  EXPECT_NE(handle->pCircularBuf, nullptr);
}

TEST_F(HandleTest, TakesExactlyOneMode)
{
  for (uint64_t low = 0; low < 8; ++low)
  {
    SCOPED_TRACE(low);
    const bool one = low == 1 || low == 2 || low == 4;
    handle = garbage();
    TraceLog trace;
    EXPECT_EQ(open(memory, 0x50 | low), one ? TAV_RC_OK : TAV_RC_BAD_PARAM);
    if (one)
    {
      EXPECT_THAT(trace.failures(), IsEmpty());
      ASSERT_EQ(tavTermHandle(&handle), TAV_RC_OK);
      continue;
    }
    EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::initHandle, 50, TAV_RC_BAD_PARAM}));
    EXPECT_EQ(handle, nullptr);
  }
}

TEST_F(HandleTest, KeepsTheOtherOptionBits)
{
  ASSERT_EQ(open(memory, kRead | 0x8000000000000070), TAV_RC_OK);
  EXPECT_EQ(handle->options, kRead | 0x8000000000000070 | kNoHdrStack | kDirect);
}

TEST_F(HandleTest, AWriterThatAsksForNoHeaderStackGetsNone)
{
  ASSERT_EQ(open(memory, kWrite | kNoHdrStack), TAV_RC_OK);
  EXPECT_EQ(handle->pHdrStack, nullptr);
}

TEST_F(HandleTest, TakesByteOrderAndAlignment)
{
  for (const uint8_t order : {uint8_t{0}, uint8_t{1}, uint8_t{2}, uint8_t{3}, uint8_t{4}})
  {
    TAVInitParam param(&memory, kRead, 0, 0, order, static_cast<uint8_t>(order + 1));
    ASSERT_EQ(tavInitHandle(&handle, &param), TAV_RC_OK);
    EXPECT_EQ(handle->swapBytes, order == 3 ? 1 : 0);
    EXPECT_EQ(handle->alignMode, order + 1);
    ASSERT_EQ(tavTermHandle(&handle), TAV_RC_OK);
  }
}

TEST_F(HandleTest, KeepsTheVersionOfItsParameters)
{
  TAVInitParam param(&memory, kRead);
  param.version = 0x87654321;
  ASSERT_EQ(tavInitHandle(&handle, &param), TAV_RC_OK);
  EXPECT_EQ(handle->initVersion, 0x87654321U);
  EXPECT_EQ(handle->version, 0x09050000U);
}

TEST_F(HandleTest, InitChecksItsArgumentsInTheirOrder)
{
  TAVInitParam none(nullptr, 0);
  TAVInitParam unusable(&memory, 0);
  memory.status = 0x90000035;
  TraceLog trace;
  handle = garbage();
  EXPECT_EQ(tavInitHandle(nullptr, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tavInitHandle(&handle, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(handle, nullptr);
  handle = garbage();
  EXPECT_EQ(tavInitHandle(&handle, &none), TAV_RC_BAD_PARAM);
  EXPECT_EQ(handle, nullptr);
  handle = garbage();
  EXPECT_EQ(tavInitHandle(&handle, &unusable), TAV_RC_BAD_PARAM);
  EXPECT_EQ(handle, nullptr);
  memory.status = TAV_RC_OK;
  EXPECT_EQ(tavInitHandle(&handle, &unusable), TAV_RC_BAD_PARAM);
  EXPECT_EQ(handle, nullptr);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::initHandle, 10, TAV_RC_BAD_PARAM},
                                            Failure{probe::initHandle, 20, TAV_RC_BAD_PARAM},
                                            Failure{probe::initHandle, 30, TAV_RC_BAD_PARAM},
                                            Failure{probe::initHandle, 40, TAV_RC_BAD_PARAM},
                                            Failure{probe::initHandle, 50, TAV_RC_BAD_PARAM}));
}

TEST_F(HandleTest, AStorageThatFailedToBeMadeIsRefused)
{
  uint32_t rc = 0;
  TAVSSMemory failed(~uint64_t{0}, &rc);
  ASSERT_EQ(rc, TAV_RC_NO_MEMORY);
  EXPECT_EQ(open(failed, kRead), TAV_RC_BAD_PARAM);
}

TEST_F(HandleTest, UpdatingNeedsDirectMemory)
{
  const int64_t before = allocations::live();
  {
    TraceLog trace;
    handle = garbage();
    EXPECT_EQ(open(paged, kUpdate), TAV_RC_NOT_SUPPORTED);
    EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::initHandle, 210, TAV_RC_NOT_SUPPORTED}));
  }
  EXPECT_EQ(handle, nullptr);
  EXPECT_EQ(allocations::live(), before);
}

TEST_F(HandleTest, TheRingsCodeComesUpAndAllIsUndone)
{
  const int64_t before = allocations::live();
  {
    TAVInitParam param(&paged, kWrite, 0, 0, 0, 0); // a ring of no pages
    TraceLog trace;
    handle = garbage();
    EXPECT_EQ(tavInitHandle(&handle, &param), TAV_RC_BAD_PARAM);
    EXPECT_EQ(trace.failures().back(), (Failure{probe::initHandle, 210, TAV_RC_BAD_PARAM}));
    std::vector<uint32_t> owners;
    for (const Step& step : trace.steps())
    {
      if ((step.probe == probe::circularBufEnd || step.probe == probe::hdrStack) && step.kind == KOR_TRACE_ENTRY)
      {
        owners.push_back(step.probe);
      }
    }
    EXPECT_THAT(owners, ElementsAre(probe::circularBufEnd));
  }
  EXPECT_EQ(handle, nullptr);
  EXPECT_EQ(allocations::live(), before);
}

TEST_F(HandleTest, AnUpdateOverPagesIsRefusedWhateverBecameOfTheRing)
{
  TAVInitParam param(&paged, kUpdate, 0, 0, 0, 0);
  EXPECT_EQ(tavInitHandle(&handle, &param), TAV_RC_NOT_SUPPORTED);
}

TEST_F(HandleTest, TheStoragesCodeComesUpAndAllIsUndone)
{
  const int64_t before = allocations::live();
  memory.refusal = 0x90000035;
  {
    TraceLog trace;
    handle = garbage();
    EXPECT_EQ(open(memory, kWrite), 0x90000035U);
    EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::initHandle, 210, 0x90000035}));
    EXPECT_THAT(trace.recordsOf(probe::hdrStack), IsEmpty());
  }
  EXPECT_EQ(handle, nullptr);
  EXPECT_EQ(allocations::live(), before);
}

TEST_F(HandleTest, WithoutMemoryForTheHandleTheAllocatorsCodeComesUp)
{
  TraceLog trace;
  handle = garbage();
  const allocations::FailNth fail(1);
  EXPECT_EQ(open(memory, kRead), TAV_RC_NO_MEMORY);
  EXPECT_TRUE(fail.happened());
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::initHandle, 70, TAV_RC_NO_MEMORY}));
  EXPECT_EQ(handle, nullptr);
}

TEST_F(HandleTest, WithoutMemoryForTheRingObjectThereIsNoHandle)
{
  const int64_t before = allocations::live();
  for (const uint64_t mode : {kWrite, kUpdate})
  {
    handle = garbage();
    TraceLog trace;
    const allocations::FailNth fail(2);
    EXPECT_EQ(open(paged, mode), TAV_RC_NO_MEMORY);
    EXPECT_TRUE(fail.happened());
    EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::initHandle, 210, TAV_RC_NO_MEMORY}));
    EXPECT_EQ(handle, nullptr);
  }
  EXPECT_EQ(allocations::live(), before);
}

TEST_F(HandleTest, WithoutMemoryForTheHeaderStackThereIsNoHandle)
{
  const int64_t before = allocations::live();
  {
    TraceLog trace;
    const allocations::FailNth fail(2);
    EXPECT_EQ(open(memory, kWrite), TAV_RC_NO_HDR_STACK);
    EXPECT_TRUE(fail.happened());
    EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::initHandle, 210, TAV_RC_NO_HDR_STACK}));
  }
  EXPECT_EQ(handle, nullptr);
  EXPECT_EQ(allocations::live(), before);
}

TEST_F(HandleTest, EachAllocationMayFailOnce)
{
  const int64_t before = allocations::live();
  std::vector<uint32_t> codes;
  bool failed = true;
  for (uint64_t nth = 1; failed; ++nth)
  {
    uint32_t rc = TAV_RC_OK;
    {
      const allocations::FailNth fail(nth);
      TAVInitParam param(&paged, kWrite, 64, 0, 0, 0); // one page: nothing smaller to fall back to
      rc = tavInitHandle(&handle, &param);
      failed = fail.happened();
    }
    EXPECT_EQ(handle != nullptr, rc == TAV_RC_OK);
    if (handle != nullptr)
    {
      ASSERT_EQ(tavTermHandle(&handle), TAV_RC_OK);
    }
    if (failed)
    {
      codes.push_back(rc);
    }
  }
  // The handle, the ring's object, its page, its flags, the header stack's object, and its block, which it can lack.
  EXPECT_THAT(codes, ElementsAre(TAV_RC_NO_MEMORY, TAV_RC_NO_MEMORY, TAV_RC_NO_MEMORY, TAV_RC_NO_MEMORY,
                                 TAV_RC_NO_HDR_STACK, TAV_RC_OK));
  codes = {};
  codes.shrink_to_fit();
  EXPECT_EQ(allocations::live(), before);
}

TEST_F(HandleTest, InitTracesParametersAndHandle)
{
  TAVInitParam param(&memory, kWrite, 1, 2, 3, 1);
  TAVHandle** const out = &handle;
  TraceLog trace;
  ASSERT_EQ(tavInitHandle(out, &param), TAV_RC_OK);
  EXPECT_THAT(trace.stepsOf(probe::initHandle),
              ElementsAre(Step{KOR_TRACE_ENTRY, 0x88A0013, 0}, Step{KOR_TRACE_VAR, 0x88A0013, 0},
                          Step{KOR_TRACE_VAR, 0x88A0013, 60}, Step{KOR_TRACE_VAR, 0x88A0013, 200},
                          Step{KOR_TRACE_EXIT, 0x88A0013, 0}));
  EXPECT_THAT(trace.dump(probe::initHandle, 0).items,
              ElementsAre(bytesOf(out), " List of options used to configure tav APIs ", bytesOf(param)));
  EXPECT_THAT(trace.dump(probe::initHandle, 60).items, ElementsAre(bytesOf(uint8_t{1})));
  EXPECT_THAT(trace.dump(probe::initHandle, 200).items,
              ElementsAre(bytesOf(kWrite | kDirect), "tav handle", bytesOf(*handle)));
}

TEST_F(HandleTest, InitGoesThroughItsStepsInOrder)
{
  TAVInitParam param(&paged, kWrite, 640, 0, 0, 0);
  TraceLog trace;
  ASSERT_EQ(tavInitHandle(&handle, &param), TAV_RC_OK);
  std::vector<uint32_t> entered;
  for (const Step& step : trace.steps())
  {
    if (step.kind == KOR_TRACE_ENTRY)
    {
      entered.push_back(step.probe);
    }
  }
  EXPECT_THAT(entered, ElementsAre(probe::initHandle, probe::ssGetStatus, probe::initParamVersion,
                                   probe::ssHasAttributes, probe::circularBuf, probe::ssGetStatus,
                                   probe::ssHasAttributes, probe::hdrStack));
}

TEST_F(HandleTest, TermFreesAllButTheStorage)
{
  const int64_t before = allocations::live();
  ASSERT_EQ(open(paged, kWrite), TAV_RC_OK);
  EXPECT_GT(allocations::live(), before);
  EXPECT_EQ(tavTermHandle(&handle), TAV_RC_OK);
  EXPECT_EQ(handle, nullptr);
  EXPECT_EQ(allocations::live(), before);
  EXPECT_EQ(paged.getStatus(), TAV_RC_OK);
}

TEST_F(HandleTest, TermChecksItsArgument)
{
  TraceLog trace;
  EXPECT_EQ(tavTermHandle(nullptr), TAV_RC_BAD_PARAM);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::termHandle, 10, TAV_RC_BAD_PARAM}));
  trace.clear();
  EXPECT_EQ(tavTermHandle(&handle), TAV_RC_BAD_PARAM);
  EXPECT_EQ(handle, nullptr);
  EXPECT_THAT(trace.steps(), ElementsAre(Step{KOR_TRACE_ENTRY, 0x88A0014, 0}, Step{KOR_TRACE_EXIT, 0x88A0014, 0}));
  EXPECT_EQ(trace.records().back().code, TAV_RC_BAD_PARAM);
}

TEST_F(HandleTest, TermDestroysTheHeaderStackBeforeTheRing)
{
  ASSERT_EQ(open(paged, kWrite), TAV_RC_OK);
  const std::string record = bytesOf(*handle);
  TraceLog trace;
  ASSERT_EQ(tavTermHandle(&handle), TAV_RC_OK);
  std::vector<Step> outer;
  for (const Step& step : trace.steps())
  {
    if (step.probe == probe::termHandle || step.probe == probe::hdrStackEnd || step.probe == probe::circularBufEnd)
    {
      outer.push_back(step);
    }
  }
  EXPECT_THAT(outer, ElementsAre(Step{KOR_TRACE_ENTRY, 0x88A0014, 0}, Step{KOR_TRACE_VAR, 0x88A0014, 100},
                                 Step{KOR_TRACE_ENTRY, 0x88A001B, 0}, Step{KOR_TRACE_EXIT, 0x88A001B, 0},
                                 Step{KOR_TRACE_ENTRY, 0x88A002C, 0}, Step{KOR_TRACE_EXIT, 0x88A002C, 0},
                                 Step{KOR_TRACE_EXIT, 0x88A0014, 0}));
  EXPECT_THAT(trace.dump(probe::termHandle, 100).items, ElementsAre("tav handle to be terminated", record));
}

TEST_F(HandleTest, TermWritesWhatTheRingStillHolds)
{
  ASSERT_EQ(open(paged, kWrite), TAV_RC_OK);
  TAVHeaderData root = group64(1).data();
  ASSERT_EQ(tavAddElement(0, handle, &root), TAV_RC_OK);
  EXPECT_TRUE(paged.bytes.empty());
  ASSERT_EQ(tavTermHandle(&handle), TAV_RC_OK);
  ASSERT_GE(paged.bytes.size(), 16U);
  EXPECT_EQ(paged.bytes[kBigEndianHost ? 13 : 12], 2U);
  EXPECT_EQ(paged.bytes[kBigEndianHost ? 15 : 14], 1U);
}

TEST_F(HandleTest, ResetReturnsAWriterOverMemoryToItsBeginning)
{
  TAVInitParam param(&memory, kWrite | 0x40, 0, 0, 3, 1);
  ASSERT_EQ(tavInitHandle(&handle, &param), TAV_RC_OK);
  const std::string fresh = bytesOf(*handle);
  TAVHeaderData root = group64(1).data();
  ASSERT_EQ(tavAddElement(0, handle, &root), TAV_RC_OK);
  ASSERT_EQ(handle->streamBytes, 16U);
  ASSERT_EQ(handle->pHdrStack->count, 1U);
  handle->curOffset = 5;

  TAVResetParam reset;
  EXPECT_EQ(tavResetHandle(handle, &reset), TAV_RC_OK);
  EXPECT_EQ(bytesOf(*handle), fresh); // byte order, alignment and options among the rest
  EXPECT_EQ(handle->pHdrStack->count, 0U);
}

TEST_F(HandleTest, ResetWritesPendingPagesAndEmptiesTheRing)
{
  ASSERT_EQ(open(paged, kWrite), TAV_RC_OK);
  const std::string fresh = bytesOf(*handle);
  TAVHeaderData root = group64(1).data();
  ASSERT_EQ(tavAddElement(0, handle, &root), TAV_RC_OK);
  ASSERT_TRUE(paged.bytes.empty());

  TAVResetParam reset;
  EXPECT_EQ(tavResetHandle(handle, &reset), TAV_RC_OK);
  EXPECT_EQ(bytesOf(*handle), fresh);
  EXPECT_EQ(handle->pCircularBuf->empty, 1U);
  EXPECT_EQ(handle->pHdrStack->count, 0U);
  EXPECT_GE(paged.bytes.size(), 16U);
}

TEST_F(HandleTest, ResetForgetsTheChunkOfAReader)
{
  paged.bytes.assign(100, 0);
  ASSERT_EQ(open(paged, kRead), TAV_RC_OK);
  handle->curOffset = 16;
  handle->pDirectData = block.data();
  handle->directDataSize = 4;

  TAVResetParam reset;
  EXPECT_EQ(tavResetHandle(handle, &reset), TAV_RC_OK);
  EXPECT_EQ(handle->curOffset, 0U);
  EXPECT_EQ(handle->pDirectData, nullptr);
  EXPECT_EQ(handle->directDataSize, 0U);
}

TEST_F(HandleTest, ResetDoesNotTellThatPagesCouldNotBeWritten)
{
  ASSERT_EQ(open(paged, kWrite), TAV_RC_OK);
  TAVHeaderData root = group64(1).data();
  ASSERT_EQ(tavAddElement(0, handle, &root), TAV_RC_OK);
  paged.failAt(1, TAV_RC_END_OF_DATA);

  TAVResetParam reset;
  EXPECT_EQ(tavResetHandle(handle, &reset), TAV_RC_OK);
  EXPECT_EQ(handle->streamBytes, 0U);
}

TEST_F(HandleTest, ResetGivesTheStoragesCodeAndStillResets)
{
  ASSERT_EQ(open(memory, kWrite), TAV_RC_OK);
  TAVHeaderData root = group64(1).data();
  ASSERT_EQ(tavAddElement(0, handle, &root), TAV_RC_OK);
  memory.refusal = 0x90000035;

  TraceLog trace;
  TAVResetParam reset;
  EXPECT_EQ(tavResetHandle(handle, &reset), 0x90000035U);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::resetHandle, 40, 0x90000035}));
  EXPECT_EQ(handle->streamBytes, 0U);
  EXPECT_EQ(handle->pHdrStack->count, 0U);
  EXPECT_EQ(handle->pDirectData, block.data());
  EXPECT_EQ(handle->directDataSize, block.size());
  EXPECT_EQ(trace.stepsOf(probe::resetHandle).size(), 5U);
}

TEST_F(HandleTest, ResetTakesTheStoragesPresentBlock)
{
  ASSERT_EQ(open(memory, kRead), TAV_RC_OK);
  std::array<uint8_t, 7> other{};
  memory.pBuffer = other.data();
  memory.bufferSize = other.size();

  TAVResetParam reset;
  EXPECT_EQ(tavResetHandle(handle, &reset), TAV_RC_OK);
  EXPECT_EQ(handle->pDirectData, other.data());
  EXPECT_EQ(handle->directDataSize, 7U);
}

TEST_F(HandleTest, ResetChecksItsArgumentsInTheirOrder)
{
  ASSERT_EQ(open(memory, kWrite), TAV_RC_OK);
  handle->streamBytes = 9;
  TAVResetParam reset;
  TraceLog trace;
  EXPECT_EQ(tavResetHandle(nullptr, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tavResetHandle(nullptr, &reset), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tavResetHandle(handle, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::resetHandle, 10, TAV_RC_BAD_PARAM},
                                            Failure{probe::resetHandle, 10, TAV_RC_BAD_PARAM},
                                            Failure{probe::resetHandle, 20, TAV_RC_BAD_PARAM}));
  EXPECT_EQ(handle->streamBytes, 9U);
}

TEST_F(HandleTest, ResetTracesParametersAndHandle)
{
  ASSERT_EQ(open(memory, kWrite), TAV_RC_OK);
  TAVResetParam reset;
  TAVResetParam* const pReset = &reset;
  TraceLog trace;
  ASSERT_EQ(tavResetHandle(handle, pReset), TAV_RC_OK);
  EXPECT_THAT(trace.stepsOf(probe::resetHandle),
              ElementsAre(Step{KOR_TRACE_ENTRY, 0x88A0015, 0}, Step{KOR_TRACE_VAR, 0x88A0015, 30},
                          Step{KOR_TRACE_VAR, 0x88A0015, 1000}, Step{KOR_TRACE_EXIT, 0x88A0015, 0}));
  EXPECT_THAT(trace.dump(probe::resetHandle, 30).items,
              ElementsAre(bytesOf(handle), "Reset parameter structure", bytesOf(pReset)));
  EXPECT_THAT(trace.dump(probe::resetHandle, 1000).items, ElementsAre("tav handle after reset", bytesOf(*handle)));
}

TEST_F(HandleTest, GivesItsStorageAndTheStreamsLength)
{
  ASSERT_EQ(open(memory, kWrite), TAV_RC_OK);
  TAVHeaderData root = group64(1).data();
  ASSERT_EQ(tavAddElement(0, handle, &root), TAV_RC_OK);
  TAVSideStorage* storage = nullptr;
  uint64_t bytes = 0;
  TraceLog trace;
  EXPECT_EQ(tavGetSideStorage(handle, &storage, &bytes), TAV_RC_OK);
  EXPECT_EQ(storage, &memory);
  EXPECT_EQ(bytes, 16U);
  EXPECT_THAT(trace.steps(), ElementsAre(Step{KOR_TRACE_ENTRY, 0x88A0016, 0}, Step{KOR_TRACE_VAR, 0x88A0016, 0},
                                         Step{KOR_TRACE_VAR, 0x88A0016, 100}, Step{KOR_TRACE_EXIT, 0x88A0016, 0}));
  EXPECT_THAT(trace.dump(probe::getSideStorage, 100).items, ElementsAre(bytesOf(storage), bytesOf(bytes)));
}

TEST_F(HandleTest, GetSideStorageChecksItsArgumentsInTheirOrder)
{
  ASSERT_EQ(open(memory, kRead), TAV_RC_OK);
  TAVSideStorage* storage = nullptr;
  uint64_t bytes = 77;
  TraceLog trace;
  EXPECT_EQ(tavGetSideStorage(nullptr, nullptr, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tavGetSideStorage(handle, nullptr, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tavGetSideStorage(handle, &storage, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tavGetSideStorage(nullptr, &storage, &bytes), TAV_RC_BAD_PARAM);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::getSideStorage, 10, TAV_RC_BAD_PARAM},
                                            Failure{probe::getSideStorage, 20, TAV_RC_BAD_PARAM},
                                            Failure{probe::getSideStorage, 30, TAV_RC_BAD_PARAM},
                                            Failure{probe::getSideStorage, 10, TAV_RC_BAD_PARAM}));
  EXPECT_EQ(storage, nullptr);
  EXPECT_EQ(bytes, 77U);
}

} // namespace
