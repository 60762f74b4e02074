/// Printing one node: opening, body, closing, as text or as XML.
#include "api/printer.h"
#include "dictionary/dictionary.h"
#include "format/layout.h"
#include "tav/probes.h"
#include "trace/traceFrame.h"

using namespace tav;
using namespace tav::inside;
using tav::inside::print::has;
using tav::inside::print::line;
using tav::inside::print::piece;
using tav::inside::print::ReadyTag;

namespace
{

/// Which parts of a node a call prints.
struct Parts
{
  bool open;
  bool body;
  bool close;
};

bool hasValue(const TAVHeaderData& node)
{
  return !isGroup(node.header) && sizeOf(node.header) != 0;
}

/// What stands where a node's data does; XML wraps it where anything else stands beside it.
uint32_t printData(TAVPrintCtx& ctx, TAVHeaderData& node)
{
  if (has(ctx, TAV_PRINT_DESCRIPTORS))
  {
    tav::inside::print::descriptor(ctx, node);
  }
  const bool xml = has(ctx, TAV_PRINT_XML);
  const bool value = hasValue(node);
  const bool wrapped = xml ? has(ctx, TAV_PRINT_HEADERS | TAV_PRINT_DESCRIPTORS) : value;
  if (wrapped)
  {
    line(ctx, {xml ? "   <tavData>" : "   "});
  }
  const uint32_t rc = value ? tavPrintValue(&ctx, &node) : TAV_RC_OK;
  if (rc == TAV_RC_OK && wrapped)
  {
    piece(ctx, xml ? "</tavData>\n" : "\n");
  }
  return rc;
}

uint32_t printBody(TAVPrintCtx& ctx, TAVHeaderData& node)
{
  if (has(ctx, TAV_PRINT_BARE))
  {
    return tavPrintValue(&ctx, &node);
  }
  if (has(ctx, TAV_PRINT_HEADERS))
  {
    tav::inside::print::header(ctx, node.header);
  }
  return has(ctx, TAV_PRINT_DATA) ? printData(ctx, node) : TAV_RC_OK;
}

uint32_t nodeText(TAVPrintCtx& ctx, TAVHeaderData& node, const Parts& parts)
{
  if (parts.open)
  {
    line(ctx, {elementEnumName(elmOf(node.header)), "\n"});
    line(ctx, {"{\n"});
  }
  const uint32_t rc = parts.body ? printBody(ctx, node) : TAV_RC_OK;
  if (rc == TAV_RC_OK && parts.close)
  {
    line(ctx, {"}\n"});
  }
  return rc;
}

/// The tags of a node that is one line, when the block has them ready.
const ReadyTag* readyTag(const TAVPrintCtx& ctx, const TAVHeaderData& node, const Parts& parts)
{
  const bool oneLine = parts.open && parts.close && !has(ctx, TAV_PRINT_HEADERS);
  return oneLine && ctx.pBlock != nullptr ? ctx.pBlock->tags.find(elmOf(node.header), ctx.depth) : nullptr;
}

void openXml(TAVPrintCtx& ctx, const TAVHeaderData& node, const Parts& parts)
{
  line(ctx, {"<", elementTagName(elmOf(node.header)), ">"});
  if (!parts.close || has(ctx, TAV_PRINT_HEADERS))
  {
    piece(ctx, "\n");
  }
}

void closeXml(TAVPrintCtx& ctx, const TAVHeaderData& node, const Parts& parts)
{
  const char* const tag = elementTagName(elmOf(node.header));
  if (has(ctx, TAV_PRINT_HEADERS) || (!parts.open && !parts.body))
  {
    line(ctx, {"</", tag, ">\n"});
  }
  else
  {
    tavPrintf(&ctx, "</%s>\n", tag); // behind the value, on its line
  }
}

uint32_t nodeXml(TAVPrintCtx& ctx, TAVHeaderData& node, const Parts& parts)
{
  const ReadyTag* const ready = readyTag(ctx, node, parts);
  if (ready != nullptr)
  {
    ctx.pBlock->addReady(ready->opening, ready->openingLength);
  }
  else if (parts.open)
  {
    openXml(ctx, node, parts);
  }
  const uint32_t rc = parts.body ? printBody(ctx, node) : TAV_RC_OK;
  if (rc != TAV_RC_OK || !parts.close)
  {
    return rc;
  }
  if (ready != nullptr)
  {
    ctx.pBlock->addReady(ready->closing, ready->closingLength);
  }
  else
  {
    closeXml(ctx, node, parts);
  }
  return rc;
}

uint32_t nodeAttributes(TAVPrintCtx& ctx, TAVHeaderData& node, const Parts& parts)
{
  const char* const tag = elementTagName(elmOf(node.header));
  if (parts.open)
  {
    line(ctx, {"<", tag});
  }
  uint32_t rc = TAV_RC_OK;
  if (parts.body)
  {
    tavPrintf(&ctx, " %s=", tag);
    rc = tavPrintValue(&ctx, &node);
  }
  if (rc == TAV_RC_OK && parts.close)
  {
    piece(ctx, ">\n");
  }
  return rc;
}

uint32_t printParts(TAVPrintCtx& ctx, TAVHeaderData& node, const Parts& parts)
{
  if (!has(ctx, TAV_PRINT_XML))
  {
    return nodeText(ctx, node, parts);
  }
  return ctx.attributeForm != 0 ? nodeAttributes(ctx, node, parts) : nodeXml(ctx, node, parts);
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
