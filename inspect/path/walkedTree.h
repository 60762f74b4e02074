/// The nodes of a stream as a walk finds them, for the matcher of paths.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>

#include "tav/inspect/attributes.hpp"
#include "tav/inspect/value.hpp"
#include "tav/inspect/walker.hpp"
#include "tav/path/matcher.hpp"
#include "tav/path/valueText.hpp"

namespace tav::inspect
{

namespace paths = detail::paths;

inline constexpr uint64_t kMostCompared = uint64_t{16} * 1024 * 1024; ///< bytes of a value; longer ones compare as none

/// The nodes of a stream as a walk finds them.
struct WalkedTree
{
  struct Place
  {
    Node node{};
    bool above = true;                   ///< above the roots
    std::optional<Walker::Mark> group{}; ///< to look below it
  };

  bool isAbove(const Place& place) const { return place.above; }
  uint16_t elm(const Place& place) const { return place.node.elm(); }
  uint64_t offset(const Place& place) const { return place.node.offset(); }
  bool isGroup(const Place& place) const { return place.node.isGroup(); }
  bool hasText(const Place& place) const
  {
    return place.node.isGroup() || paths::hasText(place.node.type(), place.node.size());
  }

  bool value(const Place& place, paths::Value& value) const
  {
    const uint16_t type = place.node.type();
    const auto text = place.node.isGroup() ? std::nullopt : plainText(*source, form, place.node, kMostCompared);
    const bool onlyText = type == TAV_TYPE_UTC_TIMESTAMP || type == TAV_TYPE_UINT64_ARRAY;
    value = {onlyText ? paths::Value::Kind::onlyText : paths::Value::Kind::text, text.value_or("")};
    return text.has_value();
  }
  bool attribute(const Place& place, paths::Attribute attribute, paths::Value& value) const
  {
    const auto text = attributeText(*source, form, place.node, attribute);
    value = {paths::Value::Kind::text, text.value_or("")};
    return text.has_value();
  }

  Place placeOf(const Walker& walker, const Event& event) const
  {
    Place place{event.node, false, std::nullopt};
    if (event.node.isGroup() && looks)
    {
      place.group = walker.mark();
    }
    return place;
  }

  class Walk
  {
  public:
    Walk(WalkedTree& tree, const Place& top)
        : tree_(tree), levels_(top.above ? 0 : top.node.depth + 1)
    {
      if (top.above)
      {
        walker_.emplace(*tree.source, tree.form);
      }
      else if (top.group)
      {
        walker_.emplace(Walker::through(*tree.source, tree.form, *top.group));
      }
    }

    bool next()
    {
      while (walker_ && walker_->next(event_))
      {
        if (event_.what == What::nodeEnd && event_.node.isGroup() && event_.depth + 1 == levels_)
        {
          walker_.reset(); // the top one
        }
        else if (event_.what == What::nodeBegin && event_.depth <= deepest_)
        {
          deepest_ = kNoOffset;
          place_ = tree_.placeOf(*walker_, event_);
          return true;
        }
      }
      return false;
    }
    const Place& place() const { return place_; }
    size_t depth() const { return static_cast<size_t>(event_.depth + 1 - levels_); }
    void skip()
    {
      if (!event_.node.isGroup() || !walker_->skip())
      {
        deepest_ = event_.depth;
      }
    }

  private:
    WalkedTree& tree_;
    uint64_t levels_; ///< the depth of what is directly below
    uint64_t deepest_ = kNoOffset;
    std::optional<Walker> walker_{};
    Event event_{};
    Place place_{};
  };

  ByteSource* source = nullptr;
  Form form{};
  bool looks = false; ///< something may have to be looked up below a node
};

} // namespace tav::inspect
