/// Numbers as characters, without a branch on how many they have.
#pragma once

#include <bit>
#include <cstdint>
#include <cstring>

#include "tav/byteOrder.h"

namespace tav::inside::digits
{

/// Room that a number takes at most; what is written runs over its end, but not out of this.
inline constexpr uint64_t kLongest = 32;

inline constexpr uint64_t kEight = 100000000; ///< the first number of more than eight digits

/// The eight decimal digits of a number below kEight, the first in the lowest byte. They are split in halves three
/// times, all parts at once; the factors are those of exact divisions in their ranges.
constexpr uint64_t eightDigits(uint64_t number)
{
  const uint64_t fours = number / 10000 | (number % 10000) << 32U;
  const uint64_t hundreds = (fours * 10486 >> 20U) & 0x0000007F0000007FU;
  const uint64_t twos = hundreds | (fours - 100 * hundreds) << 16U;
  const uint64_t tens = (twos * 103 >> 10U) & 0x000F000F000F000FU;
  return tens | (twos - 10 * tens) << 8U;
}

/// Stores eight digits as characters without the first `skipped`; returns the place behind them.
inline char* storeDigits(char* to, uint64_t eight, unsigned skipped)
{
  const uint64_t text = (eight | 0x3030303030303030U) >> 8 * skipped;
  const uint64_t inOrder = kor::isLittleEndian ? text : kor::byteswap64(text);
  std::memcpy(to, &inOrder, sizeof inOrder);
  return to + 8 - skipped;
}

/// A number below kEight, with zeros before it up to `width`, at least 1 and at most 8 digits.
inline char* writeShort(char* to, uint64_t number, unsigned width = 1)
{
  const uint64_t eight = eightDigits(number);
  const uint64_t stop = uint64_t{1} << 8 * (8 - width);
  return storeDigits(to, eight, static_cast<unsigned>(std::countr_zero(eight | stop)) / 8);
}

/// A number as "%llu" shows it.
inline char* writeDecimal(char* to, uint64_t number)
{
  if (number < kEight)
  {
    return writeShort(to, number);
  }
  const uint64_t high = number / kEight;
  char* const middle = high < kEight ? writeShort(to, high)
                                     : storeDigits(writeShort(to, high / kEight), eightDigits(high % kEight), 0);
  return storeDigits(middle, eightDigits(number % kEight), 0);
}

/// A number as "%lld" shows it.
inline char* writeSigned(char* to, int64_t number)
{
  const auto bits = static_cast<uint64_t>(number);
  *to = '-';
  return writeDecimal(to + (number < 0 ? 1 : 0), number < 0 ? 0 - bits : bits);
}

/// A small number as "%04d" and its kin show it: the sign is one of the `width` characters.
inline char* writePadded(char* to, int32_t number, unsigned width)
{
  const bool negative = number < 0;
  *to = '-';
  return writeShort(to + (negative ? 1 : 0), static_cast<uint64_t>(negative ? -int64_t{number} : int64_t{number}),
                    negative ? width - 1 : width);
}

/// A number below 100 as "%02d" shows it.
inline char* writeTwo(char* to, unsigned number)
{
  to[0] = static_cast<char>('0' + number / 10);
  to[1] = static_cast<char>('0' + number % 10);
  return to + 2;
}

/// One hexadecimal digit.
constexpr char hexDigit(uint64_t number)
{
  return "0123456789ABCDEF"[number];
}

/// A byte as "%02X" shows it.
inline char* writeHex(char* to, uint8_t byte)
{
  to[0] = hexDigit(byte >> 4U);
  to[1] = hexDigit(byte & 0xFU);
  return to + 2;
}

} // namespace tav::inside::digits
