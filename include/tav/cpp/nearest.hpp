/// @file nearest.hpp
/// The name that a misspelt one may have meant.
#pragma once

#include <cstddef>
#include <string_view>

namespace tav::detail
{

inline constexpr size_t kLongestMisspelt = 64;

/// Characters to change, add or leave out between two texts; the case of letters does not count. `row` has room for one
/// number more than `left` has characters.
inline size_t editDistance(std::string_view left, std::string_view right, size_t* row) noexcept
{
  const auto lower = [](char c) { return c >= 'A' && c <= 'Z' ? static_cast<char>(c + ('a' - 'A')) : c; };
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
      const size_t oneMore = 1 + (row[i] < row[i - 1] ? row[i] : row[i - 1]);
      row[i] = changed < oneMore ? changed : oneMore;
    }
  }
  return row[left.size()];
}

/// The most changes of a word that still count as a slip of the fingers.
constexpr size_t mostSlips(std::string_view word) noexcept
{
  return 1 + word.size() / 4;
}

} // namespace tav::detail
