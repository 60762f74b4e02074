/// Nodes of the C interface: what they keep of a node and the group around it.
#pragma once

#include <cstdint>

#include "inspect/c/reader.h"

namespace tav::inspect
{

/// A node with all that a step from it needs. The group around it has header type 0 for a root.
struct PlacedNode
{
  TAVHeader header{};
  TAVHeader parent{};
  Form form{}; ///< byte order and padding
};

/// Reads a node that came from outside; false for one that this reader has not handed out.
bool take(const tav_reader& reader, const tav_node& node, PlacedNode& placed);

/// Hands out a node, with its payload where that is at hand: null asks for it.
void give(const tav_reader& reader, const PlacedNode& placed, const uint8_t* payload, tav_node& out);

/// A data element's payload: where it lies over memory, else in the reader's window. Null when it is too large for
/// that. Throws Error when it cannot be read.
const uint8_t* payloadOf(const tav_reader& reader, const TAVHeader& node);

inline uint64_t payloadOffset(const TAVHeader& node)
{
  return layout::addSaturated(node.nodeOffset, layout::headerLength(node.hdrType));
}

} // namespace tav::inspect
