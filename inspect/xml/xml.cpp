#include "tav/inspect/xml.hpp"

#include <algorithm>
#include <initializer_list>
#include <utility>
#include <vector>

#include "inspect/text/bytes.h"
#include "tav/inspect/attributes.hpp"
#include "tav/inspect/jsonText.hpp"
#include "tav/inspect/phrases.hpp"
#include "tav/inspect/value.hpp"
#include "tav/inspect/walker.hpp"

namespace tav::inspect
{

namespace
{

using detail::paths::Attribute;

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
        out_.write("</" + xmlNameOf(event.node.elm(), source_.dictionary()) + ">\n");
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

  void attributes(const Node& node, std::initializer_list<Attribute> which);
  void beginTag(const Node& node);
  void beginGroup(const Node& node)
  {
    beginTag(node);
    out_.write(">\n");
  }
  void putData(const Node& node);
  void putArray(const Node& node);
  void putText(uint64_t from, uint64_t end);
  void putHex(uint64_t from, uint64_t length);
  void putDamage(const Event& event);
  std::string_view piece(uint64_t from, uint64_t end);

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

void XmlWriter::attributes(const Node& node, std::initializer_list<Attribute> which)
{
  for (const Attribute one : which)
  {
    if (const auto text = attributeText(source_, form_, node, one))
    {
      attribute(detail::paths::kAttributeNames[static_cast<size_t>(one)], *text);
    }
  }
}

void XmlWriter::beginTag(const Node& node)
{
  out_.write("<" + xmlNameOf(node.elm(), source_.dictionary()));
  attributes(node, {Attribute::id, Attribute::name, Attribute::type, Attribute::header, Attribute::info,
                    Attribute::eyeSize, Attribute::size, Attribute::extra});
}

void XmlWriter::putData(const Node& node)
{
  const uint64_t start = node.payloadOffset();
  beginTag(node);
  switch (xmlValueOf(source_, node))
  {
  case XmlValue::number: out_.write(">" + plainText(source_, form_, node, kMaxNumber).value_or("")); break;
  case XmlValue::date:
    attributes(node, {Attribute::seconds, Attribute::fractionA, Attribute::fractionB, Attribute::further,
                      Attribute::offsetMinutes});
    out_.write(">" + plainText(source_, form_, node, kMaxNumber).value_or(""));
    break;
  case XmlValue::text:
    attributes(node, {Attribute::codePage});
    putText(start + (node.type() == TAV_TYPE_UTF8_STRING ? 2 : 0), start + node.size());
    break;
  case XmlValue::array: putArray(node); break;
  default:
    attribute("encoding", "hex");
    out_.write(">");
    putHex(start, node.size());
  }
  out_.write("</" + xmlNameOf(node.elm(), source_.dictionary()) + ">\n");
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

void XmlWriter::putText(uint64_t from, uint64_t end)
{
  out_.write(">");
  while (from < end)
  {
    const std::string_view bytes = piece(from, end);
    if (bytes.empty())
    {
      return;
    }
    out_.write(escaped(bytes, false));
    from += bytes.size();
  }
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
