/// Finding the next eye catcher.
#include <algorithm>
#include <array>

#include "api/fetchBytes.h"
#include "api/rawWrite.h"
#include "format/eyeMatcher.h"
#include "format/layout.h"
#include "tav/probes.h"
#include "trace/traceFrame.h"

using namespace tav;
using namespace tav::inside;

namespace
{

/// The bytes at hand, and how far the scan has come in them.
struct Span
{
  const uint8_t* bytes = nullptr;
  uint64_t offset = 0; ///< stream offset of the first byte
  uint64_t length = 0;
  uint64_t at = 0;
};

uint32_t fetchSpan(TAVHandle& handle, uint64_t offset, uint64_t wanted, Span& span)
{
  TAVCBUserArea area{};
  const uint32_t rc = handle.pCircularBuf->getChunk(offset, wanted, &area, false, false);
  if (rc == TAV_RC_OK)
  {
    span = {area.pChunk, offset, area.chunkLength, 0};
  }
  return rc;
}

uint32_t firstSpan(TAVHandle& handle, uint64_t start, uint64_t wanted, Span& span)
{
  if (!isDirect(handle))
  {
    return handle.pCircularBuf != nullptr ? fetchSpan(handle, start, wanted, span) : TAV_RC_NO_CIRCULAR_BUF;
  }
  uint64_t relative = 0;
  if (handle.pDirectData == nullptr || !isInDirectData(handle, start, relative))
  {
    return TAV_RC_NO_MEMORY;
  }
  span = {handle.pDirectData + relative, start, handle.directDataSize - relative, 0};
  return TAV_RC_OK;
}

/// Scans up to `remaining` bytes and leaves the span behind the eye catcher.
uint32_t scanSpans(TAVHandle& handle, uint64_t remaining, Span& span, EyeMatcher& matcher)
{
  while (remaining != 0 && !matcher.found())
  {
    if (span.at == span.length)
    {
      if (isDirect(handle))
      {
        return TAV_RC_NOT_FOUND;
      }
      const uint32_t rc = fetchSpan(handle, span.offset + span.length, remaining, span);
      if (rc != TAV_RC_OK)
      {
        return rc;
      }
    }
    const uint8_t* const from = span.bytes + span.at;
    const uint8_t* const stop = matcher.scan(from, from + std::min(remaining, span.length - span.at));
    const auto scanned = static_cast<uint64_t>(stop - from);
    span.at += scanned;
    remaining -= scanned;
  }
  return matcher.found() ? TAV_RC_OK : TAV_RC_NOT_FOUND;
}

/// The word behind the eye catcher. A block that ends right behind it does not count as holding it.
uint32_t readDistance(TAVHandle& handle, const Span& span, uint64_t& distance)
{
  std::array<uint8_t, sizeof distance> bytes;
  if (span.length > span.at + bytes.size())
  {
    std::copy_n(span.bytes + span.at, bytes.size(), bytes.begin());
  }
  else if (isDirect(handle))
  {
    return TAV_RC_NO_MEMORY;
  }
  else
  {
    const uint32_t rc = fetchBytes(*handle.pCircularBuf, span.offset + span.at, bytes.data(), bytes.size());
    if (rc != TAV_RC_OK)
    {
      return rc;
    }
  }
  distance = kor::bitCast<uint64_t>(bytes);
  return TAV_RC_OK;
}

} // namespace

uint32_t tavFindEyeSizeComboInt(TAVHandle* handle, uint64_t start, uint64_t length, bool unused, uint64_t* foundOffset,
                                uint64_t* eyeSize, bool* swapped)
{
  TraceFrame frame(probe::findEyeSizeCombo);
  frame.dump(0, handle, start, length, unused, foundOffset, eyeSize, swapped);
  Span span;
  EyeMatcher matcher;
  uint64_t distance = 0;
  const uint64_t limit = length != 0 ? length : ~uint64_t{0};
  const bool found = frame.require(10, handle != nullptr, TAV_RC_BAD_PARAM) &&
                     frame.require(20, foundOffset != nullptr, TAV_RC_BAD_PARAM) &&
                     frame.require(30, eyeSize != nullptr, TAV_RC_BAD_PARAM) &&
                     frame.require(40, swapped != nullptr, TAV_RC_BAD_PARAM) &&
                     frame.step(50, firstSpan(*handle, start, limit, span)) &&
                     frame.step(60, scanSpans(*handle, limit, span, matcher)) &&
                     frame.step(70, readDistance(*handle, span, distance));
  if (foundOffset != nullptr)
  {
    *foundOffset = found ? span.offset + span.at - kEyeLength : 0;
  }
  if (eyeSize != nullptr)
  {
    *eyeSize = found && matcher.isReversed() ? kor::byteswap64(distance) : distance;
  }
  if (swapped != nullptr)
  {
    *swapped = found && matcher.isReversed();
  }
  if (found)
  {
    frame.dump(100, *foundOffset, *eyeSize, *swapped);
  }
  return frame.code();
}
