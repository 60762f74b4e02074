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

constexpr uint16_t kCpu = 60110; // 0xEACE
constexpr uint64_t kBefore = 0xABCDEF;

using AddElement = OverForms;
INSTANTIATE_TEST_SUITE_P(Forms, AddElement, ::testing::ValuesIn(allForms()), kFormName);

const char* nodes64(const Form& form)
{
  if (isBigEndian(form))
  {
    return form.align ? R"(FF FF FF FF FF FF FF FF 00 10 00 00 00 02 00 14
                           00 00 00 00 00 00 00 05 00 10 01 23 00 65 EA 61 01 02 03 04 05 EE EE EE
                           00 00 00 00 00 00 00 04 00 10 00 00 00 37 EA CE 11 22 33 44 EE EE EE EE)"
                      : R"(FF FF FF FF FF FF FF FF 00 00 00 00 00 02 00 14
                           00 00 00 00 00 00 00 05 00 00 01 23 00 65 EA 61 01 02 03 04 05
                           00 00 00 00 00 00 00 04 00 00 00 00 00 37 EA CE 11 22 33 44)";
  }
  return form.align ? R"(FF FF FF FF FF FF FF FF 00 00 10 00 02 00 14 00
                         05 00 00 00 00 00 00 00 23 01 10 00 65 00 61 EA 01 02 03 04 05 EE EE EE
                         04 00 00 00 00 00 00 00 00 00 10 00 37 00 CE EA 44 33 22 11 EE EE EE EE)"
                    : R"(FF FF FF FF FF FF FF FF 00 00 00 00 02 00 14 00
                         05 00 00 00 00 00 00 00 23 01 00 00 65 00 61 EA 01 02 03 04 05
                         04 00 00 00 00 00 00 00 00 00 00 00 37 00 CE EA 44 33 22 11)";
}

TEST_P(AddElement, LaysOut64BitNodesEndToEnd)
{
  StreamWriter writer(GetParam());
  fillStorage(writer, 0xEE);
  EXPECT_EQ(writer.add(group64(kRoot)).nodeOffset, 0U);
  EXPECT_EQ(writer.add(binary(kBlob, {1, 2, 3, 4, 5}, true, 0x123)).nodeOffset, 16U);
  EXPECT_EQ(writer.add(u32(kCpu, 0x11223344)).nodeOffset, GetParam().align ? 40U : 37U);
  EXPECT_EQ(writer.length(), GetParam().align ? 64U : 57U);
  EXPECT_EQ(toHex(writer.bytes()), rows(nodes64(GetParam())));
}

const char* nodes32(const Form& form)
{
  if (isBigEndian(form))
  {
    return form.align ? R"(00 00 00 00 00 01 00 14
                           00 00 00 02 00 35 EA CE 11 22 EE EE EE EE EE EE
                           00 00 00 01 00 69 EA 61 58 EE EE EE EE EE EE EE)"
                      : R"(00 00 00 00 00 01 00 14
                           00 00 00 02 00 35 EA CE 11 22
                           00 00 00 01 00 69 EA 61 58)";
  }
  return form.align ? R"(00 00 00 00 01 00 14 00
                         02 00 00 00 35 00 CE EA 22 11 EE EE EE EE EE EE
                         01 00 00 00 69 00 61 EA 58 EE EE EE EE EE EE EE)"
                    : R"(00 00 00 00 01 00 14 00
                         02 00 00 00 35 00 CE EA 22 11
                         01 00 00 00 69 00 61 EA 58)";
}

TEST_P(AddElement, LaysOut32BitNodesEndToEnd)
{
  StreamWriter writer(GetParam());
  fillStorage(writer, 0xEE);
  EXPECT_EQ(writer.add(group32(kRoot)).nodeOffset, 0U);
  EXPECT_EQ(writer.add(element(false, TAV_TYPE_UINT16, kCpu, bytesOfValue(uint16_t{0x1122}))).nodeOffset, 8U);
  writer.add(element(false, TAV_TYPE_BYTE, kBlob, {'X'}));
  EXPECT_EQ(toHex(writer.bytes()), rows(nodes32(GetParam())));
}

