#include <array>
#include <limits>
#include <vector>

#include "cpp/layer.h"

using namespace test;
using namespace std::chrono_literals;

namespace
{

constexpr uint16_t kElm = 0x1234;
const tav::StreamOptions kLow{.byteOrder = kLowFirst};

/// A stream of one element, and the element as a reader sees it.
class OneElement
{
public:
  OneElement(const tav::StreamOptions& options, uint16_t type, const Bytes& payload)
      : stream_(make(options, type, payload)), reader_(spanOf(stream_), options)
  {
  }
  [[nodiscard]] tav::Node node() const
  {
    return *reader_.path("system/4660");
  }

private:
  /// The payload is given in the stream's byte order, so it is laid out by hand.
  static Bytes make(const tav::StreamOptions& options, uint16_t type, const Bytes& payload)
  {
    ByteRows rows(options.byteOrder == tav::ByteOrder::swapped);
    rows.h64(16 + payload.size(), 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM);
    rows.h64(payload.size(), 0, type, kElm).data(payload);
    return rows.bytes;
  }

  Bytes stream_;
  tav::Reader reader_;
};

template<class T>
T valueOf(uint16_t type, std::string_view payload, tav::ByteOrder byteOrder = kLowFirst)
{
  return OneElement({.byteOrder = byteOrder}, type, hex(payload)).node().as<T>();
}

template<class T>
uint32_t refusal(uint16_t type, std::string_view payload)
{
  const OneElement element(kLow, type, hex(payload));
  const uint32_t thrown = thrownBy([&] { static_cast<void>(element.node().as<T>()); });
  EXPECT_EQ(givenBy([&](std::error_code& ec) { static_cast<void>(element.node().as<T>(ec)); }), thrown);
  EXPECT_EQ(thrownBy([&] { static_cast<void>(element.node().copy().as<T>()); }), thrown);
  EXPECT_EQ(givenBy([&](std::error_code& ec) { static_cast<void>(element.node().copy().as<T>(ec)); }), thrown);
  return thrown;
}

template<class T>
uint32_t numberRefusal(uint16_t type, std::string_view payload)
{
  const OneElement element(kLow, type, hex(payload));
  const uint32_t thrown = thrownBy([&] { static_cast<void>(element.node().asNumber<T>()); });
  EXPECT_EQ(givenBy([&](std::error_code& ec) { EXPECT_EQ(element.node().asNumber<T>(ec), T{}); }), thrown);
  return thrown;
}

} // namespace

TEST(LayerValue, IntegersInBothByteOrders)
{
  EXPECT_EQ(valueOf<uint8_t>(TAV_TYPE_UINT8, "FE"), 0xFE);
  EXPECT_EQ(valueOf<int8_t>(TAV_TYPE_SINT8, "FE"), -2);
  EXPECT_EQ(valueOf<uint16_t>(TAV_TYPE_UINT16, "B2 A1"), 0xA1B2);
  EXPECT_EQ(valueOf<int16_t>(TAV_TYPE_SINT16, "FF FE", kHighFirst), -2);
  EXPECT_EQ(valueOf<uint32_t>(TAV_TYPE_UINT32, "A1 B2 C3 D4", kHighFirst), 0xA1B2C3D4);
  EXPECT_EQ(valueOf<int32_t>(TAV_TYPE_SINT32, "FE FF FF FF"), -2);
  EXPECT_EQ(valueOf<uint64_t>(TAV_TYPE_UINT64, "01 02 03 04 05 06 07 08", kHighFirst), 0x0102030405060708U);
  EXPECT_EQ(valueOf<long long>(TAV_TYPE_SINT64, "FE FF FF FF FF FF FF FF"), -2);
}

TEST(LayerValue, ByteIsNoInteger)
{
  EXPECT_EQ(valueOf<std::byte>(TAV_TYPE_BYTE, "C7"), std::byte{0xC7});
  EXPECT_EQ(refusal<uint8_t>(TAV_TYPE_BYTE, "C7"), TAV_RC_NOT_SUPPORTED);
}

TEST(LayerValue, TextAsCopyAndAsView)
{
  EXPECT_EQ(valueOf<std::string>(TAV_TYPE_ASCII_STRING, "61 00 62"), std::string("a\0b", 3));
  const OneElement element(kLow, TAV_TYPE_ASCII_STRING, hex("61 62"));
  EXPECT_EQ(element.node().as<std::string_view>(), "ab");
}

