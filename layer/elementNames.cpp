#include "layer/elementNames.h"

#include <algorithm>
#include <array>
#include <cstddef>
#include <iterator>
#include <optional>
#include <span>
#include <string>

#include "dictionary/dictionary.h"
#include "tav/cpp/nearest.hpp"
#include "tav/layout.hpp"
#include "tav/path/names.hpp"

namespace tav::detail
{

namespace
{

/// Whether a text may be an enum name or a constant: all of these begin so, and no tag does.
bool isEnumLike(std::string_view name) noexcept
{
  const std::string_view word = paths::withoutBlanks(name);
  return word.starts_with("TAV_") || word.starts_with("SQLM_");
}

/// Calls with the id, the enum name and the tag of each element, in the order of the dictionary.
template<class Visit>
void forEachElement(Visit visit)
{
  for (const TAVElementRange* range = inside::elementDirectory(); range->count != 0; ++range)
  {
    for (const TAVElementEntry& entry : std::span(range->pEntries, static_cast<size_t>(range->count)))
    {
      if (const std::string_view name = inside::enumNameOf(entry); paths::isElementName(name))
      {
        visit(static_cast<uint16_t>(entry.id), name, std::string_view(inside::tagNameOf(entry)));
      }
    }
  }
}

/// Calls with the id of each element that has this tag.
template<class Visit>
void forEachTagged(std::string_view name, Visit visit)
{
  for (const uint16_t place : inside::placesTagged(paths::withoutBlanks(name)))
  {
    const TAVElementEntry& entry = inside::elementAt(place);
    const std::string_view tag = inside::tagNameOf(entry);
    if (tag == name || paths::withoutBlanks(tag) == name)
    {
      visit(static_cast<uint16_t>(entry.id));
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
  const TAVElementEntry* const entry = inside::findElement(id);
  return entry != nullptr ? std::string_view(inside::enumNameOf(*entry)) : std::string_view();
}

std::vector<uint16_t> idsNamed(std::string_view name, dictionary::OwnNames own)
{
  std::vector<uint16_t> ids;
  forEachTagged(name, [&ids](uint16_t id) { ids.push_back(id); });
  if (isEnumLike(name))
  {
    forEachElement([&](uint16_t id, std::string_view enumName, std::string_view /*tag*/) {
      if (enumName == name || paths::withoutBlanks(enumName) == name || paths::constantOf(enumName) == name)
      {
        ids.push_back(id);
      }
    });
  }
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

std::optional<uint16_t> onlyTagged(std::string_view tag) noexcept
{
  std::optional<uint16_t> only;
  bool isOnly = true;
  forEachTagged(tag, [&](uint16_t id) {
    isOnly = isOnly && (!only || *only == id);
    only = id;
  });
  return isOnly && !isEnumLike(tag) ? only : std::nullopt;
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
