/// @file step.hpp
/// The step to a group's first child or to a node's sibling, and reading the node that is there. The operations
/// find the place with their trace frame; their fast way finds it with one that has no records.
#pragma once

#include <cstdint>

#include "tav/core/bytes.hpp"
#include "tav/core/fastWay.hpp"
#include "tav/core/node.hpp"

namespace tav::core
{

/// Where the sibling after a node starts; `fits` falls where that passes 64 bits.
template<class Frame, class AnyNode>
[[gnu::always_inline]] inline bool findSibling(Frame& frame, bool alignAll, const AnyNode& reference,
                                               const Level& level, uint64_t& start, bool& fits)
{
  // The ids that end a group are above all others. For lower ones the fast way leaves out the check at 80: where it
  // fails, the sibling does not start before the level's end either.
  const bool implied = isFast<Frame> && reference.elm() < TAV_ELM_CMN_END_HDR_MARKER;
  if (!frame.require(70, reference.wide() == level.wide, TAV_RC_BAD_PARAM) ||
      (!implied && (!frame.require(80, level.end > reference.offset(), TAV_RC_BAD_PARAM) ||
                    !frame.require(90, !isEndElement(reference.elm()), TAV_RC_NO_MORE_CHILDREN))))
  {
    return false;
  }
  uint64_t length = 0;
  if (!lengthOf(alignAll, reference, length) || !addFits(reference.offset(), length, start)) [[unlikely]]
  {
    fits = false;
  }
  return true;
}

/// Whether a place is one of a level's; `fits` is false where it passes 64 bits.
template<class Frame>
[[gnu::always_inline]] inline bool isOnLevel(Frame& frame, bool fits, uint64_t start, uint64_t end)
{
  return frame.require(110, fits && start <= end, TAV_RC_OUTSIDE_PARENT) &&
         frame.require(120, start != end, TAV_RC_NO_MORE_CHILDREN);
}

/// Where the next child of a level starts: the first, or the one after `reference`.
template<class Frame, class AnyNode>
[[gnu::always_inline]] inline bool findPlace(Frame& frame, bool alignAll, const Level& level, bool first,
                                             const AnyNode& reference, uint64_t& start)
{
  start = level.start;
  bool fits = level.fits;
  return (first || findSibling(frame, alignAll, reference, level, start, fits)) &&
         isOnLevel(frame, fits, start, level.end);
}

/// Finds a node in the bytes. One of type 0, which is neither a group nor data, is not here: most nodes pass with one
/// comparison of their type then.
template<bool Wide, class Bytes>
[[gnu::always_inline]] inline bool findNode(const Bytes& bytes, uint64_t offset, Place& place)
{
  if (!bytes.find(offset, lengthOfHeader(Wide), place)) [[unlikely]]
  {
    return false;
  }
  const NodeIn<Wide> node{place.header, bytes.form.swap};
  if (node.type() <= TAV_TYPE_HEADER64) [[unlikely]]
  {
    return node.type() != 0;
  }
  return Bytes::holds(node.size(), place);
}

/// Finds the sibling of a node, or the level's first child, in bytes whose children have 64-bit headers if `Wide`:
/// TAV_RC_OK, TAV_RC_NO_MORE_CHILDREN, or `kNotHere`. The sibling of an open group is found by its eye catcher, which
/// is not here.
template<bool Wide, class Bytes, class AnyNode>
[[gnu::always_inline]] inline uint32_t findNext(const Bytes& bytes, const Level& level, bool first,
                                                const AnyNode& reference, Place& place)
{
  if (!first && (isOpenHere(reference) || (Bytes::bare && !isBare(reference)))) [[unlikely]]
  {
    return kNotHere;
  }
  FastFrame frame;
  uint64_t start = 0;
  if (!findPlace(frame, bytes.form.alignAll, level, first, reference, start)) [[unlikely]]
  {
    return frame.code();
  }
  return findNode<Wide>(bytes, start, place) ? TAV_RC_OK : kNotHere;
}

/// Fills a descriptor with the node whose header begins at `bytes`.
template<bool Wide, class Way>
[[gnu::always_inline]] inline void describe(const uint8_t* bytes, bool swap, uint64_t offset, uint8_t* data,
                                            uint64_t room, TAVHeaderData& out)
{
  TAVHeader& header = out.header;
  Way::template copyHeader<Wide>(header, bytes);
  if (swap)
  {
    Wide ? swapFields(header.hdr64) : swapFields(header.hdr32);
  }
  header.hdrType = Wide ? TAV_HDR_64 : TAV_HDR_32;
  header.nodeOffset = offset;
  out.pDataBuf = data;
  out.dataBufSize = room;
  out.dataBufOffset = 0;
}

/// Hands out a node that was found.
template<bool Wide, class Bytes>
[[gnu::always_inline]] inline uint32_t handOut(const Bytes& bytes, TAVHandle& handle, const Place& place,
                                               TAVHeaderData& out)
{
  const NodeIn<Wide> node{place.header, bytes.form.swap};
  if (node.type() <= TAV_TYPE_HEADER64 && !Bytes::template hasData<Wide>(node.type())) [[unlikely]]
  {
    describe<Wide, typename Bytes::Way>(place.header, bytes.form.swap, place.offset, nullptr, 0, out);
    return TAV_RC_OK;
  }
  constexpr uint64_t length = lengthOfHeader(Wide);
  const uint64_t room = Bytes::take(handle, place, length, node.size());
  describe<Wide, typename Bytes::Way>(place.header, bytes.form.swap, place.offset, place.header + length, room, out);
  return TAV_RC_OK;
}

/// The fast way to the next child on a level whose nodes have 64-bit headers if `Wide`.
template<bool Wide, bool First, class Bytes>
[[gnu::always_inline]] inline uint32_t nextOnLevel(const Bytes& bytes, TAVHandle& handle, const Level& level,
                                                   const TAVHeader* before, TAVHeaderData& out)
{
  if (!First && is64(*before) != Wide) [[unlikely]]
  {
    return kNotHere;
  }
  Place place = bytes.nowhere();
  const uint32_t rc = First ? findNext<Wide>(bytes, level, true, Node{}, place)
                            : findNext<Wide>(bytes, level, false, NodeAt<Wide>{*before}, place);
  return rc == TAV_RC_OK ? handOut<Wide>(bytes, handle, place, out) : rc;
}

/// The fast way of reading the node at an offset.
template<bool Wide, class Bytes>
[[gnu::always_inline]] inline uint32_t readNode(const Bytes& bytes, TAVHandle& handle, uint64_t offset,
                                                TAVHeaderData& out)
{
  Place place = bytes.nowhere();
  return findNode<Wide>(bytes, offset, place) ? handOut<Wide>(bytes, handle, place, out) : kNotHere;
}

/// Where the sibling of a node starts, for nextElement; past every level where only a step by the node itself tells.
template<class AnyNode>
[[gnu::always_inline]] inline uint64_t behind(const AnyNode& node)
{
  uint64_t length = 0;
  uint64_t start = 0;
  const bool here =
      !isOpenHere(node) && isBare(node) && lengthOf(false, node, length) && addFits(node.offset(), length, start);
  return here ? start : ~uint64_t{0};
}

/// A level of a block in host order, whose nodes have 64-bit headers. A place on it is an address.
struct BlockLevel
{
  using Spot = uint8_t*;

