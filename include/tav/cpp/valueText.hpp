/// @file valueText.hpp
/// Values as characters, for Reader::print.
#pragma once

#include <array>
#include <charconv>
#include <cstdlib>
#include <cstring>
#include <string>
#include <string_view>

#include "tav/cpp/decode.hpp"
#include "tav/cpp/text.hpp"

namespace tav::detail
{

/// Whether XML can hold a text: well-formed UTF-8 without control characters but tab and line ends, and without U+FFFE
/// and U+FFFF.
inline bool isXmlText(std::string_view text) noexcept
{
  while (!text.empty())
  {
    const size_t length = characterLength(text);
    const std::string_view character = text.substr(0, length);
    const bool steers = length == 1 && static_cast<uint8_t>(text[0]) < 0x20 && text[0] != '\t' && text[0] != '\n' &&
                        text[0] != '\r';
    if (length == 0 || steers || character == "\xEF\xBF\xBE" || character == "\xEF\xBF\xBF")
    {
      return false;
    }
    text.remove_prefix(length);
  }
  return true;
}

/// Appends a text in the form that XML takes in an element or, where line ends would become blanks, between quotes.
inline void appendXml(std::string& to, std::string_view text, bool quoted)
{
  for (const char c : text)
  {
    switch (c)
    {
    case '&':
      to += "&amp;";
      break;
    case '<':
      to += "&lt;";
      break;
    case '>':
      to += "&gt;";
      break;
    case '"':
      to += "&quot;";
      break;
    case '\r':
      to += "&#13;";
      break;
    case '\n':
      to += quoted ? "&#10;" : "\n";
      break;
    case '\t':
      to += quoted ? "&#9;" : "\t";
      break;
    default:
      to += c;
    }
  }
}

inline void appendHex(std::string& to, const uint8_t* bytes, size_t size)
{
  constexpr std::string_view digits = "0123456789ABCDEF";
  for (size_t i = 0; i < size; ++i)
  {
    to += digits[bytes[i] >> 4U];
    to += digits[bytes[i] & 0xFU];
  }
}

template<class Number>
void appendNumber(std::string& to, Number number)
{
  std::array<char, 24> digits;
  const std::to_chars_result end = std::to_chars(digits.data(), digits.data() + digits.size(), number);
  to.append(digits.data(), end.ptr);
}

/// Writes the last digits of a number, so many, and returns the place behind them.
inline char* putDigits(char* at, uint32_t number, unsigned count)
{
  char* const end = at + count;
  for (char* digit = end; digit != at; number /= 10)
  {
    *--digit = static_cast<char>('0' + number % 10);
  }
  return end;
}

/// Appends a moment with the offset of its time zone: "2024-05-01T12:20:30.123456+02:00"; of a year beyond 9999 the
/// seconds.
inline void appendTime(std::string& to, const TAVTimeStamp& stamp)
{
  constexpr uint64_t endOf9999 = 253402300800;
  constexpr uint64_t million = 1'000'000;
  // Each fraction holds more than its unit needs: what is above a second belongs to the seconds.
  const uint64_t fraction = uint64_t{stamp.fractionA} * 1000 + stamp.fractionB;
  const int64_t shift = static_cast<int64_t>(fraction / million) + int64_t{stamp.offsetMinutes} * 60;
  if (stamp.seconds >= endOf9999 || static_cast<int64_t>(stamp.seconds) + shift >= static_cast<int64_t>(endOf9999))
  {
    appendNumber(to, stamp.seconds);
    to += " s";
    return;
  }
  constexpr int64_t daySeconds = int64_t{24} * 60 * 60;
  const int64_t seconds = static_cast<int64_t>(stamp.seconds) + shift;
  const int64_t days = (seconds >= 0 ? seconds : seconds - (daySeconds - 1)) / daySeconds;
  const auto clock = static_cast<uint32_t>(seconds - days * daySeconds);
  const Date date = dateOf(days);
  const auto east = static_cast<unsigned>(std::abs(int{stamp.offsetMinutes}));
  std::array<char, 40> text;
  char* at = putDigits(text.data(), static_cast<uint32_t>(date.year), 4);
  const auto put = [&at](char before, uint32_t number, unsigned count) {
    *at = before;
    at = putDigits(at + 1, number, count);
  };
  put('-', date.month, 2);
  put('-', date.day, 2);
  put('T', clock / 3600, 2);
  put(':', clock / 60 % 60, 2);
  put(':', clock % 60, 2);
  put('.', static_cast<uint32_t>(fraction % million), 6);
  put(stamp.offsetMinutes < 0 ? '-' : '+', east / 60, east >= 6000 ? 3 : 2);
  put(':', east % 60, 2);
  to.append(text.data(), at);
}

inline std::string timeText(const TAVTimeStamp& stamp)
{
  std::string text;
  appendTime(text, stamp);
  return text;
}

/// The digits of a 128-bit number without a sign.
inline std::string digitsOf(uint64_t high, uint64_t low)
{
  std::array<uint32_t, 4> words{static_cast<uint32_t>(high >> 32U), static_cast<uint32_t>(high),
                                static_cast<uint32_t>(low >> 32U), static_cast<uint32_t>(low)};
  std::string text;
  uint32_t left = 0;
  do
  {
    uint64_t remainder = 0;
    left = 0;
    for (uint32_t& word : words)
    {
      const uint64_t part = remainder << 32U | word;
      word = static_cast<uint32_t>(part / 10);
      remainder = part % 10;
      left |= word;
    }
    text.insert(text.begin(), static_cast<char>('0' + remainder));
  } while (left != 0);
  return text;
}

inline std::string longText(const Uint128& number)
{
  return digitsOf(number.high, number.low);
}

/// The digits of a 128-bit number with one.
inline std::string longText(const Sint128& number)
{
  const auto high = static_cast<uint64_t>(number.high);
  if (number.high >= 0)
  {
    return digitsOf(high, number.low);
  }
  const uint64_t low = ~number.low + 1;
  return '-' + digitsOf(~high + (low == 0 ? 1 : 0), low);
}

/// A value as it is printed.
struct ValueText
{
  std::string text;
  bool isText = false; ///< characters of the stream, which XML has to escape and cannot always hold
  bool isHex = false;  ///< the bytes' digits, in place of a value
  uint16_t codePage = kCodePageUtf8;
};

template<class Number>
std::string numberText(const RawValue& raw)
{
  Number number{};
  static_cast<void>(decode(raw, number));
  return std::to_string(number);
}

inline std::string wordsText(const RawValue& raw)
{
  std::string text;
  for (uint64_t at = 0; at < raw.size; at += sizeof(uint64_t))
  {
    uint64_t word = 0;
    static_cast<void>(decode(RawValue{TAV_TYPE_UINT64, raw.bytes + at, sizeof word, raw.swap}, word));
    text += std::to_string(word);
  }
  return text;
}

inline std::string hexText(const RawValue& raw)
{
  std::string text;
  std::array<uint8_t, 16> number{};
  size_t done = 0;
  if (raw.type == TAV_TYPE_UINT128 && raw.swap && raw.size >= number.size())
  {
    layout::swapPayload(layout::SwapRule::one128, raw.bytes, number.data(), number.size());
    appendHex(text, number.data(), number.size());
    done = number.size();
  }
  appendHex(text, raw.bytes + done, raw.length() - done);
  return text;
}

/// The bytes as they stand in the stream.
inline ValueText bytesText(const RawValue& raw)
{
  ValueText value{.text = {}, .isHex = true};
  appendHex(value.text, raw.bytes, raw.length());
  return value;
}

/// A value in the form in which the plain operation prints it, but for moments, of which it shows others. What it does
/// not print, a type or a size without a value, is the digits of the bytes.
inline ValueText valueText(const RawValue& raw)
{
  const uint8_t exact = layout::typeInfo(raw.type).valueSize;
  const std::string_view characters(reinterpret_cast<const char*>(raw.bytes), raw.length());
  if (exact != 0 && raw.size != exact)
  {
    return bytesText(raw);
  }
  switch (raw.type)
  {
  case TAV_TYPE_ASCII_STRING:
  case TAV_TYPE_SINT8: // a character, as the plain operation prints it
  case TAV_TYPE_BYTE:
    return {.text = std::string(characters), .isText = true};
  case TAV_TYPE_UINT16:
    return {.text = numberText<uint16_t>(raw)};
  case TAV_TYPE_SINT16:
    return {.text = numberText<int16_t>(raw)};
  case TAV_TYPE_UINT32:
    return {.text = numberText<uint32_t>(raw)};
  case TAV_TYPE_SINT32:
    return {.text = numberText<int32_t>(raw)};
  case TAV_TYPE_UINT64:
    return {.text = numberText<uint64_t>(raw)};
  case TAV_TYPE_SINT64:
    return {.text = numberText<int64_t>(raw)};
  default:
    break;
  }
  TAVTimeStamp stamp{};
  if (decode(raw, stamp) == TAV_RC_OK)
  {
    return {.text = timeText(stamp)};
  }
  Utf8 text;
  if (decode(raw, text) == TAV_RC_OK)
  {
    return {.text = std::string(text.text), .isText = true, .codePage = text.codePage};
  }
  Sint128 number;
  if (decode(raw, number) == TAV_RC_OK)
  {
    return {.text = longText(number)};
  }
  if (raw.type == TAV_TYPE_UINT64_ARRAY && raw.size % sizeof(uint64_t) == 0)
  {
    return {.text = wordsText(raw)};
  }
  const bool isDigits = raw.type == TAV_TYPE_UINT8 || raw.type == TAV_TYPE_BINARY || raw.type == TAV_TYPE_UINT128;
  return isDigits ? ValueText{.text = hexText(raw)} : bytesText(raw);
}

} // namespace tav::detail
