/// The steps of the header stack, for those who walk with one of their own: the exported operations are these with
/// their trace records.
#pragma once

#include <cstdint>

#include "kor/traceFrame.h"
#include "tav/probes.h"
#include "tav/tav.h"

namespace tav::inside
{

/// Raises the stack's capacity by one increment.
uint32_t growStack(TAVHdrStack& stack);

template<class Frame>
uint32_t pushEntry(TAVHdrStack& stack, const TAVHeader* header)
{
  Frame frame(probe::hdrStackPush);
  frame.dump(0, trace::record(header), stack.count, stack.capacity);
  if (frame.require(10, header != nullptr, TAV_RC_BAD_PARAM) &&
      (stack.count < stack.capacity || frame.step(20, growStack(stack))))
  {
    stack.pEntries[stack.count++] = *header;
  }
  return frame.code();
}

template<class Frame>
TAVHeader* topEntry(TAVHdrStack& stack)
{
  const Frame frame(probe::hdrStackTop);
  TAVHeader* const entry = stack.count != 0 ? stack.pEntries + (stack.count - 1) : nullptr;
  frame.dump(0, stack.count, trace::record(entry));
  return entry;
}

template<class Frame>
uint32_t popEntry(TAVHdrStack& stack)
{
  Frame frame(probe::hdrStackPop);
  frame.dump(0, stack.count);
  if (frame.require(10, stack.count != 0, TAV_RC_NO_MEMORY))
  {
    --stack.count;
    frame.dump(100, stack.count);
  }
  return frame.code();
}

template<class Frame>
uint32_t popEntry(TAVHdrStack& stack, TAVHeader* out)
{
  Frame frame(probe::hdrStackPopCopy);
  frame.dump(0, out, stack.count);
  if (frame.require(10, out != nullptr, TAV_RC_BAD_PARAM) && frame.require(20, stack.count != 0, TAV_RC_NO_MEMORY))
  {
    *out = stack.pEntries[--stack.count];
    frame.dump(100, trace::record(out), stack.count);
  }
  return frame.code();
}

} // namespace tav::inside
