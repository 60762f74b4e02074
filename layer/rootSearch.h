/// @file rootSearch.h
/// Where the streams in a file begin: one root behind another, with zeros between them where a page was not full.
#pragma once

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>

#include "tav/core/node.hpp"
#include "tav/cpp/form.hpp"
#include "tav/layout.hpp"

namespace tav::detail
{

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
  const core::Node node = core::nodeOf(group);
  return core::isOpen(node) ? ~uint64_t{0} : core::levelBelow(node).end;
}

/// From a node's start to its sibling's; the largest length for one whose size cannot be.
inline uint64_t lengthOfNode(const TAVHeader& node, bool aligned) noexcept
{
  uint64_t length = 0;
  return core::lengthOf(aligned, core::nodeOf(node), length) ? length : ~uint64_t{0};
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
    constexpr uint64_t most = uint64_t{64} * 1024; // then it is asked whether a hole begins here
    length = std::min(length, most);
    uint64_t zeros = 0;
    while (zeros < length && piece[zeros] == 0) ++zeros;
    offset += zeros;
    if (zeros != length)
    {
      found = offset;
      return TAV_RC_OK;
    }
    offset = bytes.zerosUntil(offset);
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
    // Zeros, and the first bytes of a root behind them, can look like an empty one, or like a large one.
    if (rc != TAV_RC_OK || (found && layout::sizeOf(root) != 0))
    {
      return rc != TAV_RC_OK ? rc : unlessBehindZeros(offset, root);
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
    const core::Level level = core::levelBelow(core::nodeOf(group));
    const uint64_t start = level.start;
    const uint64_t end = endOfGroup(group);
    TAVHeader child;
    bool there = false;
    const uint32_t rc = readHeader(bytes_, form_, level.wide, start, child, there);
    const bool blank = there && layout::typeOf(child) == 0;
    const uint64_t length = layout::isSizeUnknown(child) ? layout::headerLength(child.hdrType)
                                                         : lengthOfNode(child, form_.aligned);
    fits = start == end || !there || (blank && layout::isSizeUnknown(group)) ||
           (!blank && layout::addSaturated(start, length) <= end);
    return rc;
  }

private:
  /// How likely it is that a place is a root's, the likeliest first.
  enum class Likely : uint8_t
  {
    endsInFile, ///< or is open
    isUnnamed,  ///< as before, with the id 0: its id may be the zeros behind a root that begins before it
    endsBehind, ///< the file is cut off
    no
  };

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

  /// A root that begins with zeros may be none, but zeros and the first bytes of one: that is taken where it is likely
  /// and the other is not.
  uint32_t unlessBehindZeros(uint64_t offset, TAVHeader& root) noexcept
  {
    uint64_t first = offset;
    bool hasOther = false;
    bool found = false;
    uint32_t rc = skipZeros(bytes_, offset, first);
    rc = rc == TAV_RC_OK ? hasGroup(offset + 1, first, hasOther) : rc;
    rc = rc == TAV_RC_OK && hasOther ? isLikelyInside(root, found) : rc;
    if (rc != TAV_RC_OK || found || !hasOther)
    {
      return rc;
    }
    TAVHeader other;
    Likely likely = Likely::no;
    rc = likeliestAround(offset, first, other, likely);
    root = likely < Likely::endsBehind ? other : root;
    return rc;
  }

  /// Whether a header at one of a few offsets, the last one among them, is a group's. Mostly none is, and then nothing
  /// but a root's header was read.
  uint32_t hasGroup(uint64_t from, uint64_t last, bool& found) noexcept
  {
    uint32_t rc = TAV_RC_OK;
    for (uint64_t at = from; rc == TAV_RC_OK && !found && at <= last; ++at)
    {
      TAVHeader header;
      rc = look(at, header, found);
    }
    return rc;
  }

  uint32_t behindZeros(uint64_t from, uint64_t first, TAVHeader& root) noexcept
  {
    Likely likely = Likely::no;
    uint32_t rc = likeliestAround(from, first, root, likely);
    if (rc == TAV_RC_OK && likely == Likely::no)
    {
      root = {};
      root.nodeOffset = first;
      rc = TAV_RC_BAD_CHILD_HDR;
    }
    return rc;
  }

  /// A root may begin with zeros itself: of those places that its own leave, the likeliest one, and of several the
  /// last.
  uint32_t likeliestAround(uint64_t from, uint64_t first, TAVHeader& root, Likely& most) noexcept
  {
    const uint64_t length = form_.wide ? layout::kHeaderSize64 : layout::kHeaderSize32;
    uint32_t rc = TAV_RC_OK;
    most = Likely::no;
    for (uint64_t back = 0; rc == TAV_RC_OK && most != Likely::endsInFile && back < length && back <= first - from;
         ++back)
    {
      TAVHeader other;
      Likely likely = Likely::no;
      rc = judge(first - back, other, likely);
      if (rc == TAV_RC_OK && likely < most)
      {
        root = other;
        most = likely;
      }
    }
    return rc;
  }

  uint32_t judge(uint64_t offset, TAVHeader& root, Likely& likely) noexcept
  {
    bool found = false;
    bool inside = false;
    uint32_t rc = look(offset, root, found);
    rc = rc == TAV_RC_OK && found ? isLikely(root, found) : rc;
    rc = rc == TAV_RC_OK && found ? endsInside(root, inside) : rc;
    likely = !found                     ? Likely::no
             : !inside                  ? Likely::endsBehind
             : layout::elmOf(root) == 0 ? Likely::isUnnamed
                                        : Likely::endsInFile;
    return rc;
  }

  uint32_t isLikelyInside(const TAVHeader& root, bool& likely) noexcept
  {
    bool inside = false;
    uint32_t rc = endsInside(root, inside);
    rc = rc == TAV_RC_OK && inside ? isLikely(root, likely) : rc;
    likely = likely && inside;
    return rc;
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

  /// Whether a root has a child that fits, and behind it is nothing, zeros, or another root.
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
    const uint64_t places = std::min<uint64_t>(layout::kHeaderSize64, first - offset + 1);
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
