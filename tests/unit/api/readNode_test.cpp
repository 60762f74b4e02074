#include <cstdint>
#include <optional>
#include <utility>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "support/byteRows.h"
#include "support/streams.h"
#include "support/traceLog.h"
#include "tav/probes.h"
#include "tav/tav.h"

namespace
{

using namespace tav;
using namespace test;

constexpr uint16_t kElm = 0x1234;
constexpr uint32_t kRefused = 0x90000035;

class ReadNode : public ::testing::TestWithParam<Form>
{
protected:
  ByteRows rows{GetParam().swap};
  TAVHeaderData out = untouched();

  [[nodiscard]] bool buffered() const { return GetParam().buffered; }

  /// Reads the node at an offset of the rows, which stay where they are.
  uint32_t read(uint64_t offset, bool wide)
  {
    reader_.emplace(rows.bytes, GetParam());
    return tavReadNodeInt(0, reader_->handle(), offset, wide, &out);
  }

  void expectNoData() const
  {
    EXPECT_EQ(out.header.nodeOffset, 0U);
    EXPECT_EQ(out.pDataBuf, nullptr);
    EXPECT_EQ(out.dataBufSize, 0U);
    EXPECT_EQ(out.dataBufOffset, 0U);
  }

private:
  std::optional<StreamReader> reader_;
};

TEST_P(ReadNode, FillsEveryFieldOfAWideGroupAndLeavesItsDataEmpty)
{
  rows.h64(0x1122334455667788, 0x00400123, TAV_TYPE_HEADER64, kElm);
  ASSERT_EQ(read(0, true), TAV_RC_OK);
  EXPECT_EQ(out.header.hdrType, TAV_HDR_64);
  EXPECT_EQ(out.header.hdr64.size, 0x1122334455667788U);
  EXPECT_EQ(out.header.hdr64.info, 0x00400123U);
  EXPECT_EQ(out.header.hdr64.type, TAV_TYPE_HEADER64);
  EXPECT_EQ(out.header.hdr64.elm, kElm);
  expectNoData();
}

TEST_P(ReadNode, TakesAWideHeaderOfType1ForAGroup)
{
  rows.h64(0xFFFFFF, 0, TAV_TYPE_HEADER32, kElm);
  ASSERT_EQ(read(0, true), TAV_RC_OK);
  EXPECT_EQ(out.pDataBuf, nullptr);
  EXPECT_EQ(out.dataBufSize, 0U);
}

TEST_P(ReadNode, FillsEveryFieldOfANarrowGroup)
{
  rows.h32(0x11223344, TAV_TYPE_HEADER32, kElm);
  ASSERT_EQ(read(0, false), TAV_RC_OK);
  EXPECT_EQ(out.header.hdrType, TAV_HDR_32);
  EXPECT_EQ(out.header.hdr32.size, 0x11223344U);
  EXPECT_EQ(out.header.hdr32.type, TAV_TYPE_HEADER32);
  EXPECT_EQ(out.header.hdr32.elm, kElm);
  expectNoData();
}

TEST_P(ReadNode, PointsToTheDataOfAWideElementWithoutSwappingIt)
{
  rows.fill(24, 0xEE).h64(5, 0x7, TAV_TYPE_BINARY, kElm).data(hex("01 02 03 04 05")).fill(11, 0xEE);
  ASSERT_EQ(read(24, true), TAV_RC_OK);
  EXPECT_EQ(out.header.hdr64.size, 5U);
  EXPECT_EQ(out.header.hdr64.info, 7U);
  EXPECT_EQ(out.header.hdr64.type, TAV_TYPE_BINARY);
  EXPECT_EQ(out.header.nodeOffset, 24U);
  EXPECT_EQ(payloadOf(out, 5), hex("01 02 03 04 05"));
  EXPECT_EQ(out.dataBufOffset, 0U);
  EXPECT_EQ(out.dataBufSize, buffered() ? 5U : 16U) << "over memory: the whole rest of the block";
}

TEST_P(ReadNode, PointsToTheDataOfANarrowElement)
{
  rows.fill(3, 0xEE).h32(2, TAV_TYPE_UINT16, kElm).data(hex("AA BB")).fill(7, 0xEE);
  ASSERT_EQ(read(3, false), TAV_RC_OK);
  EXPECT_EQ(out.header.hdr32.size, 2U);
  EXPECT_EQ(out.header.nodeOffset, 3U);
  EXPECT_EQ(payloadOf(out, 2), hex("AA BB"));
  EXPECT_EQ(out.dataBufSize, buffered() ? 2U : 9U);
}

TEST_P(ReadNode, GivesAnElementOfSize0APointerToNothing)
{
  rows.h64(0, 0, TAV_TYPE_BINARY, kElm);
  ASSERT_EQ(read(0, true), TAV_RC_OK);
  EXPECT_NE(out.pDataBuf, nullptr);
  EXPECT_EQ(out.dataBufSize, 0U);
}

TEST_P(ReadNode, TakesDataThatEndsWithTheStream)
{
  rows.h64(3, 0, TAV_TYPE_BINARY, kElm).data(hex("01 02 03"));
  ASSERT_EQ(read(0, true), TAV_RC_OK);
  EXPECT_EQ(payloadOf(out, 3), hex("01 02 03"));
}

TEST_P(ReadNode, RefusesDataThatTheStreamCutsOff)
{
  rows.h64(4, 0, TAV_TYPE_BINARY, kElm).data(hex("01 02 03"));
  StreamReader reader(rows.bytes, GetParam());
  TraceLog trace;
  EXPECT_EQ(tavReadNodeInt(0, reader.handle(), 0, true, &out), TAV_RC_DATA_TOO_LARGE);
  EXPECT_THAT(trace.failuresOf(probe::readNode), ElementsAre(Failure{probe::readNode, 70, TAV_RC_DATA_TOO_LARGE}));
  EXPECT_EQ(out.header.hdr64.size, 4U);
  EXPECT_EQ(out.dataBufSize, 3U);
  EXPECT_EQ(payloadOf(out, 3), hex("01 02 03"));
}

TEST_P(ReadNode, RefusesDataOfTheLargestSize)
{
  rows.h64(~uint64_t{0}, 0, TAV_TYPE_BINARY, kElm).data(hex("01 02 03"));
  StreamReader reader(rows.bytes, GetParam());
  EXPECT_EQ(tavReadNodeInt(0, reader.handle(), 0, true, &out), TAV_RC_DATA_TOO_LARGE);
  EXPECT_EQ(out.dataBufSize, 3U);
}

TEST_P(ReadNode, RefusesAHeaderThatTheStreamCutsOff)
{
  for (const bool wide : {true, false})
  {
    rows.bytes.assign(wide ? 15 : 7, 0);
    StreamReader reader(rows.bytes, GetParam());
    TraceLog trace;
    out = untouched();
    const uint32_t expected = buffered() ? TAV_RC_END_OF_STORAGE : TAV_RC_NO_MEMORY;
    EXPECT_EQ(tavReadNodeInt(0, reader.handle(), 0, wide, &out), expected);
    EXPECT_THAT(trace.failuresOf(probe::readNode),
                ElementsAre(Failure{probe::readNode, buffered() ? 40U : 60U, expected}));
    EXPECT_EQ(out.pDataBuf, nullptr);
    EXPECT_EQ(out.dataBufSize, 0U);
    EXPECT_EQ(out.dataBufOffset, 0U);
    EXPECT_EQ(out.header.nodeOffset, 0U);
  }
}

TEST_P(ReadNode, RefusesOffsetsAtTheEndAndBeyond)
{
  rows.fill(32);
  StreamReader reader(rows.bytes, GetParam());
  for (const uint64_t offset : {uint64_t{32}, uint64_t{33}, ~uint64_t{0} - 15, ~uint64_t{0} - 7, ~uint64_t{0}})
  {
    for (const bool wide : {true, false})
    {
      out = untouched();
      EXPECT_EQ(tavReadNodeInt(0, reader.handle(), offset, wide, &out),
                buffered() ? TAV_RC_END_OF_STORAGE : TAV_RC_NO_MEMORY)
          << offset;
      EXPECT_EQ(out.pDataBuf, nullptr);
      EXPECT_EQ(out.header.nodeOffset, offset);
    }
  }
}

TEST_P(ReadNode, IgnoresItsOptions)
{
  rows.h64(0, 0, TAV_TYPE_HEADER64, kElm);
  StreamReader reader(rows.bytes, GetParam());
  EXPECT_EQ(tavReadNodeInt(~uint64_t{0}, reader.handle(), 0, true, &out), TAV_RC_OK);
}

TEST_P(ReadNode, ReadsThroughAHandleForWriting)
{
  StreamWriter writer(GetParam());
  writer.add(group64(kElm));
  EXPECT_EQ(tavReadNodeInt(0, writer.handle(), 0, true, &out), TAV_RC_OK);
  EXPECT_EQ(out.header.hdr64.elm, kElm);
}

TEST_P(ReadNode, TracesEntryArgumentsResultAndExit)
{
  rows.h64(0, 0, TAV_TYPE_HEADER64, kElm);
  StreamReader reader(rows.bytes, GetParam());
  TraceLog trace;
  ASSERT_EQ(tavReadNodeInt(9, reader.handle(), 0, true, &out), TAV_RC_OK);
  EXPECT_THAT(trace.stepsOf(probe::readNode),
              ElementsAre(Step{KOR_TRACE_ENTRY, probe::readNode, 0}, Step{KOR_TRACE_VAR, probe::readNode, 0},
                          Step{KOR_TRACE_VAR, probe::readNode, 100}, Step{KOR_TRACE_EXIT, probe::readNode, 0}));
  EXPECT_THAT(trace.dump(probe::readNode, 0).items,
              ElementsAre(bytesOf(uint64_t{9}), bytesOf(reader.handle()), bytesOf(uint64_t{0}), bytesOf(true),
                          bytesOf(&out)));
  EXPECT_THAT(trace.dump(probe::readNode, 100).items, ElementsAre(bytesOf(out)));
  EXPECT_EQ(trace.records().back().code, TAV_RC_OK);
}

INSTANTIATE_TEST_SUITE_P(Forms, ReadNode, ::testing::ValuesIn(accessAndOrder()), kFormName);

TEST(ReadNodeArguments, CheckTheHandleFirst)
{
  TraceLog trace;
  EXPECT_EQ(tavReadNodeInt(0, nullptr, 0, true, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_THAT(trace.steps(),
              ElementsAre(Step{KOR_TRACE_ENTRY, probe::readNode, 0}, Step{KOR_TRACE_VAR, probe::readNode, 0},
                          Step{KOR_TRACE_ERROR, probe::readNode, 10}, Step{KOR_TRACE_EXIT, probe::readNode, 0}));
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::readNode, 10, TAV_RC_BAD_PARAM}));
  EXPECT_EQ(trace.records().back().code, TAV_RC_BAD_PARAM);
}

