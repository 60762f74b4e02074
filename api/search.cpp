/// Searching an element among the children of a group.
#include <array>
#include <memory>
#include <new>

#include "format/layout.h"
#include "kor/traceFrame.h"
#include "tav/probes.h"

using namespace tav;

namespace
{

/// What tavFindElmInt looks for.
struct Wanted
{
  uint32_t minDepth;
  uint32_t maxDepth;
  uint16_t infoKey;
  uint32_t elm;
};

bool matches(const Wanted& wanted, const TAVHeader& node, uint64_t depth)
{
  const bool keyMatches =
      wanted.infoKey == 0 || (is64(node) && (node.hdr64.info & TAV_INFO_KEY_MASK) == wanted.infoKey);
  return depth >= uint64_t{wanted.minDepth} + 1 && depth <= uint64_t{wanted.maxDepth} + 1 &&
         elmOf(node) == wanted.elm && keyMatches;
}

/// Looks through one level, from after `previous` on. A group on the way is entered by pushing it, and the caller gets
/// control back; nothing climbs out of a group again, so a failed step means that nothing was found.
uint32_t searchLevel(TAVHandle& handle, const Wanted& wanted, TAVHeader* previous, TAVHdrStack& stack,
                     TAVHeaderData& out)
{
  std::array<TAVHeaderData, 2> nodes{};
  for (size_t current = 0;; current ^= 1U)
  {
    TAVHeaderData& node = nodes[current];
    if (tavGetNextChild(0, &handle, stack.top(), previous, &node) != TAV_RC_OK)
    {
      return TAV_RC_NOT_FOUND;
    }
    if (matches(wanted, node.header, stack.count))
    {
      out = node;
      return TAV_RC_OK;
    }
    if (isGroup(node.header) && stack.count <= wanted.maxDepth)
    {
      return stack.push(&node.header);
    }
    previous = &node.header;
  }
}

} // namespace

uint32_t tavFindElmInt(TAVHandle* handle, TAVHeader* parent, uint32_t minDepth, uint32_t maxDepth, uint16_t infoKey,
                       uint32_t elm, TAVHeader* resume, TAVHdrStack* stack, TAVHeaderData* out)
{
  TraceFrame frame(probe::findElement);
  frame.dump(0, handle, trace::record(parent), minDepth, maxDepth, infoKey, elm, trace::record(resume), stack, out);
  if (!frame.require(10, handle != nullptr, TAV_RC_BAD_PARAM) ||
      !frame.require(20, parent != nullptr, TAV_RC_BAD_PARAM) || !frame.require(30, out != nullptr, TAV_RC_BAD_PARAM))
  {
    return frame.code();
  }
  std::unique_ptr<TAVHdrStack> temporary;
  if (stack == nullptr)
  {
    temporary.reset(new (std::nothrow) TAVHdrStack);
    stack = temporary.get();
  }
  if (frame.require(40, stack != nullptr, TAV_RC_NO_HDR_STACK) &&
      (resume == nullptr ? frame.step(50, stack->push(parent))
                         : frame.require(60, stack->count != 0, TAV_RC_BAD_PARAM)) &&
      frame.step(70, searchLevel(*handle, {minDepth, maxDepth, infoKey, elm}, resume, *stack, *out)))
  {
    frame.dump(100, trace::record(out));
  }
  return frame.code();
}