TEST_P(AddElement, Lays32BitNodesUnderA64BitGroupOfType1)
{
  StreamWriter writer(GetParam());
  writer.add(group64(kRoot, TAV_TYPE_HEADER32, 0, 0));
  writer.add(element(false, TAV_TYPE_UINT64, kCpu, bytesOfValue(uint64_t{0x0102030405060708})));
  const std::string big = GetParam().align ? "00 00 00 00 00 00 00 00 00 10 00 00 00 01 00 14"
                                           : "00 00 00 00 00 00 00 00 00 00 00 00 00 01 00 14";
  const std::string little = GetParam().align ? "00 00 00 00 00 00 00 00 00 00 10 00 01 00 14 00"
                                              : "00 00 00 00 00 00 00 00 00 00 00 00 01 00 14 00";
  EXPECT_EQ(toHex(writer.bytes()), isBigEndian(GetParam())
                                       ? rows(big + "00 00 00 08 00 39 EA CE 01 02 03 04 05 06 07 08")
                                       : rows(little + "08 00 00 00 39 00 CE EA 08 07 06 05 04 03 02 01"));
}

const char* nodeWithPair(const Form& form)
{
  if (isBigEndian(form))
  {
    return form.align ? R"(00 00 00 00 00 00 00 03 00 50 00 00 00 65 EA 61 AA BB CC EE EE EE EE EE
                           C0 DE D5 EE DD EC 0D ED 00 00 00 00 00 00 00 13)"
                      : R"(00 00 00 00 00 00 00 03 00 40 00 00 00 65 EA 61 AA BB CC
                           C0 DE D5 EE DD EC 0D ED 00 00 00 00 00 00 00 13)";
  }
  return form.align ? R"(03 00 00 00 00 00 00 00 00 00 50 00 65 00 61 EA AA BB CC EE EE EE EE EE
                         ED 0D EC DD EE D5 DE C0 13 00 00 00 00 00 00 00)"
                    : R"(03 00 00 00 00 00 00 00 00 00 40 00 65 00 61 EA AA BB CC
                         ED 0D EC DD EE D5 DE C0 13 00 00 00 00 00 00 00)";
}

TEST_P(AddElement, PutsThePairBehindThePaddingAndCountsNoPaddingInIt)
{
  StreamWriter writer(GetParam());
  fillStorage(writer, 0xEE);
  writer.add(group64(kRoot));
  writer.add(binary(kBlob, {0xAA, 0xBB, 0xCC}, true, TAV_INFO_EYE_SIZE));
  const Bytes all = writer.bytes();
  EXPECT_EQ(toHex({all.begin() + 16, all.end()}), rows(nodeWithPair(GetParam())));
}

TEST_P(AddElement, LeavesTheCallersHeaderInHostOrder)
{
  StreamWriter writer(GetParam());
  writer.add(group64(kRoot));
  Element node = u32(kCpu, 5, true, 0x77);
  const TAVHeader after = writer.add(node);
  EXPECT_EQ(after.hdr64.size, 4U);
  EXPECT_EQ(after.hdr64.info, GetParam().align ? 0x77 | TAV_INFO_ALIGNED8 : 0x77U);
  EXPECT_EQ(after.hdr64.type, TAV_TYPE_UINT32);
  EXPECT_EQ(after.hdr64.elm, kCpu);
}

struct Layout : Row
{
  uint16_t type;
  const char* payload;
  const char* reversed;
};

class PayloadOf : public ::testing::TestWithParam<std::tuple<Layout, bool>>
{
};

