/// @file valueText.hpp
/// Values as `tav get` prints them and as paths compare them.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "tav/cpp/valueText.hpp"

namespace tav::detail::paths
{

/// Bytes in hexadecimal digits.
inline std::string digitsOf(const uint8_t* bytes, size_t size)
{
  constexpr std::string_view digits = "0123456789abcdef";
  std::string text;
  text.reserve(2 * size);
  for (size_t i = 0; i < size; ++i)
  {
    text += digits[bytes[i] >> 4U];
    text += digits[bytes[i] & 0xFU];
  }
  return text;
}

template<class Number>
bool appendLong(const RawValue& raw, std::string& text)
{
  Number number;
  const bool isOne = decode(raw, number) == TAV_RC_OK;
  text = isOne ? longText(number) : text;
  return isOne;
}

/// Whether a value of this size has characters.
constexpr bool hasText(uint16_t type, uint64_t size) noexcept
{
  return size > (type == TAV_TYPE_UTF8_STRING && size >= 2 ? 2U : 0U);
}

/// Numbers in decimal, texts as they are, moments with their zone, words in brackets; what has no value, for its type
/// or its size, as its bytes in hexadecimal.
inline std::string plainText(const RawValue& raw)
{
  const layout::TypeInfo& info = layout::typeInfo(raw.type);
  if (!info.known || (info.valueSize != 0 && info.valueSize != raw.size))
  {
    return digitsOf(raw.bytes, raw.length());
  }
  switch (raw.type)
  {
  case TAV_TYPE_ASCII_STRING: return {reinterpret_cast<const char*>(raw.bytes), raw.length()};
  case TAV_TYPE_UINT8: return numberText<uint8_t>(raw);
  case TAV_TYPE_SINT8: return numberText<int8_t>(raw);
  case TAV_TYPE_UINT16: return numberText<uint16_t>(raw);
  case TAV_TYPE_SINT16: return numberText<int16_t>(raw);
  case TAV_TYPE_UINT32: return numberText<uint32_t>(raw);
  case TAV_TYPE_SINT32: return numberText<int32_t>(raw);
  case TAV_TYPE_UINT64: return numberText<uint64_t>(raw);
  case TAV_TYPE_SINT64: return numberText<int64_t>(raw);
  default: break;
  }
  std::string text;
  Utf8 view;
  TAVTimeStamp stamp{};
  std::vector<uint64_t> words;
  if (decode(raw, view) == TAV_RC_OK)
  {
    text = view.text;
  }
  else if (decode(raw, stamp) == TAV_RC_OK)
  {
    text = timeText(stamp);
  }
  else if (decode(raw, words) == TAV_RC_OK)
  {
    for (const uint64_t word : words)
    {
      text += (text.empty() ? "" : " ") + std::to_string(word);
    }
    text = '[' + text + ']';
  }
  else if (!appendLong<Uint128>(raw, text) && !appendLong<Sint128>(raw, text))
  {
    text = digitsOf(raw.bytes, raw.length());
  }
  return text;
}

} // namespace tav::detail::paths
