#include "tav/inspect/jsonWriter.hpp"

#include <algorithm>
#include <array>
#include <utility>

#include "inspect/text/bytes.h"
#include "tav/inspect/jsonText.hpp"
#include "tav/inspect/path.hpp"
#include "tav/inspect/phrases.hpp"
#include "tav/inspect/value.hpp"

namespace tav::inspect
{

using namespace tav::layout;

namespace
{

constexpr size_t kMaxIndent = 32;               ///< levels, so that deep nests do not become mostly blanks
constexpr uint64_t kMaxSteps = 64;              ///< deeper nodes are named by their offset, so that a line stays a line
constexpr size_t kMostText = size_t{16} * 1024; ///< that is kept before it is handed over

/// Makes the path of a node out of that of another one in the same group.
void replaceLastStep(std::string& path, const Node& node, const Dictionary& dictionary)
{
  path.resize(path.rfind('/')); // no element's name has one
  appendStep(path, node, dictionary);
}

} // namespace

JsonWriter::JsonWriter(ByteSource& source, const Form& form, Sink& out, JsonStyle style, bool safe)
    : source_(source), form_(form), out_(out), style_(style), safe_(safe)
{
}

void JsonWriter::put(std::string_view text)
{
  text_ += text;
  if (text_.size() > kMostText)
  {
    flush();
  }
}

/// At the end of each call, too: what was written is there when the walk fails behind it.
void JsonWriter::flush()
{
  if (!text_.empty())
  {
    out_.write(text_);
    text_.clear();
  }
}

void JsonWriter::begin()
{
  const bool compact = style_ == JsonStyle::compact;
  put("{");
  firstKey_ = true;
  putNumber("tav", kJsonVersion);
  key("form");
  put("{");
  firstKey_ = true;
  putString("byteOrder", form_.swapped != kor::isLittleEndian ? "little" : "big");
  putNumber("root", form_.root64 ? 64 : 32);
  key("aligned");
  put(form_.aligned ? "true}" : "false}");
  firstKey_ = false;
  if (style_ == JsonStyle::lines)
  {
    key("lines");
    put("true}\n");
    flush();
    return;
  }
  put(compact ? "," : ",\n ");
  firstKey_ = true;
  key("nodes");
  put("[");
  flush();
}

void JsonWriter::end()
{
  finishData();
  if (style_ != JsonStyle::lines)
  {
    put(style_ == JsonStyle::compact || firstRoot_ ? "]}\n" : "\n ]}\n");
  }
  flush();
}

/// In one piece: this is called some ten times a node. Names are short.
void JsonWriter::key(std::string_view name)
{
  constexpr size_t around = 6; // , "": and blanks
  std::array<char, 64> piece{};
  const bool compact = style_ == JsonStyle::compact;
  name = name.substr(0, piece.size() - around);
  char* at = piece.data();
  const auto put = [&](std::string_view text) { at = std::copy_n(text.data(), text.size(), at); };
  if (!std::exchange(firstKey_, false))
  {
    compact ? put(",") : put(", ");
  }
  put("\"");
  put(name);
  compact ? put("\":") : put("\": ");
  text_.append(piece.data(), at);
}

void JsonWriter::putNumber(std::string_view name, uint64_t value)
{
  key(name);
  appendNumber(text_, value);
}

void JsonWriter::putString(std::string_view name, std::string_view value)
{
  key(name);
  appendJsonString(text_, value);
}

void JsonWriter::putHex(std::string_view name, std::string_view bytes)
{
  putString(name, hexText(std::span(reinterpret_cast<const uint8_t*>(bytes.data()), bytes.size())));
}

void JsonWriter::startItem()
{
  bool& first = groups_.empty() ? firstRoot_ : groups_.back().empty;
  const bool wasFirst = std::exchange(first, false);
  if (style_ != JsonStyle::lines && !wasFirst)
  {
    put(",");
  }
  if (style_ == JsonStyle::readable)
  {
    text_ += '\n';
    text_.append(2 + 2 * std::min(groups_.size(), kMaxIndent), ' ');
  }
  put("{");
  firstKey_ = true;
}

void JsonWriter::putPlace(uint64_t offset, uint64_t depth)
{
  if (style_ == JsonStyle::lines)
  {
    putString("path", path_);
    putNumber("offset", offset);
    putNumber("depth", depth);
  }
}

void JsonWriter::putHead(const Node& node)
{
  putPlace(node.offset(), groups_.size());
  key("element");
  text_ += '"'; // no character of an element has to be escaped
  appendElementText(text_, node.elm(), source_.dictionary());
  text_ += '"';
  putNumber("id", node.elm());
  putNumber("header", node.is64() ? 64 : 32);
  key("type");
  const size_t begin = text_.size();
  text_ += '"';
  if (appendJsonTypeName(text_, node.type()))
  {
    text_ += '"';
  }
  else
  {
    text_.resize(begin);
    appendNumber(text_, node.type());
  }
  const uint32_t usual = form_.aligned ? TAV_INFO_ALIGNED8 : 0;
  if (node.is64() && (node.info() & ~uint32_t{TAV_INFO_EYE_SIZE}) != usual)
  {
    putNumber("info", node.info());
  }
  if (hasEyeSize(node.header))
  {
    key("eyeSize");
    put("true");
  }
}

void JsonWriter::putSize(uint64_t size, bool unknown)
{
  unknown ? putString("size", "unknown") : putNumber("size", size);
}

void JsonWriter::setPath(const Walker& walker, const Event& event)
{
  path_.clear();
  if (style_ != JsonStyle::lines)
  {
    return;
  }
  event.depth <= kMaxSteps ? walker.appendPath(path_, event)
                           : void(path_ = offsetPath(event.node, source_.dictionary()));
}

void JsonWriter::add(const Walker& walker, const Event& event)
{
  take(walker, event);
  flush();
}

void JsonWriter::take(const Walker& walker, const Event& event)
{
  switch (event.what)
  {
  case What::nodeBegin:
  {
    const bool behindSibling = hasData_; // with its path
    finishData();
    if (behindSibling && style_ == JsonStyle::lines && event.depth <= kMaxSteps)
    {
      replaceLastStep(path_, event.node, source_.dictionary());
    }
    else
    {
      setPath(walker, event);
    }
    if (event.node.isGroup())
    {
      beginGroup(event.node);
      return;
    }
    data_ = {.node = event.node};
    hasData_ = true;
    return;
  }
  case What::payload: return; // read when the node is written
  case What::extra: data_.extra = {event.offset, event.length}; return;
  case What::padding: data_.padding = {event.offset, event.length}; return;
  case What::pair: data_.pair = {event.offset, event.length}; return;
  case What::nodeEnd:
    if (event.node.isGroup())
    {
      endGroup(event.offset);
    }
    return;
  default: addDamage(walker, event);
  }
}

void JsonWriter::addDamage(const Walker& walker, const Event& event)
{
  finishData();
  setPath(walker, event);
  startItem();
  putPlace(event.offset, groups_.size());
  if (event.what == What::zeros)
  {
    putNumber("zeros", event.length);
  }
  else if (event.what == What::damaged)
  {
    putBytes("damaged", event.offset, event.length);
    putString("reason", event.reason);
  }
  else
  {
    putBytes("unread", event.offset, event.length);
  }
  put(style_ == JsonStyle::lines ? "}\n" : "}");
}

void JsonWriter::beginGroup(const Node& node)
{
  startItem();
  putHead(node);
  groups_.push_back({node.payloadOffset(), node.size(), isSizeUnknown(node.header), hasEyeSize(node.header),
                     hasChildren64(node.header), true});
  if (style_ == JsonStyle::lines)
  {
    putSize(node.size(), isSizeUnknown(node.header));
    put("}\n");
    return;
  }
  key("children");
  put("[");
}

void JsonWriter::endGroup(uint64_t end)
{
  // An end element as a writer makes it, at the end of a group that asks for it, goes without saying.
  const bool usualEnd = style_ != JsonStyle::lines && hasData_ && isUsualEnd(data_);
  hasData_ = hasData_ && !usualEnd;
  finishData();
  const Group group = groups_.back();
  groups_.pop_back();
  if (style_ == JsonStyle::lines)
  {
    return;
  }
  put("]");
  firstKey_ = false;
  if (group.size != end - group.payload)
  {
    putSize(group.size, group.sizeUnknown);
  }
  if (group.eyeSize && !usualEnd)
  {
    key("endElement");
    put("false");
  }
  put("}");
}

bool JsonWriter::isUsualEnd(const DataPieces& data)
{
  const Node& node = data.node;
  if (groups_.empty() || !groups_.back().eyeSize || node.elm() != TAV_ELM_CMN_END_HDR_EYE_SIZE)
  {
    return false;
  }
  const Group& group = groups_.back();
  const bool plain = node.type() == TAV_TYPE_BINARY && node.size() == kEyeSizeLength && data.extra.length == 0 &&
                     data.padding.length == 0 && node.is64() == group.wideChildren &&
                     (!node.is64() || node.info() == (form_.aligned ? TAV_INFO_ALIGNED8 : 0));
  if (!plain)
  {
    return false;
  }
  const auto pair = encodeEyeSize(groupDistance(node.offset() - group.payload, node.is64()), form_.swapped);
  return bytesAt(node.payloadOffset(), kEyeSizeLength) == asText(pair);
}

/// Writes the data element whose pieces are complete; called when something else begins.
void JsonWriter::finishData()
{
  if (std::exchange(hasData_, false))
  {
    putData(data_);
  }
}

void JsonWriter::putData(const DataPieces& data)
{
  startItem();
  putHead(data.node);
  if (style_ == JsonStyle::lines)
  {
    putSize(data.node.size(), false);
  }
  putValue(data.node);
  putRemarks(data);
  put(style_ == JsonStyle::lines ? "}\n" : "}");
}

void JsonWriter::putRemarks(const DataPieces& data)
{
  const Node& node = data.node;
  const bool padded = form_.aligned || (node.info() & TAV_INFO_ALIGNED8) != 0;
  uint64_t end = node.size();
  if (padded)
  {
    roundUp8Checked(end);
  }
  if (data.extra.length != 0)
  {
    putHex("extra", bytesOf(data.extra));
  }
  const std::string padding = bytesOf(data.padding);
  if (padding != std::string(static_cast<size_t>(end - node.size()), '\0'))
  {
    putHex("padding", padding);
  }
  if (node.is64() && hasEyeSize(node.header))
  {
    const std::string pair = bytesOf(data.pair);
    if (pair != asText(encodeEyeSize(dataDistance(node.size()), form_.swapped)))
    {
      putHex("pair", pair);
    }
  }
}

std::string JsonWriter::bytesAt(uint64_t offset, uint64_t length)
{
  std::string bytes(static_cast<size_t>(length), '\0');
  bytes.resize(source_.read(offset, std::span(reinterpret_cast<uint8_t*>(bytes.data()), bytes.size())));
  return bytes;
}

} // namespace tav::inspect
