/// Printing what a descriptor says: the header, and where the data lie.
#include <algorithm>
#include <bit>

#include "api/printer.h"
#include "dictionary/dictionary.h"
#include "format/layout.h"

namespace tav::print
{
namespace
{

/// What a line begins with in the text form, and its element in XML.
struct Label
{
  std::string_view text;
  std::string_view tag;
};

/// The characters of a number.
class Characters
{
public:
  static Characters decimal(uint64_t number)
  {
    Characters result;
    result.length_ = static_cast<size_t>(digits::writeDecimal(result.text_.data(), number) - result.text_.data());
    return result;
  }

  /// The number in hexadecimal digits, with zeros before it up to `width`.
  static Characters hex(uint64_t number, size_t width)
  {
    Characters result;
    const size_t length = std::max(width, (static_cast<size_t>(std::bit_width(number)) + 3) / 4);
    for (size_t at = length; at != 0; number >>= 4U)
    {
      result.text_[--at] = digits::hexDigit(number & 0xFU);
    }
    result.length_ = length;
    return result;
  }

  [[nodiscard]] std::string_view view() const
  {
    return {text_.data(), length_};
  }

private:
  std::array<char, digits::kLongest> text_;
  size_t length_ = 0;
};

/// Records of fields in either form: "name = value" between braces, or elements.
class Fields
{
public:
  explicit Fields(TAVPrintCtx& ctx)
      : ctx_(ctx), xml_(has(ctx, TAV_PRINT_XML))
  {
  }

  /// Opens a record; what follows stands a step further in.
  void open(const Label& label)
  {
    if (xml_)
    {
      line(ctx_, {indentation(), "<", label.tag, ">\n"});
    }
    else
    {
      line(ctx_, {indentation(), label.text, "\n"});
      line(ctx_, {indentation(), "{\n"});
    }
    ++level_;
  }

  void close(const Label& label)
  {
    --level_;
    if (xml_)
    {
      line(ctx_, {indentation(), "</", label.tag, ">\n"});
    }
    else
    {
      line(ctx_, {indentation(), "}\n"});
    }
  }

  void value(const Label& label, std::string_view value)
  {
    if (xml_)
    {
      line(ctx_, {indentation(), "<", label.tag, ">", value, "</", label.tag, ">\n"});
    }
    else
    {
      line(ctx_, {indentation(), label.text, value, "\n"});
    }
  }

  void number(const Label& label, uint64_t number)
  {
    value(label, Characters::decimal(number).view());
  }

  /// A code with a name; XML shows the name alone.
  void code(const Label& label, uint16_t code, std::string_view name)
  {
    if (xml_)
    {
      value(label, name);
    }
    else
    {
      line(ctx_, {indentation(), label.text, Characters::decimal(code).view(), " ( ", name, " )\n"});
    }
  }

private:
  [[nodiscard]] std::string_view indentation() const
  {
    constexpr std::string_view blanks = "         ";
    return blanks.substr(0, level_ * kBlanksPerLevel);
  }

  TAVPrintCtx& ctx_;
  bool xml_;
  size_t level_ = 1;
};

} // namespace

void header(TAVPrintCtx& ctx, const TAVHeader& header)
{
  constexpr Label whole{"TAVHeader", "tavHeader"};
  const Label form = is64(header) ? Label{"TAVHeader64", "tavHeader64"} : Label{"TAVHeader32", "tavHeader32"};
  Fields fields(ctx);
  fields.open(whole);
  fields.open(form);
  fields.number({"size = ", "size"}, sizeOf(header));
  if (is64(header))
  {
    fields.value({"info = ", "info"}, Characters::hex(header.hdr64.info, 1).view());
  }
  fields.code({"type = ", "type"}, typeOf(header), typePrintName(typeOf(header)));
  fields.code({"elm  = ", "elm"}, elmOf(header), elementEnumName(elmOf(header)));
  fields.close(form);
  fields.code({"hdrType    = ", "hdrType"}, header.hdrType, typePrintName(header.hdrType));
  fields.number({"nodeOffset = ", "nodeOffset"}, header.nodeOffset);
  fields.close(whole);
}

void descriptor(TAVPrintCtx& ctx, const TAVHeaderData& node)
{
  constexpr size_t addressDigits = 16;
  const auto address = static_cast<uint64_t>(reinterpret_cast<uintptr_t>(node.pDataBuf));
  Fields fields(ctx);
  fields.value({"pDataBuf      = ", "pDataBuf"}, Characters::hex(address, addressDigits).view());
  fields.number({"dataBufSize   = ", "dataBufSize"}, node.dataBufSize);
  fields.number({"dataBufOffset = ", "dataBufOffset"}, node.dataBufOffset);
}

} // namespace tav::print
