/// How pages come into the ring: the fill step and the page-read step. How they go: circularRelease.cpp.
#include <algorithm>
#include <cstring>

#include "format/layout.h"
#include "storage/cachedRun.h"
#include "storage/circularPiece.h"
#include "tav/probes.h"
#include "trace/traceFrame.h"

using namespace tav;
using namespace tav::inside;

namespace
{

/// Whether a storage has no byte at an offset or behind.
bool endsBefore(TAVSideStorage& storage, uint64_t offset)
{
  uint64_t size = 0;
  return storage.getTotalSize(&size) == TAV_RC_OK && offset >= size;
}

} // namespace

/// How many pages to read, and on which side of the cached range.
struct TAVCircularBuf::Plan
{
  uint64_t pages;
  bool backward;
};

/// Brings pages into the ring so that the byte at `offset` is cached, if the storage has it or `purpose` makes it.
uint32_t TAVCircularBuf::fill(uint64_t offset, uint64_t pages, bool backward, Purpose purpose)
{
  TraceFrame frame(probe::cbFill);
  frame.dump(0, offset, pages, backward);
  uint64_t index = 0;
  const bool cached = indexOf(offset, index);
  const Plan plan = cached      ? planCached(index, pages, backward)
                    : isEmpty() ? startEmpty(offset, pages, backward)
                                : planUncached(offset, pages, backward);
  const bool far = !cached && plan.pages >= 2 * pageCount && pStorage->hasAttributes(TAV_ATTR_SEEK);
  if (frame.step(10, far ? jump(offset, backward, purpose) : readPages(plan.pages, plan.backward, offset, purpose)) &&
      frame.step(20, readUntilCached(offset, purpose)))
  {
    frame.dump(100, headOffset, cachedBytes(*this));
  }
  return frame.code();
}

/// An empty ring may begin anywhere. It begins at the offset, not at a multiple of the page size: an element as large
/// as the ring has to fit.
TAVCircularBuf::Plan TAVCircularBuf::startEmpty(uint64_t offset, uint64_t pages, bool backward)
{
  if (!backward)
  {
    headOffset = offset;
    return {1 + std::min(pages, pageCount - 1), false};
  }
  const uint64_t wanted = std::clamp<uint64_t>(pages, 1, pageCount);
  const uint64_t before = wanted * pageSize - 1;
  headOffset = offset > before ? offset - before : 0;
  return {wanted, false};
}

/// More pages behind (before) a cached byte, when fewer than wanted are contiguous there.
TAVCircularBuf::Plan TAVCircularBuf::planCached(uint64_t index, uint64_t pages, bool backward) const
{
  if (!backward && index <= tail && tail + 1 < ringSize)
  {
    const uint64_t there = (tail - index + pageSize) / pageSize;
    if (there < pages && there < pageCount)
    {
      return {std::min(pages, (ringSize - tail - 2 + pageSize) / pageSize), false};
    }
  }
  if (backward && head <= index && head != 0)
  {
    const uint64_t there = (index - head + pageSize) / pageSize;
    if (there < pages && there < pageCount)
    {
      return {std::min(pages, pageCount) - there, true};
    }
  }
  return {0, backward};
}

/// All pages from the cached range to the offset, and those wanted beyond it.
TAVCircularBuf::Plan TAVCircularBuf::planUncached(uint64_t offset, uint64_t pages, bool backward) const
{
  const bool before = offset < headOffset;
  const uint64_t distance = before ? headOffset - offset : offset - headOffset - cachedCount();
  const uint64_t gap = std::max<uint64_t>(1, unitsFor(distance, pageSize));
  const uint64_t beyond = before == backward ? std::min(pages, pageCount - 1) : 0;
  return {addSaturated(gap, beyond), before};
}

/// Gives up the cached range and begins anew around the offset, which is cheaper than reading all between.
uint32_t TAVCircularBuf::jump(uint64_t offset, bool backward, Purpose purpose)
{
  const uint32_t rc = releasePages(pageCount, false);
  if (rc != TAV_RC_OK)
  {
    return rc;
  }
  headOffset = offset;
  if (backward)
  {
    headOffset = offset < ringSize ? 0 : offset - ringSize + 1;
  }
  return readPages(pageCount, false, offset, purpose);
}

/// Page ends need not meet the plan's arithmetic: reads on, page by page, while that leads anywhere.
uint32_t TAVCircularBuf::readUntilCached(uint64_t offset, Purpose purpose)
{
  while (!isCached(offset))
  {
    const uint64_t headBefore = headOffset;
    const uint64_t countBefore = cachedCount();
    const uint32_t rc = readPages(1, !isEmpty() && offset < headOffset, offset, purpose);
    if (rc != TAV_RC_OK || (headOffset == headBefore && cachedCount() == countBefore))
    {
      return rc;
    }
  }
  return TAV_RC_OK;
}

/// Reads up to `pages` pages and adds them on one side; a page that the storage could not fill is the last. Pages on
/// the other side make room, but never the one that holds `offset`. That the storage has nothing behind what was asked
/// for is no failure.
uint32_t TAVCircularBuf::readPages(uint64_t pages, bool backward, uint64_t offset, Purpose purpose)
{
  TraceFrame frame(probe::cbReadPages);
  frame.dump(0, pages, backward);
  bool full = true;
  uint64_t done = 0;
  for (; full && done < pages; ++done)
  {
    const uint32_t rc = backward ? readPageBackward(offset, full) : readPageForward(offset, purpose, full);
    const bool enough = rc == TAV_RC_END_OF_STORAGE && isCached(offset);
    if (enough || !frame.step(10, rc))
    {
      break;
    }
  }
  if (frame.code() == TAV_RC_OK)
  {
    frame.dump(100, done, cachedBytes(*this));
  }
  return frame.code();
}

