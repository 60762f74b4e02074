#include "tav/inspect/xml.hpp"

#include <algorithm>
#include <initializer_list>
#include <string>
#include <utility>
#include <vector>

#include "inspect/text/bytes.h"
#include "inspect/text/date.h"
#include "tav/cpp/valueText.hpp"
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
constexpr uint64_t kMaxNumber = 64;             ///< bytes of the longest value that is one number or date
constexpr size_t kMostText = size_t{16} * 1024; ///< that is kept before it is handed over

/// Appends text; in attributes also quotation marks and what a reader would make a blank are escaped.
void appendEscaped(std::string& out, std::string_view text, bool attribute)
{
  for (size_t at = 0; !text.empty(); text.remove_prefix(at))
  {
    at = std::min(text.find_first_of(attribute ? "&<>\r\"\n\t" : "&<>\r"), text.size());
    out += text.substr(0, at);
    if (at == text.size())
    {
      return;
    }
    out += detail::xmlEscape(text[at++], attribute);
  }
}

/// Writes the events of a walk as XML.
class XmlWriter
{
public:
  XmlWriter(ByteSource& source, const Form& form, Sink& out)
      : source_(source), form_(form), out_(out) {}

  void begin()
  {
    put("<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<tav");
    attribute("byteOrder", form_.swapped != kor::isLittleEndian ? "little" : "big");
    attribute("root", form_.root64 ? "64" : "32");
    attribute("aligned", form_.aligned ? "true" : "false");
    put(">\n");
    flush();
  }

  void end()
  {
    put("</tav>\n");
    flush();
  }

  void add(const Event& event)
  {
    take(event);
    flush();
  }

private:
  void take(const Event& event)
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
        endTag(event.node);
      }
      return;
    case What::damaged:
    case What::unread:
    case What::zeros: putDamage(event); return;
    default: return; // told with the node
    }
  }

  void put(std::string_view text)
  {
    text_ += text;
    if (text_.size() > kMostText)
    {
      flush();
    }
  }

  /// At the end of each call, too: what was written is there when the walk fails behind it.
  void flush()
  {
    if (!text_.empty())
    {
      out_.write(text_);
      text_.clear();
    }
  }

  void indent(uint64_t depth) { text_.append(static_cast<size_t>(1 + std::min(depth, kMaxIndent)), ' '); }

  void attribute(std::string_view name, std::string_view value)
  {
    text_ += ' ';
    text_ += name;
    text_ += "=\"";
    appendEscaped(text_, value, true);
    text_ += '"';
  }

  void attribute(Attribute which, std::string_view value)
  {
    attribute(detail::paths::kAttributeNames[static_cast<size_t>(which)], value);
  }

  void attributes(const Node& node, std::initializer_list<Attribute> which);
  void beginTag(const Node& node);
  void beginGroup(const Node& node)
  {
    beginTag(node);
    put(">\n");
  }
  void endTag(const Node& node)
  {
    text_ += "</";
    appendXmlName(text_, node.elm(), source_.dictionary());
    put(">\n");
  }
  void putData(const Node& node);
  void putDate(const Node& node);
  void putArray(const Node& node);
  void putText(uint64_t from, uint64_t end);
  void putHex(uint64_t from, uint64_t length);
  void putDamage(const Event& event);
  std::string_view piece(uint64_t from, uint64_t end);

  ByteSource& source_;
  Form form_;
  Sink& out_;
  std::vector<uint8_t> buffer_{};
  std::string text_{};  ///< what is not handed over yet
  std::string value_{}; ///< of an attribute
};

/// The bytes from an offset on, at most a piece, cut between characters. Valid until the source is asked again.
std::string_view XmlWriter::piece(uint64_t from, uint64_t end)
{
  const auto count = static_cast<size_t>(std::min<uint64_t>(kPiece + 4, end - from));
  const std::string_view bytes = asText(bytesAt(source_, from, count, buffer_));
  return bytes.substr(0, cutAtCharacter(bytes, kPiece));
}

void XmlWriter::attributes(const Node& node, std::initializer_list<Attribute> which)
{
  for (const Attribute one : which)
  {
    value_.clear();
    if (appendAttributeText(value_, source_, form_, node, one))
    {
      attribute(one, value_);
    }
  }
}

void XmlWriter::beginTag(const Node& node)
{
  text_ += '<';
  appendXmlName(text_, node.elm(), source_.dictionary());
  attributes(node, {Attribute::id, Attribute::name, Attribute::type, Attribute::header, Attribute::info,
                    Attribute::eyeSize, Attribute::size, Attribute::extra});
}

void XmlWriter::putData(const Node& node)
{
  const uint64_t start = node.payloadOffset();
  beginTag(node);
  switch (xmlValueOf(source_, node))
  {
  case XmlValue::number:
    text_ += '>';
    appendPlainText(text_, source_, form_, node, kMaxNumber);
    break;
  case XmlValue::date: putDate(node); break;
  case XmlValue::text:
    attributes(node, {Attribute::codePage});
    putText(start + (node.type() == TAV_TYPE_UTF8_STRING ? 2 : 0), start + node.size());
    break;
  case XmlValue::array: putArray(node); break;
  default:
    attribute("encoding", "hex");
    put(">");
    putHex(start, node.size());
  }
  endTag(node);
}

/// With the parts that its text does not tell.
void XmlWriter::putDate(const Node& node)
{
  if (const auto stamp = untoldDate(source_, form_, node))
  {
    for (const Attribute part : {Attribute::seconds, Attribute::fractionA, Attribute::fractionB, Attribute::further,
                                 Attribute::offsetMinutes})
    {
      value_.clear();
      appendPartOfDate(value_, *stamp, part);
      attribute(part, value_);
    }
  }
  text_ += '>';
  appendPlainText(text_, source_, form_, node, kMaxNumber);
}

void XmlWriter::putArray(const Node& node)
{
  put(">");
  bool first = true;
  for (uint64_t at = node.payloadOffset(); at < node.payloadOffset() + node.size(); at += 8)
  {
    uint64_t number = 0;
    source_.read(at, std::span(reinterpret_cast<uint8_t*>(&number), sizeof number));
    number = form_.swapped ? kor::byteswap64(number) : number;
    put(std::exchange(first, false) ? "" : " ");
    appendNumber(text_, number);
  }
}

void XmlWriter::putText(uint64_t from, uint64_t end)
{
  put(">");
  while (from < end)
  {
    const std::string_view bytes = piece(from, end);
    if (bytes.empty())
    {
      return;
    }
    appendEscaped(text_, bytes, false);
    put({});
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
    put(hexText(buffer_));
  }
}

void XmlWriter::putDamage(const Event& event)
{
  indent(event.depth);
  const bool zeros = event.what == What::zeros;
  const std::string name = zeros ? "zeros" : event.what == What::damaged ? "damaged"
                                                                         : "unread";
  put("<" + name);
  attribute("offset", hexOffset(event.offset));
  attribute("length", std::to_string(event.length));
  if (event.what == What::damaged)
  {
    attribute("reason", event.reason);
    attribute("encoding", "hex");
  }
  put(zeros ? "/>\n" : ">");
  if (!zeros)
  {
    putHex(event.offset, event.length);
    put("</" + name + ">\n");
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
