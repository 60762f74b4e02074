/// @file node.hpp
/// What the steps know of a node and of the level that it is on.
#pragma once

#include <cstddef>
#include <cstdint>

#include "tav/core/words.hpp"
#include "tav/layout.hpp"
#include "tav/tav.h"

namespace tav::core
{

/// A node in registers, where a TAVHeader would live in memory: one handed over there would be stored field by field
/// and loaded whole, which waits until the stores have left the store buffer. So all that takes one is inlined by
/// force.
struct Node
{
  uint64_t place;
  HeaderFields fields;
  bool is64;

  [[nodiscard]] uint64_t offset() const { return place; }
  [[nodiscard]] uint64_t size() const { return fields.size; }
  [[nodiscard]] uint32_t info() const { return fields.info; }
  [[nodiscard]] uint16_t type() const { return fields.type; }
  [[nodiscard]] uint16_t elm() const { return fields.elm; }
  [[nodiscard]] bool wide() const { return is64; }
  [[nodiscard]] bool group() const { return isGroupType(fields.type); }
};

/// A node by the caller's header, of a form that is known. Each field is loaded where it is needed, so that a step over
/// it saves no register.
template<bool Wide>
struct NodeAt
{
  const TAVHeader& header;

  [[nodiscard]] uint64_t offset() const { return header.nodeOffset; }
  [[nodiscard]] uint64_t size() const { return Wide ? header.hdr64.size : header.hdr32.size; }
  [[nodiscard]] uint32_t info() const { return Wide ? header.hdr64.info : 0; }
  [[nodiscard]] uint16_t type() const { return Wide ? header.hdr64.type : header.hdr32.type; }
  [[nodiscard]] uint16_t elm() const { return Wide ? header.hdr64.elm : header.hdr32.elm; }
  static constexpr bool wide() { return Wide; }
};

/// The same by a header in the stream.
template<bool Wide>
struct NodeIn
{
  const uint8_t* header;
  bool swap;

  [[nodiscard]] uint64_t size() const
  {
    if constexpr (Wide)
    {
      const auto word = load<uint64_t>(header + offsetof(TAVHeader64, size));
      return swap ? kor::byteswap64(word) : word;
    }
    else
    {
      const auto word = load<uint32_t>(header + offsetof(TAVHeader32, size));
      return swap ? kor::byteswap32(word) : word;
    }
  }
  [[nodiscard]] uint16_t type() const
  {
    const auto word = load<uint16_t>(header + (Wide ? offsetof(TAVHeader64, type) : offsetof(TAVHeader32, type)));
    return swap ? kor::byteswap16(word) : word;
  }
  static constexpr bool wide() { return Wide; }
};

/// The same with its place, in host order.
template<bool Wide>
struct NodeFound : NodeIn<Wide>
{
  uint64_t place;

  [[nodiscard]] uint64_t offset() const { return place; }
  [[nodiscard]] uint32_t info() const
  {
    return Wide ? load<uint32_t>(this->header + offsetof(TAVHeader64, info)) : 0;
  }
  [[nodiscard]] uint16_t elm() const
  {
    return load<uint16_t>(this->header + (Wide ? offsetof(TAVHeader64, elm) : offsetof(TAVHeader32, elm)));
  }
};

template<class AnyNode>
[[gnu::always_inline]] inline bool isOpen(const AnyNode& node)
{
  return node.size() == (node.wide() ? TAV_SIZE_UNKNOWN : kSizeUnknown32);
}

/// Whether a node is open, for the fast way: it only looks where nothing else would tell. The sums of a step are past
/// 64 bits for an open node with a 64-bit header, but the element that ends a group is asked for before them.
template<class AnyNode>
[[gnu::always_inline]] inline bool isOpenHere(const AnyNode& node)
{
  return (!node.wide() || node.elm() >= TAV_ELM_CMN_END_HDR_MARKER) && isOpen(node);
}

constexpr uint64_t lengthOfHeader(bool wide)
{
  return wide ? kHeaderSize64 : kHeaderSize32;
}

[[gnu::always_inline]] inline Node nodeOf(const TAVHeader& header)
{
  return {header.nodeOffset, fieldsOf(header), is64(header)};
}

[[gnu::always_inline]] inline void toHeader(const Node& node, TAVHeader& header)
{
  setHeader(node.fields, node.is64, header);
  header.nodeOffset = node.place;
}

/// The places of a group's children.
struct Level
{
  uint64_t start;
  uint64_t end;
  bool wide; ///< the children have 64-bit headers
  bool fits; ///< neither offset passes 64 bits
};

/// A closed group's content.
template<class AnyNode>
[[gnu::always_inline]] inline Level levelBelowClosed(const AnyNode& parent)
{
  Level level{0, ~uint64_t{0}, parent.wide() && parent.type() != TAV_TYPE_HEADER32, false};
  level.fits = addFits(parent.offset(), lengthOfHeader(parent.wide()), level.start) &&
               addFits(level.start, parent.size(), level.end);
  return level;
}

/// A group's content. An open group with a 32-bit header ends at 4 GiB, one with a 64-bit header nowhere. So does one
/// whose size passes 64 bits.
inline Level levelBelow(const Node& parent)
{
  Level level = levelBelowClosed(parent);
  if (isOpen(parent))
  {
    level.end = parent.size();
    level.fits = level.start >= parent.offset();
  }
  else if (!level.fits)
  {
    level.end = ~uint64_t{0};
  }
  return level;
}

/// Whether a sibling is right behind a node's payload.
template<class AnyNode>
[[gnu::always_inline]] inline bool isBare(const AnyNode& node)
{
  return (node.info() & (TAV_INFO_ALIGNED8 | TAV_INFO_EYE_SIZE)) == 0 && node.elm() < TAV_ELM_CMN_END_HDR_MARKER;
}

/// The bytes from a node's start to its sibling's. `alignAll`: every payload is padded to a multiple of 8.
template<class AnyNode>
[[gnu::always_inline]] inline bool lengthOf(bool alignAll, const AnyNode& node, uint64_t& length)
{
  length = node.size();
  if (alignAll || (node.info() & (TAV_INFO_ALIGNED8 | TAV_INFO_EYE_SIZE)) != 0) [[unlikely]]
  {
    const bool element = !isGroupType(node.type());
    const bool padded = alignAll || (node.info() & TAV_INFO_ALIGNED8) != 0;
    const bool pair = (node.info() & TAV_INFO_EYE_SIZE) != 0;
    if (element && ((padded && !roundUp8Checked(length)) || (pair && !addChecked(length, kEyeSizeLength))))
    {
      return false;
    }
  }
  return addFits(length, lengthOfHeader(node.wide()), length);
}

} // namespace tav::core