  BlockLevel() = default;
  template<class Way>
  BlockLevel(const BlockOf<HostForm, Way>& block, uint64_t end)
      : base(block.base)
  {
    const bool hasAny = block.size >= kHeaderSize64;
    last = hasAny ? base + (block.size - kHeaderSize64) : base;
    const uint64_t most = hasAny ? block.size - kHeaderSize64 + 1 : 0;
    starts = base + (end < most ? end : most);
  }

  /// Where the node at an offset is looked for; past the level for an offset that is.
  [[nodiscard]] Spot at(uint64_t offset) const
  {
    return offset < static_cast<uint64_t>(starts - base) ? base + offset : starts;
  }
  [[gnu::always_inline]] bool find(Spot spot, Place& place) const
  {
    place = {static_cast<uint64_t>(spot - base), spot, static_cast<uint64_t>(last - spot)};
    return spot < starts;
  }
  static bool holds(uint64_t dataSize, const Place& place)
  {
    return dataSize <= place.room;
  }
  static uint64_t take(const Place& place, uint64_t /*dataSize*/)
  {
    return place.room;
  }

  uint8_t* base = nullptr;
  uint8_t* starts = nullptr; ///< nodes start before it
  uint8_t* last = nullptr;   ///< header of the block
};

/// The same of what a ring caches. A place is an offset.
template<class Way>
struct RingLevel
{
  using Spot = uint64_t;

  // cppcheck-suppress passedByValue ; a number
  [[gnu::always_inline]] bool find(Spot spot, Place& place) const
  {
    return spot < end && bytes.find(spot, kHeaderSize64, place);
  }
  static bool holds(uint64_t dataSize, const Place& place)
  {
    return RingOf<HostForm, Way>::holds(dataSize, place);
  }
  [[gnu::always_inline]] uint64_t take(const Place& place, uint64_t dataSize) const
  {
    return RingOf<HostForm, Way>::take(handle, place, kHeaderSize64, dataSize);
  }

  RingOf<HostForm, Way> bytes;
  TAVHandle& handle;
  uint64_t end;
};

/// The fast way from a node to its sibling on such a level, when that is a data element and ends no group: all else is
/// not here. `spot` is where it starts, as `behind` tells, and becomes the place behind it: who keeps that in a
/// register waits for no descriptor in memory. `node` is the node before, with a header of the same form, and becomes
/// the sibling.
template<class AnyLevel>
[[gnu::always_inline]] inline bool nextElement(const AnyLevel& level, typename AnyLevel::Spot& spot,
                                               TAVHeaderData& node)
{
  Place place{};
  if (!level.find(spot, place)) [[unlikely]]
  {
    return false;
  }
  const NodeFound<true> found{{place.header, false}, place.offset};
  const uint64_t size = found.size();
  if (found.type() <= TAV_TYPE_HEADER64 || !isBare(found) || !AnyLevel::holds(size, place)) [[unlikely]]
  {
    return false;
  }
  node.header.hdr64 = {size, found.info(), found.type(), found.elm()};
  node.header.hdrType = TAV_HDR_64; // as it is, but a compiler that reads it here leaves out later looks at it
  node.header.nodeOffset = place.offset;
  node.pDataBuf = place.header + kHeaderSize64;
  node.dataBufSize = level.take(place, size);
  spot += kHeaderSize64 + size; // at the most the end of the bytes
  return true;
}

/// The fast way to the next child of a group whose children have 64-bit headers if `Wide`.
template<bool Wide, bool First, class Bytes>
[[gnu::always_inline]] inline uint32_t nextChild(const Bytes& bytes, TAVHandle& handle, const TAVHeader& parent,
                                                 const TAVHeader* before, TAVHeaderData& out)
{
  const Level level = Wide ? levelBelowClosed(NodeAt<true>{parent}) : levelBelowClosed(nodeOf(parent));
  if (!level.fits || (!Wide && isOpen(nodeOf(parent))) || (!First && is64(*before) != Wide)) [[unlikely]]
  {
    return kNotHere;
  }
  return nextOnLevel<Wide, First>(bytes, handle, level, before, out);
}

} // namespace tav::core
