#include "tav/inspect/attributes.hpp"

#include <algorithm>
#include <array>
#include <span>
#include <string_view>
#include <vector>

#include "inspect/dictionary/builtIn.h"
#include "inspect/path/names.h"
#include "inspect/text/bytes.h"
#include "inspect/text/date.h"
#include "tav/inspect/jsonText.hpp"
#include "tav/inspect/path.hpp"
#include "tav/inspect/phrases.hpp"
#include "tav/inspect/value.hpp"
#include "tav/path/valueText.hpp"

namespace tav::inspect
{

namespace
{

using detail::paths::Attribute;

/// Bytes that XML can hold and that are characters of their own.
constexpr auto kXmlBytes = [] {
  std::array<bool, 256> table{};
  for (size_t byte = 0; byte < 0x80; ++byte)
  {
    table[byte] = byte >= 0x20 || byte == '\t' || byte == '\n' || byte == '\r';
  }
  return table;
}();

bool isXmlText(std::string_view text)
{
  const std::string_view::iterator other =
      std::find_if(text.begin(), text.end(), [](char c) { return !kXmlBytes[static_cast<uint8_t>(c)]; });
  return other == text.end() || detail::isXmlText(text.substr(static_cast<size_t>(other - text.begin())));
}

/// The tag of an element where it is its name in XML.
std::string_view xmlTagOf(uint16_t elm, const Dictionary& dictionary)
{
  const std::string_view tag = clearTagOf(elm, dictionary);
  const auto isFirst = [](char c) { return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || c == '_'; };
  return !tag.empty() && isFirst(tag.front()) ? tag : std::string_view();
}

void appendCodePage(std::string& out, ByteSource& source, const Form& form, const Node& node)
{
  if (node.isGroup() || node.type() != TAV_TYPE_UTF8_STRING || xmlValueOf(source, node) != XmlValue::text)
  {
    return;
  }
  uint16_t codePage = 0;
  source.read(node.payloadOffset(), std::span(reinterpret_cast<uint8_t*>(&codePage), sizeof codePage));
  codePage = form.swapped ? kor::byteswap16(codePage) : codePage;
  if (codePage != kUsualCodePage)
  {
    appendNumber(out, codePage);
  }
}

void appendExtra(std::string& out, ByteSource& source, const Node& node)
{
  std::array<uint8_t, 2> extra{};
  const size_t count = source.read(node.payloadOffset() + node.size(), extra);
  detail::paths::appendDigits(out, extra.data(), count);
}

std::string_view eyeSizeOf(const Node& node)
{
  return node.has(kNoPair) ? "missing" : node.has(kBadPair) ? "damaged"
                                                            : "true";
}

/// What only a group tells, or a node that is none.
void appendOfKind(std::string& out, ByteSource& source, const Form& form, const Node& node, Attribute attribute)
{
  if (node.isGroup())
  {
    if (attribute == Attribute::size && (node.has(kOpen) || node.has(kOverrun)))
    {
      layout::isSizeUnknown(node.header) ? void(out += "unknown") : appendNumber(out, node.size());
    }
    return;
  }
  switch (attribute)
  {
  case Attribute::size: return;
  case Attribute::extra: return node.has(kExtra) ? appendExtra(out, source, node) : void();
  case Attribute::encoding: out += xmlValueOf(source, node) == XmlValue::hex ? "hex" : ""; return;
  case Attribute::codePage: return appendCodePage(out, source, form, node);
  default: break;
  }
  const auto stamp = xmlValueOf(source, node) == XmlValue::date ? untoldDate(source, form, node) : std::nullopt;
  if (stamp)
  {
    appendPartOfDate(out, *stamp, attribute);
  }
}

} // namespace

std::string xmlNameOf(uint16_t elm)
{
  return xmlNameOf(elm, {});
}

std::string xmlNameOf(uint16_t elm, const Dictionary& dictionary)
{
  std::string name;
  appendXmlName(name, elm, dictionary);
  return name;
}

void appendXmlName(std::string& out, uint16_t elm, const Dictionary& dictionary)
{
  const std::string_view tag = xmlTagOf(elm, dictionary);
  out += tag.empty() ? "element" : tag;
}

std::optional<TAVTimeStamp> untoldDate(ByteSource& source, const Form& form, const Node& node)
{
  const TAVTimeStamp stamp = dateOf(source, form, node);
  return isWholeDate(stamp, dateText(stamp)) ? std::nullopt : std::optional(stamp);
}

void appendPartOfDate(std::string& out, const TAVTimeStamp& stamp, Attribute attribute)
{
  switch (attribute)
  {
  case Attribute::seconds: return appendNumber(out, stamp.seconds);
  case Attribute::fractionA: return appendNumber(out, stamp.fractionA);
  case Attribute::fractionB: return appendNumber(out, stamp.fractionB);
  case Attribute::further: return appendNumber(out, stamp.further);
  default: return appendNumber(out, stamp.offsetMinutes);
  }
}

bool isXmlText(ByteSource& source, uint64_t from, uint64_t end)
{
  constexpr size_t piece = size_t{48} * 1024;
  std::vector<uint8_t> buffer;
  while (from < end)
  {
    const auto count = static_cast<size_t>(std::min<uint64_t>(piece + 4, end - from));
    const std::string_view bytes = asText(bytesAt(source, from, count, buffer));
    const size_t whole = cutAtCharacter(bytes, piece);
    if (whole == 0)
    {
      return true; // the file became shorter
    }
    if (!isXmlText(bytes.substr(0, whole)))
    {
      return false;
    }
    from += whole;
  }
  return true;
}

XmlValue xmlValueOf(ByteSource& source, const Node& node)
{
  const uint16_t type = node.type();
  const uint64_t start = node.payloadOffset();
  const uint64_t end = start + node.size();
  switch (type)
  {
  case TAV_TYPE_UTC_TIMESTAMP: return node.size() == sizeof(TAVTimeStamp) ? XmlValue::date : XmlValue::hex;
  case TAV_TYPE_ASCII_STRING: return isXmlText(source, start, end) ? XmlValue::text : XmlValue::hex;
  case TAV_TYPE_UTF8_STRING:
    return node.size() >= 2 && isXmlText(source, start + 2, end) ? XmlValue::text : XmlValue::hex;
  case TAV_TYPE_UINT64_ARRAY: return node.size() % 8 == 0 ? XmlValue::array : XmlValue::hex;
  case TAV_TYPE_UINT128:
  case TAV_TYPE_SINT128: return node.size() == 16 ? XmlValue::number : XmlValue::hex;
  default:
    return type >= TAV_TYPE_UINT8 && type <= TAV_TYPE_SINT64 && node.size() == layout::typeInfo(type).valueSize
               ? XmlValue::number
               : XmlValue::hex;
  }
}

std::optional<std::string> attributeText(ByteSource& source, const Form& form, const Node& node, Attribute attribute)
{
  std::string text;
  return appendAttributeText(text, source, form, node, attribute) ? std::optional(std::move(text)) : std::nullopt;
}

bool appendAttributeText(std::string& out, ByteSource& source, const Form& form, const Node& node, Attribute attribute)
{
  const size_t before = out.size();
  switch (attribute)
  {
  case Attribute::id:
    if (xmlTagOf(node.elm(), source.dictionary()).empty())
    {
      appendNumber(out, node.elm());
    }
    break;
  case Attribute::name:
    if (xmlTagOf(node.elm(), source.dictionary()).empty())
    {
      out += builtInName(node.elm());
    }
    break;
  case Attribute::type:
    if (!appendJsonTypeName(out, node.type()))
    {
      appendNumber(out, node.type());
    }
    break;
  case Attribute::header:
    out += node.depth != 0 ? "" : node.is64() ? "64"
                                              : "32";
    break;
  case Attribute::info:
  {
    const uint32_t usual = form.aligned ? TAV_INFO_ALIGNED8 : 0;
    if (node.is64() && (node.info() & ~uint32_t{TAV_INFO_EYE_SIZE}) != usual)
    {
      appendHexOffset(out, node.info());
    }
    break;
  }
  case Attribute::eyeSize: out += layout::hasEyeSize(node.header) ? eyeSizeOf(node) : ""; break;
  default: appendOfKind(out, source, form, node, attribute);
  }
  return out.size() != before;
}

} // namespace tav::inspect
