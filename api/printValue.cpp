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
using namespace tav::inside::print;

namespace
{

constexpr uint64_t kUnboundedText = uint64_t{1} << 63U; ///< a text of this size ends at its NUL

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
    const auto some = static_cast<size_t>(std::min(length, longestPiece));
    if (put(ctx, 0, {text, lengthOfText(text, some)}) < some)
    {
      return;
    }
    text += some;
    length -= some;
  } while (length != 0);
}

/// Prints units of a value, each a piece of its own that `write` puts at the place it is given.
template<class Write>
void printUnits(TAVPrintCtx& ctx, uint64_t size, uint64_t unit, const Write& write)
{
  for (uint64_t at = 0; at < size; at += unit)
  {
    std::array<char, kLongestShort> place;
    put(ctx, 0, {place.data(), static_cast<size_t>(write(place.data(), at) - place.data())});
  }
}

void printByType(TAVPrintCtx& ctx, const TAVHeaderData& node)
{
  const uint16_t type = typeOf(node.header);
  const uint64_t size = sizeOf(node.header);
  const uint8_t* const bytes = node.pDataBuf;
  const bool swap = ctx.swapBytes != 0;
  const uint64_t reversed = swap ? swappedPrefix(typeInfo(type).swapRule, size) : 0;
  switch (type)
  {
  case TAV_TYPE_ASCII_STRING:
    return printString(ctx, node);
  case TAV_TYPE_BINARY:
  case TAV_TYPE_UINT128:
    return printUnits(ctx, size, 1, [&](char* to, uint64_t at) {
      return digits::writeHex(to, bytes[at < reversed ? reversed - 1 - at : at]);
    });
  case TAV_TYPE_UINT64_ARRAY:
    return printUnits(ctx, size, sizeof(uint64_t), [&](char* to, uint64_t at) {
      return digits::writeDecimal(to, valueAt<uint64_t>(bytes + at, swap));
    });
  default:
    return printUnits(ctx, 1, 1, [&](char* to, uint64_t /*at*/) { return writeShort(to, type, bytes, swap); });
  }
}

/// A descriptor that says how many bytes it has must have the node's.
bool hasItsBytes(const TAVHeaderData& node)
{
  const uint64_t size = sizeOf(node.header);
  const bool openText = typeOf(node.header) == TAV_TYPE_ASCII_STRING && size >= kUnboundedText;
  return node.dataBufSize == 0 || size <= node.dataBufSize || openText;
}

/// Whether the size holds what is reversed.
bool isReversible(const TypeInfo& type, uint64_t size)
{
  return type.swapRule == SwapRule::all64 ? size % 8 == 0 : size >= swapUnitLength(type.swapRule);
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
  const uint16_t code = typeOf(node->header);
  const TypeInfo& type = typeInfo(code);
  const uint64_t size = sizeOf(node->header);
  const bool printable = type.known && code != TAV_TYPE_UTF8_STRING && code != TAV_TYPE_SINT128;
  const bool ofType = code == TAV_TYPE_UINT64_ARRAY ? size % 8 == 0 : type.valueSize == 0 || size == type.valueSize;
  if (frame.require(50, ctx->swapBytes == 0 || isReversible(type, size), TAV_RC_OUTSIDE_PARENT) &&
      frame.require(60, printable, TAV_RC_NOT_SUPPORTED) && frame.require(70, ofType, TAV_RC_OUTSIDE_PARENT))
  {
    printByType(*ctx, *node);
    frame.dump(100, ctx->bytesWritten);
  }
  return frame.code();
}
