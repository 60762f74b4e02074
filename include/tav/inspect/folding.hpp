/// @file folding.hpp
/// Which nodes of a walk only repeat the siblings before them.
#pragma once

#include <cstdint>
#include <functional>
#include <vector>

#include "tav/inspect/api.hpp"
#include "tav/inspect/walker.hpp"

namespace tav::inspect
{

/// Siblings that were hidden, with all below them.
struct Folded
{
  uint64_t offset = 0; ///< of the first of them
  uint64_t count = 0;
  uint64_t depth = 0;
};

/// Of siblings of one element and kind that follow one another, the first few are shown and the others hidden. Damaged
/// bytes and nodes of which something is remarkable are never hidden with their siblings. End elements are no siblings.
/// Memory grows with the depth. Used by one thread.
class Folding
{
public:
  using Told = std::function<void(const Folded&)>;

  /// `shown`: of siblings that are alike; `told` is told of the others when their run ends.
  TAV_INSPECT_API explicit Folding(Told told, uint64_t shown = 3);

  /// To be given every event of the walk, in their order; whether what it stands for is shown.
  TAV_INSPECT_API bool shows(const Event& event);

  /// Tells of what is hidden still; at the end of the walk.
  TAV_INSPECT_API void finish();

private:
  struct Run
  {
    uint16_t elm = 0;
    bool isGroup = false;
    uint64_t count = 0;
    Folded hidden{};
  };

  bool showsNode(const Node& node);
  void endRun(Run& run);
  void endRunsBelow(uint64_t depth);

  Told told_;
  uint64_t shown_;
  std::vector<Run> runs_{};         ///< level by level
  uint64_t hiddenDepth_ = kNoDepth; ///< of the group that is being left out

  static constexpr uint64_t kNoDepth = ~uint64_t{0};
};

} // namespace tav::inspect
