/// @file ranges.hpp
/// Walks as input ranges: the children of a group, and all below it.
#pragma once

#include <cstddef>
#include <cstdint>
#include <iterator>
#include <optional>
#include <ranges>
#include <vector>

#include "tav/cpp/node.hpp"

namespace tav
{

namespace detail
{

/// An iterator over a walk that lives in its range. `Walk` has `isDone()`, `current()` and `advance()`.
template<class Walk>
class WalkIterator
{
public:
  using iterator_concept = std::input_iterator_tag;
  using value_type = Node;
  using difference_type = std::ptrdiff_t;

  WalkIterator() = default;
  explicit WalkIterator(Walk& walk) noexcept
      : walk_(&walk)
  {
  }

  const Node& operator*() const noexcept
  {
    return walk_->current();
  }
  const Node* operator->() const noexcept
  {
    return &walk_->current();
  }
  WalkIterator& operator++()
  {
    walk_->advance();
    return *this;
  }
  void operator++(int)
  {
    walk_->advance();
  }
  friend bool operator==(const WalkIterator& iterator, std::default_sentinel_t) noexcept
  {
    return iterator.isAtEnd();
  }

private:
  [[nodiscard]] bool isAtEnd() const noexcept
  {
    return walk_->isDone();
  }

  Walk* walk_ = nullptr;
};

/// The end of a walk: kept for who asks, or thrown.
inline void endWalk(uint32_t rc, std::error_code* ec, const char* what)
{
  const uint32_t failure = rc == TAV_RC_NO_MORE_CHILDREN ? TAV_RC_OK : rc;
  if (ec == nullptr)
  {
    demand(failure, what);
    return;
  }
  report(failure, *ec);
}

} // namespace detail

/// Children of a group. A single pass; the range holds the place of the walk, so an iterator must not outlive it.
class ChildRange : public std::ranges::view_base
{
public:
  ChildRange(ChildRange&&) = default;
  ChildRange& operator=(ChildRange&&) = default;

  detail::WalkIterator<ChildRange> begin() &
  {
    if (!begun_)
    {
      begun_ = true;
      first_ == TAV_RC_OK ? advance() : finish(first_);
    }
    return detail::WalkIterator<ChildRange>(*this);
  }
  static std::default_sentinel_t end() noexcept
  {
    return std::default_sentinel;
  }

private:
  friend class Node;
  friend class detail::WalkIterator<ChildRange>;

  /// All children of a node.
  ChildRange(const Node& parent, EndElements endElements, std::error_code* ec) noexcept
      : current_(parent.state_), ec_(ec), endElements_(endElements),
        first_(parent.isGroup() ? TAV_RC_OK : TAV_RC_NO_MORE_CHILDREN)
  {
    current_.parent_ = parent.data_.header;
  }
  struct Behind
  {
    const Node& node;
  };
  /// The siblings behind a node.
  ChildRange(Behind behind, EndElements endElements, std::error_code* ec) noexcept
      : current_(behind.node), ec_(ec), endElements_(endElements), hasReference_(true),
        first_(whyNoSiblings(behind.node))
  {
  }

  /// The stream's first node stands alone.
  static uint32_t whyNoSiblings(const Node& node) noexcept
  {
    if (node.hasParent())
    {
      return TAV_RC_OK;
    }
    return node.state_ != nullptr && node.isRoot_ ? TAV_RC_NO_MORE_CHILDREN : TAV_RC_NOT_SUPPORTED;
  }

  [[nodiscard]] const Node& current() const noexcept
  {
    return current_;
  }
  [[nodiscard]] bool isDone() const noexcept
  {
    return done_;
  }

  void advance()
  {
    uint32_t rc = TAV_RC_OK;
    do
    {
      rc = step();
    } while (rc == TAV_RC_OK && endElements_ == EndElements::skip && layout::isEndElement(current_.elm()));
    if (rc != TAV_RC_OK)
    {
      finish(rc);
    }
  }

  void finish(uint32_t rc)
  {
    done_ = true;
    detail::endWalk(rc, ec_, "walking the nodes of a group");
  }

  uint32_t step() noexcept
  {
    const uint64_t last = current_.offset();
    TAVHeader* const reference = hasReference_ ? &current_.data_.header : nullptr;
    const uint32_t rc = current_.readNext(&current_.parent_, reference);
    // A sibling behind a group that was never closed is found by its eye catcher, which damage can place anywhere.
    if (rc == TAV_RC_OK && hasReference_ && current_.offset() <= last)
    {
      return TAV_RC_OUTSIDE_PARENT;
    }
    hasReference_ = true;
    return rc;
  }

