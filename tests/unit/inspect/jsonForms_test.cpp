// Documents of which a stream in another form is made, and the words of a document in all the ways in which they stand.
#include <string>
#include <utility>
#include <vector>

#include <gmock/gmock.h>

#include "inspect/streams.h"

using namespace tav::inspect;
using test::Bytes;
using testing::HasSubstr;
using testing::Not;

namespace
{

struct Converted
{
  Bytes bytes{};
  LeftOut leftOut{};
  std::string refused{};
};

Converted converted(const std::string& text, const Conversion& conversion)
{
  MemoryText document("document", text);
  test::Made made;
  Converted result;
  try
  {
    result.leftOut = fromJson(document, made.file(), conversion);
    result.bytes = made.bytes();
  }
  catch (const Error& error)
  {
    result.refused = error.problem().sentence;
  }
  return result;
}

std::string jsonOf(const Bytes& bytes, const Form& form, const ToJsonOptions& options = {.style = JsonStyle::compact})
{
  ByteSource source("x", std::span<const uint8_t>(bytes));
  test::Kept kept;
  toJson(source, form, kept, options);
  return kept.text;
}

std::string node(const std::string& properties)
{
  return R"([{"element": "system", "children": [{"id": 1, )" + properties + "}]}]";
}

/// All kinds of values, of which some have an odd length.
const char* const kValues = R"([{"element": "system", "eyeSize": true, "children": [
    {"id": 1, "value": 7}, {"id": 2, "value": -7}, {"id": 3, "value": "ada"}, {"id": 4, "value": "gr\u00fc\u00df"},
    {"id": 5, "value": [1, 2, 3]}, {"id": 6, "bytes": "010203"}, {"id": 7, "type": "Byte", "value": 9},
    {"element": "host", "type": "group32", "eyeSize": true, "children": [{"id": 8, "value": 340282366920938463463}]},
    {"element": "host", "children": []}, {"id": 9, "value": "2024-02-29T10:30:00.123456+01:00"}]}])";

bool differ(const Bytes& a, const Form& formA, const Bytes& b, const Form& formB)
{
  ByteSource first("a", std::span<const uint8_t>(a));
  ByteSource second("b", std::span<const uint8_t>(b));
  return diff({first, formA}, {second, formB}, {}, [](const Difference& one) { ADD_FAILURE() << one.sentence; });
}

} // namespace

TEST(JsonForms, EveryConversionKeepsEveryValue)
{
  const Bytes bytes = test::bytesOfJson(kValues);
  const std::string text = jsonOf(bytes, {});
  for (const bool swapped : {false, true})
  {
    for (const bool root64 : {false, true})
    {
      for (const bool aligned : {false, true})
      {
        for (const bool eyeSize : {false, true})
        {
          SCOPED_TRACE(testing::Message() << swapped << root64 << aligned << eyeSize);
          const Converted made =
              converted(text, {.swapped = swapped, .root64 = root64, .aligned = aligned, .eyeSize = eyeSize});
          if (eyeSize && !root64)
          {
            EXPECT_EQ(made.refused, "eye/size pairs need 64-bit headers");
            continue;
          }
          const Form form{.swapped = swapped, .root64 = root64, .aligned = aligned};
          EXPECT_EQ(made.refused, "");
          EXPECT_EQ(test::defects(made.bytes, form), 0U);
          EXPECT_FALSE(differ(bytes, {}, made.bytes, form));
          EXPECT_THAT(jsonOf(made.bytes, form), Not(HasSubstr("\"pair\""))) << "all are as a writer makes them";
        }
      }
    }
  }
}

TEST(JsonForms, PairsAreGivenToEveryNodeWhereTheyAreAskedFor)
{
  const Converted made =
      converted(R"({"system": {"cpuOnline": [1, 2], "host": {"hostName": "ada"}}})", {.eyeSize = true});
  const std::string text = jsonOf(made.bytes, {});
  size_t pairs = 0;
  for (size_t at = text.find("\"eyeSize\":true"); at != std::string::npos; at = text.find("\"eyeSize\":true", at + 1))
  {
    ++pairs;
  }
  EXPECT_EQ(pairs, 5U);
}

