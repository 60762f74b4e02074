#include "tav/inspect/value.hpp"

#include <algorithm>
#include <array>
#include <cstring>

#include "inspect/text/bytes.h"
#include "inspect/text/date.h"
#include "inspect/walk/prober.h"
#include "inspect/walk/sizeSuits.h"
#include "tav/cpp/text.hpp"
#include "tav/inspect/problem.hpp"
#include "tav/path/valueText.hpp"

namespace tav::inspect
{

using namespace tav::layout;

namespace
{

template<class Number>
Number load(std::span<const uint8_t> bytes)
{
  Number value{};
  std::memcpy(&value, bytes.data(), sizeof value);
  return value;
}

void appendEscape(std::string& out, uint8_t byte)
{
  static constexpr std::string_view letters = "\aa\bb\tt\nn\vv\ff\rr\"\"\\\\";
  for (size_t i = 0; i < letters.size(); i += 2)
  {
    if (static_cast<uint8_t>(letters[i]) == byte)
    {
      out += '\\';
      out += letters[i + 1];
      return;
    }
  }
  out += "\\x";
  detail::paths::appendDigits(out, &byte, 1);
}

/// Whether a character, with its length, steers a terminal: the control characters below the blank, U+007F to U+009F,
/// and those that turn the direction of writing, so that another order of letters is seen than is there.
bool steers(std::string_view character)
{
  const auto byteAt = [&](size_t i) { return static_cast<uint8_t>(character[i]); };
  const uint8_t first = byteAt(0);
  if (character.size() == 2)
  {
    return first == 0xC2 && byteAt(1) < 0xA0;
  }
  if (character.size() == 3 && first == 0xE2)
  {
    return (byteAt(1) == 0x80 && byteAt(2) >= 0xAA && byteAt(2) <= 0xAE) || // U+202A to U+202E
           (byteAt(1) == 0x81 && byteAt(2) >= 0xA6 && byteAt(2) <= 0xA9);   // U+2066 to U+2069
  }
  return first < 0x20 || first == 0x7F;
}

/// Which bytes stand for themselves: ASCII that steers nothing. In quotation marks those and backslashes do not.
using Plain = std::array<bool, 256>;

constexpr Plain plainBytes(bool inQuotes)
{
  Plain plain{};
  for (size_t byte = 0x20; byte < 0x7F; ++byte)
  {
    plain[byte] = !inQuotes || (byte != '"' && byte != '\\');
  }
  return plain;
}

/// Appends text without what steers terminals or is no UTF-8: written as \n, \x1b and so on.
void appendEscaped(std::string& out, std::string_view text, bool inQuotes)
{
  static constexpr std::array<Plain, 2> plains{plainBytes(false), plainBytes(true)};
  const Plain& plain = plains[inQuotes ? 1 : 0];
  while (!text.empty())
  {
    const std::string_view::iterator special =
        std::find_if(text.begin(), text.end(), [&](char c) { return !plain[static_cast<uint8_t>(c)]; });
    out.append(text.begin(), special);
    text.remove_prefix(static_cast<size_t>(special - text.begin()));
    if (text.empty())
    {
      return;
    }
    const size_t length = detail::characterLength(text);
    const std::string_view character = text.substr(0, std::max<size_t>(length, 1));
    if (length == 0 || steers(character) || character == "\"" || character == "\\")
    {
      std::for_each(character.begin(), character.end(), [&](char c) { appendEscape(out, static_cast<uint8_t>(c)); });
    }
    else
    {
      out += character;
    }
    text.remove_prefix(character.size());
  }
}

void appendQuoted(std::string& out, std::string_view text)
{
  out += '"';
  appendEscaped(out, text, true);
  out += '"';
}

using Bytes = std::span<const uint8_t>;

/// The first bytes of a payload: where they lie when they are at hand, else in `room`. Valid until the source is
/// asked again.
Bytes storedBytes(ByteSource& source, const Node& node, uint64_t most, std::vector<uint8_t>& room)
{
  const uint64_t size = std::min(node.size(), node.limit - std::min(node.limit, node.payloadOffset()));
  // Never more than the file has, whatever a header claims.
  const size_t count = lengthInMemory(source, node.payloadOffset(), std::min({most, size, source.size()}));
  return bytesAt(source, node.payloadOffset(), count, room);
}

/// A value of the right size for a decoder.
detail::RawValue rawValue(const Form& form, uint16_t type, Bytes bytes)
{
  const size_t whole = type == TAV_TYPE_UINT64_ARRAY ? bytes.size() / 8 * 8 : bytes.size(); // of one that was cut
  return {type, bytes.data(), whole, form.swapped};
}

bool isTextType(uint16_t type)
{
  return type == TAV_TYPE_ASCII_STRING || type == TAV_TYPE_UTF8_STRING;
}

/// Whether the bytes are shown as they are stored, so that they read the same on every machine.
bool isNoValue(const Node& node)
{
  return !typeInfo(node.type()).known || !sizeSuits(node.type(), node.size());
}

} // namespace

std::vector<uint8_t> payloadBytes(ByteSource& source, const Form& form, const Node& node, uint64_t most)
{
  std::vector<uint8_t> room;
  const Bytes stored = storedBytes(source, node, most, room);
  std::vector<uint8_t> bytes(stored.begin(), stored.end());
  const SwapRule rule = typeInfo(node.type()).swapRule;
  const bool isWhole = rule != SwapRule::one128 || node.size() == 16;
  const uint64_t prefix = form.swapped && isWhole ? swappedPrefix(rule, bytes.size()) : 0;
  if (prefix != 0)
  {
    swapPayload(rule, stored.data(), bytes.data(), prefix);
  }
  return bytes;
}

TAVTimeStamp dateOf(ByteSource& source, const Form& form, const Node& node)
{
  TAVTimeStamp stamp{};
  std::array<uint8_t, sizeof stamp> bytes{};
  const auto count = static_cast<size_t>(std::min<uint64_t>(sizeof stamp, node.size()));
  source.read(node.payloadOffset(), std::span(bytes).first(count));
  static_cast<void>(detail::decode({TAV_TYPE_UTC_TIMESTAMP, bytes.data(), bytes.size(), form.swapped}, stamp));
  return stamp;
}

void appendValueText(std::string& out, ByteSource& source, const Form& form, const Node& node, uint64_t most)
{
  if (node.isGroup())
  {
    return;
  }
  most = std::max<uint64_t>(most, 16); // what all types but texts, bytes and arrays need
  std::vector<uint8_t> room;
  const Bytes bytes = storedBytes(source, node, most, room);
  if (isNoValue(node))
  {
    detail::paths::appendDigits(out, bytes.data(), bytes.size());
    out += node.size() > most ? " ..." : "";
    return;
  }
  const detail::RawValue raw = rawValue(form, node.type(), bytes);
  std::string_view text;
  if (!isTextType(node.type()))
  {
    detail::paths::appendPlainText(out, raw);
  }
  else if (detail::decode(raw, text) == TAV_RC_OK)
  {
    appendQuoted(out, text);
  }
  else
  {
    appendQuoted(out, hexText(bytes)); // fewer than a code page's bytes are there
  }
  out += node.size() > bytes.size() ? " ..." : "";
}

std::string valueText(ByteSource& source, const Form& form, const Node& node, uint64_t most)
{
  std::string text;
  appendValueText(text, source, form, node, most);
  return text;
}

bool appendPlainText(std::string& out, ByteSource& source, const Form& form, const Node& node, uint64_t most)
{
  if (node.size() > most)
  {
    return false;
  }
  std::vector<uint8_t> room;
  const Bytes bytes = storedBytes(source, node, most, room);
  if (isNoValue(node))
  {
    detail::paths::appendDigits(out, bytes.data(), bytes.size());
  }
  else
  {
    detail::paths::appendPlainText(out, rawValue(form, node.type(), bytes));
  }
  return true;
}

std::optional<std::string> plainText(ByteSource& source, const Form& form, const Node& node, uint64_t most)
{
  std::string text;
  return appendPlainText(text, source, form, node, most) ? std::optional(std::move(text)) : std::nullopt;
}

std::string typeText(uint16_t type)
{
  if (isGroupType(type))
  {
    return "group";
  }
  switch (type)
  {
  case TAV_TYPE_BYTE: return "Byte";
  case TAV_TYPE_UINT64_ARRAY: return "Uint64 array";
  default: return typeInfo(type).known ? typePrintName(type) : "type " + std::to_string(type);
  }
}

bool isUtf8(std::string_view text)
{
  return detail::isUtf8(text);
}

std::string quoted(std::string_view text)
{
  std::string out;
  appendQuoted(out, text);
  return out;
}

std::string forTerminal(std::string_view text)
{
  std::string out;
  appendEscaped(out, text, false);
  return out;
}

std::optional<uint64_t> pairDistanceAt(ByteSource& source, const Form& form, uint64_t offset)
{
  return Prober(source, form, 0).pairAt(offset, source.size());
}

std::string hexText(std::span<const uint8_t> bytes)
{
  std::string text;
  detail::paths::appendDigits(text, bytes.data(), bytes.size());
  return text;
}

std::string dateText(const TAVTimeStamp& stamp)
{
  return detail::timeText(stamp);
}

std::string int128Text(std::span<const uint8_t> bytes, bool isSigned)
{
  const auto first = load<uint64_t>(bytes);
  const auto second = load<uint64_t>(bytes.subspan(sizeof first));
  const uint64_t high = kor::isLittleEndian ? second : first;
  const uint64_t low = kor::isLittleEndian ? first : second;
  return isSigned ? detail::longText(Sint128{.high = static_cast<int64_t>(high), .low = low})
                  : detail::digitsOf(high, low);
}

std::string cutToWidth(std::string_view text, size_t columns)
{
  size_t at = 0;
  size_t width = 0;
  size_t cutAt = 0;
  while (at < text.size())
  {
    if (width + 3 <= columns)
    {
      cutAt = at;
    }
    if (width == columns)
    {
      return std::string(text.substr(0, cutAt)) + std::string("...").substr(0, std::min<size_t>(3, columns));
    }
    at += std::max<size_t>(1, detail::characterLength(text.substr(at)));
    ++width;
  }
  return std::string(text);
}

} // namespace tav::inspect
