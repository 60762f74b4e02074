/// @file ranges.hpp
/// Walks as input ranges: the children of a group, and all below it.
#pragma once

#include <cstddef>
#include <cstdint>
#include <iterator>
#include <optional>
#include <span>
#include <type_traits>
#include <utility>

#include "tav/cpp/node.hpp"
#include "tav/cpp/stack.hpp"

namespace tav
{

namespace detail
{

/// Whether a walk goes from sibling to sibling: then most of its steps are taken in place.
template<class Walk>
inline constexpr bool stepsInPlace = std::is_same_v<Walk, ChildRange> || std::is_same_v<Walk, DescendantRange>;

/// An iterator over a walk that lives in its range. `Walk` has `current()` and `advance()`, which reports whether there
/// is a node; one that steps in place has its node as `current_`, too, and the place `end_` where its level ends. The
/// iterator keeps what most steps need, where a loop has it in registers: these are taken without a call.
template<class Walk>
class WalkIterator
{
public:
  using iterator_concept = std::input_iterator_tag;
  using value_type = Node;
  using difference_type = std::ptrdiff_t;

  WalkIterator() = default;
  /// Null: at the end.
  explicit WalkIterator(Walk* walk) noexcept
      : walk_(walk)
  {
    settle();
  }

  const Node& operator*() const noexcept
  {
    return walk_->current();
  }
  const Node* operator->() const noexcept
  {
    return &walk_->current();
  }
  [[gnu::always_inline]] WalkIterator& operator++()
  {
    if constexpr (stepsInPlace<Walk>)
    {
      if (stepInPlace()) [[likely]]
      {
        return *this;
      }
    }
    stepElsewhere();
    return *this;
  }
  void operator++(int)
  {
    ++*this;
  }
  friend bool operator==(const WalkIterator& iterator, std::default_sentinel_t) noexcept
  {
    return iterator.isAtEnd();
  }

private:
  [[nodiscard]] bool isAtEnd() const noexcept
  {
    return walk_ == nullptr;
  }

  /// To a sibling that is a data element, while nothing is traced.
  [[gnu::always_inline]] bool stepInPlace() noexcept
  {
    if (!core::hasNeverTraced()) [[unlikely]]
    {
      return false;
    }
    Node& node = walk_->current_;
    if (state_->inPlace == InPlace::block) [[likely]]
    {
      return core::nextElement(level_, next_, node.data_);
    }
    if (state_->inPlace != InPlace::ring)
    {
      return false;
    }
    TAVHandle& handle = *state_->handle;
    const core::RingLevel<core::PlainWay> level{RingInPlace(handle), handle, walk_->end_};
    const bool isHere = core::nextElement(level, behind_, node.data_);
    if (isHere)
    {
      node.fetch_ = ++state_->fetches;
    }
    return isHere;
  }

  void stepElsewhere()
  {
    Walk* const walk = std::exchange(walk_, nullptr); // at the end, too, when the step throws
    if (walk->advance())
    {
      walk_ = walk;
      settle();
    }
  }

  /// After a step that was not taken in place.
  void settle() noexcept
  {
    if constexpr (stepsInPlace<Walk>)
    {
      if (walk_ == nullptr)
      {
        return;
      }
      const Node& node = walk_->current_;
      state_ = node.state_;
      behind_ = Walk::descends && node.isGroup() ? ~uint64_t{0} : node.behind();
      if (state_->inPlace == InPlace::block)
      {
        level_ = core::BlockLevel(BlockInPlace(*state_->handle), walk_->end_);
        next_ = level_.at(behind_);
      }
    }
  }

  Walk* walk_ = nullptr;
  ReaderState* state_ = nullptr;
  core::BlockLevel level_;
  uint8_t* next_ = nullptr; ///< where the node's sibling is looked for in a block
  uint64_t behind_ = 0;     ///< the same by its offset, through a ring
};

/// The end of a walk: reported where somebody asks for the code, else thrown.
[[gnu::noinline, gnu::cold]] inline void endWalk(uint32_t rc, std::error_code* ec, const char* what)
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
class ChildRange
{
public:
  ChildRange(ChildRange&&) = default;
  ChildRange& operator=(ChildRange&&) = default;

