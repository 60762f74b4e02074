#include <bit>
#include <cstdint>
#include <cstring>
#include <memory>
#include <ostream>
#include <string>
#include <vector>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "api/printer.h"
#include "support/elements.h"
#include "support/printing.h"
#include "support/rows.h"
#include "support/traceLog.h"
#include "tav/probes.h"

namespace
{

using namespace tav;
using namespace tav::inside;
using namespace test;
using namespace std::string_literals;

constexpr bool kLittle = std::endian::native == std::endian::little;

/// A node over a heap block of exactly its bytes, and a context of either byte order.
class PrintValue
{
public:
  PrintValue(uint16_t type, const Bytes& bytes, bool swap, bool wide = true)
      : block_(new uint8_t[bytes.size()]), swap_(swap)
  {
    std::copy(bytes.begin(), bytes.end(), block_.get());
    node.header = wide ? header64(bytes.size(), type, 1) : header32(static_cast<uint32_t>(bytes.size()), type, 1);
    node.pDataBuf = block_.get();
    node.dataBufSize = bytes.size();
  }

  Printed operator()()
  {
    CaughtStream stream;
    TAVPrintCtx ctx = printContext(stream.get(), 0, swap_);
    const uint32_t rc = tavPrintValue(&ctx, &node);
    return {rc, ctx.bytesWritten, stream.text()};
  }