TEST_P(PayloadOf, IsReversedByItsTypeInTheOtherByteOrderAndNeverOtherwise)
{
  const auto& [row, wide] = GetParam();
  for (const bool swap : {false, true})
  {
    StreamWriter writer({false, swap});
    const uint64_t start = writer.add(wide ? group64(kRoot) : group32(kRoot)).nodeOffset + (wide ? 32 : 16);
    writer.add(element(wide, row.type, kCpu, hex(row.payload)));
    const Bytes all = writer.bytes();
    EXPECT_EQ(toHex({all.begin() + static_cast<ptrdiff_t>(start), all.end()}), rows(swap ? row.reversed : row.payload))
        << (swap ? "other byte order" : "host order");
  }
}

constexpr Layout kLayouts[] = {
    {"AsciiString", 50, "61 62 63", "61 62 63"},
    {"Uint8", 51, "81", "81"},
    {"Sint8", 52, "82", "82"},
    {"Uint16", 53, "01 02", "02 01"},
    {"Sint16", 54, "01 02", "02 01"},
    {"Uint32", 55, "01 02 03 04", "04 03 02 01"},
    {"Sint32", 56, "01 02 03 04", "04 03 02 01"},
    {"Uint64", 57, "01 02 03 04 05 06 07 08", "08 07 06 05 04 03 02 01"},
    {"Sint64", 58, "01 02 03 04 05 06 07 08", "08 07 06 05 04 03 02 01"},
    {"TimestampKeepsTheOrderOfItsUnits", 100, "00 01 02 03 04 05 06 07 08 09 0A 0B 0C 0D 0E 0F",
     "07 06 05 04 03 02 01 00 09 08 0B 0A 0D 0C 0F 0E"},
    {"Binary", 101, "01 02 03 04", "01 02 03 04"},
    {"Utf8StringReversesItsCodePage", 102, "01 02 61 62", "02 01 61 62"},
    {"Uint128", 103, "00 01 02 03 04 05 06 07 08 09 0A 0B 0C 0D 0E 0F",
     "0F 0E 0D 0C 0B 0A 09 08 07 06 05 04 03 02 01 00"},
    {"Sint128", 104, "00 01 02 03 04 05 06 07 08 09 0A 0B 0C 0D 0E 0F",
     "0F 0E 0D 0C 0B 0A 09 08 07 06 05 04 03 02 01 00"},
    {"Byte", 105, "42", "42"},
    {"Uint64ArrayReversesEachUnit", 106, "01 02 03 04 05 06 07 08 11 12 13 14 15 16 17 18",
     "08 07 06 05 04 03 02 01 18 17 16 15 14 13 12 11"},
    {"Uint64ArrayKeepsAnIncompleteUnit", 106, "01 02 03 04 05 06 07 08 11 12 13", "08 07 06 05 04 03 02 01 11 12 13"},
    {"LongUint16ReversesItsFirstUnit", 53, "01 02 03 04 05", "02 01 03 04 05"},
    {"LongUint32ReversesItsFirstUnit", 55, "01 02 03 04 05 06", "04 03 02 01 05 06"},
    {"LongTimestampReversesItsFirst16Bytes", 100, "00 01 02 03 04 05 06 07 08 09 0A 0B 0C 0D 0E 0F 10 11",
     "07 06 05 04 03 02 01 00 09 08 0B 0A 0D 0C 0F 0E 10 11"},
    {"LongUint128ReversesItsFirst16Bytes", 103, "00 01 02 03 04 05 06 07 08 09 0A 0B 0C 0D 0E 0F 10",
     "0F 0E 0D 0C 0B 0A 09 08 07 06 05 04 03 02 01 00 10"},
    {"ShortUint16StaysAsItIs", 53, "01", "01"},
    {"ShortUint32StaysAsItIs", 55, "01 02 03", "01 02 03"},
    {"ShortTimestampStaysAsItIs", 100, "00 01 02 03 04 05 06 07 08", "00 01 02 03 04 05 06 07 08"},
    {"ShortUint64ArrayStaysAsItIs", 106, "01 02 03 04 05 06 07", "01 02 03 04 05 06 07"},
    {"UnknownTypeStaysAsItIs", 107, "01 02 03 04", "01 02 03 04"},
    {"TypeBeyondTheTableStaysAsItIs", 65535, "01 02 03 04", "01 02 03 04"},
    {"TypeZeroStaysAsItIs", 0, "01 02", "01 02"},
};

