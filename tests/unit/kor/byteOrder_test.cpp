#include "tav/byteOrder.h"

#include <cstring>
#include <gtest/gtest.h>

namespace
{
using namespace tav::kor;

static_assert(byteswap32(0x01020304) == 0x04030201, "usable in constant expressions");

TEST(ByteOrder, IsThatOfTheProcessor)
{
  const uint32_t number = 0x01020304;
  uint8_t first = 0;
  std::memcpy(&first, &number, 1);
  EXPECT_EQ(first, isLittleEndian ? 0x04 : 0x01);
}

TEST(ByteSwap, ReversesTheBytesOfEveryWidth)
{
  EXPECT_EQ(byteswap16(0x0102), 0x0201);
  EXPECT_EQ(byteswap32(0x01020304u), 0x04030201u);
  EXPECT_EQ(byteswap64(0x0102030405060708u), 0x0807060504030201u);
}

TEST(ByteSwap, TwiceIsTheValueAgain)
{
  for (int bit = 0; bit < 64; ++bit)
  {
    const uint64_t value = uint64_t{1} << bit;
    EXPECT_EQ(byteswap64(byteswap64(value)), value);
    EXPECT_EQ(byteswap32(byteswap32(static_cast<uint32_t>(value))), static_cast<uint32_t>(value));
    EXPECT_EQ(byteswap16(byteswap16(static_cast<uint16_t>(value))), static_cast<uint16_t>(value));
  }
}
} // namespace
