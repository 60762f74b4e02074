#include <array>
#include <cstring>
#include <vector>

#include "cpp/layer.h"

using namespace test;
using namespace std::chrono_literals;

namespace
{

constexpr uint16_t kElm = 0x1234;

/// The one element of a root group, without the root's header; in streams of a byte order.
template<class Add>
std::string elementOf(Add&& add, tav::StreamOptions options = {.byteOrder = kLowFirst})
{
  tav::Writer writer(options);
  tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
  add(root);
  const Bytes all = bytesOf(writer.bytes());
  return toHex(Bytes(all.begin() + 16, all.end()));
}

template<class T>
std::string added(const T& value, tav::ByteOrder byteOrder = kLowFirst)
{
  return elementOf([&value](tav::Group& root) { root.add(kElm, value); }, {.byteOrder = byteOrder});
}

template<class T>
uint32_t refusal(const T& value)
{
  tav::Writer writer;
  tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
  const uint64_t before = writer.size();
  const uint32_t thrown = thrownBy([&] { root.add(kElm, value); });
  EXPECT_EQ(givenBy([&](std::error_code& ec) { root.add(kElm, value, ec); }), thrown);
  EXPECT_EQ(writer.size(), before);
  return thrown;
}

} // namespace

// Expected bytes are those of streams with the low byte first, where a test does not say that it is the high byte.

TEST(LayerAdd, IntegersTakeTheTypeOfTheirWidthAndSign)
{
  EXPECT_EQ(added(uint8_t{0xA1}), rows("01 00 00 00 00 00 00 00 00 00 00 00 33 00 34 12 A1"));
  EXPECT_EQ(added(int8_t{-2}), rows("01 00 00 00 00 00 00 00 00 00 00 00 34 00 34 12 FE"));
  EXPECT_EQ(added(uint16_t{0xA1B2}), rows("02 00 00 00 00 00 00 00 00 00 00 00 35 00 34 12 B2 A1"));
  EXPECT_EQ(added(int16_t{-2}), rows("02 00 00 00 00 00 00 00 00 00 00 00 36 00 34 12 FE FF"));
  EXPECT_EQ(added(uint32_t{0xA1B2C3D4}), rows("04 00 00 00 00 00 00 00 00 00 00 00 37 00 34 12 D4 C3 B2 A1"));
  EXPECT_EQ(added(int32_t{-2}), rows("04 00 00 00 00 00 00 00 00 00 00 00 38 00 34 12 FE FF FF FF"));
  EXPECT_EQ(added(uint64_t{0xA1B2C3D4E5F60718}),
            rows("08 00 00 00 00 00 00 00 00 00 00 00 39 00 34 12 18 07 F6 E5 D4 C3 B2 A1"));
  EXPECT_EQ(added(int64_t{-2}), rows("08 00 00 00 00 00 00 00 00 00 00 00 3A 00 34 12 FE FF FF FF FF FF FF FF"));
}

TEST(LayerAdd, BothSpellingsOfA64BitIntegerAreTheSame)
{
  EXPECT_EQ(added(5ULL), added(uint64_t{5}));
  EXPECT_EQ(added(5UL), sizeof(long) == 8 ? added(uint64_t{5}) : added(uint32_t{5}));
  EXPECT_EQ(added(-5LL), added(int64_t{-5}));
}

TEST(LayerAdd, StreamOfTheHighByteFirstHoldsItFirst)
{
  EXPECT_EQ(added(uint32_t{0xA1B2C3D4}, kHighFirst),
            rows("00 00 00 00 00 00 00 04 00 00 00 00 00 37 12 34 A1 B2 C3 D4"));
}

TEST(LayerAdd, ByteIsAByte)
{
  EXPECT_EQ(added(std::byte{0xC7}), rows("01 00 00 00 00 00 00 00 00 00 00 00 69 00 34 12 C7"));
}

