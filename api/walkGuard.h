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

/// Counts the nodes that are looked at beside a walk, below each of its groups. In a sound stream each is the child of
/// one group; on hostile bytes all groups can have the same children.
class ChildGuard
{
public:
  explicit ChildGuard(const TAVHeader& start)
      : start_(start.nodeOffset)
  {
  }

  /// Whether there may be another one after the node at `offset`.
  bool visit(uint64_t offset)
  {
    farthest_ = std::max(farthest_, offset);
    return ++nodes_ / kTimes <= std::max((farthest_ - start_) / kHeaderSize32, kAlways);
  }

private:
  static constexpr uint64_t kTimes = 4;
  static constexpr uint64_t kAlways = 0x2000; ///< so many cost nobody anything, however short the stream

  uint64_t start_;
  uint64_t farthest_ = start_;
  uint64_t nodes_ = 0;
};

/// Bounds a search that looks through the levels of a stream's groups one by one. Sound levels do not overlap: in all
/// they are as long as the stream, once for each depth that is searched. On hostile bytes each group can have all that
/// follows as its level.
class LevelGuard
{
public:
  /// `depths`: how many levels the search can have above each other.
  LevelGuard(uint64_t start, uint64_t depths)
      : start_(start), times_(kTimes + 2 * depths), farthest_(start)
  {
  }

  /// Whether the search may go on after it went through a level from one offset to another.
  bool pass(uint64_t from, uint64_t to)
  {
    farthest_ = std::max(farthest_, to);
    passed_ = addSaturated(passed_, to > from ? to - from : 0);
    uint64_t most = 0;
    return __builtin_mul_overflow(farthest_ - start_, times_, &most) || passed_ <= std::max(most, kAlways);
  }

private:
  static constexpr uint64_t kTimes = 16;
  static constexpr uint64_t kAlways = 0x100000; ///< so much costs nobody anything, however short the stream

  uint64_t start_;
  uint64_t times_;
  uint64_t farthest_;
  uint64_t passed_ = 0;
};

} // namespace tav::inside
