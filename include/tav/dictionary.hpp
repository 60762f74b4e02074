/// @file dictionary.hpp
/// The element dictionary for programs: from an element id to its names and back. Header only, constant data,
/// any thread may use it. The names are those that the printer shows.
#pragma once

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <iterator>
#include <optional>
#include <span>
#include <string_view>

namespace tav::dictionary
{

/// One element. All strings live for ever and end with a NUL.
struct Entry
{
  uint16_t id;
  std::string_view constant; ///< the constant of elements.h; a placeholder has none: INVALID_ELEMENT
  std::string_view name;     ///< the enum name, as the text form prints it: at a few ids with blanks around it
  std::string_view tag;      ///< the tag name, as the XML form prints it
};

namespace detail
{

/// The length is that of the literal, which spares the compiler a walk over every string.
template<size_t Size>
constexpr std::string_view literal(const char (&text)[Size])
{
  return std::string_view(text, Size - 1);
}

inline constexpr Entry kEntries[] = {
#define TAV_ELEMENT(id, constant, enumName, tagName) {id, literal(#constant), literal(enumName), literal(tagName)},
#define TAV_ELEMENT_PLACEHOLDER(id) \
  {id, literal("INVALID_ELEMENT"), literal("INVALID_ELEMENT"), literal("invalid_element")},
#include "tav/elements.def"
};

struct Range
{
  uint16_t firstId;
  uint16_t count;
};

inline constexpr Range kRanges[] = {
#define TAV_ELEMENT_RANGE(firstId, count) {firstId, count},
#include "tav/elements.def"
};

/// The place of an id's entry, the number of entries when it has none. A place and not a pointer: g++ with the
/// undefined behaviour sanitizer takes no comparison with null for a constant.
constexpr size_t placeOf(uint16_t id)
{
  size_t start = 0;
  for (const Range& range : kRanges)
  {
    const auto index = static_cast<uint16_t>(id - range.firstId);
    if (index < range.count)
    {
      return start + index;
    }
    start += range.count;
  }
  return start;
}

/// A string by which an entry is found: every entry has three.
struct Key
{
  uint16_t entry;
  uint16_t kind;

  std::string_view text() const
  {
    const Entry& found = kEntries[entry];
    const std::string_view texts[] = {found.constant, found.name, found.tag};
    return texts[kind];
  }
};

using Keys = std::array<Key, 3 * std::size(kEntries)>;

inline Keys sortedKeys()
{
  Keys keys{};
  for (size_t i = 0; i < keys.size(); ++i)
  {
    keys[i] = {static_cast<uint16_t>(i / 3), static_cast<uint16_t>(i % 3)};
  }
  std::sort(keys.begin(), keys.end(),
            [](Key left, Key right) {
              const int order = left.text().compare(right.text());
              return order != 0 ? order < 0 : kEntries[left.entry].id < kEntries[right.entry].id;
            });
  return keys;
}

} // namespace detail

/// Every entry, range by range in the order in which the lookup asks them. Id 20 stands twice: as the document
/// root, which answers a lookup, and as SQLM_ELM_COLLECTED.
constexpr std::span<const Entry> entries()
{
  return detail::kEntries;
}

/// The enum name of an id, empty when it has no entry. Cost: a comparison for each of ten ranges.
constexpr std::string_view nameOf(uint16_t id)
{
  const size_t place = detail::placeOf(id);
  return place < std::size(detail::kEntries) ? detail::kEntries[place].name : std::string_view();
}

/// The tag name of an id, empty when it has no entry. Cost: as `nameOf`.
constexpr std::string_view tagOf(uint16_t id)
{
  const size_t place = detail::placeOf(id);
  return place < std::size(detail::kEntries) ? detail::kEntries[place].tag : std::string_view();
}

/// The id of an element by its enum name, its constant or its tag name, letter case included.
///
/// @return the lowest id where several elements share a tag; nothing when no element has the name
/// Cost: a binary search; the first call in a program also sorts the names, about a millisecond.
inline std::optional<uint16_t> idOf(std::string_view enumNameOrTag)
{
  // Sorted when first asked: sorted at compile time it would cost every source file that includes this header.
  static const detail::Keys keys = detail::sortedKeys();
  const detail::Keys::const_iterator found =
      std::lower_bound(keys.begin(), keys.end(), enumNameOrTag,
                       [](detail::Key key, std::string_view text) { return key.text() < text; });
  if (found == keys.end() || found->text() != enumNameOrTag)
  {
    return std::nullopt;
  }
  return detail::kEntries[found->entry].id;
}

} // namespace tav::dictionary
