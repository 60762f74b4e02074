#include "tav/kor.h"

#include <array>
#include <gtest/gtest.h>
#include <string>

namespace
{
// A wide character has to be wider than 16 bits to be none at all.
TEST(Print, AFormatThatFailsStoresAnEmptyText)
{
  std::array<char, 64> buffer{'#'};
  const wchar_t notACharacter[] = {static_cast<wchar_t>(0x110000), L'\0'};
  EXPECT_EQ(korSnprintf(buffer.data(), buffer.size(), "before %ls", notACharacter), TAV_RC_BAD_PARAM);
  EXPECT_EQ(std::string(buffer.data()), "");
}
} // namespace
