/// @file dictionary.hpp
/// The element dictionary for programs: from an element id to its names and back. Header only, constant data,
/// any thread may use it. The names are those that the printer shows.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstdlib>
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

/// The tag of an element that is not in the dictionary: a program's own.
struct OwnName
{
  uint16_t id = 0;
  std::string_view tag{};
};

/// The names of a program's own elements, in any order. Where one is a name of the dictionary, too, both elements bear
/// it.
using OwnNames = std::span<const OwnName>;

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

inline constexpr size_t kEntryCount = sizeof kEntries / sizeof kEntries[0];

/// By their texts; of several alike the one with the lowest id comes first.
struct SortedKeys
{
  Key keys[3 * kEntryCount];

  SortedKeys()
  {
    for (size_t i = 0; i < 3 * kEntryCount; ++i)
    {
      keys[i] = {static_cast<uint16_t>(i / 3), static_cast<uint16_t>(i % 3)};
    }
    std::qsort(keys, 3 * kEntryCount, sizeof keys[0], compare);
  }

  /// The first key that does not come before a text; the end when all do.
  const Key* find(std::string_view text) const
  {
    const Key* first = keys;
    for (size_t count = 3 * kEntryCount; count != 0;)
    {
      const size_t half = count / 2;
      const bool isBefore = first[half].text() < text;
      first += isBefore ? half + 1 : 0;
      count = isBefore ? count - half - 1 : half;
    }
    return first;
  }

private:
  static int compare(const void* left, const void* right)
  {
    const Key& one = *static_cast<const Key*>(left);
    const Key& other = *static_cast<const Key*>(right);
    const int order = one.text().compare(other.text());
    return order != 0 ? order : kEntries[one.entry].id - kEntries[other.entry].id;
  }
};

} // namespace detail

/// Every entry, range by range in the order in which the lookup asks them. Id 20 is listed twice: as the document
/// root, which answers a lookup, and as SQLM_ELM_COLLECTED.
constexpr std::span<const Entry> entries()
{
  return detail::kEntries;
}

/// The enum name of an id, empty when it has no entry. Cost: a comparison for each of ten ranges.
constexpr std::string_view nameOf(uint16_t id)
{
  const size_t place = detail::placeOf(id);
  return place < detail::kEntryCount ? detail::kEntries[place].name : std::string_view();
}

/// The tag name of an id, empty when it has no entry. Cost: as `nameOf`.
constexpr std::string_view tagOf(uint16_t id)
{
  const size_t place = detail::placeOf(id);
  return place < detail::kEntryCount ? detail::kEntries[place].tag : std::string_view();
}

/// The id of an element by its enum name, its constant or its tag name, letter case included.
///
/// @return the lowest id where several elements share a tag; nothing when no element has the name
/// Cost: a binary search; the first call in a program also sorts the names, about a millisecond.
inline std::optional<uint16_t> idOf(std::string_view enumNameOrTag)
{
  // Sorted when first asked: sorted at compile time it would cost every source file that includes this header.
  static const detail::SortedKeys sorted;
  const detail::Key* const found = sorted.find(enumNameOrTag);
  if (found == std::end(sorted.keys) || found->text() != enumNameOrTag)
  {
    return std::nullopt;
  }
  return detail::kEntries[found->entry].id;
}

} // namespace tav::dictionary
