#include "tools/recovery.h"

#include <algorithm>
#include <cstring>

#include "tools/report.h"

namespace tav::tool
{

using namespace tav::layout;

namespace
{

constexpr uint64_t kMostNested = 4000; ///< groups that the library follows
constexpr uint64_t kInfoBits = TAV_INFO_EYE_SIZE | TAV_INFO_ALIGNED8;

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

bool isKnown(const TAVHeader& header)
{
  return isGroup(header) || typeInfo(typeOf(header)).known;
}

} // namespace

Recovery::Recovery(ByteSource& source, const Form& form, Rebuilder& rebuilder, uint64_t search, Sink sink)
    : source_(source), form_(form), rebuilder_(rebuilder), prober_(source, form, kNoOffset), sink_(std::move(sink)),
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
  if (!endByZeros())
  {
    gap();
  }
  return true;
}

// Judging ------------------------------------------------------------------------------------------------------------

uint64_t Recovery::sureLimit() const
{
  return frames_[frames_.back().sureAt].limit;
}

bool Recovery::isBoundary(uint64_t offset)
{
  for (size_t i = frames_.size(); i-- > 0 && frames_[i].limit <= offset;)
  {
    if (frames_[i].limit == offset)
    {
      return true;
    }
  }
  const Ending* const ending = nextEnding();
  return ending != nullptr && ending->start == offset;
}

/// As Prober::judge; a group that claims more than there is, as all around the place where a file was cut, counts by
/// what is in it.
Belief Recovery::judge(uint64_t offset, bool wide, uint64_t limit)
{
  constexpr int kMost = 16;
  Belief belief = prober_.judge(offset, wide, limit);
  for (int i = 0; i < kMost && belief == Belief::none; ++i)
  {
    TAVHeader header{};
    if (!prober_.header(offset, wide, limit, header) || !isGroup(header) || !Prober::isNamed(elmOf(header)))
    {
      return Belief::none;
    }
    offset += headerLength(header.hdrType);
    wide = hasChildren64(header);
    belief = offset == limit ? Belief::named : std::min(prober_.judge(offset, wide, limit), Belief::named);
  }
  return belief;
}

bool Recovery::isPlausible(uint64_t offset, bool wide, uint64_t limit)
{
  return judge(offset, wide, limit) >= Belief::named;
}

Recovery::Candidate Recovery::look(uint64_t offset, bool wide)
{
  Candidate found;
  const uint64_t limit = sureLimit();
  TAVHeader& header = found.data.header;
  if (!prober_.header(offset, wide, limit, header) || (typeOf(header) == 0 && sizeOf(header) == 0))
  {
    return found;
  }
  isGroup(header) ? lookAtGroup(found, limit) : lookAtData(found, limit);
  return found;
}

void Recovery::lookAtGroup(Candidate& found, uint64_t limit)
{
  const TAVHeader& header = found.header();
  const uint64_t start = header.nodeOffset + headerLength(header.hdrType);
  const bool wide = hasChildren64(header);
  const bool named = Prober::isNamed(elmOf(header));
  found.end = isSizeUnknown(header) ? kNoOffset : addSaturated(start, sizeOf(header));
  const bool child = isPlausible(start, wide, limit);
  found.open = found.end > limit ||
               (sizeOf(header) == 0 && (hasEyeSize(header) || frames_.size() == 1 || frames_.back().open) && child);
  Ending ending;
  const uint64_t length = endElementLength(wide);
  if (hasEyeSize(header) && !found.open && found.end - start >= length &&
      readEnding(source_, form_, found.end - length, wide, limit, ending) && ending.start == header.nodeOffset)
  {
    found.trust = Trust::paired;
  }
  else if (child || (sizeOf(header) == 0 && (isBoundary(start) || isPlausible(start, is64(header), limit))))
  {
    found.trust = named ? Trust::followed : Trust::alone;
  }
  else if (!found.open || (named && isCutAt(start, wide)))
  {
    found.trust = Trust::alone;
  }
}

/// Whether the file may have been cut in the node at a place: its header is cut, or claims more than there is.
bool Recovery::isCutAt(uint64_t offset, bool wide)
{
  TAVHeader header{};
  return !prober_.header(offset, wide, source_.size(), header) || (isKnown(header) && Prober::isNamed(elmOf(header)));
}

