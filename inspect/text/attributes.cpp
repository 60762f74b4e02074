#include "tav/inspect/attributes.hpp"

#include <algorithm>
#include <array>
#include <cstring>
#include <span>
#include <string_view>
#include <vector>

#include "tav/dictionary.hpp"
#include "tav/inspect/jsonText.hpp"
#include "tav/inspect/path.hpp"
#include "tav/inspect/phrases.hpp"
#include "tav/inspect/value.hpp"

namespace tav::inspect
{

namespace
{

using detail::paths::Attribute;

bool isXmlText(std::string_view text)
{
  const auto allowed = [](char c) { return static_cast<uint8_t>(c) >= 0x20 || c == '\t' || c == '\n' || c == '\r'; };
  return isUtf8(text) && std::all_of(text.begin(), text.end(), allowed) &&
         text.find("\xEF\xBF\xBE") == std::string_view::npos && text.find("\xEF\xBF\xBF") == std::string_view::npos;
}

std::optional<std::string> when(bool shown, std::string text)
{
  return shown ? std::optional(std::move(text)) : std::nullopt;
}

/// A part of a moment that its text does not tell.
std::optional<std::string> partOfDate(ByteSource& source, const Form& form, const Node& node, Attribute attribute)
{
  if (node.isGroup() || xmlValueOf(source, node) != XmlValue::date)
  {
    return std::nullopt;
  }
  TAVTimeStamp stamp{};
  const std::vector<uint8_t> bytes = payloadBytes(source, form, node, sizeof stamp);
  std::memcpy(&stamp, bytes.data(), std::min(bytes.size(), sizeof stamp));
  const auto back = parseDate(dateText(stamp));
  const bool isWhole = back && std::memcmp(&*back, &stamp, sizeof stamp) == 0;
  switch (attribute)
  {
  case Attribute::seconds: return when(!isWhole, std::to_string(stamp.seconds));
  case Attribute::fractionA: return when(!isWhole, std::to_string(stamp.fractionA));
  case Attribute::fractionB: return when(!isWhole, std::to_string(stamp.fractionB));
  case Attribute::further: return when(!isWhole, std::to_string(stamp.further));
  default: return when(!isWhole, std::to_string(stamp.offsetMinutes));
  }
}

std::optional<std::string> codePageOf(ByteSource& source, const Form& form, const Node& node)
{
  if (node.isGroup() || node.type() != TAV_TYPE_UTF8_STRING || xmlValueOf(source, node) != XmlValue::text)
  {
    return std::nullopt;
  }
  uint16_t codePage = 0;
  source.read(node.payloadOffset(), std::span(reinterpret_cast<uint8_t*>(&codePage), sizeof codePage));
  codePage = form.swapped ? kor::byteswap16(codePage) : codePage;
  return when(codePage != kUsualCodePage, std::to_string(codePage));
}

std::optional<std::string> extraOf(ByteSource& source, const Node& node)
{
  if (!node.has(kExtra))
  {
    return std::nullopt;
  }
  std::array<uint8_t, 2> extra{};
  return hexText(std::span(extra).first(source.read(node.payloadOffset() + node.size(), extra)));
}

std::string eyeSizeOf(const Node& node)
{
  return node.has(kNoPair) ? "missing" : node.has(kBadPair) ? "damaged"
                                                            : "true";
}

} // namespace

std::string xmlNameOf(uint16_t elm)
{
  return xmlNameOf(elm, {});
}

std::string xmlNameOf(uint16_t elm, const Dictionary& dictionary)
{
  const std::string text = elementText(elm, dictionary);
  const bool letter = (text[0] >= 'a' && text[0] <= 'z') || (text[0] >= 'A' && text[0] <= 'Z') || text[0] == '_';
  return letter ? text : "element";
}

bool isXmlText(ByteSource& source, uint64_t from, uint64_t end)
{
  constexpr size_t piece = size_t{48} * 1024;
  std::vector<uint8_t> buffer;
  while (from < end)
  {
    buffer.resize(static_cast<size_t>(std::min<uint64_t>(piece + 4, end - from)));
    const size_t count = source.read(from, buffer);
    const std::string_view bytes(reinterpret_cast<const char*>(buffer.data()), count);
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
  const bool named = xmlNameOf(node.elm(), source.dictionary()) != "element";
  const std::string_view name = dictionary::nameOf(node.elm());
  const uint32_t usual = form.aligned ? TAV_INFO_ALIGNED8 : 0;
  const bool strange = node.is64() && (node.info() & ~uint32_t{TAV_INFO_EYE_SIZE}) != usual;
  switch (attribute)
  {
  case Attribute::id: return when(!named, std::to_string(node.elm()));
  case Attribute::name: return when(!named && !name.empty(), std::string(name));
  case Attribute::type: return jsonTypeName(node.type()).value_or(std::to_string(node.type()));
  case Attribute::header: return when(node.depth == 0, node.is64() ? "64" : "32");
  case Attribute::info: return when(strange, hexOffset(node.info()));
  case Attribute::eyeSize: return when(layout::hasEyeSize(node.header), eyeSizeOf(node));
  case Attribute::size:
    return when(node.isGroup() && (node.has(kOpen) || node.has(kOverrun)),
                layout::isSizeUnknown(node.header) ? "unknown" : std::to_string(node.size()));
  case Attribute::extra: return node.isGroup() ? std::nullopt : extraOf(source, node);
  case Attribute::encoding: return when(!node.isGroup() && xmlValueOf(source, node) == XmlValue::hex, "hex");
  case Attribute::codePage: return codePageOf(source, form, node);
  default: return partOfDate(source, form, node, attribute);
  }
}

} // namespace tav::inspect
