/// How bytes reach the stream: the one step under every writing operation.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>

#include "core/bytes.h"
#include "format/layout.h"
#include "storage/cachedRun.h"
#include "tav/byteOrder.h"
#include "tav/tav.h"

namespace tav
{

using core::isDirect;
using core::isReadOnly;

/// Whether the direct block has room for `length` bytes at `position`, and for `more` behind them. Its last byte is
/// never used.
[[gnu::always_inline]] inline bool hasRoom(const TAVHandle& handle, uint64_t position, uint64_t length,
                                           uint64_t more = 0)
{
  uint64_t room = handle.directDataSize;
  return takeRoom(room, length) && takeRoom(room, more) && room > position;
}

/// Whether the stream is plain and stands in directly addressed memory.
[[gnu::always_inline]] inline bool isPlainBlock(const TAVHandle& handle)
{
  return core::isHostWith(handle, TAV_OPT_DIRECT);
}

/// Whether the stream is plain and read or written through a ring.
[[gnu::always_inline]] inline bool isPlainRing(const TAVHandle& handle)
{
  return core::isHostWith(handle, 0) && handle.pCircularBuf != nullptr;
}

/// Where `length` bytes at `position` can be written in place: in the block, or in bytes that the ring caches next to
/// each other, of which the pages are marked then. Null where rawWrite has more to do, or to refuse.
inline uint8_t* takePlace(TAVHandle& handle, uint64_t position, uint64_t length)
{
  if (isDirect(handle)) [[likely]]
  {
    const bool fits = handle.pDirectData != nullptr && hasRoom(handle, position, length);
    return fits ? handle.pDirectData + position : nullptr;
  }
  TAVCircularBuf* const ring = handle.pCircularBuf;
  return ring != nullptr && ring->storageWritable != 0 ? takeCachedRun(*ring, position, length) : nullptr;
}

/// Writes a run of bytes at `position`, which moves past it on success. No bytes need a place all the same, but
/// nothing is written: the circular buffer refuses a run of none.
uint32_t rawWrite(TAVHandle& handle, uint64_t& position, const void* bytes, uint64_t length);

/// Writes the payload of a data element in the stream's byte order at `position`, which moves past what was written.
uint32_t writePayload(TAVHandle& handle, uint64_t& position, uint16_t type, const uint8_t* payload, uint64_t size);

/// The innermost open group; null when there is none or the handle keeps none.
TAVHeader* openGroup(TAVHandle& handle);

/// Whether a child may stand under the open group, or as a root where there is none.
uint32_t validateChild(TAVHandle& handle, const TAVHeader& child);

} // namespace tav
