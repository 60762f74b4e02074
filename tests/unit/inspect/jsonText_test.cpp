// The words and numbers of the JSON form, there and back, and what is none of them.
#include <array>
#include <string>
#include <utility>
#include <vector>

#include <gmock/gmock.h>
#include <nlohmann/json.hpp>

#include "inspect/streams.h"
#include "tav/inspect/jsonText.hpp"

using namespace tav::inspect;

namespace
{

std::string jsonString(std::string_view text)
{
  std::string out;
  appendJsonString(out, text);
  return out;
}

std::string numberAgain(const char* text, bool isSigned)
{
  const auto bytes = parseInt128(text, isSigned);
  return bytes ? int128Text(*bytes, isSigned) : "(none)";
}

} // namespace

TEST(JsonText, WritesEveryCharacterSoThatAnotherParserReadsIt)
{
  std::string all;
  for (int c = 0; c < 0x80; ++c)
  {
    all += static_cast<char>(c);
    const std::string one = all.substr(all.size() - 1);
    EXPECT_EQ(nlohmann::json::parse(jsonString(one)).get<std::string>(), one);
  }
  all += "\xC3\xBC\xE2\x82\xAC\xF0\x9F\x99\x82";
  EXPECT_EQ(nlohmann::json::parse(jsonString(all)).get<std::string>(), all);
  EXPECT_EQ(jsonString(""), "\"\"");
  EXPECT_EQ(jsonString("\x7F\n\x01z"), R"("\u007f\n\u0001z")");
}

TEST(JsonText, OfATypeIsFoundAgainOfAllNumbersThatHaveAName)
{
  std::vector<unsigned> named;
  for (unsigned number = 0; number <= 0xFFFF; ++number)
  {
    const auto type = static_cast<uint16_t>(number);
    const auto name = jsonTypeName(type);
    EXPECT_EQ(name.has_value(), tav::layout::isGroupType(type) || tav::layout::typeInfo(type).known) << number;
    if (name)
    {
      named.push_back(number);
      EXPECT_EQ(jsonTypeOf(*name), type) << *name;
    }
    EXPECT_EQ(typeText(type) == "type " + std::to_string(number), !name) << number;
  }
  EXPECT_EQ(named.size(), 18U);
}

TEST(JsonText, OfATypeMayBeSpeltInSeveralWays)
{
  for (const char* const name : {"group32", "GROUP-32", "TAV_TYPE_HEADER32", "header 32"})
  {
    EXPECT_EQ(jsonTypeOf(name), TAV_TYPE_HEADER32) << name;
  }
  for (const char* const name : {"group64", "Group_64", "TAV_TYPE_HEADER64", "Header64"})
  {
    EXPECT_EQ(jsonTypeOf(name), TAV_TYPE_HEADER64) << name;
  }
  for (const char* const name : {"", "TAV_TYPE_", "Uint", "Uint33", "group"})
  {
    EXPECT_EQ(jsonTypeOf(name), std::nullopt) << name;
  }
}

TEST(JsonText, OfBytesTakesPairsOfHexadecimalDigitsAlone)
{
  for (unsigned c = 0; c < 0x100; ++c)
  {
    const char other = static_cast<char>(c);
    const bool isDigit = std::string_view("0123456789abcdefABCDEF").find(other) != std::string_view::npos;
    std::string bytes;
    EXPECT_EQ(appendHexBytes(bytes, std::string{'1', other}), isDigit) << c;
    EXPECT_EQ(appendHexBytes(bytes, std::string{other, '1'}), isDigit) << c;
  }
  std::string bytes = "x";
  EXPECT_TRUE(appendHexBytes(bytes, "00aBfF"));
  EXPECT_EQ(bytes, (std::string{'x', '\0', '\xAB', '\xFF'}));
  EXPECT_FALSE(appendHexBytes(bytes, "123"));
}

TEST(JsonText, OfADateIsRefusedWhereverACharacterIsAnother)
{
  const std::string date = "2024-02-29T10:30:00.123456-01:30";
  const auto stamp = parseDate(date);
  ASSERT_TRUE(stamp);
  EXPECT_EQ(dateText(*stamp), date);
  EXPECT_TRUE(isWholeDate(*stamp, date));
  for (size_t at = 0; at < date.size(); ++at)
  {
    std::string other = date;
    other[at] = 'x';
    EXPECT_EQ(parseDate(other), std::nullopt) << other;
  }
  for (size_t length = 0; length < date.size(); ++length)
  {
    // A fraction of fewer digits and none at all are dates, and so is one without a zone.
    const bool isDate = length == 19 || (length >= 21 && length <= 26);
    EXPECT_EQ(parseDate(date.substr(0, length)).has_value(), isDate) << length;
  }
  EXPECT_EQ(parseDate(date + "0"), std::nullopt);
}

