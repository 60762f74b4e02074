#include "tav/inspect/jsonWriter.hpp"

#include <algorithm>
#include <utility>

#include "inspect/text/bytes.h"
#include "tav/inspect/jsonText.hpp"
#include "tav/inspect/path.hpp"
#include "tav/inspect/value.hpp"

namespace tav::inspect
{

using namespace tav::layout;

namespace
{

constexpr size_t kMaxIndent = 32;  ///< levels, so that deep nests do not become mostly blanks
constexpr uint64_t kMaxSteps = 64; ///< deeper nodes are named by their offset, so that a line stays a line

} // namespace

JsonWriter::JsonWriter(ByteSource& source, const Form& form, Sink& out, JsonStyle style, bool safe)
    : source_(source), form_(form), out_(out), style_(style), safe_(safe)
{
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
    return;
  }
  put(compact ? "," : ",\n ");
  firstKey_ = true;
  key("nodes");
  put("[");
}

void JsonWriter::end()
{
  finishData();
  if (style_ != JsonStyle::lines)
  {
    put(style_ == JsonStyle::compact || firstRoot_ ? "]}\n" : "\n ]}\n");
  }
}

void JsonWriter::key(std::string_view name)
{
  if (!firstKey_)
  {
    put(style_ == JsonStyle::compact ? "," : ", ");
  }
  firstKey_ = false;
  put("\"");
  put(name);
  put(style_ == JsonStyle::compact ? "\":" : "\": ");
}

void JsonWriter::putNumber(std::string_view name, uint64_t value)
{
  key(name);
  put(std::to_string(value));
}

void JsonWriter::putString(std::string_view name, std::string_view value)
{
  key(name);
  std::string text;
  appendJsonString(text, value);
  put(text);
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
    put("\n" + std::string(2 + 2 * std::min(groups_.size(), kMaxIndent), ' '));
  }
  put("{");
  firstKey_ = true;
}

void JsonWriter::putPlace(const std::string& path, uint64_t offset, uint64_t depth)
{
  if (style_ == JsonStyle::lines)
  {
    putString("path", path);
    putNumber("offset", offset);
    putNumber("depth", depth);
  }
}

void JsonWriter::putHead(const std::string& path, const Node& node)
{
  putPlace(path, node.offset(), groups_.size());
  putString("element", elementText(node.elm(), source_.dictionary()));
  putNumber("id", node.elm());
  putNumber("header", node.is64() ? 64 : 32);
  if (const auto name = jsonTypeName(node.type()))
  {
    putString("type", *name);
  }
  else
  {
    putNumber("type", node.type());
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

std::string JsonWriter::pathOf(const Walker& walker, const Event& event) const
{
  if (style_ != JsonStyle::lines)
  {
    return {};
  }
  return event.depth <= kMaxSteps ? walker.path(event) : offsetPath(event.node, source_.dictionary());
}

void JsonWriter::add(const Walker& walker, const Event& event)
{
  switch (event.what)
  {
  case What::nodeBegin:
    finishData();
    if (event.node.isGroup())
    {
      beginGroup(pathOf(walker, event), event.node);
      return;
    }
    data_.emplace();
    data_->node = event.node;
    data_->path = pathOf(walker, event);
    return;
  case What::payload: return; // read when the node is written
  case What::extra: data_->extra = event; return;
  case What::padding: data_->padding = event; return;
  case What::pair: data_->pair = event; return;
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
  startItem();
  putPlace(pathOf(walker, event), event.offset, groups_.size());
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

void JsonWriter::beginGroup(const std::string& path, const Node& node)
{
  startItem();
  putHead(path, node);
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
  const bool usualEnd = style_ != JsonStyle::lines && data_ && isUsualEnd(*data_);
  if (usualEnd)
  {
    data_.reset();
  }
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
  const bool plain = node.type() == TAV_TYPE_BINARY && node.size() == kEyeSizeLength && !data.extra && !data.padding &&
                     node.is64() == group.wideChildren &&
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
  if (data_)
  {
    const DataPieces data = *std::exchange(data_, std::nullopt);
    putData(data);
  }
}

void JsonWriter::putData(const DataPieces& data)
{
  startItem();
  putHead(data.path, data.node);
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
  if (data.extra)
  {
    putHex("extra", bytesAt(data.extra->offset, data.extra->length));
  }
  const std::string padding = data.padding ? bytesAt(data.padding->offset, data.padding->length) : std::string();
  if (padding != std::string(static_cast<size_t>(end - node.size()), '\0'))
  {
    putHex("padding", padding);
  }
  if (node.is64() && hasEyeSize(node.header))
  {
    const std::string pair = data.pair ? bytesAt(data.pair->offset, data.pair->length) : std::string();
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
