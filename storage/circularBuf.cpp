/// Construction, chunks, writes and marks of the circular buffer. How pages come and go:
/// circularFill.cpp and circularRelease.cpp.
#include <algorithm>
#include <cstring>
#include <utility>

#include "format/layout.h"
#include "storage/cachedRun.h"
#include "tav/probes.h"
#include "tav/tav.h"
#include "trace/traceFrame.h"

using namespace tav;
using namespace tav::inside;

namespace
{

// What the allocator's records name as the caller.
constexpr const char* kUnit = "tavCircularBuf";
constexpr uint32_t kMakeRingLine = 156;
constexpr uint32_t kMakeFlagsLine = 163;
constexpr uint32_t kRefusedLine = 169;
constexpr uint32_t kEndRingLine = 239;
constexpr uint32_t kEndFlagsLine = 244;
constexpr uint64_t kDefaultPageSize = 0x10000;
constexpr uint64_t kSeekHint = 1;

uint64_t pagesFor(uint64_t size, uint64_t pageSize)
{
  // Rounded down where rounding up would pass 64 bits.
  return size > ~uint64_t{0} - (pageSize - 1) ? size / pageSize : unitsFor(size, pageSize);
}

// The steps that every access asks for several times. They look at the switch of the trace once, not at every record.

template<class Frame>
bool cachesNothing(const TAVCircularBuf& ring)
{
  const Frame frame(probe::cbIsEmpty);
  frame.dump(100, ring.empty);
  return ring.empty != 0;
}

template<class Frame>
uint64_t countCached(const TAVCircularBuf& ring)
{
  const Frame frame(probe::cbCachedCount);
  const uint64_t count = cachedBytes(ring);
  frame.dump(100, count);
  return count;
}

template<class Frame>
bool findIndex(const TAVCircularBuf& ring, uint64_t offset, uint64_t& index)
{
  const Frame frame(probe::cbOffsetToIndex);
  frame.dump(0, offset);
  const bool cached = !cachesNothing<Frame>(ring) && offset >= ring.headOffset &&
                      offset - ring.headOffset < countCached<Frame>(ring);
  if (cached)
  {
    index = runAt(ring, offset).index;
  }
  frame.dump(100, cached, index);
  return cached;
}

template<class Frame>
uint64_t findPage(const TAVCircularBuf& ring, uint64_t index)
{
  const Frame frame(probe::cbPageOfIndex);
  frame.dump(0, index);
  const uint64_t page = pageOfIndex(ring, index);
  frame.dump(100, page);
  return page;
}
/// What came to the class later is where there was padding: programs that know the class without it fit.
static_assert(sizeof(TAVCircularBuf) == (sizeof(void*) == 8 ? 88 : 72));

/// The next smaller ring to try: a quarter less, and 1 page after 2 or 3.
uint64_t fewerPages(uint64_t pages)
{
  return pages / 4 != 0 ? pages - pages / 4 : 1;
}

} // namespace

TAVCircularBuf::TAVCircularBuf(TAVSideStorage* storage, uint64_t size, uint32_t* rc)
    : status(TAV_RC_OK), pRing(nullptr), ringSize(0), head(0), tail(0), headOffset(0), pageSize(0), pageCount(0),
      pPageFlags(nullptr), pStorage(storage), storageWritable(0), empty(1), writeFailure_(TAV_RC_OK)
{
  TraceFrame frame(probe::circularBuf);
  frame.dump(0, storage, size, rc);
  if (frame.require(10, storage != nullptr && storage->getStatus() == TAV_RC_OK, TAV_RC_BAD_PARAM))
  {
    storageWritable = storage->hasAttributes(TAV_ATTR_WRITABLE) ? 1 : 0;
    pageSize = storage->ioUnit != 0 ? storage->ioUnit : kDefaultPageSize;
    if (frame.require(20, roundUp8Checked(pageSize), TAV_RC_BAD_PARAM))
    {
      pageCount = pagesFor(size, pageSize);
      static_cast<void>(frame.require(30, pageCount != 0, TAV_RC_BAD_PARAM) && frame.step(40, allocate()));
    }
  }
  status = frame.code();
  if (rc != nullptr)
  {
    *rc = status;
  }
  frame.dump(100, pageSize, pageCount, ringSize);
}