/// Frees a page at the other end when fewer than `needed` bytes are free. `kept`: that page holds `offset`, so it stays
/// and nothing is to be read. A page that the storage filled in part can be completed in a ring that is full otherwise.
uint32_t TAVCircularBuf::makeRoom(uint64_t needed, uint64_t offset, bool fromTail, bool& kept)
{
  if (needed <= ringSize - cachedCount())
  {
    return TAV_RC_OK;
  }
  const Piece piece = pieceAt(fromTail);
  kept = offset >= piece.offset && offset - piece.offset < piece.length;
  return kept ? TAV_RC_OK : releasePages(1, fromTail);
}

/// Where the next page read begins: behind the tail, whose page it completes, or anywhere in an empty ring.
uint64_t TAVCircularBuf::nextIndex() const
{
  return isEmpty() || tail + 1 == ringSize ? 0 : tail + 1;
}

uint32_t TAVCircularBuf::readPageForward(uint64_t offset, Purpose purpose, bool& full)
{
  bool kept = false;
  uint32_t rc = makeRoom(pageSize - nextIndex() % pageSize, offset, false, kept);
  full = rc == TAV_RC_OK && !kept;
  if (!full)
  {
    return rc;
  }
  const uint64_t index = nextIndex();
  const uint64_t room = pageSize - index % pageSize;
  uint64_t got = 0;
  bool ended = false;
  const uint64_t start = headOffset + cachedCount();
  rc = seekStorage(start);
  if (rc == TAV_RC_OK)
  {
    rc = readStorage(index, room, got, ended);
  }
  else if (purpose == Purpose::read && endsBefore(*pStorage, start))
  {
    ended = true; // a storage may refuse to seek to its end, and a file has a highest offset
    rc = TAV_RC_OK;
  }
  full = got == room;
  if (rc != TAV_RC_OK)
  {
    return rc;
  }
  if (ended && !full && purpose == Purpose::write && storageWritable != 0 && !isCached(offset))
  {
    // The stream grows here. While the byte that is written is cached there is no need: a file that ends in this page
    // would get more zeros at its end each time that the ring begins anew.
    zeroPending(index + got, room - got);
    got = room;
  }
  if (got == 0)
  {
    return ended && purpose == Purpose::read ? TAV_RC_END_OF_STORAGE : TAV_RC_OK;
  }
  tail = index + got - 1;
  empty = 0;
  return TAV_RC_OK;
}

uint32_t TAVCircularBuf::readPageBackward(uint64_t offset, bool& full)
{
  full = false;
  if (headOffset == 0)
  {
    return TAV_RC_END_OF_STORAGE;
  }
  bool kept = false;
  uint32_t rc = makeRoom(pageSize, offset, true, kept);
  if (rc != TAV_RC_OK || kept)
  {
    return rc;
  }
  const bool wasEmpty = isEmpty();
  const uint64_t length = std::min(pageSize, headOffset);
  const uint64_t start = wasEmpty ? 0 : (head >= length ? head - length : head + ringSize - length);
  rc = seekStorage(headOffset - length);
  uint64_t done = 0;
  bool ended = false;
  while (rc == TAV_RC_OK && done < length && !ended)
  {
    const uint64_t index = start + done < ringSize ? start + done : start + done - ringSize;
    uint64_t got = 0;
    rc = readStorage(index, std::min(length - done, ringSize - index), got, ended);
    done += got;
  }
  if (rc != TAV_RC_OK)
  {
    return rc;
  }
  full = done == length;
  if (!full)
  {
    if (storageWritable == 0 || wasEmpty)
    {
      return TAV_RC_END_OF_STORAGE;
    }
    zeroPending(start + done < ringSize ? start + done : start + done - ringSize, length - done);
  }
  head = start;
  headOffset -= length;
  tail = wasEmpty ? start + length - 1 : tail;
  empty = 0;
  return TAV_RC_OK;
}

/// Reads bytes at the storage's cursor into the ring. No bytes with a success is the end of the storage, too.
uint32_t TAVCircularBuf::readStorage(uint64_t index, uint64_t wanted, uint64_t& got, bool& ended)
{
  void* buffer = pRing + index;
  got = 0;
  const uint32_t rc = pStorage->read(wanted, &buffer, wanted, &got, false, false);
  got = std::min(got, wanted);
  ended = rc == TAV_RC_END_OF_STORAGE || rc == TAV_RC_END_OF_DATA || (rc == TAV_RC_OK && got == 0);
  return ended ? TAV_RC_OK : rc;
}

/// Clears bytes of the ring, which may wrap, and marks their pages as pending.
void TAVCircularBuf::zeroPending(uint64_t index, uint64_t length)
{
  while (length != 0)
  {
    const uint64_t piece = std::min(length, pageSize - index % pageSize);
    std::memset(pRing + index, 0, static_cast<size_t>(piece));
    pPageFlags[2 * pageOf(index)] = 1;
    length -= piece;
    index = index + piece < ringSize ? index + piece : 0;
  }
}