TEST(LayerAdd, EveryKindOfTextIsAnAsciiStringWithoutItsNul)
{
  const std::string expected = rows("03 00 00 00 00 00 00 00 00 00 00 00 32 00 34 12 61 64 61");
  const char* const pointer = "ada";
  char array[8] = "ada";
  EXPECT_EQ(added("ada"), expected);
  EXPECT_EQ(added(pointer), expected);
  EXPECT_EQ(added(array), expected);
  EXPECT_EQ(added(std::string("ada")), expected);
  EXPECT_EQ(added(std::string_view("ada")), expected);
}

TEST(LayerAdd, CharactersWithoutANulEndWithTheArray)
{
  const auto array = std::make_unique<char[][3]>(1); // its end is the end of the block
  array[0][0] = 'a';
  array[0][1] = 'd';
  array[0][2] = 'a';
  EXPECT_EQ(added(array[0]), added("ada"));
}

TEST(LayerAdd, NullPointerToTextIsRefused)
{
  EXPECT_EQ(refusal(static_cast<const char*>(nullptr)), TAV_RC_BAD_PARAM);
  EXPECT_EQ(refusal(static_cast<const char8_t*>(nullptr)), TAV_RC_BAD_PARAM);
}

TEST(LayerAdd, EmptyTextHasAnEmptyPayload)
{
  EXPECT_EQ(added(""), rows("00 00 00 00 00 00 00 00 00 00 00 00 32 00 34 12"));
  EXPECT_EQ(added(std::string_view()), added(""));
}

TEST(LayerAdd, Utf8CarriesItsCodePageInThePayload)
{
  const std::string expected = rows("05 00 00 00 00 00 00 00 00 00 00 00 66 00 34 12 B8 04 C3 A4 21");
  EXPECT_EQ(added(u8"\u00E4!"), expected);
  EXPECT_EQ(added(std::u8string(u8"\u00E4!")), expected);
  EXPECT_EQ(added(tav::Utf8{"\xC3\xA4!"}), expected);
  EXPECT_EQ(added(tav::Utf8Text{"\xC3\xA4!"}), expected);
}

TEST(LayerAdd, Utf8OfAnotherCodePageKeepsIt)
{
  EXPECT_EQ(added(tav::Utf8{"A", 0x0102}), rows("03 00 00 00 00 00 00 00 00 00 00 00 66 00 34 12 02 01 41"));
}

TEST(LayerAdd, CodePageIsInTheStreamsByteOrder)
{
  EXPECT_EQ(added(tav::Utf8{"A"}, kHighFirst),
            rows("00 00 00 00 00 00 00 03 00 00 00 00 00 66 12 34 04 B8 41"));
}

TEST(LayerAdd, Utf8LongerThanTheShortWayIsWhole)
{
  const std::string text(1000, 'x');
  tav::Writer writer;
  tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
  root.add(kElm, tav::Utf8{text});
  const Bytes all = bytesOf(writer.bytes());
  ASSERT_EQ(all.size(), 16 + 16 + 2 + text.size());
  EXPECT_EQ(std::string(all.begin() + 34, all.end()), text);
}

TEST(LayerAdd, TextBeyondAsciiIsAUtf8String)
{
  const std::string expected = rows("04 00 00 00 00 00 00 00 00 00 00 00 66 00 34 12 B8 04 C3 A4");
  EXPECT_EQ(added("\xC3\xA4"), expected);
  EXPECT_EQ(added(std::string("\xC3\xA4")), expected);
  EXPECT_EQ(added(std::string_view("\xC3\xA4")), expected);
  std::string longer(302, 'x');
  longer.replace(300, 2, "\xC3\xA4");
  EXPECT_EQ(added(longer), added(tav::Utf8{longer}));
  for (size_t place = 0; place < 20; ++place) // wherever it is in the words that are looked at
  {
    std::string text(20, 'x');
    text.replace(place, 1, "\xF0\x9F\x98\x80");
    EXPECT_EQ(added(text), added(tav::Utf8{text})) << place;
  }
  EXPECT_EQ(added(std::string("\x7F\0", 2)), rows("02 00 00 00 00 00 00 00 00 00 00 00 32 00 34 12 7F 00"));
}

