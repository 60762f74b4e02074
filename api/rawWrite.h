/// How bytes reach the stream: the one step under every writing operation.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>

#include "format/layout.h"
#include "storage/cachedRun.h"
#include "tav/byteOrder.h"
#include "tav/tav.h"

namespace tav::inside
{

inline bool isDirect(const TAVHandle& handle)
{
  return (handle.options & TAV_OPT_DIRECT) != 0;
}

inline bool isReadOnly(const TAVHandle& handle)
{
  return (handle.options & TAV_OPT_READ) != 0;
}

/// Whether the direct block has room for `length` bytes at `position`, and for `more` behind them. Its last byte is
/// never used.
[[gnu::always_inline]] inline bool hasRoom(const TAVHandle& handle, uint64_t position, uint64_t length,
                                           uint64_t more = 0)
{
  uint64_t room = handle.directDataSize;
  return takeRoom(room, length) && takeRoom(room, more) && room > position;
}

/// Whether the stream is in host order and unpadded, and the options, which stand before both flags, hold no bit but
/// `option` and the first 16, in one look. What is not told apart here is no option that is known.
[[gnu::always_inline]] inline bool isPlainWith(const TAVHandle& handle, uint64_t option)
{
  static_assert(offsetof(TAVHandle, alignMode) == offsetof(TAVHandle, options) + sizeof handle.options &&
                offsetof(TAVHandle, swapBytes) == offsetof(TAVHandle, alignMode) + 1);
  constexpr size_t mode = 2; // bytes of the options that tell how the handle was opened
  constexpr uint64_t looked = kor::isLittleEndian ? ~uint64_t{0} : ~(uint64_t{0xFFFF} << (8 * mode));
  const uint64_t asked = kor::isLittleEndian ? option >> (8 * mode) : option << (8 * mode);
  uint64_t word = 0;
  std::memcpy(&word, reinterpret_cast<const uint8_t*>(&handle) + offsetof(TAVHandle, options) + mode, sizeof word);
  return (word & looked) == asked;
}

/// Whether the stream is plain and stands in directly addressed memory.
[[gnu::always_inline]] inline bool isPlainBlock(const TAVHandle& handle)
{
  return isPlainWith(handle, TAV_OPT_DIRECT);
}

/// Whether the stream is plain and read or written through a ring.
[[gnu::always_inline]] inline bool isPlainRing(const TAVHandle& handle)
{
  return isPlainWith(handle, 0) && handle.pCircularBuf != nullptr;
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

/// Whether a child may stand under the open group, or as a root where there is none. A group with a 32-bit header takes
/// no child with a 64-bit one, whatever its type says: no reader would find it.
uint32_t validateChild(TAVHandle& handle, const TAVHeader& child);

} // namespace tav::inside