TEST(ReadNodeArguments, LeaveTheDescriptorUntouchedWithoutAHandle)
{
  TAVHeaderData out = untouched();
  EXPECT_EQ(tavReadNodeInt(0, nullptr, 0, true, &out), TAV_RC_BAD_PARAM);
  EXPECT_TRUE(sameBytes(out, untouched()));
}

TEST(ReadNodeArguments, CheckTheDescriptorNext)
{
  StreamReader reader(Bytes(32));
  TraceLog trace;
  EXPECT_EQ(tavReadNodeInt(0, reader.handle(), 0, true, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::readNode, 20, TAV_RC_BAD_PARAM}));
}

TEST(ReadNodeThroughARing, NeedsTheRing)
{
  StreamReader reader(Bytes(32), onePage());
  TAVCircularBuf* const ring = std::exchange(reader.handle()->pCircularBuf, nullptr);
  TAVHeaderData out = untouched();
  TraceLog trace;
  EXPECT_EQ(tavReadNodeInt(0, reader.handle(), 7, true, &out), TAV_RC_NO_CIRCULAR_BUF);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::readNode, 30, TAV_RC_NO_CIRCULAR_BUF}));
  EXPECT_EQ(out.pDataBuf, nullptr);
  EXPECT_EQ(out.dataBufSize, 0U);
  EXPECT_EQ(out.dataBufOffset, 0U);
  EXPECT_EQ(out.header.nodeOffset, 7U);
  reader.handle()->pCircularBuf = ring;
}

