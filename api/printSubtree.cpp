/// Printing a node and all below it.
#include <algorithm>
#include <array>
#include <memory>
#include <new>

#include "api/ownedHandle.h"
#include "api/printLeaves.h"
#include "format/layout.h"
#include "kor/lineBuffered.h"
#include "tav/probes.h"
#include "trace/traceFrame.h"

using namespace tav;
using namespace tav::inside;
using tav::inside::print::has;
using tav::inside::print::OutputBlock;

namespace
{

/// Groups that the attribute form prints with their keys, and the elements that are keys.
constexpr std::array<uint16_t, 3> kKeyedGroups{SQLM_ELM_DBASE, SQLM_ELM_NODE, TAV_ELM_CMN_HOST};
constexpr std::array<uint16_t, 3> kKeyElements{SQLM_ELM_NODE_NUMBER, SQLM_ELM_DB_NAME, TAV_ELM_CMN_HOST_NAME};

bool isAmong(const std::array<uint16_t, 3>& ids, uint16_t elm)
{
  return std::find(ids.begin(), ids.end(), elm) != ids.end();
}

/// Lets the output go on piece by piece: what the block holds goes out, and nothing is put into it any more.
void leaveBlock(TAVPrintCtx& ctx)
{
  ctx.pBlock->handOver();
  ctx.pBlock = nullptr;
}

/// Ends a node in the block. A trace that has begun may go where the output goes: then nothing is held back.
uint32_t endNode(TAVPrintCtx& ctx)
{
  OutputBlock& block = *ctx.pBlock;
  block.endNode();
  if (tracing()) [[unlikely]]
  {
    leaveBlock(ctx);
  }
  return block.stopped() ? TAV_RC_NO_MEMORY : TAV_RC_OK;
}

/// Prints parts of a node that must produce something.
uint32_t printSome(TAVPrintCtx& ctx, TAVHeaderData& node, bool open, bool body, bool close)
{
  uint64_t count = 0;
  const uint32_t rc = tavPrintNode(&ctx, &node, open, body, close, &count);
  if (rc != TAV_RC_OK)
  {
    return rc;
  }
  if (count == 0)
  {
    return TAV_RC_NO_MEMORY;
  }
  return ctx.pBlock != nullptr ? endNode(ctx) : TAV_RC_OK;
}

/// The key elements of a group, each as an attribute.
uint32_t printKeys(TAVPrintCtx& ctx, TAVHandle& handle, TAVHeader& group, ChildGuard& guard)
{
  std::array<TAVHeaderData, 2> slots{};
  TAVHeader* previous = nullptr;
  for (size_t current = 0;; current ^= 1U)
  {
    TAVHeaderData& child = slots[current];
    uint32_t rc = tavGetNextChild(0, &handle, &group, previous, &child);
    if (rc == TAV_RC_NO_MORE_CHILDREN)
    {
      return TAV_RC_OK;
    }
    if (rc == TAV_RC_OK && !guard.visit(child.header.nodeOffset))
    {
      rc = TAV_RC_OUTSIDE_PARENT;
    }
    if (rc == TAV_RC_OK && isAmong(kKeyElements, elmOf(child.header)))
    {
      rc = printSome(ctx, child, false, true, false);
    }
    if (rc != TAV_RC_OK)
    {
      return rc;
    }
    previous = &child.header;
  }
}

/// A group's opening with its keys as attributes. Its children, the keys among them, are walked afterwards all the
/// same.
uint32_t printWithKeys(TAVPrintCtx& ctx, TAVHandle& handle, TAVHeaderData& group, ChildGuard& guard)
{
  ctx.attributeForm = 1;
  uint32_t rc = printSome(ctx, group, true, false, false);
  if (rc == TAV_RC_OK)
  {
    rc = printKeys(ctx, handle, group.header, guard);
  }
  TAVHeaderData again{};
  if (rc == TAV_RC_OK)
  {
    const uint64_t width = is64(group.header) ? 0x1 : 0x2;
    rc = tavFindNodeFromIndex(width, &handle, group.header.nodeOffset, 0, &again);
  }
  if (rc == TAV_RC_OK)
  {
    rc = printSome(ctx, again, false, false, true);
  }
  ctx.attributeForm = 0;
  if (rc == TAV_RC_OK && has(ctx, TAV_PRINT_HEADERS))
  {
    rc = printSome(ctx, again, false, true, true);
  }
  return rc;
}

uint32_t printChild(TAVPrintCtx& ctx, TAVHandle& handle, TAVHeaderData& child, ChildGuard& keys)
{
  const bool group = isGroup(child.header);
  const bool keyed = group && has(ctx, TAV_PRINT_XML) && has(ctx, TAV_PRINT_ATTRIBUTES) &&
                     isAmong(kKeyedGroups, elmOf(child.header));
  return keyed ? printWithKeys(ctx, handle, child, keys) : printSome(ctx, child, true, true, !group);
}

/// Leaves the innermost group and prints its closing; `closed` receives its header.
uint32_t leaveGroup(TAVPrintCtx& ctx, TAVHdrStack& stack, TAVHeaderData& closed)
{
  closed = {};
  const uint32_t rc = stack.pop(&closed.header);
  --ctx.depth;
  return rc == TAV_RC_OK ? printSome(ctx, closed, false, false, true) : rc;
}

uint32_t enterGroup(TAVPrintCtx& ctx, TAVHdrStack& stack, const TAVHeader& group)
{
  ++ctx.depth;
  return stack.push(&group);
}

uint32_t walk(TAVPrintCtx& ctx, TAVHandle& handle, TAVHdrStack& stack)
{
  std::array<TAVHeaderData, 2> slots{};
  TAVHeader* previous = nullptr;
  TAVHeader passed{};
  WalkGuard guard(stack.pEntries[0]);
  ChildGuard keys(stack.pEntries[0]);
  const OwnPairs pairs(handle);
  for (size_t current = 0; stack.count != 0; current ^= 1U)
  {
    if (ctx.pBlock != nullptr &&
        print::printLeaves(ctx, handle, stack.pEntries[stack.count - 1], previous, guard, passed))
    {
      previous = &passed;
      if (ctx.pBlock->stopped())
      {
        return TAV_RC_NO_MEMORY;
      }
    }
    TAVHeaderData& child = slots[current];
    uint32_t rc = tavGetNextChild(0, &handle, stack.top(), previous, &child);
    previous = &child.header;
    if (rc == TAV_RC_NO_MORE_CHILDREN)
    {
      rc = leaveGroup(ctx, stack, child);
    }
    else if (rc == TAV_RC_OK)
    {
      rc = guard.visit(child.header.nodeOffset) ? printChild(ctx, handle, child, keys) : TAV_RC_OUTSIDE_PARENT;
      if (rc == TAV_RC_OK && isGroup(child.header))
      {
        rc = enterGroup(ctx, stack, child.header);
        previous = nullptr;
      }
    }
    if (rc != TAV_RC_OK)
    {
      return rc;
    }
  }
  return TAV_RC_OK;
}

/// A walk whose output goes to a stream in blocks.
uint32_t walkInBlocks(TAVPrintCtx& ctx, TAVHandle& handle, TAVHdrStack& stack)
{
  OutputBlock block(print::streamOf(ctx), ctx.bytesWritten);
  ctx.pBlock = &block;
  const uint32_t rc = walk(ctx, handle, stack);
  if (ctx.pBlock != nullptr)
  {
    leaveBlock(ctx);
  }
  return block.stopped() ? TAV_RC_NO_MEMORY : rc;
}

uint32_t printBelow(TAVPrintCtx& ctx, TAVHandle* handle, const TAVHeader& start)
{
  if (handle == nullptr || !isGroup(start))
  {
    return TAV_RC_BAD_PARAM;
  }
  const std::unique_ptr<TAVHdrStack> stack(new (std::nothrow) TAVHdrStack);
  if (stack == nullptr)
  {
    return TAV_RC_NO_HDR_STACK;
  }
  const uint32_t rc = enterGroup(ctx, *stack, start);
  if (rc != TAV_RC_OK)
  {
    return rc;
  }
  const bool toBuffer = ctx.pStream == nullptr && ctx.pBuffer != nullptr;
  // Which lines a line-buffered stream refuses can only be told when they go out one by one.
  const bool alone = toBuffer || tracing() || kor::isLineBuffered(print::streamOf(ctx));
  return alone ? walk(ctx, *handle, *stack) : walkInBlocks(ctx, *handle, *stack);
}

uint32_t printAll(TAVPrintCtx& ctx, TAVHandle* handle, TAVHeaderData& start)
{
  if (has(ctx, TAV_PRINT_XML))
  {
    tavPrintf(&ctx, "<?xml version=\"1.0\" encoding=\"UTF-8\" ?>\n");
  }
  const bool below = has(ctx, TAV_PRINT_SUBTREE);
  uint64_t count = 0;
  const uint32_t rc = tavPrintNode(&ctx, &start, below, 1, 0, &count);
  if (count == 0)
  {
    return TAV_RC_NO_MEMORY;
  }
  return rc == TAV_RC_OK && below ? printBelow(ctx, handle, start.header) : rc;
}

TAVPrintCtx* makeContext(uint64_t options, const TAVHandle* handle, const TAVPrintParam& param)
{
  const uint8_t swapBytes = handle != nullptr ? handle->swapBytes : uint8_t{0};
  return new (std::nothrow) TAVPrintCtx{param.pBuffer, param.bufferSize, param.pStream, 0, 0,
                                        swapBytes, options, 0, 0, nullptr};
}

} // namespace