  TAVHeaderData node{};

private:
  std::unique_ptr<uint8_t[]> block_;
  bool swap_;
};

struct ValueRow : Row
{
  uint16_t type;
  Bytes littleEndian;
  Bytes bigEndian;
  std::string text;
};

const ValueRow kValues[] = {
    {"AsciiString", 50, {'h', 'e', 'l', 'l', 'o'}, {'h', 'e', 'l', 'l', 'o'}, "hello"},
    {"AsciiStringOfOne", 50, {'x'}, {'x'}, "x"},
    {"AsciiStringEmpty", 50, {}, {}, ""},
    {"AsciiStringUpToItsNul", 50, {'a', 'b', 0, 'c'}, {'a', 'b', 0, 'c'}, "ab"},
    {"AsciiStringWithAFormat", 50, {'%', 's', '%', 'n'}, {'%', 's', '%', 'n'}, "%s%n"},
    {"AsciiStringWithMarkup", 50, {'<', '&', '>'}, {'<', '&', '>'}, "<&>"},
    {"Uint8IsHexadecimal", 51, {0x0A}, {0x0A}, "0A"},
    {"Uint8Zero", 51, {0x00}, {0x00}, "00"},
    {"Uint8Largest", 51, {0xFF}, {0xFF}, "FF"},
    {"Sint8IsACharacter", 52, {0x41}, {0x41}, "A"},
    {"Sint8Negative", 52, {0xFF}, {0xFF}, "\xFF"},
    {"Sint8Zero", 52, {0x00}, {0x00}, "\0"s},
    {"Uint16", 53, {0x01, 0x02}, {0x02, 0x01}, "513"},
    {"Uint16Largest", 53, {0xFF, 0xFF}, {0xFF, 0xFF}, "65535"},
    {"Sint16", 54, {0x01, 0x02}, {0x02, 0x01}, "513"},
    {"Sint16Negative", 54, {0xFE, 0xFF}, {0xFF, 0xFE}, "-2"},
    {"Sint16Smallest", 54, {0x00, 0x80}, {0x80, 0x00}, "-32768"},
    {"Uint32", 55, {0x04, 0x03, 0x02, 0x01}, {0x01, 0x02, 0x03, 0x04}, "16909060"},
    {"Uint32Largest", 55, {0xFF, 0xFF, 0xFF, 0xFF}, {0xFF, 0xFF, 0xFF, 0xFF}, "4294967295"},
    {"Sint32", 56, {0x04, 0x03, 0x02, 0x01}, {0x01, 0x02, 0x03, 0x04}, "16909060"},
    {"Sint32Negative", 56, {0xF9, 0xFF, 0xFF, 0xFF}, {0xFF, 0xFF, 0xFF, 0xF9}, "-7"},
    {"Sint32Smallest", 56, {0x00, 0x00, 0x00, 0x80}, {0x80, 0x00, 0x00, 0x00}, "-2147483648"},
    {"Uint64", 57, {8, 7, 6, 5, 4, 3, 2, 1}, {1, 2, 3, 4, 5, 6, 7, 8}, "72623859790382856"},
    {"Uint64Largest", 57, Bytes(8, 0xFF), Bytes(8, 0xFF), "18446744073709551615"},
    {"Sint64", 58, {8, 7, 6, 5, 4, 3, 2, 1}, {1, 2, 3, 4, 5, 6, 7, 8}, "72623859790382856"},
    {"Sint64Smallest", 58, {0, 0, 0, 0, 0, 0, 0, 0x80}, {0x80, 0, 0, 0, 0, 0, 0, 0}, "-9223372036854775808"},
    {"Sint64MinusOne", 58, Bytes(8, 0xFF), Bytes(8, 0xFF), "-1"},
    {"Binary", 101, {0x00, 0x01, 0xAB, 0xFF}, {0x00, 0x01, 0xAB, 0xFF}, "0001ABFF"},
    {"BinaryEmpty", 101, {}, {}, ""},
    {"ByteIsACharacter", 105, {0x42}, {0x42}, "B"},
    {"ByteLargest", 105, {0xFF}, {0xFF}, "\xFF"},
    {"ByteZero", 105, {0x00}, {0x00}, "\0"s},
    {"Uint64ArrayEmpty", 106, {}, {}, ""},
    {"Uint64ArrayOfOne", 106, {7, 0, 0, 0, 0, 0, 0, 0}, {0, 0, 0, 0, 0, 0, 0, 7}, "7"},
    {"Uint64ArrayWithoutSeparators",
     106,
     {1, 0, 0, 0, 0, 0, 0, 0, 0xFF, 0xFF, 0xFF, 0xFF, //
      0xFF, 0xFF, 0xFF, 0xFF, 0x0A, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00},
     {0, 0, 0, 0, 0, 0, 0, 1, 0xFF, 0xFF, 0xFF, 0xFF, //
      0xFF, 0xFF, 0xFF, 0xFF, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x0A},
     "11844674407370955161510"},
};

// seconds; fraction A, fraction B, further field; offset
const ValueRow kTimestamps[] = {
    {"Epoch", 100, Bytes(16, 0), Bytes(16, 0), "1970-01-01-00.00.00.0000000000"},
    {"HourWest",
     100,
     {0x10, 0x0E, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0xC4, 0xFF},
     {0, 0, 0, 0, 0, 0, 0x0E, 0x10, 0, 0, 0, 0, 0, 0, 0xFF, 0xC4},
     "1970-01-01-00.00.00.000000-060"},
    // 2024-01-15 10:30:00, A 5999, B 321, 90 minutes east: 5999 / 1000 + 321 = 326
    {"FractionsAndHalfHour",
     100,
     {0x28, 0x09, 0xA5, 0x65, 0, 0, 0, 0, 0x6F, 0x17, 0x41, 0x01, 0xAB, 0xCD, 0x5A, 0x00},
     {0, 0, 0, 0, 0x65, 0xA5, 0x09, 0x28, 0x17, 0x6F, 0x01, 0x41, 0xCD, 0xAB, 0x00, 0x5A},
     "2024-01-15-12.00.00.0003260090"},
    // 65535 / 1000 + 65535 = 65600; the further field is not shown
    {"LargestFractions",
     100,
     {0x28, 0x09, 0xA5, 0x65, 0, 0, 0, 0, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0x00, 0x00},
     {0, 0, 0, 0, 0x65, 0xA5, 0x09, 0x28, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0x00, 0x00},
     "2024-01-15-10.30.00.0656000000"},
    {"WideOffset",
     100,
     {0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0xFF, 0x7F},
     {0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0x7F, 0xFF},
     "1970-01-23-18.07.00.00000032767"},
    {"LastDayOfALeapYearHasNoMonth",
     100,
     {0x00, 0x34, 0x73, 0x67, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0},
     {0, 0, 0, 0, 0x67, 0x73, 0x34, 0x00, 0, 0, 0, 0, 0, 0, 0, 0},
     "2025-00-00-00.00.00.0000000000"},
    {"FarYearHasFiveDigits",
     100,
     {0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0, 0, 0, 0, 0, 0, 0, 0},
     {0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0, 0, 0, 0, 0, 0, 0, 0},
     "64723-06-03-07.00.15.0000000000"},
};

class PrintedValue : public ::testing::TestWithParam<ValueRow>
{
};

TEST_P(PrintedValue, IsItsTextInHostOrder)
{
  PrintValue print(GetParam().type, kLittle ? GetParam().littleEndian : GetParam().bigEndian, false);
  EXPECT_EQ(print(), printed(TAV_RC_OK, GetParam().text));
}

TEST_P(PrintedValue, IsItsTextInTheOtherOrder)
{
  PrintValue print(GetParam().type, kLittle ? GetParam().bigEndian : GetParam().littleEndian, true);
  EXPECT_EQ(print(), printed(TAV_RC_OK, GetParam().text));
}

TEST_P(PrintedValue, IsTheSameBehindA32BitHeader)
{
  PrintValue print(GetParam().type, kLittle ? GetParam().littleEndian : GetParam().bigEndian, false, false);
  EXPECT_EQ(print(), printed(TAV_RC_OK, GetParam().text));
}

TEST_P(PrintedValue, MayStandAtAnyAddress)
{
  Bytes shifted = kLittle ? GetParam().littleEndian : GetParam().bigEndian;
  shifted.insert(shifted.begin(), 0xEE);
  PrintValue print(GetParam().type, shifted, false);
  print.node.header.hdr64.size -= 1;
  print.node.pDataBuf += 1;
  print.node.dataBufSize -= 1;
  EXPECT_EQ(print(), printed(TAV_RC_OK, GetParam().text));
}

TEST_P(PrintedValue, NeedsNoBufferSize)
{
  PrintValue print(GetParam().type, kLittle ? GetParam().littleEndian : GetParam().bigEndian, false);
  print.node.dataBufSize = 0;
  EXPECT_EQ(print(), printed(TAV_RC_OK, GetParam().text));
}

TEST_P(PrintedValue, LeavesTheDataAsItWas)
{
  const Bytes before = GetParam().littleEndian;
  PrintValue print(GetParam().type, before, true);
  ASSERT_EQ(print().rc, TAV_RC_OK);
  EXPECT_EQ(Bytes(print.node.pDataBuf, print.node.pDataBuf + before.size()), before);
}

std::string valueName(const ::testing::TestParamInfo<ValueRow>& row)
{
  return row.param.name;
}

INSTANTIATE_TEST_SUITE_P(OfType, PrintedValue, ::testing::ValuesIn(kValues), valueName);
INSTANTIATE_TEST_SUITE_P(Timestamp, PrintedValue, ::testing::ValuesIn(kTimestamps), valueName);

const Bytes kSixteen{0x00, 0x01, 0x02, 0x03, 0x04, 0x05, 0x06, 0x07, 0x08, 0x09, 0x0A, 0x0B, 0x0C, 0x0D, 0x0E, 0x0F};

TEST(PrintedUint128, IsItsBytesInHostOrder)
{
  EXPECT_EQ(PrintValue(TAV_TYPE_UINT128, kSixteen, false)(), printed(TAV_RC_OK, "000102030405060708090A0B0C0D0E0F"));
}

TEST(PrintedUint128, IsReversedAsOneUnitInTheOtherOrder)
{
  EXPECT_EQ(PrintValue(TAV_TYPE_UINT128, kSixteen, true)(), printed(TAV_RC_OK, "0F0E0D0C0B0A09080706050403020100"));
}

TEST(PrintedUint128, KeepsTheBytesBeyondItsUnit)
{
  Bytes longer = kSixteen;
  longer.insert(longer.end(), {0xAA, 0xBB});
  EXPECT_EQ(PrintValue(TAV_TYPE_UINT128, longer, true)(), printed(TAV_RC_OK, "0F0E0D0C0B0A09080706050403020100AABB"));
}

TEST(PrintedUint128, MayHaveAnySizeInHostOrder)
{
  EXPECT_EQ(PrintValue(TAV_TYPE_UINT128, {0x12, 0x34}, false)(), printed(TAV_RC_OK, "1234"));
  EXPECT_EQ(PrintValue(TAV_TYPE_UINT128, {}, false)(), printed(TAV_RC_OK, ""));
}

TEST(PrintedUint64Array, OfMoreThan255UnitsIsWhole)
{
  for (const size_t units : {255U, 256U, 257U, 600U})
  {
    EXPECT_EQ(PrintValue(TAV_TYPE_UINT64_ARRAY, Bytes(units * 8, 0), false)(),
              printed(TAV_RC_OK, std::string(units, '0')));
  }
}

TEST(PrintedAsciiString, OfTheLargestSizesEndsAtItsNul)
{
  for (const uint64_t size : {uint64_t{1} << 63U, ~uint64_t{0}})
  {
    PrintValue print(TAV_TYPE_ASCII_STRING, {'t', 'e', 'x', 't', 0, 'x'}, false);
    print.node.header.hdr64.size = size;
    EXPECT_EQ(print(), printed(TAV_RC_OK, "text"));
  }
}

TEST(PrintedAsciiString, OfTheLargestSizesNeedsNoBufferSize)
{
  PrintValue print(TAV_TYPE_ASCII_STRING, {'t', 'e', 'x', 't', 0}, false);
  print.node.header.hdr64.size = uint64_t{1} << 63U;
  print.node.dataBufSize = 0;
  EXPECT_EQ(print(), printed(TAV_RC_OK, "text"));
}

TEST(PrintedAsciiString, OfTheLargestSizesEndsWithTheBytesAtHand)
{
  PrintValue print(TAV_TYPE_ASCII_STRING, {'t', 'e', 'x', 't'}, false);
  print.node.header.hdr64.size = ~uint64_t{0};
  EXPECT_EQ(print(), printed(TAV_RC_OK, "text"));
}

TEST(PrintedAsciiString, OfMoreThan31BitsEndsAtItsNul)
{
  for (const uint64_t size : {uint64_t{1} << 31U, (uint64_t{1} << 32U) + 1, (uint64_t{1} << 63U) - 1})
  {
    PrintValue print(TAV_TYPE_ASCII_STRING, {'t', 'e', 'x', 't', 0}, false);
    print.node.header.hdr64.size = size;
    print.node.dataBufSize = size;
    EXPECT_EQ(print(), printed(TAV_RC_OK, "text"));
  }
}

/// A size that does not fit its type.
struct SizeRow
{
  uint16_t type;
  uint64_t exact; ///< the only size that fits
  uint64_t unit;  ///< bytes that the other byte order reverses
};

void PrintTo(const SizeRow& row, std::ostream* out)
{
  *out << "type " << row.type;
}

class SizeOfType : public ::testing::TestWithParam<SizeRow>
{
};

TEST_P(SizeOfType, IsExact)
{
  for (uint64_t size = 0; size <= 24; ++size)
  {
    if (size == GetParam().exact)
    {
      continue;
    }
    PrintValue print(GetParam().type, Bytes(size, 0x31), false);
    TraceLog trace;
    EXPECT_EQ(print(), printed(TAV_RC_OUTSIDE_PARENT, "")) << size;
    EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::printValue, 70, TAV_RC_OUTSIDE_PARENT})) << size;
  }
}