/// Allocates ring and flags, with fewer and fewer pages while memory is short.
uint32_t TAVCircularBuf::allocate()
{
  for (;;)
  {
    ringSize = pageCount * pageSize;
    void* ring = nullptr;
    uint32_t rc = korMemAlloc(&ring, 0, ringSize, KOR_MEM_PLAIN, kUnit, kMakeRingLine);
    if (rc == TAV_RC_OK)
    {
      void* flags = nullptr;
      rc = korMemAlloc(&flags, 0, 2 * pageCount, KOR_MEM_PLAIN, kUnit, kMakeFlagsLine);
      if (rc == TAV_RC_OK)
      {
        pRing = static_cast<uint8_t*>(ring);
        pPageFlags = static_cast<uint8_t*>(flags);
        std::memset(pPageFlags, 0, static_cast<size_t>(2 * pageCount));
        return TAV_RC_OK;
      }
      korMemFree(&ring, 0, 0, kUnit, kRefusedLine);
    }
    if (pageCount == 1)
    {
      pageCount = 0;
      ringSize = 0;
      return rc;
    }
    pageCount = fewerPages(pageCount);
  }
}

TAVCircularBuf::~TAVCircularBuf()
{
  TraceFrame frame(probe::circularBufEnd);
  if (!isEmpty())
  {
    static_cast<void>(frame.step(10, releasePages(pageCount, false)));
  }
  storageWritable = 0;
  head = 0;
  tail = 0;
  pageSize = 0;
  pageCount = 0;
  ringSize = 0;
  if (pRing != nullptr)
  {
    void* ring = pRing;
    korMemFree(&ring, 0, 0, kUnit, kEndRingLine);
    pRing = nullptr;
  }
  if (pPageFlags != nullptr)
  {
    void* flags = pPageFlags;
    korMemFree(&flags, 0, 0, kUnit, kEndFlagsLine);
    pPageFlags = nullptr;
  }
}

uint32_t TAVCircularBuf::getChunk(uint64_t offset, uint64_t length, TAVCBUserArea* area, bool backward, bool copy)
{
  TraceFrame frame(probe::cbGetChunk);
  frame.dump(0, offset, length, area, backward, copy);
  if (!frame.require(10, area != nullptr && pRing != nullptr, TAV_RC_BAD_PARAM) ||
      !frame.require(20, !copy || area->pChunk != nullptr, TAV_RC_BAD_PARAM))
  {
    return frame.code();
  }
  uint64_t index = 0;
  if (!indexOf(offset, index))
  {
    const uint32_t filled = fill(offset, unitsFor(length, pageSize), backward, Purpose::read);
    const bool usable = filled == TAV_RC_OK || filled == TAV_RC_END_OF_STORAGE;
    if (!frame.step(30, usable ? TAV_RC_OK : filled) ||
        !frame.require(40, indexOf(offset, index), TAV_RC_END_OF_STORAGE))
    {
      return frame.code();
    }
  }
  const uint8_t* first = pRing + index;
  if (backward)
  {
    static_cast<void>(frame.step(50, cutBackward(offset, index, length, *area, first)));
  }
  else
  {
    area->chunkLength = std::min(length, runAt(*this, offset).length);
    area->chunkOffset = offset;
  }
  deliver(*area, first, copy);
  frame.dump(100, trace::record(area));
  return frame.code();
}

/// The chunk that ends at an index. Where it starts in the stream comes out of offsetOf, whose oddities stay.
uint32_t TAVCircularBuf::cutBackward(uint64_t offset, uint64_t index, uint64_t length, TAVCBUserArea& area,
                                     const uint8_t*& first) const
{
  uint64_t contiguous = index + 1;
  if (head < index)
  {
    contiguous = index - head + 1;
  }
  else if (head == index)
  {
    contiguous = 1; // what is before the first cached byte is not part of the stream
  }
  area.chunkLength = std::min(length, contiguous);
  first = pRing + (index + 1 - area.chunkLength);
  return offsetOf(offset, area.chunkOffset);
}

