/// Printing what a descriptor says: the header, and where the data lie.
#include <array>

#include "api/digits.h"
#include "api/printer.h"
#include "dictionary/dictionary.h"
#include "format/layout.h"

namespace tav::inside::print
{
namespace
{

/// The characters of a number, with zeros before it up to `width`.
class Number
{
public:
  explicit Number(uint64_t value, unsigned base = 10, size_t width = 1)
  {
    for (; value != 0 || length_ < width; value /= base)
    {
      text_[text_.size() - ++length_] = digits::hexDigit(value % base);
    }
  }
  operator std::string_view() const // NOLINT(google-explicit-constructor): a text is what it is
  {
    return {text_.data() + text_.size() - length_, length_};
  }

private:
  std::array<char, 20> text_; ///< at its end
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

  /// Opens a record; what follows is indented one step more.
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

  /// A field whose name takes so many characters in the text form. Of a code that has a name XML shows the name alone.
  void field(std::string_view name, size_t width, const Number& value, std::string_view codeName = {})
  {
    const bool named = codeName.data() != nullptr;
    row({indent(), "<", name, ">", named ? codeName : value, "</", name, ">\n"},
        {indent(), name, kBlanks.substr(0, width - name.size()), " = ", value, named ? " ( " : "", codeName,
         named ? " )\n" : "\n"});
  }

private:
  static constexpr std::string_view kBlanks = "             ";

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
  fields.field("size", 4, Number(sizeOf(header)));
  if (wide)
  {
    fields.field("info", 4, Number(header.hdr64.info, 16));
  }
  fields.field("type", 4, Number(typeOf(header)), typePrintName(typeOf(header)));
  fields.field("elm", 4, Number(elmOf(header)), elementEnumName(elmOf(header)));
  fields.close(wide ? "tavHeader64" : "tavHeader32");
  fields.field("hdrType", 10, Number(header.hdrType), typePrintName(header.hdrType));
  fields.field("nodeOffset", 10, Number(header.nodeOffset));
  fields.close("tavHeader");
}

void descriptor(TAVPrintCtx& ctx, const TAVHeaderData& node)
{
  Fields fields(ctx);
  fields.field("pDataBuf", 13, Number(reinterpret_cast<uintptr_t>(node.pDataBuf), 16, 16));
  fields.field("dataBufSize", 13, Number(node.dataBufSize));
  fields.field("dataBufOffset", 13, Number(node.dataBufOffset));
}

} // namespace tav::inside::print