  detail::WalkIterator<ChildRange> begin() &
  {
    if (!begun_)
    {
      begun_ = true;
      arriveElsewhere(first_ != TAV_RC_OK ? first_ : hasReference_ ? onward()
                                                                   : current_.readNext<true>(nullptr, end_));
    }
    return detail::WalkIterator<ChildRange>(done_ ? nullptr : this);
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
    end_ = Node::endOf(current_.parent_);
  }
  struct Behind
  {
    const Node& node;
  };
  /// The siblings behind a node.
  ChildRange(Behind behind, EndElements endElements, std::error_code* ec) noexcept
      : current_(behind.node), ec_(ec), endElements_(endElements), hasReference_(true),
        first_(whyNoSiblings(behind.node)), end_(Node::endOf(current_.parent_))
  {
  }

  /// The stream's first node is alone.
  static uint32_t whyNoSiblings(const Node& node) noexcept
  {
    if (node.hasParent())
    {
      return TAV_RC_OK;
    }
    return node.state_ != nullptr && node.isRoot_ ? TAV_RC_NO_MORE_CHILDREN : TAV_RC_NOT_SUPPORTED;
  }

  static constexpr bool descends = false;

  [[nodiscard]] const Node& current() const noexcept
  {
    return current_;
  }
  /// Siblings lie ahead, whatever the bytes are: behind a node's end, or behind an eye catcher that is.
  [[gnu::noinline]] bool advance()
  {
    const uint32_t rc = onward();
    return (rc == TAV_RC_OK && current_.isSurelyNoEnd()) || arriveElsewhere(rc);
  }
  [[gnu::always_inline]] uint32_t onward() noexcept
  {
    return current_.readNext<false>(&current_.data_.header, end_);
  }

  /// After a step that led to no node, or perhaps to an end element.
  [[gnu::noinline]] bool arriveElsewhere(uint32_t rc)
  {
    while (rc == TAV_RC_OK && endElements_ == EndElements::skip && layout::isEndElement(current_.elm()))
    {
      rc = onward();
    }
    if (rc != TAV_RC_OK)
    {
      done_ = true;
      detail::endWalk(rc, ec_, "walking the nodes of a group");
    }
    return rc == TAV_RC_OK;
  }

  Node current_; ///< knows the group that is walked
  std::error_code* ec_;
  EndElements endElements_;
  bool hasReference_ = false;
  bool begun_ = false;
  bool done_ = false;
  uint32_t first_;   ///< why there is nothing to walk
  uint64_t end_ = 0; ///< of the group that is walked
};

/// All nodes below a group, depth first. A single pass; the range holds the place of the walk, 32 bytes a level.
class DescendantRange
{
public:
  DescendantRange(DescendantRange&&) = default;
  DescendantRange& operator=(DescendantRange&&) = default;

  detail::WalkIterator<DescendantRange> begin() &
  {
    if (!begun_)
    {
      begun_ = true;
      const uint32_t rc = current_.isGroup() ? descend() : TAV_RC_NO_MORE_CHILDREN;
      arriveElsewhere(rc);
    }
    return detail::WalkIterator<DescendantRange>(done_ ? nullptr : this);
  }
  static std::default_sentinel_t end() noexcept
  {
    return std::default_sentinel;
  }

  /// Leaves out what is below the present node: the walk goes on behind it, where its size says.
  void skip() noexcept
  {
    skips_ = current_.isGroup();
  }

  /// Levels between the start and the present node; its children are on level 1.
  [[nodiscard]] size_t depth() const noexcept
  {
    return depth_;
  }

private:
  friend class Node;
  friend class detail::IndexWalk;
  friend class detail::WalkIterator<DescendantRange>;

  DescendantRange(const Node& start, EndElements endElements, std::error_code* ec)
      : current_(start), ec_(ec), endElements_(endElements)
  {
  }
  struct At
  {
    const Node& node;
  };
  /// A walk that has come to a node, which knows its group; `outer`: those around it, from the start inwards.
  DescendantRange(At at, detail::Stack<TAVHeader>&& outer, EndElements endElements, std::error_code* ec)
      : current_(at.node), outer_(std::move(outer)), end_(Node::endOf(current_.parent_)), depth_(outer_.size() + 1),
        ec_(ec), endElements_(endElements), begun_(true)
  {
  }

  static constexpr bool descends = true;

  [[nodiscard]] const Node& current() const noexcept
  {
    return current_;
  }
  [[gnu::noinline]] bool advance()
  {
    const uint32_t rc = step();
    return (rc == TAV_RC_OK && current_.isSurelyNoEnd()) || arriveElsewhere(rc);
  }

