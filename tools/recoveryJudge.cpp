// How much speaks for a node: the judgement that a recovery goes by.
#include <algorithm>
#include <cstring>

#include "tools/recovery.h"

namespace tav::tool
{

using namespace tav::layout;

namespace
{

constexpr uint64_t kInfoBits = TAV_INFO_EYE_SIZE | TAV_INFO_ALIGNED8;

} // namespace

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

/// Whether a group ends at a place, or one begins whose header is lost. What nothing confirms ends a group only where
/// nodes go on behind it: its size may be the damaged part.
bool Recovery::isBoundary(uint64_t offset)
{
  for (size_t i = frames_.size(); i-- > 0 && frames_[i].limit <= offset;)
  {
    if (frames_[i].limit == offset && (frames_[i].sure || goesOn(offset, frames_[i - 1].wide)))
    {
      return true;
    }
  }
  const Ending* const ending = nextEnding();
  return ending != nullptr && ending->start == offset;
}

/// Whether a node stands at a place, in a group with these headers or behind its end.
bool Recovery::goesOn(uint64_t offset, bool wide)
{
  const uint64_t limit = sureLimit();
  return judge(offset, wide, limit) >= Belief::named ||
         (!wide && canHold(true) && prober_.judge(offset, true, limit) == Belief::followed);
}

/// As Prober::judge, but an element that nobody knows counts where a node follows; and what claims more than there is,
/// as all around the place where a file was cut, counts by what is in it.
Belief Recovery::judge(uint64_t offset, bool wide, uint64_t limit)
{
  constexpr int kMost = 16;
  Belief belief = prober_.judge(offset, wide, limit);
  TAVHeader header{};
  if (belief == Belief::typed && prober_.header(offset, wide, limit, header) && prober_.isFollowed(header, limit))
  {
    return Belief::named;
  }
  for (int i = 0; i < kMost && belief == Belief::none; ++i)
  {
    if (!prober_.header(offset, wide, limit, header) || !Prober::isNamed(elmOf(header)))
    {
      return Belief::none;
    }
    if (!isGroup(header))
    {
      const bool cut = i != 0 && limit == source_.size() && prober_.judgeHeader(header, kNoOffset) == Belief::named;
      return cut ? Belief::named : Belief::none;
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
  else if (!found.open || (named && (isCutAt(start, wide) || (header.nodeOffset == 0 && !isOdd(header)))))
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

/// What speaks for a place as the one where a node ends.
Belief Recovery::beliefBehind(uint64_t end, bool wide, uint64_t limit)
{
  if (isBoundary(end))
  {
    return Belief::followed;
  }
  return goesOn(end, wide) ? std::max(Belief::named, judge(end, wide, limit)) : Belief::none;
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
      const Belief belief = end > limit ? Belief::none : beliefBehind(end, wide, limit);
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

/// Whether a size can be no other for the type: a damaged header hardly has one.
bool Recovery::isExact(const TAVHeader& header)
{
  switch (typeOf(header))
  {
  case TAV_TYPE_ASCII_STRING:
  case TAV_TYPE_BINARY:
  case TAV_TYPE_UTF8_STRING:
  case TAV_TYPE_UINT64_ARRAY:
    return false;
  default:
    return !isGroup(header);
  }
}

/// Whether several nodes follow one another, or few up to the end of a group.
bool Recovery::isRun(uint64_t offset, bool wide)
{
  constexpr int kEnough = 5; ///< three nodes that are followed, or two of which the size of one can be no other
  for (int weight = 0; weight < kEnough;)
  {
    Ending ending;
    if (weight != 0 && (isBoundary(offset) || readEnding(source_, form_, offset, wide, sureLimit(), ending) ||
                        (!wide && canHold(true) && prober_.judge(offset, true, sureLimit()) == Belief::followed)))
    {
      return true;
    }
    const Candidate node = look(offset, wide);
    const bool exact = node.trust != Trust::none && isExact(node.header());
    if ((node.trust < Trust::followed && !exact) || !Prober::isNamed(elmOf(node.header())))
    {
      return false;
    }
    weight += node.trust == Trust::paired ? kEnough : exact ? 3
                                                            : 2;
    offset = node.isGroup() ? offset + headerLength(node.header().hdrType) : node.end;
    wide = node.isGroup() ? hasChildren64(node.header()) : wide;
  }
  return true;
}

/// Whether a header is such as no writer makes of a group.
bool Recovery::isOdd(const TAVHeader& group)
{
  return is64(group) ? (infoOf(group) & ~kInfoBits) != 0 : typeOf(group) != TAV_TYPE_HEADER32;
}

/// Whether a group's header is such as no writer makes, or its claim such as few groups have.
bool Recovery::isStrange(const Candidate& found)
{
  return found.isGroup() && ((found.open && !isSizeUnknown(found.header())) || isOdd(found.header()));
}

/// Whether a group claims more than there is from its place on, and from the start of the file just what there is: a
/// root whose sector went elsewhere.
bool Recovery::isMovedRoot(const Candidate& found)
{
  const TAVHeader& header = found.header();
  return found.isGroup() && found.open && !isOdd(header) && found.trust >= Trust::followed &&
         addSaturated(headerLength(header.hdrType), sizeOf(header)) == source_.size();
}

bool Recovery::isSure(const uint8_t* bytes, uint64_t offset, bool wide)
{
  Candidate found;
  if (tryAt(bytes, offset, wide, found) && (found.trust >= Trust::followed || isExact(found.header())) &&
      (!isStrange(found) || (isMovedRoot(found) && isRun(offset, wide))))
  {
    return true;
  }
  return form_.root64 && tryAt(bytes, offset, !wide, found) && found.trust >= Trust::followed &&
         (isStrange(found) ? isMovedRoot(found) : !found.isGroup() || !wide || isConfirmed(found)) &&
         isRun(offset, !wide);
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
  std::array<uint8_t, 4096 + kHeaderSize64> window{};
  const uint64_t length = kHeaderSize32;
  uint64_t at = known ? sureAt_ : from;
  bool done = false;
  while (at < to && !done)
  {
    const size_t got = source_.read(at, window);
    std::fill(window.begin() + static_cast<ptrdiff_t>(got), window.end(), uint8_t{0});
    const uint64_t tests = std::min<uint64_t>({4096, to - at, got < length ? 0 : got - length + 1});
    if (tests == 0)
    {
      at = to;
      break;
    }
    uint64_t i = 0;
    while (i < tests && !isSure(window.data() + i, at + i, wide))
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

/// Where a data element ends that no reader takes, for its type or for a size that its type does not have. Type 0 is
/// what bytes of zeros have.
bool Recovery::endOfStranger(const TAVHeader& header, uint64_t limit, uint64_t& end)
{
  if (prober_.judgeHeader(header, limit) != Belief::fits || typeOf(header) == 0 || isGroup(header) ||
      isEndElement(elmOf(header)))
  {
    return false;
  }
  end = addSaturated(header.nodeOffset + headerLength(header.hdrType), prober_.paddedSize(header));
  uint64_t distance = 0;
  if (hasEyeSize(header) && (!prober_.pairAt(end, limit, distance) || distance != dataDistance(sizeOf(header))))
  {
    return false;
  }
  end += hasEyeSize(header) ? kEyeSizeLength : 0;
  return end <= limit;
}

/// Whether all but a node's own header speaks for it: nodes go on behind it, perhaps behind others like it, and none
/// begins in its bytes, as in a group whose type is damaged.
bool Recovery::isStranger(const TAVHeader& header, uint64_t& end)
{
  constexpr int kMost = 16;
  const uint64_t limit = std::min(sureLimit(), frames_.back().limit);
  const bool wide = is64(header);
  if (!endOfStranger(header, limit, end))
  {
    return false;
  }
  uint64_t at = end;
  TAVHeader next{};
  for (int i = 0; i < kMost && at != limit && !isBoundary(at) && !goesOn(at, wide); ++i)
  {
    if (!prober_.header(at, wide, limit, next))
    {
      return false;
    }
    if (prober_.judgeHeader(next, limit) >= Belief::typed)
    {
      return prober_.isChain(at, wide, limit) && firstSure(header.nodeOffset + 1, end, wide) == end;
    }
    if (!endOfStranger(next, limit, at))
    {
      return false;
    }
  }
  return firstSure(header.nodeOffset + 1, end, wide) == end;
}

/// Whether nodes follow one another from a place exactly to another one, into groups that end behind it.
bool Recovery::leadsTo(uint64_t from, bool wide, uint64_t end)
{
  constexpr int kMost = 64;
  for (int i = 0; i < kMost && from < end; ++i)
  {
    Candidate node = look(from, wide);
    if (node.trust == Trust::none && canHold(!wide))
    {
      node = look(from, !wide);
      node.trust = node.trust == Trust::alone ? Trust::none : node.trust;
    }
    if (node.trust == Trust::none || node.end <= from)
    {
      return false;
    }
    const bool into = node.isGroup() && node.end > end;
    from = into ? from + headerLength(node.header().hdrType) : node.end;
    wide = into ? hasChildren64(node.header()) : is64(node.header());
  }
  return from == end;
}

/// Whether several nodes follow one another from a place in a few bytes on.
bool Recovery::holdsRun(uint64_t from, uint64_t to)
{
  std::array<uint8_t, 64> window{};
  for (uint64_t at = from; at < to; ++at)
  {
    source_.read(at, std::span(window).first(kHeaderSize64));
    for (const bool wide : {true, false})
    {
      Candidate found;
      if ((!wide || form_.root64) && tryAt(window.data(), at, wide, found) && found.trust >= Trust::followed &&
          (isStrange(found) ? isMovedRoot(found) : !found.isGroup() || wide || isConfirmed(found)) && isRun(at, wide))
      {
        return true;
      }
    }
  }
  return false;
}

/// Whether something speaks for the size that a group claims.
bool Recovery::isConfirmed(const Candidate& group)
{
  return group.trust == Trust::paired || isSizeUnknown(group.header()) || group.end == sureLimit() ||
         isBoundary(group.end) || goesOn(group.end, is64(group.header()));
}

/// Whether nodes may stand in a payload: bytes may be anything, a stream, too. Text holds none; where a pair is
/// announced it has to stand behind the payload.
bool Recovery::mayHoldNodes(const Candidate& found)
{
  const uint16_t type = typeOf(found.header());
  return (type == TAV_TYPE_BINARY || type == TAV_TYPE_UINT64_ARRAY) && !found.pairMissing && found.pairBytes == 0;
}

/// Whether nodes inside of what a node claims follow one another exactly to its end, or to that of its payload where
/// the announced pair is damaged.
bool Recovery::isContradicted(const Candidate& found)
{
  const TAVHeader& header = found.header();
  if (found.isGroup() || (isExact(header) && found.pairBytes == 0) || mayHoldNodes(found))
  {
    return false;
  }
  const uint64_t start = header.nodeOffset + headerLength(header.hdrType);
  const uint64_t sure = firstSure(start, found.end, is64(header));
  return sure < start + sizeOf(header) &&
         (leadsTo(sure, is64(header), found.end) ||
          (found.pairBytes != 0 && leadsTo(sure, is64(header), found.end - found.pairBytes)));
}

/// Whether a node stands where it seems to. On the way from node to node its header is trusted; behind damage, all its
/// bytes are searched for something surer.
bool Recovery::believe(Candidate& found, bool onWay)
{
  const TAVHeader& header = found.header();
  const bool named = Prober::isNamed(elmOf(header));
  const uint64_t start = header.nodeOffset + headerLength(header.hdrType);
  if (found.trust >= Trust::followed)
  {
    return found.trust == Trust::paired ? named || !found.isGroup() || !holdsRun(header.nodeOffset + 1, start)
                                        : !isContradicted(found);
  }
  if (onWay && !damaged_ && named && isExact(header))
  {
    return !holdsRun(header.nodeOffset + 1, found.end);
  }
  // Its size can be damaged: then nodes stand inside of what it claims, and go on beyond.
  const uint64_t end = found.isGroup() ? start : found.end;
  const uint64_t from = onWay && named && !found.isGroup() ? start : header.nodeOffset + 1;
  const uint64_t sure = firstSure(from, end, is64(header));
  if (sure < end && !found.isGroup() && sure >= start + sizeOf(header))
  {
    found.end = sure; // its padding is not there
    return true;
  }
  return sure >= end || (!found.isGroup() && mayHoldNodes(found) && leadsTo(sure, is64(header), end));
}

} // namespace tav::tool