void TAVCircularBuf::deliver(TAVCBUserArea& area, const uint8_t* first, bool copy) const
{
  if (copy)
  {
    std::memcpy(area.pChunk, first, static_cast<size_t>(area.chunkLength));
  }
  else
  {
    area.pChunk = pRing + (first - pRing);
  }
}

uint32_t TAVCircularBuf::write(uint64_t offset, const void* data, uint64_t size, bool direct)
{
  TraceFrame frame(probe::cbWrite);
  frame.dump(0, offset, data, size, direct);
  if (!frame.require(10, storageWritable != 0, TAV_RC_NOT_SUPPORTED) ||
      !frame.require(20, data != nullptr && pRing != nullptr, TAV_RC_BAD_PARAM) ||
      !frame.require(30, size != 0, TAV_RC_BAD_PARAM))
  {
    return frame.code();
  }
  const auto* const bytes = static_cast<const uint8_t*>(data);
  const bool large = size >= ringSize - pageSize;
  uint64_t index = 0;
  bool cached = indexOf(offset, index);
  const uint64_t contiguous = runAt(*this, offset).length;
  if (!direct && !large && size > contiguous)
  {
    const uint32_t filled = fill(offset, unitsFor(size, pageSize), false, Purpose::write);
    cached = indexOf(offset, index);
    writeFailure_ = cached ? TAV_RC_OK : filled;
  }
  if (cached)
  {
    if (frame.step(40, writeCached(index, offset, bytes, size, direct)))
    {
      frame.dump(100, offset + size);
    }
    return frame.code();
  }
  const bool overlaps = !isEmpty() && offset < headOffset && headOffset - offset < size;
  if (frame.require(50, direct || large, TAV_RC_BAD_PARAM) &&
      (!(large || overlaps) || frame.step(60, releasePages(pageCount, false))) &&
      frame.step(70, writeStraight(offset, bytes, size)))
  {
    frame.dump(100, offset + size);
  }
  return frame.code();
}

/// Copies into the ring from an index on; what runs past the cached end goes straight to the storage.
uint32_t TAVCircularBuf::writeCached(uint64_t index, uint64_t offset, const uint8_t* data, uint64_t size, bool direct)
{
  uint64_t copied = 0;
  if (index > tail)
  {
    copied = std::min(size, ringSize - index);
    std::memcpy(pRing + index, data, static_cast<size_t>(copied));
    index = 0;
  }
  if (copied < size && index <= tail)
  {
    const uint64_t piece = std::min(size - copied, tail - index + 1);
    std::memcpy(pRing + index, data + copied, static_cast<size_t>(piece));
    copied += piece;
  }
  if (copied == size)
  {
    return TAV_RC_OK;
  }
  uint32_t rc = reset();
  if (rc == TAV_RC_OK)
  {
    rc = writeStraight(offset + copied, data + copied, size - copied);
    if (rc == TAV_RC_OK && !direct)
    {
      headOffset += size - copied;
    }
  }
  return rc;
}

uint32_t TAVCircularBuf::writeStraight(uint64_t offset, const uint8_t* data, uint64_t size)
{
  uint32_t rc = seekStorage(offset);
  if (rc == TAV_RC_OK)
  {
    uint64_t written = 0;
    rc = pStorage->write(data, size, &written);
    if (rc == TAV_RC_OK && written != size)
    {
      rc = TAV_RC_NO_MEMORY;
    }
  }
  return rc;
}

/// Brings the storage's cursor to an offset; a storage that is there already is left alone. One that lands
/// elsewhere must be neither read nor written there.
uint32_t TAVCircularBuf::seekStorage(uint64_t offset)
{
  uint64_t position = 0;
  uint32_t rc = pStorage->getPosition(&position);
  if (rc != TAV_RC_OK || position == offset)
  {
    return rc;
  }
  rc = pStorage->seek(offset, kSeekHint);
  if (rc == TAV_RC_OK)
  {
    rc = pStorage->getPosition(&position);
  }
  return rc != TAV_RC_OK || position == offset ? rc : TAV_RC_NO_MEMORY;
}

