#include "inspect/recover/place.h"

#include <algorithm>
#include <utility>

namespace tav::inspect
{

Place::Place(const Form& form, uint64_t size)
{
  levels_.push_back({.group = {.limit = size, .wide = form.root64, .sure = true}});
}

void Place::moveTo(uint64_t position)
{
  position_ = position;
  skipLost();
}

void Place::enter(const OpenGroup& group)
{
  const Level& around = levels_.back();
  const size_t own = levels_.size();
  const bool holds = group.wide || group.sure || group.fixed;
  levels_.push_back({group, group.sure ? own : around.sureAt, holds ? own : around.heldAt});
}

size_t Place::groupAt(uint64_t start) const
{
  const auto behind = std::upper_bound(levels_.begin() + 1, levels_.end(), start,
                                       [](uint64_t at, const Level& level) { return at < level.group.start; });
  const auto at = static_cast<size_t>(behind - levels_.begin()) - 1;
  return at != 0 && levels_[at].group.start == start ? at : 0;
}

void Place::stretch(uint64_t end)
{
  for (size_t i = levels_.size(); i-- > 1 && levels_[i].group.limit < end;)
  {
    levels_[i].group.limit = end;
  }
}

uint64_t Place::contradict(uint64_t end)
{
  uint64_t count = 0;
  const bool beyond = top().limit < end;
  for (size_t i = 1; beyond && i < levels_.size(); ++i)
  {
    OpenGroup& group = levels_[i].group;
    if (group.limit < end)
    {
      count += group.open ? 0 : group.count();
      group.limit = levels_[i - 1].group.limit;
      group.open = true;
    }
  }
  return count;
}

void Place::openTop()
{
  OpenGroup& group = top();
  group.limit = levels_.front().group.limit;
  group.open = true;
  group.sure = false;
  levels_.back().sureAt = 0;
}

void Place::expect(std::vector<Ending> lost)
{
  lost_ = std::move(lost);
  next_ = 0;
  skipLost();
}

void Place::skipLost()
{
  while (next_ < lost_.size() && lost_[next_].start < position_)
  {
    ++next_;
  }
}

} // namespace tav::inspect
