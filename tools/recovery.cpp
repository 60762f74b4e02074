#include "tools/recovery.h"

#include <algorithm>

#include "tools/report.h"

namespace tav::tool
{

using namespace tav::layout;

namespace
{

constexpr uint64_t kMostNested = 4000; ///< groups that the library follows

TAVHeader madeHeader(bool wideHeader, bool wideChildren, bool eye)
{
  TAVHeader header{};
  const uint16_t type = wideChildren ? TAV_TYPE_HEADER64 : TAV_TYPE_HEADER32;
  header.hdrType = wideHeader ? TAV_HDR_64 : TAV_HDR_32;
  if (wideHeader)
  {
    header.hdr64 = {0, eye ? TAV_INFO_EYE_SIZE : 0, type, TAV_ELM_CMN_DOC_ROOT};
  }
  else
  {
    header.hdr32 = {0, type, TAV_ELM_CMN_DOC_ROOT};
  }
  return header;
}

} // namespace

Recovery::Recovery(ByteSource& source, const Form& form, Rebuilder& rebuilder, uint64_t search, Sinks sinks)
    : source_(source), form_(form), rebuilder_(rebuilder), prober_(source, form, kNoOffset), sinks_(std::move(sinks)),
      search_(search)
{
  Frame file;
  file.limit = source.size();
  file.wide = form.root64;
  file.sure = true;
  frames_.push_back(file);
}

bool Recovery::step()
{
  closeFinished();
  if (position_ >= source_.size())
  {
    while (frames_.size() > 1)
    {
      closeGroup();
    }
    return false;
  }
  if (enterEnding() || takeEnding())
  {
    return true;
  }
  Candidate found = look(position_, frames_.back().wide);
  // What no reader knows cannot come back; a group whose type is damaged looks like that, too, and has nodes inside.
  const bool known = isKnown(found.header()) && !isEndElement(elmOf(found.header()));
  if (known && found.trust != Trust::none && believe(found, true))
  {
    take(found);
    return true;
  }
  if (!endByZeros() && !loseStranger(found.header()))
  {
    gap();
  }
  return true;
}

void Recovery::index(uint64_t from)
{
  if (!indexed_)
  {
    indexed_ = true;
    endings_ = findEndings(source_, form_, from);
  }
}

Ending* Recovery::nextEnding()
{
  while (ending_ < endings_.size() && endings_[ending_].start < position_)
  {
    ++ending_;
  }
  return ending_ < endings_.size() ? &endings_[ending_] : nullptr;
}

void Recovery::closeFinished()
{
  while (frames_.size() > 1 && frames_.back().limit <= position_)
  {
    wouldReadAsOpen() ? keepOpen() : closeGroup();
  }
}

/// Whether the innermost group, if it were closed now, would read as one that was never closed: a root of size 0 that
/// something follows.
bool Recovery::wouldReadAsOpen() const
{
  const Frame& top = frames_.back();
  return frames_.size() == 2 && !top.hidden && top.wide == form_.root64 && position_ < source_.size() &&
         rebuilder_.isEmpty();
}

/// Lets the innermost group take what comes behind it, up to the end of the file.
void Recovery::keepOpen()
{
  Frame& top = frames_.back();
  totals_.closed += top.open ? 0 : 1;
  top.limit = source_.size();
  top.open = true;
  top.sure = false;
  top.sureAt = 0;
}

RecoveryTotals Recovery::totals() const
{
  RecoveryTotals totals = totals_;
  totals.ends = rebuilder_.endElements();
  return totals;
}

/// A root that seemed to end too soon was right where nothing of it came back from behind its end.
void Recovery::settleClaim()
{
  Frame& top = frames_.back();
  totals_.closed += top.claim != 0 && keptTo_ > top.claim && !top.hidden ? 1 : 0;
  top.claim = 0;
}

void Recovery::closeGroup()
{
  settleClaim();
  if (!frames_.back().hidden)
  {
    rebuilder_.close();
  }
  frames_.pop_back();
}

void Recovery::openGroup(const Frame& frame, const TAVHeader& header)
{
  Frame inner = frame;
  inner.sureAt = frame.sure ? frames_.size() : frames_.back().sureAt;
  inner.heldAt = frame.wide || frame.sure || frame.fixed ? frames_.size() : frames_.back().heldAt;
  frames_.push_back(inner);
  if (rebuilder_.depth() >= kMostNested && hasChildren64(header) == rebuilder_.wideChildren())
  {
    frames_.back().hidden = true;
    return;
  }
  rebuilder_.open(header);
}

/// Puts a group of its own around what has lost its own.
void Recovery::makeParent(bool wide)
{
  const Frame around = frames_.back();
  Frame frame;
  frame.start = position_;
  frame.limit = around.limit;
  frame.wide = wide;
  frame.open = true;
  openGroup(frame, madeHeader(rebuilder_.wideChildren(), wide, false));
  ++totals_.made;
}

/// Whether nodes with this header can stand here. Below a group of 32-bit headers there are no 64-bit ones.
bool Recovery::canHold(bool wide) const
{
  return !wide || frames_[frames_.back().heldAt].wide;
}

/// Sees to it that the innermost group takes nodes with this header.
void Recovery::fit(bool wide, bool isRoot)
{
  while (wide && !frames_.back().wide)
  {
    totals_.closed += frames_.back().hidden ? 0 : 1;
    closeGroup();
  }
  if (frames_.back().wide != wide || (frames_.size() == 1 && (!isRoot || damaged_)))
  {
    makeParent(wide);
  }
}

/// An end element: it closes the group that it leads back to, and all that are still open inside of it.
bool Recovery::takeEnd(uint64_t offset, bool wide)
{
  Ending ending;
  if (!readEnding(source_, form_, offset, wide, sureLimit(), ending))
  {
    return false;
  }
  const auto behind = std::upper_bound(frames_.begin() + 1, frames_.end(), ending.start,
                                       [](uint64_t start, const Frame& frame) { return start < frame.start; });
  const auto at = static_cast<size_t>(behind - frames_.begin()) - 1;
  if (at == 0 || frames_[at].start != ending.start)
  {
    lose(ending.end, "an end element whose group is lost");
    return true;
  }
  if (frames_[at].hidden)
  {
    loseNested(ending.end);
  }
  else
  {
    totals_.kept += ending.end - offset;
    position_ = ending.end;
  }
  damaged_ = false;
  while (frames_.size() > at)
  {
    Frame& top = frames_.back();
    if (wouldReadAsOpen()) // of a root that asks for no end element none is kept
    {
      keepOpen();
      break;
    }
    const bool right = top.claim != 0 ? top.claim == ending.end : !top.open && top.limit == ending.end;
    totals_.closed += !top.hidden && !right ? 1 : 0;
    top.claim = 0;
    closeGroup();
  }
  return true;
}

bool Recovery::takeEnding()
{
  const Frame& top = frames_.back();
  if (takeEnd(position_, top.wide))
  {
    return true;
  }
  TAVHeader header{};
  if (frames_.size() == 1 || !prober_.header(position_, top.wide, sureLimit(), header) ||
      !isEndElement(elmOf(header)) || !(typeOf(header) == TAV_TYPE_BINARY || sizeOf(header) == 0) ||
      sizeOf(header) > kEyeSizeLength)
  {
    return false;
  }
  // One whose pair is damaged, or a mark without one. It can end an open group only; it is made anew if it has to be.
  const uint64_t length = headerLength(header.hdrType);
  const uint64_t end = std::min(source_.size(), position_ + length + sizeOf(header));
  const uint64_t pair = firstSure(position_ + length, end, top.wide) - position_ - length;
  const std::string before = reasonOfEnd(position_, top.wide);
  if (top.hidden)
  {
    loseNested(position_ + length);
  }
  else
  {
    totals_.kept += length;
    totals_.pairs += 1;
    position_ += length;
  }
  if (pair != 0)
  {
    lose(position_ + pair, before.empty() ? "a damaged pair of an end element" : before);
  }
  if (top.open && wouldReadAsOpen())
  {
    keepOpen();
  }
  else if (top.open)
  {
    totals_.closed += top.hidden ? 0 : 1;
    closeGroup();
  }
  damaged_ = false;
  return true;
}

/// Where an end element says that a group begins whose header is damaged.
bool Recovery::enterEnding()
{
  const Ending* const next = nextEnding();
  if (next == nullptr || next->start != position_)
  {
    return false;
  }
  const Ending ending = *next;
  ++ending_;
  if (ending.end > sureLimit() || !canHold(true))
  {
    return false;
  }
  TAVHeader header{};
  const bool whole = prober_.header(position_, true, source_.size(), header) && isGroup(header) &&
                     Prober::isNamed(elmOf(header)) && hasChildren64(header) == ending.wide && hasEyeSize(header);
  // What was open before and ends inside of it has a wrong size.
  for (size_t i = frames_.size(); i-- > 1 && frames_[i].limit < ending.end;)
  {
    frames_[i].limit = ending.end;
  }
  fit(true, true);
  Frame frame;
  frame.start = position_;
  frame.limit = ending.end;
  frame.wide = ending.wide;
  frame.sure = true;
  openGroup(frame, whole ? header : madeHeader(true, ending.wide, true));
  damaged_ = !whole;
  if (whole)
  {
    totals_.closed += frames_.back().hidden ? 0 : 1;
    keepHeader(header);
  }
  else
  {
    totals_.made += frames_.back().hidden ? 0 : 1;
    // Its first bytes are searched, too: the distance can be the damaged part.
    gap();
  }
  return true;
}

/// A damaged pair is not where a node begins.
void Recovery::trimPair(Candidate& found)
{
  index(position_);
  const uint64_t start = found.end - found.pairBytes;
  const Ending* const ending = nextEnding();
  if ((ending != nullptr && ending->start > position_ && ending->start < found.end) ||
      firstSure(start, found.end, is64(found.header())) < found.end)
  {
    found.end = start;
    found.pairBytes = 0;
    found.pairMissing = true;
  }
}

/// A node that goes on beyond a size that nothing confirms contradicts it.
void Recovery::contradict(uint64_t end)
{
  const bool beyond = frames_.back().limit < end;
  for (size_t i = 1; beyond && i < frames_.size(); ++i)
  {
    if (frames_[i].limit < end)
    {
      totals_.closed += frames_[i].open || frames_[i].hidden ? 0 : 1;
      frames_[i].limit = frames_[i - 1].limit;
      frames_[i].open = true;
    }
  }
}

void Recovery::take(Candidate found)
{
  if (found.pairBytes != 0)
  {
    trimPair(found);
  }
  fit(is64(found.header()), found.isGroup());
  contradict(found.isGroup() ? position_ + headerLength(found.header().hdrType) : found.end);
  last_ = found.header();
  lastTold_ = false;
  if (damaged_)
  {
    doubt(last_);
  }
  if (found.isGroup())
  {
    takeGroup(found);
    damaged_ = false;
    keptTo_ = position_;
    return;
  }
  ++totals_.nodes;
  damaged_ = false;
  keptTo_ = found.end - found.pairBytes;
  rebuilder_.add(found.data);
  totals_.kept += found.end - found.pairBytes - position_;
  totals_.pairs += found.pairBytes != 0 || found.pairMissing ? 1 : 0;
  position_ = found.end - found.pairBytes;
  if (found.pairBytes != 0)
  {
    lose(found.end, "a damaged pair");
    damaged_ = false;
  }
}

void Recovery::takeGroup(const Candidate& found)
{
  const TAVHeader& header = found.header();
  if (hasEyeSize(header) && found.trust != Trust::paired && !indexed_)
  {
    index(position_);
    if (enterEnding()) // its size is damaged; its end element knows
    {
      return;
    }
  }
  Frame frame;
  frame.start = position_;
  frame.wide = hasChildren64(header);
  frame.sure = found.trust == Trust::paired;
  frame.fixed = frames_.size() == 1 && !damaged_;
  const uint64_t around = frames_.back().limit;
  const bool repaired = found.open || found.end > around;
  frame.claim = !repaired && frames_.size() == 1 && !frame.sure && endsTooSoon(found.end) ? found.end : 0;
  frame.open = repaired || frame.claim != 0;
  frame.limit = frame.open ? around : found.end;
  if (frame.sure && found.end > around)
  {
    for (size_t i = frames_.size(); i-- > 1 && frames_[i].limit < found.end;)
    {
      frames_[i].limit = found.end;
    }
    frame.limit = found.end;
    frame.open = false;
  }
  if (rebuilder_.depth() >= kMostNested && frame.wide != rebuilder_.wideChildren())
  {
    loseNested(frame.limit); // the group around cannot hold its nodes
    return;
  }
  openGroup(frame, header);
  totals_.closed += repaired && !frames_.back().hidden ? 1 : 0;
  keepHeader(header);
}

/// Accounts for the header of the group that was opened last.
void Recovery::keepHeader(const TAVHeader& header)
{
  const uint64_t length = headerLength(header.hdrType);
  if (frames_.back().hidden)
  {
    loseNested(position_ + length);
    return;
  }
  ++totals_.nodes;
  totals_.kept += length;
  position_ += length;
}

/// Of a group that is too deep, nothing is written but the nodes in it.
void Recovery::loseNested(uint64_t to)
{
  lose(to, "of a group nested more than " + std::to_string(kMostNested) +
               " deep; nodes in it go to the group around it");
  damaged_ = false;
}

/// Whether more than zeros stands where a root ends by its size, and no other root begins.
bool Recovery::endsTooSoon(uint64_t end)
{
  bool gaveUp = false;
  return end < source_.size() && !goesOn(end, form_.root64) && !prober_.zerosToEnd(end, gaveUp);
}

bool Recovery::mayEndInZeros() const
{
  const Frame& top = frames_.back();
  return top.limit == source_.size() && (top.open || frames_.size() == 1);
}

bool Recovery::endByZeros()
{
  bool gaveUp = false;
  if (!mayEndInZeros() || !prober_.zerosToEnd(position_, gaveUp))
  {
    return false;
  }
  totals_.zeros = source_.size() - position_;
  totals_.kept += totals_.zeros;
  position_ = source_.size();
  return true;
}

void Recovery::lose(uint64_t to, std::string reason)
{
  if (!lastTold_ && keptTo_ == position_)
  {
    doubt(last_);
  }
  totals_.lost += to - position_;
  ++totals_.losses;
  if (sinks_.loss)
  {
    sinks_.loss({position_, to - position_, std::move(reason)});
  }
  position_ = to;
  damaged_ = true;
}

} // namespace tav::tool