TEST(LayerValue, Utf8InAllItsForms)
{
  const OneElement element(kLow, TAV_TYPE_UTF8_STRING, hex("B8 04 C3 A4"));
  EXPECT_EQ(element.node().as<std::string>(), "\xC3\xA4");
  EXPECT_TRUE(element.node().as<std::u8string>() == u8"\u00E4");
  EXPECT_TRUE(element.node().as<std::u8string_view>() == u8"\u00E4");
  EXPECT_EQ(element.node().as<tav::Utf8Text>(), (tav::Utf8Text{"\xC3\xA4", 1208}));
  EXPECT_EQ(element.node().as<tav::Utf8>(), (tav::Utf8{"\xC3\xA4", 1208}));
}

TEST(LayerValue, TextOfEitherTypeIsReadAlike)
{
  const OneElement element(kLow, TAV_TYPE_UTF8_STRING, hex("B8 04 C3 A4"));
  EXPECT_EQ(element.node().as<std::string_view>(), "\xC3\xA4");
  tav::Writer writer;
  const std::vector<std::string> texts{"ascii", "gr\xC3\xBC\xC3\x9F"
                                                "e",
                                       ""};
  {
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
    for (const std::string& text : texts) root.add(TAV_ELM_CMN_HOST_NAME, text);
  }
  writer.finish();
  const tav::Reader reader(writer.bytes());
  std::vector<std::string> read;
  for (const tav::Node& node : reader.root().children())
  {
    read.push_back(node.as<std::string>());
    EXPECT_EQ(node.as<std::string_view>(), read.back());
  }
  EXPECT_EQ(read, texts);
}

TEST(LayerValue, TimeComesBackAsItWasWritten)
{
  using Micro = std::chrono::sys_time<std::chrono::microseconds>;
  for (const auto fraction : {0us, 1us, 999us, 1000us, 123456us, 999999us})
  {
    const Micro time = Micro(1709164800s) + fraction;
    tav::Writer writer;
    writer.group(TAV_ELM_CMN_SYSTEM).add(TAV_ELM_CMN_HOST_NAME, time);
    const tav::Reader reader(writer.bytes());
    const tav::Node node = reader.path("/system/*").value();
    EXPECT_EQ(node.as<Micro>(), time);
    const auto stamp = node.as<TAVTimeStamp>();
    EXPECT_EQ(stamp.fractionA, fraction.count() / 1000);
    EXPECT_EQ(stamp.fractionB, fraction.count() % 1000);
  }
}

TEST(LayerValue, CodePageIsReadInTheStreamsByteOrder)
{
  EXPECT_EQ(valueOf<tav::Utf8Text>(TAV_TYPE_UTF8_STRING, "01 02 41", kHighFirst), (tav::Utf8Text{"A", 0x0102}));
}

TEST(LayerValue, TextOfAnotherCodePageIsNoUtf8ByTheLanguagesType)
{
  EXPECT_EQ(refusal<std::u8string>(TAV_TYPE_UTF8_STRING, "01 02 41"), TAV_RC_NOT_SUPPORTED);
}

TEST(LayerValue, Utf8WithoutRoomForItsCodePageIsRefused)
{
  EXPECT_EQ(refusal<tav::Utf8Text>(TAV_TYPE_UTF8_STRING, "B8"), TAV_RC_OUTSIDE_PARENT);
  EXPECT_EQ(refusal<std::string>(TAV_TYPE_UTF8_STRING, ""), TAV_RC_OUTSIDE_PARENT);
}

TEST(LayerValue, BinaryAsCopyAndAsView)
{
  const OneElement element(kLow, TAV_TYPE_BINARY, hex("01 02"));
  EXPECT_EQ(element.node().as<std::vector<std::byte>>(), (std::vector{std::byte{1}, std::byte{2}}));
  EXPECT_EQ(bytesOf(element.node().as<std::span<const std::byte>>()), hex("01 02"));
}

