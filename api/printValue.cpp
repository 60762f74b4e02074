/// Printing one value.
#include <algorithm>
#include <array>
#include <cinttypes>
#include <cstring>

#include "api/printer.h"
#include "format/layout.h"
#include "kor/traceFrame.h"
#include "tav/probes.h"

using namespace tav;

namespace
{

constexpr uint64_t kUnboundedText = uint64_t{1} << 63U; // a text of this size ends at its NUL

/// A value in host order: its first bytes reversed where the stream is in the other order.
class Value
{
public:
  Value(const TAVHeaderData& node, bool swap)
      : bytes_(node.pDataBuf), size_(sizeOf(node.header)), rule_(typeInfo(typeOf(node.header)).swapRule), swap_(swap)
  {
    if (swap && rule_ != SwapRule::all64 && fits())
    {
      reversed_ = swappedPrefix(rule_, size_);
      swapPayload(rule_, bytes_, first_.data(), reversed_);
    }
  }

  /// Whether the size holds what is reversed.
  [[nodiscard]] bool fits() const
  {
    return !swap_ || (rule_ == SwapRule::all64 ? size_ % 8 == 0 : size_ >= swapUnitLength(rule_));
  }

  [[nodiscard]] uint64_t size() const
  {
    return size_;
  }

  [[nodiscard]] uint8_t byteAt(uint64_t at) const
  {
    return at < reversed_ ? first_[at] : bytes_[at];
  }

  template<class Number>
  [[nodiscard]] Number as() const
  {
    Number number;
    std::memcpy(&number, reversed_ != 0 ? first_.data() : bytes_, sizeof number);
    return number;
  }

  /// A unit of an array.
  [[nodiscard]] uint64_t wordAt(uint64_t at) const
  {
    uint64_t word = 0;
    std::memcpy(&word, bytes_ + at, sizeof word);
    return swap_ ? kor::byteswap64(word) : word;
  }

private:
  const uint8_t* bytes_;
  uint64_t size_;
  SwapRule rule_;
  bool swap_;
  uint64_t reversed_ = 0;
  std::array<uint8_t, 16> first_{};
};

/// Characters up to a NUL or the size. Longer than a format's precision can say, they go in pieces.
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
    if (tavPrintf(&ctx, "%.*s", static_cast<int>(piece), text) < piece)
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
    tavPrintf(&ctx, "%02X", static_cast<unsigned>(value.byteAt(at)));
  }
}

void printTimestamp(TAVPrintCtx& ctx, const Value& value)
{
  const auto timestamp = value.as<TAVTimeStamp>();
  TAVDate date{};
  tavTimeStampToDateInt(timestamp, &date);
  tavPrintf(&ctx, "%04d-%02d-%02d-%02d.%02d.%02d.%06d%04d", date.year, date.month, date.day, date.hour, date.minute,
            date.second, date.fractionA / 1000 + date.fractionB, timestamp.offsetMinutes);
}

void printWords(TAVPrintCtx& ctx, const Value& value)
{
  for (uint64_t at = 0; at < value.size(); at += sizeof(uint64_t))
  {
    tavPrintf(&ctx, "%" PRIu64, value.wordAt(at));
  }
}

bool isPrintable(uint16_t type)
{
  return typeInfo(type).known && type != TAV_TYPE_UTF8_STRING && type != TAV_TYPE_SINT128;
}

bool isSizeOfType(uint16_t type, uint64_t size)
{
  const uint8_t exact = typeInfo(type).valueSize;
  return (exact == 0 || size == exact) && (type != TAV_TYPE_UINT64_ARRAY || size % 8 == 0);
}

void printNumber(TAVPrintCtx& ctx, uint16_t type, const Value& value)
{
  switch (type)
  {
  case TAV_TYPE_UINT8:
    tavPrintf(&ctx, "%02X", static_cast<unsigned>(value.byteAt(0)));
    break;
  case TAV_TYPE_SINT8:
    tavPrintf(&ctx, "%c", value.as<int8_t>());
    break;
  case TAV_TYPE_BYTE:
    tavPrintf(&ctx, "%c", value.byteAt(0));
    break;
  case TAV_TYPE_UINT16:
    tavPrintf(&ctx, "%hu", value.as<uint16_t>());
    break;
  case TAV_TYPE_SINT16:
    tavPrintf(&ctx, "%hd", value.as<int16_t>());
    break;
  case TAV_TYPE_UINT32:
    tavPrintf(&ctx, "%" PRIu32, value.as<uint32_t>());
    break;
  case TAV_TYPE_SINT32:
    tavPrintf(&ctx, "%" PRId32, value.as<int32_t>());
    break;
  case TAV_TYPE_UINT64:
    tavPrintf(&ctx, "%" PRIu64, value.as<uint64_t>());
    break;
  default:
    tavPrintf(&ctx, "%" PRId64, value.as<int64_t>());
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
  case TAV_TYPE_UTC_TIMESTAMP:
    printTimestamp(ctx, value);
    break;
  case TAV_TYPE_BINARY:
  case TAV_TYPE_UINT128:
    printHex(ctx, value);
    break;
  case TAV_TYPE_UINT64_ARRAY:
    printWords(ctx, value);
    break;
  default:
    printNumber(ctx, type, value);
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
  const Value value(*node, ctx->swapBytes != 0);
  if (frame.require(50, value.fits(), TAV_RC_OUTSIDE_PARENT) &&
      frame.require(60, isPrintable(type), TAV_RC_NOT_SUPPORTED) &&
      frame.require(70, isSizeOfType(type, value.size()), TAV_RC_OUTSIDE_PARENT))
  {
    printByType(*ctx, *node, value);
  }
  return frame.code();
}
