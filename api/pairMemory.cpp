#include "api/pairMemory.h"

#include <algorithm>
#include <iterator>
#include <new>

namespace tav::inside
{
namespace
{

/// Whether `keep` had the memory that it needs.
template<class Keep>
bool hasKept(Keep keep)
{
  try
  {
    keep();
    return true;
  }
  catch (const std::bad_alloc&)
  {
    return false;
  }
}

} // namespace

bool PairMemory::isCovered(uint64_t place, uint64_t& end) const
{
  const auto behind = covered_.upper_bound(place);
  if (behind == covered_.begin() || std::prev(behind)->second <= place)
  {
    return false;
  }
  end = std::prev(behind)->second;
  return true;
}

bool PairMemory::findCovered(uint64_t place, uint64_t& start) const
{
  const auto behind = covered_.upper_bound(place);
  if (behind == covered_.end())
  {
    return false;
  }
  start = behind->first;
  return true;
}

void PairMemory::cover(uint64_t start, uint64_t end)
{
  auto next = covered_.upper_bound(start);
  if (next != covered_.begin() && std::prev(next)->second >= start)
  {
    --next;
    start = next->first;
  }
  while (next != covered_.end() && next->first <= end)
  {
    end = std::max(end, next->second);
    next = covered_.erase(next);
  }
  if (start < end && !isFull())
  {
    static_cast<void>(hasKept([&] { covered_.emplace_hint(next, start, end); }));
  }
}

bool PairMemory::findPair(uint64_t group, uint64_t& eyeOffset) const
{
  return lookUp(pairs_, group, eyeOffset);
}

bool PairMemory::keepPair(uint64_t group, uint64_t eyeOffset)
{
  uint64_t before = eyeOffset;
  return lookUp(pairs_, group, before) && before <= eyeOffset ? true : keep(pairs_, group, eyeOffset);
}

bool PairMemory::findEnd(uint64_t place, uint32_t& rc) const
{
  uint64_t value = 0;
  const bool isKnown = lookUp(ends_, place, value);
  rc = static_cast<uint32_t>(value);
  return isKnown;
}

void PairMemory::keepEnd(uint64_t place, uint32_t rc)
{
  if (keepsEnds)
  {
    static_cast<void>(keep(ends_, place, rc));
  }
}

bool PairMemory::findSuccessor(uint64_t eyeOffset, uint64_t& next) const
{
  return lookUp(successors_, eyeOffset, next);
}

void PairMemory::keepSuccessor(uint64_t eyeOffset, uint64_t next)
{
  static_cast<void>(keep(successors_, eyeOffset, next));
}

void PairMemory::clear()
{
  covered_.clear();
  pairs_.clear();
  ends_.clear();
  successors_.clear();
}

void PairMemory::makeRoom()
{
  if (isFull())
  {
    clear();
  }
}

bool PairMemory::lookUp(const Entries& entries, uint64_t key, uint64_t& value)
{
  const auto entry = entries.find(key);
  if (entry == entries.end())
  {
    return false;
  }
  value = entry->second;
  return true;
}

bool PairMemory::isFull() const
{
  return covered_.size() + pairs_.size() + ends_.size() + successors_.size() >= kMostEntries;
}

/// What is there already finds a place also when there is no room for more.
bool PairMemory::keep(Entries& entries, uint64_t key, uint64_t value) const
{
  const auto entry = entries.find(key);
  if (entry != entries.end())
  {
    entry->second = value;
    return true;
  }
  return !isFull() && hasKept([&] { entries.emplace(key, value); });
}

} // namespace tav::inside