TEST(LayerValue, WordsInBothByteOrders)
{
  const std::vector<uint64_t> expected{1, 0x0102030405060708};
  EXPECT_EQ(valueOf<std::vector<uint64_t>>(TAV_TYPE_UINT64_ARRAY, "01 00 00 00 00 00 00 00 08 07 06 05 04 03 02 01"),
            expected);
  EXPECT_EQ(valueOf<std::vector<uint64_t>>(TAV_TYPE_UINT64_ARRAY, "00 00 00 00 00 00 00 01 01 02 03 04 05 06 07 08",
                                           kHighFirst),
            expected);
  EXPECT_TRUE(valueOf<std::vector<uint64_t>>(TAV_TYPE_UINT64_ARRAY, "").empty());
  EXPECT_EQ(refusal<std::vector<uint64_t>>(TAV_TYPE_UINT64_ARRAY, "01 02 03"), TAV_RC_OUTSIDE_PARENT);
}

TEST(LayerValue, LongIntegersInBothByteOrders)
{
  const tav::Uint128 expected{0x1112131415161718, 0x2122232425262728};
  EXPECT_EQ(valueOf<tav::Uint128>(TAV_TYPE_UINT128, "28 27 26 25 24 23 22 21 18 17 16 15 14 13 12 11"), expected);
  EXPECT_EQ(valueOf<tav::Uint128>(TAV_TYPE_UINT128, "11 12 13 14 15 16 17 18 21 22 23 24 25 26 27 28", kHighFirst),
            expected);
  EXPECT_EQ(valueOf<tav::Sint128>(TAV_TYPE_SINT128, "FE FF FF FF FF FF FF FF FF FF FF FF FF FF FF FF"),
            (tav::Sint128{-1, ~uint64_t{1}}));
#if defined(__SIZEOF_INT128__)
  EXPECT_TRUE(valueOf<tav::BuiltinUint128>(TAV_TYPE_UINT128, "11 12 13 14 15 16 17 18 21 22 23 24 25 26 27 28",
                                           kHighFirst) ==
              ((tav::BuiltinUint128{0x1112131415161718} << 64U) | 0x2122232425262728U));
  EXPECT_TRUE(valueOf<tav::BuiltinSint128>(TAV_TYPE_SINT128, "FE FF FF FF FF FF FF FF FF FF FF FF FF FF FF FF") == -2);
#endif
}

TEST(LayerValue, TimestampAsItIsAndAsATime)
{
  const char* const bytes = "00 00 01 00 00 00 00 00 02 01 03 00 09 00 3C 00";
  const auto stamp = valueOf<TAVTimeStamp>(TAV_TYPE_UTC_TIMESTAMP, bytes);
  EXPECT_EQ(stamp.seconds, 0x10000U);
  EXPECT_EQ(stamp.further, 9);
  EXPECT_EQ(stamp.offsetMinutes, 60);
  using Micro = std::chrono::sys_time<std::chrono::microseconds>;
  EXPECT_EQ(valueOf<Micro>(TAV_TYPE_UTC_TIMESTAMP, bytes), Micro(0x10000s + 258ms + 3us)) << "the zone moves nothing";
  EXPECT_EQ(valueOf<std::chrono::sys_seconds>(TAV_TYPE_UTC_TIMESTAMP, bytes), std::chrono::sys_seconds(0x10000s));
  EXPECT_EQ(valueOf<std::chrono::sys_seconds>(TAV_TYPE_UTC_TIMESTAMP,
                                              "00 00 00 00 00 01 00 00 01 02 00 03 00 09 00 3C", kHighFirst),
            std::chrono::sys_seconds(0x10000s));
}

TEST(LayerValue, TimesThatTheClockCannotShowAreRefused)
{
  const char* const late = "FF FF FF FF FF FF FF FF 00 00 00 00 00 00 00 00";
  EXPECT_EQ(refusal<std::chrono::system_clock::time_point>(TAV_TYPE_UTC_TIMESTAMP, late), TAV_RC_OUTSIDE_PARENT);
  EXPECT_EQ(refusal<std::chrono::sys_seconds>(TAV_TYPE_UTC_TIMESTAMP, late), TAV_RC_OUTSIDE_PARENT);
  const char* const after2262 = "00 00 00 00 04 00 00 00 FF FF FF FF 00 00 00 00";
  EXPECT_EQ(refusal<std::chrono::sys_time<std::chrono::nanoseconds>>(TAV_TYPE_UTC_TIMESTAMP, after2262),
            TAV_RC_OUTSIDE_PARENT);
  EXPECT_EQ(valueOf<std::chrono::sys_seconds>(TAV_TYPE_UTC_TIMESTAMP, after2262),
            std::chrono::sys_seconds(0x400000000s + 65s));
}

