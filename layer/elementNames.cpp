#include "layer/elementNames.h"

#include <algorithm>
#include <array>
#include <cstddef>
#include <iterator>
#include <string>

#include "dictionary/dictionary.h"
#include "tav/cpp/nearest.hpp"
#include "tav/layout.hpp"
#include "tav/path/names.hpp"

namespace tav::detail
{

namespace
{

/// The enum names, one behind another: the library's table puts most of them together when they are printed, and what
/// is handed out here lives for ever.
constexpr char kNames[] =
#define TAV_ELEMENT(id, constant, enumName, tagName) enumName "\0"
#define TAV_ELEMENT_PLACEHOLDER(id) "INVALID_ELEMENT\0"
#include "tav/elements.def"
    ;

/// Where they begin, and where the last one ends.
constexpr auto kStarts = []() {
  constexpr size_t lengths[] = {
#define TAV_ELEMENT(id, constant, enumName, tagName) sizeof(enumName),
#define TAV_ELEMENT_PLACEHOLDER(id) sizeof "INVALID_ELEMENT",
#include "tav/elements.def"
  };
  std::array<uint32_t, std::size(lengths) + 1> starts{};
  for (size_t i = 0; i < std::size(lengths); ++i)
  {
    starts[i + 1] = static_cast<uint32_t>(starts[i] + lengths[i]);
  }
  return starts;
}();

std::string_view nameAt(size_t place) noexcept
{
  return {kNames + kStarts[place], kStarts[place + 1] - kStarts[place] - 1};
}

/// The constant of an element is its enum name without the blanks that a few of these have around them, and without the
/// remark that one has behind it.
std::string_view constantOf(std::string_view enumName) noexcept
{
  const std::string_view words = paths::withoutBlanks(enumName);
  return words.substr(0, words.find(' '));
}

/// Calls with the id, the enum name and the tag of each element, in the order of the dictionary.
template<class Visit>
void forEachElement(Visit visit)
{
  size_t place = 0;
  for (const TAVElementRange* range = inside::elementDirectory(); range->count != 0; ++range)
  {
    for (uint64_t i = 0; i < range->count; ++i, ++place)
    {
      const TAVElementEntry& entry = range->pEntries[i];
      if (const std::string_view name = nameAt(place); name != "INVALID_ELEMENT")
      {
        visit(static_cast<uint16_t>(entry.id), name, std::string_view(inside::tagNameOf(entry)));
      }
    }
  }
}

} // namespace

std::string_view elementTag(uint16_t id) noexcept
{
  const TAVElementEntry* const entry = inside::findElement(id);
  return entry != nullptr ? std::string_view(inside::tagNameOf(*entry)) : std::string_view();
}

std::string_view elementName(uint16_t id) noexcept
{
  const size_t place = dictionary::detail::placeOf(id);
  return place + 1 < kStarts.size() ? nameAt(place) : std::string_view();
}

std::vector<uint16_t> idsNamed(std::string_view name, dictionary::OwnNames own)
{
  std::vector<uint16_t> ids;
  forEachElement([&](uint16_t id, std::string_view enumName, std::string_view tag) {
    const bool isTag = tag == name || paths::withoutBlanks(tag) == name;
    if (isTag || enumName == name || paths::withoutBlanks(enumName) == name || constantOf(enumName) == name)
    {
      ids.push_back(id);
    }
  });
  for (const dictionary::OwnName& entry : own)
  {
    if (entry.tag == name)
    {
      ids.push_back(entry.id);
    }
  }
  paths::putInOrder(ids);
  return ids;
}

std::vector<uint16_t> idsLike(std::string_view pattern, dictionary::OwnNames own)
{
  std::string shorter; // where stars follow each other, one says the same
  std::unique_copy(pattern.begin(), pattern.end(), std::back_inserter(shorter),
                   [](char left, char right) { return left == '*' && right == '*'; });
  std::vector<uint16_t> ids;
  forEachElement([&](uint16_t id, std::string_view /*enumName*/, std::string_view tag) {
    if (paths::isLike(paths::withoutBlanks(tag), shorter))
    {
      ids.push_back(id);
    }
  });
  for (const dictionary::OwnName& entry : own)
  {
    if (paths::isLike(entry.tag, shorter))
    {
      ids.push_back(entry.id);
    }
  }
  if (std::any_of(ids.begin(), ids.end(), [](uint16_t id) { return !layout::isEndElement(id); }))
  {
    ids.erase(std::remove_if(ids.begin(), ids.end(), layout::isEndElement), ids.end());
  }
  paths::putInOrder(ids);
  return ids;
}

std::string_view nearestTag(std::string_view name, dictionary::OwnNames own) noexcept
{
  std::string_view nearest;
  if (name.size() > kLongestMisspelt)
  {
    return nearest;
  }
  std::array<size_t, kLongestMisspelt + 1> row{};
  size_t least = mostSlips(name) + 1;
  const auto consider = [&](std::string_view tag) {
    const size_t distance = editDistance(name, tag, row.data());
    nearest = distance < least ? tag : nearest;
    least = distance < least ? distance : least;
  };
  for (const dictionary::OwnName& entry : own)
  {
    consider(entry.tag);
  }
  forEachElement([&](uint16_t, std::string_view, std::string_view tag) { consider(tag); });
  return nearest;
}

} // namespace tav::detail
