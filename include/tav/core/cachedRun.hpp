/// @file cachedRun.hpp
/// Where cached bytes stand in the ring: the arithmetic under every access, inlined so that a hit costs no call.
#pragma once

#include <bit>
#include <cstdint>

#include "tav/tav.h"

namespace tav::core
{

/// How many bytes the ring caches.
inline uint64_t cachedBytes(const TAVCircularBuf& ring)
{
  if (ring.empty != 0)
  {
    return 0;
  }
  return ring.head <= ring.tail ? ring.tail - ring.head + 1 : ring.tail + (ring.ringSize - ring.head) + 1;
}

/// Bytes that are cached next to each other.
struct CachedRun
{
  uint64_t index; ///< of the first in the ring
  uint64_t length;
};

/// The run that begins at a stream offset, of length 0 when that is not cached.
[[gnu::always_inline]] inline CachedRun runAt(const TAVCircularBuf& ring, uint64_t offset)
{
  const uint64_t distance = offset - ring.headOffset;
  if (ring.empty != 0 || offset < ring.headOffset || distance >= ring.ringSize) [[unlikely]]
  {
    return {0, 0};
  }
  uint64_t index = ring.head + distance;
  uint64_t end = ring.tail + 1;
  if (ring.head > ring.tail) // what is cached goes around the ring's end
  {
    const bool wraps = index >= ring.ringSize;
    index = wraps ? index - ring.ringSize : index;
    end = wraps ? end : ring.ringSize;
  }
  return {index, index < end ? end - index : 0};
}

/// Whether pages begin at multiples of a power of two. std::has_single_bit counts bits, by a call where the processor's
/// instruction cannot be taken for granted.
inline bool hasRoundPages(const TAVCircularBuf& ring)
{
  return (ring.pageSize & (ring.pageSize - 1)) == 0;
}

/// The page that an index lies in. A page is nearly always a power of two, and a division costs more than all else
/// here.
inline uint64_t pageOfIndex(const TAVCircularBuf& ring, uint64_t index)
{
  return hasRoundPages(ring) ? index >> std::countr_zero(ring.pageSize) : index / ring.pageSize;
}

/// The place of `length` bytes, at least one, for writing: marks their page, as a write and a mark through the ring's
/// operations would. Null, with nothing done, unless the byte behind lies in the same page, or is not cached, and pages
/// are of a usual size.
[[gnu::always_inline]] inline uint8_t* takeInPage(TAVCircularBuf& ring, uint64_t offset, uint64_t length)
{
  const auto [index, cached] = runAt(ring, offset);
  const uint64_t last = ring.pageSize - 1;
  if (length > cached || !hasRoundPages(ring) || (index & last) + length > last) [[unlikely]]
  {
    return nullptr;
  }
  ring.pPageFlags[2 * pageOfIndex(ring, index)] = 1;
  return ring.pRing + index;
}

} // namespace tav::core