uint32_t tavPrintSubtree(uint64_t options, TAVHandle* handle, TAVHeaderData* start, TAVPrintParam* param,
                         uint64_t* bytesPrinted)
{
  TraceFrame frame(probe::printSubtree);
  frame.dump(0, options, handle, trace::record(start), trace::record(param), bytesPrinted);
  TAVHeaderData first{};
  const bool fromRoot = start == nullptr && (options & TAV_PRINT_SUBTREE) != 0 && handle != nullptr;
  uint64_t total = 0;
  if (frame.require(10, start != nullptr || fromRoot, TAV_RC_BAD_PARAM) &&
      frame.require(20, bytesPrinted != nullptr, TAV_RC_BAD_PARAM) &&
      frame.require(30, param != nullptr, TAV_RC_BAD_PARAM) &&
      (!fromRoot || frame.step(40, tavGetNextChild(0, handle, nullptr, nullptr, &first))))
  {
    const std::unique_ptr<TAVPrintCtx> ctx(makeContext(options, handle, *param));
    if (frame.require(50, ctx != nullptr, TAV_RC_NO_MEMORY))
    {
      static_cast<void>(frame.step(60, printAll(*ctx, handle, fromRoot ? first : *start)));
      total = ctx->bytesWritten;
    }
  }
  if (total == 0)
  {
    frame.keep(TAV_RC_NO_MEMORY); // nothing printed, for whatever reason
  }
  if (bytesPrinted != nullptr)
  {
    *bytesPrinted = total;
  }
  frame.dump(100, total);
  return frame.code();
}
