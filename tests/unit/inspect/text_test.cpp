#include <array>
#include <initializer_list>
#include <string>
#include <vector>

#include <gmock/gmock.h>

#include "inspect/streams.h"
#include "support/byteRows.h"

using namespace tav::inspect;

namespace
{

/// The 16 bytes of a number in host order.
std::string digits(uint64_t high, uint64_t low, bool isSigned)
{
  test::ByteRows rows;
  rows.number(test::kBigEndianHost ? high : low, 8).number(test::kBigEndianHost ? low : high, 8);
  return int128Text(rows.bytes, isSigned);
}

/// The value of the node that bytes begin with as people read it, or as plain text.
std::string firstValue(const test::Bytes& bytes, const tav::inspect::Form& form, uint64_t most, bool plain = false)
{
  ByteSource source("x", std::span<const uint8_t>(bytes));
  Node node;
  tav::layout::decodeHeader(bytes.data(), true, form.swapped, node.header);
  node.limit = bytes.size();
  return plain ? plainText(source, form, node, most).value_or("(too long)") : valueText(source, form, node, most);
}

} // namespace

TEST(Similar, CountsWhatHasToBeChanged)
{
  EXPECT_EQ(editDistance("hostName", "hostname"), 0U);
  EXPECT_EQ(editDistance("hostNmae", "hostName"), 2U);
  EXPECT_EQ(editDistance("", "abc"), 3U);
  EXPECT_EQ(editDistance("abc", ""), 3U);
  EXPECT_EQ(editDistance("kitten", "sitting"), 3U);
  const std::string longWord(1000, 'x');
  EXPECT_EQ(editDistance(longWord, longWord + "yz"), 2U);
  EXPECT_EQ(editDistance(longWord + "yz", longWord), 2U);
}

TEST(Similar, FindsTheNearestWordWithinTheSlipsThatItsLengthAllows)
{
  const std::vector<std::string> known{"recover", "check", "tree"};
  EXPECT_EQ(nearest("recovr", known), "recover");
  EXPECT_EQ(nearest("chekc", known), "check");
  EXPECT_EQ(nearest("re", known), "recover"); // begins with it
  EXPECT_EQ(nearest("snapshot", known), "");
  EXPECT_EQ(nearest(std::string(100, 'x'), known), "");
  EXPECT_EQ(mostSlips("abcd"), 2U);
}

TEST(Value, WritesNumbersOf128BitsToTheirLastDigit)
{
  EXPECT_EQ(digits(0, 0, false), "0");
  EXPECT_EQ(digits(0, 42, true), "42");
  EXPECT_EQ(digits(1, 0, false), "18446744073709551616");
  EXPECT_EQ(digits(~uint64_t{0}, ~uint64_t{0}, false), "340282366920938463463374607431768211455");
  EXPECT_EQ(digits(~uint64_t{0}, ~uint64_t{0}, true), "-1");
  EXPECT_EQ(digits(uint64_t{1} << 63, 0, true), "-170141183460469231731687303715884105728");
  EXPECT_EQ(digits(~uint64_t{0}, 0, true), "-18446744073709551616");
}

TEST(Value, TellsWhatIsUtf8)
{
  EXPECT_TRUE(isUtf8(""));
  EXPECT_TRUE(isUtf8("a\xC3\xA4\xE2\x82\xAC\xF0\x9F\x98\x80"));
  for (const char* const wrong :
       {"\x80", "\xC3", "\xC0\x80", "\xE0\x80\x80", "\xED\xA0\x80", "\xF4\x90\x80\x80", "\xFF"})
  {
    EXPECT_FALSE(isUtf8(wrong));
  }
}

TEST(Value, CutsBetweenCharacters)
{
  EXPECT_EQ(cutToWidth("\xC3\xA4\xC3\xA4\xC3\xA4\xC3\xA4", 4), "\xC3\xA4\xC3\xA4\xC3\xA4\xC3\xA4");
  EXPECT_EQ(cutToWidth("\xC3\xA4\xC3\xA4\xC3\xA4\xC3\xA4\xC3\xA4", 4), "\xC3\xA4...");
}

