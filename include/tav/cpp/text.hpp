/// @file text.hpp
/// Characters: what is ASCII, what is UTF-8.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <string>
#include <string_view>

namespace tav::detail
{

/// Whether every byte is below 0x80. Looks at eight bytes at a time: it runs before every text that is written.
[[gnu::always_inline]] inline bool isAscii(std::string_view text) noexcept
{
  constexpr uint64_t high = 0x8080808080808080U;
  constexpr size_t width = sizeof(uint64_t);
  const char* const first = text.data();
  const size_t size = text.size();
  uint64_t seen = 0;
  uint64_t word = 0;
  if (size < width)
  {
    for (size_t at = 0; at != size; ++at)
    {
      seen |= static_cast<uint8_t>(first[at]);
    }
    return (seen & high) == 0;
  }
  for (size_t at = 0; at + width <= size; at += width)
  {
    std::memcpy(&word, first + at, width);
    seen |= word;
  }
  std::memcpy(&word, first + size - width, width); // the rest, with some that were seen already
  seen |= word;
  return (seen & high) == 0;
}

/// Length of the well-formed UTF-8 character at the start of a text, 0 when there is none.
inline size_t characterLength(std::string_view text) noexcept
{
  const auto byteAt = [&text](size_t at) { return at < text.size() ? static_cast<uint8_t>(text[at]) : uint8_t{0}; };
  const uint8_t first = byteAt(0);
  const uint8_t second = byteAt(1);
  const auto follows = [&byteAt](size_t at) { return (byteAt(at) & 0xC0U) == 0x80U; };
  if (first < 0x80)
  {
    return text.empty() ? 0 : 1;
  }
  if (first < 0xE0)
  {
    return first >= 0xC2 && follows(1) ? 2 : 0;
  }
  if (first < 0xF0)
  {
    const bool isWrong = (first == 0xE0 && second < 0xA0) || (first == 0xED && second > 0x9F); // too long; a surrogate
    return !isWrong && follows(1) && follows(2) ? 3 : 0;
  }
  const bool isWrong = first > 0xF4 || (first == 0xF0 && second < 0x90) || (first == 0xF4 && second > 0x8F);
  return !isWrong && follows(1) && follows(2) && follows(3) ? 4 : 0;
}

inline bool isUtf8(std::string_view text) noexcept
{
  if (isAscii(text))
  {
    return true;
  }
  while (!text.empty())
  {
    const size_t length = characterLength(text);
    if (length == 0)
    {
      return false;
    }
    text.remove_prefix(length);
  }
  return true;
}

/// A number in hexadecimal, its digits of the caller's case.
inline std::string hexDigits(uint64_t number, const char* digits)
{
  std::string text;
  for (unsigned shift = 64; shift != 0; shift -= 4)
  {
    const uint64_t rest = number >> (shift - 4);
    if (rest != 0 || shift == 4)
    {
      text += digits[rest & 0xFU];
    }
  }
  return text;
}

} // namespace tav::detail