  Node current_; ///< knows the group that is walked
  std::error_code* ec_;
  EndElements endElements_;
  bool hasReference_ = false;
  bool begun_ = false;
  bool done_ = false;
  uint32_t first_; ///< why there is nothing to walk
};

/// All nodes below a group, depth first. A single pass; the range holds the place of the walk, 32 bytes a level.
class DescendantRange : public std::ranges::view_base
{
public:
  DescendantRange(DescendantRange&&) = default;
  DescendantRange& operator=(DescendantRange&&) = default;

  detail::WalkIterator<DescendantRange> begin() &
  {
    if (!begun_)
    {
      begun_ = true;
      done_ = open_.empty();
      if (!done_)
      {
        advance();
      }
    }
    return detail::WalkIterator<DescendantRange>(*this);
  }
  static std::default_sentinel_t end() noexcept
  {
    return std::default_sentinel;
  }

  /// Levels between the start and the present node; its children are on level 1.
  [[nodiscard]] size_t depth() const noexcept
  {
    return depth_;
  }

private:
  friend class Node;
  friend class detail::WalkIterator<DescendantRange>;

  DescendantRange(const Node& start, EndElements endElements, std::error_code* ec)
      : current_(start), ec_(ec), endElements_(endElements)
  {
    if (start.isGroup())
    {
      open_.push_back(start.data_.header);
    }
  }

  [[nodiscard]] const Node& current() const noexcept
  {
    return current_;
  }
  [[nodiscard]] bool isDone() const noexcept
  {
    return done_;
  }

  void advance()
  {
    uint32_t rc = TAV_RC_OK;
    do
    {
      rc = step();
    } while (rc == TAV_RC_OK && endElements_ == EndElements::skip && layout::isEndElement(current_.elm()));
    done_ = rc != TAV_RC_OK;
    if (done_)
    {
      detail::endWalk(rc, ec_, "walking below a group");
    }
  }

  /// Down into a group, on to the sibling, or up until there is one.
  uint32_t step()
  {
    const uint64_t last = current_.offset();
    TAVHeader ended;
    TAVHeader* reference = depth_ != 0 ? &current_.data_.header : nullptr;
    if (reference != nullptr && current_.isGroup())
    {
      open_.push_back(*reference);
      reference = nullptr;
    }
    while (!open_.empty())
    {
      const uint32_t rc = current_.readNext(&open_.back(), reference);
      if (rc != TAV_RC_NO_MORE_CHILDREN)
      {
        return rc == TAV_RC_OK ? arrive(last) : rc;
      }
      ended = open_.back();
      open_.pop_back();
      reference = &ended;
    }
    return TAV_RC_NO_MORE_CHILDREN;
  }

  /// Backwards is where only damage leads.
  uint32_t arrive(uint64_t last) noexcept
  {
    if (current_.offset() <= last)
    {
      return TAV_RC_OUTSIDE_PARENT;
    }
    if (current_.parent_.nodeOffset != open_.back().nodeOffset || depth_ == 0)
    {
      current_.parent_ = open_.back();
    }
    depth_ = open_.size();
    return TAV_RC_OK;
  }

  Node current_;
  std::vector<TAVHeader> open_;
  size_t depth_ = 0;
  std::error_code* ec_;
  EndElements endElements_;
  bool begun_ = false;
  bool done_ = false;
};

inline ChildRange Node::children(EndElements endElements) const
{
  return {*this, endElements, nullptr};
}

inline ChildRange Node::children(std::error_code& ec, EndElements endElements) const
{
  ec.clear();
  return {*this, endElements, &ec};
}

inline ChildRange Node::siblings(EndElements endElements) const
{
  return {ChildRange::Behind{*this}, endElements, nullptr};
}

inline ChildRange Node::siblings(std::error_code& ec, EndElements endElements) const
{
  ec.clear();
  return {ChildRange::Behind{*this}, endElements, &ec};
}

inline DescendantRange Node::descendants(EndElements endElements) const
{
  return {*this, endElements, nullptr};
}

inline DescendantRange Node::descendants(std::error_code& ec, EndElements endElements) const
{
  ec.clear();
  return {*this, endElements, &ec};
}

inline std::optional<Node> Node::next() const
{
  ChildRange behind = siblings();
  const auto first = behind.begin();
  return first == behind.end() ? std::nullopt : std::optional(*first);
}

inline std::optional<Node> Node::next(std::error_code& ec) const
{
  ChildRange behind = siblings(ec);
  const auto first = behind.begin();
  return first == behind.end() ? std::nullopt : std::optional(*first);
}

} // namespace tav
