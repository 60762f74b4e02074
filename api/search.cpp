/// Searching an element among the children of a group.
#include <array>
#include <memory>
#include <new>

#include "api/nodeStep.h"
#include "api/search.h"

using namespace tav;
using namespace tav::inside;

namespace
{

bool matches(const Wanted& wanted, const Node& node, uint64_t depth)
{
  if (node.fields.elm != wanted.elm) [[likely]]
  {
    return false;
  }
  const bool keyMatches =
      wanted.infoKey == 0 || (node.wide && (node.fields.info & TAV_INFO_KEY_MASK) == wanted.infoKey);
  return keyMatches && depth >= uint64_t{wanted.minDepth} + 1 && depth <= uint64_t{wanted.maxDepth} + 1;
}

/// Looks through one level, from after `previous` on. A group on the way is entered by pushing it, and the caller gets
/// control back; nothing climbs out of a group again, so a failed step means that nothing was found.
uint32_t searchLevel(TAVHandle& handle, const Wanted& wanted, TAVHeader* previous, TAVHdrStack& stack,
                     TAVHeaderData& out, uint64_t& reached)
{
  std::array<TAVHeaderData, 2> nodes{};
  for (size_t current = 0;; current ^= 1U)
  {
    TAVHeaderData& node = nodes[current];
    if (tavGetNextChild(0, &handle, stack.top(), previous, &node) != TAV_RC_OK)
    {
      return TAV_RC_NOT_FOUND;
    }
    reached = node.header.nodeOffset;
    if (matches(wanted, nodeOf(node.header), stack.count))
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

/// Looks through one level of the direct block as searchLevel does. Without a stack the level is the first.
template<bool Wide>
uint32_t searchBlock(TAVHandle& handle, const Block& memory, const Level& children, const Wanted& wanted,
                     const TAVHeader* previous, TAVHdrStack* stack, TAVHeaderData& out, uint64_t& reached)
{
  const uint64_t depth = stack != nullptr ? stack->count : 1;
  const Block block = memory;
  const Level level = children;
  const uint32_t elm = wanted.elm;
  const bool shallow = depth > wanted.maxDepth;
  bool first = previous == nullptr;
  Node node = first ? Node{} : nodeOf(*previous);
  for (;; first = false)
  {
    const uint32_t rc = stepInBlock<Wide>(block, level, first, node);
    if (rc != TAV_RC_OK) [[unlikely]]
    {
      reached = first ? reached : node.offset;
      return rc == kUnusual ? kUnusual : TAV_RC_NOT_FOUND;
    }
    if (node.fields.elm == elm && matches(wanted, node, depth)) [[unlikely]]
    {
      if (!Wide)
      {
        out.header.hdr64 = {}; // of which a 32-bit header fills a half
      }
      reached = node.offset;
      return readSilently(handle, node, out) ? TAV_RC_OK : kUnusual;
    }
    if (!shallow && node.group()) [[unlikely]]
    {
      TAVHeader group{};
      toHeader(node, group);
      return stack != nullptr ? pushEntry<SilentFrame>(*stack, &group) : TAV_RC_OK;
    }
  }
}

/// The search over direct memory while tracing is off: no call leaves the library, and where the caller wants no stack
/// there is none. `kUnusual`, with the stack as it was, where an open group is on the way.
uint32_t findInBlock(TAVHandle& handle, const Wanted& wanted, const TAVHeader* parent, const TAVHeader* resume,
                     TAVHdrStack* stack, TAVHeaderData& out, uint64_t& reached)
{
  if (resume != nullptr && (stack == nullptr || stack->count == 0))
  {
    return TAV_RC_BAD_PARAM;
  }
  uint32_t rc = TAV_RC_OK;
  if (stack != nullptr)
  {
    rc = resume == nullptr ? pushEntry<SilentFrame>(*stack, parent) : TAV_RC_OK;
    if (rc != TAV_RC_OK)
    {
      return rc;
    }
    parent = topEntry<SilentFrame>(*stack);
  }
  Block block{};
  if (!blockOf(handle, block))
  {
    rc = kUnusual;
  }
  else
  {
    const Level level = levelBelow(nodeOf(*parent));
    rc = level.wide ? searchBlock<true>(handle, block, level, wanted, resume, stack, out, reached)
                    : searchBlock<false>(handle, block, level, wanted, resume, stack, out, reached);
  }
  if (rc == kUnusual && stack != nullptr && resume == nullptr)
  {
    --stack->count;
  }
  return rc;
}

/// The search with its records, and over a circular buffer.
[[gnu::noinline]] uint32_t findTraced(TAVHandle* handle, TAVHeader* parent, const Wanted& wanted, TAVHeader* resume,
                                      TAVHdrStack* stack, TAVHeaderData* out, uint64_t& reached)
{
  TraceFrame frame(probe::findElement);
  frame.dump(0, handle, trace::record(parent), wanted.minDepth, wanted.maxDepth, wanted.infoKey, wanted.elm,
             trace::record(resume), stack, out);
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
      frame.step(70, searchLevel(*handle, wanted, resume, *stack, *out, reached)))
  {
    frame.dump(100, trace::record(out));
  }
  return frame.code();
}

} // namespace

uint32_t tav::inside::findElement(TAVHandle* handle, TAVHeader* parent, const Wanted& wanted, TAVHeader* resume,
                                  TAVHdrStack* stack, TAVHeaderData* out, uint64_t& reached)
{
  const bool silent = !tracing() && handle != nullptr && isDirect(*handle) && isReadOnly(*handle) &&
                      parent != nullptr && out != nullptr;
  const uint32_t rc = silent ? findInBlock(*handle, wanted, parent, resume, stack, *out, reached) : kUnusual;
  return rc != kUnusual ? rc : findTraced(handle, parent, wanted, resume, stack, out, reached);
}

uint32_t tavFindElmInt(TAVHandle* handle, TAVHeader* parent, uint32_t minDepth, uint32_t maxDepth, uint16_t infoKey,
                       uint32_t elm, TAVHeader* resume, TAVHdrStack* stack, TAVHeaderData* out)
{
  uint64_t reached = 0;
  return findElement(handle, parent, {minDepth, maxDepth, infoKey, elm}, resume, stack, out, reached);
}
