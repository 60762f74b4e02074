/// The step to a group's first child or to a node's sibling, and reading the node that is there. The operations
/// find the place with their trace frame; their fast way finds it with one that has no records.
#pragma once

#include <cstdint>

#include "core/bytes.h"
#include "core/fastWay.h"
#include "core/node.h"

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

/// Where the next child of a level starts: the first, or the one after `reference`.
template<class Frame, class AnyNode>
[[gnu::always_inline]] inline bool findPlace(Frame& frame, bool alignAll, const Level& level, bool first,
                                             const AnyNode& reference, uint64_t& start)
{
  start = level.start;
  bool fits = level.fits;
  return (first || findSibling(frame, alignAll, reference, level, start, fits)) &&
         frame.require(110, fits && start <= level.end, TAV_RC_OUTSIDE_PARENT) &&
         frame.require(120, start != level.end, TAV_RC_NO_MORE_CHILDREN);
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

/// The step of a walk, from node to node.
template<bool Wide, class Bytes>
[[gnu::always_inline]] inline uint32_t step(const Bytes& bytes, const Level& level, bool first, Node& node,
                                            Place& place)
{
  if (!first && node.is64 != Wide) [[unlikely]]
  {
    return kNotHere;
  }
  Node before = node;
  before.is64 = Wide; // which the compiler knows from here on
  const uint32_t rc = findNext<Wide>(bytes, level, first, before, place);
  if (rc == TAV_RC_OK) [[likely]]
  {
    node = {place.offset, decodeFields(place.header, Wide, bytes.form.swap), Wide};
  }
  return rc;
}

/// Fills a descriptor with the node whose header begins at `bytes`.
template<bool Wide>
[[gnu::always_inline]] inline void describe(const uint8_t* bytes, bool swap, uint64_t offset, uint8_t* data,
                                            uint64_t room, TAVHeaderData& out)
{
  TAVHeader& header = out.header;
  copyHeader<Wide>(header, bytes);
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
    describe<Wide>(place.header, bytes.form.swap, place.offset, nullptr, 0, out);
    return TAV_RC_OK;
  }
  constexpr uint64_t length = lengthOfHeader(Wide);
  const uint64_t room = Bytes::take(handle, place, length, node.size());
  describe<Wide>(place.header, bytes.form.swap, place.offset, place.header + length, room, out);
  return TAV_RC_OK;
}

/// The fast way of reading the node at an offset.
template<bool Wide, class Bytes>
[[gnu::always_inline]] inline uint32_t readNode(const Bytes& bytes, TAVHandle& handle, uint64_t offset,
                                                TAVHeaderData& out)
{
  Place place = bytes.nowhere();
  return findNode<Wide>(bytes, offset, place) ? handOut<Wide>(bytes, handle, place, out) : kNotHere;
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
  Place place = bytes.nowhere();
  const uint32_t rc = First ? findNext<Wide>(bytes, level, true, Node{}, place)
                            : findNext<Wide>(bytes, level, false, NodeAt<Wide>{*before}, place);
  return rc == TAV_RC_OK ? handOut<Wide>(bytes, handle, place, out) : rc;
}

} // namespace tav::core
