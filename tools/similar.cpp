#include "tools/similar.h"

#include <algorithm>

namespace tav::tool
{

size_t editDistance(std::string_view a, std::string_view b)
{
  std::vector<size_t> row(b.size() + 1);
  for (size_t j = 0; j <= b.size(); ++j)
  {
    row[j] = j;
  }
  for (size_t i = 1; i <= a.size(); ++i)
  {
    size_t diagonal = row[0];
    row[0] = i;
    for (size_t j = 1; j <= b.size(); ++j)
    {
      const auto lower = [](char c) { return c >= 'A' && c <= 'Z' ? static_cast<char>(c + ('a' - 'A')) : c; };
      const size_t changed = diagonal + (lower(a[i - 1]) == lower(b[j - 1]) ? 0 : 1);
      diagonal = row[j];
      row[j] = std::min({row[j] + 1, row[j - 1] + 1, changed});
    }
  }
  return row.back();
}

size_t mostSlips(std::string_view word)
{
  return 1 + word.size() / 4;
}

std::string nearest(std::string_view word, const std::vector<std::string>& known)
{
  constexpr size_t longest = 64; // nobody mistypes more
  std::string found;
  size_t least = mostSlips(word) + 1;
  for (const std::string& candidate : known)
  {
    const bool begun = word.size() > 1 && candidate.starts_with(word);
    const size_t distance = begun ? 1 : word.size() > longest ? least
                                                              : editDistance(word, candidate);
    if (distance < least)
    {
      least = distance;
      found = candidate;
    }
  }
  return found;
}

} // namespace tav::tool
