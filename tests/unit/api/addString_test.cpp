#include <cstdint>
#include <ostream>
#include <string>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "support/rows.h"
#include "support/traceLog.h"
#include "support/writing.h"
#include "tav/layout.hpp"
#include "tav/probes.h"
#include "tav/tav.h"

namespace
{

using namespace tav;
using namespace test;

constexpr uint16_t kName = 60103;    // 0xEAC7
constexpr uint16_t kUtf8Page = 1208; // 0x04B8
constexpr uint64_t kBefore = 0xABCDEF;

/// A pair with the distance of a string is in the order of the machine that wrote it.
constexpr const char* kEye = kBigEndianHost ? "C0 DE D5 EE DD EC 0D ED" : "ED 0D EC DD EE D5 DE C0";

std::string hostWord(const std::string& lowByte)
{
  return kBigEndianHost ? "00 00 00 00 00 00 00 " + lowByte : lowByte + " 00 00 00 00 00 00 00";
}

TAVHeaderData textOf(const TAVHeader& header, Bytes& text)
{
  TAVHeaderData data{header, text.data(), text.size(), 0};
  data.header.nodeOffset = kBefore;
  return data;
}

Bytes nodesBehindRoot(StreamWriter& writer, bool wide = true)
{
  const Bytes all = writer.bytes();
  return {all.begin() + (wide ? 16 : 8), all.end()};
}

class AddString : public ::testing::TestWithParam<Form>
{
protected:
  StreamWriter writer{GetParam()};

  /// The bytes of this form, packed and aligned, low byte first and high byte first.
  [[nodiscard]] static std::string pick(const char* little, const char* littleAligned, const char* big,
                                        const char* bigAligned)
  {
    const bool align = GetParam().align;
    return isBigEndian(GetParam()) ? (align ? bigAligned : big) : (align ? littleAligned : little);
  }