TEST_P(SizeOfType, IsExactInTheOtherOrderToo)
{
  for (uint64_t size = 0; size <= 24; ++size)
  {
    if (size == GetParam().exact)
    {
      continue;
    }
    PrintValue print(GetParam().type, Bytes(size, 0x31), true);
    const uint32_t point = size < GetParam().unit ? 50 : 70;
    TraceLog trace;
    EXPECT_EQ(print(), printed(TAV_RC_OUTSIDE_PARENT, "")) << size;
    EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::printValue, point, TAV_RC_OUTSIDE_PARENT})) << size;
  }
}

INSTANTIATE_TEST_SUITE_P(Each, SizeOfType,
                         ::testing::Values(SizeRow{51, 1, 0}, SizeRow{52, 1, 0}, SizeRow{53, 2, 2}, SizeRow{54, 2, 2},
                                           SizeRow{55, 4, 4}, SizeRow{56, 4, 4}, SizeRow{57, 8, 8}, SizeRow{58, 8, 8},
                                           SizeRow{100, 16, 16}, SizeRow{105, 1, 0}),
                         [](const auto& row) { return "Type" + std::to_string(row.param.type); });

TEST(SizeOfUint64Array, IsAMultipleOf8)
{
  for (const uint64_t size : {1U, 7U, 9U, 12U, 2047U})
  {
    PrintValue print(TAV_TYPE_UINT64_ARRAY, Bytes(size, 0), false);
    TraceLog trace;
    EXPECT_EQ(print(), printed(TAV_RC_OUTSIDE_PARENT, "")) << size;
    EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::printValue, 70, TAV_RC_OUTSIDE_PARENT})) << size;
  }
}

