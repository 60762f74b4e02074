// How much speaks for a node: the judgement that a recovery goes by.
#include <algorithm>
#include <cstring>

#include "tools/recovery.h"

namespace tav::tool
{

using namespace tav::layout;

bool Recovery::isKnown(const TAVHeader& header)
{
  return isGroup(header) || typeInfo(typeOf(header)).known;
}

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
    const bool cut = limit == source_.size() && limit - offset < (wide ? kHeaderSize64 : kHeaderSize32);
    belief = cut ? Belief::named : std::min(prober_.judge(offset, wide, limit), Belief::named);
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
  if (chainWith != chainWithout)
  {
    return chainWith;
  }
  const auto exact = [&](uint64_t offset) {
    TAVHeader header{};
    return prober_.header(offset, wide, limit, header) && typeInfo(typeOf(header)).valueSize != 0;
  };
  return exact(with) != exact(without) ? exact(with) : form_.extra;
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
  // What was searched once is not searched again: claims may overlap as they like.
  const bool known = wide == sureWide_ && from >= sureFrom_ && from <= sureAt_;
  if (known && (sureFound_ || to <= sureAt_))
  {
    return std::min(to, sureAt_);
  }
  Candidate found;
  std::array<uint8_t, 4096 + kHeaderSize64> window{};
  const uint64_t length = wide ? kHeaderSize64 : kHeaderSize32;
  uint64_t at = known ? sureAt_ : from;
  bool done = false;
  while (at < to && !done)
  {
    const size_t got = source_.read(at, window);
    const uint64_t tests = std::min<uint64_t>({4096, to - at, got < length ? 0 : got - length + 1});
    if (tests == 0)
    {
      at = to;
      break;
    }
    uint64_t i = 0;
    while (i < tests && !(tryAt(window.data() + i, at + i, wide, found) && found.trust >= Trust::followed) &&
           !(!wide && form_.root64 && tryAt(window.data() + i, at + i, true, found) && found.trust == Trust::paired))
    {
      ++i;
    }
    at += i;
    done = i < tests;
  }
  sureFrom_ = known ? sureFrom_ : from;
  sureAt_ = at;
  sureWide_ = wide;
  sureFound_ = done;
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
  if (found.trust >= Trust::followed || (onWay && found.isGroup()))
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

} // namespace tav::tool
