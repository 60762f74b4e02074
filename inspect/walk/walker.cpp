#include "tav/inspect/walker.hpp"

#include <algorithm>
#include <utility>

#include "inspect/walk/mostCounts.h"
#include "inspect/walk/pathSteps.h"
#include "inspect/walk/prober.h"
#include "tav/inspect/path.hpp"
#include "tav/inspect/phrases.hpp"

namespace tav::inspect
{

using namespace tav::layout;

uint64_t missingPadding(const Event& ended, const Form& form)
{
  const Node& node = ended.node;
  const bool pair = node.is64() && hasEyeSize(node.header) && !node.has(kNoPair);
  const uint64_t end = ended.offset - (pair ? kEyeSizeLength : 0);
  uint64_t size = node.size();
  if (form.aligned || (node.info() & TAV_INFO_ALIGNED8) != 0)
  {
    roundUp8Checked(size);
  }
  const uint64_t padded = addSaturated(node.payloadOffset() + (node.has(kExtra) ? 2 : 0), size);
  return padded - std::min(end, padded);
}

Walker::Walker(ByteSource& source, const Form& form, WalkStart start)
    : source_(source), form_(form), prober_(std::make_unique<Prober>(source, form, start.budget)),
      position_(std::min(start.offset, source.size())), inside_(start.inside)
{
  Frame file;
  file.limit = source.size();
  file.open = true;
  file.wide = start.offset == 0 ? form.root64 : start.wide;
  frames_.push_back(file);
}

Walker Walker::through(ByteSource& source, const Form& form, const Mark& mark)
{
  Walker walker(source, form, {.offset = mark.position, .budget = mark.budget});
  walker.frames_ = {mark.file};
  if (mark.depth != 0)
  {
    walker.frames_.push_back(mark.parent);
    walker.above_ = mark.depth - 1;
  }
  walker.frames_.push_back(mark.group);
  for (Frame& frame : walker.frames_)
  {
    frame.counts = 0;
    frame.counted = 0;
  }
  return walker;
}

Walker::Mark Walker::mark() const
{
  Mark mark;
  mark.file = frames_.front();
  mark.parent = frames_[frames_.size() - 2];
  mark.group = frames_.back();
  mark.depth = mark.group.node.depth;
  mark.position = position_;
  mark.budget = prober_->budget() - std::min(prober_->budget(), prober_->spent());
  return mark;
}

Walker::~Walker() = default;

Walker::Walker(Walker&&) noexcept = default;

uint64_t Walker::spent() const
{
  return prober_->spent();
}

void Walker::queue(What what, uint64_t offset, uint64_t length)
{
  queue_[queueCount_++] = {what, offset, length};
}

bool Walker::next(Event& event)
{
  canSkip_ = false;
  while (queueHead_ == queueCount_)
  {
    if (done_)
    {
      return false;
    }
    queueHead_ = queueCount_ = 0;
    step();
  }
  const Piece& piece = queue_[queueHead_++];
  event.what = piece.what;
  event.offset = piece.offset;
  event.length = piece.length;
  event.end = shared_.end;
  event.node = shared_.node;
  event.depth = shared_.depth;
  event.code = shared_.code;
  event.reason.clear();
  if (!shared_.reason.empty())
  {
    event.reason.swap(shared_.reason);
  }
  canSkip_ = event.what == What::nodeBegin && event.node.isGroup();
  return true;
}

bool Walker::goOn(Event& event)
{
  if (queueHead_ == queueCount_)
  {
    return next(event);
  }
  const Piece& piece = queue_[queueHead_++];
  event.what = piece.what;
  event.offset = piece.offset;
  event.length = piece.length;
  event.reason.clear();
  canSkip_ = false; // a group's header is the first piece that a step finds
  return true;
}

bool Walker::skip()
{
  const Frame& top = frames_.back();
  if (!canSkip_ || top.open || top.node.has(kOverrun) || queueHead_ != queueCount_)
  {
    return false;
  }
  if (!endIsSure())
  {
    return false;
  }
  canSkip_ = false;
  if (position_ < top.limit)
  {
    queue(What::skipped, position_, top.limit - position_);
    shared_.end = End::closed;
    shared_.code = TAV_RC_OK;
    shared_.node = top.node;
    shared_.depth = top.node.depth;
    position_ = top.limit;
  }
  return true;
}

bool Walker::endIsSure()
{
  const Frame& top = frames_.back();
  const Frame& around = frames_[frames_.size() - 2];
  const bool room = top.limit - position_ >= kEyeSizeLength;
  if (hasEyeSize(top.node.header) &&
      !(room && prober_->pairEnds(top.limit - kEyeSizeLength, top.limit, top.node.header)))
  {
    return false;
  }
  TAVHeader behind{};
  return top.limit == around.limit || frames_.size() == 2 ||
         (prober_->header(top.limit, around.wide, around.limit, behind) &&
          prober_->judgeHeader(behind, around.limit) != Belief::none);
}

void Walker::step()
{
  shared_.end = End::closed;
  shared_.depth = frames_.size() - 1 + above_;
  shared_.code = TAV_RC_OK;
  if (endPending_)
  {
    endPending_ = false;
    endGroup(End::byEndElement);
    return;
  }
  const Frame& top = frames_.back();
  if (position_ >= top.limit)
  {
    frames_.size() > 1 ? endByLimit() : void(done_ = true);
    return;
  }
  TAVHeader header{};
  const bool fits = prober_->header(position_, top.wide, top.limit, header);
  const bool blank = !fits || (sizeOf(header) == 0 && typeOf(header) == 0 && elmOf(header) == 0);
  if (blank && top.open && top.limit == source_.size() && endByZeros())
  {
    return;
  }
  if (blank && passZeros())
  {
    return;
  }
  if (!fits)
  {
    damage(position_, TAV_RC_NO_MEMORY,
           counted(top.limit - position_, "byte") + (top.limit - position_ == 1 ? " is" : " are") +
               " too few for a node's header");
    return;
  }
  begin(header);
}

void Walker::begin(TAVHeader& header)
{
  const Frame& top = frames_.back();
  Belief belief = prober_->judgeHeader(header, top.limit);
  if (frames_.size() == 1 && header.nodeOffset != 0 && belief < Belief::named)
  {
    // Nothing says which header a further root has. That of the first is given with the form.
    TAVHeader other{};
    const bool found = prober_->header(position_, !top.wide, top.limit, other) &&
                       prober_->judge(position_, !top.wide, top.limit) == Belief::followed;
    if (found)
    {
      header = other;
      belief = Belief::followed;
    }
  }
  Node& node = shared_.node; // of what will be in the queue
  node = {};
  node.header = header;
  node.depth = frames_.size() - 1 + above_;
  node.parentOffset = frames_.size() > 1 ? top.node.offset() : kNoOffset;
  node.flags = std::exchange(afterDamage_, false) ? uint32_t{kAfterDamage} : 0;
  const uint64_t start = node.payloadOffset();
  const bool overruns = node.size() > top.limit - start && !(node.isGroup() && isSizeUnknown(header));
  const bool strange = belief == Belief::fits && !node.isGroup() && isStrange(header);
  const bool blank = node.size() == 0 && node.type() == 0;
  const bool wildGroup = node.isGroup() && overruns && !holdsNodes(header, top.limit) &&
                         !prober_->isChain(start, hasChildren64(header), top.limit);
  if (blank || strange || wildGroup || (overruns && !node.isGroup()))
  {
    damage(position_, overruns ? TAV_RC_OUTSIDE_PARENT : TAV_RC_BAD_HDR_TYPE, whyNot(header, top.limit));
    return;
  }
  node.ordinal = countChild(node.elm());
  node.isGroup() ? beginGroup(node) : takeData(node);
}

bool Walker::holdsNodes(TAVHeader group, uint64_t limit)
{
  // The end of a file cuts all groups around it, each the first child of the one before, perhaps.
  constexpr int mostLevels = 64;
  for (int level = 0; level < mostLevels; ++level)
  {
    const uint64_t start = group.nodeOffset + headerLength(group.hdrType);
    const bool wide = hasChildren64(group);
    if (prober_->judge(start, wide, limit) >= Belief::named)
    {
      return true;
    }
    TAVHeader child{};
    if (!prober_->header(start, wide, limit, child))
    {
      return Prober::isNamed(elmOf(group));
    }
    const uint64_t inside = start + headerLength(child.hdrType);
    if (!isGroup(child) || !Prober::isNamed(elmOf(child)) || sizeOf(child) <= limit - inside)
    {
      return false;
    }
    group = child;
  }
  return true;
}

bool Walker::isStrange(const TAVHeader& header)
{
  const Frame& top = frames_.back();
  if (frames_.size() == 1)
  {
    return true;
  }
  return !prober_->isFollowed(header, top.limit) && !prober_->isChain(header.nodeOffset, top.wide, top.limit);
}

bool Walker::looksUnfinished(const Node& node, const Frame& parent)
{
  // A group that was opened with size 0 and never closed. One that asks for a pair is never empty when closed. The
  // others can only be open inside a group that was not closed either.
  const Node& around = parent.node;
  const bool unfinished =
      (frames_.size() == 1 && !inside_) || (around.has(kOpen) && (around.size() == 0 || !hasEyeSize(around.header)));
  if (node.size() != 0 || !(unfinished || (hasEyeSize(node.header) && parent.open)))
  {
    return false;
  }
  // Children that nobody knows count unless what is there is surer as a sibling, with a header of the other width.
  const uint64_t start = node.payloadOffset();
  const bool wide = hasChildren64(node.header);
  return prober_->judge(start, wide, parent.limit) >= Belief::typed ||
         (prober_->judge(start, is64(node.header), parent.limit) < Belief::typed &&
          prober_->isChain(start, wide, parent.limit));
}

void Walker::beginGroup(Node& node)
{
  const Frame& parent = frames_.back();
  const uint64_t start = node.payloadOffset();
  Frame frame;
  if (isSizeUnknown(node.header) || looksUnfinished(node, parent))
  {
    node.flags |= kOpen;
    frame.open = true;
    frame.limit = parent.limit;
  }
  else if (node.size() > parent.limit - start)
  {
    node.flags |= kOverrun;
    frame.open = true;
    frame.limit = parent.limit;
  }
  else
  {
    frame.limit = start + node.size();
  }
  if (!node.is64() && node.type() == TAV_TYPE_HEADER64)
  {
    node.flags |= kBadGroupType;
  }
  node.limit = frame.limit;
  frame.node = node;
  frame.wide = hasChildren64(node.header);
  frame.counts = counts_.size();
  queue(What::nodeBegin, node.offset(), node.headerLength());
  position_ = start;
  frames_.push_back(frame);
}

bool Walker::extraBehind(const Node& node, uint64_t base, uint64_t limit)
{
  const Frame& top = frames_.back();
  bool without = false;
  bool with = false;
  if (hasEyeSize(node.header))
  {
    without = prober_->pairAt(base, limit).has_value();
    with = prober_->pairAt(base + 2, limit).has_value();
  }
  if (without == with)
  {
    const Belief here = prober_->judge(base, top.wide, limit);
    const Belief behind = base + 2 == limit ? Belief::followed : prober_->judge(base + 2, top.wide, limit);
    without = here > behind;
    with = behind > here;
  }
  if (without == with && node.is64() && hasEyeSize(node.header))
  {
    // Neither eye catcher is whole: what follows the pair shows where it is.
    const auto follows = [&](uint64_t at) {
      return at == limit || prober_->judge(at, top.wide, limit) >= Belief::named;
    };
    without = follows(base + kEyeSizeLength);
    with = follows(base + kEyeSizeLength + 2);
  }
  if (without == with)
  {
    without = prober_->isChain(base, top.wide, limit);
    with = prober_->isChain(base + 2, top.wide, limit);
  }
  if (without == with)
  {
    return form_.extra;
  }
  (with ? withExtra_ : withoutExtra_) += 1;
  return with;
}

void Walker::takeData(Node& node)
{
  const uint64_t limit = frames_.back().limit;
  const uint64_t start = node.payloadOffset();
  const uint64_t end = start + node.size();
  const uint64_t padded = std::min(limit, addSaturated(start, prober_->paddedSize(node.header)));
  node.limit = end;
  if (node.type() == TAV_TYPE_UTF8_STRING && limit - padded >= 2 && extraBehind(node, padded, limit))
  {
    node.flags |= kExtra;
  }
  const uint64_t extra = node.has(kExtra) ? 2 : 0;
  queue(What::nodeBegin, node.offset(), node.headerLength());
  if (node.size() != 0)
  {
    queue(What::payload, start, node.size());
  }
  if (extra != 0)
  {
    queue(What::extra, end, extra);
  }
  if (padded != end)
  {
    queue(What::padding, end + extra, padded - end);
  }
  position_ = padded + extra;
  if (node.is64() && hasEyeSize(node.header))
  {
    takePair(node, limit);
  }
  queue(What::nodeEnd, position_, 0);
  if (isEndElement(node.elm()))
  {
    afterEndElement(node);
  }
}

void Walker::takePair(Node& node, uint64_t limit)
{
  const uint64_t behind = position_ + kEyeSizeLength;
  if (prober_->pairAt(position_, limit))
  {
    queue(What::pair, position_, kEyeSizeLength);
    position_ = behind;
    return;
  }
  const bool wide = frames_.back().wide;
  const bool room = limit - position_ >= kEyeSizeLength;
  const bool nodeBehind = room && (behind == limit || prober_->judge(behind, wide, limit) >= Belief::named);
  if (nodeBehind && prober_->judge(position_, wide, limit) < Belief::named)
  {
    node.flags |= kBadPair;
    queue(What::pair, position_, kEyeSizeLength);
    position_ = behind;
    return;
  }
  node.flags |= kNoPair;
}

void Walker::afterEndElement(const Node& node)
{
  if (frames_.size() == 1)
  {
    return;
  }
  Frame& top = frames_.back();
  const bool marker = node.elm() == TAV_ELM_CMN_END_HDR_MARKER;
  const bool itsOwn = !marker && prober_->pairEnds(node.payloadOffset(), top.limit, top.node.header);
  // Behind damaged bytes an end element can be that of a group whose header was among them.
  const bool doubtful = !itsOwn && !marker && top.lastDamage != 0;
  leans_ = leans_ || (!itsOwn && !marker && !doubtful && frames_.size() <= inherited_);
  // Nodes up to the very end of the group are in it, although readers stop before them.
  const bool more = top.open || position_ == top.limit || prober_->isChain(position_, top.wide, top.limit, true);
  if (top.open ? !doubtful : itsOwn && !more)
  {
    if (!top.open)
    {
      top.node.flags |= kWrongSize;
    }
    endPending_ = true;
  }
}

void Walker::endByLimit()
{
  const Frame& top = frames_.back();
  if (!top.open)
  {
    endGroup(End::closed);
    return;
  }
  endGroup(top.limit == source_.size() ? End::byFile : End::byParent);
}

void Walker::endGroup(End end)
{
  queue(What::nodeEnd, position_, 0);
  shared_.end = end;
  shared_.node = frames_.back().node;
  shared_.depth = shared_.node.depth;
  counts_.resize(frames_.back().counts);
  frames_.pop_back();
  inherited_ = std::min(inherited_, frames_.size());
}

uint64_t Walker::countChild(uint16_t elm)
{
  Frame& top = frames_.back();
  const uint64_t bit = uint64_t{1} << (elm % 64);
  const size_t first = (top.counted & bit) != 0 ? top.counts : counts_.size();
  for (size_t i = first; i < counts_.size(); ++i)
  {
    if (counts_[i].elm == elm)
    {
      return ++counts_[i].count;
    }
  }
  if (counts_.size() - top.counts == kMostCounts)
  {
    return 0;
  }
  top.counted |= bit;
  counts_.push_back({elm, 1});
  return 1;
}

std::string Walker::path(const Event& event, PathStyle style) const
{
  std::string text;
  appendPath(text, event, style);
  return text;
}

void Walker::appendPath(std::string& out, const Event& event, PathStyle style) const
{
  const uint64_t groups = std::min<uint64_t>(event.depth, frames_.size() - 1);
  const uint64_t steps = groups + (event.node.header.hdrType != 0 ? 1 : 0);
  appendSteps(out, steps, style, [&](std::string& to, uint64_t i) {
    appendStep(to, i < groups ? frames_[static_cast<size_t>(i) + 1].node : event.node, source_.dictionary());
  });
  out += steps == 0 ? "/" : "";
}

} // namespace tav::inspect