TEST(SizeOfUint64Array, IsAMultipleOf8InTheOtherOrderToo)
{
  PrintValue print(TAV_TYPE_UINT64_ARRAY, Bytes(12, 0), true);
  TraceLog trace;
  EXPECT_EQ(print(), printed(TAV_RC_OUTSIDE_PARENT, ""));
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::printValue, 50, TAV_RC_OUTSIDE_PARENT}));
}

TEST(SizeOfUint128, HoldsItsUnitInTheOtherOrder)
{
  for (uint64_t size = 0; size < 16; ++size)
  {
    PrintValue print(TAV_TYPE_UINT128, Bytes(size, 0), true);
    TraceLog trace;
    EXPECT_EQ(print(), printed(TAV_RC_OUTSIDE_PARENT, "")) << size;
    EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::printValue, 50, TAV_RC_OUTSIDE_PARENT})) << size;
  }
}

/// A type without a printed form; below `unit` bytes the other byte order sees a size that does not fit first.
struct UnprintableRow
{
  uint16_t type;
  uint64_t unit;
};

void PrintTo(const UnprintableRow& row, std::ostream* out)
{
  *out << "type " << row.type;
}

class UnprintableType : public ::testing::TestWithParam<UnprintableRow>
{
};

TEST_P(UnprintableType, IsRefusedWithAnySize)
{
  for (const uint64_t size : {0U, 1U, 2U, 15U, 16U, 17U})
  {
    PrintValue print(GetParam().type, Bytes(size, 0x31), false);
    TraceLog trace;
    EXPECT_EQ(print(), printed(TAV_RC_NOT_SUPPORTED, "")) << size;
    EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::printValue, 60, TAV_RC_NOT_SUPPORTED})) << size;
  }
}

