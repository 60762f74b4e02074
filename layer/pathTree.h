/// @file pathTree.h
/// The nodes of a reader as the matcher of paths wants them.
#pragma once

#include <array>
#include <charconv>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <system_error>
#include <utility>
#include <vector>

#include "layer/elementNames.h"
#include "tav/cpp/ranges.hpp"
#include "tav/path/compare.hpp"
#include "tav/path/compiled.hpp"
#include "tav/path/valueText.hpp"

namespace tav::detail
{

struct NodeTree
{
  struct Place
  {
    Node node{};
    bool above = true; ///< above the roots
  };

  explicit NodeTree(ReaderState& reader) noexcept
      : state(reader)
  {
  }
  NodeTree(const NodeTree&) = delete;
  NodeTree& operator=(const NodeTree&) = delete;

  /// The first failure of a walk: then all of them end.
  [[nodiscard]] uint32_t failure() const noexcept
  {
    return failed;
  }
  [[nodiscard]] bool hasFailed() const noexcept
  {
    return failed != TAV_RC_OK;
  }
  void fail(uint32_t rc) noexcept
  {
    failed = hasFailed() ? failed : rc;
  }

  [[nodiscard]] static bool isAbove(const Place& place) noexcept
  {
    return place.above;
  }
  [[nodiscard]] static uint16_t elm(const Place& place) noexcept
  {
    return place.node.elm();
  }
  [[nodiscard]] static uint64_t offset(const Place& place) noexcept
  {
    return place.node.offset();
  }
  [[nodiscard]] static bool isGroup(const Place& place) noexcept
  {
    return place.node.isGroup();
  }

  [[nodiscard]] static bool hasText(const Place& place) noexcept
  {
    return place.node.isGroup() || paths::hasText(place.node.type(), place.node.size());
  }

  bool value(const Place& place, paths::Value& value)
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

  bool attribute(const Place& place, paths::Attribute attribute, paths::Value& value)
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

  /// The nodes below one, or all: in stream order.
  class Walk
  {
  public:
    Walk(NodeTree& tree, const Place& top)
        : tree_(tree), isWhole_(top.above)
    {
      if (!isWhole_)
      {
        enter(top.node);
      }
    }
    Walk(const Walk&) = delete;
    Walk& operator=(const Walk&) = delete;

    bool next()
    {
      if (isWhole_ && !begun_)
      {
        begun_ = true;
        return readRoot();
      }
      if (isWhole_ && !range_)
      {
        if (place_.above || skips_)
        {
          return false;
        }
        const Node root = place_.node;
        enter(root);
      }
      return step();
    }
    [[nodiscard]] const Place& place() const noexcept
    {
      return place_;
    }
    [[nodiscard]] size_t depth() const noexcept
    {
      return (range_ ? range_->depth() : 0) + (isWhole_ ? 1 : 0);
    }
    void skip() noexcept
    {
      skips_ = true; // a root's
      if (range_)
      {
        range_->skip();
      }
    }

  private:
    void enter(const Node& node)
    {
      range_.emplace(node.below(ec_));
    }
    bool readRoot() noexcept
    {
      TAVHeaderData data{};
      ++tree_.state.fetches;
      const uint32_t rc = tavGetNextChild(0, tree_.state.handle, nullptr, nullptr, &data);
      tree_.fail(rc);
      if (rc == TAV_RC_OK)
      {
        place_ = {Node(tree_.state, data), false};
        place_.node.isRoot_ = true;
      }
      return rc == TAV_RC_OK;
    }
    bool step()
    {
      if (tree_.hasFailed())
      {
        return false;
      }
      at_ = isWalking_ ? ++at_ : range_->begin();
      isWalking_ = true;
      if (at_ == std::default_sentinel)
      {
        tree_.fail(codeOf(ec_));
        return false;
      }
      place_.above = false;
      place_.node = *at_;
      return true;
    }

    NodeTree& tree_;
    bool isWhole_; ///< from above the roots
    bool begun_ = false;
    bool skips_ = false;
    bool isWalking_ = false;
    std::error_code ec_{};
    std::optional<DescendantRange> range_{};
    WalkIterator<DescendantRange> at_{};
    Place place_{};
  };