TEST(ReadNodeThroughARing, TakesANarrowHeaderOfType2ForAGroup)
{
  Form form = onePage();
  StreamReader reader(ByteRows().h32(0x7FFF, TAV_TYPE_HEADER64, kElm).bytes, form);
  TAVHeaderData out = untouched();
  EXPECT_EQ(tavReadNodeInt(0, reader.handle(), 0, false, &out), TAV_RC_OK);
  EXPECT_EQ(out.pDataBuf, nullptr);
}

TEST(ReadNodeThroughARing, CompletesAHeaderThatAPageCuts)
{
  StreamReader reader(ByteRows().fill(9).h64(3, 0x55, TAV_TYPE_HEADER64, kElm).bytes, onePage());
  TAVHeaderData out = untouched();
  ASSERT_EQ(tavReadNodeInt(0, reader.handle(), 0, false, &out), TAV_RC_OK);
  ASSERT_EQ(tavReadNodeInt(0, reader.handle(), 9, true, &out), TAV_RC_OK);
  EXPECT_EQ(out.header.hdr64.size, 3U);
  EXPECT_EQ(out.header.hdr64.info, 0x55U);
  EXPECT_EQ(out.header.hdr64.elm, kElm);
}

TEST(ReadNodeThroughARing, BringsDataThatTheCachedRangeCutsIntoTheRingWhole)
{
  Form form = onePage();
  form.ringBytes = 32;
  ByteRows rows;
  rows.h32(0, TAV_TYPE_BINARY, 1).h32(32, TAV_TYPE_BINARY, kElm);
  for (uint8_t i = 0; i < 32; ++i)
  {
    rows.fill(1, i);
  }
  StreamReader reader(rows.bytes, form);
  TAVHeaderData out = untouched();
  ASSERT_EQ(tavReadNodeInt(0, reader.handle(), 0, false, &out), TAV_RC_OK);
  ASSERT_EQ(tavReadNodeInt(0, reader.handle(), 8, false, &out), TAV_RC_OK);
  EXPECT_EQ(out.dataBufSize, 32U);
  EXPECT_EQ(payloadOf(out, 32), Bytes(rows.bytes.begin() + 16, rows.bytes.end()));
}

