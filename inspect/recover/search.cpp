#include "inspect/recover/search.h"

#include <algorithm>
#include <array>
#include <span>
#include <vector>

namespace tav::inspect
{

using namespace tav::layout;

bool RecoverySearch::findNext(uint64_t from, uint64_t to, Candidate& found)
{
  constexpr uint64_t kAtOnce = uint64_t{16} * 1024;
  std::vector<uint8_t> window(kAtOnce + kHeaderSize64);
  for (uint64_t at = from; at < to;)
  {
    std::fill(window.begin(), window.end(), uint8_t{0});
    source_.read(at, window);
    const uint64_t tests = std::min(kAtOnce, to - at);
    for (uint64_t i = 0; i < tests; ++i)
    {
      if (isFound(window.data() + i, at + i, from, to, found))
      {
        return true;
      }
    }
    at = std::min(to, source_.pastHole(at + tests, window, kHeaderSize64));
    spent_ += tests;
    if (gaveUp())
    {
      return false;
    }
  }
  return false;
}

/// Whether a node begins at an offset; one with other headers than the group around has takes more to be believed.
bool RecoverySearch::isFound(const uint8_t* bytes, uint64_t offset, uint64_t from, uint64_t to, Candidate& found)
{
  const bool own = place_.top().wide;
  if (judge_.tryAt(bytes, offset, own, found) && judge_.isWorthTaking(found, from, to) &&
      believe(found, Footing::searched))
  {
    return true;
  }
  return form_.root64 && judge_.tryAt(bytes, offset, !own, found) && found.trust >= Trust::followed &&
         !judge_.isDamagedEnd(found, to) && judge_.isRun(offset, !own) && believe(found, Footing::searched);
}

uint64_t RecoverySearch::firstSure(uint64_t from, uint64_t to, bool wide)
{
  // What was searched once is not searched again: claims may overlap as they like.
  const bool known = wide == sureWide_ && from >= sureFrom_ && from <= sureAt_;
  if (known && (sureFound_ || to <= sureAt_))
  {
    return std::min(to, sureAt_);
  }
  std::array<uint8_t, 4096 + kHeaderSize64> window;
  const uint64_t length = kHeaderSize32;
  uint64_t at = known ? sureAt_ : from;
  bool done = false;
  while (at < to && !done)
  {
    // Most are texts of a few bytes: no more is read than the tests look at.
    const auto bytes = std::span(window).first(static_cast<size_t>(std::min<uint64_t>(4096, to - at) + kHeaderSize64));
    const size_t got = source_.read(at, bytes);
    std::fill(bytes.begin() + static_cast<ptrdiff_t>(got), bytes.end(), uint8_t{0});
    const uint64_t tests = std::min<uint64_t>({4096, to - at, got < length ? 0 : got - length + 1});
    if (tests == 0)
    {
      at = to;
      break;
    }
    uint64_t i = 0;
    while (i < tests && !judge_.isSure(window.data() + i, at + i, wide))
    {
      ++i;
    }
    at += i;
    done = i < tests;
    at = done ? at : std::min(to, source_.pastHole(at, window, kHeaderSize64));
  }
  sureFrom_ = known ? sureFrom_ : from;
  sureAt_ = at;
  sureWide_ = wide;
  sureFound_ = done;
  return at;
}

/// Whether nodes inside of what a node claims follow one another exactly to its end, or to that of its payload where
/// the announced pair is damaged.
bool RecoverySearch::isContradicted(const Candidate& found)
{
  const TAVHeader& header = found.header();
  if (found.isGroup() || (Judge::isExact(header) && found.pairBytes == 0) || Judge::mayHoldNodes(found))
  {
    return false;
  }
  const uint64_t start = header.nodeOffset + headerLength(header.hdrType);
  const uint64_t sure = firstSure(start, found.end, is64(header));
  return sure < start + sizeOf(header) &&
         (judge_.leadsTo(sure, is64(header), found.end) ||
          judge_.leadsTo(sure, is64(header), found.end - found.pairBytes));
}

bool RecoverySearch::believe(Candidate& found, Footing footing)
{
  const TAVHeader& header = found.header();
  const bool named = Prober::isNamed(elmOf(header));
  const uint64_t start = header.nodeOffset + headerLength(header.hdrType);
  if (found.trust >= Trust::followed)
  {
    return found.trust == Trust::paired ? named || !found.isGroup() || !judge_.holdsRun(header.nodeOffset + 1, start)
                                        : !isContradicted(found);
  }
  if (footing == Footing::sound && named && Judge::isExact(header))
  {
    return !judge_.holdsRun(header.nodeOffset + 1, found.end);
  }
  // Its size can be damaged: then nodes stand inside of what it claims, and go on beyond.
  const uint64_t end = found.isGroup() ? start : found.end;
  const uint64_t from = footing != Footing::searched && named && !found.isGroup() ? start : header.nodeOffset + 1;
  const uint64_t sure = firstSure(from, end, is64(header));
  if (!found.isGroup() && sure >= start + sizeOf(header))
  {
    found.end = sure; // perhaps its padding is not there
    return true;
  }
  return sure >= end || (!found.isGroup() && Judge::mayHoldNodes(found) && judge_.leadsTo(sure, is64(header), end));
}

bool RecoverySearch::isStranger(const TAVHeader& header, uint64_t& end)
{
  constexpr int kMost = 16;
  const uint64_t limit = std::min(place_.sureLimit(), place_.top().limit);
  const bool wide = is64(header);
  if (!judge_.endOfStranger(header, limit, end))
  {
    return false;
  }
  uint64_t at = end;
  TAVHeader next{};
  for (int i = 0; i < kMost && at != limit && !judge_.isBoundary(at) && !judge_.goesOn(at, wide); ++i)
  {
    if (!judge_.prober().header(at, wide, limit, next))
    {
      return false;
    }
    if (judge_.prober().judgeHeader(next, limit) >= Belief::typed)
    {
      return judge_.prober().isChain(at, wide, limit) && firstSure(header.nodeOffset + 1, end, wide) == end;
    }
    if (!judge_.endOfStranger(next, limit, at))
    {
      return false;
    }
  }
  return firstSure(header.nodeOffset + 1, end, wide) == end;
}

} // namespace tav::inspect