INSTANTIATE_TEST_SUITE_P(Types, PayloadOf, ::testing::Combine(::testing::ValuesIn(kLayouts), ::testing::Bool()),
                         kRowNameUnder);

TEST(AddElementArray, OfAnyLengthIsReversedToItsLastUnit)
{
  constexpr size_t units = 1000; // several times what is reversed in one go
  Bytes payload;
  Bytes reversed;
  for (size_t unit = 0; unit < units; ++unit)
  {
    const Bytes bytes{static_cast<uint8_t>(unit / 256), static_cast<uint8_t>(unit), 3, 4, 5, 6, 7, 8};
    payload.insert(payload.end(), bytes.begin(), bytes.end());
    reversed.insert(reversed.end(), bytes.rbegin(), bytes.rend());
  }
  payload.push_back(0x99);
  reversed.push_back(0x99);
  StreamWriter writer({true, true});
  writer.add(group64(kRoot));
  writer.add(element(true, TAV_TYPE_UINT64_ARRAY, kBlob, payload));
  const Bytes all = writer.bytes();
  EXPECT_EQ(toHex({all.begin() + 32, all.end()}), toHex(reversed));
}

/// What a call of tavAddElement did beside its code.
struct Added
{
  uint32_t code;
  uint64_t length;
  uint64_t nodeOffset;
};

Added add(StreamWriter& writer, TAVHeader header, uint8_t* payload, uint64_t payloadSize)
{
  header.nodeOffset = kBefore;
  TAVHeaderData data{header, payload, payloadSize, 0};
  const uint32_t code = tavAddElement(0, writer.handle(), &data);
  return {code, writer.length(), data.header.nodeOffset};
}

TEST(AddElementPayload, OfNoBytesIsABareHeader)
{
  uint8_t nothing = 0;
  StreamWriter writer(lowFirst());
  writer.add(group64(kRoot));
  const Added added = add(writer, header64(0, TAV_TYPE_BINARY, kBlob), &nothing, 0);
  EXPECT_EQ(added.code, TAV_RC_OK);
  EXPECT_EQ(added.length, 32U);
  const Bytes all = writer.bytes();
  EXPECT_EQ(toHex({all.begin() + 16, all.end()}), rows("00 00 00 00 00 00 00 00 00 00 00 00 65 00 61 EA"));
}

TEST(AddElementPayload, OfNoBytesIsFollowedByItsPair)
{
  uint8_t nothing = 0;
  StreamWriter writer(lowFirst());
  writer.add(group64(kRoot));
  ASSERT_EQ(add(writer, header64(0, TAV_TYPE_BINARY, kBlob, TAV_INFO_EYE_SIZE), &nothing, 0).code, TAV_RC_OK);
  const Bytes all = writer.bytes();
  EXPECT_EQ(toHex({all.begin() + 32, all.end()}), rows("ED 0D EC DD EE D5 DE C0 10 00 00 00 00 00 00 00"));
}

TEST(AddElementPayload, OfUnsaidLengthIsAsLongAsTheHeaderSays)
{
  Bytes bytes{1, 2, 3, 4};
  StreamWriter writer;
  writer.add(group64(kRoot));
  EXPECT_EQ(add(writer, header64(4, TAV_TYPE_BINARY, kBlob), bytes.data(), 0).length, 36U);
}

TEST(AddElementPayload, BeyondTheHeadersSizeIsNotWritten)
{
  Bytes bytes{1, 2, 3, 4};
  StreamWriter writer;
  fillStorage(writer, 0xEE);
  writer.add(group64(kRoot));
  EXPECT_EQ(add(writer, header64(3, TAV_TYPE_BINARY, kBlob), bytes.data(), 4).length, 35U);
  EXPECT_EQ(writer.handle()->pDirectData[34], 3);
  EXPECT_EQ(writer.handle()->pDirectData[35], 0xEE);
}