TEST(ReadNodeThroughARing, RefusesDataLargerThanTheRingWithoutEmptyingIt)
{
  StreamReader reader(ByteRows().h32(17, TAV_TYPE_BINARY, kElm).fill(17).bytes, onePage());
  TAVHeaderData out = untouched();
  TraceLog trace;
  EXPECT_EQ(tavReadNodeInt(0, reader.handle(), 0, false, &out), TAV_RC_DATA_TOO_LARGE);
  EXPECT_THAT(trace.failuresOf(probe::readNode), ElementsAre(Failure{probe::readNode, 70, TAV_RC_DATA_TOO_LARGE}));
  EXPECT_THAT(trace.recordsOf(probe::cbReposition), IsEmpty());
}

TEST(ReadNodeThroughARing, DoesNotFetchDataOfSize0)
{
  StreamReader reader(ByteRows().h64(0, 0, TAV_TYPE_BINARY, kElm).bytes, onePage());
  TAVHeaderData out = untouched();
  TraceLog trace;
  ASSERT_EQ(tavReadNodeInt(0, reader.handle(), 0, true, &out), TAV_RC_OK);
  uint32_t fetches = 0;
  for (const Step& step : trace.stepsOf(probe::cbGetChunk))
  {
    fetches += step.kind == KOR_TRACE_ENTRY ? 1 : 0;
  }
  EXPECT_EQ(fetches, 1U);
}

