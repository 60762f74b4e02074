/// How bytes of the stream are fetched through the circular buffer, where a chunk can be shorter than asked.
#pragma once

#include <cstdint>

#include "tav/tav.h"

namespace tav::inside
{

/// Copies `length` bytes at `offset`, from as many chunks as it takes.
uint32_t fetchBytes(TAVCircularBuf& ring, uint64_t offset, uint8_t* to, uint64_t length);

/// Points `area` at `size` bytes of data at `offset`. Data that the cached range cuts off is brought into the ring
/// whole; data that the ring cannot hold, or the storage does not have, comes as a shorter chunk.
uint32_t fetchData(TAVCircularBuf& ring, uint64_t offset, uint64_t size, TAVCBUserArea& area);

/// The handle's own area: the chunk last fetched for a node's data.
inline TAVCBUserArea areaOf(const TAVHandle& handle)
{
  return {handle.curOffset, handle.pDirectData, handle.directDataSize};
}

inline void setArea(TAVHandle& handle, const TAVCBUserArea& area)
{
  handle.curOffset = area.chunkOffset;
  handle.pDirectData = area.pChunk;
  handle.directDataSize = area.chunkLength;
}

/// Whether an offset lies in the direct block, its end included. `relative` is the distance from the block's start.
inline bool isInDirectData(const TAVHandle& handle, uint64_t offset, uint64_t& relative)
{
  relative = offset - handle.curOffset;
  return offset >= handle.curOffset && relative <= handle.directDataSize;
}

} // namespace tav::inside