TEST(JsonForms, DamageIsLeftOutOfWhatIsConvertedAndCounted)
{
  const std::string text = R"([{"element": "system", "children": [{"damaged": "0102"}, {"id": 1, "value": 7},
      {"unread": "030405"}]}, {"zeros": 100}])";
  const Converted plain = converted(text, {});
  EXPECT_EQ(plain.bytes.size(), 16U + 2U + 20U + 3U + 100U);
  EXPECT_EQ(plain.leftOut.places, 0U);
  const Converted made = converted(text, {.swapped = true});
  EXPECT_EQ(made.bytes.size(), 16U + 20U);
  EXPECT_EQ(made.leftOut.places, 2U);
  EXPECT_EQ(made.leftOut.bytes, 5U);
}

TEST(JsonForms, EndElementsThatAreWrittenOutAreMadeAnew)
{
  const std::string ended = R"([{"element": "system", "eyeSize": true, "endElement": false, "children": [
      {"id": 1, "value": 7}, {"element": "endHdrEyeSize", "bytes": "00112233445566778899aabbccddeeff"}]}])";
  const Converted plain = converted(ended, {});
  EXPECT_EQ(plain.bytes.size(), 16U + 20U + 32U) << "as it stands";
  const Converted made = converted(ended, {.swapped = true});
  EXPECT_EQ(made.refused, "");
  EXPECT_EQ(made.bytes.size(), 16U + 20U + 32U);
  EXPECT_EQ(test::defects(made.bytes, {.swapped = true}), 0U);
  EXPECT_NE(test::defects(plain.bytes, {}), 0U);
}

TEST(JsonForms, WhatStandsBehindAValueIsKeptUnlessItIsMadeAnew)
{
  const std::string text = node(R"("eyeSize": true, "type": "UTF8 String", "value": "a", "extra": "0102",
      "padding": "030405", "pair": "000102030405060708090a0b0c0d0e0f")");
  const Converted plain = converted(text, {});
  ASSERT_EQ(plain.bytes.size(), 32U + 3U + 2U + 3U + 16U);
  EXPECT_THAT(hexText(std::span(plain.bytes).subspan(35)), testing::Eq("0102030405000102030405060708090a0b0c0d0e0f"));
  const Converted made = converted(text, {.swapped = true});
  EXPECT_EQ(made.bytes.size(), 32U + 3U + 16U);
  EXPECT_EQ(test::defects(made.bytes, {.swapped = true}), 0U);
}

TEST(JsonForms, SizesThatAreGivenStandAsTheyAre)
{
  for (const auto& [header, length] : std::vector<std::pair<const char*, size_t>>{{"64", 16}, {"32", 8}})
  {
    const std::string before = std::string(R"({"form": {"root": )") + header + R"(}, "nodes": [{"element": "system", )";
    for (const auto& [size, bytes] : std::vector<std::pair<std::string, uint8_t>>{{"\"unknown\"", uint8_t{0xFF}},
                                                                                  {"0", uint8_t{0}}})
    {
      const Converted made = converted(before + R"("size": )" + size + R"(, "children": []}]})", {});
      ASSERT_EQ(made.bytes.size(), length) << made.refused;
      EXPECT_EQ(Bytes(made.bytes.begin(), made.bytes.begin() + 4), Bytes(4, bytes)) << header << size;
    }
  }
}

TEST(JsonForms, NumbersMayBeHexadecimalTexts)
{
  EXPECT_EQ(test::bytesOfJson(node(R"("info": "0x12", "value": 7)")),
            test::bytesOfJson(node(R"("info": 18, "value": 7)")));
  EXPECT_THAT(converted(node(R"("info": "0x1g", "value": 7)"), {}).refused, HasSubstr("is no number that fits"));
  EXPECT_THAT(converted(node(R"("info": "0x", "value": 7)"), {}).refused, HasSubstr("is no number that fits"));
  EXPECT_THAT(converted(node(R"("info": true, "value": 7)"), {}).refused, HasSubstr("is no number that fits"));
}

TEST(JsonForms, TruthIsANumberOfTheTypeThatIsGivenOrAByte)
{
  for (const char* const value : {"true", "false"})
  {
    const Bytes bytes = test::bytesOfJson(node(std::string(R"("value": )") + value));
    ASSERT_EQ(bytes.size(), 16U + 16U + 1U);
    EXPECT_EQ(bytes.back(), value == std::string("true") ? 1 : 0);
    EXPECT_EQ(test::bytesOfJson(node(std::string(R"("type": "Uint64", "value": )") + value)).size(), 40U);
  }
}

