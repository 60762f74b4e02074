/// Keeps a walk from going round on hostile bytes.
#pragma once

#include <algorithm>
#include <cstdint>

#include "format/layout.h"

namespace tav::inside
{

/// Counts the nodes of a walk below a group. The sibling of a group that was never closed is found by an eye catcher,
/// which damage can place before nodes that were visited already; nested, such groups double the walk at each level.
/// A walk that has taken more steps than there is room for headers up to the farthest node visits nodes again.
class WalkGuard
{
public:
  explicit WalkGuard(const TAVHeader& start)
      : start_(start.nodeOffset)
  {
  }

  /// Whether the walk may go on after visiting the node at `offset`.
  bool visit(uint64_t offset)
  {
    ++nodes_;
    farthest_ = std::max(farthest_, offset);
    return nodes_ <= (farthest_ - start_) / kHeaderSize32;
  }

private:
  uint64_t start_;
  uint64_t farthest_ = start_;
  uint64_t nodes_ = 0;
};

} // namespace tav::inside
