/// @file elementTable.h
/// How the entries, their strings and the range directory are put together, whatever the names come from.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <string_view>

#include "dictionary/dictionary.h"

namespace tav::inside
{

/// A line of elements.def, for the compiler only.
struct ListedElement
{
  uint16_t id;
  std::string_view enumName;
  std::string_view tagName; ///< empty: a placeholder
};

inline constexpr auto kListedElements = std::to_array<ListedElement>({
#define TAV_ELEMENT(id, constant, enumName, tagName) {id, enumName, tagName},
#define TAV_ELEMENT_PLACEHOLDER(id) {id, {}, {}},
#include "tav/elements.def"
});

inline constexpr size_t kElementCount = kListedElements.size();

inline constexpr std::string_view kPlaceholderEnumName = "INVALID_ELEMENT";
inline constexpr std::string_view kPlaceholderTagName = "invalid_element";

/// A constant of its own: a compiler takes only so many steps to find the value of one.
inline constexpr size_t kElementStringBytes = [] {
  size_t bytes = kPlaceholderEnumName.size() + kPlaceholderTagName.size() + 2;
  for (const ListedElement& element : kListedElements)
  {
    bytes += element.tagName.empty() ? 0 : element.enumName.size() + element.tagName.size() + 2;
  }
  return bytes;
}();

/// The strings behind each other, each with its NUL, and the entries that point out their places.
struct ElementTable
{
  std::array<char, kElementStringBytes> strings{};
  std::array<TAVElementEntry, kElementCount> entries{};
  size_t used = 0;
  size_t filled = 0;

  constexpr ElementTable()
  {
    add(kPlaceholderEnumName);
    add(kPlaceholderTagName);
  }

  /// The next entry in the order of the list; one without a tag is a placeholder.
  constexpr void put(uint16_t id, std::string_view enumName, std::string_view tagName)
  {
    const bool placeholder = tagName.empty();
    const size_t enumPlace = placeholder ? 0 : add(enumName);
    const size_t tagPlace = placeholder ? kPlaceholderEnumName.size() + 1 : add(tagName);
    TAVElementEntry& entry = entries[filled++];
    entry.id = id;
    entry.enumNamePlace = enumPlace & 0xFFFFFF;
    entry.tagNamePlace = tagPlace & 0xFFFFFF;
  }

private:
  constexpr size_t add(std::string_view text)
  {
    const size_t place = used;
    for (const char character : text)
    {
      strings[used++] = character;
    }
    ++used; // the NUL is there
    return place;
  }
};

static_assert(kElementStringBytes <= 0xFFFFFF);

struct ElementBounds
{
  uint16_t firstId;
  uint64_t count;
};

inline constexpr auto kElementBounds = std::to_array<ElementBounds>({
#define TAV_ELEMENT_RANGE(firstId, count) {firstId, count},
#include "tav/elements.def"
});

static_assert(kElementBounds.size() == kElementRangeCount);

using ElementDirectory = std::array<TAVElementRange, kElementRangeCount + 1>;

/// The directory over the entries of all ranges.
constexpr ElementDirectory directoryOver(const TAVElementEntry* entries)
{
  ElementDirectory directory{};
  for (size_t i = 0; i < kElementRangeCount; ++i)
  {
    directory[i] = {1, kElementBounds[i].firstId, kElementBounds[i].count, entries};
    entries += kElementBounds[i].count;
  }
  return directory;
}

} // namespace tav::inside