TEST(LayerValue, AnotherTypeIsRefused)
{
  EXPECT_EQ(refusal<uint32_t>(TAV_TYPE_SINT32, "01 00 00 00"), TAV_RC_NOT_SUPPORTED);
  EXPECT_EQ(refusal<std::string>(TAV_TYPE_BINARY, "61"), TAV_RC_NOT_SUPPORTED);
  EXPECT_EQ(refusal<std::vector<std::byte>>(TAV_TYPE_ASCII_STRING, "61"), TAV_RC_NOT_SUPPORTED);
  EXPECT_EQ(refusal<std::vector<uint64_t>>(TAV_TYPE_UINT64, "01 00 00 00 00 00 00 00"), TAV_RC_NOT_SUPPORTED);
  EXPECT_EQ(refusal<tav::Uint128>(TAV_TYPE_SINT128, "01 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00"),
            TAV_RC_NOT_SUPPORTED);
}

TEST(LayerValue, AnotherSizeIsRefused)
{
  EXPECT_EQ(refusal<uint32_t>(TAV_TYPE_UINT32, "01 00 00"), TAV_RC_OUTSIDE_PARENT);
  EXPECT_EQ(refusal<uint32_t>(TAV_TYPE_UINT32, "01 00 00 00 00"), TAV_RC_OUTSIDE_PARENT);
  EXPECT_EQ(refusal<std::byte>(TAV_TYPE_BYTE, ""), TAV_RC_OUTSIDE_PARENT);
  EXPECT_EQ(refusal<TAVTimeStamp>(TAV_TYPE_UTC_TIMESTAMP, "01"), TAV_RC_OUTSIDE_PARENT);
}

TEST(LayerValue, GroupHasNoValue)
{
  tav::Writer writer;
  writer.group(TAV_ELM_CMN_SYSTEM).close();
  const tav::Reader reader(writer.bytes());
  EXPECT_EQ(thrownBy([&] { static_cast<void>(reader.root().as<uint8_t>()); }), TAV_RC_NOT_SUPPORTED);
  EXPECT_EQ(thrownBy([&] { static_cast<void>(reader.root().asNumber<int>()); }), TAV_RC_NOT_SUPPORTED);
  EXPECT_EQ(thrownBy([&] { static_cast<void>(reader.root().copy().as<uint8_t>()); }), TAV_RC_NOT_SUPPORTED);
  EXPECT_TRUE(reader.root().payload().empty());
}

TEST(LayerNumber, AnyIntegerTypeGivesItsNumber)
{
  EXPECT_EQ(OneElement(kLow, TAV_TYPE_UINT8, hex("FE")).node().asNumber<int64_t>(), 254);
  EXPECT_EQ(OneElement(kLow, TAV_TYPE_SINT8, hex("FE")).node().asNumber<int64_t>(), -2);
  EXPECT_EQ(OneElement(kLow, TAV_TYPE_UINT16, hex("B2 A1")).node().asNumber<int>(), 0xA1B2);
  EXPECT_EQ(OneElement(kLow, TAV_TYPE_SINT16, hex("FE FF")).node().asNumber<int>(), -2);
  EXPECT_EQ(OneElement(kLow, TAV_TYPE_UINT32, hex("FF FF FF FF")).node().asNumber<int64_t>(), 0xFFFFFFFF);
  EXPECT_EQ(OneElement(kLow, TAV_TYPE_SINT32, hex("FE FF FF FF")).node().asNumber<int8_t>(), -2);
  EXPECT_EQ(OneElement(kLow, TAV_TYPE_UINT64, hex("07 00 00 00 00 00 00 00")).node().asNumber<uint8_t>(), 7);
  EXPECT_EQ(OneElement(kLow, TAV_TYPE_SINT64, hex("FE FF FF FF FF FF FF FF")).node().asNumber<int16_t>(), -2);
  EXPECT_EQ(OneElement(kLow, TAV_TYPE_UINT128, hex("FF FF FF FF FF FF FF FF 00 00 00 00 00 00 00 00"))
                .node()
                .asNumber<uint64_t>(),
            std::numeric_limits<uint64_t>::max());
  EXPECT_EQ(
      OneElement(kLow, TAV_TYPE_SINT128, hex("FE FF FF FF FF FF FF FF FF FF FF FF FF FF FF FF")).node().asNumber<int>(),
      -2);
}

