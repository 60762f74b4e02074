/// @file roots.hpp
/// The roots of all streams in a file, as an input range.
#pragma once

#include <cstdint>
#include <system_error>

#include "tav/cpp/form.hpp"
#include "tav/cpp/ranges.hpp"

namespace tav
{

namespace detail
{

/// The root at an offset, or behind the zeros that are there, and where it ends. TAV_RC_NO_MORE_CHILDREN when nothing
/// but zeros is left, TAV_RC_BAD_CHILD_HDR where something else than a root is. `file`: what is read, where it is
/// known, for its holes.
TAV_API uint32_t findRoot(TAVHandle& handle, KORHFile* file, const StreamForm& form, uint64_t from, uint64_t& root,
                          uint64_t& end) noexcept;

} // namespace detail

/// The roots of the streams that stand one behind another in a file, in one form. Zeros between them, which fill the
/// last page of each, are passed over. Nothing comes behind a root that was never closed: all there is counts as its
/// own. A single pass; the range holds the place of the walk, so an iterator must not outlive it, nor it the reader.
/// TAV_RC_BAD_CHILD_HDR where something else than a root is.
class RootRange
{
public:
  RootRange(RootRange&&) = default;
  RootRange& operator=(RootRange&&) = default;

  detail::WalkIterator<RootRange> begin() &
  {
    if (!begun_)
    {
      begun_ = true;
      done_ = !advance();
    }
    return detail::WalkIterator<RootRange>(done_ ? nullptr : this);
  }
  static std::default_sentinel_t end() noexcept
  {
    return std::default_sentinel;
  }

private:
  friend class Reader;
  friend class detail::WalkIterator<RootRange>;

  RootRange(detail::ReaderState* state, std::error_code* ec) noexcept
      : state_(state), ec_(ec)
  {
  }

  [[nodiscard]] const Node& current() const noexcept
  {
    return current_;
  }

  bool advance()
  {
    const uint32_t rc = step();
    if (rc != TAV_RC_OK)
    {
      done_ = true;
      detail::endWalk(rc, ec_, "walking the roots");
    }
    return rc == TAV_RC_OK;
  }

  uint32_t step() noexcept
  {
    if (state_ == nullptr || state_->handle == nullptr)
    {
      return TAV_RC_BAD_PARAM;
    }
    TAVHandle& handle = *state_->handle;
    ++state_->fetches;
    const detail::StreamForm form{state_->isSwapped(), (handle.options & TAV_OPT_ROOT32) == 0, handle.alignMode == 1};
    uint64_t root = 0;
    uint64_t end = 0;
    uint32_t rc = detail::findRoot(handle, state_->file, form, next_, root, end);
    if (rc != TAV_RC_OK)
    {
      return rc;
    }
    TAVHeaderData data{};
    rc = tavReadNodeInt(0, &handle, root, form.wide, &data);
    if (rc == TAV_RC_OK)
    {
      current_ = Node(*state_, data);
      current_.isRoot_ = true;
      next_ = end;
    }
    return rc;
  }

  detail::ReaderState* state_;
  std::error_code* ec_;
  uint64_t next_ = 0;
  bool begun_ = false;
  bool done_ = false;
  Node current_;
};

} // namespace tav

/// @cond  A view, as those of ranges.hpp.
template<>
inline constexpr bool std::ranges::enable_view<tav::RootRange> = true;
/// @endcond