  /// Adds a text below a root with headers of the same width; the descriptor as it is left.
  TAVHeaderData add(const std::string& characters, const TAVHeader& header, uint16_t codePage)
  {
    fillStorage(writer, 0xEE);
    writer.add(header.hdrType == TAV_HDR_64 ? group64(kRoot) : group32(kRoot));
    Bytes text = bytesOfText(characters);
    TAVHeaderData data = textOf(header, text);
    EXPECT_EQ(tavAddString(0, writer.handle(), &data, codePage), TAV_RC_OK);
    return data;
  }
};
INSTANTIATE_TEST_SUITE_P(Forms, AddString, ::testing::ValuesIn(allForms()),
                         kFormName);

TEST_P(AddString, WritesAnAsciiStringAsItIs)
{
  const TAVHeaderData data = add("abc", header64(3, TAV_TYPE_ASCII_STRING, kName), 437);
  EXPECT_EQ(data.header.hdr64.size, 3U);
  EXPECT_EQ(
      toHex(nodesBehindRoot(writer)),
      rows(pick("03 00 00 00 00 00 00 00 00 00 00 00 32 00 C7 EA", "03 00 00 00 00 00 00 00 00 00 10 00 32 00 C7 EA",
                "00 00 00 00 00 00 00 03 00 00 00 00 00 32 EA C7", "00 00 00 00 00 00 00 03 00 10 00 00 00 32 EA C7") +
           "61 62 63" + (GetParam().align ? "EE EE EE EE EE" : "")));
}

TEST_P(AddString, WritesTheCodePageAndTwoBytesMoreThanAUtf8StringCounts)
{
  const TAVHeaderData data = add("abcde", header64(3, TAV_TYPE_UTF8_STRING, kName), kUtf8Page);
  EXPECT_EQ(data.header.hdr64.size, 5U);
  EXPECT_EQ(toHex(nodesBehindRoot(writer)), rows(pick("05 00 00 00 00 00 00 00 00 00 00 00 66 00 C7 EA B8 04",
                                                      "05 00 00 00 00 00 00 00 00 00 10 00 66 00 C7 EA B8 04",
                                                      "00 00 00 00 00 00 00 05 00 00 00 00 00 66 EA C7 04 B8",
                                                      "00 00 00 00 00 00 00 05 00 10 00 00 00 66 EA C7 04 B8") +
                                                 "61 62 63 64 65" + (GetParam().align ? "EE EE EE" : "")));
}

TEST_P(AddString, Writes32BitHeaders)
{
  const TAVHeaderData data = add("abcdefgh", header32(6, TAV_TYPE_UTF8_STRING, kName), kUtf8Page);
  EXPECT_EQ(data.header.hdr32.size, 8U); // needs no padding, though the node ends 2 bytes past a multiple of 8
  EXPECT_EQ(toHex(nodesBehindRoot(writer, false)),
            rows(isBigEndian(GetParam()) ? "00 00 00 08 00 66 EA C7 04 B8 61 62 63 64 65 66 67 68"
                                         : "08 00 00 00 66 00 C7 EA B8 04 61 62 63 64 65 66 67 68"));
}

TEST_P(AddString, EndsWithAPairInHostOrder)
{
  add("abcde", header64(3, TAV_TYPE_UTF8_STRING, kName, TAV_INFO_EYE_SIZE), kUtf8Page);
  const Bytes all = nodesBehindRoot(writer);
  const std::string padding = GetParam().align ? "EE EE EE" : "";
  EXPECT_EQ(toHex({all.begin() + 18, all.end()}), rows("61 62 63 64 65" + padding + kEye + hostWord("15")));
}

TEST_P(AddString, EndsAnAsciiStringWithAPairInHostOrder)
{
  add("abcdefg", header64(7, TAV_TYPE_ASCII_STRING, kName, TAV_INFO_EYE_SIZE), 437);
  const Bytes all = nodesBehindRoot(writer);
  const std::string padding = GetParam().align ? "EE" : "";
  EXPECT_EQ(toHex({all.begin() + 16, all.end()}), rows("61 62 63 64 65 66 67" + padding + kEye + hostWord("17")));
}

TEST_P(AddString, LeavesTheNodeOffsetAlone)
{
  const TAVHeaderData data = add("abc", header64(3, TAV_TYPE_ASCII_STRING, kName), 437);
  EXPECT_EQ(data.header.nodeOffset, kBefore);
}

TEST_P(AddString, IsFollowedByTheNextNodeBehindTheUncountedBytes)
{
  add("abcdefghij", header64(6, TAV_TYPE_UTF8_STRING, kName), kUtf8Page);
  EXPECT_EQ(writer.add(u32(kName, 1)).nodeOffset, 16U + 16 + 2 + 8);
}

TEST(AddStringText, OfAnEmptyAsciiStringMayBeMissing)
{
  StreamWriter writer;
  writer.add(group64(kRoot));
  TAVHeaderData data{header64(0, TAV_TYPE_ASCII_STRING, kName), nullptr, 0, 0};
  EXPECT_EQ(tavAddString(0, writer.handle(), &data, 437), TAV_RC_OK);
  EXPECT_EQ(writer.length(), 32U);
}

TEST(AddStringText, OfAnEmptyUtf8StringIsTheCodePageAndTwoBytes)
{
  StreamWriter writer(lowFirst());
  writer.add(group64(kRoot));
  Bytes text{0x31, 0x32};
  TAVHeaderData data = textOf(header64(0, TAV_TYPE_UTF8_STRING, kName), text);
  ASSERT_EQ(tavAddString(0, writer.handle(), &data, 437), TAV_RC_OK);
  EXPECT_EQ(toHex(nodesBehindRoot(writer)), rows("02 00 00 00 00 00 00 00 00 00 00 00 66 00 C7 EA B5 01 31 32"));
}

TEST(AddStringText, IsAsLongAsTheHeaderSaysWhateverTheBufferSize)
{
  StreamWriter writer;
  writer.add(group64(kRoot));
  Bytes text = bytesOfText("abc");
  TAVHeaderData data = textOf(header64(3, TAV_TYPE_ASCII_STRING, kName), text);
  data.dataBufSize = 1;
  EXPECT_EQ(tavAddString(0, writer.handle(), &data, 437), TAV_RC_OK);
  EXPECT_EQ(writer.length(), 35U);
}

TEST(AddStringText, MissingIsRefusedBeforeTheSizeIsChanged)
{
  StreamWriter writer;
  writer.add(group64(kRoot));
  for (const auto type : {TAV_TYPE_ASCII_STRING, TAV_TYPE_UTF8_STRING})
  {
    TAVHeaderData data{header64(3, type, kName), nullptr, 3, 0};
    TraceLog trace;
    EXPECT_EQ(tavAddString(0, writer.handle(), &data, 437), TAV_RC_BAD_PARAM);
    EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::addString, 50, TAV_RC_BAD_PARAM}));
    EXPECT_EQ(data.header.hdr64.size, 3U);
    EXPECT_EQ(writer.length(), 16U);
  }
}

