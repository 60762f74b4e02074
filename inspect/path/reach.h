/// @file reach.h
/// How far what a path leads to depends on what is around it.
#pragma once

#include <algorithm>
#include <cstdint>

#include "tav/path/compiled.hpp"

namespace tav::inspect
{

/// Whether what a path finds in a root does not depend on the roots before and behind.
inline bool staysInRoot(const detail::paths::Compiled& path)
{
  const auto counts = [&](uint32_t index) {
    const detail::paths::Route& route = path.routes[index];
    return route.hasParents || (!route.steps.empty() && !route.steps.front().predicates.empty());
  };
  const auto levels = [&](uint32_t index) {
    const detail::paths::Route& route = path.routes[index];
    const bool any = !route.steps.empty() && route.steps.front().axis != detail::paths::Axis::child;
    return any && std::any_of(route.steps.begin(), route.steps.end(),
                              [](const detail::paths::Step& step) { return !step.predicates.empty(); });
  };
  return std::none_of(path.main.begin(), path.main.end(), counts) &&
         std::none_of(path.main.begin(), path.main.end(), levels);
}

} // namespace tav::inspect