  /// The nodes around one, the place above the roots first and the node last. Without the way to it: the node alone.
  std::vector<Place> lineTo(const Node& node, bool fromAbove)
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

  /// The first match of the steps of a path of plain names; see detail::findStraight.
  static bool findStraight(std::span<const paths::Step> steps, const Node& start, Node& found) noexcept
  {
    if (start.state_ == nullptr || !start.state_->isFast)
    {
      return false;
    }
    TAVHeaderData nodes[2];
    nodes[0].header = start.data_.header;
    size_t current = 0;
    for (const paths::Step& step : steps)
    {
      TAVHeaderData& parent = nodes[current];
      current ^= 1U;
      if (!layout::isGroup(parent.header) || tavFindElmInt(start.state_->handle, &parent.header, 0, 0, 0, step.only,
                                                           nullptr, nullptr, &nodes[current]) != TAV_RC_OK)
      {
        return false;
      }
    }
    found = Node(*start.state_, nodes[current]);
    found.parent_ = nodes[current ^ 1U].header;
    return true;
  }

private:
  static bool mayHold(const Node& group, const Node& node) noexcept
  {
    const uint64_t start = group.offset() + layout::headerLength(group.header().hdrType);
    return group.isGroup() && node.offset() >= start && (group.isOpen() || node.offset() - start < group.size());
  }

  static std::optional<std::string> when(bool shown, std::string text)
  {
    return shown ? std::optional(std::move(text)) : std::nullopt;
  }
  static std::string infoText(uint32_t info)
  {
    std::array<char, 16> digits{};
    const std::to_chars_result end = std::to_chars(digits.data(), digits.data() + digits.size(), info, 16);
    return "0x" + std::string(digits.data(), end.ptr);
  }
  /// Whether the XML form calls an element by its tag.
  bool hasXmlName(uint16_t elm) const
  {
    const std::string_view tag = elementTag(elm);
    return tag.empty() ? std::binary_search(ownTags.begin(), ownTags.end(), elm)
                       : tag.find(' ') == std::string_view::npos &&
                             idsNamed(tag) == std::vector<uint16_t>{elm};
  }

  std::optional<std::string> headerAttribute(const Node& node, paths::Attribute attribute) const
  {
    using paths::Attribute;
    const bool wide = layout::is64(node.data_.header);
    const uint32_t info = layout::infoOf(node.data_.header);
    const uint32_t usual = state.handle->alignMode != 0 ? TAV_INFO_ALIGNED8 : 0;
    const std::string_view type = typeName(node.type());
    switch (attribute)
    {
    case Attribute::id: return when(!hasXmlName(node.elm()), std::to_string(node.elm()));
    case Attribute::name:
      return when(!elementName(node.elm()).empty() && !hasXmlName(node.elm()),
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

  static std::optional<std::string> valueAttribute(const RawValue& raw, paths::Attribute attribute)
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
  static bool decimalOf(const RawValue& raw) noexcept
  {
    const bool isNumber = raw.type >= TAV_TYPE_UINT8 && raw.type <= TAV_TYPE_SINT64;
    const bool isLong = raw.type == TAV_TYPE_UINT128 || raw.type == TAV_TYPE_SINT128;
    return (isNumber && raw.size == layout::typeInfo(raw.type).valueSize) || (isLong && raw.size == 16);
  }
  /// The parts of a moment that its text does not say.
  static std::optional<std::string> dateAttribute(const TAVTimeStamp& stamp, paths::Attribute attribute)
  {
    using paths::Attribute;
    constexpr int aDay = 24 * 60;
    const bool isWhole = stamp.fractionA < 1000 && stamp.fractionB < 1000 && stamp.further == 0 &&
                         stamp.offsetMinutes > -aDay && stamp.offsetMinutes < aDay && !timeText(stamp).ends_with('s');
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

public:
  ReaderState& state;
  std::span<const uint16_t> ownTags{}; ///< as the path that is followed has them
  uint32_t failed = TAV_RC_OK;
};

} // namespace tav::detail
