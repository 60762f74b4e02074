// Numbers as characters, against the formats that they stand for.
#include <cinttypes>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <limits>
#include <random>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "api/digits.h"

namespace
{

using namespace tav;
using namespace tav::inside;

/// What a writer wrote; nothing outside its room may be touched.
template<class Write>
std::string written(const Write& write)
{
  std::string room(digits::kLongest + 8, '#');
  const auto length = static_cast<size_t>(write(room.data()) - room.data());
  EXPECT_EQ(room.substr(digits::kLongest), "########");
  return room.substr(0, length);
}

template<class... Arguments>
std::string formatted(const char* format, Arguments... arguments)
{
  char text[64];
  std::snprintf(text, sizeof text, format, arguments...);
  return text;
}

/// Numbers on both sides of every change of length, the extremes, and random ones of every length.
std::vector<uint64_t> numbers()
{
  std::vector<uint64_t> result{0, 1, std::numeric_limits<uint64_t>::max(), uint64_t{1} << 63U,
                               (uint64_t{1} << 63U) - 1};
  for (uint64_t power = 10; power != 0 && power <= 10000000000000000000U;
       power = power > 1000000000000000000U ? 0 : power * 10)
  {
    result.insert(result.end(), {power - 1, power, power + 1});
  }
  result.insert(result.end(), {9999999999999999999U, 10000000000000000000U, 10000000000000000001U});
  std::mt19937_64 random(7);
  for (unsigned at = 0; at < 100000; ++at)
  {
    result.push_back(random() >> (at % 64));
  }
  return result;
}

TEST(Digits, OfAnyNumberAreThoseOfTheFormat)
{
  for (const uint64_t number : numbers())
  {
    ASSERT_EQ(written([&](char* to) { return digits::writeDecimal(to, number); }), formatted("%" PRIu64, number));
  }
}

TEST(Digits, OfAnySignedNumberAreThoseOfTheFormat)
{
  for (const uint64_t number : numbers())
  {
    const auto value = static_cast<int64_t>(number);
    ASSERT_EQ(written([&](char* to) { return digits::writeSigned(to, value); }), formatted("%" PRId64, value));
    const auto negative = static_cast<int64_t>(0 - number);
    ASSERT_EQ(written([&](char* to) { return digits::writeSigned(to, negative); }), formatted("%" PRId64, negative));
  }
}

TEST(Digits, OfEveryNumberOfEightDigitsInStepsAreThoseOfTheFormat)
{
  for (uint64_t number = 0; number < digits::kEight; number += 997)
  {
    ASSERT_EQ(written([&](char* to) { return digits::writeDecimal(to, number); }), formatted("%" PRIu64, number));
  }
}

TEST(Digits, WithAWidthAreThoseOfTheFormat)
{
  for (int number = -40000; number <= 70000; ++number)
  {
    ASSERT_EQ(written([&](char* to) { return digits::writePadded(to, number, 4); }), formatted("%04d", number));
    ASSERT_EQ(written([&](char* to) { return digits::writePadded(to, number, 6); }), formatted("%06d", number));
  }
}

TEST(Digits, OfTwoPlacesAreThoseOfTheFormat)
{
  for (unsigned number = 0; number < 100; ++number)
  {
    ASSERT_EQ(written([&](char* to) { return digits::writeTwo(to, number); }), formatted("%02u", number));
  }
}

TEST(Digits, OfEveryByteAreThoseOfTheFormat)
{
  for (unsigned byte = 0; byte < 256; ++byte)
  {
    ASSERT_EQ(written([&](char* to) { return digits::writeHex(to, static_cast<uint8_t>(byte)); }),
              formatted("%02X", byte));
  }
}

} // namespace
