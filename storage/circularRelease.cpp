/// How pages leave the ring: the page-release step.
#include "storage/cachedRun.h"
#include "storage/circularPiece.h"
#include "tav/probes.h"
#include "trace/traceFrame.h"

using namespace tav;
using namespace tav::inside;

/// The piece at an end of the cached range: the bytes of one page. Head and tail may share a page without being
/// neighbours, when the range wraps.
TAVCircularBuf::Piece TAVCircularBuf::pieceAt(bool fromTail) const
{
  const bool together = head <= tail && pageOf(head) == pageOf(tail);
  if (!fromTail)
  {
    const uint64_t end = together ? tail + 1 : (pageOf(head) + 1) * pageSize;
    return {head, headOffset, end - head, together};
  }
  const uint64_t start = together ? head : pageOf(tail) * pageSize;
  const uint64_t length = tail - start + 1;
  return {start, headOffset + cachedCount() - length, length, together};
}

/// Writes up to `pages` pages back and drops them, from the head end or from the tail end. All of them empty the ring,
/// also where its two ends share a page, which makes one piece more than there are pages.
uint32_t TAVCircularBuf::releasePages(uint64_t pages, bool fromTail)
{
  TraceFrame frame(probe::cbReleasePages);
  frame.dump(0, pages, fromTail);
  uint64_t done = 0;
  uint64_t position = 0;
  if (isEmpty())
  {
    frame.dump(100, done, cachedBytes(*this));
    return frame.code();
  }
  if (!frame.step(10, pStorage->getPosition(&position)))
  {
    return frame.code();
  }
  bool seekNeeded = position != headOffset;
  const uint64_t most = pages < pageCount ? pages : pageCount + 1;
  for (; done < most && !isEmpty(); ++done)
  {
    const Piece piece = pieceAt(fromTail);
    seekNeeded = seekNeeded || fromTail;
    const bool pending = storageWritable != 0 || pPageFlags[2 * pageOf(piece.index)] != 0;
    if (pending && !frame.step(20, writePiece(piece, seekNeeded)))
    {
      break;
    }
    seekNeeded = !pending;
    dropPiece(piece, fromTail);
  }
  if (frame.code() == TAV_RC_OK)
  {
    frame.dump(100, done, cachedBytes(*this));
  }
  return frame.code();
}

uint32_t TAVCircularBuf::writePiece(const Piece& piece, bool& seekNeeded)
{
  uint32_t rc = seekNeeded ? seekStorage(piece.offset) : TAV_RC_OK;
  if (rc != TAV_RC_OK)
  {
    return rc;
  }
  seekNeeded = false;
  uint64_t written = 0;
  rc = pStorage->write(pRing + piece.index, piece.length, &written);
  if (rc == TAV_RC_OK && written < piece.length)
  {
    rc = TAV_RC_NO_MEMORY;
  }
  if (rc == TAV_RC_OK)
  {
    pPageFlags[2 * pageOf(piece.index)] = 0;
  }
  return rc;
}

void TAVCircularBuf::dropPiece(const Piece& piece, bool fromTail)
{
  if (!fromTail)
  {
    headOffset += piece.length;
  }
  if (piece.last)
  {
    empty = 1;
    head = 0;
    tail = 0;
  }
  else if (fromTail)
  {
    tail = piece.index == 0 ? ringSize - 1 : piece.index - 1;
  }
  else
  {
    head = piece.index + piece.length == ringSize ? 0 : piece.index + piece.length;
  }
}