// Which type takes which code page.
struct Page : Row
{
  uint16_t type;
  uint16_t codePage;
  uint32_t code;
};

constexpr Page kPages[] = {
    {"AsciiWith437", 50, 437, TAV_RC_OK},
    {"AsciiWith1208", 50, 1208, TAV_RC_BAD_PARAM},
    {"AsciiWith0", 50, 0, TAV_RC_BAD_PARAM},
    {"Utf8With1208", 102, 1208, TAV_RC_OK},
    {"Utf8With437", 102, 437, TAV_RC_OK},
    {"Utf8With0", 102, 0, TAV_RC_OK},
    {"Utf8With65535", 102, 65535, TAV_RC_OK},
    {"BinaryWith437", 101, 437, TAV_RC_BAD_PARAM},
    {"GroupWith437", 2, 437, TAV_RC_BAD_PARAM},
};

class CodePage : public ::testing::TestWithParam<std::tuple<Page, bool>>
{
};

TEST_P(CodePage, FitsItsTypeOrIsRefusedBeforeAnythingElse)
{
  const auto& [row, wide] = GetParam();
  StreamWriter writer;
  writer.add(wide ? group64(kRoot) : group32(kRoot));
  const uint64_t before = writer.length();
  Bytes text = bytesOfText("abcdef");
  TAVHeaderData data = textOf(wide ? header64(4, row.type, kName) : header32(4, row.type, kName), text);
  TraceLog trace;
  EXPECT_EQ(tavAddString(0, writer.handle(), &data, row.codePage), row.code);
  if (row.code == TAV_RC_OK)
  {
    EXPECT_THAT(trace.failures(), IsEmpty());
    EXPECT_GT(writer.length(), before);
    return;
  }
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::addString, 30, row.code}));
  EXPECT_EQ(writer.length(), before);
  EXPECT_EQ(wide ? data.header.hdr64.size : data.header.hdr32.size, 4U);
}

INSTANTIATE_TEST_SUITE_P(Rows, CodePage, ::testing::Combine(::testing::ValuesIn(kPages), ::testing::Bool()),
                         kRowNameUnder);

TEST(AddStringChecks, RefuseANullHandleFirst)
{
  TraceLog trace;
  EXPECT_EQ(tavAddString(0, nullptr, nullptr, 0), TAV_RC_BAD_PARAM);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::addString, 10, TAV_RC_BAD_PARAM}));
}

TEST(AddStringChecks, RefuseANullDescriptorNext)
{
  StreamWriter writer;
  TraceLog trace;
  EXPECT_EQ(tavAddString(0, writer.handle(), nullptr, 0), TAV_RC_BAD_PARAM);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::addString, 20, TAV_RC_BAD_PARAM}));
}

TEST(AddStringChecks, RefuseTheCodePageBeforeTheHeaderForm)
{
  StreamWriter writer;
  Bytes text = bytesOfText("abc");
  TAVHeaderData data = textOf(header64(3, TAV_TYPE_ASCII_STRING, kName), text);
  EXPECT_EQ(tavAddString(0, writer.handle(), &data, kUtf8Page), TAV_RC_BAD_PARAM);
}

TEST(AddStringChecks, RefuseAStringWithoutOpenGroup)
{
  StreamWriter writer;
  Bytes text = bytesOfText("abcde");
  TAVHeaderData data = textOf(header64(3, TAV_TYPE_UTF8_STRING, kName), text);
  TraceLog trace;
  EXPECT_EQ(tavAddString(0, writer.handle(), &data, kUtf8Page), TAV_RC_BAD_CHILD_HDR);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::validateChild, 20, TAV_RC_BAD_CHILD_HDR},
                                            Failure{probe::addString, 40, TAV_RC_BAD_CHILD_HDR}));
  EXPECT_EQ(data.header.hdr64.size, 3U);
}