TEST(LayerNumber, NumberThatDoesNotFitIsRefused)
{
  EXPECT_EQ(numberRefusal<int8_t>(TAV_TYPE_UINT8, "80"), TAV_RC_OUTSIDE_PARENT);
  EXPECT_EQ(numberRefusal<uint64_t>(TAV_TYPE_SINT8, "FE"), TAV_RC_OUTSIDE_PARENT);
  EXPECT_EQ(numberRefusal<int64_t>(TAV_TYPE_UINT64, "00 00 00 00 00 00 00 80"), TAV_RC_OUTSIDE_PARENT);
  EXPECT_EQ(numberRefusal<uint64_t>(TAV_TYPE_UINT128, "00 00 00 00 00 00 00 00 01 00 00 00 00 00 00 00"),
            TAV_RC_OUTSIDE_PARENT);
  EXPECT_EQ(numberRefusal<int64_t>(TAV_TYPE_SINT128, "FE FF FF FF FF FF FF 7F FF FF FF FF FF FF FF FF"),
            TAV_RC_OUTSIDE_PARENT);
}

TEST(LayerNumber, WhatIsNoIntegerIsRefused)
{
  EXPECT_EQ(numberRefusal<int>(TAV_TYPE_ASCII_STRING, "31"), TAV_RC_NOT_SUPPORTED);
  EXPECT_EQ(numberRefusal<int>(TAV_TYPE_BYTE, "31"), TAV_RC_NOT_SUPPORTED);
  EXPECT_EQ(numberRefusal<int>(TAV_TYPE_UINT32, "31"), TAV_RC_OUTSIDE_PARENT);
}

class LayerRoundTrip : public ::testing::TestWithParam<tav::StreamOptions>
{
};

TEST_P(LayerRoundTrip, EveryTypeComesBackAndTheWalkGoesOn)
{
  const std::string longText(1000, 'u');
  using Time = std::chrono::sys_time<std::chrono::microseconds>;
  const Time time(0x10000s + 258ms + 3us);
  tav::Writer writer(GetParam());
  {
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM, {.eyeSize = true});
    root.add(1, int16_t{-7});
    root.add(2, "text");
    root.add(3, tav::Utf8{longText}, {.eyeSize = true});
    root.add(4, u8"short");
    root.add(5, std::array{std::byte{1}, std::byte{2}, std::byte{3}});
    root.add(6, std::vector<uint64_t>{1, 2, 3});
    root.add(7, tav::Uint128{1, 2}, {.eyeSize = true});
    root.add(8, tav::Sint128{-1, 2});
    root.add(9, time);
    root.add(10, "");
    root.add(11, std::byte{4});
  }
  writer.finish();
  const tav::Reader reader(writer.bytes(), GetParam());
  std::vector<tav::Node> nodes;
  for (const tav::Node& node : reader.root().children())
  {
    nodes.push_back(node);
  }
  ASSERT_EQ(nodes.size(), 11U);
  EXPECT_EQ(nodes[0].as<int16_t>(), -7);
  EXPECT_EQ(nodes[1].as<std::string>(), "text");
  EXPECT_EQ(nodes[2].as<std::string>(), longText);
  EXPECT_TRUE(nodes[3].as<std::u8string>() == u8"short");
  EXPECT_EQ(nodes[4].as<std::vector<std::byte>>().size(), 3U);
  EXPECT_EQ(nodes[5].as<std::vector<uint64_t>>(), (std::vector<uint64_t>{1, 2, 3}));
  EXPECT_EQ(nodes[6].as<tav::Uint128>(), (tav::Uint128{1, 2}));
  EXPECT_EQ(nodes[7].as<tav::Sint128>(), (tav::Sint128{-1, 2}));
  EXPECT_EQ(nodes[8].as<Time>(), time);
  EXPECT_EQ(nodes[9].as<std::string>(), "");
  EXPECT_EQ(nodes[10].as<std::byte>(), std::byte{4});
}

INSTANTIATE_TEST_SUITE_P(Forms, LayerRoundTrip,
                         ::testing::Values(tav::StreamOptions{},
                                           tav::StreamOptions{.byteOrder = tav::ByteOrder::swapped},
                                           tav::StreamOptions{.align8 = true},
                                           tav::StreamOptions{.root = tav::Width::bits32},
                                           tav::StreamOptions{.byteOrder = tav::ByteOrder::swapped, .align8 = true}));
