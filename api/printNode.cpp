/// Printing one node: opening, body, closing, as text or as XML.
#include "api/printer.h"
#include "dictionary/dictionary.h"
#include "format/layout.h"
#include "tav/probes.h"
#include "trace/traceFrame.h"

using namespace tav;
using namespace tav::inside;
using namespace tav::inside::print;

namespace
{

/// Which parts of a node a call prints.
struct Asked
{
  bool open;
  bool body;
  bool close;
};

/// What is where a node's data does; XML wraps it where anything else is beside it.
uint32_t printData(TAVPrintCtx& ctx, TAVHeaderData& node)
{
  if (has(ctx, TAV_PRINT_DESCRIPTORS))
  {
    descriptor(ctx, node);
  }
  const bool xml = has(ctx, TAV_PRINT_XML);
  const bool value = !isGroup(node.header) && sizeOf(node.header) != 0;
  const bool wrapped = xml ? has(ctx, TAV_PRINT_HEADERS | TAV_PRINT_DESCRIPTORS) : value;
  if (wrapped)
  {
    line(ctx, {xml ? "   <tavData>" : "   "});
  }
  const uint32_t rc = value ? tavPrintValue(&ctx, &node) : TAV_RC_OK;
  if (rc == TAV_RC_OK && wrapped)
  {
    piece(ctx, {xml ? "</tavData>\n" : "\n"});
  }
  return rc;
}

/// The opening of a node. That of an element is on the line of its value, unless more than a value follows.
void printOpening(TAVPrintCtx& ctx, uint16_t elm, std::string_view tag, const Asked& asked)
{
  if (!has(ctx, TAV_PRINT_XML))
  {
    line(ctx, {elementEnumName(elm), "\n"});
    line(ctx, {"{\n"});
    return;
  }
  line(ctx, {"<", tag, ctx.attributeForm != 0 ? "" : ">"});
  if (ctx.attributeForm == 0 && (!asked.close || has(ctx, TAV_PRINT_HEADERS)))
  {
    piece(ctx, {"\n"});
  }
}

uint32_t printBody(TAVPrintCtx& ctx, TAVHeaderData& node, std::string_view tag)
{
  const bool attribute = has(ctx, TAV_PRINT_XML) && ctx.attributeForm != 0;
  if (attribute)
  {
    piece(ctx, {" ", tag, "="});
  }
  if (attribute || has(ctx, TAV_PRINT_BARE))
  {
    return tavPrintValue(&ctx, &node);
  }
  if (has(ctx, TAV_PRINT_HEADERS))
  {
    header(ctx, node.header);
  }
  return has(ctx, TAV_PRINT_DATA) ? printData(ctx, node) : TAV_RC_OK;
}

void printClosing(TAVPrintCtx& ctx, std::string_view tag, const Asked& asked)
{
  if (!has(ctx, TAV_PRINT_XML))
  {
    line(ctx, {"}\n"});
  }
  else if (ctx.attributeForm != 0)
  {
    piece(ctx, {">\n"});
  }
  else if (has(ctx, TAV_PRINT_HEADERS) || (!asked.open && !asked.body))
  {
    line(ctx, {"</", tag, ">\n"});
  }
  else
  {
    piece(ctx, {"</", tag, ">\n"}); // behind the value, on its line
  }
}

/// The tags of an element that is one line, when the block has them ready.
const ReadyTag* readyTag(const TAVPrintCtx& ctx, uint16_t elm, const Asked& asked)
{
  const bool oneLine = ctx.attributeForm == 0 && asked.open && asked.close &&
                       (ctx.options & (TAV_PRINT_XML | TAV_PRINT_HEADERS)) == TAV_PRINT_XML;
  return oneLine && ctx.pBlock != nullptr ? findTag(ctx.pBlock->tags, elm, ctx.depth) : nullptr;
}

uint32_t printParts(TAVPrintCtx& ctx, TAVHeaderData& node, const Asked& asked)
{
  const uint16_t elm = elmOf(node.header);
  const ReadyTag* const ready = readyTag(ctx, elm, asked);
  const std::string_view tag = has(ctx, TAV_PRINT_XML) && ready == nullptr ? elementTagName(elm) : "";
  if (asked.open)
  {
    ready != nullptr ? piece(ctx, {ready->opening()}) : printOpening(ctx, elm, tag, asked);
  }
  const uint32_t rc = asked.body ? printBody(ctx, node, tag) : TAV_RC_OK;
  if (rc == TAV_RC_OK && asked.close)
  {
    ready != nullptr ? piece(ctx, {ready->closing()}) : printClosing(ctx, tag, asked);
  }
  return rc;
}

} // namespace

uint32_t tavPrintNode(TAVPrintCtx* ctx, TAVHeaderData* node, uint8_t open, uint8_t body, uint8_t close, uint64_t* count)
{
  TraceFrame frame(probe::printNode);
  frame.dump(0, ctx, trace::record(node), open, body, close);
  const uint64_t before = ctx->bytesWritten;
  static_cast<void>(
      frame.require(10, node != nullptr, TAV_RC_BAD_PARAM) &&
      frame.require(20, isKnownHdrType(node->header.hdrType), TAV_RC_BAD_HDR_TYPE) &&
      frame.step(30, printParts(*ctx, *node, {open != 0, body != 0, close != 0})));
  *count = ctx->bytesWritten - before;
  frame.dump(100, *count);
  return frame.code();
}
