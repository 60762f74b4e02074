#include "api/rawWrite.h"

#include <algorithm>
#include <array>
#include <cstring>

#include "tav/probes.h"
#include "trace/traceFrame.h"

namespace tav::inside
{

uint32_t rawWrite(TAVHandle& handle, uint64_t& position, const void* bytes, uint64_t length)
{
  TraceFrame frame(probe::rawWrite);
  frame.dump(0, position, bytes, length);
  if (isDirect(handle))
  {
    if (frame.require(20, handle.pDirectData != nullptr, TAV_RC_NO_MEMORY) &&
        frame.require(30, hasRoom(handle, position, length), TAV_RC_END_OF_STORAGE))
    {
      if (length != 0)
      {
        // The bytes may lie in the block themselves.
        std::memmove(handle.pDirectData + position, bytes, static_cast<size_t>(length));
        position += length;
      }
      frame.dump(100, position);
    }
    return frame.code();
  }
  if (frame.require(10, handle.pCircularBuf != nullptr, TAV_RC_NO_CIRCULAR_BUF) &&
      (length == 0 || frame.step(40, handle.pCircularBuf->write(position, bytes, length, false))))
  {
    if (length != 0 && handle.pCircularBuf->isCached(position))
    {
      handle.pCircularBuf->markPages(position, length);
    }
    position += length;
    frame.dump(100, position);
  }
  return frame.code();
}

uint32_t writePayload(TAVHandle& handle, uint64_t& position, uint16_t type, const uint8_t* payload, uint64_t size)
{
  const SwapRule rule = typeInfo(type).swapRule;
  const uint64_t prefix = handle.swapBytes != 0 ? swappedPrefix(rule, size) : 0;
  if (prefix != 0 && isDirect(handle) && !hasRoom(handle, position, prefix))
  {
    return rawWrite(handle, position, payload, prefix); // which refuses all of it
  }
  // In pieces, so that an array of any length needs no memory of its size.
  std::array<uint8_t, 1024> piece;
  for (uint64_t done = 0; done < prefix;)
  {
    const uint64_t length = std::min<uint64_t>(prefix - done, piece.size());
    swapPayload(rule, payload + done, piece.data(), length);
    const uint32_t rc = rawWrite(handle, position, piece.data(), length);
    if (rc != TAV_RC_OK)
    {
      return rc;
    }
    done += length;
  }
  return rawWrite(handle, position, payload + prefix, size - prefix);
}

TAVHeader* openGroup(TAVHandle& handle)
{
  return handle.pHdrStack != nullptr ? handle.pHdrStack->top() : nullptr;
}

uint32_t validateChild(TAVHandle& handle, const TAVHeader& child)
{
  TraceFrame frame(probe::validateChild);
  frame.dump(0, "Validation of child node type w.r.t parent", trace::record(&child));
  const TAVHeader* const parent = openGroup(handle);
  const uint16_t governing = parent != nullptr ? typeOf(*parent) : typeOf(child);
  switch (child.hdrType)
  {
  case TAV_HDR_32:
    static_cast<void>(frame.require(10, governing == TAV_TYPE_HEADER32, TAV_RC_BAD_CHILD_HDR));
    break;
  case TAV_HDR_64:
    static_cast<void>(frame.require(20, parent != nullptr ? hasChildren64(*parent) : isGroupType(governing),
                                    TAV_RC_BAD_CHILD_HDR));
    break;
  default:
    static_cast<void>(frame.fail(30, TAV_RC_BAD_PARAM));
  }
  return frame.code();
}

} // namespace tav::inside
