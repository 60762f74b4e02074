// The values of the JSON form, in pieces where they are long.
#include <algorithm>
#include <cstring>
#include <utility>

#include "inspect/text/bytes.h"
#include "inspect/text/date.h"
#include "tav/cpp/valueText.hpp"
#include "tav/inspect/jsonText.hpp"
#include "tav/inspect/jsonWriter.hpp"
#include "tav/inspect/phrases.hpp"
#include "tav/inspect/value.hpp"

namespace tav::inspect
{

using namespace tav::layout;

namespace
{

constexpr size_t kPiece = size_t{48} * 1024;   ///< bytes of a payload in one string
constexpr size_t kBlock = size_t{4} * 1024;    ///< zeros are counted by blocks of this length
constexpr uint64_t kExact = uint64_t{1} << 53; ///< whole numbers up to here are exact in a double

bool isZero(std::span<const uint8_t> bytes)
{
  return std::all_of(bytes.begin(), bytes.end(), [](uint8_t byte) { return byte == 0; });
}

} // namespace

void JsonWriter::putValue(const Node& node)
{
  const uint16_t type = node.type();
  const uint64_t start = node.payloadOffset();
  const uint64_t size = node.size();
  const bool oneNumber = (type >= TAV_TYPE_UINT8 && type <= TAV_TYPE_SINT64) || type == TAV_TYPE_BYTE;
  if (oneNumber && size == typeInfo(type).valueSize)
  {
    putInteger(node);
  }
  else if ((type == TAV_TYPE_UINT128 || type == TAV_TYPE_SINT128) && size == 16)
  {
    putString("value", *plainText(source_, form_, node, kBlock));
  }
  else if (type == TAV_TYPE_UTC_TIMESTAMP && size == sizeof(TAVTimeStamp))
  {
    putDate(dateOf(source_, form_, node));
  }
  else if (type == TAV_TYPE_ASCII_STRING && isText(start, start + size))
  {
    putText(start, start + size);
  }
  else if (type == TAV_TYPE_UTF8_STRING && size >= 2 && isText(start + 2, start + size))
  {
    uint16_t codePage = 0;
    std::memcpy(&codePage, bytesAt(start, sizeof codePage).data(), sizeof codePage);
    codePage = form_.swapped ? kor::byteswap16(codePage) : codePage;
    if (codePage != kUsualCodePage)
    {
      putNumber("codePage", codePage);
    }
    putText(start + 2, start + size);
  }
  else if (type == TAV_TYPE_UINT64_ARRAY && size % 8 == 0)
  {
    putArray(node);
  }
  else
  {
    putBytes("bytes", start, size);
  }
}

void JsonWriter::putInteger(const Node& node)
{
  key("value");
  const size_t begin = text_.size();
  if (node.type() == TAV_TYPE_BYTE) // a number, too, although it is shown in hexadecimal elsewhere
  {
    appendNumber(text_, source_.view(node.payloadOffset()).front());
    return;
  }
  appendPlainText(text_, source_, form_, node, kBlock);
  if (!safe_ || node.size() != 8)
  {
    return;
  }
  const std::string digits = text_.substr(begin + (text_[begin] == '-' ? 1 : 0));
  if (std::stoull(digits) > kExact)
  {
    text_.insert(begin, 1, '"');
    text_ += '"';
  }
}

void JsonWriter::putDate(const TAVTimeStamp& stamp)
{
  key("value");
  const size_t begin = text_.size();
  text_ += '"';
  detail::appendTime(text_, stamp);
  if (isWholeDate(stamp, std::string_view(text_).substr(begin + 1)))
  {
    text_ += '"';
    return;
  }
  text_.resize(begin);
  text_ += '{';
  firstKey_ = true;
  key("seconds");
  const bool quote = safe_ && stamp.seconds > kExact;
  text_ += quote ? "\"" : "";
  appendNumber(text_, stamp.seconds);
  text_ += quote ? "\"" : "";
  putNumber("fractionA", stamp.fractionA);
  putNumber("fractionB", stamp.fractionB);
  putNumber("further", stamp.further);
  key("offsetMinutes");
  appendNumber(text_, stamp.offsetMinutes);
  text_ += '}';
  firstKey_ = false;
}

void JsonWriter::putArray(const Node& node)
{
  key("value");
  put("[");
  piece_.resize(kPiece);
  const uint64_t end = node.payloadOffset() + node.size();
  bool first = true;
  for (uint64_t at = node.payloadOffset(); at < end; at += piece_.size())
  {
    piece_.resize(static_cast<size_t>(std::min<uint64_t>(kPiece, end - at)));
    source_.read(at, piece_);
    for (size_t i = 0; i < piece_.size(); i += 8)
    {
      uint64_t number = 0;
      std::memcpy(&number, piece_.data() + i, sizeof number);
      const std::string text = std::to_string(form_.swapped ? kor::byteswap64(number) : number);
      put(std::exchange(first, false) ? "" : style_ == JsonStyle::compact ? ","
                                                                          : ", ");
      put(safe_ && text.size() > 15 ? '"' + text + '"' : text);
    }
  }
  put("]");
}

/// The bytes from an offset on, at most a piece, cut between characters. Valid until the source is asked again.
std::string_view JsonWriter::textAt(uint64_t from, uint64_t end)
{
  const auto count = static_cast<size_t>(std::min<uint64_t>(kPiece + 4, end - from));
  const std::string_view text = asText(inspect::bytesAt(source_, from, count, piece_));
  return text.substr(0, cutAtCharacter(text, kPiece));
}

/// Whether bytes are UTF-8. They are looked at piece by piece, as they are written afterwards.
bool JsonWriter::isText(uint64_t from, uint64_t end)
{
  while (from < end)
  {
    const std::string_view text = textAt(from, end);
    if (text.empty() || !isUtf8(text))
    {
      return false;
    }
    from += text.size();
  }
  return true;
}

void JsonWriter::putText(uint64_t from, uint64_t end)
{
  key("value");
  const bool pieces = end - from > kPiece;
  put(pieces ? "[" : "");
  for (bool first = true; from < end || first; first = false)
  {
    put(first ? "" : ",");
    const std::string_view text = textAt(from, end);
    appendJsonString(text_, text);
    if (text.empty())
    {
      break; // an empty text, or a file that became shorter
    }
    from += text.size();
  }
  put(pieces ? "]" : "");
}

void JsonWriter::putBytes(std::string_view name, uint64_t from, uint64_t length)
{
  if (length <= kBlock)
  {
    putHex(name, bytesAt(from, length));
    return;
  }
  key(name);
  put("[");
  const uint64_t end = from + length;
  uint64_t zeros = 0;
  std::string hex;
  bool first = true;
  const auto flush = [&] {
    if (zeros != 0 || !hex.empty())
    {
      put(std::exchange(first, false) ? "" : ",");
      put(zeros != 0 ? std::to_string(zeros) : '"' + hex + '"');
    }
    zeros = 0;
    hex.clear();
  };
  for (; from < end; from += piece_.size())
  {
    piece_.resize(static_cast<size_t>(std::min<uint64_t>(kBlock, end - from)));
    source_.read(from, piece_);
    const bool blank = isZero(piece_);
    if (blank ? !hex.empty() : zeros != 0 || hex.size() >= 2 * kPiece)
    {
      flush();
    }
    blank ? void(zeros += piece_.size()) : void(hex += hexText(piece_));
    if (blank && from + kBlock < end)
    {
      const uint64_t past = std::min(end, source_.zerosUntil(from + kBlock)) - (from + kBlock);
      zeros += past / kBlock * kBlock;
      from += past / kBlock * kBlock;
    }
  }
  flush();
  put("]");
}

} // namespace tav::inspect
