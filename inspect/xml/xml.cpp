#include "tav/inspect/xml.hpp"

#include <algorithm>
#include <array>
#include <cstring>
#include <utility>
#include <vector>

#include "inspect/text/bytes.h"
#include "tav/cpp/valueText.hpp"
#include "tav/dictionary.hpp"
#include "tav/inspect/jsonText.hpp"
#include "tav/inspect/path.hpp"
#include "tav/inspect/phrases.hpp"
#include "tav/inspect/value.hpp"
#include "tav/inspect/walker.hpp"

namespace tav::inspect
{

namespace
{

constexpr size_t kPiece = size_t{48} * 1024;
constexpr uint64_t kMaxIndent = 32;
constexpr uint64_t kMaxNumber = 64; ///< bytes of the longest value that is one number or date

std::string escaped(std::string_view text, bool attribute)
{
  std::string out;
  for (const char c : text)
  {
    switch (c)
    {
    case '&': out += "&amp;"; break;
    case '<': out += "&lt;"; break;
    case '>': out += "&gt;"; break;
    case '\r': out += "&#13;"; break;
    case '"': out += attribute ? "&quot;" : "\""; break;
    case '\n': out += attribute ? "&#10;" : "\n"; break;
    case '\t': out += attribute ? "&#9;" : "\t"; break;
    default: out += c;
    }
  }
  return out;
}

/// The name of a node's element in XML; "element" where the tag is not unique or no name in XML.
std::string nameOf(uint16_t elm)
{
  const std::string text = elementText(elm);
  const bool letter = (text[0] >= 'a' && text[0] <= 'z') || (text[0] >= 'A' && text[0] <= 'Z') || text[0] == '_';
  return letter ? text : "element";
}

/// Writes the events of a walk as XML.
class XmlWriter
{
public:
  XmlWriter(ByteSource& source, const Form& form, Sink& out)
      : source_(source), form_(form), out_(out) {}

  void begin()
  {
    out_.write("<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<tav");
    attribute("byteOrder", form_.swapped != kor::isLittleEndian ? "little" : "big");
    attribute("root", form_.root64 ? "64" : "32");
    attribute("aligned", form_.aligned ? "true" : "false");
    out_.write(">\n");
  }

  void end() { out_.write("</tav>\n"); }

  void add(const Event& event)
  {
    switch (event.what)
    {
    case What::nodeBegin:
      indent(event.depth);
      event.node.isGroup() ? beginGroup(event.node) : putData(event.node);
      return;
    case What::nodeEnd:
      if (event.node.isGroup())
      {
        indent(event.depth);
        out_.write("</" + nameOf(event.node.elm()) + ">\n");
      }
      return;
    case What::damaged:
    case What::unread:
    case What::zeros: putDamage(event); return;
    default: return; // told with the node
    }
  }

private:
  void indent(uint64_t depth) { out_.write(std::string(static_cast<size_t>(1 + std::min(depth, kMaxIndent)), ' ')); }

  void attribute(std::string_view name, std::string_view value)
  {
    out_.write(" " + std::string(name) + "=\"" + escaped(value, true) + "\"");
  }

  void beginTag(const Node& node);
  void beginGroup(const Node& node);
  void putData(const Node& node);
  void putDate(const Node& node);
  void putArray(const Node& node);
  void putText(const Node& node, uint64_t skip);
  void putHex(uint64_t from, uint64_t length);
  void putDamage(const Event& event);
  bool isText(uint64_t from, uint64_t end);
  std::string_view piece(uint64_t from, uint64_t end);
  template<class Action>
  void eachPiece(uint64_t from, uint64_t end, Action action);

