/// @file selection.h
/// Which nodes of a walk some paths lead to: the one place where extracting, editing and comparing ask a path.
#pragma once

#include <algorithm>
#include <cstdint>
#include <optional>
#include <span>
#include <vector>

#include "tav/inspect/path.hpp"

namespace tav::inspect
{

class Selection
{
public:
  /// The paths outlive this object.
  explicit Selection(std::span<const Path> paths)
      : found_(paths.size())
  {
    matchers_.reserve(paths.size());
    for (const Path& path : paths)
    {
      matchers_.emplace_back(path);
    }
  }

  /// To be given `event`, the nodeBegin of every node of the walk whose parent was not skipped. The last of the paths
  /// that lead to it; nothing when none does.
  std::optional<size_t> at(const Walker& walker, const Event& event)
  {
    std::optional<size_t> last;
    for (size_t i = 0; i < matchers_.size(); ++i)
    {
      if (matchers_[i].matches(walker, event))
      {
        ++found_[i];
        last = i;
      }
    }
    return last;
  }

  /// Whether a path can lead to something below the node that was given last.
  bool reachesBelow() const
  {
    return std::any_of(matchers_.begin(), matchers_.end(), [](const auto& matcher) { return matcher.reachesBelow(); });
  }

  /// How many nodes a path has led to so far.
  uint64_t found(size_t path) const { return found_[path]; }

private:
  std::vector<PathMatcher> matchers_{};
  std::vector<uint64_t> found_{};
};

} // namespace tav::inspect