TEST(AddElementPayload, IsTakenFromItsFirstByteWhateverTheBufferOffset)
{
  Bytes bytes{1, 2};
  StreamWriter writer;
  writer.add(group64(kRoot));
  TAVHeaderData data{header64(2, TAV_TYPE_BINARY, kBlob), bytes.data(), 2, 1};
  ASSERT_EQ(tavAddElement(0, writer.handle(), &data), TAV_RC_OK);
  EXPECT_EQ(data.dataBufOffset, 1U);
  EXPECT_EQ(writer.handle()->pDirectData[32], 1);
}

TEST(AddElementPayload, OfAGroupIsNotWritten)
{
  Bytes bytes{1, 2, 3, 4};
  StreamWriter writer;
  EXPECT_EQ(add(writer, header64(4, TAV_TYPE_HEADER64, kRoot, TAV_INFO_EYE_SIZE), bytes.data(), 4).length, 16U);
}

TEST(AddElementPayload, OfAGroupMayBeShorterThanItsSize)
{
  StreamWriter writer(lowFirst());
  const Added added = add(writer, header64(100, TAV_TYPE_HEADER64, kRoot), nullptr, 7);
  EXPECT_EQ(added.code, TAV_RC_OK);
  EXPECT_EQ(toHex(writer.bytes()), rows("64 00 00 00 00 00 00 00 00 00 00 00 02 00 14 00"));
}

TEST(AddElementAlignment, RoundsTheSizeOfThePayload)
{
  Bytes bytes(9);
  StreamWriter writer({false, false, true});
  writer.add(group64(kRoot));
  EXPECT_EQ(add(writer, header64(5, TAV_TYPE_BINARY, kBlob), bytes.data(), 5).length, 16U + 16 + 8);
  EXPECT_EQ(add(writer, header64(8, TAV_TYPE_BINARY, kBlob), bytes.data(), 8).length, 40U + 16 + 8);
  EXPECT_EQ(add(writer, header64(9, TAV_TYPE_BINARY, kBlob), bytes.data(), 9).length, 64U + 16 + 16);
}

TEST(AddElementAlignment, RoundsNoPositionThatAnotherNodePutOut)
{
  Bytes verbatim{1, 2, 3};
  Bytes bytes(5);
  StreamWriter writer({false, false, true});
  writer.add(group64(kRoot));
  check(tavAddStream(0, writer.handle(), TAV_HDR_64, verbatim.data(), verbatim.size()), "tavAddStream");
  EXPECT_EQ(add(writer, header64(5, TAV_TYPE_BINARY, kBlob), bytes.data(), 5).length, 16U + 3 + 16 + 8);
}

TEST(AddElementAlignment, IsOnForTheModeOneAlone)
{
  Bytes bytes(5);
  StreamWriter writer;
  writer.handle()->alignMode = 2;
  writer.add(group64(kRoot));
  EXPECT_EQ(add(writer, header64(5, TAV_TYPE_BINARY, kBlob), bytes.data(), 5).length, 37U);
}

TEST(AddElementMode, OfUpdatingWritesToo)
{
  StreamWriter writer({}, 0x1000, TAV_OPT_UPDATE);
  EXPECT_EQ(writer.add(group64(kRoot)).nodeOffset, 0U);
}

// Which header forms may stand where. The open group is made by hand: not every one can be opened.
struct Place : Row
{
  uint16_t parentHdr; // 0: no group is open
  uint16_t parentType;
  uint16_t hdrType;
  uint16_t type;
  uint32_t code;
  uint32_t point;
};

