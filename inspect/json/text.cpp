#include "tav/inspect/jsonText.hpp"

#include <algorithm>
#include <charconv>
#include <chrono>
#include <vector>

#include "tav/inspect/value.hpp"
#include "tav/layout.hpp"
#include "tav/path/valueText.hpp"

namespace tav::inspect
{

namespace
{

constexpr uint16_t kTypesWithNames[] = {
    TAV_TYPE_HEADER32, TAV_TYPE_HEADER64, TAV_TYPE_ASCII_STRING, TAV_TYPE_UINT8, TAV_TYPE_SINT8,
    TAV_TYPE_UINT16, TAV_TYPE_SINT16, TAV_TYPE_UINT32, TAV_TYPE_SINT32, TAV_TYPE_UINT64,
    TAV_TYPE_SINT64, TAV_TYPE_UTC_TIMESTAMP, TAV_TYPE_BINARY, TAV_TYPE_UTF8_STRING, TAV_TYPE_UINT128,
    TAV_TYPE_SINT128, TAV_TYPE_BYTE, TAV_TYPE_UINT64_ARRAY};

/// Lower case, without what separates words.
std::string plainName(std::string_view name)
{
  constexpr std::string_view prefix = "TAV_TYPE_";
  if (name.starts_with(prefix))
  {
    name.remove_prefix(prefix.size());
  }
  std::string plain;
  for (const char c : name)
  {
    if (c != ' ' && c != '_' && c != '-')
    {
      plain += c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c;
    }
  }
  return plain;
}

/// Reads a text from left to right.
class Scanner
{
public:
  explicit Scanner(std::string_view text)
      : text_(text) {}

  bool take(char c)
  {
    const bool found = !text_.empty() && text_.front() == c;
    text_.remove_prefix(found ? 1 : 0);
    return found;
  }

  /// Exactly `count` digits.
  bool number(size_t count, unsigned& value)
  {
    value = 0;
    for (size_t i = 0; i < count; ++i)
    {
      if (i >= text_.size() || text_[i] < '0' || text_[i] > '9')
      {
        return false;
      }
      value = value * 10 + static_cast<unsigned>(text_[i] - '0');
    }
    text_.remove_prefix(count);
    return true;
  }

  /// One to six digits behind the point, as millionths.
  bool fraction(unsigned& value)
  {
    value = 0;
    size_t count = 0;
    unsigned digit = 0;
    while (count < 6 && number(1, digit))
    {
      value = value * 10 + digit;
      ++count;
    }
    for (size_t i = count; i < 6; ++i)
    {
      value *= 10;
    }
    return count != 0;
  }

