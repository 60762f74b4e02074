// The forms of Reader::print.
#include <array>
#include <cstdint>
#include <iterator>
#include <string>
#include <string_view>

#include "layer/elementNames.h"
#include "layer/printedText.h"
#include "tav/cpp/print.hpp"
#include "tav/cpp/ranges.hpp"
#include "tav/cpp/stack.hpp"
#include "tav/cpp/valueText.hpp"

namespace tav::detail
{

/// Prints one node and all below it. The text form is that of tavPrintSubtree. So is the XML, but that it is always
/// well-formed: texts are escaped, what XML cannot hold is in hexadecimal digits with encoding="hex".
class Printer
{
public:
  Printer(FILE* stream, const PrintOptions& options, bool swapped)
      : stream_(stream), options_(options), swapped_(swapped)
  {
  }

  uint32_t print(const Node& start)
  {
    const bool below = options_.subtree && start.isGroup();
    if (below && options_.bare)
    {
      return TAV_RC_BAD_PARAM;
    }
    if (options_.xml)
    {
      text_ += "<?xml version=\"1.0\" encoding=\"UTF-8\" ?>\n";
    }
    const bool tags = below || options_.xml;
    if (tags)
    {
      open(start, 0);
    }
    body(start, 0);
    uint32_t rc = TAV_RC_OK;
    if (below)
    {
      open_.push(start.elm());
      rc = printBelow(start);
    }
    else if (tags)
    {
      close(start.elm(), 0, !start.isGroup());
    }
    handOver();
    return failed_ ? KOR_RC_IO_ERROR : rc == TAV_RC_OK && count_ == 0 ? TAV_RC_NO_MEMORY
                                                                      : rc;
  }

  /// Characters that the stream has taken.
  [[nodiscard]] uint64_t count() const noexcept
  {
    return count_;
  }

private:
  static constexpr size_t kDeepest = 4000; ///< as everywhere: what is deeper costs blanks without bound
  static constexpr size_t kBlock = size_t{32} * 1024;

  struct Label
  {
    std::string_view text;
    std::string_view tag;
  };

  uint32_t printBelow(const Node& start)
  {
    std::error_code ec;
    DescendantRange all = start.descendants(ec, EndElements::show);
    for (auto at = all.begin(); at != std::default_sentinel && !failed_; ++at)
    {
      const Node& node = *at;
      closeDownTo(all.depth());
      printInside(node, all.depth());
      if (node.isGroup() && open_.size() >= kDeepest)
      {
        return TAV_RC_NO_MEMORY;
      }
      if (node.isGroup())
      {
        open_.push(node.elm());
      }
      if (text_.size() >= kBlock)
      {
        handOver();
      }
    }
    if (!ec)
    {
      closeDownTo(0);
    }
    return codeOf(ec);
  }

  void closeDownTo(size_t depth)
  {
    while (open_.size() > depth)
    {
      close(open_.back(), open_.size() - 1, false);
      open_.pop();
    }
  }

  void printInside(const Node& node, size_t depth)
  {
    open(node, depth);
    body(node, depth);
    if (!node.isGroup())
    {
      close(node.elm(), depth, true);
    }
  }

  /// What is before a line.
  void begin(size_t depth, size_t further = 0)
  {
    if (!options_.xml)
    {
      const std::string level = std::to_string(depth);
      text_.append(level.size() < 3 ? 3 - level.size() : 0, ' ').append(level) += '|';
    }
    text_.append(3 * (depth + further), ' ');
  }

  static std::string_view nameOf(std::string_view tag) noexcept
  {
    return tag.empty() ? "element" : tag;
  }
  static std::string_view tagName(uint16_t elm) noexcept
  {
    return nameOf(elementTag(elm));
  }
  static std::string_view enumName(uint16_t elm) noexcept
  {
    const std::string_view name = elementName(elm);
    return name.empty() ? "Unknown Element" : name;
  }

  void open(const Node& node, size_t depth)
  {
    begin(depth);
    if (!options_.xml)
    {
      text_.append(enumName(node.elm())) += '\n';
      begin(depth);
      text_ += "{\n";
      return;
    }
    tag_ = elementTag(node.elm());
    text_ += '<';
    text_.append(nameOf(tag_));
    if (tag_.empty())
    {
      text_.append(" id=\"").append(std::to_string(node.elm())) += '"';
    }
    if (node.isGroup())
    {
      appendKeys(node, depth);
    }
    else if (!isWrapped())
    {
      options_.data || options_.bare ? takeValue(node, value_) : value_.clear();
      appendForm(value_);
    }
    text_ += '>';
    if (node.isGroup() || options_.headers)
    {
      text_ += '\n';
    }
  }