constexpr Place kPlaces[] = {
    {"Root32OfType1", 0, 0, 1, 1, TAV_RC_OK, 0},
    {"Root32OfType2", 0, 0, 1, 2, TAV_RC_BAD_CHILD_HDR, 10},
    {"Root32Data", 0, 0, 1, 55, TAV_RC_BAD_CHILD_HDR, 10},
    {"Root64OfType1", 0, 0, 2, 1, TAV_RC_OK, 0},
    {"Root64OfType2", 0, 0, 2, 2, TAV_RC_OK, 0},
    {"Root64Data", 0, 0, 2, 55, TAV_RC_BAD_CHILD_HDR, 20},
    {"RootOfNoHeaderForm", 0, 0, 0, 1, TAV_RC_BAD_PARAM, 30},
    {"RootOfUnknownHeaderForm", 0, 0, 3, 1, TAV_RC_BAD_PARAM, 30},
    {"Data32Under32OfType1", 1, 1, 1, 55, TAV_RC_OK, 0},
    {"Group32Under32OfType1", 1, 1, 1, 1, TAV_RC_OK, 0},
    {"Group32OfType2Under32OfType1", 1, 1, 1, 2, TAV_RC_OK, 0},
    {"Data64Under32OfType1", 1, 1, 2, 55, TAV_RC_BAD_CHILD_HDR, 20},
    {"Group64Under32OfType1", 1, 1, 2, 2, TAV_RC_BAD_CHILD_HDR, 20},
    {"Data32Under32OfType2", 1, 2, 1, 55, TAV_RC_BAD_CHILD_HDR, 10},
    {"Data64Under32OfType2", 1, 2, 2, 55, TAV_RC_BAD_CHILD_HDR, 20},
    {"Group64Under32OfType2", 1, 2, 2, 2, TAV_RC_BAD_CHILD_HDR, 20},
    {"Group64OfType1Under32OfType2", 1, 2, 2, 1, TAV_RC_BAD_CHILD_HDR, 20},
    {"Data64Under32OfAnyOtherType", 1, 7, 2, 55, TAV_RC_BAD_CHILD_HDR, 20},
    {"Data32Under64OfType1", 2, 1, 1, 55, TAV_RC_OK, 0},
    {"Group32Under64OfType1", 2, 1, 1, 1, TAV_RC_OK, 0},
    {"Data64Under64OfType1", 2, 1, 2, 55, TAV_RC_BAD_CHILD_HDR, 20},
    {"Group64Under64OfType1", 2, 1, 2, 1, TAV_RC_BAD_CHILD_HDR, 20},
    {"Data32Under64OfType2", 2, 2, 1, 55, TAV_RC_BAD_CHILD_HDR, 10},
    {"Group32Under64OfType2", 2, 2, 1, 1, TAV_RC_BAD_CHILD_HDR, 10},
    {"Data64Under64OfType2", 2, 2, 2, 55, TAV_RC_OK, 0},
    {"Group64OfType1Under64OfType2", 2, 2, 2, 1, TAV_RC_OK, 0},
    {"Group64OfType2Under64OfType2", 2, 2, 2, 2, TAV_RC_OK, 0},
    {"Data64UnderAnyOtherType", 2, 7, 2, 55, TAV_RC_OK, 0},
    {"Data32UnderAnyOtherType", 2, 7, 1, 55, TAV_RC_BAD_CHILD_HDR, 10},
    {"UnknownHeaderFormUnderAGroup", 2, 2, 3, 55, TAV_RC_BAD_PARAM, 30},
};

class ChildAgainstParent : public ::testing::TestWithParam<Place>
{
};

/// Adds the row's child under its parent.
Added addChild(StreamWriter& writer, const Place& row)
{
  if (row.parentHdr != 0)
  {
    const TAVHeader parent = row.parentHdr == TAV_HDR_64 ? header64(0, row.parentType, kRoot)
                                                         : header32(0, row.parentType, kRoot);
    check(writer.handle()->pHdrStack->push(&parent), "push");
  }
  TAVHeader header = row.hdrType == TAV_HDR_64 ? header64(4, row.type, kCpu) : header32(4, row.type, kCpu);
  header.hdrType = row.hdrType;
  uint8_t bytes[4] = {};
  return add(writer, header, bytes, 4);
}