TEST(AddStringChecks, RefuseAHeaderFormThatTheGroupDoesNotTake)
{
  StreamWriter writer;
  writer.add(group64(kRoot));
  Bytes text = bytesOfText("abc");
  TAVHeaderData narrow = textOf(header32(3, TAV_TYPE_ASCII_STRING, kName), text);
  EXPECT_EQ(tavAddString(0, writer.handle(), &narrow, 437), TAV_RC_BAD_CHILD_HDR);
  TAVHeaderData unknown = narrow;
  unknown.header.hdrType = 3;
  EXPECT_EQ(tavAddString(0, writer.handle(), &unknown, 437), TAV_RC_BAD_PARAM);
}

TEST(AddStringChecks, AreNeitherOfTheModeNorOfTheOptions)
{
  StreamWriter writer;
  writer.add(group64(kRoot));
  writer.handle()->options |= TAV_OPT_READ;
  Bytes text = bytesOfText("abc");
  TAVHeaderData data = textOf(header64(3, TAV_TYPE_ASCII_STRING, kName), text);
  EXPECT_EQ(tavAddString(~uint64_t{0}, writer.handle(), &data, 437), TAV_RC_OK);
}

TEST(AddStringChecks, RefuseOnAReadHandleOnlyThatNoGroupIsOpen)
{
  StreamReader reader(Bytes(64));
  Bytes text = bytesOfText("abc");
  TAVHeaderData data = textOf(header64(3, TAV_TYPE_ASCII_STRING, kName), text);
  EXPECT_EQ(tavAddString(0, reader.handle(), &data, 437), TAV_RC_BAD_CHILD_HDR);
}

TEST(AddStringRoom, ForTheCountedBytesIsCheckedBeforeAnyByte)
{
  StreamWriter writer({}, 16 + 16 + 5); // 3 characters and the code page would end at the block's end
  writer.add(group64(kRoot));
  Bytes text = bytesOfText("abcde");
  TAVHeaderData data = textOf(header64(3, TAV_TYPE_UTF8_STRING, kName), text);
  TraceLog trace;
  EXPECT_EQ(tavAddString(0, writer.handle(), &data, kUtf8Page), TAV_RC_END_OF_STORAGE);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::writeNode, 50, TAV_RC_END_OF_STORAGE},
                                            Failure{probe::addString, 60, TAV_RC_END_OF_STORAGE}));
  EXPECT_EQ(data.header.hdr64.size, 3U);
  EXPECT_EQ(writer.length(), 16U);
  EXPECT_EQ(Bytes(writer.handle()->pDirectData + 16, writer.handle()->pDirectData + 37), Bytes(21));
}

TEST(AddStringRoom, ForTheUncountedBytesIsMissedAfterTheHeader)
{
  StreamWriter writer(lowFirst(), 16 + 16 + 5 + 2);
  writer.add(group64(kRoot));
  Bytes text = bytesOfText("abcde");
  TAVHeaderData data = textOf(header64(3, TAV_TYPE_UTF8_STRING, kName), text);
  TraceLog trace;
  EXPECT_EQ(tavAddString(0, writer.handle(), &data, kUtf8Page), TAV_RC_END_OF_STORAGE);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::rawWrite, 30, TAV_RC_END_OF_STORAGE},
                                            Failure{probe::addString, 70, TAV_RC_END_OF_STORAGE}));
  EXPECT_EQ(writer.length(), 16U);
  EXPECT_EQ(toHex(Bytes(writer.handle()->pDirectData + 16, writer.handle()->pDirectData + 39)),
            rows("05 00 00 00 00 00 00 00 00 00 00 00 66 00 C7 EA B8 04 00 00 00 00 00"));
}

TEST(AddStringRoom, IsEnoughWithOneByteMore)
{
  StreamWriter writer({}, 16 + 16 + 5 + 3);
  writer.add(group64(kRoot));
  Bytes text = bytesOfText("abcde");
  TAVHeaderData data = textOf(header64(3, TAV_TYPE_UTF8_STRING, kName), text);
  EXPECT_EQ(tavAddString(0, writer.handle(), &data, kUtf8Page), TAV_RC_OK);
}