TEST_P(UnprintableType, IsRefusedForItsSizeFirstInTheOtherOrder)
{
  for (const uint64_t size : {0U, 1U, 2U, 15U, 16U, 17U})
  {
    const bool fits = size >= GetParam().unit;
    const uint32_t code = fits ? TAV_RC_NOT_SUPPORTED : TAV_RC_OUTSIDE_PARENT;
    PrintValue print(GetParam().type, Bytes(size, 0x31), true);
    TraceLog trace;
    EXPECT_EQ(print(), printed(code, "")) << size;
    EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::printValue, fits ? 60U : 50U, code})) << size;
  }
}

INSTANTIATE_TEST_SUITE_P(Each, UnprintableType,
                         ::testing::Values(UnprintableRow{102, 2}, UnprintableRow{104, 16}, UnprintableRow{0, 0},
                                           UnprintableRow{3, 0}, UnprintableRow{49, 0}, UnprintableRow{59, 0},
                                           UnprintableRow{99, 0}, UnprintableRow{107, 0}, UnprintableRow{109, 0},
                                           UnprintableRow{110, 0}, UnprintableRow{65535, 0}),
                         [](const auto& row) { return "Type" + std::to_string(row.param.type); });

TEST(PrintValueArguments, NullNodeIsABadArgument)
{
  CaughtStream stream;
  TAVPrintCtx ctx = printContext(stream.get());
  TraceLog trace;
  EXPECT_EQ(tavPrintValue(&ctx, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::printValue, 10, TAV_RC_BAD_PARAM}));
  EXPECT_EQ(ctx.bytesWritten, 0U);
}

