/// @file rootSearch.hpp
/// Where the streams in a file begin: one root behind another, with zeros between them where a page was not full.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <new>

#include "tav/cpp/owner.hpp"
#include "tav/layout.hpp"

namespace tav::detail
{

/// How the bytes of a stream are to be taken.
struct StreamForm
{
  bool swapped = false;
  bool wide = true; ///< the root has a 64-bit header
  bool aligned = false;
};

/// As std::min, whose header holds a hundred other algorithms.
constexpr uint64_t lesser(uint64_t a, uint64_t b) noexcept
{
  return b < a ? b : a;
}

/// The bytes of an open file by offset, through a window: headers that stand near each other cost one read.
class FileBytes
{
public:
  explicit FileBytes(KORHFile& file) noexcept
      : file_(file)
  {
  }

  uint32_t open() noexcept
  {
    window_.reset(new (std::nothrow) Window);
    return window_ != nullptr ? file_.getSize(&size_) : TAV_RC_NO_MEMORY;
  }
  [[nodiscard]] uint64_t size() const noexcept
  {
    return size_;
  }

  /// Bytes that are at hand from an offset on: at least one, but at the end of the file.
  uint32_t view(uint64_t offset, const uint8_t*& bytes, uint64_t& length) noexcept
  {
    length = 0;
    if (offset >= size_)
    {
      return TAV_RC_OK;
    }
    if (offset < from_ || offset - from_ >= filled_)
    {
      if (const uint32_t rc = fill(offset); rc != TAV_RC_OK)
      {
        return rc;
      }
    }
    bytes = window_->data() + (offset - from_);
    length = filled_ - (offset - from_);
    return TAV_RC_OK;
  }

  /// Up to `length` bytes; fewer at the end of the file alone.
  uint32_t read(uint64_t offset, uint8_t* to, uint64_t length, uint64_t& got) noexcept
  {
    got = 0;
    uint32_t rc = TAV_RC_OK;
    while (rc == TAV_RC_OK && got < length)
    {
      const uint8_t* bytes = nullptr;
      uint64_t there = 0;
      rc = view(offset + got, bytes, there);
      if (rc != TAV_RC_OK || there == 0)
      {
        break;
      }
      there = lesser(there, length - got);
      std::memcpy(to + got, bytes, static_cast<size_t>(there));
      got += there;
    }
    return rc;
  }

private:
  static constexpr size_t kWindow = size_t{16} * 1024;
  using Window = std::array<uint8_t, kWindow>;

  uint32_t fill(uint64_t offset) noexcept
  {
    from_ = offset;
    filled_ = 0;
    KORFileSeekParam seek;
    seek.offset = offset;
    KORFileReadParam read;
    read.length = kWindow;
    uint32_t rc = file_.seek(&seek, nullptr);
    rc = rc == TAV_RC_OK ? file_.read(&read, window_->data(), &filled_) : rc;
    size_ = rc == TAV_RC_END_OF_STORAGE ? lesser(size_, offset + filled_) : size_;
    return rc == TAV_RC_END_OF_STORAGE ? TAV_RC_OK : rc;
  }

  KORHFile& file_;
  Owner<Window> window_;
  uint64_t size_ = 0;
  uint64_t from_ = 0;
  uint64_t filled_ = 0;
};

/// Reads the header at an offset; `there` reports whether the bytes have room for one.
template<class Bytes>
uint32_t readHeader(Bytes& bytes, const StreamForm& form, bool wide, uint64_t offset, TAVHeader& header,
                    bool& there) noexcept
{
  std::array<uint8_t, layout::kHeaderSize64> room;
  const uint64_t length = wide ? layout::kHeaderSize64 : layout::kHeaderSize32;
  uint64_t got = 0;
  const uint32_t rc = bytes.read(offset, room.data(), length, got);
  there = rc == TAV_RC_OK && got == length;
  header = {};
  if (there)
  {
    layout::decodeHeader(room.data(), wide, form.swapped, header);
    header.nodeOffset = offset;
  }
  return rc;
}

/// Where a closed group ends; the largest offset for one that is open, or whose size cannot be.
inline uint64_t endOfGroup(const TAVHeader& group) noexcept
{
  return layout::isSizeUnknown(group)
             ? ~uint64_t{0}
             : layout::addSaturated(layout::addSaturated(group.nodeOffset, layout::headerLength(group.hdrType)),
                                    layout::sizeOf(group));
}

/// From a node's start to its sibling's.
inline uint64_t lengthOfNode(const TAVHeader& node, bool aligned) noexcept
{
  uint64_t length = layout::sizeOf(node);
  if (!layout::isGroup(node))
  {
    const bool padded = aligned || (layout::infoOf(node) & TAV_INFO_ALIGNED8) != 0;
    const bool fits = !padded || layout::roundUp8Checked(length);
    length = fits && layout::hasEyeSize(node) ? layout::addSaturated(length, layout::kEyeSizeLength) : length;
  }
  return layout::addSaturated(length, layout::headerLength(node.hdrType));
}

/// The first byte that is not zero, from an offset on; the end of the bytes when there is none.
template<class Bytes>
uint32_t skipZeros(Bytes& bytes, uint64_t offset, uint64_t& found) noexcept
{
  while (true)
  {
    const uint8_t* piece = nullptr;
    uint64_t length = 0;
    const uint32_t rc = bytes.view(offset, piece, length);
    if (rc != TAV_RC_OK || length == 0)
    {
      found = offset;
      return rc;
    }
    uint64_t zeros = 0;
    while (zeros < length && piece[zeros] == 0) ++zeros;
    offset += zeros;
    if (zeros != length)
    {
      found = offset;
      return TAV_RC_OK;
    }
  }
}

/// Looks for the roots of a file's streams in one form.
template<class Bytes>
class RootSearch
{
public:
  RootSearch(Bytes& bytes, const StreamForm& form) noexcept
      : bytes_(bytes), form_(form)
  {
  }

