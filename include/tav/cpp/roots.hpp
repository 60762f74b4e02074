/// @file roots.hpp
/// The roots of all streams in a file, as an input range.
#pragma once

#include <cstdint>
#include <cstring>
#include <system_error>
#include <utility>

#include "tav/cpp/ranges.hpp"
#include "tav/cpp/rootSearch.hpp"

namespace tav
{

namespace detail
{

/// The bytes under a handle that reads, by offset.
class HandleBytes
{
public:
  explicit HandleBytes(TAVHandle& handle) noexcept
      : handle_(handle)
  {
  }

  /// Bytes that are at hand from an offset on: at least one, but at the end.
  uint32_t view(uint64_t offset, const uint8_t*& bytes, uint64_t& length) noexcept
  {
    constexpr uint64_t piece = 4096;
    length = 0;
    if (handle_.pCircularBuf == nullptr)
    {
      length = offset < handle_.directDataSize ? handle_.directDataSize - offset : 0;
      bytes = handle_.pDirectData + (length != 0 ? offset : 0);
      return TAV_RC_OK;
    }
    TAVCBUserArea area{};
    const uint32_t rc = handle_.pCircularBuf->getChunk(offset, piece, &area, false, false);
    bytes = area.pChunk;
    length = rc == TAV_RC_OK ? area.chunkLength : 0;
    return isEnd(rc) ? TAV_RC_OK : rc;
  }

  /// Up to `length` bytes; fewer at the end alone.
  uint32_t read(uint64_t offset, uint8_t* to, uint64_t length, uint64_t& got) noexcept
  {
    uint32_t rc = TAV_RC_OK;
    uint64_t there = 1;
    for (got = 0; rc == TAV_RC_OK && there != 0 && got < length; got += there)
    {
      const uint8_t* bytes = nullptr;
      rc = view(offset + got, bytes, there);
      there = lesser(there, length - got);
      if (there != 0) // at the end the bytes are nowhere, which memcpy does not take
      {
        std::memcpy(to + got, bytes, static_cast<size_t>(there));
      }
    }
    return rc;
  }

private:
  static bool isEnd(uint32_t rc) noexcept
  {
    return rc == TAV_RC_END_OF_STORAGE || rc == TAV_RC_END_OF_DATA;
  }

  TAVHandle& handle_;
};

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
    detail::HandleBytes bytes(handle);
    detail::RootSearch<detail::HandleBytes> search(bytes, form);
    TAVHeader root;
    uint32_t rc = search.next(next_, root);
    if (rc != TAV_RC_OK)
    {
      return rc;
    }
    TAVHeaderData data{};
    rc = tavReadNodeInt(0, &handle, root.nodeOffset, form.wide, &data);
    if (rc == TAV_RC_OK)
    {
      current_ = Node(*state_, data);
      current_.isRoot_ = true;
      next_ = detail::endOfGroup(root);
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
