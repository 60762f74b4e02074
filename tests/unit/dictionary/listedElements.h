/// @file listedElements.h
/// The lines of elements.def in their order, read without the library's directory or lookup.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string_view>
#include <vector>

namespace test
{

struct ListedElement
{
  uint16_t id;
  std::string_view constant; ///< empty for a placeholder
  std::string_view enumName;
  std::string_view tagName;
};

struct ListedRange
{
  uint16_t firstId; ///< as announced by the list
  uint64_t count;   ///< as announced by the list
};

inline constexpr ListedElement kListedElements[] = {
#define TAV_ELEMENT(id, constant, enumName, tagName) {id, #constant, enumName, tagName},
#define TAV_ELEMENT_PLACEHOLDER(id) {id, {}, "INVALID_ELEMENT", "invalid_element"},
#include "tav/elements.def"
};

inline constexpr ListedRange kListedRanges[] = {
#define TAV_ELEMENT_RANGE(firstId, count) {firstId, count},
#include "tav/elements.def"
};

/// The list in one letter a line: r where a range begins, e for an element or a placeholder.
inline constexpr std::string_view kListedLines =
#define TAV_ELEMENT_RANGE(firstId, count) "r"
#define TAV_ELEMENT(id, constant, enumName, tagName) "e"
#define TAV_ELEMENT_PLACEHOLDER(id) "e"
#include "tav/elements.def"
    ;

/// How many elements stand between each line that begins a range and the next.
inline std::vector<uint64_t> listedCounts()
{
  std::vector<uint64_t> counts;
  for (const char line : kListedLines)
  {
    if (line == 'r')
    {
      counts.push_back(0);
    }
    else
    {
      ++counts.back();
    }
  }
  return counts;
}

/// The first element of the list with an id, null when there is none.
inline const ListedElement* firstListed(uint16_t id)
{
  for (const ListedElement& element : kListedElements)
  {
    if (element.id == id)
    {
      return &element;
    }
  }
  return nullptr;
}

} // namespace test
