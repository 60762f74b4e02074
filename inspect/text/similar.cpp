#include "tav/inspect/similar.hpp"

#include "tav/cpp/nearest.hpp"

namespace tav::inspect
{

size_t editDistance(std::string_view a, std::string_view b)
{
  std::vector<size_t> row(a.size() + 1);
  return detail::editDistance(a, b, row.data());
}

size_t mostSlips(std::string_view word)
{
  return detail::mostSlips(word);
}

std::string nearest(std::string_view word, const std::vector<std::string>& known)
{
  std::string found;
  size_t least = mostSlips(word) + 1;
  for (const std::string& candidate : known)
  {
    const bool begun = word.size() > 1 && candidate.starts_with(word);
    const size_t distance = begun ? 1 : word.size() > detail::kLongestMisspelt ? least
                                                                               : editDistance(word, candidate);
    if (distance < least)
    {
      least = distance;
      found = candidate;
    }
  }
  return found;
}

} // namespace tav::inspect
