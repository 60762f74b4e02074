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

namespace tav::inside
{

using core::isDirect;
using core::isReadOnly;

/// Whether the direct block has room for bytes.
inline bool hasRoom(const TAVHandle& handle, uint64_t position, uint64_t length, uint64_t more = 0)
{
  return core::hasRoom(handle.directDataSize, position, length, more);
}

/// Writes a run of bytes at `position`, which moves past it on success. No bytes need a place all the same, but
/// nothing is written: the circular buffer refuses a run of none.
uint32_t rawWrite(TAVHandle& handle, uint64_t& position, const void* bytes, uint64_t length);

/// Writes the payload of a data element in the stream's byte order at `position`, which moves past what was written.
uint32_t writePayload(TAVHandle& handle, uint64_t& position, uint16_t type, const uint8_t* payload, uint64_t size);

/// The innermost open group; null when there is none or the handle keeps none.
TAVHeader* openGroup(TAVHandle& handle);

/// Whether a child may stand under the open group, or as a root where there is none. A group with a 32-bit header takes
/// no child with a 64-bit one, whatever its type says: no reader would find it.
uint32_t validateChild(TAVHandle& handle, const TAVHeader& child);

} // namespace tav::inside
