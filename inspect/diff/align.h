/// @file diff_align.h
/// Which children of two groups stand for the same thing.
#pragma once

#include <cstdint>
#include <utility>
#include <vector>

#include "inspect/diff/index.h"

namespace tav::inspect
{

/// A child as the alignment sees it.
struct Child
{
  uint64_t row;
  uint64_t hash;
  uint64_t key;
  uint32_t kind; ///< element, and whether it is a group, a value or damaged bytes
};

/// Rows of either side that are compared with each other; kNoRow: there is no counterpart.
using Pairs = std::vector<std::pair<uint64_t, uint64_t>>;

/// Aligns children: those of one element by their keys where they have some, else those that are equal in their
/// order, and between them one after the other. In the order of the first list, then what only the second has.
Pairs align(const std::vector<Child>& first, const std::vector<Child>& second);

} // namespace tav::inspect