uint32_t TAVCircularBuf::takeWriteFailure()
{
  return std::exchange(writeFailure_, TAV_RC_OK);
}

uint32_t TAVCircularBuf::reset()
{
  TraceFrame frame(probe::cbReset);
  static_cast<void>(frame.step(10, releasePages(pageCount, false)));
  return frame.code();
}

uint32_t TAVCircularBuf::reposition(uint64_t offset, int8_t adjustment, uint8_t pages)
{
  TraceFrame frame(probe::cbReposition);
  frame.dump(0, offset, adjustment, pages);
  if (frame.step(10, pRing != nullptr ? reset() : TAV_RC_BAD_PARAM))
  {
    const uint64_t from = offset + static_cast<uint64_t>(int64_t{adjustment});
    if (frame.step(20, fill(from, pages, false, Purpose::read)))
    {
      frame.dump(100, headOffset, cachedBytes(*this));
    }
  }
  return frame.code();
}

uint32_t TAVCircularBuf::markPages(uint64_t offset, uint64_t length)
{
  TraceFrame frame(probe::cbMarkPages);
  frame.dump(0, offset, length);
  if (!frame.require(10, storageWritable != 0, TAV_RC_NOT_SUPPORTED) ||
      !frame.require(20, !isEmpty(), TAV_RC_BAD_PARAM))
  {
    return frame.code();
  }
  const uint64_t end = addSaturated(offset, length);
  uint64_t index = head;
  if (!(offset <= headOffset && headOffset <= end) && !frame.require(30, indexOf(offset, index), TAV_RC_BAD_PARAM))
  {
    return frame.code();
  }
  const uint64_t page = pageOf(index);
  const uint64_t last = indexOf(end, index) ? pageOf(index) : pageOf(tail);
  markPending(*this, page, last);
  frame.dump(100, page, last);
  return frame.code();
}

bool TAVCircularBuf::isCached(uint64_t offset) const
{
  uint64_t index = 0;
  return indexOf(offset, index);
}

uint64_t TAVCircularBuf::cachedCount() const
{
  return tracing() ? countCached<TraceFrame>(*this) : countCached<UntracedFrame>(*this);
}

bool TAVCircularBuf::isEmpty() const
{
  return tracing() ? cachesNothing<TraceFrame>(*this) : cachesNothing<UntracedFrame>(*this);
}

/// The ring index of a stream offset; false when it is not cached.
bool TAVCircularBuf::indexOf(uint64_t offset, uint64_t& index) const
{
  return tracing() ? findIndex<TraceFrame>(*this, offset, index) : findIndex<UntracedFrame>(*this, offset, index);
}

/// The mapping behind the chunkOffset of a backward chunk. It is given a stream offset where an index is meant, and
/// its comparisons are chained; readers of such chunks have always seen these values.
uint32_t TAVCircularBuf::offsetOf(uint64_t value, uint64_t& offset) const
{
  TraceFrame frame(probe::cbIndexToOffset);
  frame.dump(0, value);
  const uint64_t headReached = head <= value ? 1 : 0;
  if ((head < tail && headReached <= tail) || (head > tail && value > tail && headReached < ringSize))
  {
    offset = headOffset - head + value;
  }
  else if (head > tail && value <= tail)
  {
    offset = headOffset + ringSize - head + value;
  }
  else if (value == (head == tail ? 1U : 0U))
  {
    offset = headOffset;
  }
  else
  {
    static_cast<void>(frame.fail(10, TAV_RC_CB_STATE));
    return frame.code();
  }
  frame.dump(100, offset);
  return frame.code();
}

uint64_t TAVCircularBuf::pageOf(uint64_t index) const
{
  return tracing() ? findPage<TraceFrame>(*this, index) : findPage<UntracedFrame>(*this, index);
}
