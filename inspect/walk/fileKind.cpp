#include "tav/inspect/fileKind.hpp"

#include <algorithm>
#include <array>
#include <string>
#include <vector>

#include "inspect/dictionary/builtIn.h"
#include "tav/inspect/form.hpp"
#include "tav/inspect/jsonText.hpp"
#include "tav/inspect/value.hpp"
#include "tav/inspect/walker.hpp"

namespace tav::inspect
{

namespace
{

using namespace std::string_view_literals;

struct Magic
{
  std::string_view bytes;
  FileKind kind;
};

constexpr std::array<Magic, 10> kMagics{{
    {"\x1F\x8B\x08"sv, {"gzip", "a gzip file"}},
    {"PK\x03\x04"sv, {"zip", "a zip file"}},
    {"PK\x05\x06"sv, {"zip", "a zip file", true}},
    {"PK\x07\x08"sv, {"zip", "a zip file"}},
    {"\x28\xB5\x2F\xFD"sv, {"zstd", "a zstd file"}},
    {"\x7F"
     "ELF"sv,
     {"elf", "an ELF file"}},
    {"SQLite format 3\0"sv, {"sqlite", "an SQLite database"}},
    {"PAR1"sv, {"parquet", "a Parquet file"}},
    {"\xFF\xFE<\0"sv, {"xml", "XML in UTF-16"}},
    {"\xFE\xFF\0<"sv, {"xml", "XML in UTF-16"}},
}};

constexpr size_t kLook = size_t{64} * 1024;

/// Whether bytes are text as people write it: UTF-8 without control characters but those that lay it out.
bool isPlainText(std::string_view text)
{
  constexpr auto steers = [](char c) {
    const auto byte = static_cast<uint8_t>(c);
    return byte == 0x7F || (byte < 0x20 && c != '\t' && c != '\n' && c != '\r' && c != '\f');
  };
  return std::none_of(text.begin(), text.end(), steers) && isUtf8(text);
}

FileKind kindOfText(std::string_view text)
{
  constexpr std::string_view mark = "\xEF\xBB\xBF";
  text.remove_prefix(text.starts_with(mark) ? mark.size() : 0);
  text.remove_prefix(std::min(text.find_first_not_of(" \t\r\n\f"), text.size()));
  const auto second = text.substr(std::min<size_t>(1, text.size())).find_first_not_of(" \t\r\n\f");
  const char next = second == std::string_view::npos ? '\0' : text[second + 1];
  if (text.starts_with('{') && (next == '"' || next == '}' || next == '\0'))
  {
    return {"json", "JSON"};
  }
  const bool value = next == '[' || next == '{' || next == '"' || next == ']' || next == '-' || next == 't' ||
                     next == 'f' || next == 'n' || (next >= '0' && next <= '9');
  if (text.starts_with('[') && value)
  {
    return {"json", "JSON"};
  }
  const bool letter = (next >= 'a' && next <= 'z') || (next >= 'A' && next <= 'Z') || next == '?' || next == '!';
  return text.starts_with('<') && letter ? FileKind{"xml", "XML"} : FileKind{"text", "text"};
}

} // namespace

std::optional<FileKind> fileKindOf(ByteSource& source)
{
  std::vector<uint8_t> bytes(static_cast<size_t>(std::min<uint64_t>(kLook, source.size())));
  bytes.resize(source.read(0, bytes));
  std::string_view start(reinterpret_cast<const char*>(bytes.data()), bytes.size());
  for (const Magic& magic : kMagics)
  {
    if (start.starts_with(magic.bytes))
    {
      return magic.kind;
    }
  }
  // The last character may be cut.
  const bool whole = bytes.size() == source.size();
  start = whole ? start : start.substr(0, cutAtCharacter(start, start.size() - std::min<size_t>(4, start.size())));
  return !start.empty() && isPlainText(start) ? std::optional(kindOfText(start)) : std::nullopt;
}

std::optional<FileKind> otherKindOf(ByteSource& source, const Recognition& found)
{
  Walker walker(source, found.form);
  Event event;
  const bool isRoot = found.isStream && walker.next(event) && event.what == What::nodeBegin && event.node.isGroup() &&
                      !event.node.has(kOverrun) && !builtInName(event.node.elm()).empty();
  return isRoot ? std::nullopt : fileKindOf(source);
}

} // namespace tav::inspect