  /// Down into a group, else on to the sibling. Both lie ahead, whatever the bytes are.
  [[gnu::always_inline]] uint32_t step()
  {
    if (current_.isGroup()) [[unlikely]]
    {
      return descend();
    }
    return current_.readNext<false>(&current_.data_.header, end_);
  }

  /// To the first child of the present node.
  [[gnu::noinline]] uint32_t descend()
  {
    if (std::exchange(skips_, false))
    {
      return current_.readNext<false>(&current_.data_.header, end_);
    }
    if (depth_ != 0)
    {
      outer_.push(current_.parent_);
    }
    ++depth_;
    current_.parent_ = current_.data_.header;
    end_ = Node::endOf(current_.parent_);
    return current_.readNext<true>(nullptr, end_);
  }

  /// After a step that led to no node, or perhaps to an end element.
  [[gnu::noinline]] bool arriveElsewhere(uint32_t rc)
  {
    while (true)
    {
      if (rc == TAV_RC_NO_MORE_CHILDREN)
      {
        rc = climb();
      }
      if (rc != TAV_RC_OK)
      {
        done_ = true;
        detail::endWalk(rc, ec_, "walking below a group");
        return false;
      }
      if (endElements_ == EndElements::show || !layout::isEndElement(current_.elm()))
      {
        return true;
      }
      rc = step();
    }
  }

  /// Up, until there is a sibling. It can lie before the present node, where only damage leads.
  uint32_t climb() noexcept
  {
    const uint64_t last = current_.offset();
    uint32_t rc = TAV_RC_NO_MORE_CHILDREN;
    while (rc == TAV_RC_NO_MORE_CHILDREN && !outer_.empty())
    {
      TAVHeader ended = current_.parent_;
      current_.parent_ = outer_.back();
      outer_.pop();
      --depth_;
      end_ = Node::endOf(current_.parent_);
      rc = current_.readNext<false>(&ended, end_);
    }
    return rc == TAV_RC_OK && current_.offset() <= last ? TAV_RC_OUTSIDE_PARENT : rc;
  }

  Node current_;                   ///< knows the group that is walked
  detail::Stack<TAVHeader> outer_; ///< the groups around that one
  uint64_t end_ = 0;               ///< of the group that is walked
  size_t depth_ = 0;               ///< 0: still at the start
  std::error_code* ec_;
  EndElements endElements_;
  bool begun_ = false;
  bool done_ = false;
  bool skips_ = false; ///< the present group's children
};

} // namespace tav

/// @cond  Views, as std::ranges::view_base would make them: `<ranges>` costs a small program more than all of this, and
/// the variables come with `<span>`, too.
template<>
inline constexpr bool std::ranges::enable_view<tav::ChildRange> = true;
template<>
inline constexpr bool std::ranges::enable_view<tav::DescendantRange> = true;
/// @endcond

namespace tav
{

inline ChildRange Node::children(EndElements endElements) const
{
  beginWalk();
  return {*this, endElements, nullptr};
}

inline ChildRange Node::children(std::error_code& ec, EndElements endElements) const
{
  beginWalk();
  ec.clear();
  return {*this, endElements, &ec};
}

inline ChildRange Node::siblings(EndElements endElements) const
{
  beginWalk();
  return {ChildRange::Behind{*this}, endElements, nullptr};
}

inline ChildRange Node::siblings(std::error_code& ec, EndElements endElements) const
{
  beginWalk();
  ec.clear();
  return {ChildRange::Behind{*this}, endElements, &ec};
}

inline DescendantRange Node::descendants(EndElements endElements) const
{
  beginWalk();
  return {*this, endElements, nullptr};
}

inline DescendantRange Node::descendants(std::error_code& ec, EndElements endElements) const
{
  beginWalk();
  ec.clear();
  return {*this, endElements, &ec};
}

inline DescendantRange Node::below(std::error_code& ec) const
{
  ec.clear();
  return {*this, EndElements::show, &ec};
}

inline std::optional<Node> Node::next() const
{
  ChildRange behind = siblings();
  const auto first = behind.begin();
  return first == std::default_sentinel ? std::nullopt : std::optional(*first);
}

inline std::optional<Node> Node::next(std::error_code& ec) const
{
  ChildRange behind = siblings(ec);
  const auto first = behind.begin();
  return first == std::default_sentinel ? std::nullopt : std::optional(*first);
}

} // namespace tav
