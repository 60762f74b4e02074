#include <cstring>

#include "format/hdrStack.h"

namespace tav::inside
{
namespace
{

constexpr uint32_t kFirstCapacity = 1000;
constexpr uint32_t kIncrement = 200;
constexpr const char* kUnit = "tavHdrStack";

} // namespace
} // namespace tav::inside

using namespace tav;
using namespace tav::inside;

TAVHdrStack::TAVHdrStack()
    : pEntries(nullptr), capacity(0), count(0)
{
  const TraceFrame frame(probe::hdrStack);
  void* block = nullptr;
  const uint32_t rc = _korMemAlloc(&block, 0, kFirstCapacity * sizeof(TAVHeader), KOR_MEM_RESERVED, kUnit, 67);
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
    _korMemFree(&block, 0, 0, kUnit, 93);
    pEntries = nullptr;
  }
  capacity = 0;
  count = 0;
}

/// The entries stay where they are: a reserved block has room for every capacity that the allocator grants, and the
/// block asked for here only decides whether it is granted. It is released with the entries.
uint32_t tav::inside::growStack(TAVHdrStack& stack)
{
  TraceFrame frame(probe::hdrStackGrow);
  frame.dump(0, stack.capacity, kIncrement);
  void* block = stack.pEntries;
  const uint64_t bytes = (uint64_t{stack.capacity} + kIncrement) * sizeof(TAVHeader);
  if (frame.step(10, _korMemAlloc(&block, 0, bytes, KOR_MEM_RESERVED, kUnit, 117)))
  {
    if (stack.pEntries == nullptr)
    {
      stack.pEntries = static_cast<TAVHeader*>(block);
    }
    else
    {
      std::memcpy(block, stack.pEntries, stack.capacity * sizeof(TAVHeader));
    }
    stack.capacity += kIncrement;
    frame.dump(100, stack.capacity);
  }
  return frame.code();
}

uint32_t TAVHdrStack::grow()
{
  return growStack(*this);
}

uint32_t TAVHdrStack::push(const TAVHeader* header)
{
  return pushEntry<TraceFrame>(*this, header);
}

TAVHeader* TAVHdrStack::top()
{
  return topEntry<TraceFrame>(*this);
}

uint32_t TAVHdrStack::pop()
{
  return popEntry<TraceFrame>(*this);
}

uint32_t TAVHdrStack::pop(TAVHeader* out)
{
  return popEntry<TraceFrame>(*this, out);
}