TEST(AddStringRoom, ForThePairIsMissedLast)
{
  StreamWriter writer({}, 16 + 16 + 3 + 16);
  writer.add(group64(kRoot));
  Bytes text = bytesOfText("abc");
  TAVHeaderData data = textOf(header64(3, TAV_TYPE_ASCII_STRING, kName, TAV_INFO_EYE_SIZE), text);
  EXPECT_EQ(tavAddString(0, writer.handle(), &data, 437), TAV_RC_END_OF_STORAGE);
  EXPECT_EQ(writer.length(), 16U);
  EXPECT_EQ(writer.handle()->pDirectData[34], 'c');
}

TEST(AddStringSize, ThatHasNoRoomForTheCodePageIsRefused)
{
  for (const bool buffered : {false, true})
  {
    for (const bool wide : {false, true})
    {
      for (const uint64_t below : {0U, 1U})
      {
        StreamWriter writer({.buffered = buffered, .root32 = !wide});
        writer.add(wide ? group64(kRoot) : group32(kRoot));
        const uint64_t before = writer.length();
        Bytes text = bytesOfText("ab");
        TAVHeaderData data = textOf(wide ? header64(~uint64_t{0} - below, TAV_TYPE_UTF8_STRING, kName)
                                         : header32(~uint32_t{0} - static_cast<uint32_t>(below), TAV_TYPE_UTF8_STRING,
                                                    kName),
                                    text);
        const uint64_t size = layout::sizeOf(data.header);
        TraceLog trace;
        EXPECT_EQ(tavAddString(0, writer.handle(), &data, kUtf8Page), TAV_RC_BAD_PARAM);
        EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::addString, 55, TAV_RC_BAD_PARAM}));
        EXPECT_EQ(layout::sizeOf(data.header), size);
        EXPECT_EQ(writer.length(), before);
      }
    }
  }
}

TEST(AddStringSize, ThatHasJustRoomForTheCodePageMeetsTheRoomOfTheBlock)
{
  StreamWriter writer;
  writer.add(group64(kRoot));
  Bytes text = bytesOfText("ab");
  TAVHeaderData data = textOf(header64(~uint64_t{0} - 2, TAV_TYPE_UTF8_STRING, kName), text);
  EXPECT_EQ(tavAddString(0, writer.handle(), &data, kUtf8Page), TAV_RC_END_OF_STORAGE);
  EXPECT_EQ(data.header.hdr64.size, ~uint64_t{0} - 2);
}

TEST(AddStringSize, OfAnAsciiStringNearTheTopIsNotCountedUp)
{
  StreamWriter writer;
  writer.add(group64(kRoot));
  Bytes text = bytesOfText("ab");
  TAVHeaderData data = textOf(header64(~uint64_t{0}, TAV_TYPE_ASCII_STRING, kName), text);
  EXPECT_EQ(tavAddString(0, writer.handle(), &data, 437), TAV_RC_END_OF_STORAGE);
  EXPECT_EQ(data.header.hdr64.size, ~uint64_t{0});
}

/// A string whose adding fails at one call of the storage, added until it succeeds.
class StringTakenAgain : public ::testing::TestWithParam<Form>
{
};

TEST_P(StringTakenAgain, IsTheOneThatWouldHaveBeen)
{
  Form form = GetParam();
  form.buffered = true;
  form.ringBytes = 2 * form.pageBytes;
  uint64_t failures = 0;
  for (const bool wide : {false, true})
  {
    form.root32 = !wide;
    const auto write = [&](uint64_t nth) {
      StreamWriter writer(form);
      writer.add(wide ? group64(kRoot) : group32(kRoot));
      writer.add(binary(kName, Bytes(101, 1), wide));
      Bytes text(150, 'x');
      TAVHeaderData data = textOf(wide ? header64(148, TAV_TYPE_UTF8_STRING, kName, TAV_INFO_EYE_SIZE)
                                       : header32(148, TAV_TYPE_UTF8_STRING, kName),
                                  text);
      writer.vectorStorage().failAt(nth, kStorageCode);
      if (tavAddString(0, writer.handle(), &data, kUtf8Page) != TAV_RC_OK)
      {
        ++failures;
        EXPECT_EQ(layout::sizeOf(data.header), 148U);
        EXPECT_EQ(tavAddString(0, writer.handle(), &data, kUtf8Page), TAV_RC_OK);
      }
      EXPECT_EQ(layout::sizeOf(data.header), 150U);
      writer.vectorStorage().failAt(0, TAV_RC_OK);
      writer.close();
      return writer.bytes();
    };
    const Bytes expected = write(0);
    for (uint64_t nth = 1; nth < 20; ++nth)
    {
      EXPECT_EQ(toHex(write(nth)), toHex(expected)) << "call " << nth;
    }
  }
  EXPECT_GT(failures, 4U);
}

