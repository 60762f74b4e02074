/// @file pathTree.h
/// The nodes of a reader as the matcher of paths wants them.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <system_error>
#include <vector>

#include "tav/core/search.hpp"
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

  bool value(const Place& place, paths::Value& value);
  bool attribute(const Place& place, paths::Attribute attribute, paths::Value& value);

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
  std::vector<Place> lineTo(const Node& node, bool fromAbove);

  /// The first match of the steps of a path of plain names; see detail::findStraight. `Step` has the id as `only`.
  template<class Step>
  static bool findStraight(std::span<const Step> steps, const Node& start, Node& found) noexcept
  {
    if (start.state_ == nullptr || !start.state_->isFast)
    {
      return false;
    }
    using Block = BlockInPlace;
    TAVHandle& handle = *start.state_->handle;
    const bool isPlain = core::hasNeverTraced() && Block::canRead(handle);
    TAVHeaderData nodes[2];
    nodes[0].header = start.data_.header;
    size_t current = 0;
    for (const Step& step : steps)
    {
      TAVHeader& parent = nodes[current].header;
      current ^= 1U;
      TAVHeaderData& child = nodes[current];
      const bool isThere = layout::isGroup(parent) &&
                           ((isPlain && core::findChild(Block(handle), handle, parent, step.only, child)) ||
                            tavFindElmInt(&handle, &parent, 0, 0, 0, step.only, nullptr, nullptr, &child) == TAV_RC_OK);
      if (!isThere)
      {
        return false;
      }
    }
    found = Node(*start.state_, nodes[current]);
    found.parent_ = nodes[current ^ 1U].header;
    return true;
  }

private:
  [[nodiscard]] std::optional<std::string> headerAttribute(const Node& node, paths::Attribute attribute) const;

public:
  ReaderState& state;
  std::span<const uint16_t> ownTags{}; ///< as the path that is followed has them
  uint32_t failed = TAV_RC_OK;
};

} // namespace tav::detail
