/// A path as libtav makes it.
#pragma once

#include <array>
#include <atomic>
#include <cstddef>
#include <cstdint>
#include <span>

#include "tav/path/compiled.hpp"

namespace tav::detail::paths
{

struct Counted : Compiled
{
  mutable std::atomic<size_t> owners = 1;

  /// The ids of a short path that is straight and does not leave its start, next to each other: a look-up in an index
  /// is over before a step has come from memory.
  uint32_t idCount = 0;
  std::array<uint16_t, 12> ids{};

  void keepIds()
  {
    if (!isStraight || leavesStart)
    {
      return;
    }
    const std::span<const Step> steps = routes[main.front()].steps;
    idCount = steps.size() <= ids.size() ? static_cast<uint32_t>(steps.size()) : 0;
    for (size_t i = 0; i < idCount; ++i)
    {
      ids[i] = steps[i].only;
    }
  }
};

/// Nobody else makes one.
inline const Counted& countedOf(const Compiled& path) noexcept
{
  return static_cast<const Counted&>(path);
}

} // namespace tav::detail::paths