bool Recovery::lookForPair(Candidate& found, uint64_t base, uint64_t limit)
{
  const bool utf8 = typeOf(found.header()) == TAV_TYPE_UTF8_STRING;
  for (uint64_t extra = 0; extra <= (utf8 ? 2U : 0U); extra += 2)
  {
    uint64_t distance = 0;
    const uint64_t at = base + extra;
    if (!prober_.pairAt(at, limit, distance))
    {
      continue;
    }
    EyeSizeBytes bytes{};
    source_.read(at, bytes);
    const bool other = decodeEyeSize(bytes, form_.swapped).eye != TAV_EYE_CATCHER;
    const bool right = distance == dataDistance(sizeOf(found.header()));
    found.data.extra = extra != 0;
    found.data.otherOrder = other && (extra != 0 || typeOf(found.header()) == TAV_TYPE_ASCII_STRING);
    found.end = at + kEyeSizeLength;
    found.trust = right ? Trust::paired : Trust::followed;
    found.pairBytes = right ? 0 : kEyeSizeLength;
    return true;
  }
  return false;
}

/// Of two places that are as good at the first look, the one that nodes follow from farther on; else the one that other
/// strings speak for.
bool Recovery::isBetter(uint64_t with, uint64_t without, bool wide, uint64_t limit)
{
  limit = std::max(with, std::min(limit, frames_.back().limit));
  const bool chainWith = isBoundary(with) || prober_.isChain(with, wide, limit);
  const bool chainWithout = isBoundary(without) || prober_.isChain(without, wide, limit);
  return chainWith == chainWithout ? form_.extra : chainWith;
}

void Recovery::lookAtData(Candidate& found, uint64_t limit)
{
  const TAVHeader& header = found.header();
  const uint64_t start = header.nodeOffset + headerLength(header.hdrType);
  const bool wide = is64(header);
  if (sizeOf(header) > limit - start || prober_.judgeHeader(header, limit) < Belief::typed)
  {
    return;
  }
  const uint64_t base = std::min(limit, addSaturated(start, prober_.paddedSize(header)));
  const uint64_t pair = wide && hasEyeSize(header) ? kEyeSizeLength : 0;
  if (pair != 0 && lookForPair(found, base, limit))
  {
    return;
  }
  // Where the next node stands tells whether the two bytes behind a string and the damaged pair are there.
  const bool utf8 = typeOf(header) == TAV_TYPE_UTF8_STRING;
  Belief best = Belief::typed;
  for (const uint64_t with : {pair, uint64_t{0}})
  {
    for (uint64_t extra = 0; extra <= (utf8 ? 2U : 0U); extra += 2)
    {
      const uint64_t end = addSaturated(base, extra + with);
      const Belief belief = end > limit ? Belief::none : isBoundary(end) ? Belief::followed
                                                                         : judge(end, wide, limit);
      if (belief > best || (extra != 0 && found.pairBytes == with && belief == best && best != Belief::typed &&
                            isBetter(end, found.end, wide, limit)))
      {
        best = belief;
        found.end = end;
        found.data.extra = extra != 0;
        found.pairBytes = with;
        found.pairMissing = with != pair;
        found.trust = Trust::followed;
      }
    }
  }
  if (found.trust == Trust::none)
  {
    // Nothing tells what the bytes behind it are: a damaged pair is found to be lost when they are searched.
    found.end = base;
    found.pairMissing = pair != 0;
    found.trust = Trust::alone;
  }
}

bool Recovery::isRun(uint64_t offset, bool wide)
{
  constexpr int kEnough = 3;
  for (int i = 0; i < kEnough; ++i)
  {
    if (i != 0 && isBoundary(offset))
    {
      return true;
    }
    Ending ending;
    if (i != 0 && readEnding(source_, form_, offset, wide, sureLimit(), ending))
    {
      return true;
    }
    const Candidate node = look(offset, wide);
    if (node.trust < Trust::followed || !Prober::isNamed(elmOf(node.header())))
    {
      return false;
    }
    if (node.trust == Trust::paired)
    {
      return true;
    }
    offset = node.isGroup() ? offset + headerLength(node.header().hdrType) : node.end;
    wide = node.isGroup() ? hasChildren64(node.header()) : wide;
  }
  return true;
}

