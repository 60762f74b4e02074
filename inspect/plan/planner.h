/// Where a file is cut.
#pragma once

#include <bitset>
#include <cstdint>
#include <optional>
#include <unordered_set>
#include <vector>

#include "tav/inspect/plan.hpp"
#include "tav/inspect/streamWalk.hpp"

namespace tav::inspect
{

/// Goes through a file in strides. Where the sizes of a few nodes lead to a place it takes their way; else it looks at
/// the bytes there for what looks like a child of one of the groups around, by the kinds of children that it has seen
/// in them. What it takes for one need not be one.
class Planner
{
public:
  /// `maxDepth`: the most groups around a part.
  Planner(ByteSource& source, const Form& form, bool everyForm, size_t maxDepth);

  /// The parts, each about `target` bytes long.
  std::vector<Part> run(uint64_t target);

private:
  /// What was seen among the children of a group.
  struct Level
  {
    uint64_t group = kNoOffset;           ///< where it begins
    std::unordered_set<uint32_t> kinds{}; ///< element and type
    uint64_t first = 0;                   ///< where the first of those seen begins
    uint64_t count = 0;
  };

  bool reach(uint64_t target, uint64_t slack);
  bool isFar(uint64_t target, uint64_t steps) const;
  void see(const Event& event, uint64_t target, uint64_t slack);
  bool guess(uint64_t target);
  bool guessIn(std::span<const uint8_t> bytes, uint64_t at, uint64_t count);
  bool tryAt(uint64_t offset, const uint8_t* bytes);
  bool isChild(const Walker::State& around, size_t level, uint64_t offset);
  bool canCut() const;
  Part here() const;

  ByteSource& source_;
  bool everyForm_;
  size_t maxDepth_;
  std::optional<StreamWalk> walk_{};
  Event event_{};
  std::vector<Level> levels_{}; ///< of the groups around the place, by depth, the file's first
  std::bitset<65536> elms_{};   ///< what may be guessed at
  size_t inner_ = 0;            ///< levels that are around the place that is looked for
  bool guessed_ = false;
};

} // namespace tav::inspect
