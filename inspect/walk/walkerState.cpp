// A walk that goes on where another one stands.
#include <algorithm>
#include <utility>

#include "inspect/walk/mostCounts.h"
#include "inspect/walk/prober.h"
#include "tav/inspect/walker.hpp"

namespace tav::inspect
{

Walker Walker::from(ByteSource& source, const Form& form, const State& state, uint64_t budget)
{
  Walker walker(source, form, {.offset = state.position, .budget = budget});
  walker.frames_ = state.frames;
  walker.counts_ = state.counts;
  walker.above_ = state.above;
  walker.afterDamage_ = state.afterDamage;
  walker.inherited_ = state.frames.size();
  return walker;
}

Walker::State Walker::state() const
{
  return {frames_, counts_, above_, position_, afterDamage_};
}

void Walker::State::forget()
{
  counts.clear();
  for (Frame& frame : frames)
  {
    frame.counts = 0;
    frame.counted = 0;
    frame.lastDamage = 0;
  }
}

bool Walker::State::join(const State& before, size_t shared)
{
  std::vector<Count> all;
  const std::vector<Count> mine = std::move(counts);
  for (size_t i = 0; i < frames.size(); ++i)
  {
    Frame& frame = frames[i];
    const size_t from = frame.counts;
    const size_t to = i + 1 < frames.size() ? frames[i + 1].counts : mine.size();
    frame.counts = all.size();
    if (i < shared)
    {
      const Frame& known = before.frames[i];
      const size_t end = i + 1 < before.frames.size() ? before.frames[i + 1].counts : before.counts.size();
      frame.lastDamage = frame.lastDamage != 0 ? frame.lastDamage : known.lastDamage;
      frame.counted |= known.counted;
      frame.node = known.node;
      all.insert(all.end(), before.counts.begin() + static_cast<ptrdiff_t>(known.counts),
                 before.counts.begin() + static_cast<ptrdiff_t>(end));
    }
    const size_t old = all.size();
    const auto counted = [&](uint16_t elm) {
      return std::find_if(all.begin() + static_cast<ptrdiff_t>(frame.counts), all.end(),
                          [elm](const Count& count) { return count.elm == elm; });
    };
    size_t met = 0;
    for (size_t k = from; k < to; ++k)
    {
      const auto place = counted(mine[k].elm);
      if (place != all.end())
      {
        met += static_cast<size_t>(place - all.begin()) < old ? 1 : 0;
        place->count += mine[k].count;
      }
      else if (all.size() - frame.counts < kMostCounts)
      {
        all.push_back(mine[k]);
      }
    }
    if (to - from == kMostCounts && met < old - frame.counts)
    {
      return false; // of those that were known before, some may be among the ones that were not counted here
    }
    if (i + 1 == shared && shared < frames.size())
    {
      Node& child = frames[shared].node; // of all its siblings, the last that was counted
      const auto place = counted(child.elm());
      child.ordinal = place == all.end() ? 0 : place->count;
    }
  }
  counts = std::move(all);
  return true;
}

} // namespace tav::inspect
