/// The steps of every walk: reading the node at an offset, and finding where the next one starts. The exported
/// operations are these with their trace records; walks inside the library inline them.
///
/// They are inlined by force: a node or a level handed over in memory would be stored field by field and loaded whole,
/// which waits until the stores have left the store buffer.
///
/// While tracing is off a call takes the silent steps, which know the usual cases only and leave nothing behind: what
/// is unusual is taken again, by the step that tells of everything it does.
#pragma once

#include <algorithm>
#include <array>
#include <cstdint>

#include "api/fetch.h"
#include "api/rawWrite.h"
#include "format/hdrStack.h"
#include "format/layout.h"
#include "kor/shared.h"
#include "kor/traceFrame.h"
#include "storage/cachedRun.h"
#include "tav/probes.h"
#include "tav/tav.h"

namespace tav::inside
{

/// Never leaves the library: a silent step met something unusual.
inline constexpr uint32_t kUnusual = ~uint32_t{0};

/// Whether an exported step may be a silent one, in one look: it has no options, and tracing was never on. Where it was
/// once, isSilentCall tells.
[[gnu::always_inline]] inline bool isUsualCall(uint64_t options)
{
  return (reinterpret_cast<uintptr_t>(kor::loadRelaxed(g_pWTCB)) | options) == 0;
}

inline bool isSilentCall(uint64_t options)
{
  return options == 0 && !tracing();
}

/// TAV_RC_OK as a value of its own. The compiler would return some field that was found to be 0 instead, and keep it in
/// a register that has to be saved before.
[[gnu::always_inline]] inline uint32_t okAnew()
{
  uint32_t rc = TAV_RC_OK;
#if defined(__GNUC__)
  __asm__(""
          : "+r"(rc));
#endif
  return rc;
}

/// What a walk knows of a node, in registers where a TAVHeader would live in memory.
struct Node
{
  uint64_t offset;
  HeaderFields fields;
  bool wide;