  /// `onTheLine`: of a data element, whose tag was the last to be opened.
  void close(uint16_t elm, size_t depth, bool onTheLine)
  {
    if (!onTheLine || options_.headers || !options_.xml)
    {
      begin(depth);
    }
    if (options_.xml)
    {
      text_.append("</", 2).append(onTheLine ? nameOf(tag_) : tagName(elm)).append(">\n", 2);
    }
    else
    {
      text_ += "}\n";
    }
  }

  /// Whether the value is in an element of its own, beside others.
  [[nodiscard]] bool isWrapped() const noexcept
  {
    return !options_.bare && (options_.headers || options_.descriptors);
  }

  void body(const Node& node, size_t depth)
  {
    const bool isValue = !node.isGroup();
    if (options_.bare)
    {
      if (isValue)
      {
        if (!options_.xml)
        {
          takeValue(node, value_);
        }
        appendValue(value_);
      }
      return;
    }
    if (options_.headers)
    {
      header(node, depth);
    }
    if (!options_.data)
    {
      return;
    }
    if (options_.descriptors)
    {
      descriptor(node, depth);
    }
    options_.xml ? dataXml(node, depth) : dataText(node, depth);
  }

  void dataText(const Node& node, size_t depth)
  {
    if (!node.isGroup() && node.size() != 0)
    {
      begin(depth);
      text_ += "   ";
      takeValue(node, value_);
      appendValue(value_);
      text_ += '\n';
    }
  }

  void dataXml(const Node& node, size_t depth)
  {
    if (!isWrapped())
    {
      if (!node.isGroup())
      {
        appendValue(value_);
      }
      return;
    }
    begin(depth, 1);
    text_ += "<tavData";
    node.isGroup() ? value_.clear() : takeValue(node, value_);
    appendForm(value_);
    text_ += '>';
    appendValue(value_);
    text_ += "</tavData>\n";
  }

  /// In XML, characters that it cannot hold become the payload's digits.
  void takeValue(const Node& node, ValueText& value) const
  {
    if (node.size() == 0 || node.data_.pDataBuf == nullptr)
    {
      return value.clear();
    }
    const RawValue raw{node.type(), node.data_.pDataBuf, node.size(), swapped_};
    showValue(value, raw);
    if (options_.xml && value.isText && !isXmlText(value.shown))
    {
      value.clear();
      showBytes(value, raw);
    }
    if (!options_.xml && raw.type == TAV_TYPE_ASCII_STRING)
    {
      value.shown = value.shown.substr(0, value.shown.find('\0'));
    }
  }

  /// What an element's tag says of a value that is no plain text.
  void appendForm(const ValueText& value)
  {
    if (value.isHex)
    {
      text_ += " encoding=\"hex\"";
    }
    else if (value.codePage != kCodePageUtf8)
    {
      text_.append(" codePage=\"").append(std::to_string(value.codePage)) += '"';
    }
  }

  void appendValue(const ValueText& value)
  {
    if (options_.xml && value.isText)
    {
      appendXml(text_, value.shown, false);
    }
    else
    {
      text_ += value.shown;
    }
  }

  template<size_t Size>
  static size_t placeIn(const std::array<uint16_t, Size>& ids, uint16_t id) noexcept
  {
    size_t place = 0;
    while (place < Size && ids[place] != id)
    {
      ++place;
    }
    return place;
  }

  /// The key elements of a group as attributes, of several alike the first. They are printed below it as well.
  void appendKeys(const Node& group, size_t depth)
  {
    constexpr std::array<uint16_t, 3> keyed{SQLM_ELM_DBASE, SQLM_ELM_NODE, TAV_ELM_CMN_HOST};
    constexpr std::array<uint16_t, 3> keys{SQLM_ELM_NODE_NUMBER, SQLM_ELM_DB_NAME, TAV_ELM_CMN_HOST_NAME};
    if (!options_.attributes || depth == 0 || placeIn(keyed, group.elm()) == keyed.size())
    {
      return;
    }
    std::array<bool, keys.size()> seen{};
    ValueText key;
    std::error_code ec; // which the walk below the group meets again
    for (const Node& child : group.children(ec))
    {
      const size_t place = placeIn(keys, child.elm());
      if (place == keys.size() || seen[place] || child.isGroup())
      {
        continue;
      }
      seen[place] = true;
      text_.append(" ").append(tagName(child.elm())) += "=\"";
      takeValue(child, key);
      appendXml(text_, key.shown, true);
      text_ += '"';
    }
  }