TEST(LayerAdd, TextThatIsNoUtf8IsRefused)
{
  for (const char* const text :
       {"\x80", "\xC3", "\xC3(", "\xC0\x80", "\xE0\x80\x80", "\xED\xA0\x80", "\xF0\x80\x80\x80", "\xF4\x90\x80\x80",
        "\xF5\x80\x80\x80", "\xE2\x82", "\xF0\x9F\x98", "\xFF", "abcdefgh\xE4"})
  {
    EXPECT_EQ(refusal(text), TAV_RC_BAD_PARAM) << toHex(Bytes(text, text + std::strlen(text)));
  }
  EXPECT_EQ(added("\xEF\xBF\xBF"), added(tav::Utf8{"\xEF\xBF\xBF"})) << "a character, if not one to be exchanged";
}

TEST(LayerAdd, IdBeyond65535IsRefusedAndDoesNotBecomeAnother)
{
  tav::Writer writer;
  EXPECT_EQ(thrownBy([&] { static_cast<void>(writer.group(0x10001)); }), TAV_RC_BAD_PARAM);
  tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
  for (const int64_t id : {int64_t{65536}, int64_t{65537}, int64_t{-1}, int64_t{1} << 32U, INT64_MIN})
  {
    EXPECT_EQ(thrownBy([&] { root.add(id, 5); }), TAV_RC_BAD_PARAM) << id;
    EXPECT_EQ(givenBy([&](std::error_code& ec) { root.add<TAV_TYPE_UINT8>(id, 5, ec); }), TAV_RC_BAD_PARAM) << id;
    EXPECT_EQ(thrownBy([&] { root.addRaw(TAV_TYPE_BINARY, id, {}); }), TAV_RC_BAD_PARAM) << id;
    EXPECT_EQ(givenBy([&](std::error_code& ec) { static_cast<void>(root.group(id, ec)); }), TAV_RC_BAD_PARAM) << id;
  }
  tav::Writer narrow({.root = tav::Width::bits32});
  tav::Group other = narrow.group(TAV_ELM_CMN_SYSTEM);
  EXPECT_EQ(thrownBy([&] { other.add(65536, 5); }), TAV_RC_BAD_PARAM) << "on the slow way, too";
  EXPECT_EQ(root.add(65535, 5).elm(), 65535);
  EXPECT_EQ(root.add(uint8_t{7}, 5).elm(), 7);
  enum Own
  {
    own = 40000
  };
  EXPECT_EQ(root.add(own, 5).elm(), 40000);
}

TEST(LayerAdd, BytesAreBinary)
{
  const std::array bytes{std::byte{1}, std::byte{2}};
  const std::string expected = rows("02 00 00 00 00 00 00 00 00 00 00 00 65 00 34 12 01 02");
  EXPECT_EQ(added(bytes), expected);
  EXPECT_EQ(added(std::span(bytes)), expected);
  EXPECT_EQ(added(std::vector<std::byte>(bytes.begin(), bytes.end())), expected);
}

TEST(LayerAdd, WordsAreAnArray)
{
  const std::vector<uint64_t> words{1, 0x0102030405060708};
  EXPECT_EQ(added(words), rows("10 00 00 00 00 00 00 00 00 00 00 00 6A 00 34 12"
                               "01 00 00 00 00 00 00 00 08 07 06 05 04 03 02 01"));
  EXPECT_EQ(added(words, kHighFirst), rows("00 00 00 00 00 00 00 10 00 00 00 00 00 6A 12 34"
                                           "00 00 00 00 00 00 00 01 01 02 03 04 05 06 07 08"));
}

