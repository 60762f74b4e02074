/// The header stack's fast way.
#pragma once

#include "tav/tav.h"

namespace tav::core
{

/// Pushes where the stack has room already; else false, with nothing done.
inline bool push(TAVHdrStack& stack, const TAVHeader& header)
{
  if (stack.count >= stack.capacity) [[unlikely]]
  {
    return false;
  }
  stack.pEntries[stack.count++] = header;
  return true;
}

} // namespace tav::core
