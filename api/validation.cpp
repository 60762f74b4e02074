/// Walking a subtree to see that it can be walked.
#include <array>
#include <memory>
#include <new>

#include "api/walkGuard.h"
#include "format/layout.h"
#include "kor/traceFrame.h"
#include "tav/probes.h"

using namespace tav;

namespace
{

constexpr uint64_t kContainment = 0x1;

/// Whether a child lies inside its parent. The parent's end leaves out the length of its header, so some sound streams
/// are refused: an empty last child, or the last child of a 64-bit group of type 1.
bool isContained(const TAVHeader& child, const TAVHeader& parent)
{
  uint64_t parentEnd = parent.nodeOffset;
  uint64_t childEnd = child.nodeOffset;
  return addChecked(parentEnd, sizeOf(parent)) && addChecked(childEnd, sizeOf(child)) &&
         child.nodeOffset < parentEnd && child.nodeOffset > parent.nodeOffset && childEnd <= parentEnd;
}

/// Visits every node below the group on the stack, depth first.
uint32_t walk(uint64_t options, TAVHandle& handle, TAVHdrStack& stack)
{
  std::array<TAVHeaderData, 2> slots{};
  size_t current = 0;
  bool descended = true;
  WalkGuard guard(stack.pEntries[0]);
  for (;;)
  {
    TAVHeader* const parent = stack.top();
    TAVHeader* const previous = descended ? nullptr : &slots[current ^ 1U].header;
    TAVHeaderData& child = slots[current];
    descended = false;
    uint32_t rc = tavGetNextChild(0, &handle, parent, previous, &child);
    if (rc == TAV_RC_NO_MORE_CHILDREN)
    {
      if (stack.count < 2)
      {
        return TAV_RC_OK;
      }
      rc = stack.pop(&slots[current ^ 1U].header);
    }
    else if (rc == TAV_RC_OK)
    {
      const bool contained = (options & kContainment) == 0 || isContained(child.header, *parent);
      if (!contained || !guard.visit(child.header.nodeOffset))
      {
        return TAV_RC_OUTSIDE_PARENT;
      }
      if (isGroup(child.header))
      {
        rc = stack.push(&child.header);
        descended = true;
      }
      current ^= 1U;
    }
    if (rc != TAV_RC_OK)
    {
      return rc;
    }
  }
}

} // namespace

uint32_t tavValidateHierarchy(uint64_t options, TAVHandle* handle, TAVHeader* header)
{
  TraceFrame frame(probe::validateHierarchy);
  frame.dump(0, handle);
  static_cast<void>(frame.require(10, handle != nullptr, TAV_RC_BAD_PARAM) &&
                    frame.require(20, header != nullptr, TAV_RC_BAD_PARAM) &&
                    frame.require(30, (options & kContainment) == 0, TAV_RC_BAD_PARAM) &&
                    frame.step(40, tavValidateSubtreeInt(options, handle, header)));
  return frame.code();
}

uint32_t tavValidateSubtreeInt(uint64_t options, TAVHandle* handle, TAVHeader* header)
{
  TraceFrame frame(probe::validateSubtree);
  frame.dump(0, options, handle, trace::record(header));
  if (!frame.require(10, handle != nullptr, TAV_RC_BAD_PARAM) ||
      !frame.require(20, header != nullptr, TAV_RC_BAD_PARAM))
  {
    return frame.code();
  }
  const std::unique_ptr<TAVHdrStack> stack(new (std::nothrow) TAVHdrStack);
  static_cast<void>(frame.require(30, stack != nullptr, TAV_RC_NO_HDR_STACK) && frame.step(40, stack->push(header)) &&
                    frame.step(50, walk(options, *handle, *stack)));
  const uint32_t result = frame.code();
  frame.dump(100, result);
  return frame.code();
}