TEST_P(ChildAgainstParent, IsTakenOrRefused)
{
  const Place& row = GetParam();
  StreamWriter writer;
  TraceLog trace;
  const Added added = addChild(writer, row);
  EXPECT_EQ(added.code, row.code);
  if (row.code == TAV_RC_OK)
  {
    EXPECT_THAT(trace.failures(), IsEmpty());
    EXPECT_EQ(added.nodeOffset, 0U);
    return;
  }
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::validateChild, row.point, row.code},
                                            Failure{probe::addElement, 50, row.code}));
  EXPECT_EQ(added.length, 0U);
  EXPECT_EQ(added.nodeOffset, kBefore);
}

TEST_P(ChildAgainstParent, IsTakenOrRefusedWithoutATrace)
{
  for (const Form& form : allForms())
  {
    StreamWriter writer(form);
    const uint32_t open = GetParam().parentHdr != 0 ? 1 : 0;
    const Added added = addChild(writer, GetParam());
    EXPECT_EQ(added.code, GetParam().code) << form;
    EXPECT_EQ(added.length != 0, added.code == TAV_RC_OK) << form;
    const bool opened = added.code == TAV_RC_OK && (GetParam().type == 1 || GetParam().type == 2);
    EXPECT_EQ(writer.handle()->pHdrStack->count, open + (opened ? 1 : 0)) << form;
  }
}

TEST(GroupOf32BitsThatAnnounces64, TakesNoNodeInAnyWay)
{
  for (const bool buffered : {false, true})
  {
    StreamWriter writer({.buffered = buffered, .root32 = true});
    writer.add(group32(kRoot));
    writer.add({header32(0, TAV_TYPE_HEADER64, kRoot), {}});
    const uint64_t before = writer.length();
    uint8_t bytes[16] = {};
    for (const uint16_t type : {TAV_TYPE_HEADER32, TAV_TYPE_HEADER64, TAV_TYPE_BINARY, TAV_TYPE_ASCII_STRING})
    {
      EXPECT_EQ(add(writer, header64(4, type, kCpu), bytes, 4).code, TAV_RC_BAD_CHILD_HDR);
      EXPECT_EQ(add(writer, header32(4, type, kCpu), bytes, 4).code, TAV_RC_BAD_CHILD_HDR);
    }
    TAVHeaderData text{header64(4, TAV_TYPE_ASCII_STRING, kCpu), bytes, 4, 0};
    EXPECT_EQ(tavAddString(0, writer.handle(), &text, 437), TAV_RC_BAD_CHILD_HDR);
    for (const uint32_t kind : {TAV_HDR_32, TAV_HDR_64})
    {
      EXPECT_EQ(tavAddStream(0, writer.handle(), kind, bytes, sizeof bytes), TAV_RC_BAD_CHILD_HDR);
    }
    EXPECT_EQ(writer.length(), before);
    writer.close();
    writer.add(u32(kCpu, 7, false)); // its own parent takes nodes as before
  }
}

INSTANTIATE_TEST_SUITE_P(Rules, ChildAgainstParent, ::testing::ValuesIn(kPlaces),
                         kRowName);

TEST(ChildAgainstParentTrace, BeginsWithTheLabelAndTheChild)
{
  StreamWriter writer;
  Element root = group64(kRoot);
  TraceLog trace;
  writer.add(root);
  const Record record = trace.dump(probe::validateChild, 0);
  EXPECT_THAT(record.items, ElementsAre("Validation of child node type w.r.t parent", bytesOf(root.header)));
  EXPECT_THAT(trace.stepsOf(probe::validateChild), ElementsAre(Step{KOR_TRACE_ENTRY, probe::validateChild, 0},
                                                               Step{KOR_TRACE_VAR, probe::validateChild, 0},
                                                               Step{KOR_TRACE_EXIT, probe::validateChild, 0}));
}
} // namespace
