#include "inspect/plan/planner.h"

#include <algorithm>
#include <cstring>
#include <unordered_set>
#include <vector>

#include "inspect/plan/partState.h"
#include "inspect/walk/mostCounts.h"
#include "inspect/walk/prober.h"

namespace tav::inspect
{

using namespace tav::layout;

namespace
{

constexpr size_t kMostLevels = 64;    ///< groups around a part
constexpr size_t kMostKinds = 64;     ///< of children that are remembered of a group
constexpr uint64_t kSample = 16;      ///< nodes by which the length of the others is judged
constexpr uint64_t kFewSteps = 48;    ///< that are taken rather than looking at bytes
constexpr uint64_t kMostSteps = 4096; ///< and where looking has found nothing
constexpr uint64_t kWindow = uint64_t{64} * 1024;
constexpr uint64_t kMargin = kHeaderSize64;
constexpr uint64_t kMostSearched = uint64_t{1024} * 1024; ///< bytes that are looked through for a damaged node's end
constexpr uint64_t kMostLookedAt = uint64_t{256} * 1024;  ///< and in which a place is looked for
constexpr uint64_t kConvincing = 12;                      ///< children in a row that speak for the first of them

uint32_t kindOf(const TAVHeader& header)
{
  return uint32_t{elmOf(header)} << 16U | typeOf(header);
}

} // namespace

Planner::Planner(ByteSource& source, const Form& form, bool everyForm, size_t maxDepth)
    : source_(source), everyForm_(everyForm), maxDepth_(std::min(maxDepth, kMostLevels))
{
  walk_.emplace(
      source_, form, [](const PassedOver&) {}, stateOf(source_, wholeOf(source_, form)), 0, everyForm_, kMostSearched);
}

std::vector<Part> Planner::run(uint64_t target)
{
  std::vector<Part> parts;
  parts.push_back(here());
  const uint64_t size = source_.size();
  for (uint64_t next = target; next < size; next = addSaturated(std::max(next, parts.back().offset), target))
  {
    if (reach(next, target / 4) && walk_->walker().place() > parts.back().offset && walk_->walker().place() < size)
    {
      parts.push_back(here());
    }
  }
  for (size_t i = 0; i < parts.size(); ++i)
  {
    parts[i].size = (i + 1 < parts.size() ? parts[i + 1].offset : size) - parts[i].offset;
  }
  return parts;
}

bool Planner::canCut() const
{
  const Walker& walk = walk_->walker();
  return walk.isBetween() && walk.depth() <= maxDepth_ && !walk.isAfterDamage() &&
         (walk.place() == 0 || walk.place() > walk_->streamOffset());
}

Part Planner::here() const
{
  const Walker::State state = walk_->walker().state();
  Part part = partAt(state, walk_->form(), walk_->streamOffset());
  part.guessed = guessed_;
  for (PartGroup& group : part.around)
  {
    group.damaged = false;
  }
  if (!guessed_)
  {
    const size_t from = state.frames.back().counts;
    uint64_t children = 0;
    for (size_t i = from; i < state.counts.size(); ++i)
    {
      children += state.counts[i].count;
    }
    part.firstChild = state.counts.size() - from < kMostCounts ? std::optional(children) : std::nullopt;
  }
  return part;
}

/// Goes on to the first place at or behind `target` where the file can be cut; false when none was found near it.
bool Planner::reach(uint64_t target, uint64_t slack)
{
  bool looked = false;
  for (uint64_t steps = 0; steps < kMostSteps; ++steps)
  {
    if (walk_->walker().place() >= target && canCut())
    {
      return true;
    }
    if (!looked && walk_->walker().isBetween() && isFar(target, steps))
    {
      looked = true;
      if (guess(target))
      {
        return true;
      }
    }
    if (!walk_->next(event_))
    {
      return false;
    }
    see(event_, target, slack);
    steps -= event_.what == What::nodeBegin ? 0 : 1; // what belongs to a node is no step of its own
  }
  return false;
}

/// Whether it takes too many steps to a place, as far as those that were taken tell.
bool Planner::isFar(uint64_t target, uint64_t steps) const
{
  if (steps >= kFewSteps)
  {
    return true;
  }
  const size_t depth = walk_->walker().depth();
  if (levels_.size() <= depth || levels_[depth].count < kSample)
  {
    return false;
  }
  const Level& level = levels_[depth];
  const uint64_t place = walk_->walker().place();
  const uint64_t each = (place - level.first) / level.count + 1;
  return target > place && (target - place) / each > kFewSteps;
}

void Planner::see(const Event& event, uint64_t target, uint64_t slack)
{
  if (event.what != What::nodeBegin)
  {
    return;
  }
  const auto depth = static_cast<size_t>(event.depth);
  if (depth < kMostLevels)
  {
    levels_.resize(std::max(levels_.size(), depth + 1));
    Level& level = levels_[depth];
    if (level.group != event.node.parentOffset || level.count == 0)
    {
      level = {.group = event.node.parentOffset, .first = event.offset};
    }
    ++level.count;
    if (level.kinds.size() < kMostKinds && !isEndElement(event.node.elm()))
    {
      level.kinds.insert(kindOf(event.node.header));
    }
  }
  const bool goesIn = event.node.isGroup() && depth < maxDepth_ && event.node.limit > addSaturated(target, slack);
  if (event.node.isGroup() && !goesIn)
  {
    walk_->skip(); // where it cannot be skipped, its children are gone through
  }
}

/// Looks for a node near a place, and goes on there when it has found one.
bool Planner::guess(uint64_t target)
{
  const Walker& walk = walk_->walker();
  const size_t depth = std::min({walk.depth(), maxDepth_, levels_.size() - 1});
  elms_.reset();
  inner_ = 0;
  for (size_t i = 0; i <= depth && walk.limitAt(i) > target; ++i)
  {
    const bool isSeen = levels_[i].count != 0 && levels_[i].group == walk.groupAt(i);
    for (const uint32_t kind : isSeen ? levels_[i].kinds : std::unordered_set<uint32_t>{})
    {
      elms_.set(kind >> 16U);
    }
    inner_ = i + 1;
  }
  if (elms_.none())
  {
    return false;
  }
  std::vector<uint8_t> window(kWindow + kMargin);
  for (uint64_t at = target; at < source_.size() && at - target < kMostLookedAt; at += kWindow)
  {
    const size_t got = source_.read(at, window);
    std::fill(window.begin() + static_cast<ptrdiff_t>(got), window.end(), uint8_t{0});
    if (guessIn(window, at, std::min<uint64_t>(kWindow, got)))
    {
      return true;
    }
  }
  return false;
}

bool Planner::guessIn(std::span<const uint8_t> bytes, uint64_t at, uint64_t count)
{
  const bool swapped = walk_->form().swapped;
  for (uint64_t i = 0; i < count; ++i)
  {
    for (const uint64_t length : {kHeaderSize64, kHeaderSize32})
    {
      uint16_t elm = 0;
      std::memcpy(&elm, bytes.data() + i + length - sizeof elm, sizeof elm);
      if (elms_[swapped ? kor::byteswap16(elm) : elm] && tryAt(at + i, bytes.data() + i))
      {
        return true;
      }
    }
  }
  return false;
}

/// Whether the bytes at an offset are a child of one of the groups around; then the walk goes on there.
bool Planner::tryAt(uint64_t offset, const uint8_t* bytes)
{
  const Walker& walk = walk_->walker();
  for (size_t level = 0; level < inner_; ++level)
  {
    TAVHeader header{};
    decodeHeader(bytes, walk.wideAt(level), walk_->form().swapped, header);
    header.nodeOffset = offset;
    if (!levels_[level].kinds.contains(kindOf(header)) ||
        Prober(source_, walk_->form(), 0).judgeHeader(header, walk.limitAt(level)) < Belief::typed)
    {
      continue;
    }
    Walker::State around = walk.state();
    around.frames.resize(level + 1);
    around.forget();
    around.position = offset;
    around.afterDamage = false;
    if (isChild(around, level, offset))
    {
      const Form form = walk_->form();
      const uint64_t streamOffset = walk_->streamOffset();
      walk_.emplace(
          source_, form, [](const PassedOver&) {}, around, streamOffset, everyForm_, kMostSearched);
      for (Level& seen : levels_)
      {
        seen.first = offset;
        seen.count = 1;
      }
      guessed_ = true;
      return true;
    }
  }
  return false;
}

/// Whether what follows looks like a run of children, or one up to the group's end.
bool Planner::isChild(const Walker::State& around, size_t level, uint64_t offset)
{
  constexpr uint64_t mostEvents = 256;
  Walker walk = Walker::from(source_, walk_->form(), around, 0);
  Event event;
  uint64_t children = 0;
  for (uint64_t i = 0; i < mostEvents && children < kConvincing && walk.next(event); ++i)
  {
    if (event.what == What::damaged || event.what == What::unread || event.what == What::zeros)
    {
      return false;
    }
    if (event.what == What::nodeEnd && event.depth < level)
    {
      return children > 1; // the group's end
    }
    if (event.what != What::nodeBegin)
    {
      continue;
    }
    if (event.depth == level)
    {
      const bool isKnown = levels_[level].kinds.contains(kindOf(event.node.header));
      if ((children == 0 && event.offset != offset) || !(isKnown || isEndElement(event.node.elm())))
      {
        return false;
      }
      ++children;
    }
    if (event.node.isGroup())
    {
      walk.skip();
    }
  }
  return children > 1;
}

} // namespace tav::inspect