TEST(PrintValueArguments, GroupIsABadArgument)
{
  for (const uint16_t type : {TAV_TYPE_HEADER32, TAV_TYPE_HEADER64})
  {
    for (const bool wide : {false, true})
    {
      PrintValue print(type, {1, 2, 3, 4}, false, wide);
      TraceLog trace;
      EXPECT_EQ(print(), printed(TAV_RC_BAD_PARAM, ""));
      EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::printValue, 20, TAV_RC_BAD_PARAM}));
    }
  }
}

TEST(PrintValueArguments, GroupIsRefusedBeforeItsMissingData)
{
  PrintValue print(TAV_TYPE_HEADER64, {}, false);
  print.node.pDataBuf = nullptr;
  TraceLog trace;
  EXPECT_EQ(print(), printed(TAV_RC_BAD_PARAM, ""));
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::printValue, 20, TAV_RC_BAD_PARAM}));
}

TEST(PrintValueArguments, MissingDataIsABadArgument)
{
  PrintValue print(TAV_TYPE_UINT32, {1, 2, 3, 4}, false);
  print.node.pDataBuf = nullptr;
  TraceLog trace;
  EXPECT_EQ(print(), printed(TAV_RC_BAD_PARAM, ""));
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::printValue, 30, TAV_RC_BAD_PARAM}));
}

TEST(PrintValueArguments, MissingDataIsRefusedBeforeAnUnprintableType)
{
  PrintValue print(TAV_TYPE_UTF8_STRING, {1, 2, 3, 4}, true);
  print.node.pDataBuf = nullptr;
  TraceLog trace;
  EXPECT_EQ(print(), printed(TAV_RC_BAD_PARAM, ""));
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::printValue, 30, TAV_RC_BAD_PARAM}));
}

TEST(PrintValueArguments, FewerBytesThanTheNodeHasAreNotReadBeyond)
{
  PrintValue print(TAV_TYPE_BINARY, {1, 2, 3, 4}, false);
  print.node.header.hdr64.size = 5;
  TraceLog trace;
  EXPECT_EQ(print(), printed(TAV_RC_OUTSIDE_PARENT, ""));
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::printValue, 40, TAV_RC_OUTSIDE_PARENT}));
}

TEST(PrintValueTrace, IsEntryArgumentsCharactersAndExit)
{
  PrintValue print(TAV_TYPE_UINT32, {7, 7, 7, 7}, false); // 117901063 in either byte order
  CaughtStream stream;
  TAVPrintCtx ctx = printContext(stream.get());
  TraceLog trace;
  ASSERT_EQ(tavPrintValue(&ctx, &print.node), TAV_RC_OK);
  EXPECT_THAT(trace.steps(),
              ElementsAre(Step{KOR_TRACE_ENTRY, probe::printValue, 0}, Step{KOR_TRACE_VAR, probe::printValue, 0},
                          Step{KOR_TRACE_VAR, probe::printValue, 100}, Step{KOR_TRACE_EXIT, probe::printValue, 0}));
  EXPECT_THAT(trace.dump(probe::printValue, 100).items, ElementsAre(bytesOf(uint64_t{9})));
  TAVPrintCtx* const pCtx = &ctx;
  EXPECT_THAT(trace.dump(probe::printValue, 0).items, ElementsAre(bytesOf(pCtx), bytesOf(print.node)));
}

