/// Printing what a descriptor says: the header, and where the data lie.
#include <algorithm>
#include <bit>

#include "api/printer.h"
#include "dictionary/dictionary.h"
#include "format/layout.h"

namespace tav::inside::print
{
namespace
{

/// The characters of a number.
struct Characters
{
  std::array<char, digits::kLongest> text;
  size_t length;

  operator std::string_view() const // NOLINT(google-explicit-constructor): a text is what it is
  {
    return {text.data(), length};
  }
};

Characters decimal(uint64_t number)
{
  Characters result{};
  result.length = static_cast<size_t>(digits::writeDecimal(result.text.data(), number) - result.text.data());
  return result;
}

/// A number in hexadecimal digits, with zeros before it up to `width`.
Characters hex(uint64_t number, size_t width)
{
  Characters result{};
  result.length = std::max(width, (static_cast<size_t>(std::bit_width(number)) + 3) / 4);
  for (size_t at = result.length; at != 0; number >>= 4U)
  {
    result.text[--at] = digits::hexDigit(number & 0xFU);
  }
  return result;
}

/// Records of fields in either form: "name = value" between braces, or elements.
class Fields
{
public:
  explicit Fields(TAVPrintCtx& ctx)
      : ctx_(ctx), xml_(has(ctx, TAV_PRINT_XML))
  {
  }

  /// Opens a record; what follows stands a step further in.
  void open(std::string_view text, std::string_view tag)
  {
    row({indent(), "<", tag, ">\n"}, {indent(), text, "\n"});
    if (!xml_)
    {
      line(ctx_, {indent(), "{\n"});
    }
    ++level_;
  }

  void close(std::string_view tag)
  {
    --level_;
    row({indent(), "</", tag, ">\n"}, {indent(), "}\n"});
  }

  /// A field whose name takes so many characters in the text form.
  void value(std::string_view name, size_t width, std::string_view value)
  {
    row({indent(), "<", name, ">", value, "</", name, ">\n"},
        {indent(), name, kBlanks.substr(0, width - name.size()), " = ", value, "\n"});
  }

  /// A code with a name; XML shows the name alone.
  void code(std::string_view field, size_t width, uint16_t code, std::string_view name)
  {
    row({indent(), "<", field, ">", name, "</", field, ">\n"},
        {indent(), field, kBlanks.substr(0, width - field.size()), " = ", decimal(code), " ( ", name, " )\n"});
  }

private:
  static constexpr std::string_view kBlanks = "             ";
  using Parts = std::initializer_list<std::string_view>;

  /// A line in the form that is asked for.
  void row(Parts xml, Parts text)
  {
    line(ctx_, xml_ ? xml : text);
  }

  [[nodiscard]] std::string_view indent() const
  {
    return kBlanks.substr(0, level_ * kBlanksPerLevel);
  }

  TAVPrintCtx& ctx_;
  bool xml_;
  size_t level_ = 1;
};

} // namespace

void header(TAVPrintCtx& ctx, const TAVHeader& header)
{
  const bool wide = is64(header);
  Fields fields(ctx);
  fields.open("TAVHeader", "tavHeader");
  fields.open(wide ? "TAVHeader64" : "TAVHeader32", wide ? "tavHeader64" : "tavHeader32");
  fields.value("size", 4, decimal(sizeOf(header)));
  if (wide)
  {
    fields.value("info", 4, hex(header.hdr64.info, 1));
  }
  fields.code("type", 4, typeOf(header), typePrintName(typeOf(header)));
  fields.code("elm", 4, elmOf(header), elementEnumName(elmOf(header)));
  fields.close(wide ? "tavHeader64" : "tavHeader32");
  fields.code("hdrType", 10, header.hdrType, typePrintName(header.hdrType));
  fields.value("nodeOffset", 10, decimal(header.nodeOffset));
  fields.close("tavHeader");
}

void descriptor(TAVPrintCtx& ctx, const TAVHeaderData& node)
{
  constexpr size_t addressDigits = 16;
  Fields fields(ctx);
  fields.value("pDataBuf", 13, hex(reinterpret_cast<uintptr_t>(node.pDataBuf), addressDigits));
  fields.value("dataBufSize", 13, decimal(node.dataBufSize));
  fields.value("dataBufOffset", 13, decimal(node.dataBufOffset));
}

} // namespace tav::inside::print