TEST(JsonForms, LongNumbersGetTheTypeThatHoldsThem)
{
  const auto typeOf = [](const std::string& number) {
    const std::string text = jsonOf(test::bytesOfJson(node(R"("value": )" + number)), {});
    const size_t at = text.find("\"type\":", text.find("\"id\":1,"));
    return text.substr(at + 8, text.find('"', at + 8) - at - 8);
  };
  const std::vector<std::pair<const char*, const char*>> cases{{"0", "Uint32"},
                                                               {"-0", "Uint32"},
                                                               {"4294967295", "Uint32"},
                                                               {"4294967296", "Uint64"},
                                                               {"18446744073709551615", "Uint64"},
                                                               {"18446744073709551616", "Uint128"},
                                                               {"-1", "Sint32"},
                                                               {"-2147483648", "Sint32"},
                                                               {"-2147483649", "Sint64"},
                                                               {"-9223372036854775808", "Sint64"},
                                                               {"-9223372036854775809", "Sint128"}};
  for (const auto& [number, type] : cases)
  {
    EXPECT_EQ(typeOf(number), type) << number;
  }
}

TEST(JsonForms, LongValuesOfLinesAreHandedOverInPieces)
{
  // Three times what is kept of a value before it is written, at both depths.
  std::string hex;
  for (int i = 0; i < 200'000; ++i)
  {
    hex += "0123456789abcdef";
  }
  const std::string first = "{\"lines\": true}\n{\"element\": \"system\", \"depth\": 0, \"type\": \"group64\", "
                            "\"size\": 3200036}\n";
  const std::string value =
      R"({"id": 1, "depth": 1, "type": "Binary", "bytes": [")" + hex + R"(", ")" + hex + "\"]}\n";
  const Converted made = converted(first + value + "{\"id\": 2, \"depth\": 1, \"value\": 7}\n", {});
  EXPECT_EQ(made.refused, "");
  ASSERT_EQ(made.bytes.size(), 3'200'036U + 16U);
  EXPECT_EQ(test::defects(made.bytes, {}), 0U);
  const std::string whole = jsonOf(made.bytes, {}, {.style = JsonStyle::lines});
  EXPECT_EQ(test::bytesOfJson(whole), made.bytes);
}

TEST(JsonForms, SafeDatesAndArraysHoldTheirNumbersAsTexts)
{
  const Bytes bytes = test::bytesOfJson(R"([{"element": "system", "children": [
      {"id": 1, "value": [1, 999999999999999, 1000000000000000, 18446744073709551615]},
      {"id": 2, "value": {"seconds": 18446744073709551615, "fractionA": 1, "fractionB": 2, "further": 3,
                          "offsetMinutes": -4}}]}])");
  const std::string safe = jsonOf(bytes, {}, {.style = JsonStyle::compact, .safe = true});
  EXPECT_THAT(safe, HasSubstr(R"([1,999999999999999,"1000000000000000","18446744073709551615"])"));
  EXPECT_THAT(safe, HasSubstr(R"({"seconds":"18446744073709551615","fractionA":1,"fractionB":2,"further":3,)"
                              R"("offsetMinutes":-4})"));
  EXPECT_EQ(test::bytesOfJson(safe), bytes);
  const std::string plain = jsonOf(bytes, {});
  EXPECT_THAT(plain, HasSubstr(R"("seconds":18446744073709551615,)"));
  EXPECT_EQ(test::bytesOfJson(plain), bytes);
}

TEST(JsonForms, ANameThatNoDictionaryHasIsTakenWithItsId)
{
  EXPECT_EQ(test::bytesOfJson(R"([{"element": "queueDepth", "id": 40001, "children": []}])"),
            test::bytesOfJson(R"([{"id": 40001, "children": []}])"));
  EXPECT_THAT(converted(R"([{"element": "queueDepth", "id": 60111, "children": []}])", {}).refused,
              HasSubstr("no element has the name \"queueDepth\""));
}

TEST(JsonForms, DeepNodesOfLinesAreNamedByTheirOffsets)
{
  std::string text;
  for (int i = 0; i < 70; ++i)
  {
    text += "{\"system\":";
  }
  text += "{\"cpuOnline\": [7, 8]}" + std::string(70, '}');
  const Bytes bytes = test::bytesOfJson(text);
  const std::string lines = jsonOf(bytes, {}, {.style = JsonStyle::lines});
  EXPECT_THAT(lines, HasSubstr(R"("path": "/**/cpuOnline[@0x460]")"));
  EXPECT_THAT(lines, HasSubstr(R"("path": "/**/cpuOnline[@0x474]")"));
  EXPECT_EQ(test::bytesOfJson(lines), bytes);
}
