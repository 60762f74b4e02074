#include "inspect/recover/judge.h"

#include <algorithm>
#include <array>
#include <optional>
#include <span>

#include "inspect/recover/endings.h"

namespace tav::inspect
{

using namespace tav::layout;

namespace
{

constexpr uint64_t kInfoBits = TAV_INFO_EYE_SIZE | TAV_INFO_ALIGNED8;

} // namespace

bool Judge::isKnown(const TAVHeader& header)
{
  return isGroup(header) || typeInfo(typeOf(header)).known;
}

bool Judge::isExact(const TAVHeader& header)
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

/// Whether a header is such as no writer makes of a group.
bool Judge::isOdd(const TAVHeader& group)
{
  return is64(group) ? (infoOf(group) & ~kInfoBits) != 0 : typeOf(group) != TAV_TYPE_HEADER32;
}

bool Judge::isStrange(const Candidate& found)
{
  return found.isGroup() && ((found.open && !isSizeUnknown(found.header())) || isOdd(found.header()));
}

bool Judge::mayHoldNodes(const Candidate& found)
{
  const uint16_t type = typeOf(found.header());
  return (type == TAV_TYPE_BINARY || type == TAV_TYPE_UINT64_ARRAY) && !found.pairMissing && found.pairBytes == 0;
}

/// Whether a group claims more than there is from its place on, and from the start of the file just what there is: a
/// root whose sector went elsewhere.
bool Judge::isMovedRoot(const Candidate& found) const
{
  const TAVHeader& header = found.header();
  return found.isGroup() && found.open && !isOdd(header) && found.trust >= Trust::followed &&
         addSaturated(headerLength(header.hdrType), sizeOf(header)) == source_.size();
}

bool Judge::isBoundary(uint64_t offset) const
{
  for (size_t i = place_.depth(); i-- > 0 && place_.group(i).limit <= offset;)
  {
    const OpenGroup& group = place_.group(i);
    if (group.limit == offset && (group.sure || goesOn(offset, place_.group(i - 1).wide)))
    {
      return true;
    }
  }
  const Ending* const lost = place_.lostGroup();
  return lost != nullptr && lost->start == offset;
}

bool Judge::goesOn(uint64_t offset, bool wide) const
{
  const uint64_t limit = place_.sureLimit();
  return beliefAt(offset, wide, limit) >= Belief::named || isOfOtherWidth(offset, wide, limit);
}

/// Whether a node has the wider header here, where the group may hold such.
bool Judge::isOfOtherWidth(uint64_t offset, bool wide, uint64_t limit) const
{
  return !wide && place_.canHold(true) && prober_.judge(offset, true, limit) == Belief::followed;
}

Belief Judge::beliefAt(uint64_t offset, bool wide, uint64_t limit) const
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

bool Judge::isPlausible(uint64_t offset, bool wide, uint64_t limit) const
{
  return beliefAt(offset, wide, limit) >= Belief::named;
}

bool Judge::tryAt(const uint8_t* bytes, uint64_t offset, bool wide, Candidate& found) const
{
  if (!prober_.isNamedHeader(bytes, wide))
  {
    return false;
  }
  found = look(offset, wide);
  return found.trust != Trust::none;
}

Candidate Judge::look(uint64_t offset, bool wide) const
{
  Candidate found;
  const uint64_t limit = place_.sureLimit();
  TAVHeader& header = found.data.header;
  if (!prober_.header(offset, wide, limit, header) || (typeOf(header) == 0 && sizeOf(header) == 0))
  {
    return found;
  }
  isGroup(header) ? lookAtGroup(found, limit) : lookAtData(found, limit);
  return found;
}

void Judge::lookAtGroup(Candidate& found, uint64_t limit) const
{
  const TAVHeader& header = found.header();
  const uint64_t start = header.nodeOffset + headerLength(header.hdrType);
  const bool wide = hasChildren64(header);
  const bool named = Prober::isNamed(elmOf(header));
  found.end = isSizeUnknown(header) ? kNoOffset : addSaturated(start, sizeOf(header));
  const bool child = isPlausible(start, wide, limit);
  found.open = found.end > limit ||
               (sizeOf(header) == 0 && (hasEyeSize(header) || place_.inFile() || place_.top().open) && child);
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
  else if (!found.open || (named && (isCutAt(start, wide) || isMovedHeader(header))))
  {
    found.trust = Trust::alone;
  }
}

/// Whether a header is such as a writer makes of a group of this file: it may have been moved away from what it holds.
bool Judge::isMovedHeader(const TAVHeader& group) const
{
  return !isOdd(group) && (group.nodeOffset == 0 || sizeOf(group) < source_.size());
}

/// Whether the file may have been cut in the node at a place: its header is cut, or claims more than there is.
bool Judge::isCutAt(uint64_t offset, bool wide) const
{
  TAVHeader header{};
  return !prober_.header(offset, wide, source_.size(), header) || (isKnown(header) && Prober::isNamed(elmOf(header)));
}

bool Judge::lookForPair(Candidate& found, uint64_t base, uint64_t limit) const
{
  const bool utf8 = typeOf(found.header()) == TAV_TYPE_UTF8_STRING;
  for (uint64_t extra = 0; extra <= (utf8 ? 2U : 0U); extra += 2)
  {
    const uint64_t at = base + extra;
    const std::optional<uint64_t> distance = prober_.pairAt(at, limit);
    if (!distance)
    {
      continue;
    }
    EyeSizeBytes bytes{};
    source_.read(at, bytes);
    const bool other = decodeEyeSize(bytes, form_.swapped).eye != TAV_EYE_CATCHER;
    const bool right = *distance == dataDistance(sizeOf(found.header()));
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
bool Judge::isBetter(uint64_t with, uint64_t without, bool wide, uint64_t limit) const
{
  limit = std::max(with, std::min(limit, place_.top().limit));
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
Belief Judge::beliefBehind(uint64_t end, bool wide, uint64_t limit) const
{
  if (isBoundary(end))
  {
    return Belief::followed;
  }
  const Belief belief = beliefAt(end, wide, limit);
  return belief >= Belief::named ? belief : isOfOtherWidth(end, wide, limit) ? Belief::named
                                                                             : Belief::none;
}

void Judge::lookAtData(Candidate& found, uint64_t limit) const
{
  const TAVHeader& header = found.header();
  const uint64_t start = header.nodeOffset + headerLength(header.hdrType);
  if (sizeOf(header) > limit - start || prober_.judgeHeader(header, limit) < Belief::typed)
  {
    return;
  }
  const bool pair = is64(header) && hasEyeSize(header);
  const uint64_t base = std::min(limit, addSaturated(start, prober_.paddedSize(header)));
  if (pair && lookForPair(found, base, limit))
  {
    return;
  }
  lookBehind(found, base, limit);
  if (found.trust == Trust::none)
  {
    // Nothing says what the bytes behind it are: a damaged pair is found to be lost when they are searched.
    found.end = base;
    found.pairMissing = pair;
    found.trust = Trust::alone;
  }
}

/// Where the next node is shows whether the two bytes behind a string and the damaged pair are there.
void Judge::lookBehind(Candidate& found, uint64_t base, uint64_t limit) const
{
  const TAVHeader& header = found.header();
  const bool wide = is64(header);
  const uint64_t pair = wide && hasEyeSize(header) ? kEyeSizeLength : 0;
  const bool utf8 = typeOf(header) == TAV_TYPE_UTF8_STRING;
  Belief best = Belief::typed;
  const std::array pairs{pair, uint64_t{0}};
  for (const uint64_t with : std::span(pairs).first(pair != 0 ? 2 : 1))
  {
    for (uint64_t extra = 0; extra <= (utf8 ? 2U : 0U); extra += 2)
    {
      const uint64_t end = addSaturated(base, extra + with);
      const Belief belief = end > limit ? Belief::none : beliefBehind(end, wide, limit);
      if (belief > best || (extra != 0 && found.pairBytes == with && belief == best &&
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
}

bool Judge::isRun(uint64_t offset, bool wide) const
{
  constexpr int kEnough = 5; ///< three nodes that are followed, or two of which the size of one can be no other
  const uint64_t limit = place_.sureLimit();
  for (int weight = 0; weight < kEnough;)
  {
    Ending ending;
    if (weight != 0 && (isBoundary(offset) || readEnding(source_, form_, offset, wide, limit, ending) ||
                        isOfOtherWidth(offset, wide, limit)))
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

bool Judge::isSure(const uint8_t* bytes, uint64_t offset, bool wide) const
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

/// Whether a 32-bit header without anything that speaks for it is the second half of a 64-bit one, which a node follows
/// and which begins at `from` or later.
bool Judge::isTail(const Candidate& found, uint64_t from) const
{
  const TAVHeader& header = found.header();
  constexpr uint64_t half = kHeaderSize64 - kHeaderSize32;
  TAVHeader whole{};
  return form_.root64 && !is64(header) && found.trust == Trust::alone &&
         header.nodeOffset >= addSaturated(from, half) &&
         prober_.header(header.nodeOffset - half, true, place_.sureLimit(), whole) && sizeOf(whole) != 0 &&
         prober_.judge(header.nodeOffset - half, true, place_.sureLimit()) == Belief::followed;
}

bool Judge::isWorthTaking(const Candidate& found, uint64_t from, uint64_t to) const
{
  const TAVHeader& header = found.header();
  const bool strange = found.isGroup() &&
                       (found.trust == Trust::alone
                            ? isStrange(found) || found.open || (!is64(header) && sizeOf(header) == 0)
                            : isStrange(found) && found.open && isOdd(header));
  return !strange && !isTail(found, from) && !isDamagedEnd(found, to);
}

bool Judge::isDamagedEnd(const Candidate& found, uint64_t limit) const
{
  Ending ending;
  const TAVHeader& header = found.header();
  return isEndElement(elmOf(header)) && !readEnding(source_, form_, header.nodeOffset, is64(header), limit, ending);
}

bool Judge::endOfStranger(const TAVHeader& header, uint64_t limit, uint64_t& end) const
{
  if (prober_.judgeHeader(header, limit) != Belief::fits || typeOf(header) == 0 || isGroup(header) ||
      isEndElement(elmOf(header)))
  {
    return false;
  }
  end = addSaturated(header.nodeOffset + headerLength(header.hdrType), prober_.paddedSize(header));
  if (hasEyeSize(header) && prober_.pairAt(end, limit) != dataDistance(sizeOf(header)))
  {
    return false;
  }
  end += hasEyeSize(header) ? kEyeSizeLength : 0;
  return end <= limit;
}

bool Judge::leadsTo(uint64_t from, bool wide, uint64_t end) const
{
  constexpr int kMost = 64;
  for (int i = 0; i < kMost && from < end; ++i)
  {
    Candidate node = look(from, wide);
    if (node.trust == Trust::none && place_.canHold(!wide))
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

bool Judge::holdsRun(uint64_t from, uint64_t to) const
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

bool Judge::isConfirmed(const Candidate& group) const
{
  return group.trust == Trust::paired || isSizeUnknown(group.header()) || group.end == place_.sureLimit() ||
         isBoundary(group.end) || goesOn(group.end, is64(group.header()));
}

} // namespace tav::inspect
