/// Printing one node: opening, body, closing, as text or as XML.
#include <cinttypes>

#include "api/printer.h"
#include "dictionary/dictionary.h"
#include "format/layout.h"
#include "kor/traceFrame.h"
#include "tav/probes.h"

using namespace tav;
using tav::print::has;
using tav::print::line;

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

void dumpHeaderText(TAVPrintCtx& ctx, const TAVHeader& header)
{
  line(ctx, "   TAVHeader\n");
  line(ctx, "   {\n");
  line(ctx, is64(header) ? "      TAVHeader64\n" : "      TAVHeader32\n");
  line(ctx, "      {\n");
  line(ctx, "         size = %" PRIu64 "\n", sizeOf(header));
  if (is64(header))
  {
    line(ctx, "         info = %X\n", header.hdr64.info);
  }
  line(ctx, "         type = %hu ( %s )\n", typeOf(header), typePrintName(typeOf(header)));
  line(ctx, "         elm  = %hu ( %s )\n", elmOf(header), elementEnumName(elmOf(header)));
  line(ctx, "      }\n");
  line(ctx, "      hdrType    = %hu ( %s )\n", header.hdrType, typePrintName(header.hdrType));
  line(ctx, "      nodeOffset = %" PRIu64 "\n", header.nodeOffset);
  line(ctx, "   }\n");
}

uint32_t dataText(TAVPrintCtx& ctx, TAVHeaderData& node)
{
  if (has(ctx, TAV_PRINT_DESCRIPTORS))
  {
    line(ctx, "   pDataBuf      = %016" PRIX64 "\n", static_cast<uint64_t>(reinterpret_cast<uintptr_t>(node.pDataBuf)));
    line(ctx, "   dataBufSize   = %" PRIu64 "\n", node.dataBufSize);
    line(ctx, "   dataBufOffset = %" PRIu64 "\n", node.dataBufOffset);
  }
  if (!hasValue(node))
  {
    return TAV_RC_OK;
  }
  line(ctx, "   ");
  const uint32_t rc = tavPrintValue(&ctx, &node);
  if (rc == TAV_RC_OK)
  {
    tavPrintf(&ctx, "\n");
  }
  return rc;
}

uint32_t bodyText(TAVPrintCtx& ctx, TAVHeaderData& node)
{
  if (has(ctx, TAV_PRINT_BARE))
  {
    return tavPrintValue(&ctx, &node);
  }
  if (has(ctx, TAV_PRINT_HEADERS))
  {
    dumpHeaderText(ctx, node.header);
  }
  return has(ctx, TAV_PRINT_DATA) ? dataText(ctx, node) : TAV_RC_OK;
}

uint32_t nodeText(TAVPrintCtx& ctx, TAVHeaderData& node, const Parts& parts)
{
  if (parts.open)
  {
    line(ctx, "%s\n", elementEnumName(elmOf(node.header)));
    line(ctx, "{\n");
  }
  const uint32_t rc = parts.body ? bodyText(ctx, node) : TAV_RC_OK;
  if (rc == TAV_RC_OK && parts.close)
  {
    line(ctx, "}\n");
  }
  return rc;
}

void dumpHeaderXml(TAVPrintCtx& ctx, const TAVHeader& header)
{
  const char* const form = is64(header) ? "64" : "32";
  line(ctx, "   <tavHeader>\n");
  line(ctx, "      <tavHeader%s>\n", form);
  line(ctx, "         <size>%" PRIu64 "</size>\n", sizeOf(header));
  if (is64(header))
  {
    line(ctx, "         <info>%X</info>\n", header.hdr64.info);
  }
  line(ctx, "         <type>%s</type>\n", typePrintName(typeOf(header)));
  line(ctx, "         <elm>%s</elm>\n", elementEnumName(elmOf(header)));
  line(ctx, "      </tavHeader%s>\n", form);
  line(ctx, "      <hdrType>%s</hdrType>\n", typePrintName(header.hdrType));
  line(ctx, "      <nodeOffset>%" PRIu64 "</nodeOffset>\n", header.nodeOffset);
  line(ctx, "   </tavHeader>\n");
}

uint32_t dataXml(TAVPrintCtx& ctx, TAVHeaderData& node)
{
  if (has(ctx, TAV_PRINT_DESCRIPTORS))
  {
    line(ctx, "   <pDataBuf>%016" PRIX64 "</pDataBuf>\n",
         static_cast<uint64_t>(reinterpret_cast<uintptr_t>(node.pDataBuf)));
    line(ctx, "   <dataBufSize>%" PRIu64 "</dataBufSize>\n", node.dataBufSize);
    line(ctx, "   <dataBufOffset>%" PRIu64 "</dataBufOffset>\n", node.dataBufOffset);
  }
  const bool wrapped = has(ctx, TAV_PRINT_HEADERS | TAV_PRINT_DESCRIPTORS);
  if (wrapped)
  {
    line(ctx, "   <tavData>");
  }
  const uint32_t rc = hasValue(node) ? tavPrintValue(&ctx, &node) : TAV_RC_OK;
  if (rc == TAV_RC_OK && wrapped)
  {
    tavPrintf(&ctx, "</tavData>\n");
  }
  return rc;
}

uint32_t bodyXml(TAVPrintCtx& ctx, TAVHeaderData& node)
{
  if (has(ctx, TAV_PRINT_BARE))
  {
    return tavPrintValue(&ctx, &node);
  }
  if (has(ctx, TAV_PRINT_HEADERS))
  {
    dumpHeaderXml(ctx, node.header);
  }
  return has(ctx, TAV_PRINT_DATA) ? dataXml(ctx, node) : TAV_RC_OK;
}

uint32_t nodeXml(TAVPrintCtx& ctx, TAVHeaderData& node, const Parts& parts)
{
  const char* const tag = elementTagName(elmOf(node.header));
  const bool headers = has(ctx, TAV_PRINT_HEADERS);
  if (parts.open)
  {
    line(ctx, parts.close && !headers ? "<%s>" : "<%s>\n", tag);
  }
  const uint32_t rc = parts.body ? bodyXml(ctx, node) : TAV_RC_OK;
  if (rc != TAV_RC_OK || !parts.close)
  {
    return rc;
  }
  if (headers || (!parts.open && !parts.body))
  {
    line(ctx, "</%s>\n", tag);
  }
  else
  {
    tavPrintf(&ctx, "</%s>\n", tag); // behind the value, on its line
  }
  return rc;
}

uint32_t nodeAttributes(TAVPrintCtx& ctx, TAVHeaderData& node, const Parts& parts)
{
  const char* const tag = elementTagName(elmOf(node.header));
  if (parts.open)
  {
    line(ctx, "<%s", tag);
  }
  uint32_t rc = TAV_RC_OK;
  if (parts.body)
  {
    tavPrintf(&ctx, " %s=", tag);
    rc = tavPrintValue(&ctx, &node);
  }
  if (rc == TAV_RC_OK && parts.close)
  {
    tavPrintf(&ctx, ">\n");
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