  [[nodiscard]] bool group() const { return isGroupType(fields.type); }
  [[nodiscard]] bool sizeUnknown() const { return fields.size == (wide ? TAV_SIZE_UNKNOWN : kSizeUnknown32); }
  [[nodiscard]] uint64_t length() const { return wide ? kHeaderSize64 : kHeaderSize32; }
};

/// For a header of a form that is known.
template<bool Wide>
[[gnu::always_inline]] inline Node nodeOf(const TAVHeader& header)
{
  return {header.nodeOffset, fieldsOf<Wide>(header), Wide};
}

[[gnu::always_inline]] inline Node nodeOf(const TAVHeader& header)
{
  return is64(header) ? nodeOf<true>(header) : nodeOf<false>(header);
}

[[gnu::always_inline]] inline void toHeader(const Node& node, TAVHeader& header)
{
  setHeader(node.fields, node.wide, header);
  header.nodeOffset = node.offset;
}

/// @name Reading the node at an offset
/// @{

/// Where a node's data is: its first byte, and how many bytes are at hand there.
struct DataPlace
{
  uint8_t* start;
  uint64_t room;
};

/// A handle's direct block as the inner walks see it: what a step needs, in registers.
struct Block
{
  uint8_t* base;
  uint64_t size;
  bool swap;
  bool alignAll;
};

/// False when the handle has none, or one that does not begin with the stream, which walks rarely see.
[[gnu::always_inline]] inline bool blockOf(const TAVHandle& handle, Block& block)
{
  block = {handle.pDirectData, handle.directDataSize, handle.swapBytes != 0, handle.alignMode == 1};
  return isDirect(handle) && handle.pDirectData != nullptr && handle.curOffset == 0;
}

/// Reads the header at a node's offset; false when it does not lie in the block.
[[gnu::always_inline]] inline bool readHeader(const Block& block, Node& node, DataPlace& data)
{
  const uint64_t length = node.length();
  const uint64_t left = block.size - node.offset;
  if (node.offset > block.size || left < length) [[unlikely]]
  {
    return false;
  }
  uint8_t* const bytes = block.base + node.offset;
  node.fields = decodeFields(bytes, node.wide, block.swap);
  data = {bytes + length, left - length};
  return true;
}

/// Over direct memory a 32-bit header of type 2 counts as a data element.
inline bool hasDirectData(const Node& node)
{
  return node.wide ? !node.group() : node.fields.type != TAV_TYPE_HEADER32;
}

/// Reads the header at a node's offset in the ring; false when the node is not cached next to each other, or is too
/// unusual to be handed out from here.
[[gnu::always_inline]] inline bool readCachedHeader(const TAVHandle& handle, Node& node, DataPlace& data)
{
  const TAVCircularBuf& ring = *handle.pCircularBuf;
  const uint64_t length = node.length();
  const auto [index, run] = runAt(ring, node.offset);
  if (run < length) [[unlikely]]
  {
    return false;
  }
  node.fields = decodeFields(ring.pRing + index, node.wide, handle.swapBytes != 0);
  data = {ring.pRing + index + length, node.fields.size};
  return node.group() || (node.fields.size != 0 && node.fields.size <= run - length);
}

/// Hands a node out whose header stands before its data.
[[gnu::always_inline]] inline void handOut(const Node& node, const DataPlace& data, bool hasData, bool swap,
                                           TAVHeaderData& out)
{
  decodeHeader(data.start - node.length(), node.wide, swap, out.header);
  out.header.nodeOffset = node.offset;
  out.pDataBuf = hasData ? data.start : nullptr;
  out.dataBufSize = hasData ? data.room : 0;
  out.dataBufOffset = 0;
}

/// Reads the node at its offset when tracing is off and nothing is unusual about it; else false, with nothing done.
[[gnu::always_inline]] inline bool readSilently(TAVHandle& handle, Node& node, TAVHeaderData& out)
{
  DataPlace data{};
  if (isDirect(handle)) [[likely]]
  {
    Block block{};
    if (!blockOf(handle, block) || !readHeader(block, node, data) || (!node.group() && node.fields.size > data.room))
        [[unlikely]]
    {
      return false;
    }
    handOut(node, data, hasDirectData(node), block.swap, out);
    return true;
  }
  if (handle.pCircularBuf == nullptr || !readCachedHeader(handle, node, data)) [[unlikely]]
  {
    return false;
  }
  handOut(node, data, !node.group(), handle.swapBytes != 0, out);
  if (!node.group())
  {
    setArea(handle, {node.offset + node.length(), data.start, data.room});
  }
  return true;
}

/// @}

/// @name Where the next node starts
/// @{

/// The places of a group's children.
struct Level
{
  uint64_t start;
  uint64_t end;
  bool wide; ///< the children have 64-bit headers
  bool fits; ///< neither offset passes 64 bits
};

/// A group's content. An open group with a 32-bit header ends at 4 GiB, one with a 64-bit header nowhere.
[[gnu::always_inline]] inline Level levelBelow(const Node& parent)
{
  const bool wide = parent.wide && parent.fields.type != TAV_TYPE_HEADER32;
  uint64_t start = parent.offset;
  const bool startFits = addChecked(start, parent.length());
  if (parent.sizeUnknown()) [[unlikely]]
  {
    return {start, parent.fields.size, wide, startFits};
  }
  uint64_t end = start;
  const bool endFits = addChecked(end, parent.fields.size);
  return {start, end, wide, startFits && endFits};
}

/// The bytes from a node's start to its sibling's. `alignAll`: every payload is padded to a multiple of 8.
[[gnu::always_inline]] inline bool lengthOf(bool alignAll, const Node& node, uint64_t& length)
{
  length = node.fields.size;
  bool fits = true;
  if (alignAll || (node.fields.info & (TAV_INFO_ALIGNED8 | TAV_INFO_EYE_SIZE)) != 0) [[unlikely]]
  {
    const bool element = !node.group();
    if (element && (alignAll || (node.fields.info & TAV_INFO_ALIGNED8) != 0))
    {
      fits = roundUp8Checked(length);
    }
    if (element && (node.fields.info & TAV_INFO_EYE_SIZE) != 0)
    {
      fits = addChecked(length, kEyeSizeLength) && fits;
    }
  }
  return addChecked(length, node.length()) && fits;
}

/// Where the sibling after a node starts; `fits` falls where that passes 64 bits.
template<class Frame>
[[gnu::always_inline]] inline bool findSibling(Frame& frame, bool alignAll, const Node& reference, const Level& level,
                                               uint64_t& start, bool& fits)
{
  if (!frame.require(70, reference.wide == level.wide, TAV_RC_BAD_PARAM) ||
      !frame.require(80, level.end > reference.offset, TAV_RC_BAD_PARAM) ||
      !frame.require(90, !isEndElement(reference.fields.elm), TAV_RC_NO_MORE_CHILDREN))
  {
    return false;
  }
  uint64_t length = 0;
  const bool lengthFits = lengthOf(alignAll, reference, length);
  start = reference.offset;
  fits = addChecked(start, length) && lengthFits && fits;
  return true;
}

/// Where the next child of a level starts: the first, or the one after `reference`.
template<class Frame>
[[gnu::always_inline]] inline bool findPlace(Frame& frame, bool alignAll, const Level& level, bool first,
                                             const Node& reference, uint64_t& start)
{
  start = level.start;
  bool fits = level.fits;
  return (first || findSibling(frame, alignAll, reference, level, start, fits)) &&
         frame.require(110, fits && start <= level.end, TAV_RC_OUTSIDE_PARENT) &&
         frame.require(120, start != level.end, TAV_RC_NO_MORE_CHILDREN);
}

/// @}

/// @name Walking the direct block
/// @{

/// Steps from a node to its sibling, or to the first child, with the codes of tavGetNextChild and without its records.
/// `kUnusual` after an open group, where the node stays what it is: its sibling is found by calls that leave records.
/// The level's children have 64-bit headers if `Wide`.
template<bool Wide>
[[gnu::always_inline]] inline uint32_t stepInBlock(const Block& block, const Level& level, bool first, Node& node)
{
  if (!first)
  {
    if (node.wide != Wide) [[unlikely]]
    {
      return kUnusual;
    }
    node.wide = Wide; // which the compiler knows from here on
    if (node.sizeUnknown()) [[unlikely]]
    {
      return kUnusual;
    }
  }
  SilentFrame frame(probe::getNextChild);
  uint64_t start = 0;
  if (!findPlace(frame, block.alignAll, level, first, node, start)) [[unlikely]]
  {
    return frame.code();
  }
  Node next{start, {}, Wide};
  DataPlace data{};
  if (!readHeader(block, next, data)) [[unlikely]]
  {
    return TAV_RC_NO_MEMORY;
  }
  node.offset = start;
  node.fields.size = next.fields.size;
  node.fields.info = next.fields.info;
  node.fields.type = next.fields.type;
  node.fields.elm = next.fields.elm;
  node.wide = Wide;
  return !node.group() && node.fields.size > data.room ? TAV_RC_DATA_TOO_LARGE : TAV_RC_OK;
}

/// The same for a level of either form.
inline uint32_t stepInBlock(const TAVHandle& handle, const Level& level, bool first, Node& node)
{
  Block block{};
  if (!blockOf(handle, block)) [[unlikely]]
  {
    return kUnusual;
  }
  return level.wide ? stepInBlock<true>(block, level, first, node) : stepInBlock<false>(block, level, first, node);
}

/// @}

} // namespace tav::inside
