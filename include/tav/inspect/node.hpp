/// @file node.hpp
/// How a stream is to be read, and one node of it as the walker found it.
#pragma once

#include <cstdint>

#include "tav/layout.hpp"

namespace tav::inspect
{

/// What nothing in a stream says and every reader has to know.
struct Form
{
  bool swapped = false; ///< the other byte order than this machine's
  bool root64 = true;   ///< the first node has a 64-bit header
  bool aligned = false; ///< payloads are padded to multiples of 8 also where no header says so
  bool extra = false;   ///< UTF-8 strings have two uncounted bytes behind them where the bytes around do not tell

  bool operator==(const Form&) const = default;
};

inline constexpr uint64_t kNoOffset = ~uint64_t{0};

/// What is remarkable about a node. Not each of them is a defect.
enum NodeFlag : uint32_t
{
  kOpen = 0x1,          ///< a group whose size is not known: it was never closed, or is ended by its end element
  kOverrun = 0x2,       ///< a group that claims more than its parent or the file has; it was cut there
  kNoPair = 0x4,        ///< announces an eye/size pair, but none is there
  kBadPair = 0x8,       ///< the bytes of its pair are there, but the eye catcher is damaged
  kBadGroupType = 0x10, ///< a 32-bit header that announces 64-bit children; they are read as 32-bit ones
  kExtra = 0x20,        ///< a UTF-8 string with two uncounted bytes behind it
  kWrongSize = 0x40,    ///< a group that was ended by its own end element before its size was used up
  kAfterDamage = 0x80   ///< the first node found behind damaged bytes: nodes may be missing before it
};

struct Node
{
  TAVHeader header{};                ///< in host order, with nodeOffset
  uint64_t depth = 0;                ///< 0: not inside any group
  uint64_t parentOffset = kNoOffset; ///< of the group around it
  uint64_t limit = 0;                ///< where its payload or its children end at the latest
  uint64_t ordinal = 0;              ///< its place among those of its id among its siblings, from 1; 0: was not counted
  uint32_t flags = 0;                ///< NodeFlag bits

  uint64_t offset() const { return header.nodeOffset; }
  bool is64() const { return layout::is64(header); }
  bool isGroup() const { return layout::isGroup(header); }
  uint16_t type() const { return layout::typeOf(header); }
  uint16_t elm() const { return layout::elmOf(header); }
  uint64_t size() const { return layout::sizeOf(header); }
  uint32_t info() const { return layout::infoOf(header); }
  uint64_t headerLength() const { return layout::headerLength(header.hdrType); }
  uint64_t payloadOffset() const { return offset() + headerLength(); }
  bool has(NodeFlag flag) const { return (flags & flag) != 0; }
};

} // namespace tav::inspect