TEST(LayerAdd, LongIntegersInHalvesAreOneValue)
{
  const tav::Uint128 value{0x1112131415161718, 0x2122232425262728};
  EXPECT_EQ(added(value), rows("10 00 00 00 00 00 00 00 00 00 00 00 67 00 34 12"
                               "28 27 26 25 24 23 22 21 18 17 16 15 14 13 12 11"));
  EXPECT_EQ(added(value, kHighFirst), rows("00 00 00 00 00 00 00 10 00 00 00 00 00 67 12 34"
                                           "11 12 13 14 15 16 17 18 21 22 23 24 25 26 27 28"));
  EXPECT_EQ(added(tav::Sint128{-1, ~uint64_t{1}}), rows("10 00 00 00 00 00 00 00 00 00 00 00 68 00 34 12"
                                                        "FE FF FF FF FF FF FF FF FF FF FF FF FF FF FF FF"));
}

#if defined(__SIZEOF_INT128__)
TEST(LayerAdd, TheCompilersLongIntegersAreTheSameAsHalves)
{
  const auto value = (tav::BuiltinUint128{0x1112131415161718} << 64U) | 0x2122232425262728U;
  EXPECT_EQ(added(value), added(tav::Uint128{0x1112131415161718, 0x2122232425262728}));
  EXPECT_EQ(added(tav::BuiltinSint128{-2}), added(tav::Sint128{-1, ~uint64_t{1}}));
}
#endif

TEST(LayerAdd, TimestampIsWrittenAsItIs)
{
  EXPECT_EQ(added(TAVTimeStamp{0x0102030405060708, 0x1112, 0x2122, 0x3132, -2}),
            rows("10 00 00 00 00 00 00 00 00 00 00 00 64 00 34 12"
                 "08 07 06 05 04 03 02 01 12 11 22 21 32 31 FE FF"));
}

TEST(LayerAdd, TimeOfTheSystemClockBecomesMillisecondsAndTheirMicroseconds)
{
  const std::chrono::sys_time<std::chrono::nanoseconds> time(0x10000s + 258ms + 3us + 999ns);
  EXPECT_EQ(added(time), rows("10 00 00 00 00 00 00 00 00 00 00 00 64 00 34 12"
                              "00 00 01 00 00 00 00 00 02 01 03 00 00 00 00 00"));
}

TEST(LayerAdd, CoarseTimesHaveNoFractions)
{
  EXPECT_EQ(added(std::chrono::sys_days(std::chrono::days(1))), added(TAVTimeStamp{86400, 0, 0, 0, 0}));
}

TEST(LayerAdd, TimesThatATimestampCannotTellAreRefused)
{
  EXPECT_EQ(refusal(std::chrono::sys_time<std::chrono::nanoseconds>(-1ns)), TAV_RC_OUTSIDE_PARENT);
  using Hours = std::chrono::duration<int64_t, std::ratio<3600>>; // those of a library may count in 32 bits
  EXPECT_EQ(refusal(std::chrono::sys_time<Hours>::max()), TAV_RC_OUTSIDE_PARENT);
}

TEST(LayerAdd, TypeCanBeNamed)
{
  const auto as = [](auto add) { return elementOf(add); };
  EXPECT_EQ(as([](tav::Group& root) { root.add<TAV_TYPE_SINT8>(kElm, -5); }), added(int8_t{-5}));
  EXPECT_EQ(as([](tav::Group& root) { root.add<TAV_TYPE_UINT16>(kElm, 5); }), added(uint16_t{5}));
  EXPECT_EQ(as([](tav::Group& root) { root.add<TAV_TYPE_BYTE>(kElm, 5); }), added(std::byte{5}));
  EXPECT_EQ(as([](tav::Group& root) { root.add<TAV_TYPE_UINT128>(kElm, 5); }), added(tav::Uint128{0, 5}));
  EXPECT_EQ(as([](tav::Group& root) { root.add<TAV_TYPE_SINT128>(kElm, -5); }),
            added(tav::Sint128{-1, ~uint64_t{4}}));
  EXPECT_EQ(as([](tav::Group& root) { root.add<uint8_t>(kElm, 5); }), added(uint8_t{5}));
}

