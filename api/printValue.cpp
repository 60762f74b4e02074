/// Printing one value.
#include <algorithm>
#include <cstring>

#include "api/printValue.h"
#include "api/printer.h"
#include "format/layout.h"
#include "tav/probes.h"
#include "trace/traceFrame.h"

using namespace tav;
using namespace tav::inside;
using tav::inside::print::kUnboundedText;
using tav::inside::print::shortPiece;
using tav::inside::print::Value;

namespace
{

/// Characters up to a NUL or the size. Very many go in several pieces.
void printString(TAVPrintCtx& ctx, const TAVHeaderData& node)
{
  constexpr uint64_t longestPiece = 1U << 30U;
  const auto* text = reinterpret_cast<const char*>(node.pDataBuf);
  uint64_t length = sizeOf(node.header);
  if (length >= kUnboundedText) // no text is so long: the bytes at hand are meant, or all up to the NUL
  {
    length = node.dataBufSize != 0 ? node.dataBufSize : std::strlen(text);
  }
  do
  {
    const uint64_t piece = std::min(length, longestPiece);
    if (print::piece(ctx, {text, print::lengthOfText(text, piece)}) < piece)
    {
      return;
    }
    text += piece;
    length -= piece;
  } while (length != 0);
}

void printHex(TAVPrintCtx& ctx, const Value& value)
{
  for (uint64_t at = 0; at < value.size(); ++at)
  {
    shortPiece(ctx, [&](char* to) { return digits::writeHex(to, value.byteAt(at)); });
  }
}

void printWords(TAVPrintCtx& ctx, const Value& value)
{
  for (uint64_t at = 0; at < value.size(); at += sizeof(uint64_t))
  {
    shortPiece(ctx, [&](char* to) { return digits::writeDecimal(to, value.wordAt(at)); });
  }
}

void printByType(TAVPrintCtx& ctx, const TAVHeaderData& node, const Value& value)
{
  const uint16_t type = typeOf(node.header);
  switch (type)
  {
  case TAV_TYPE_ASCII_STRING:
    printString(ctx, node);
    break;
  case TAV_TYPE_BINARY:
  case TAV_TYPE_UINT128:
    printHex(ctx, value);
    break;
  case TAV_TYPE_UINT64_ARRAY:
    printWords(ctx, value);
    break;
  default:
    shortPiece(ctx, [&](char* to) { return print::writeShort(to, type, value); });
  }
}

/// A descriptor that tells how many bytes it has must have the node's.
bool hasItsBytes(const TAVHeaderData& node)
{
  const uint64_t size = sizeOf(node.header);
  const bool openText = typeOf(node.header) == TAV_TYPE_ASCII_STRING && size >= kUnboundedText;
  return node.dataBufSize == 0 || size <= node.dataBufSize || openText;
}

} // namespace

uint32_t tavPrintValue(TAVPrintCtx* ctx, TAVHeaderData* node)
{
  TraceFrame frame(probe::printValue);
  frame.dump(0, ctx, trace::record(node));
  if (!frame.require(10, node != nullptr, TAV_RC_BAD_PARAM) ||
      !frame.require(20, !isGroup(node->header), TAV_RC_BAD_PARAM) ||
      !frame.require(30, node->pDataBuf != nullptr, TAV_RC_BAD_PARAM) ||
      !frame.require(40, hasItsBytes(*node), TAV_RC_OUTSIDE_PARENT))
  {
    return frame.code();
  }
  const uint16_t type = typeOf(node->header);
  const Value value(type, node->pDataBuf, sizeOf(node->header), ctx->swapBytes != 0);
  if (frame.require(50, value.fits(), TAV_RC_OUTSIDE_PARENT) &&
      frame.require(60, print::isPrintable(type), TAV_RC_NOT_SUPPORTED) &&
      frame.require(70, print::isSizeOfType(type, value.size()), TAV_RC_OUTSIDE_PARENT))
  {
    printByType(*ctx, *node, value);
    frame.dump(100, ctx->bytesWritten);
  }
  return frame.code();
}
