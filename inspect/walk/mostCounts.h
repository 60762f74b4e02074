/// @file mostCounts.h
#pragma once

#include <cstddef>

namespace tav::inspect
{

inline constexpr size_t kMostCounts =
    256; ///< different ids among siblings that are counted; others are named by offset

} // namespace tav::inspect
