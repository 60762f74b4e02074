#include "api/fetchBytes.h"

#include <algorithm>

#include "format/layout.h"

namespace tav::inside
{
namespace
{

constexpr uint64_t kMostPages = 255; // what the reposition step can be asked for

/// Begins the ring anew at the data's first byte and reads on until the data is whole or does not grow any more.
uint32_t bringWhole(TAVCircularBuf& ring, uint64_t offset, uint64_t size, TAVCBUserArea& area)
{
  const auto pages = static_cast<uint8_t>(std::min(kMostPages, unitsFor(size, ring.pageSize)));
  uint32_t rc = ring.reposition(offset, 0, pages);
  if (rc == TAV_RC_OK || rc == TAV_RC_END_OF_STORAGE)
  {
    rc = ring.getChunk(offset, size, &area, false, false);
  }
  while (rc == TAV_RC_OK && area.chunkLength < size)
  {
    const uint64_t before = area.chunkLength;
    TAVCBUserArea next{};
    const uint32_t more = ring.getChunk(offset + before, 0, &next, false, false);
    if (more != TAV_RC_OK && more != TAV_RC_END_OF_STORAGE)
    {
      return more;
    }
    rc = ring.getChunk(offset, size, &area, false, false);
    if (area.chunkLength <= before)
    {
      break;
    }
  }
  return rc;
}

} // namespace

uint32_t fetchBytes(TAVCircularBuf& ring, uint64_t offset, uint8_t* to, uint64_t length)
{
  while (length != 0)
  {
    TAVCBUserArea area{0, to, 0};
    const uint32_t rc = ring.getChunk(offset, length, &area, false, true);
    if (rc != TAV_RC_OK)
    {
      return rc;
    }
    to += area.chunkLength;
    length -= area.chunkLength;
    if (length != 0 && !addChecked(offset, area.chunkLength))
    {
      return TAV_RC_END_OF_STORAGE;
    }
  }
  return TAV_RC_OK;
}

uint32_t fetchData(TAVCircularBuf& ring, uint64_t offset, uint64_t size, TAVCBUserArea& area)
{
  if (size == 0)
  {
    area = {offset, ring.pRing, 0}; // nothing to fetch, but a value all the same
    return TAV_RC_OK;
  }
  const uint32_t rc = ring.getChunk(offset, size, &area, false, false);
  const bool cut = rc == TAV_RC_OK && area.chunkLength < size && size <= ring.ringSize;
  return cut ? bringWhole(ring, offset, size, area) : rc;
}

} // namespace tav::inside
