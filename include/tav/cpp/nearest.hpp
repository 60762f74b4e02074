/// @file nearest.hpp
/// The name that a misspelt one may have meant.
#pragma once

#include <algorithm>
#include <array>
#include <cstddef>
#include <string_view>

#include "tav/dictionary.hpp"

namespace tav::detail
{

inline constexpr size_t kLongestMisspelt = 64;

/// Characters to change, add or leave out between two texts; the case of letters does not count.
inline size_t editDistance(std::string_view left, std::string_view right) noexcept
{
  const auto lower = [](char c) { return c >= 'A' && c <= 'Z' ? static_cast<char>(c + ('a' - 'A')) : c; };
  std::array<size_t, kLongestMisspelt + 1> row{};
  for (size_t i = 0; i <= left.size(); ++i)
  {
    row[i] = i;
  }
  for (size_t j = 1; j <= right.size(); ++j)
  {
    size_t diagonal = row[0];
    row[0] = j;
    for (size_t i = 1; i <= left.size(); ++i)
    {
      const size_t changed = diagonal + (lower(left[i - 1]) == lower(right[j - 1]) ? 0 : 1);
      diagonal = row[i];
      row[i] = std::min({row[i] + 1, row[i - 1] + 1, changed});
    }
  }
  return row[left.size()];
}

/// The tag that comes nearest to a name that no element has; empty when none is near.
inline std::string_view nearestTag(std::string_view name) noexcept
{
  std::string_view nearest;
  if (name.size() <= kLongestMisspelt)
  {
    size_t least = 2 + name.size() / 4;
    for (const dictionary::Entry& entry : dictionary::entries())
    {
      const size_t distance = entry.constant == "INVALID_ELEMENT" ? least : editDistance(name, entry.tag);
      if (distance < least)
      {
        least = distance;
        nearest = entry.tag;
      }
    }
  }
  return nearest;
}

} // namespace tav::detail
