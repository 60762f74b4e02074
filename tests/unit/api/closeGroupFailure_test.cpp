#include <cstdint>
#include <ostream>
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

TEST(CloseHeaderFailure, LeavesTheGroupOpenAndItsNewSizeInTheEntry)
{
  StreamWriter writer;
  writer.add(group64(kRoot, TAV_TYPE_HEADER64, 0, 0));
  writer.add(binary(kBlob, {1}));
  uint8_t* const block = std::exchange(writer.handle()->pDirectData, nullptr);
  TraceLog trace;
  EXPECT_EQ(tavCloseHeader(0, writer.handle()), TAV_RC_NO_MEMORY);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::rawWrite, 20, TAV_RC_NO_MEMORY},
                                            Failure{probe::closeHeader, 50, TAV_RC_NO_MEMORY}));
  ASSERT_EQ(writer.handle()->pHdrStack->count, 1U);
  EXPECT_EQ(writer.handle()->pHdrStack->top()->hdr64.size, 17U);
  EXPECT_EQ(writer.length(), 33U);
  writer.handle()->pDirectData = block;
  EXPECT_EQ(tavCloseHeader(0, writer.handle()), TAV_RC_OK);
}

TEST(CloseHeaderFailure, OfA32BitGroupLeavesItOpen)
{
  StreamWriter writer;
  writer.add(group32(kRoot));
  writer.handle()->pDirectData = nullptr;
  EXPECT_EQ(tavCloseHeader(0, writer.handle()), TAV_RC_NO_MEMORY);
  EXPECT_EQ(writer.handle()->pHdrStack->count, 1U);
}

TEST(CloseHeaderFailure, WithoutRingLeavesTheGroupOpen)
{
  StreamWriter writer({.buffered = true});
  writer.add(group64(kRoot, TAV_TYPE_HEADER64, 0, 0));
  const WithoutRing guard(writer.handle());
  for (const uint64_t options : {uint64_t{0}, uint64_t{1}})
  {
    TraceLog trace;
    EXPECT_EQ(tavCloseHeader(options, writer.handle()), TAV_RC_NO_CIRCULAR_BUF);
    EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::rawWrite, 10, TAV_RC_NO_CIRCULAR_BUF},
                                              Failure{probe::closeHeader, 50, TAV_RC_NO_CIRCULAR_BUF}));
    EXPECT_EQ(writer.handle()->pHdrStack->count, 1U);
    EXPECT_EQ(writer.length(), 16U);
  }
}

TEST(CloseHeaderFailure, ToAbandonLeavesTheWriteOffset)
{
  StreamWriter writer;
  writer.add(group64(kRoot));
  writer.handle()->pDirectData = nullptr;
  EXPECT_EQ(tavCloseHeader(1, writer.handle()), TAV_RC_NO_MEMORY);
  EXPECT_EQ(writer.length(), 16U);
  EXPECT_EQ(writer.handle()->pHdrStack->count, 1U);
}

TEST(CloseHeaderFailure, OfTheSizeAtTheEndOfTheBlockHandsItsCodeUp)
{
  StreamWriter writer({}, 64);
  writer.add(group64(kRoot, TAV_TYPE_HEADER64, 0, 0));
  writer.handle()->pHdrStack->top()->nodeOffset = 56;
  TraceLog trace;
  EXPECT_EQ(tavCloseHeader(0, writer.handle()), TAV_RC_END_OF_STORAGE);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::rawWrite, 30, TAV_RC_END_OF_STORAGE},
                                            Failure{probe::closeHeader, 50, TAV_RC_END_OF_STORAGE}));
}

TEST(CloseHeaderFailure, OfTheEndElementKeepsTheSizeThatWasWritten)
{
  StreamWriter writer(lowFirst(), 16 + 32); // the end element would end at the block's end
  writer.add(group64(kRoot, TAV_TYPE_HEADER64, TAV_INFO_EYE_SIZE));
  TraceLog trace;
  EXPECT_EQ(tavCloseHeader(0, writer.handle()), TAV_RC_END_OF_STORAGE);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::writeNode, 50, TAV_RC_END_OF_STORAGE},
                                            Failure{probe::addElement, 70, TAV_RC_END_OF_STORAGE},
                                            Failure{probe::closeHeader, 60, TAV_RC_END_OF_STORAGE}));
  EXPECT_EQ(writer.handle()->pDirectData[0], 32);
  ASSERT_EQ(writer.handle()->pHdrStack->count, 1U);
  EXPECT_EQ(writer.handle()->pHdrStack->top()->hdr64.size, 32U);
  EXPECT_EQ(writer.length(), 16U);
}

/// A storage that can be told not to go back before an offset.
class OneWayStorage : public VectorStorage
{
public:
  using VectorStorage::VectorStorage;

  uint32_t seek(uint64_t offset, uint64_t hint) override
  {
    return offset < firstOffset ? kRefusal : VectorStorage::seek(offset, hint);
  }

  static constexpr uint32_t kRefusal = 0x90000777; // no code of the library
  uint64_t firstOffset = 0;
};

