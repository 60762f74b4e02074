#include "storage/cachedRun.h"

namespace tav::inside
{

void markPending(TAVCircularBuf& ring, uint64_t page, uint64_t last)
{
  ring.pPageFlags[2 * page] = 1;
  while (page != last && last < ring.pageCount)
  {
    page = page + 1 < ring.pageCount ? page + 1 : 0;
    ring.pPageFlags[2 * page] = 1;
  }
}

uint8_t* takeCachedRun(TAVCircularBuf& ring, uint64_t offset, uint64_t length)
{
  if (uint8_t* const place = core::takeInPage(ring, offset, length))
  {
    return place;
  }
  const auto [index, cached] = runAt(ring, offset);
  if (length > cached)
  {
    return nullptr;
  }
  const CachedRun behind = runAt(ring, offset + length);
  markPending(ring, pageOfIndex(ring, index), pageOfIndex(ring, behind.length != 0 ? behind.index : ring.tail));
  return ring.pRing + index;
}

} // namespace tav::inside