/// The first node between two places that is followed or paired; `to` when there is none.
uint64_t Recovery::firstSure(uint64_t from, uint64_t to, bool wide)
{
  if (from >= sureFrom_ && from <= sureAt_ && sureAt_ <= to)
  {
    return sureAt_;
  }
  if (from >= sureFrom_ && to <= sureAt_)
  {
    return to;
  }
  Candidate found;
  std::array<uint8_t, 4096 + kHeaderSize64> window{};
  const uint64_t length = wide ? kHeaderSize64 : kHeaderSize32;
  uint64_t at = from;
  for (bool done = false; at < to && !done;)
  {
    const size_t got = source_.read(at, window);
    const uint64_t tests = std::min<uint64_t>({4096, to - at, got < length ? 0 : got - length + 1});
    if (tests == 0)
    {
      at = to;
      break;
    }
    uint64_t i = 0;
    while (i < tests && !(tryAt(window.data() + i, at + i, wide, found) && found.trust >= Trust::followed))
    {
      ++i;
    }
    at += i;
    done = i < tests;
  }
  sureFrom_ = from;
  sureAt_ = at;
  return at;
}

bool Recovery::leadsTo(uint64_t from, bool wide, uint64_t end)
{
  constexpr int kMost = 64;
  for (int i = 0; i < kMost && from < end; ++i)
  {
    const Candidate node = look(from, wide);
    if (node.trust == Trust::none || node.end <= from)
    {
      return false;
    }
    from = node.end;
  }
  return from == end;
}

/// Whether a node stands where it seems to. On the way from node to node its header is trusted; behind damage, all its
/// bytes are searched for something surer.
bool Recovery::believe(Candidate& found, bool onWay)
{
  const TAVHeader& header = found.header();
  if (found.trust >= Trust::followed || (onWay && (found.isGroup() || typeInfo(typeOf(header)).valueSize != 0)))
  {
    return true;
  }
  // Its size can be damaged: then nodes stand inside of what it claims, and go on beyond.
  const uint64_t start = header.nodeOffset + headerLength(header.hdrType);
  const uint64_t end = found.isGroup() ? start : found.end;
  const uint64_t sure = firstSure(onWay ? start : header.nodeOffset + 1, end, is64(header));
  if (sure < end && !found.isGroup() && sure >= start + sizeOf(header))
  {
    found.end = sure; // its padding is not there
    return true;
  }
  return sure >= end || leadsTo(sure, is64(header), end);
}

// Going on -----------------------------------------------------------------------------------------------------------

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
    closeGroup();
  }
}