/// A group whose header has left the ring, over a storage that does not lead back to it.
class OneWayStream
{
public:
  OneWayStream(uint32_t info, uint64_t size)
      : handle_(storage_, TAV_OPT_WRITE, {.buffered = true, .ringBytes = 128})
  {
    Element root = group64(kRoot, TAV_TYPE_HEADER64, info, size);
    TAVHeaderData data = root.data();
    check(tavAddElement(0, handle_.get(), &data), "tavAddElement");
    Element blob = binary(kBlob, Bytes(100));
    for (int i = 0; i < 10; ++i)
    {
      data = blob.data();
      check(tavAddElement(0, handle_.get(), &data), "tavAddElement");
    }
    storage_.firstOffset = 64;
  }
  TAVHandle* handle()
  {
    return handle_.get();
  }

private:
  OneWayStorage storage_;
  Handle handle_;
};

TEST(CloseHeaderOfAGroupOfUnknownSize, EndsItWithAnElementWhenTheSizeCannotBeWritten)
{
  OneWayStream stream(0, TAV_SIZE_UNKNOWN);
  const uint64_t before = stream.handle()->streamBytes;
  TraceLog trace;
  EXPECT_EQ(tavCloseHeader(0, stream.handle()), TAV_RC_OK); // the end element's code
  const std::vector<Failure> below = trace.failuresOf(probe::rawWrite);
  ASSERT_EQ(below.size(), 1U);
  EXPECT_THAT(trace.failuresOf(probe::closeHeader), ElementsAre(Failure{probe::closeHeader, 50, below[0].code}));
  EXPECT_EQ(trace.recordsOf(probe::closeHeader).back().code, TAV_RC_OK);
  EXPECT_EQ(stream.handle()->streamBytes, before + 32);
  EXPECT_EQ(stream.handle()->pHdrStack->count, 0U);
}

TEST(CloseHeaderOfAGroupOfUnknownSize, GetsNoElementWhenTheSizeWasWritten)
{
  StreamWriter writer;
  writer.add(group64(kRoot, TAV_TYPE_HEADER64, 0, TAV_SIZE_UNKNOWN));
  writer.close();
  EXPECT_EQ(writer.length(), 16U);
}

TEST(CloseHeaderOfAGroupOfUnknownSize, FailsAsTheElementFails)
{
  StreamWriter writer({}, 64);
  writer.add(group64(kRoot, TAV_TYPE_HEADER64, 0, TAV_SIZE_UNKNOWN));
  writer.handle()->pDirectData = nullptr;
  TraceLog trace;
  EXPECT_EQ(tavCloseHeader(0, writer.handle()), TAV_RC_NO_MEMORY);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::rawWrite, 20, TAV_RC_NO_MEMORY},
                                            Failure{probe::closeHeader, 50, TAV_RC_NO_MEMORY},
                                            Failure{probe::writeNode, 50, TAV_RC_NO_MEMORY},
                                            Failure{probe::addElement, 70, TAV_RC_NO_MEMORY},
                                            Failure{probe::closeHeader, 60, TAV_RC_NO_MEMORY}));
  EXPECT_EQ(writer.handle()->pHdrStack->count, 1U);
}

TEST(CloseHeaderOfAGroupOfKnownSize, GetsNoElementWhenTheSizeCannotBeWritten)
{
  OneWayStream stream(0, 0);
  const uint64_t before = stream.handle()->streamBytes;
  EXPECT_NE(tavCloseHeader(0, stream.handle()), TAV_RC_OK);
  EXPECT_EQ(stream.handle()->streamBytes, before);
  EXPECT_EQ(stream.handle()->pHdrStack->count, 1U);
}

TEST(CloseHeaderOfAGroupWithAPair, HasTheElementsCodeWhenAnUnknownSizeCannotBeWritten)
{
  OneWayStream stream(TAV_INFO_EYE_SIZE, TAV_SIZE_UNKNOWN);
  const uint64_t before = stream.handle()->streamBytes;
  EXPECT_EQ(tavCloseHeader(0, stream.handle()), TAV_RC_OK);
  EXPECT_EQ(stream.handle()->streamBytes, before + 32);
  EXPECT_EQ(stream.handle()->pHdrStack->count, 0U);
}

TEST(CloseHeaderOfAGroupWithAPair, GetsNoElementWhenAKnownSizeCannotBeWritten)
{
  OneWayStream stream(TAV_INFO_EYE_SIZE, 0);
  const uint64_t before = stream.handle()->streamBytes;
  TraceLog trace;
  const uint32_t rc = tavCloseHeader(0, stream.handle());
  EXPECT_NE(rc, TAV_RC_OK);
  EXPECT_THAT(trace.failuresOf(probe::closeHeader), ElementsAre(Failure{probe::closeHeader, 50, rc}));
  EXPECT_EQ(trace.recordsOf(probe::closeHeader).back().code, rc);
  EXPECT_THAT(trace.recordsOf(probe::addElement), ::testing::IsEmpty());
  EXPECT_EQ(stream.handle()->streamBytes, before);
  EXPECT_EQ(stream.handle()->pHdrStack->count, 1U);
}

} // namespace
