/// What tests of reading operations share: nodes looked up by offset, descriptors that show whether they were written.
#pragma once

#include <cstdint>
#include <cstring>
#include <string>

#include "support/streams.h"
#include "support/traceLog.h"
#include "tav/tav.h"

namespace test
{

/// The node at an offset, as the reader gives it.
inline TAVHeaderData nodeAt(TAVHandle* handle, uint64_t offset, bool wide = true)
{
  TAVHeaderData node{};
  check(tavReadNodeInt(0, handle, offset, wide, &node), "tavReadNodeInt");
  return node;
}

inline TAVHeader headerAt(TAVHandle* handle, uint64_t offset, bool wide = true)
{
  return nodeAt(handle, offset, wide).header;
}

/// An out argument full of a pattern that no operation writes.
struct Untouched
{
  Untouched()
  {
    std::memset(&data, 0xA5, sizeof data);
    before = bytesOf(data);
  }

  [[nodiscard]] bool isUntouched() const
  {
    return bytesOf(data) == before;
  }

  TAVHeaderData data;
  std::string before;
};

/// How many calls of a function a trace holds.
inline size_t callsOf(const TraceLog& trace, uint32_t probe)
{
  size_t calls = 0;
  for (const Step& step : trace.stepsOf(probe))
  {
    calls += step.kind == KOR_TRACE_ENTRY ? 1 : 0;
  }
  return calls;
}

} // namespace test