INSTANTIATE_TEST_SUITE_P(Forms, StringTakenAgain,
                         ::testing::Values(Form{}, Form{.swap = true}, Form{.align = true},
                                           Form{.swap = true, .align = true}),
                         kFormName);

TEST(AddStringSink, WithoutBlockOrRingIsRefused)
{
  Bytes text = bytesOfText("abc");
  TAVHeaderData data = textOf(header64(3, TAV_TYPE_ASCII_STRING, kName), text);
  StreamWriter direct;
  direct.add(group64(kRoot));
  direct.handle()->pDirectData = nullptr;
  EXPECT_EQ(tavAddString(0, direct.handle(), &data, 437), TAV_RC_NO_MEMORY);
  StreamWriter buffered({.buffered = true});
  buffered.add(group64(kRoot));
  const WithoutRing guard(buffered.handle());
  EXPECT_EQ(tavAddString(0, buffered.handle(), &data, 437), TAV_RC_NO_CIRCULAR_BUF);
  EXPECT_EQ(buffered.length(), 16U);
}

TEST(AddStringSink, ThatFailsHandsItsCodeUpUnchanged)
{
  StreamWriter writer({.buffered = true});
  writer.add(group64(kRoot));
  Bytes text(640, 'x');
  TAVHeaderData data = textOf(header64(640, TAV_TYPE_ASCII_STRING, kName), text);
  writer.vectorStorage().failAt(1, kStorageCode);
  TraceLog trace;
  EXPECT_EQ(tavAddString(0, writer.handle(), &data, 437), kStorageCode);
  EXPECT_THAT(trace.failuresOf(probe::addString), ElementsAre(Failure{probe::addString, 70, kStorageCode}));
  EXPECT_EQ(writer.length(), 16U);
}

TEST(AddStringTrace, ShowsArgumentsAndTheNewPosition)
{
  StreamWriter writer;
  writer.add(group64(kRoot));
  TAVHandle* const handle = writer.handle();
  Bytes text = bytesOfText("abc");
  TAVHeaderData data = textOf(header64(3, TAV_TYPE_ASCII_STRING, kName), text);
  const TAVHeaderData before = data;
  TraceLog trace;
  ASSERT_EQ(tavAddString(5, handle, &data, 437), TAV_RC_OK);
  EXPECT_THAT(trace.dump(probe::addString, 0).items,
              ElementsAre(bytesOf(uint64_t{5}), bytesOf(handle), "Element header", bytesOf(before),
                          bytesOf(uint16_t{437})));
  EXPECT_THAT(trace.dump(probe::addString, 100).items, ElementsAre(bytesOf(uint64_t{35})));
  EXPECT_THAT(trace.stepsOf(probe::addString),
              ElementsAre(Step{KOR_TRACE_ENTRY, probe::addString, 0}, Step{KOR_TRACE_VAR, probe::addString, 0},
                          Step{KOR_TRACE_VAR, probe::addString, 100}, Step{KOR_TRACE_EXIT, probe::addString, 0}));
}

TEST(AddStringTrace, ShowsTheOptionsAtTheNodeWriter)
{
  StreamWriter writer;
  writer.add(group64(kRoot));
  Bytes text = bytesOfText("abc");
  TAVHeaderData data = textOf(header64(3, TAV_TYPE_ASCII_STRING, kName), text);
  TraceLog trace;
  ASSERT_EQ(tavAddString(0x123, writer.handle(), &data, 437), TAV_RC_OK);
  EXPECT_EQ(trace.dump(probe::writeNode, 0).items.at(0), bytesOf(uint64_t{0x123}));
}

TEST(AddStringTrace, CarriesItsProbe)
{
  EXPECT_EQ(probe::addString, 0x088A000BU);
}

} // namespace
