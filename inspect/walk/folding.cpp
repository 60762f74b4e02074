#include "tav/inspect/folding.hpp"

namespace tav::inspect
{

namespace
{

/// What is worth a look, and so is not hidden among its like.
constexpr uint32_t kRemarkable = kOpen | kOverrun | kNoPair | kBadPair | kBadGroupType | kAfterDamage;

} // namespace

Folding::Folding(Told told, uint64_t shown)
    : told_(std::move(told)), shown_(shown)
{
}

bool Folding::shows(const Event& event)
{
  switch (event.what)
  {
  case What::nodeBegin:
    if (hiddenDepth_ != kNoDepth)
    {
      return false;
    }
    return isEndPiece(event) || showsNode(event.node);
  case What::nodeEnd:
    if (event.node.isGroup() && event.depth == hiddenDepth_)
    {
      hiddenDepth_ = kNoDepth;
      return false;
    }
    if (event.node.isGroup() && hiddenDepth_ == kNoDepth)
    {
      endRunsBelow(event.depth);
    }
    return hiddenDepth_ == kNoDepth;
  case What::damaged:
  case What::unread:
  case What::zeros:
    if (!runs_.empty())
    {
      endRun(runs_.back());
    }
    return true;
  default: return hiddenDepth_ == kNoDepth;
  }
}

bool Folding::showsNode(const Node& node)
{
  const auto level = static_cast<size_t>(node.depth);
  runs_.resize(level + 1);
  Run& run = runs_[level];
  const bool like = run.count != 0 && run.elm == node.elm() && run.isGroup == node.isGroup();
  if (!like || (node.flags & kRemarkable) != 0)
  {
    endRun(run);
    run.elm = node.elm();
    run.isGroup = node.isGroup();
  }
  if (++run.count <= shown_)
  {
    return true;
  }
  if (run.hidden.count++ == 0)
  {
    run.hidden.offset = node.offset();
    run.hidden.depth = node.depth;
  }
  hiddenDepth_ = node.isGroup() ? node.depth : kNoDepth;
  return false;
}

void Folding::endRun(Run& run)
{
  if (run.hidden.count != 0)
  {
    told_(run.hidden);
  }
  run = {};
}

void Folding::endRunsBelow(uint64_t depth)
{
  while (runs_.size() > depth + 1)
  {
    endRun(runs_.back());
    runs_.pop_back();
  }
}

void Folding::finish()
{
  while (!runs_.empty())
  {
    endRun(runs_.back());
    runs_.pop_back();
  }
}

} // namespace tav::inspect