  ByteSource& source_;
  Form form_;
  Sink& out_;
  std::vector<uint8_t> buffer_{};
};

/// The bytes from an offset on, at most a piece, cut between characters.
std::string_view XmlWriter::piece(uint64_t from, uint64_t end)
{
  buffer_.resize(static_cast<size_t>(std::min<uint64_t>(kPiece + 4, end - from)));
  const std::string_view bytes = asText(std::span(buffer_).first(source_.read(from, buffer_)));
  return bytes.substr(0, cutAtCharacter(bytes, kPiece));
}

template<class Action>
void XmlWriter::eachPiece(uint64_t from, uint64_t end, Action action)
{
  while (from < end)
  {
    const std::string_view bytes = piece(from, end);
    if (bytes.empty() || !action(bytes))
    {
      return;
    }
    from += bytes.size();
  }
}

bool XmlWriter::isText(uint64_t from, uint64_t end)
{
  bool text = true;
  eachPiece(from, end, [&](std::string_view bytes) { return text = detail::isXmlText(bytes); });
  return text;
}

void XmlWriter::beginTag(const Node& node)
{
  const std::string name = nameOf(node.elm());
  out_.write("<" + name);
  if (name == "element")
  {
    attribute("id", std::to_string(node.elm()));
    if (const std::string_view known = dictionary::nameOf(node.elm()); !known.empty())
    {
      attribute("name", known);
    }
  }
  attribute("type", jsonTypeName(node.type()).value_or(std::to_string(node.type())));
  if (node.depth == 0)
  {
    attribute("header", node.is64() ? "64" : "32");
  }
  const uint32_t usual = form_.aligned ? TAV_INFO_ALIGNED8 : 0;
  if (node.is64() && (node.info() & ~uint32_t{TAV_INFO_EYE_SIZE}) != usual)
  {
    attribute("info", hexOffset(node.info()));
  }
  if (layout::hasEyeSize(node.header))
  {
    attribute("eyeSize", node.has(kNoPair) ? "missing" : node.has(kBadPair) ? "damaged"
                                                                            : "true");
  }
}

void XmlWriter::beginGroup(const Node& node)
{
  beginTag(node);
  if (node.has(kOpen) || node.has(kOverrun))
  {
    attribute("size", layout::isSizeUnknown(node.header) ? "unknown" : std::to_string(node.size()));
  }
  out_.write(">\n");
}

void XmlWriter::putData(const Node& node)
{
  const uint16_t type = node.type();
  const uint64_t start = node.payloadOffset();
  const uint64_t end = start + node.size();
  const bool number =
      (type >= TAV_TYPE_UINT8 && type <= TAV_TYPE_SINT64 && node.size() == layout::typeInfo(type).valueSize) ||
      ((type == TAV_TYPE_UINT128 || type == TAV_TYPE_SINT128) && node.size() == 16);
  beginTag(node);
  if (node.has(kExtra))
  {
    std::array<uint8_t, 2> extra{};
    attribute("extra", hexText(std::span(extra).first(source_.read(end, extra))));
  }
  if (number)
  {
    out_.write(">" + plainText(source_, form_, node, kMaxNumber).value_or(""));
  }
  else if (type == TAV_TYPE_UTC_TIMESTAMP && node.size() == sizeof(TAVTimeStamp))
  {
    putDate(node);
  }
  else if (type == TAV_TYPE_ASCII_STRING && isText(start, end))
  {
    putText(node, 0);
  }
  else if (type == TAV_TYPE_UTF8_STRING && node.size() >= 2 && isText(start + 2, end))
  {
    putText(node, 2);
  }
  else if (type == TAV_TYPE_UINT64_ARRAY && node.size() % 8 == 0)
  {
    putArray(node);
  }
  else
  {
    attribute("encoding", "hex");
    out_.write(">");
    putHex(start, node.size());
  }
  out_.write("</" + nameOf(node.elm()) + ">\n");
}

void XmlWriter::putDate(const Node& node)
{
  TAVTimeStamp stamp{};
  const std::vector<uint8_t> bytes = payloadBytes(source_, form_, node, sizeof stamp);
  std::memcpy(&stamp, bytes.data(), std::min(bytes.size(), sizeof stamp));
  const std::string text = dateText(stamp);
  const auto back = parseDate(text);
  if (!back || std::memcmp(&*back, &stamp, sizeof stamp) != 0)
  {
    // What the text does not tell.
    attribute("seconds", std::to_string(stamp.seconds));
    attribute("fractionA", std::to_string(stamp.fractionA));
    attribute("fractionB", std::to_string(stamp.fractionB));
    attribute("further", std::to_string(stamp.further));
    attribute("offsetMinutes", std::to_string(stamp.offsetMinutes));
  }
  out_.write(">" + text);
}

void XmlWriter::putArray(const Node& node)
{
  out_.write(">");
  bool first = true;
  for (uint64_t at = node.payloadOffset(); at < node.payloadOffset() + node.size(); at += 8)
  {
    uint64_t number = 0;
    source_.read(at, std::span(reinterpret_cast<uint8_t*>(&number), sizeof number));
    number = form_.swapped ? kor::byteswap64(number) : number;
    out_.write((std::exchange(first, false) ? "" : " ") + std::to_string(number));
  }
}

void XmlWriter::putText(const Node& node, uint64_t skip)
{
  const uint64_t start = node.payloadOffset();
  if (skip != 0)
  {
    uint16_t codePage = 0;
    source_.read(start, std::span(reinterpret_cast<uint8_t*>(&codePage), sizeof codePage));
    codePage = form_.swapped ? kor::byteswap16(codePage) : codePage;
    if (codePage != kUsualCodePage)
    {
      attribute("codePage", std::to_string(codePage));
    }
  }
  out_.write(">");
  eachPiece(start + skip, start + node.size(), [&](std::string_view text) {
    out_.write(escaped(text, false));
    return true;
  });
}

void XmlWriter::putHex(uint64_t from, uint64_t length)
{
  for (const uint64_t end = from + length; from < end; from += buffer_.size())
  {
    buffer_.resize(static_cast<size_t>(std::min<uint64_t>(kPiece, end - from)));
    buffer_.resize(source_.read(from, buffer_));
    if (buffer_.empty())
    {
      return; // the file became shorter
    }
    out_.write(hexText(buffer_));
  }
}

void XmlWriter::putDamage(const Event& event)
{
  indent(event.depth);
  const bool zeros = event.what == What::zeros;
  const std::string name = zeros ? "zeros" : event.what == What::damaged ? "damaged"
                                                                         : "unread";
  out_.write("<" + name);
  attribute("offset", hexOffset(event.offset));
  attribute("length", std::to_string(event.length));
  if (event.what == What::damaged)
  {
    attribute("reason", event.reason);
    attribute("encoding", "hex");
  }
  out_.write(zeros ? "/>\n" : ">");
  if (!zeros)
  {
    putHex(event.offset, event.length);
    out_.write("</" + name + ">\n");
  }
}

} // namespace

bool toXml(ByteSource& source, const Form& form, Sink& out, const ToXmlOptions& options)
{
  Walker walker(source, form);
  DamageWatch watch(source, form, [&](PassedOver passed) {
    if (options.passedOver)
    {
      options.passedOver(std::move(passed));
    }
  });
  XmlWriter writer(source, form, out);
  writer.begin();
  bool damaged = false;
  Event event;
  while (walker.next(event))
  {
    watch.see(walker, event);
    if (options.progress)
    {
      options.progress(event.offset);
    }
    damaged = damaged || event.what == What::damaged || event.what == What::unread;
    if (options.ends || !isEndPiece(event))
    {
      writer.add(event);
    }
  }
  writer.end();
  return damaged;
}

} // namespace tav::inspect
