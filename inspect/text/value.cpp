#include "tav/inspect/value.hpp"

#include <algorithm>
#include <cstdio>
#include <cstring>

#include "inspect/text/bytes.h"
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
  char text[8];
  std::snprintf(text, sizeof text, "\\x%02x", static_cast<unsigned>(byte));
  out += text;
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

/// Text without what steers terminals or is no UTF-8, and without the characters of `more`: written as \n, \x1b and so
/// on.
std::string escaped(std::string_view text, std::string_view more)
{
  std::string out;
  while (!text.empty())
  {
    const size_t length = detail::characterLength(text);
    const size_t count = std::max<size_t>(length, 1);
    const std::string_view character = text.substr(0, count);
    if (length == 0 || steers(character) || more.find(character) != std::string_view::npos)
    {
      std::for_each(character.begin(), character.end(), [&](char c) { appendEscape(out, static_cast<uint8_t>(c)); });
    }
    else
    {
      out += character;
    }
    text.remove_prefix(count);
  }
  return out;
}

/// A value of the right size, in host order.
std::string scalarText(uint16_t type, std::span<const uint8_t> bytes, bool quote)
{
  const size_t whole = type == TAV_TYPE_UINT64_ARRAY ? bytes.size() / 8 * 8 : bytes.size(); // of one that was cut
  const std::string text = detail::paths::plainText({type, bytes.data(), whole, false});
  const bool isText = type == TAV_TYPE_ASCII_STRING || type == TAV_TYPE_UTF8_STRING;
  return quote && isText ? quoted(text) : text;
}

std::vector<uint8_t> storedBytes(ByteSource& source, const Node& node, uint64_t most)
{
  const uint64_t size = std::min(node.size(), node.limit - std::min(node.limit, node.payloadOffset()));
  // Never more than the file has, whatever a header claims.
  std::vector<uint8_t> bytes(static_cast<size_t>(std::min({most, size, source.size()})));
  bytes.resize(source.read(node.payloadOffset(), bytes));
  return bytes;
}

/// Whether the bytes are shown as they are stored, so that they read the same on every machine.
bool isNoValue(const Node& node)
{
  return !typeInfo(node.type()).known || !sizeSuits(node.type(), node.size());
}

} // namespace

std::vector<uint8_t> payloadBytes(ByteSource& source, const Form& form, const Node& node, uint64_t most)
{
  std::vector<uint8_t> bytes = storedBytes(source, node, most);
  const SwapRule rule = typeInfo(node.type()).swapRule;
  uint64_t prefix = form.swapped ? swappedPrefix(rule, bytes.size()) : 0;
  if (rule == SwapRule::one128 && node.size() != 16)
  {
    prefix = 0;
  }
  if (prefix != 0)
  {
    const std::vector<uint8_t> stored(bytes.begin(), bytes.begin() + static_cast<ptrdiff_t>(prefix));
    swapPayload(rule, stored.data(), bytes.data(), prefix);
  }
  return bytes;
}

std::string valueText(ByteSource& source, const Form& form, const Node& node, uint64_t most)
{
  if (node.isGroup())
  {
    return {};
  }
  const uint64_t wanted = std::max<uint64_t>(most, 16);
  if (isNoValue(node))
  {
    return hexText(storedBytes(source, node, wanted)) + (node.size() > most ? " ..." : "");
  }
  const std::vector<uint8_t> bytes = payloadBytes(source, form, node, wanted);
  return scalarText(node.type(), bytes, true) + (node.size() > bytes.size() ? " ..." : "");
}

std::optional<std::string> plainText(ByteSource& source, const Form& form, const Node& node, uint64_t most)
{
  if (node.size() > most)
  {
    return std::nullopt;
  }
  if (isNoValue(node))
  {
    return hexText(storedBytes(source, node, most));
  }
  return scalarText(node.type(), payloadBytes(source, form, node, most), false);
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
  return '"' + escaped(text, "\"\\") + '"';
}

std::string forTerminal(std::string_view text)
{
  return escaped(text, {});
}

std::optional<uint64_t> pairDistanceAt(ByteSource& source, const Form& form, uint64_t offset)
{
  uint64_t distance = 0;
  if (!Prober(source, form, 0).pairAt(offset, source.size(), distance))
  {
    return std::nullopt;
  }
  return distance;
}

std::string hexText(std::span<const uint8_t> bytes)
{
  return detail::paths::digitsOf(bytes.data(), bytes.size());
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
