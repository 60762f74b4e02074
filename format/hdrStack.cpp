#include <cstring>

#include "tav/probes.h"
#include "tav/tav.h"
#include "trace/traceFrame.h"

namespace tav::inside
{
namespace
{

constexpr uint32_t kFirstCapacity = 1000;
constexpr uint32_t kIncrement = 200;
// What the allocator's records name as the caller.
constexpr const char* kUnit = "tavHdrStack";
constexpr uint32_t kMakeLine = 67;
constexpr uint32_t kEndLine = 93;
constexpr uint32_t kGrowLine = 117;

} // namespace
} // namespace tav::inside

using namespace tav;
using namespace tav::inside;

TAVHdrStack::TAVHdrStack()
    : pEntries(nullptr), capacity(0), count(0)
{
  const TraceFrame frame(probe::hdrStack);
  void* block = nullptr;
  const uint32_t rc = _korMemAlloc(&block, 0, kFirstCapacity * sizeof(TAVHeader), KOR_MEM_RESERVED, kUnit, kMakeLine);
  if (rc == TAV_RC_OK && block != nullptr)
  {
    pEntries = static_cast<TAVHeader*>(block);
    capacity = kFirstCapacity;
  }
  frame.dump(100, capacity);
}

TAVHdrStack::~TAVHdrStack()
{
  const TraceFrame frame(probe::hdrStackEnd);
  if (pEntries != nullptr)
  {
    void* block = pEntries;
    _korMemFree(&block, 0, 0, kUnit, kEndLine);
    pEntries = nullptr;
  }
  capacity = 0;
  count = 0;
}

/// The entries stay where they are: a reserved block has room for every capacity that the allocator grants, and the
/// block asked for here only decides whether it is granted. It is released with the entries.
uint32_t TAVHdrStack::grow()
{
  TraceFrame frame(probe::hdrStackGrow);
  frame.dump(0, capacity, kIncrement);
  void* block = pEntries;
  const uint64_t bytes = (uint64_t{capacity} + kIncrement) * sizeof(TAVHeader);
  if (frame.step(10, _korMemAlloc(&block, 0, bytes, KOR_MEM_RESERVED, kUnit, kGrowLine)))
  {
    if (pEntries == nullptr)
    {
      pEntries = static_cast<TAVHeader*>(block);
    }
    else
    {
      std::memcpy(block, pEntries, capacity * sizeof(TAVHeader));
    }
    capacity += kIncrement;
    frame.dump(100, capacity);
  }
  return frame.code();
}

uint32_t TAVHdrStack::push(const TAVHeader* header)
{
  TraceFrame frame(probe::hdrStackPush);
  frame.dump(0, trace::record(header), count, capacity);
  if (frame.require(10, header != nullptr, TAV_RC_BAD_PARAM) && (count < capacity || frame.step(20, grow())))
  {
    pEntries[count++] = *header;
  }
  return frame.code();
}

TAVHeader* TAVHdrStack::top()
{
  const TraceFrame frame(probe::hdrStackTop);
  TAVHeader* const entry = count != 0 ? pEntries + (count - 1) : nullptr;
  frame.dump(0, count, trace::record(entry));
  return entry;
}

uint32_t TAVHdrStack::pop()
{
  TraceFrame frame(probe::hdrStackPop);
  frame.dump(0, count);
  if (frame.require(10, count != 0, TAV_RC_NO_MEMORY))
  {
    --count;
    frame.dump(100, count);
  }
  return frame.code();
}

uint32_t TAVHdrStack::pop(TAVHeader* out)
{
  TraceFrame frame(probe::hdrStackPopCopy);
  frame.dump(0, out, count);
  if (frame.require(10, out != nullptr, TAV_RC_BAD_PARAM) && frame.require(20, count != 0, TAV_RC_NO_MEMORY))
  {
    *out = pEntries[--count];
    frame.dump(100, trace::record(out), count);
  }
  return frame.code();
}