void Recovery::closeGroup()
{
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
    closeGroup();
    ++totals_.closed;
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
  totals_.kept += ending.end - offset;
  position_ = ending.end;
  damaged_ = false;
  while (frames_.size() > at)
  {
    const Frame& top = frames_.back();
    totals_.closed += top.open || top.limit != ending.end ? 1 : 0;
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
  const uint64_t pair = end - position_ - length;
  totals_.kept += length;
  totals_.pairs += 1;
  position_ += length;
  if (pair != 0)
  {
    lose(position_ + pair, "a damaged pair of an end element");
  }
  if (top.open)
  {
    closeGroup();
    ++totals_.closed;
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
    ++totals_.closed;
    ++totals_.nodes;
    totals_.kept += kHeaderSize64;
    position_ += kHeaderSize64;
  }
  else
  {
    ++totals_.made;
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

void Recovery::take(Candidate found)
{
  if (found.pairBytes != 0)
  {
    trimPair(found);
  }
  fit(is64(found.header()), found.isGroup());
  ++totals_.nodes;
  if (found.isGroup())
  {
    takeGroup(found);
    damaged_ = false;
    return;
  }
  damaged_ = false;
  // A node that goes on beyond a size that nothing confirms contradicts it.
  const bool beyond = frames_.back().limit < found.end;
  for (size_t i = 1; beyond && i < frames_.size(); ++i)
  {
    if (frames_[i].limit < found.end)
    {
      totals_.closed += frames_[i].open ? 0 : 1;
      frames_[i].limit = frames_[i - 1].limit;
      frames_[i].open = true;
    }
  }
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
      --totals_.nodes;
      return;
    }
  }
  Frame frame;
  frame.start = position_;
  frame.wide = hasChildren64(header);
  frame.sure = found.trust == Trust::paired;
  frame.fixed = frames_.size() == 1 && !damaged_;
  const uint64_t around = frames_.back().limit;
  frame.open = found.open || found.end > around;
  frame.limit = frame.open ? around : found.end;
  totals_.closed += frame.open ? 1 : 0;
  if (frame.sure && found.end > around)
  {
    for (size_t i = frames_.size(); i-- > 1 && frames_[i].limit < found.end;)
    {
      frames_[i].limit = found.end;
    }
    frame.limit = found.end;
    frame.open = false;
  }
  openGroup(frame, header);
  const uint64_t length = headerLength(header.hdrType);
  totals_.kept += length;
  position_ += length;
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
  totals_.lost += to - position_;
  ++totals_.losses;
  sink_({position_, to - position_, std::move(reason)});
  position_ = to;
  damaged_ = true;
}

// Gaps ---------------------------------------------------------------------------------------------------------------

bool Recovery::tryAt(const uint8_t* bytes, uint64_t offset, bool wide, Candidate& found)
{
  uint16_t type = 0;
  uint16_t elm = 0;
  std::memcpy(&type, bytes + (wide ? 12 : 4), sizeof type);
  std::memcpy(&elm, bytes + (wide ? 14 : 6), sizeof elm);
  type = form_.swapped ? kor::byteswap16(type) : type;
  elm = form_.swapped ? kor::byteswap16(elm) : elm;
  if ((!isGroupType(type) && !typeInfo(type).known) || !Prober::isNamed(elm))
  {
    return false;
  }
  found = look(offset, wide);
  return found.trust != Trust::none;
}

/// Whether it is an end element that leads nowhere.
bool Recovery::isDamagedEnd(const Candidate& found, uint64_t limit)
{
  Ending ending;
  const TAVHeader& header = found.header();
  return isEndElement(elmOf(header)) && !readEnding(source_, form_, header.nodeOffset, is64(header), limit, ending);
}

/// The first place from `from` on where a node can begin; false when there is none before `to`.
bool Recovery::findNext(uint64_t from, uint64_t to, Candidate& found)
{
  constexpr uint64_t kWindow = 16 * 1024;
  std::vector<uint8_t> window(kWindow + kHeaderSize64);
  const bool own = frames_.back().wide;
  for (uint64_t at = from; at < to;)
  {
    std::fill(window.begin(), window.end(), uint8_t{0});
    source_.read(at, window);
    const uint64_t tests = std::min(kWindow, to - at);
    for (uint64_t i = 0; i < tests; ++i)
    {
      const uint64_t offset = at + i;
      if (tryAt(window.data() + i, offset, own, found))
      {
        const bool strange = found.isGroup() && found.trust == Trust::alone &&
                             (found.open || (is64(found.header()) ? (infoOf(found.header()) & ~kInfoBits) != 0
                                                                  : sizeOf(found.header()) == 0));
        if (!strange && !isDamagedEnd(found, to) && believe(found, false))
        {
          return true;
        }
      }
      if (canHold(!own) && form_.root64 && tryAt(window.data() + i, offset, !own, found) &&
          found.trust >= Trust::followed && !isDamagedEnd(found, to) && isRun(offset, !own))
      {
        return true;
      }
    }
    at += tests;
    spent_ += tests;
    if (spent_ > search_)
    {
      return false;
    }
  }
  return false;
}

void Recovery::gap()
{
  index(position_);
  if (enterEnding())
  {
    return;
  }
  const Ending* const next = nextEnding();
  const uint64_t limit = frames_.back().limit;
  const uint64_t sure = sureLimit();
  uint64_t to = std::min(sure, frames_.back().sure || frames_.back().open ? limit : sure);
  const bool byEnding = next != nullptr && next->start > position_ && next->start < to && next->end <= sure;
  to = byEnding ? next->start : to;
  Candidate found;
  const uint64_t from = position_;
  if (!findNext(from, to, found))
  {
    if (spent_ > search_)
    {
      totals_.unread = source_.size() - position_;
      position_ = source_.size();
      return;
    }
    if (to == source_.size() && mayEndInZeros())
    {
      to = std::max(from, prober_.zerosStart(from));
    }
    lose(std::max(to, from + (to == from && !byEnding ? 1 : 0)), "no node is whole");
    return;
  }
  const uint64_t place = found.header().nodeOffset;
  if (place > from)
  {
    lose(place, "no node is whole");
  }
  closeFinished();
  if (!takeEnd(place, is64(found.header())))
  {
    take(found);
  }
}

} // namespace tav::tool