TEST(PrintValueTrace, EndsWithTheFailure)
{
  PrintValue print(TAV_TYPE_UINT32, {7, 0, 0}, false);
  TraceLog trace;
  ASSERT_EQ(print().rc, TAV_RC_OUTSIDE_PARENT);
  EXPECT_EQ(trace.records().back().kind, KOR_TRACE_EXIT);
  EXPECT_EQ(trace.records().back().code, TAV_RC_OUTSIDE_PARENT);
}

TEST(PrintValueTrace, ShowsTheConversionOfATimestampUnderItsOwnProbe)
{
  PrintValue print(TAV_TYPE_UTC_TIMESTAMP, Bytes(16, 0), false);
  TraceLog trace;
  ASSERT_EQ(print().rc, TAV_RC_OK);
  EXPECT_EQ(probe::timeStampToDate, 0x088A0080U);
  EXPECT_THAT(trace.stepsOf(probe::timeStampToDate),
              ElementsAre(Step{KOR_TRACE_ENTRY, probe::timeStampToDate, 0},
                          Step{KOR_TRACE_VAR, probe::timeStampToDate, 0},
                          Step{KOR_TRACE_VAR, probe::timeStampToDate, 20},
                          Step{KOR_TRACE_EXIT, probe::timeStampToDate, 0}));
}

TEST(PrintValueTrace, HasNoConversionForOtherTypes)
{
  PrintValue print(TAV_TYPE_UINT32, {7, 0, 0, 0}, false);
  TraceLog trace;
  ASSERT_EQ(print().rc, TAV_RC_OK);
  EXPECT_THAT(trace.recordsOf(probe::timeStampToDate), IsEmpty());
}

TEST(PrintValueTrace, CarriesItsProbe)
{
  EXPECT_EQ(probe::printValue, 0x088A0081U);
}

/// The value's last piece and all that was counted.
std::pair<std::string, uint64_t> valueInBuffer(PrintValue& print, uint64_t size)
{
  std::vector<char> buffer(size, '#');
  TAVPrintCtx ctx = printContext(nullptr);
  ctx.pBuffer = buffer.data();
  ctx.bufferSize = size;
  EXPECT_EQ(tavPrintValue(&ctx, &print.node), TAV_RC_OK);
  return {std::string(buffer.data()), ctx.bytesWritten};
}

TEST(PieceOfAValue, IsTheWholeString)
{
  PrintValue print(TAV_TYPE_ASCII_STRING, {'h', 'e', 'l', 'l', 'o'}, false);
  EXPECT_EQ(valueInBuffer(print, 6), std::pair("hello"s, uint64_t{5}));
}

TEST(PieceOfAValue, IsCutToTheBuffer)
{
  PrintValue print(TAV_TYPE_ASCII_STRING, {'h', 'e', 'l', 'l', 'o'}, false);
  EXPECT_EQ(valueInBuffer(print, 4), std::pair("hel"s, uint64_t{3}));
}

TEST(PieceOfAValue, IsEachByteOfABinary)
{
  PrintValue print(TAV_TYPE_BINARY, {0x12, 0xAB}, false);
  EXPECT_EQ(valueInBuffer(print, 10), std::pair("AB"s, uint64_t{4}));
}

TEST(PieceOfAValue, IsEachUnitOfAnArray)
{
  PrintValue print(TAV_TYPE_UINT64_ARRAY, Bytes(24, 0), false);
  print.node.pDataBuf[kLittle ? 16 : 23] = 200;
  EXPECT_EQ(valueInBuffer(print, 10), std::pair("200"s, uint64_t{5}));
}

TEST(PieceOfAValue, IsTheWholeTimestamp)
{
  PrintValue print(TAV_TYPE_UTC_TIMESTAMP, Bytes(16, 0), false);
  EXPECT_EQ(valueInBuffer(print, 100), std::pair("1970-01-01-00.00.00.0000000000"s, uint64_t{30}));
}

} // namespace
