/// @file names.hpp
/// Names of elements and attributes as paths write them.
#pragma once

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <iterator>
#include <string_view>
#include <vector>

#include "tav/path/decimal.hpp"

namespace tav::detail::paths
{

/// The constant of an element by its enum name: without the blanks that a few of these have around them, and without
/// the remark that one has behind it.
inline std::string_view constantOf(std::string_view enumName) noexcept
{
  const std::string_view words = withoutBlanks(enumName);
  return words.substr(0, words.find(' '));
}

/// All that an entry of the dictionary is called.
inline std::array<std::string_view, 5> namesOf(std::string_view tag, std::string_view enumName) noexcept
{
  return {tag, enumName, constantOf(enumName), withoutBlanks(tag), withoutBlanks(enumName)};
}

/// Whether an enum name is an element's, and no placeholder's.
constexpr bool isElementName(std::string_view enumName) noexcept
{
  return enumName != "INVALID_ELEMENT";
}

/// Whether a text is what a pattern describes: a star stands for any characters.
inline bool isLike(std::string_view text, std::string_view pattern) noexcept
{
  constexpr size_t none = std::string_view::npos;
  size_t at = 0;
  size_t of = 0;
  size_t star = none; ///< the last star met, which takes one character more when the rest does not fit
  size_t taken = 0;
  while (at < text.size())
  {
    if (of < pattern.size() && pattern[of] == '*')
    {
      star = of++;
      taken = at;
    }
    else if (of < pattern.size() && pattern[of] == text[at])
    {
      ++at;
      ++of;
    }
    else if (star != none)
    {
      of = star + 1;
      at = ++taken;
    }
    else
    {
      return false;
    }
  }
  return pattern.find_first_not_of('*', of) == none;
}

/// Ascending, each once.
inline void putInOrder(std::vector<uint16_t>& ids)
{
  std::sort(ids.begin(), ids.end());
  ids.erase(std::unique(ids.begin(), ids.end()), ids.end());
}

/// What the XML form shows of a node as attributes.
enum class Attribute : uint8_t
{
  none,
  id,
  name,
  type,
  header,
  info,
  eyeSize,
  size,
  extra,
  encoding,
  codePage,
  seconds,
  fractionA,
  fractionB,
  further,
  offsetMinutes
};

inline constexpr std::array<std::string_view, 16> kAttributeNames = {
    "", "id", "name", "type", "header", "info", "eyeSize", "size", "extra", "encoding", "codePage", "seconds",
    "fractionA", "fractionB", "further", "offsetMinutes"};

/// Attribute::none for a name that no attribute has.
inline Attribute attributeNamed(std::string_view name) noexcept
{
  const auto place = std::find(kAttributeNames.begin() + 1, kAttributeNames.end(), name) - kAttributeNames.begin();
  return place == std::ssize(kAttributeNames) ? Attribute::none : static_cast<Attribute>(place);
}

} // namespace tav::detail::paths
