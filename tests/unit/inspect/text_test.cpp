#include <array>
#include <string>
#include <vector>

#include <gmock/gmock.h>

#include "support/byteRows.h"
#include "tav/inspect.hpp"

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
