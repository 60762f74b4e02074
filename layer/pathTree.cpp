#include "layer/pathTree.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <string_view>

#include "layer/elementNames.h"
#include "tav/layout.hpp"

namespace tav::detail
{

namespace
{

bool mayHold(const Node& group, const Node& node) noexcept
{
  const uint64_t start = group.offset() + layout::headerLength(group.header().hdrType);
  return group.isGroup() && node.offset() >= start && (group.isOpen() || node.offset() - start < group.size());
}

std::optional<std::string> when(bool shown, std::string text)
{
  return shown ? std::optional(std::move(text)) : std::nullopt;
}

std::string infoText(uint32_t info)
{
  std::array<char, 16> digits{};
  const std::to_chars_result end = std::to_chars(digits.data(), digits.data() + digits.size(), info, 16);
  return "0x" + std::string(digits.data(), end.ptr);
}

/// Whether the XML form calls an element by its tag.
bool hasXmlName(uint16_t elm, std::span<const uint16_t> ownTags)
{
  const std::string_view tag = elementTag(elm);
  return tag.empty() ? std::binary_search(ownTags.begin(), ownTags.end(), elm)
                     : tag.find(' ') == std::string_view::npos &&
                           idsNamed(tag) == std::vector<uint16_t>{elm};
}

bool decimalOf(const RawValue& raw) noexcept
{
  const bool isNumber = raw.type >= TAV_TYPE_UINT8 && raw.type <= TAV_TYPE_SINT64;
  const bool isLong = raw.type == TAV_TYPE_UINT128 || raw.type == TAV_TYPE_SINT128;
  return (isNumber && raw.size == layout::typeInfo(raw.type).valueSize) || (isLong && raw.size == 16);
}

/// The parts of a moment that its text does not say.
std::optional<std::string> dateAttribute(const TAVTimeStamp& stamp, paths::Attribute attribute)
{
  using paths::Attribute;
  const bool isWhole = isWholeTime(stamp, timeText(stamp));
  switch (attribute)
  {
  case Attribute::seconds: return when(!isWhole, std::to_string(stamp.seconds));
  case Attribute::fractionA: return when(!isWhole, std::to_string(stamp.fractionA));
  case Attribute::fractionB: return when(!isWhole, std::to_string(stamp.fractionB));
  case Attribute::further: return when(!isWhole, std::to_string(stamp.further));
  case Attribute::offsetMinutes: return when(!isWhole, std::to_string(stamp.offsetMinutes));
  default: return std::nullopt;
  }
}

std::optional<std::string> valueAttribute(const RawValue& raw, paths::Attribute attribute)
{
  using paths::Attribute;
  TAVTimeStamp stamp{};
  if (decode(raw, stamp) == TAV_RC_OK)
  {
    return dateAttribute(stamp, attribute);
  }
  std::string_view text;
  const bool isText = decode(raw, text) == TAV_RC_OK;
  const bool isXml = isText ? isXmlText(text) : decimalOf(raw) || raw.type == TAV_TYPE_UINT64_ARRAY;
  Utf8 utf8;
  const bool otherPage = isXml && decode(raw, utf8) == TAV_RC_OK && utf8.codePage != kCodePageUtf8;
  switch (attribute)
  {
  case Attribute::encoding: return when(!isXml, "hex");
  case Attribute::codePage: return when(otherPage, std::to_string(utf8.codePage));
  default: return std::nullopt;
  }
}

} // namespace

bool NodeTree::value(const Place& place, paths::Value& value)
{
  const bool isData = !place.node.isGroup();
  if (isData)
  {
    const bool onlyText = place.node.type() == TAV_TYPE_UTC_TIMESTAMP || place.node.type() == TAV_TYPE_UINT64_ARRAY;
    value.kind = onlyText ? paths::Value::Kind::onlyText : paths::Value::Kind::text;
    fail(place.node.withRaw([&value](const RawValue& raw) {
      value.text = paths::plainText(raw);
      return TAV_RC_OK;
    }));
  }
  return isData && !hasFailed();
}

std::optional<std::string> NodeTree::headerAttribute(const Node& node, paths::Attribute attribute) const
{
  using paths::Attribute;
  const bool wide = layout::is64(node.data_.header);
  const uint32_t info = layout::infoOf(node.data_.header);
  const uint32_t usual = state.handle->alignMode != 0 ? TAV_INFO_ALIGNED8 : 0;
  const std::string_view type = typeName(node.type());
  switch (attribute)
  {
  case Attribute::id: return when(!hasXmlName(node.elm(), ownTags), std::to_string(node.elm()));
  case Attribute::name:
    return when(!elementName(node.elm()).empty() && !hasXmlName(node.elm(), ownTags),
                std::string(elementName(node.elm())));
  case Attribute::type:
    return node.type() == TAV_TYPE_HEADER32   ? "group32"
           : node.type() == TAV_TYPE_HEADER64 ? "group64"
           : type.empty()                     ? std::to_string(node.type())
                                              : std::string(type);
  case Attribute::header: return when(node.isRoot_ && !node.hasParent(), wide ? "64" : "32");
  case Attribute::info: return when(wide && (info & ~uint32_t{TAV_INFO_EYE_SIZE}) != usual, infoText(info));
  case Attribute::eyeSize: return when(layout::hasEyeSize(node.data_.header), "true");
  case Attribute::size: return when(node.isGroup() && node.isOpen(), "unknown");
  default: return std::nullopt;
  }
}

bool NodeTree::attribute(const Place& place, paths::Attribute attribute, paths::Value& value)
{
  std::optional<std::string> text = headerAttribute(place.node, attribute);
  if (!text && !place.node.isGroup())
  {
    fail(place.node.withRaw([&](const RawValue& raw) {
      text = valueAttribute(raw, attribute);
      return TAV_RC_OK;
    }));
  }
  value = {paths::Value::Kind::text, text.value_or("")};
  return text.has_value() && !hasFailed();
}

std::vector<NodeTree::Place> NodeTree::lineTo(const Node& node, bool fromAbove)
{
  std::vector<Place> line{Place{}};
  for (Walk walk(*this, Place{}); walk.next();)
  {
    const Node& one = walk.place().node;
    line.resize(walk.depth());
    line.push_back(walk.place());
    if (one.offset() == node.offset())
    {
      return line;
    }
    if (!mayHold(one, node))
    {
      walk.skip();
    }
  }
  line.clear();
  if (fromAbove)
  {
    line.emplace_back();
  }
  line.push_back({node, false});
  return line;
}

} // namespace tav::detail