/// In this machine's byte order and in the other one.
class ValueOf : public testing::TestWithParam<bool>
{
protected:
  /// A node whose payload is `size` bytes of 0x61, but the code page of a text.
  test::Bytes node(uint16_t type, uint64_t size, uint64_t there)
  {
    test::ByteRows rows(GetParam());
    rows.h64(size, 0, type, TAV_ELM_CMN_HOST_NAME);
    if (type == TAV_TYPE_UTF8_STRING && there >= 2)
    {
      rows.number(65001, 2);
    }
    return rows.fill(16 + there - rows.at(), 'a').bytes;
  }
  std::string text(uint16_t type, uint64_t size, uint64_t most)
  {
    return firstValue(node(type, size, size), form, most);
  }

  tav::inspect::Form form{.swapped = GetParam()};
};

INSTANTIATE_TEST_SUITE_P(Swapped, ValueOf, testing::Bool());

TEST_P(ValueOf, OfAWrongSizeIsItsBytesWithASignWhereThereAreMore)
{
  const std::string ten = "61616161616161616161";
  for (const uint64_t most : std::initializer_list<uint64_t>{1, 9, 10, 16, 100})
  {
    EXPECT_EQ(text(TAV_TYPE_UINT32, 10, most), ten) << most;
  }
  EXPECT_EQ(text(TAV_TYPE_UINT32, 16, 1), ten + "616161616161");
  EXPECT_EQ(text(TAV_TYPE_UINT32, 17, 1), ten + "616161616161 ...");
  EXPECT_EQ(text(TAV_TYPE_UINT32, 18, 17), ten + "61616161616161 ...");
  EXPECT_EQ(text(TAV_TYPE_UINT32, 18, 18), ten + "6161616161616161");
}

TEST_P(ValueOf, ATextIsCutWithASignWhereThereIsMore)
{
  EXPECT_EQ(text(TAV_TYPE_ASCII_STRING, 5, 100), "\"aaaaa\"");
  EXPECT_EQ(text(TAV_TYPE_ASCII_STRING, 20, 18), "\"aaaaaaaaaaaaaaaaaa\" ...");
  EXPECT_EQ(text(TAV_TYPE_UTF8_STRING, 20, 18), "\"aaaaaaaaaaaaaaaa\" ...");
  EXPECT_EQ(text(TAV_TYPE_UTF8_STRING, 20, 20), "\"aaaaaaaaaaaaaaaaaa\"");
}

TEST_P(ValueOf, APlainTextIsNothingWhereItIsTooLong)
{
  EXPECT_EQ(firstValue(node(TAV_TYPE_ASCII_STRING, 5, 5), form, 5, true), "aaaaa");
  EXPECT_EQ(firstValue(node(TAV_TYPE_ASCII_STRING, 5, 5), form, 4, true), "(too long)");
  EXPECT_EQ(firstValue(node(TAV_TYPE_UINT32, 5, 5), form, 5, true), "6161616161");
}

TEST_P(ValueOf, APairGivesItsDistanceInEitherByteOrder)
{
  test::ByteRows rows(GetParam());
  rows.fill(8, 0x5A).pair(77).fill(3, 0x5A);
  ByteSource source("x", std::span<const uint8_t>(rows.bytes));
  for (const bool swapped : {false, true})
  {
    EXPECT_EQ(pairDistanceAt(source, {.swapped = swapped}, 8), 77U);
    EXPECT_EQ(pairDistanceAt(source, {.swapped = swapped}, 7), std::nullopt);
    EXPECT_EQ(pairDistanceAt(source, {.swapped = swapped}, 12), std::nullopt); // not all of a pair is behind it
  }
}

TEST(Value, TextForATerminalHasNothingThatSteersIt)
{
  EXPECT_EQ(forTerminal("a \"b\" c\\d"), "a \"b\" c\\d");
  EXPECT_EQ(quoted("a \"b\" c\\d"), R"("a \"b\" c\\d")");
  EXPECT_EQ(forTerminal("\x1B[31m\n\x7F"), R"(\x1b[31m\n\x7f)");
  EXPECT_EQ(forTerminal("\xC2\x9B"
                        "31m"),
            R"(\xc2\x9b31m)");
  EXPECT_EQ(forTerminal("a\xFFz"), R"(a\xffz)");
  EXPECT_EQ(forTerminal("\xE2\x80\xAE"
                        "abc"),
            R"(\xe2\x80\xaeabc)");
}
