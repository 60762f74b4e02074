/// @file valueText.hpp
/// Values as characters, for Reader::print.
#pragma once

#include <array>
#include <charconv>
#include <cstdlib>
#include <cstring>
#include <string>
#include <string_view>
#include <utility>

#include "tav/cpp/decode.hpp"
#include "tav/cpp/text.hpp"

namespace tav::detail
{

/// How many bytes at the start of a text are ASCII and no control characters. Looks at eight of them at a time.
[[gnu::always_inline]] inline size_t printableLength(std::string_view text) noexcept
{
  constexpr uint64_t ones = 0x0101010101010101U;
  constexpr uint64_t high = 0x80 * ones;
  size_t at = 0;
  for (uint64_t word = 0; at + sizeof word <= text.size(); at += sizeof word)
  {
    std::memcpy(&word, text.data() + at, sizeof word);
    if (((word | (word - 0x20 * ones)) & high) != 0) // a borrow only ever comes from a byte below 0x20
    {
      break;
    }
  }
  for (const char c : text.substr(at))
  {
    if (static_cast<uint8_t>(c) - 0x20U >= 0x60)
    {
      break;
    }
    ++at;
  }
  return at;
}

/// Whether XML can hold a text: well-formed UTF-8 without control characters but tab and line ends, and without U+FFFE
/// and U+FFFF.
inline bool isXmlText(std::string_view text) noexcept
{
  for (text.remove_prefix(printableLength(text)); !text.empty();)
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

/// What stands for a character in XML, in an element or between quotes; empty for one that stands for itself.
constexpr std::string_view xmlEscape(char c, bool quoted) noexcept
{
  switch (c)
  {
  case '&':
    return "&amp;";
  case '<':
    return "&lt;";
  case '>':
    return "&gt;";
  case '"':
    return "&quot;";
  case '\r':
    return "&#13;";
  case '\n':
    return quoted ? "&#10;" : "";
  case '\t':
    return quoted ? "&#9;" : "";
  default:
    return "";
  }
}

/// Characters that do not stand for themselves everywhere in XML.
inline constexpr auto kXmlSpecial = []() {
  std::array<bool, 256> special{};
  for (size_t c = 0; c < special.size(); ++c)
  {
    special[c] = !xmlEscape(static_cast<char>(c), true).empty();
  }
  return special;
}();

/// Appends a text in the form that XML takes in an element or, where line ends would become blanks, between quotes.
template<class Text>
void appendXml(Text& to, std::string_view text, bool quoted)
{
  size_t done = 0;
  for (size_t at = 0; at != text.size(); ++at)
  {
    if (!kXmlSpecial[static_cast<uint8_t>(text[at])]) [[likely]]
    {
      continue;
    }
    const std::string_view escape = xmlEscape(text[at], quoted);
    if (!escape.empty())
    {
      to.append(text.data() + done, at - done).append(escape.data(), escape.size());
      done = at + 1;
    }
  }
  to.append(text.data() + done, text.size() - done);
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

/// Whether the text of a moment says all of it, so that it can be made of the text again.
inline bool isWholeTime(const TAVTimeStamp& stamp, std::string_view text) noexcept
{
  constexpr int hundredHours = 100 * 60; // whose text has three digits
  return stamp.fractionA < 1000 && stamp.fractionB < 1000 && stamp.further == 0 &&
         stamp.offsetMinutes > -hundredHours && stamp.offsetMinutes < hundredHours && !text.ends_with('s');
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

/// A value as it is printed: characters of the stream as they stand there, or its own.
struct ValueText
{
  std::string_view shown;
  std::string text;    ///< for `shown`, of values that are no text
  bool isText = false; ///< characters of the stream, which XML has to escape and cannot always hold
  bool isHex = false;  ///< the bytes' digits, in place of a value
  uint16_t codePage = kCodePageUtf8;
  std::array<char, 24> digits; ///< for `shown`, of numbers

  ValueText() noexcept = default;
  ValueText(const ValueText&) = delete;
  ValueText& operator=(const ValueText&) = delete;

  void clear() noexcept
  {
    shown = {};
    text.clear();
    isText = false;
    isHex = false;
    codePage = kCodePageUtf8;
  }
  void showCharacters(std::string_view characters) noexcept
  {
    shown = characters;
    isText = true;
  }
  void showText(std::string&& own) noexcept
  {
    text = std::move(own);
    shown = text;
  }
};

template<class Number>
void showNumber(ValueText& value, const RawValue& raw) noexcept
{
  Number number{};
  static_cast<void>(decode(raw, number));
  char* const first = value.digits.data();
  value.shown = {first, static_cast<size_t>(std::to_chars(first, first + value.digits.size(), number).ptr - first)};
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
inline void showBytes(ValueText& value, const RawValue& raw)
{
  value.isHex = true;
  appendHex(value.text, raw.bytes, raw.length());
  value.shown = value.text;
}

/// A value of the types that are rare, or take longer to print than to look for.
inline void showRareValue(ValueText& value, const RawValue& raw)
{
  TAVTimeStamp stamp{};
  Utf8 text;
  Sint128 number;
  if (decode(raw, stamp) == TAV_RC_OK)
  {
    appendTime(value.text, stamp);
    value.shown = value.text;
  }
  else if (decode(raw, text) == TAV_RC_OK)
  {
    value.showCharacters(text.text);
    value.codePage = text.codePage;
  }
  else if (decode(raw, number) == TAV_RC_OK)
  {
    value.showText(longText(number));
  }
  else if (raw.type == TAV_TYPE_UINT64_ARRAY && raw.size % sizeof(uint64_t) == 0)
  {
    value.showText(wordsText(raw));
  }
  else if (raw.type == TAV_TYPE_UINT8 || raw.type == TAV_TYPE_BINARY || raw.type == TAV_TYPE_UINT128)
  {
    value.showText(hexText(raw));
  }
  else
  {
    showBytes(value, raw);
  }
}

/// Shows a value in the form in which the plain operation prints it, but for moments, of which it shows others. What it
/// does not print, a type or a size without a value, is the digits of the bytes. Until the next value, and as long as
/// the payload.
inline void showValue(ValueText& value, const RawValue& raw)
{
  value.clear();
  const uint8_t exact = layout::typeInfo(raw.type).valueSize;
  if (exact != 0 && raw.size != exact)
  {
    return showBytes(value, raw);
  }
  switch (raw.type)
  {
  case TAV_TYPE_ASCII_STRING:
  case TAV_TYPE_SINT8: // a character, as the plain operation prints it
  case TAV_TYPE_BYTE:
    return value.showCharacters({reinterpret_cast<const char*>(raw.bytes), raw.length()});
  case TAV_TYPE_UINT16:
    return showNumber<uint16_t>(value, raw);
  case TAV_TYPE_SINT16:
    return showNumber<int16_t>(value, raw);
  case TAV_TYPE_UINT32:
    return showNumber<uint32_t>(value, raw);
  case TAV_TYPE_SINT32:
    return showNumber<int32_t>(value, raw);
  case TAV_TYPE_UINT64:
    return showNumber<uint64_t>(value, raw);
  case TAV_TYPE_SINT64:
    return showNumber<int64_t>(value, raw);
  default:
    return showRareValue(value, raw);
  }
}

} // namespace tav::detail
