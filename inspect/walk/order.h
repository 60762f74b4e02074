/// @file order.h
/// Sorting in little code.
#pragma once

#include <algorithm>
#include <cstddef>
#include <utility>

namespace tav::inspect
{

/// As std::sort, of which each type of items costs 2 KB of code; this one costs a fifth of that. Most lists are in
/// order.
template<class Items, class Less>
void putInOrder(Items& items, const Less& isLess)
{
  if (!std::is_sorted(items.begin(), items.end(), isLess))
  {
    std::make_heap(items.begin(), items.end(), isLess);
    std::sort_heap(items.begin(), items.end(), isLess);
  }
}

/// As std::stable_sort, for a few items.
template<class Items, class Less>
void putFewInOrder(Items& items, const Less& isLess)
{
  for (size_t i = 1; i < items.size(); ++i)
  {
    for (size_t place = i; place > 0 && isLess(items[place], items[place - 1]); --place)
    {
      std::swap(items[place], items[place - 1]);
    }
  }
}

} // namespace tav::inspect