TEST(ReadNodeThroughARing, LeavesTheChunkOfTheDataInTheHandle)
{
  Form form = onePage();
  form.ringBytes = 64;
  StreamReader reader(ByteRows().h64(4, 0, TAV_TYPE_BINARY, kElm).data(hex("01 02 03 04")).bytes, form);
  TAVHeaderData out = untouched();
  ASSERT_EQ(tavReadNodeInt(0, reader.handle(), 0, true, &out), TAV_RC_OK);
  EXPECT_EQ(reader.handle()->curOffset, 16U);
  EXPECT_EQ(reader.handle()->pDirectData, out.pDataBuf);
  EXPECT_EQ(reader.handle()->directDataSize, 4U);
}

TEST(ReadNodeThroughARing, PassesTheCodeOfAHeaderFetchOn)
{
  StreamReader reader(ByteRows().h64(4, 0, TAV_TYPE_BINARY, kElm).fill(4).bytes, onePage());
  const TAVHandle before = *reader.handle();
  reader.vectorStorage().failAt(1, kRefused);
  TAVHeaderData out = untouched();
  TraceLog trace;
  EXPECT_EQ(tavReadNodeInt(0, reader.handle(), 0, true, &out), kRefused);
  EXPECT_THAT(trace.failuresOf(probe::readNode), ElementsAre(Failure{probe::readNode, 40, kRefused}));
  EXPECT_EQ(out.pDataBuf, nullptr);
  EXPECT_EQ(reader.handle()->curOffset, before.curOffset);
  EXPECT_EQ(reader.handle()->pDirectData, before.pDirectData);
  EXPECT_EQ(reader.handle()->directDataSize, before.directDataSize);
}

TEST(ReadNodeThroughARing, PassesTheCodeOfADataFetchOnAndStillSetsTheDescriptor)
{
  StreamReader reader(ByteRows().h64(4, 0, TAV_TYPE_BINARY, kElm).fill(4).bytes, onePage());
  reader.handle()->pDirectData = reader.handle()->pCircularBuf->pRing;
  reader.handle()->directDataSize = 3;
  reader.vectorStorage().failAt(2, kRefused);
  TAVHeaderData out = untouched();
  TraceLog trace;
  EXPECT_EQ(tavReadNodeInt(0, reader.handle(), 0, true, &out), kRefused);
  EXPECT_THAT(trace.failuresOf(probe::readNode), ElementsAre(Failure{probe::readNode, 40, kRefused}));
  EXPECT_EQ(out.header.hdr64.size, 4U);
  EXPECT_EQ(out.pDataBuf, reader.handle()->pDirectData);
  EXPECT_EQ(out.dataBufSize, 3U);
  EXPECT_EQ(out.dataBufOffset, 0U);
}

TEST(ReadNodeOverMemory, NeedsTheBlock)
{
  StreamReader reader(Bytes(32));
  reader.handle()->pDirectData = nullptr;
  TAVHeaderData out = untouched();
  TraceLog trace;
  EXPECT_EQ(tavReadNodeInt(0, reader.handle(), 0, true, &out), TAV_RC_NO_MEMORY);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::readNode, 50, TAV_RC_NO_MEMORY}));
}

TEST(ReadNodeOverMemory, TakesANarrowHeaderOfType2ForADataElement)
{
  StreamReader reader(ByteRows().h32(2, TAV_TYPE_HEADER64, kElm).fill(6).bytes);
  TAVHeaderData out = untouched();
  ASSERT_EQ(tavReadNodeInt(0, reader.handle(), 0, false, &out), TAV_RC_OK);
  EXPECT_EQ(out.pDataBuf, reader.handle()->pDirectData + 8);
  EXPECT_EQ(out.dataBufSize, 6U);
}

TEST(ReadNodeOverMemory, DoesNotCompareTheSizeOfANarrowHeaderOfType2WithTheBlock)
{
  StreamReader reader(ByteRows().h32(0xFFFFFFFF, TAV_TYPE_HEADER64, kElm).fill(6).bytes);
  TAVHeaderData out = untouched();
  EXPECT_EQ(tavReadNodeInt(0, reader.handle(), 0, false, &out), TAV_RC_OK);
}

TEST(ReadNodeOverMemory, FailsForRoomAtAnOffsetEqualToTheSize)
{
  StreamReader reader(Bytes(16));
  TAVHeaderData out = untouched();
  TraceLog trace;
  EXPECT_EQ(tavReadNodeInt(0, reader.handle(), 16, true, &out), TAV_RC_NO_MEMORY);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::readNode, 60, TAV_RC_NO_MEMORY}));
}

