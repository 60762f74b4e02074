/// @file ranges.hpp
/// Walks as input ranges: the children of a group, and all below it.
#pragma once

#include <cstddef>
#include <cstdint>
#include <iterator>
#include <ranges>
#include <vector>

#include "tav/cpp/node.hpp"

namespace tav
{

namespace detail
{

/// An iterator over a walk that lives in its range. `Walk` has `done`, `current` and `advance()`.
template<class Walk>
class WalkIterator
{
public:
  using value_type = Node;
  using difference_type = std::ptrdiff_t;

  WalkIterator() = default;
  explicit WalkIterator(Walk& walk)
      : walk_(&walk)
  {
  }

  const Node& operator*() const
  {
    return walk_->current();
  }
  const Node* operator->() const
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
  friend bool operator==(const WalkIterator& iterator, std::default_sentinel_t)
  {
    return iterator.isAtEnd();
  }

private:
  [[nodiscard]] bool isAtEnd() const
  {
    return walk_->isDone();
  }

  Walk* walk_ = nullptr;
};

} // namespace detail

/// The children of a group. A single pass; the range holds the place of the walk.
class ChildRange : public std::ranges::view_base
{
public:
  ChildRange(const Node& parent, std::error_code* ec, EndElements endElements)
      : parent_(parent), ec_(ec), endElements_(endElements)
  {
  }
  ChildRange(ChildRange&&) = default;
  ChildRange& operator=(ChildRange&&) = default;

  detail::WalkIterator<ChildRange> begin()
  {
    if (!begun_)
    {
      advance();
    }
    return detail::WalkIterator<ChildRange>(*this);
  }
  static std::default_sentinel_t end()
  {
    return std::default_sentinel;
  }

private:
  friend class detail::WalkIterator<ChildRange>;
  friend class DescendantRange;

  [[nodiscard]] const Node& current() const
  {
    return current_;
  }
  [[nodiscard]] bool isDone() const
  {
    return done_;
  }

  void advance()
  {
    do
    {
      step();
    } while (!done_ && endElements_ == EndElements::skip && layout::isEndElement(current_.elm()));
  }

  void step()
  {
    TAVHeaderData next;
    TAVHeader* const reference = begun_ ? &current_.header_ : nullptr;
    uint32_t rc = TAV_RC_NO_MORE_CHILDREN;
    begun_ = true;
    if (parent_.isGroup())
    {
      ++parent_.state_->fetches;
      rc = tavGetNextChild(0, parent_.state_->handle, &parent_.header_, reference, &next);
      // A sibling behind a group that was never closed is found by its eye catcher, which damage can place anywhere.
      if (rc == TAV_RC_OK && reference != nullptr && next.header.nodeOffset <= reference->nodeOffset)
      {
        rc = TAV_RC_OUTSIDE_PARENT;
      }
    }
    done_ = rc != TAV_RC_OK;
    if (!done_)
    {
      current_ = Node(*parent_.state_, next);
      return;
    }
    const uint32_t failure = rc == TAV_RC_NO_MORE_CHILDREN ? TAV_RC_OK : rc;
    if (ec_ == nullptr)
    {
      detail::demand(failure, "walking the children of a group");
      return;
    }
    *ec_ = makeError(failure);
  }

  Node parent_;
  Node current_;
  std::error_code* ec_;
  EndElements endElements_;
  bool begun_ = false;
  bool done_ = false;
};

/// All nodes below a group, depth first. A single pass; the range holds the place of the walk, 32 bytes a level.
class DescendantRange : public std::ranges::view_base
{
public:
  DescendantRange(const Node& start, std::error_code* ec, EndElements endElements)
      : start_(start), ec_(ec), endElements_(endElements)
  {
  }
  DescendantRange(DescendantRange&&) = default;
  DescendantRange& operator=(DescendantRange&&) = default;

  detail::WalkIterator<DescendantRange> begin()
  {
    if (!begun_)
    {
      begun_ = true;
      last_ = start_.offset();
      if (ec_ != nullptr)
      {
        ec_->clear();
      }
      done_ = !start_.isGroup();
      if (!done_)
      {
        open_.push_back(start_.header_);
        advance();
      }
    }
    return detail::WalkIterator<DescendantRange>(*this);
  }
  static std::default_sentinel_t end()
  {
    return std::default_sentinel;
  }

  /// Levels between the start and the present node; its children are on level 1.
  [[nodiscard]] size_t depth() const
  {
    return depth_;
  }

private:
  friend class detail::WalkIterator<DescendantRange>;

  [[nodiscard]] const Node& current() const
  {
    return current_;
  }
  [[nodiscard]] bool isDone() const
  {
    return done_;
  }

  void advance()
  {
    do
    {
      step();
    } while (!done_ && endElements_ == EndElements::skip && layout::isEndElement(current_.elm()));
  }

  void step()
  {
    TAVHeader reference = current_.header_;
    bool hasReference = depth_ != 0;
    if (hasReference && current_.isGroup())
    {
      open_.push_back(reference);
      hasReference = false;
    }
    while (!open_.empty())
    {
      TAVHeaderData next;
      ++start_.state_->fetches;
      uint32_t rc = tavGetNextChild(0, start_.state_->handle, &open_.back(), hasReference ? &reference : nullptr, &next);
      if (rc == TAV_RC_NO_MORE_CHILDREN)
      {
        reference = open_.back();
        open_.pop_back();
        hasReference = true;
        continue;
      }
      if (rc == TAV_RC_OK && next.header.nodeOffset <= last_)
      {
        rc = TAV_RC_OUTSIDE_PARENT; // backwards: only damage leads there
      }
      if (rc != TAV_RC_OK)
      {
        fail(rc);
        return;
      }
      last_ = next.header.nodeOffset;
      depth_ = open_.size();
      current_ = Node(*start_.state_, next);
      return;
    }
    done_ = true;
  }

  void fail(uint32_t rc)
  {
    done_ = true;
    if (ec_ == nullptr)
    {
      detail::raise(rc, "walking below a group");
    }
    *ec_ = makeError(rc);
  }

  Node start_;
  Node current_;
  std::vector<TAVHeader> open_;
  uint64_t last_ = 0;
  size_t depth_ = 0;
  std::error_code* ec_;
  EndElements endElements_;
  bool begun_ = false;
  bool done_ = false;
};

inline ChildRange Node::children(EndElements endElements) const
{
  return {*this, nullptr, endElements};
}

inline ChildRange Node::children(std::error_code& ec, EndElements endElements) const
{
  ec.clear();
  return {*this, &ec, endElements};
}

inline DescendantRange Node::descendants(EndElements endElements) const
{
  return {*this, nullptr, endElements};
}

inline DescendantRange Node::descendants(std::error_code& ec, EndElements endElements) const
{
  ec.clear();
  return {*this, &ec, endElements};
}

} // namespace tav