TEST(JsonText, OfADateIsRefusedBeyondTheClockAndTheCalendar)
{
  for (const char* const date : {"2024-02-29T23:59:59Z", "2024-02-29 00:00:00Z", "9999-12-31T23:59:59+00:59",
                                 "1970-01-01T00:00:00Z", "1970-01-01T01:00:00+01:00"})
  {
    EXPECT_TRUE(parseDate(date)) << date;
  }
  for (const char* const date :
       {"2024-02-29T24:00:00Z", "2024-02-29T23:60:00Z", "2024-02-29T23:59:60Z", "2023-02-29T00:00:00Z",
        "2024-00-01T00:00:00Z", "2024-13-01T00:00:00Z", "2024-01-00T00:00:00Z", "2024-01-32T00:00:00Z",
        "2024-02-29T10:30:00+01:60", "2024-02-29T10:30:00+1:00", "2024-02-29T10:30:00+0100", "2024-02-29T10:30:00Zz",
        "1969-12-31T23:59:59Z", "1970-01-01T00:59:59+01:00"})
  {
    EXPECT_EQ(parseDate(date), std::nullopt) << date;
  }
}

TEST(JsonText, OfADateIsWholeWhereTheStampCanBeReadOfItAgain)
{
  constexpr uint64_t endOf9999 = 253402300800;
  for (const uint64_t seconds : {uint64_t{0}, uint64_t{1}, uint64_t{1714557630}, endOf9999 - 1, endOf9999, UINT64_MAX})
  {
    for (const int offset : {0, 1, -1, 59, 60, 1439, 1440, -1440, 5999, -5999, 6000, -6000, 32767, -32768})
    {
      for (const unsigned fraction : {0U, 1U, 999U, 1000U, 65535U})
      {
        for (const unsigned further : {0U, 1U})
        {
          const TAVTimeStamp stamp{seconds, static_cast<uint16_t>(fraction), static_cast<uint16_t>(fraction / 2),
                                   static_cast<uint16_t>(further), static_cast<int16_t>(offset)};
          const std::string text = dateText(stamp);
          const auto again = parseDate(text);
          const bool isSame = again && std::memcmp(&*again, &stamp, sizeof stamp) == 0;
          EXPECT_EQ(isWholeDate(stamp, text), isSame) << text;
        }
      }
    }
  }
}

TEST(JsonText, OfADateIsNotWholeWhereTheStampHoldsMore)
{
  const TAVTimeStamp stamp = *parseDate("2024-02-29T10:30:00.123456+01:00");
  EXPECT_TRUE(isWholeDate(stamp, dateText(stamp)));
  TAVTimeStamp more = stamp;
  more.further = 1;
  EXPECT_FALSE(isWholeDate(more, dateText(more)));
  more = stamp;
  more.fractionA = 1123; // a second and 123 ms
  EXPECT_FALSE(isWholeDate(more, dateText(more)));
  more = stamp;
  more.seconds = ~uint64_t{0};
  EXPECT_FALSE(isWholeDate(more, dateText(more)));
}

TEST(JsonText, OfALongNumberIsTakenToItsLastDigitAndNoFurther)
{
  for (const char* const number : {"0", "7", "4294967296", "18446744073709551616", "79228162514264337593543950336",
                                   "170141183460469231731687303715884105727"})
  {
    EXPECT_EQ(numberAgain(number, false), number);
    EXPECT_EQ(numberAgain(number, true), number);
    if (*number != '0')
    {
      EXPECT_EQ(numberAgain(("-" + std::string(number)).c_str(), true), "-" + std::string(number));
      EXPECT_EQ(numberAgain(("-" + std::string(number)).c_str(), false), "(none)");
    }
  }
  EXPECT_EQ(numberAgain("-170141183460469231731687303715884105728", true), "-170141183460469231731687303715884105728");
  EXPECT_EQ(numberAgain("340282366920938463463374607431768211455", false), "340282366920938463463374607431768211455");
  EXPECT_EQ(numberAgain("-0", true), "0");
  for (const char* const number :
       {"", "-", "1x", "x1", "/", ":", "-170141183460469231731687303715884105729",
        "170141183460469231731687303715884105728", "340282366920938463463374607431768211456"})
  {
    EXPECT_EQ(numberAgain(number, true), "(none)") << number;
  }
}

TEST(JsonText, IsCutBetweenCharactersOrWhereNoneBegins)
{
  const std::string text = "a\xC3\xBC\xE2\x82\xAC\xF0\x9F\x99\x82z";
  const std::vector<size_t> cuts{0, 1, 1, 3, 3, 3, 6, 6, 6, 6, 10, 11, 11};
  for (size_t most = 0; most < cuts.size(); ++most)
  {
    EXPECT_EQ(cutAtCharacter(text, most), cuts[most]) << most;
  }
  // No character is that long: what is no text is cut nearly where it was to be.
  EXPECT_EQ(cutAtCharacter(std::string(20, '\x80'), 10), 7U);
  EXPECT_EQ(cutAtCharacter(std::string(20, '\x80'), 2), 1U);
}