  bool isDone() const { return text_.empty(); }

private:
  std::string_view text_;
};

bool scanZone(Scanner& scan, int& minutesEast)
{
  minutesEast = 0;
  if (scan.isDone() || scan.take('Z'))
  {
    return true;
  }
  const bool west = scan.take('-');
  unsigned hours = 0;
  unsigned minutes = 0;
  if ((!west && !scan.take('+')) || !scan.number(2, hours) || !scan.take(':') || !scan.number(2, minutes) ||
      minutes > 59)
  {
    return false;
  }
  minutesEast = static_cast<int>(hours * 60 + minutes) * (west ? -1 : 1);
  return true;
}

} // namespace

void appendJsonString(std::string& out, std::string_view text)
{
  static constexpr auto plain = []() {
    std::array<bool, 256> table{};
    for (size_t byte = 0x20; byte < table.size(); ++byte)
    {
      table[byte] = byte != '"' && byte != '\\' && byte != 0x7F;
    }
    return table;
  }();
  static constexpr std::string_view characters = "\"\\\n\r\t";
  static constexpr std::string_view letters = "\"\\nrt";
  out += '"';
  while (!text.empty())
  {
    const std::string_view::iterator special =
        std::find_if(text.begin(), text.end(), [](char c) { return !plain[static_cast<uint8_t>(c)]; });
    out.append(text.begin(), special);
    text.remove_prefix(static_cast<size_t>(special - text.begin()));
    if (text.empty())
    {
      break;
    }
    const auto byte = static_cast<uint8_t>(text.front());
    out += '\\';
    if (const size_t at = characters.find(text.front()); at != std::string_view::npos)
    {
      out += letters[at];
    }
    else
    {
      out += "u00";
      detail::paths::appendDigits(out, &byte, 1);
    }
    text.remove_prefix(1);
  }
  out += '"';
}

std::optional<std::string> jsonTypeName(uint16_t type)
{
  std::string name;
  return appendJsonTypeName(name, type) ? std::optional(std::move(name)) : std::nullopt;
}

bool appendJsonTypeName(std::string& out, uint16_t type)
{
  if (layout::isGroupType(type))
  {
    out += type == TAV_TYPE_HEADER32 ? "group32" : "group64";
    return true;
  }
  const bool known = layout::typeInfo(type).known;
  out += known ? typeText(type) : std::string();
  return known;
}

std::optional<uint16_t> jsonTypeOf(std::string_view name)
{
  struct Name
  {
    std::string written;
    std::string plain;
    uint16_t type;
  };
  static const std::vector<Name> names = []() {
    std::vector<Name> made;
    for (const uint16_t type : kTypesWithNames)
    {
      made.push_back({*jsonTypeName(type), plainName(*jsonTypeName(type)), type});
    }
    return made;
  }();
  const auto written = std::find_if(names.begin(), names.end(), [&](const Name& one) { return one.written == name; });
  if (written != names.end())
  {
    return written->type;
  }
  const std::string plain = plainName(name);
  const auto found = std::find_if(names.begin(), names.end(), [&](const Name& one) { return one.plain == plain; });
  return found != names.end()  ? std::optional<uint16_t>(found->type)
         : plain == "header32" ? std::optional<uint16_t>(TAV_TYPE_HEADER32)
         : plain == "header64" ? std::optional<uint16_t>(TAV_TYPE_HEADER64)
                               : std::nullopt;
}

bool appendHexBytes(std::string& out, std::string_view text)
{
  const auto digit = [](char c) {
    return c >= '0' && c <= '9' ? c - '0' : c >= 'a' && c <= 'f' ? c - 'a' + 10
                                        : c >= 'A' && c <= 'F'   ? c - 'A' + 10
                                                                 : -1;
  };
  if (text.size() % 2 != 0)
  {
    return false;
  }
  for (size_t i = 0; i < text.size(); i += 2)
  {
    const int high = digit(text[i]);
    const int low = digit(text[i + 1]);
    if (high < 0 || low < 0)
    {
      return false;
    }
    out += static_cast<char>(high * 16 + low);
  }
  return true;
}

std::optional<TAVTimeStamp> parseDate(std::string_view text)
{
  using namespace std::chrono;
  Scanner scan(text);
  unsigned year = 0, month = 0, day = 0, hour = 0, minute = 0, second = 0, fraction = 0;
  int zone = 0;
  const bool read = scan.number(4, year) && scan.take('-') && scan.number(2, month) && scan.take('-') &&
                    scan.number(2, day) && (scan.take('T') || scan.take(' ')) && scan.number(2, hour) &&
                    scan.take(':') && scan.number(2, minute) && scan.take(':') && scan.number(2, second) &&
                    (!scan.take('.') || scan.fraction(fraction)) && scanZone(scan, zone) && scan.isDone();
  const std::chrono::year_month_day date{std::chrono::year(static_cast<int>(year)), std::chrono::month(month),
                                         std::chrono::day(day)};
  if (!read || !date.ok() || hour > 23 || minute > 59 || second > 59)
  {
    return std::nullopt;
  }
  const int64_t local = sys_days(date).time_since_epoch().count() * int64_t{86400} + hour * int64_t{3600} +
                        minute * int64_t{60} + second;
  const int64_t seconds = local - zone * int64_t{60};
  if (seconds < 0)
  {
    return std::nullopt;
  }
  return TAVTimeStamp{static_cast<uint64_t>(seconds), static_cast<uint16_t>(fraction / 1000),
                      static_cast<uint16_t>(fraction % 1000), 0, static_cast<int16_t>(zone)};
}

bool isWholeDate(const TAVTimeStamp& stamp, std::string_view text)
{
  return tav::detail::isWholeTime(stamp, text);
}

std::optional<std::array<uint8_t, 16>> parseInt128(std::string_view text, bool isSigned)
{
  const bool negative = text.starts_with('-');
  text.remove_prefix(negative ? 1 : 0);
  if (text.empty() || (negative && !isSigned))
  {
    return std::nullopt;
  }
  std::array<uint32_t, 4> words{}; // the lowest first
  for (const char c : text)
  {
    uint64_t carry = static_cast<uint64_t>(c - '0');
    if (c < '0' || c > '9')
    {
      return std::nullopt;
    }
    for (uint32_t& word : words)
    {
      carry += uint64_t{word} * 10;
      word = static_cast<uint32_t>(carry);
      carry >>= 32;
    }
    if (carry != 0)
    {
      return std::nullopt;
    }
  }
  uint64_t carry = 1;
  for (uint32_t& word : words)
  {
    carry += static_cast<uint32_t>(~word);
    word = negative ? static_cast<uint32_t>(carry) : word;
    carry >>= 32;
  }
  const bool zero = words == std::array<uint32_t, 4>{};
  if (isSigned && !zero && ((words[3] & 0x80000000u) != 0) != negative)
  {
    return std::nullopt;
  }
  if (!kor::isLittleEndian)
  {
    std::swap(words[0], words[3]);
    std::swap(words[1], words[2]);
  }
  return kor::bitCast<std::array<uint8_t, 16>>(words);
}

size_t cutAtCharacter(std::string_view text, size_t most)
{
  if (text.size() <= most)
  {
    return text.size();
  }
  size_t cut = most;
  for (int i = 0; i < 3 && cut > 1 && (static_cast<uint8_t>(text[cut]) & 0xC0) == 0x80; ++i)
  {
    --cut;
  }
  return cut;
}

} // namespace tav::inspect
