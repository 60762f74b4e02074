/// Walking a subtree to see that it can be walked.
#include <array>
#include <memory>
#include <new>

#include "api/ownedHandle.h"
#include "api/rawWrite.h"
#include "api/walkGuard.h"
#include "core/plainNodes.h"
#include "core/stack.h"
#include "core/step.h"
#include "tav/probes.h"
#include "trace/traceFrame.h"

using namespace tav;
using namespace tav::inside;

namespace
{

constexpr uint64_t kContainment = 0x1;

/// Whether a child lies inside its parent. The parent's end leaves out the length of its header, so some sound streams
/// are refused: an empty last child, or the last child of a 64-bit group of type 1.
bool isContained(const core::Node& child, const core::Node& parent)
{
  uint64_t parentEnd = parent.offset();
  uint64_t childEnd = child.offset();
  return addChecked(parentEnd, parent.fields.size) && addChecked(childEnd, child.fields.size) &&
         child.offset() < parentEnd && child.offset() > parent.offset() && childEnd <= parentEnd;
}

/// A walk under way: every node below the group on the stack, depth first.
struct Walk
{
  Walk(uint64_t options, TAVHandle& reader, TAVHdrStack& groups)
      : handle(reader), stack(groups), guard(groups.pEntries[0]), containment((options & kContainment) != 0)
  {
  }

  TAVHandle& handle;
  TAVHdrStack& stack;
  WalkGuard guard;
  bool containment;
  bool descended = true; ///< the next node is the first below the top of the stack
  TAVHeader last{};      ///< else the one after this
};

/// Whether the walk may take the node that it has come to.
bool isAccepted(bool containment, WalkGuard& guard, const core::Node& child, const core::Node& parent)
{
  return (!containment || isContained(child, parent)) && guard.visit(child.offset());
}

/// Goes on through the exported steps, whose records tell of every node.
uint32_t walkTraced(Walk& walk)
{
  std::array<TAVHeaderData, 2> slots{};
  slots[1].header = walk.last;
  for (size_t current = 0;;)
  {
    TAVHeader* const parent = walk.stack.top();
    TAVHeader* const previous = walk.descended ? nullptr : &slots[current ^ 1U].header;
    TAVHeaderData& child = slots[current];
    walk.descended = false;
    uint32_t rc = tavGetNextChild(0, &walk.handle, parent, previous, &child);
    if (rc == TAV_RC_NO_MORE_CHILDREN)
    {
      if (walk.stack.count < 2)
      {
        return TAV_RC_OK;
      }
      rc = walk.stack.pop(&slots[current ^ 1U].header);
    }
    else if (rc == TAV_RC_OK)
    {
      if (!isAccepted(walk.containment, walk.guard, core::nodeOf(child.header), core::nodeOf(*parent)))
      {
        return TAV_RC_OUTSIDE_PARENT;
      }
      if (isGroup(child.header))
      {
        rc = walk.stack.push(&child.header);
        walk.descended = true;
      }
      current ^= 1U;
    }
    if (rc != TAV_RC_OK)
    {
      return rc;
    }
  }
}

/// The children of the group on top of the stack from `node` on, up to a group among them or the end of the level.
/// Everything that a step needs is kept in registers.
template<bool Wide>
uint32_t walkLevel(Walk& walk, const core::Node& parent, const core::Level& children, core::Node& node)
{
  const core::BlockBytes<core::AnyForm> bytes(walk.handle);
  const core::Level level = children;
  const bool containment = walk.containment;
  WalkGuard guard = walk.guard;
  core::Node child = node;
  uint32_t rc = TAV_RC_OK;
  bool first = walk.descended;
  const core::PlainNodes plain(walk.handle, level);
  const auto passData = [&guard](const core::BlockLevel& places, uint8_t*& spot) {
    const auto isAny = [](const auto& /*found*/) { return true; };
    const auto visit = [&guard](const auto& found) { return guard.visit(found.offset()); };
    return core::passNodes(places, spot, TAV_TYPE_HEADER64 + 1, isAny, visit);
  };
  for (;; first = false)
  {
    if (Wide && !containment)
    {
      first = !plain.behind(first, child, passData) && first;
    }
    core::Place place = bytes.nowhere();
    rc = core::step<Wide>(bytes, level, first, child, place);
    if (rc != TAV_RC_OK) [[unlikely]]
    {
      break;
    }
    if (!isAccepted(containment, guard, child, parent)) [[unlikely]]
    {
      rc = TAV_RC_OUTSIDE_PARENT;
      break;
    }
    if (child.group()) [[unlikely]]
    {
      break;
    }
  }
  walk.guard = guard;
  walk.descended = first;
  node = child;
  return rc;
}

/// The same walk over direct memory, until its end, or until a step is not here.
uint32_t walkBlock(Walk& walk)
{
  core::Node node{};
  while (core::BlockBytes<core::AnyForm>::canRead(walk.handle) && core::isFastCall(0))
  {
    const core::Node parent = core::nodeOf(walk.stack.pEntries[walk.stack.count - 1]);
    const core::Level level = core::levelBelow(parent);
    uint32_t rc = level.wide ? walkLevel<true>(walk, parent, level, node) : walkLevel<false>(walk, parent, level, node);
    if (rc == TAV_RC_OK)
    {
      TAVHeader group{};
      toHeader(node, group);
      rc = core::push(walk.stack, group) ? TAV_RC_OK : walk.stack.push(&group);
      walk.descended = true;
    }
    else if (rc == TAV_RC_NO_MORE_CHILDREN)
    {
      if (walk.stack.count < 2)
      {
        return TAV_RC_OK;
      }
      walk.last = walk.stack.pEntries[--walk.stack.count];
      walk.descended = false;
      node = core::nodeOf(walk.last);
      continue;
    }
    if (rc == core::kNotHere)
    {
      toHeader(node, walk.last);
      break;
    }
    if (rc != TAV_RC_OK)
    {
      return rc;
    }
  }
  return walkTraced(walk);
}

uint32_t walkBelow(uint64_t options, TAVHandle& handle, TAVHdrStack& stack)
{
  const OwnPairs pairs(handle);
  Walk walk(options, handle, stack);
  return isDirect(handle) && isReadOnly(handle) ? walkBlock(walk) : walkTraced(walk);
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
  std::unique_ptr<TAVHdrStack> stack(new (std::nothrow) TAVHdrStack);
  static_cast<void>(frame.require(30, stack != nullptr, TAV_RC_NO_HDR_STACK) && frame.step(40, stack->push(header)) &&
                    frame.step(50, walkBelow(options, *handle, *stack)));
  stack.reset();
  const uint32_t result = frame.code();
  frame.dump(100, result);
  return frame.code();
}