  /// The root at `offset`, or behind the zeros that stand there. TAV_RC_NO_MORE_CHILDREN when nothing but zeros is
  /// left, TAV_RC_BAD_CHILD_HDR with the place in `root.nodeOffset` when what is there is no root.
  uint32_t next(uint64_t offset, TAVHeader& root) noexcept
  {
    bool found = false;
    uint32_t rc = look(offset, root, found);
    // Zeros, and the first bytes of a root behind them, can look like an empty one.
    if (rc != TAV_RC_OK || (found && layout::sizeOf(root) != 0))
    {
      return rc;
    }
    uint64_t first = offset;
    rc = skipZeros(bytes_, offset, first);
    if (rc != TAV_RC_OK)
    {
      return rc;
    }
    const uint8_t* rest = nullptr;
    uint64_t length = 0;
    rc = bytes_.view(first, rest, length);
    if (rc != TAV_RC_OK || length == 0)
    {
      return rc != TAV_RC_OK ? rc : TAV_RC_NO_MORE_CHILDREN;
    }
    return behindZeros(offset, first, root);
  }

  /// Whether the first child of a group, where there is one, can be a node of it. In a group that is cut off it may
  /// end anywhere.
  uint32_t hasFittingChild(const TAVHeader& group, bool& fits) noexcept
  {
    const uint64_t start = group.nodeOffset + layout::headerLength(group.hdrType);
    const uint64_t end = endOfGroup(group);
    TAVHeader child;
    bool there = false;
    const uint32_t rc = readHeader(bytes_, form_, layout::hasChildren64(group), start, child, there);
    const bool blank = there && layout::typeOf(child) == 0;
    const uint64_t length = layout::isSizeUnknown(child) ? layout::headerLength(child.hdrType)
                                                         : lengthOfNode(child, form_.aligned);
    fits = start == end || !there || (blank && layout::isSizeUnknown(group)) ||
           (!blank && layout::addSaturated(start, length) <= end);
    return rc;
  }

private:
  static bool isRoot(const TAVHeader& header) noexcept
  {
    return layout::isGroup(header);
  }

  uint32_t look(uint64_t offset, TAVHeader& root, bool& found) noexcept
  {
    bool there = false;
    const uint32_t rc = readHeader(bytes_, form_, form_.wide, offset, root, there);
    found = there && isRoot(root);
    return rc;
  }

  /// A root may begin with zeros itself: of those places that its own leave, the last one where a root is that has
  /// a child, and behind which there is nothing, zeros, or another root. One that ends in the file is preferred.
  uint32_t behindZeros(uint64_t from, uint64_t first, TAVHeader& root) noexcept
  {
    const uint64_t length = form_.wide ? layout::kHeaderSize64 : layout::kHeaderSize32;
    for (const bool cut : {false, true})
    {
      for (uint64_t back = 0; back < length && back <= first - from; ++back)
      {
        bool found = false;
        bool inside = false;
        uint32_t rc = look(first - back, root, found);
        rc = rc == TAV_RC_OK && found ? isLikely(root, found) : rc;
        rc = rc == TAV_RC_OK && found ? endsInside(root, inside) : rc;
        found = found && inside != cut;
        if (rc != TAV_RC_OK || found)
        {
          return rc;
        }
      }
    }
    root = {};
    root.nodeOffset = first;
    return TAV_RC_BAD_CHILD_HDR;
  }

  /// Whether a root ends in the file, or is open.
  uint32_t endsInside(const TAVHeader& root, bool& inside) noexcept
  {
    const uint8_t* last = nullptr;
    uint64_t length = 1;
    const bool isOpen = layout::isSizeUnknown(root);
    const uint32_t rc = isOpen ? TAV_RC_OK : bytes_.view(endOfGroup(root) - 1, last, length);
    inside = length != 0;
    return rc;
  }

  uint32_t isLikely(const TAVHeader& root, bool& likely) noexcept
  {
    const uint32_t rc = hasFittingChild(root, likely);
    return rc != TAV_RC_OK || !likely || layout::isSizeUnknown(root) ? rc : isFollowed(endOfGroup(root), likely);
  }

  /// Whether nothing, zeros or a root that ends in the file is at an offset, or a root behind zeros.
  uint32_t isFollowed(uint64_t offset, bool& followed) noexcept
  {
    uint64_t first = offset;
    uint32_t rc = skipZeros(bytes_, offset, first);
    const uint8_t* rest = nullptr;
    uint64_t length = 0;
    rc = rc == TAV_RC_OK ? bytes_.view(first, rest, length) : rc;
    followed = rc == TAV_RC_OK && length == 0;
    const uint64_t places = lesser(layout::kHeaderSize64, first - offset + 1);
    for (uint64_t back = 0; rc == TAV_RC_OK && !followed && back < places; ++back)
    {
      TAVHeader root;
      rc = look(first - back, root, followed);
      rc = rc == TAV_RC_OK && followed ? endsInside(root, followed) : rc;
    }
    return rc;
  }

  Bytes& bytes_;
  StreamForm form_;
};

} // namespace tav::detail
