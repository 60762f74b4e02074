/// Bytes as hexadecimal text: what a stream holds is written down, not computed.
#pragma once

#include <algorithm>
#include <cstdint>
#include <stdexcept>
#include <string>
#include <string_view>

#include "support/elements.h"

namespace test
{

inline int digitOf(char c)
{
  static constexpr std::string_view digits = "0123456789ABCDEF";
  const size_t at = digits.find(c);
  return at == std::string_view::npos ? -1 : static_cast<int>(at);
}

/// The bytes of pairs of upper-case digits with blanks and line breaks between them; `#` begins a comment that ends
/// with the line. Throws on anything else.
inline Bytes hex(std::string_view text)
{
  Bytes bytes;
  for (size_t at = 0; at < text.size(); ++at)
  {
    if (text[at] == '#')
    {
      at = std::min(text.find('\n', at), text.size());
    }
    else if (text[at] != ' ' && text[at] != '\n')
    {
      const int high = digitOf(text[at]);
      const int low = at + 1 < text.size() ? digitOf(text[++at]) : -1;
      if (high < 0 || low < 0)
      {
        throw std::invalid_argument("not hexadecimal: " + std::string(text.substr(0, at + 1)));
      }
      bytes.push_back(static_cast<uint8_t>(high * 16 + low));
    }
  }
  return bytes;
}

/// Rows of 16 bytes, so that a difference is found at a glance.
inline std::string toHex(const Bytes& bytes)
{
  std::string text;
  for (size_t at = 0; at < bytes.size(); ++at)
  {
    static constexpr std::string_view digits = "0123456789ABCDEF";
    text += digits[bytes[at] / 16U];
    text += digits[bytes[at] % 16U];
    text += at % 16 == 15 ? '\n' : ' ';
  }
  return text;
}

/// Normal form of rows written by hand.
inline std::string rows(std::string_view text)
{
  return toHex(hex(text));
}

} // namespace test
