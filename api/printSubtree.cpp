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
using namespace tav::inside::print;

namespace
{

/// Groups that the attribute form prints with their keys, and the elements that are keys.
constexpr std::array<uint16_t, 3> kKeyedGroups{SQLM_ELM_DBASE, SQLM_ELM_NODE, TAV_ELM_CMN_HOST};
constexpr std::array<uint16_t, 3> kKeyElements{SQLM_ELM_NODE_NUMBER, SQLM_ELM_DB_NAME, TAV_ELM_CMN_HOST_NAME};

bool isAmong(const std::array<uint16_t, 3>& ids, const TAVHeader& header)
{
  return std::find(ids.begin(), ids.end(), elmOf(header)) != ids.end();
}

/// Ends a node in the block. A trace that has begun may go where the output goes: then nothing is held back.
uint32_t endNode(TAVPrintCtx& ctx)
{
  OutputBlock& block = *ctx.pBlock;
  block.endNode();
  if (tracing()) [[unlikely]]
  {
    block.handOver();
    ctx.pBlock = nullptr;
  }
  return block.stopped() ? TAV_RC_NO_MEMORY : TAV_RC_OK;
}

/// A walk below a group. Its steps return whether to go on; where not, the walk's code says why.
class Walk
{
public:
  Walk(TAVPrintCtx& ctx, TAVHandle& handle, TAVHdrStack& stack, const TAVHeader& start)
      : ctx_(ctx), handle_(handle), stack_(stack), nodes_(start), keys_(start)
  {
  }

  uint32_t run(const TAVHeader& start)
  {
    const OwnPairs pairs(handle_);
    std::array<TAVHeaderData, 2> slots{};
    TAVHeader passed{};
    TAVHeader* previous = nullptr;
    bool goesOn = enter(start);
    for (size_t current = 0; goesOn && stack_.count != 0; current ^= 1U)
    {
      if (printLeaves(ctx_, handle_, stack_.pEntries[stack_.count - 1], previous, nodes_, passed))
      {
        previous = &passed;
      }
      TAVHeaderData& child = slots[current];
      const uint32_t rc = tavGetNextChild(0, &handle_, stack_.top(), previous, &child);
      const bool inward = rc == TAV_RC_OK && isGroup(child.header);
      goesOn = rc == TAV_RC_NO_MORE_CHILDREN
                   ? leave(child)
                   : isOk(rc) && visit(nodes_, child) && print(child) && (!inward || enter(child.header));
      previous = inward ? nullptr : &child.header;
    }
    return code_;
  }

private:
  bool isOk(uint32_t code)
  {
    code_ = code;
    return code == TAV_RC_OK;
  }

  template<class Guard>
  bool visit(Guard& guard, const TAVHeaderData& node)
  {
    return isOk(guard.visit(node.header.nodeOffset) ? TAV_RC_OK : TAV_RC_OUTSIDE_PARENT);
  }

  bool enter(const TAVHeader& group)
  {
    ++ctx_.depth;
    return isOk(stack_.push(&group));
  }

  /// Leaves the innermost group and prints its closing; `closed` receives its header.
  bool leave(TAVHeaderData& closed)
  {
    closed = {};
    const uint32_t rc = stack_.pop(&closed.header);
    --ctx_.depth;
    return isOk(rc) && printSome(closed, false, false, true);
  }

  bool print(TAVHeaderData& child)
  {
    const bool group = isGroup(child.header);
    const bool keyed = group && has(ctx_, TAV_PRINT_XML) && has(ctx_, TAV_PRINT_ATTRIBUTES) &&
                       isAmong(kKeyedGroups, child.header);
    return keyed ? printWithKeys(child) : printSome(child, true, true, !group);
  }

  /// Prints parts of a node that must produce something.
  bool printSome(TAVHeaderData& node, bool open, bool body, bool close)
  {
    uint64_t count = 0;
    return isOk(tavPrintNode(&ctx_, &node, open, body, close, &count)) &&
           isOk(count != 0 ? TAV_RC_OK : TAV_RC_NO_MEMORY) && (ctx_.pBlock == nullptr || isOk(endNode(ctx_)));
  }

  /// A group's opening with its keys as attributes. Its children, the keys among them, are walked afterwards all the
  /// same.
  bool printWithKeys(TAVHeaderData& group)
  {
    const uint64_t width = is64(group.header) ? 0x1 : 0x2;
    TAVHeaderData again{};
    ctx_.attributeForm = 1;
    const bool opened = printSome(group, true, false, false) && printKeys(group.header) &&
                        isOk(tavFindNodeFromIndex(width, &handle_, group.header.nodeOffset, 0, &again)) &&
                        printSome(again, false, false, true);
    ctx_.attributeForm = 0;
    return opened && (!has(ctx_, TAV_PRINT_HEADERS) || printSome(again, false, true, true));
  }

  /// The key elements of a group, each as an attribute.
  bool printKeys(TAVHeader& group)
  {
    std::array<TAVHeaderData, 2> slots{};
    TAVHeader* previous = nullptr;
    for (size_t current = 0;; current ^= 1U)
    {
      TAVHeaderData& child = slots[current];
      const uint32_t rc = tavGetNextChild(0, &handle_, &group, previous, &child);
      if (rc == TAV_RC_NO_MORE_CHILDREN)
      {
        return true;
      }
      if (!isOk(rc) || !visit(keys_, child) ||
          (isAmong(kKeyElements, child.header) && !printSome(child, false, true, false)))
      {
        return false;
      }
      previous = &child.header;
    }
  }

  TAVPrintCtx& ctx_;
  TAVHandle& handle_;
  TAVHdrStack& stack_;
  WalkGuard nodes_;
  ChildGuard keys_;
  uint32_t code_ = TAV_RC_OK;
};

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
  Walk walk(ctx, *handle, *stack, start);
  // Which lines a line-buffered stream refuses can only be told when they go out one by one.
  if (isToBuffer(ctx) || tracing() || kor::isLineBuffered(streamOf(ctx)))
  {
    return walk.run(start);
  }
  OutputBlock block(streamOf(ctx), ctx.bytesWritten);
  ctx.pBlock = &block;
  const uint32_t rc = walk.run(start);
  block.handOver();
  ctx.pBlock = nullptr;
  return block.stopped() ? TAV_RC_NO_MEMORY : rc;
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
    const uint8_t swapBytes = handle != nullptr ? handle->swapBytes : uint8_t{0};
    const std::unique_ptr<TAVPrintCtx> ctx(new (std::nothrow) TAVPrintCtx{
        param->pBuffer, param->bufferSize, param->pStream, 0, 0, swapBytes, options, 0, 0});
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