TEST(LayerAdd, NumberThatTheNamedTypeCannotHoldIsRefused)
{
  tav::Writer writer;
  tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
  EXPECT_EQ(thrownBy([&] { root.add<TAV_TYPE_UINT8>(kElm, 256); }), TAV_RC_OUTSIDE_PARENT);
  EXPECT_EQ(thrownBy([&] { root.add<TAV_TYPE_UINT64>(kElm, -1); }), TAV_RC_OUTSIDE_PARENT);
  EXPECT_EQ(thrownBy([&] { root.add<TAV_TYPE_UINT128>(kElm, -1); }), TAV_RC_OUTSIDE_PARENT);
  EXPECT_EQ(givenBy([&](std::error_code& ec) { root.add<TAV_TYPE_SINT8>(kElm, 128, ec); }), TAV_RC_OUTSIDE_PARENT);
  EXPECT_EQ(writer.size(), 16U);
}

TEST(LayerAdd, RawPayloadHasTheTypeThatIsAskedFor)
{
  const std::array bytes{std::byte{9}};
  EXPECT_EQ(elementOf([&](tav::Group& root) { root.addRaw(0x0777, kElm, bytes); }),
            rows("01 00 00 00 00 00 00 00 00 00 00 00 77 07 34 12 09"));
}

TEST(LayerAdd, RawPayloadCannotBeAGroup)
{
  tav::Writer writer;
  tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
  EXPECT_EQ(thrownBy([&] { root.addRaw(TAV_TYPE_HEADER64, kElm, {}); }), TAV_RC_BAD_PARAM);
}

TEST(LayerAdd, OptionsGoIntoTheInfoAndBringThePair)
{
  const auto add = [](tav::Group& root) {
    root.add(kElm, uint8_t{7}, {.eyeSize = true, .info = 0x80000000, .infoKey = 0x7FF});
  };
  EXPECT_EQ(elementOf(add), rows("01 00 00 00 00 00 00 00 FF 07 40 80 33 00 34 12 07"
                                 "ED 0D EC DD EE D5 DE C0 11 00 00 00 00 00 00 00"));
}

TEST(LayerAdd, SearchKeyOfMoreThan11BitsIsRefused)
{
  tav::Writer writer;
  tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
  EXPECT_EQ(thrownBy([&] { root.add(kElm, uint8_t{7}, {.infoKey = 0x800}); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(thrownBy([&] { tav::Group inner = root.group(kElm, {.infoKey = 0x800}); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(writer.size(), 16U);
}

TEST(LayerAdd, WhetherPayloadsArePaddedIsNotTheNodesToSay)
{
  const auto add = [](tav::Group& root) { root.add(kElm, uint8_t{7}, {.info = TAV_INFO_ALIGNED8}); };
  EXPECT_EQ(elementOf(add), added(uint8_t{7}));
  EXPECT_EQ(elementOf(add, {.byteOrder = kLowFirst, .align8 = true}),
            rows("01 00 00 00 00 00 00 00 00 00 10 00 33 00 34 12 07 00 00 00 00 00 00 00"));
}

TEST(LayerAdd, ResultTellsWhereTheNodeStands)
{
  tav::Writer writer;
  tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
  root.add(kElm, uint8_t{1});
  const tav::HeaderView second = root.add(kElm, uint32_t{2});
  EXPECT_EQ(second.offset(), 16U + 17U);
  EXPECT_EQ(second.size(), 4U);
  EXPECT_EQ(second.type(), TAV_TYPE_UINT32);
  EXPECT_EQ(second.elm(), kElm);
}

TEST(LayerAdd, EncodedNodesGoInAsTheyAre)
{
  const Bytes node = hex("01 00 00 00 00 00 00 00 00 00 00 00 33 00 34 12 07");
  EXPECT_EQ(elementOf([&](tav::Group& root) { root.addStream(tav::Width::bits64, spanOf(node)); }), toHex(node));
}

TEST(LayerAdd, EncodedNodesOfTheOtherWidthAreRefused)
{
  const Bytes node = hex("01 00 00 00 33 00 34 12 07");
  tav::Writer writer;
  tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
  EXPECT_EQ(thrownBy([&] { root.addStream(tav::Width::bits32, spanOf(node)); }), TAV_RC_BAD_CHILD_HDR);
}
