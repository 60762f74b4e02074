/// Where cached bytes stand in the ring: the arithmetic under every access, inlined so that a hit costs no call.
#pragma once

#include <algorithm>
#include <bit>
#include <cstdint>

#include "tav/tav.h"

namespace tav
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

/// The ring index of a stream offset; false when it is not cached.
inline bool cachedIndex(const TAVCircularBuf& ring, uint64_t offset, uint64_t& index)
{
  if (ring.empty != 0 || offset < ring.headOffset || offset - ring.headOffset >= cachedBytes(ring))
  {
    return false;
  }
  const uint64_t distance = offset - ring.headOffset;
  const uint64_t beforeWrap = ring.ringSize - ring.head;
  index = distance < beforeWrap ? ring.head + distance : distance - beforeWrap;
  return true;
}

/// The cached bytes from an index on that stand next to each other.
inline uint64_t contiguousFrom(const TAVCircularBuf& ring, uint64_t index)
{
  return index > ring.tail ? ring.ringSize - index : ring.tail - index + 1;
}

/// The place of `length` bytes that are cached next to each other; null when they are not.
inline uint8_t* cachedRun(const TAVCircularBuf& ring, uint64_t offset, uint64_t length)
{
  uint64_t index = 0;
  return cachedIndex(ring, offset, index) && length <= contiguousFrom(ring, index) ? ring.pRing + index : nullptr;
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

/// Marks a page and those behind it, around the ring's end, up to another as pending.
inline void markPending(TAVCircularBuf& ring, uint64_t page, uint64_t last)
{
  ring.pPageFlags[2 * page] = 1;
  while (page != last && last < ring.pageCount)
  {
    page = page + 1 < ring.pageCount ? page + 1 : 0;
    ring.pPageFlags[2 * page] = 1;
  }
}

/// The place of `length` bytes that are cached next to each other, for writing: marks their pages and the one of the
/// byte behind them, as a write and a mark through the ring's operations would. Null when they are not so cached.
inline uint8_t* takeCachedRun(TAVCircularBuf& ring, uint64_t offset, uint64_t length)
{
  uint64_t index = 0;
  if (!cachedIndex(ring, offset, index) || length > contiguousFrom(ring, index)) [[unlikely]]
  {
    return nullptr;
  }
  const uint64_t page = pageOfIndex(ring, index);
  const uint64_t last = ring.pageSize - 1;
  if (hasRoundPages(ring) && length <= last && (index & last) + length <= last) [[likely]]
  {
    ring.pPageFlags[2 * page] = 1; // the byte behind lies in the same page, or is not cached
    return ring.pRing + index;
  }
  uint64_t end = ring.tail;
  cachedIndex(ring, offset + length, end);
  markPending(ring, page, pageOfIndex(ring, end));
  return ring.pRing + index;
}

} // namespace tav
