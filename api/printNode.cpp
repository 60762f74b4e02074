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

/// What stands where a node's data does; XML wraps it where anything else stands beside it.
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

/// The opening of a node. That of an element stands on the line of its value, unless more than a value follows.
void printOpening(TAVPrintCtx& ctx, uint16_t elm, const Asked& asked)
{
  if (!has(ctx, TAV_PRINT_XML))
  {
    line(ctx, {elementEnumName(elm), "\n"});
    line(ctx, {"{\n"});
    return;
  }
  line(ctx, {"<", elementTagName(elm), ctx.attributeForm != 0 ? "" : ">"});
  if (ctx.attributeForm == 0 && (!asked.close || has(ctx, TAV_PRINT_HEADERS)))
  {
    piece(ctx, {"\n"});
  }
}

uint32_t printBody(TAVPrintCtx& ctx, TAVHeaderData& node)
{
  const bool attribute = has(ctx, TAV_PRINT_XML) && ctx.attributeForm != 0;
  if (attribute)
  {
    piece(ctx, {" ", elementTagName(elmOf(node.header)), "="});
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

void printClosing(TAVPrintCtx& ctx, uint16_t elm, const Asked& asked)
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
    line(ctx, {"</", elementTagName(elm), ">\n"});
  }
  else
  {
    piece(ctx, {"</", elementTagName(elm), ">\n"}); // behind the value, on its line
  }
}

uint32_t printParts(TAVPrintCtx& ctx, TAVHeaderData& node, const Asked& asked)
{
  if (asked.open)
  {
    printOpening(ctx, elmOf(node.header), asked);
  }
  const uint32_t rc = asked.body ? printBody(ctx, node) : TAV_RC_OK;
  if (rc == TAV_RC_OK && asked.close)
  {
    printClosing(ctx, elmOf(node.header), asked);
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
