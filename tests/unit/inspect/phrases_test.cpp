#include "tav/inspect/phrases.hpp"

#include <cstdint>
#include <cstdio>
#include <limits>
#include <string>

#include <gtest/gtest.h>

using tav::inspect::byteText;

namespace
{

TEST(ByteText, HasOneDecimalFromTenThousandOn)
{
  EXPECT_EQ(byteText(0), "0 bytes");
  EXPECT_EQ(byteText(1), "1 byte");
  EXPECT_EQ(byteText(9999), "9999 bytes");
  EXPECT_EQ(byteText(10000), "9.8 KiB");
  EXPECT_EQ(byteText(uint64_t{1} << 20U), "1.0 MiB");
  EXPECT_EQ(byteText((uint64_t{1} << 20U) - 1), "1024.0 KiB");
  EXPECT_EQ(byteText(std::numeric_limits<uint64_t>::max()), "16.0 EiB");
}

TEST(ByteText, RoundsAsPrintfDoes)
{
  static constexpr const char* units[] = {"KiB", "MiB", "GiB", "TiB", "PiB"};
  uint64_t state = 1;
  uint64_t unit = 1;
  for (const char* const name : units)
  {
    unit *= 1024;
    // Quarters and eighths have halves of a tenth among them.
    for (uint64_t eighths = 80; eighths < 8192; ++eighths)
    {
      state = state * 6364136223846793005U + 1442695040888963407U;
      for (const uint64_t bytes : {eighths * (unit / 8), eighths * (unit / 8) + state % (unit / 8)})
      {
        // A number that a double has in full, so that printf rounds the same one.
        const uint64_t whole = bytes >> 53U == 0 ? bytes : bytes & ~uint64_t{0x3FF};
        char expected[64];
        const double value = static_cast<double>(whole) / static_cast<double>(unit);
        std::snprintf(expected, sizeof expected, "%.1f %s", value, name);
        ASSERT_EQ(byteText(whole), expected) << whole;
      }
    }
  }
}

} // namespace