  void beginRecord(size_t depth, size_t level, const Label& label)
  {
    begin(depth, level);
    if (options_.xml)
    {
      text_.append("<").append(label.tag) += ">\n";
      return;
    }
    text_.append(label.text) += '\n';
    begin(depth, level);
    text_ += "{\n";
  }

  void endRecord(size_t depth, size_t level, const Label& label)
  {
    begin(depth, level);
    options_.xml ? text_.append("</").append(label.tag).append(">\n") : text_.append("}\n");
  }

  void field(size_t depth, size_t level, const Label& label, std::string_view value)
  {
    begin(depth, level);
    if (!options_.xml)
    {
      text_.append(label.text).append(value) += '\n';
      return;
    }
    text_.append("<").append(label.tag) += '>';
    appendXml(text_, value, false);
    text_.append("</").append(label.tag) += ">\n";
  }

  /// A code with a name; XML shows the name alone.
  void codeField(size_t depth, size_t level, const Label& label, uint16_t code, std::string_view name)
  {
    const std::string both = std::to_string(code) + " ( " + std::string(name) + " )";
    field(depth, level, label, options_.xml ? name : both);
  }

  static std::string hexNumber(uint64_t number, size_t width)
  {
    const std::string text = hexDigits(number, "0123456789ABCDEF");
    return std::string(width > text.size() ? width - text.size() : 0, '0') + text;
  }

  void header(const Node& node, size_t depth)
  {
    constexpr Label whole{"TAVHeader", "tavHeader"};
    const bool wide = node.width() == Width::bits64;
    const Label form = wide ? Label{"TAVHeader64", "tavHeader64"} : Label{"TAVHeader32", "tavHeader32"};
    const auto hdrType = static_cast<uint16_t>(node.width());
    beginRecord(depth, 1, whole);
    beginRecord(depth, 2, form);
    field(depth, 3, {"size = ", "size"}, std::to_string(node.size()));
    if (wide)
    {
      field(depth, 3, {"info = ", "info"}, hexNumber(node.info(), 1));
    }
    codeField(depth, 3, {"type = ", "type"}, node.type(), layout::typePrintName(node.type()));
    codeField(depth, 3, {"elm  = ", "elm"}, node.elm(), enumName(node.elm()));
    endRecord(depth, 2, form);
    codeField(depth, 2, {"hdrType    = ", "hdrType"}, hdrType, layout::typePrintName(hdrType));
    field(depth, 2, {"nodeOffset = ", "nodeOffset"}, std::to_string(node.offset()));
    endRecord(depth, 1, whole);
  }

  void descriptor(const Node& node, size_t depth)
  {
    constexpr size_t addressDigits = 16;
    const TAVHeaderData& data = node.data_;
    const auto address = static_cast<uint64_t>(reinterpret_cast<uintptr_t>(data.pDataBuf));
    field(depth, 1, {"pDataBuf      = ", "pDataBuf"}, hexNumber(address, addressDigits));
    field(depth, 1, {"dataBufSize   = ", "dataBufSize"}, std::to_string(data.dataBufSize));
    field(depth, 1, {"dataBufOffset = ", "dataBufOffset"}, std::to_string(data.dataBufOffset));
  }

  void handOver()
  {
    const size_t taken = failed_ ? 0 : std::fwrite(text_.data(), 1, text_.size(), stream_);
    failed_ = failed_ || taken != text_.size();
    count_ += taken;
    text_.clear();
  }

  FILE* stream_;
  PrintOptions options_;
  bool swapped_;
  PrintedText text_; ///< that the stream has not got yet
  Stack<uint16_t> open_;
  std::string_view tag_; ///< of the node that was opened last; empty for one without a name
  ValueText value_;      ///< of the data element whose tag is open
  uint64_t count_ = 0;
  bool failed_ = false;
};

uint32_t printNode(FILE* stream, const PrintOptions& options, const Node& start, bool swapped, uint64_t& characters)
{
  Printer printer(stream, options, swapped);
  const uint32_t rc = printer.print(start);
  characters = printer.count();
  return rc;
}

} // namespace tav::detail