TEST(ReadNodeOverMemory, SetsTheFormOnceTheOffsetLiesInTheBlock)
{
  StreamReader reader(Bytes(16));
  TAVHeaderData out = untouched();
  const uint16_t before = out.header.hdrType;
  EXPECT_EQ(tavReadNodeInt(0, reader.handle(), 17, true, &out), TAV_RC_NO_MEMORY);
  EXPECT_EQ(out.header.hdrType, before);
  EXPECT_EQ(tavReadNodeInt(0, reader.handle(), 16, true, &out), TAV_RC_NO_MEMORY);
  EXPECT_EQ(out.header.hdrType, TAV_HDR_64);
}

TEST(ReadNodeOverMemory, DoesNotChangeTheHandle)
{
  StreamReader reader(ByteRows().h64(4, 0, TAV_TYPE_BINARY, kElm).fill(3).bytes);
  const TAVHandle before = *reader.handle();
  TAVHeaderData out = untouched();
  EXPECT_EQ(tavReadNodeInt(0, reader.handle(), 0, true, &out), TAV_RC_DATA_TOO_LARGE);
  EXPECT_EQ(tavReadNodeInt(0, reader.handle(), 90, true, &out), TAV_RC_NO_MEMORY);
  EXPECT_TRUE(sameBytes(*reader.handle(), before));
}

/// A block of 64 bytes whose first byte is byte 32 of the stream: narrow headers, every second one a group's.
class ReadNodeInALaterBlock : public ::testing::Test
{
protected:
  ReadNodeInALaterBlock() { reader.handle()->curOffset = 32; }
  uint32_t read(uint64_t offset, bool wide) { return tavReadNodeInt(0, reader.handle(), offset, wide, &out); }
  static Bytes bytes()
  {
    ByteRows rows;
    for (uint16_t i = 0; i < 8; ++i)
    {
      rows.h32(i, i % 2 == 1 ? TAV_TYPE_HEADER32 : TAV_TYPE_BINARY, i);
    }
    return rows.bytes;
  }

  StreamReader reader{bytes()};
  TAVHeaderData out = untouched();
};

TEST_F(ReadNodeInALaterBlock, CountsFromTheBlocksOffset)
{
  ASSERT_EQ(read(40, false), TAV_RC_OK);
  EXPECT_EQ(out.header.hdr32.elm, 1U);
  EXPECT_EQ(out.header.nodeOffset, 40U);
}

TEST_F(ReadNodeInALaterBlock, PointsIntoTheBlock)
{
  ASSERT_EQ(read(32, false), TAV_RC_OK);
  EXPECT_EQ(out.pDataBuf, reader.handle()->pDirectData + 8);
  EXPECT_EQ(out.dataBufSize, 56U);
}

TEST_F(ReadNodeInALaterBlock, RefusesWhatLiesBefore)
{
  EXPECT_EQ(read(31, false), TAV_RC_NO_MEMORY);
  EXPECT_EQ(read(0, true), TAV_RC_NO_MEMORY);
}

TEST_F(ReadNodeInALaterBlock, MeasuresTheRoomFromTheAbsoluteOffset)
{
  EXPECT_EQ(read(48, true), TAV_RC_OK);
  EXPECT_EQ(read(49, true), TAV_RC_NO_MEMORY) << "47 bytes of the block lie behind it all the same";
  EXPECT_EQ(read(56, false), TAV_RC_OK);
  EXPECT_EQ(read(57, false), TAV_RC_NO_MEMORY);
}

TEST_F(ReadNodeInALaterBlock, HasNoRoomBehindAnAbsoluteOffsetLargerThanTheBlock)
{
  for (const uint64_t offset : {64U, 65U, 80U, 95U, 96U, 97U})
  {
    EXPECT_EQ(read(offset, true), TAV_RC_NO_MEMORY) << offset;
    EXPECT_EQ(read(offset, false), TAV_RC_NO_MEMORY) << offset;
  }
}

} // namespace
