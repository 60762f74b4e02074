/// @file place.h
/// The place that a recovery has reached in a damaged stream.
#pragma once

#include <cstddef>
#include <cstdint>
#include <utility>
#include <vector>

#include "inspect/recover/endings.h"
#include "tav/inspect/node.hpp"

namespace tav::inspect
{

/// A group that is open, as far as it is known.
struct OpenGroup
{
  uint64_t start = 0;
  uint64_t limit = 0;
  bool wide = false;    ///< children have 64-bit headers
  bool sure = false;    ///< the limit is confirmed
  bool fixed = false;   ///< a root: what has other headers than its children does not end it
  bool open = false;    ///< ends where the group around it ends
  bool hidden = false;  ///< too deep: its children go to the group around it
  bool counted = false; ///< among those that were open or whose size was wrong
  uint64_t claim = 0;   ///< where its size says that it ends, when only what is there speaks against it; else 0

  /// 1 the first time for a group that was open or whose size was wrong; one that is hidden is not written.
  uint64_t count() { return hidden || std::exchange(counted, true) ? 0 : 1; }
};

/// A position, the groups that are open around it, and the groups ahead whose headers are lost. The outermost group
/// stands for the file.
class Place
{
public:
  Place(const Form& form, uint64_t size);

  uint64_t position() const { return position_; }
  /// Never back.
  void moveTo(uint64_t position);

  void enter(const OpenGroup& group);
  void leave() { levels_.pop_back(); }

  /// Groups that are open, the file included.
  size_t depth() const { return levels_.size(); }
  bool inFile() const { return levels_.size() == 1; }
  const OpenGroup& group(size_t at) const { return levels_[at].group; }
  const OpenGroup& top() const { return levels_.back().group; }
  OpenGroup& top() { return levels_.back().group; }

  /// The innermost open group that begins at an offset; 0 when none does.
  size_t groupAt(uint64_t start) const;

  /// Moves the limits of all groups that end before `end` there: a group around them or inside of them is known to.
  void stretch(uint64_t end);

  /// Lets all groups whose limits lie before `end` end where the file or a group around them does. Returns how many of
  /// them counted as whole until then.
  uint64_t contradict(uint64_t end);

  /// Lets the innermost group take what comes behind it, up to the end of the file.
  void openTop();

  /// The innermost limit that is confirmed.
  uint64_t sureLimit() const { return levels_[levels_.back().sureAt].group.limit; }

  /// Whether nodes with this header can stand here. Below a group of 32-bit headers there are no 64-bit ones.
  bool canHold(bool wide) const { return !wide || levels_[levels_.back().heldAt].group.wide; }

  /// Names the groups whose headers are lost, sorted by start.
  void expect(std::vector<Ending> lost);

  /// The first of them at the position or behind it; null when there is none.
  const Ending* lostGroup() const { return next_ < lost_.size() ? &lost_[next_] : nullptr; }

  /// Leaves that one behind.
  void passLostGroup() { ++next_; }

private:
  struct Level
  {
    OpenGroup group{};
    size_t sureAt = 0; ///< the innermost group from here outwards whose limit is confirmed,
    size_t heldAt = 0; ///< and the one that decides whether 64-bit headers can stand here
  };

  void skipLost();

  std::vector<Level> levels_{};
  uint64_t position_ = 0;
  std::vector<Ending> lost_{};
  size_t next_ = 0;
};

} // namespace tav::inspect
