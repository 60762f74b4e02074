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

/// Appends bytes in hexadecimal digits.
inline void appendDigits(std::string& to, const uint8_t* bytes, size_t size)
{
  constexpr std::string_view digits = "0123456789abcdef";
  const size_t before = to.size();
  to.resize(before + 2 * size);
  char* at = to.data() + before;
  for (size_t i = 0; i < size; ++i)
  {
    *at++ = digits[bytes[i] >> 4U];
    *at++ = digits[bytes[i] & 0xFU];
  }
}

template<class Number>
void appendNumber(std::string& to, const RawValue& raw)
{
  Number number{};
  static_cast<void>(decode(raw, number));
  detail::appendNumber(to, number);
}

template<class Number>
bool appendLong(std::string& to, const RawValue& raw)
{
  Number number;
  const bool isOne = decode(raw, number) == TAV_RC_OK;
  to += isOne ? longText(number) : std::string();
  return isOne;
}

/// Whether a value of this size has characters.
constexpr bool hasText(uint16_t type, uint64_t size) noexcept
{
  return size > (type == TAV_TYPE_UTF8_STRING && size >= 2 ? 2U : 0U);
}

/// Appends words in brackets; false when there are none.
inline bool appendWords(std::string& to, const RawValue& raw)
{
  std::vector<uint64_t> words;
  if (decode(raw, words) != TAV_RC_OK)
  {
    return false;
  }
  to += '[';
  for (size_t i = 0; i != words.size(); ++i)
  {
    to += i == 0 ? "" : " ";
    detail::appendNumber(to, words[i]);
  }
  to += ']';
  return true;
}

/// Appends a value. Numbers in decimal, texts as they are, moments with their zone, words in brackets; what has no
/// value, for its type or its size, as its bytes in hexadecimal.
inline void appendPlainText(std::string& to, const RawValue& raw)
{
  const layout::TypeInfo& info = layout::typeInfo(raw.type);
  if (!info.known || (info.valueSize != 0 && info.valueSize != raw.size))
  {
    return appendDigits(to, raw.bytes, raw.length());
  }
  switch (raw.type)
  {
  case TAV_TYPE_ASCII_STRING: to.append(reinterpret_cast<const char*>(raw.bytes), raw.length()); return;
  case TAV_TYPE_UINT8: return appendNumber<uint8_t>(to, raw);
  case TAV_TYPE_SINT8: return appendNumber<int8_t>(to, raw);
  case TAV_TYPE_UINT16: return appendNumber<uint16_t>(to, raw);
  case TAV_TYPE_SINT16: return appendNumber<int16_t>(to, raw);
  case TAV_TYPE_UINT32: return appendNumber<uint32_t>(to, raw);
  case TAV_TYPE_SINT32: return appendNumber<int32_t>(to, raw);
  case TAV_TYPE_UINT64: return appendNumber<uint64_t>(to, raw);
  case TAV_TYPE_SINT64: return appendNumber<int64_t>(to, raw);
  default: break;
  }
  Utf8 view;
  TAVTimeStamp stamp{};
  if (decode(raw, view) == TAV_RC_OK)
  {
    to += view.text;
  }
  else if (decode(raw, stamp) == TAV_RC_OK)
  {
    appendTime(to, stamp);
  }
  else if (!appendWords(to, raw) && !appendLong<Uint128>(to, raw) && !appendLong<Sint128>(to, raw))
  {
    appendDigits(to, raw.bytes, raw.length());
  }
}

inline std::string plainText(const RawValue& raw)
{
  std::string text;
  appendPlainText(text, raw);
  return text;
}

} // namespace tav::detail::paths
