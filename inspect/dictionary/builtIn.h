/// @file builtIn.h
/// The names of the built-in dictionary, asked of libtav, which has them once. The table of tav/dictionary.hpp, which
/// is for programs, would be a second copy of them all in this library.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string_view>

#include "tav/cpp/chars.hpp"
#include "tav/dictionary.hpp"
#include "tav/path/names.hpp"

namespace tav::inspect
{

/// The tag of an id, and its enum name; empty when the built-in dictionary has no entry for it. They live for ever.
inline std::string_view builtInTag(uint16_t id) noexcept
{
  return detail::tagOf(id);
}

inline std::string_view builtInName(uint16_t id) noexcept
{
  return detail::nameOf(id);
}

/// An entry as forEachBuiltIn shows it.
struct BuiltIn
{
  uint16_t id;
  std::string_view name;
  std::string_view tag;

  bool isElement() const noexcept { return detail::paths::isElementName(name); } ///< and no placeholder
};

inline bool isBuiltIn(uint16_t id) noexcept
{
  const std::string_view name = builtInName(id);
  return !name.empty() && detail::paths::isElementName(name);
}

/// The place of the one entry that no lookup by its id finds, as one before it has the same id. The compiler finds it
/// and leaves the table out.
constexpr size_t hiddenPlace() noexcept
{
  size_t place = 0;
  while (dictionary::detail::placeOf(dictionary::detail::kEntries[place].id) == place)
  {
    ++place;
  }
  return place;
}

inline constexpr size_t kHiddenPlace = hiddenPlace();
inline constexpr std::string_view kHiddenName = dictionary::detail::kEntries[kHiddenPlace].name;
inline constexpr std::string_view kHiddenTag = dictionary::detail::kEntries[kHiddenPlace].tag;

/// Calls with each entry, in the order of dictionary::entries().
template<class Visit>
void forEachBuiltIn(Visit visit)
{
  size_t place = 0;
  for (const dictionary::detail::Range& range : dictionary::detail::kRanges)
  {
    for (uint32_t i = 0; i < range.count; ++i, ++place)
    {
      const auto id = static_cast<uint16_t>(range.firstId + i);
      const bool hidden = place == kHiddenPlace;
      visit(BuiltIn{id, hidden ? kHiddenName : builtInName(id), hidden ? kHiddenTag : builtInTag(id)});
    }
  }
}

} // namespace tav::inspect
