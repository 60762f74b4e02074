/// @file decimal.hpp
/// Numbers as they are written, compared exactly whatever their length.
#pragma once

#include <algorithm>
#include <compare>
#include <optional>
#include <string_view>

namespace tav::detail::paths
{

/// A decimal number in a text that outlives it: no digit of it is lost, as it would be in a double above 2^53.
struct Decimal
{
  bool negative = false;
  std::string_view whole{};    ///< without zeros in front
  std::string_view fraction{}; ///< without zeros at the end
};

inline bool isDigit(char c) noexcept
{
  return c >= '0' && c <= '9';
}

inline bool isBlank(char c) noexcept
{
  return c == ' ' || c == '\t' || c == '\n' || c == '\r';
}

inline std::string_view withoutBlanks(std::string_view text) noexcept
{
  while (!text.empty() && isBlank(text.front()))
  {
    text.remove_prefix(1);
  }
  while (!text.empty() && isBlank(text.back()))
  {
    text.remove_suffix(1);
  }
  return text;
}

/// The number that a text is: digits with a point among them or not, and a minus before them; blanks around them do not
/// count. Nothing for any other text.
inline std::optional<Decimal> decimalOf(std::string_view text) noexcept
{
  text = withoutBlanks(text);
  Decimal number;
  number.negative = text.starts_with('-');
  text.remove_prefix(number.negative ? 1 : 0);
  const size_t point = std::min(text.find('.'), text.size());
  number.whole = text.substr(0, point);
  number.fraction = text.substr(std::min(point + 1, text.size()));
  const auto digits = [](std::string_view part) { return std::all_of(part.begin(), part.end(), isDigit); };
  if ((number.whole.empty() && number.fraction.empty()) || !digits(number.whole) || !digits(number.fraction))
  {
    return std::nullopt;
  }
  number.whole.remove_prefix(std::min(number.whole.find_first_not_of('0'), number.whole.size()));
  number.fraction = number.fraction.substr(0, number.fraction.find_last_not_of('0') + 1);
  number.negative = number.negative && !(number.whole.empty() && number.fraction.empty());
  return number;
}

inline std::strong_ordering operator<=>(const Decimal& left, const Decimal& right) noexcept
{
  if (left.negative != right.negative)
  {
    return left.negative ? std::strong_ordering::less : std::strong_ordering::greater;
  }
  const Decimal& less = left.negative ? right : left; // of two negative numbers the longer one is the smaller
  const Decimal& more = left.negative ? left : right;
  if (less.whole.size() != more.whole.size())
  {
    return less.whole.size() <=> more.whole.size();
  }
  const int whole = less.whole.compare(more.whole);
  return (whole != 0 ? whole : less.fraction.compare(more.fraction)) <=> 0;
}

inline bool operator==(const Decimal& left, const Decimal& right) noexcept
{
  return (left <=> right) == 0; // NOLINT(modernize-use-nullptr): as orders compare
}

} // namespace tav::detail::paths
