// Behind damage: where the next node is, and what is said of the bytes before it.
#include <algorithm>

#include "inspect/recover/recovery.h"
#include "tav/inspect/form.hpp"
#include "tav/inspect/phrases.hpp"

namespace tav::inspect
{

using namespace tav::layout;

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
  constexpr uint64_t kWindow = uint64_t{16} * 1024;
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
                             (isStrange(found) || found.open || (!own && sizeOf(found.header()) == 0));
        if (!strange && !isDamagedEnd(found, to) && believe(found, false))
        {
          return true;
        }
      }
      if (canHold(!own) && form_.root64 && tryAt(window.data() + i, offset, !own, found) &&
          found.trust >= Trust::followed && !isDamagedEnd(found, to) && isRun(offset, !own) && believe(found, false))
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

/// A node that no reader takes but that is no damage goes alone: what follows it can have a name that nobody knows, and
/// no search finds that.
bool Recovery::loseStranger(const TAVHeader& header)
{
  uint64_t end = 0;
  if (damaged_ || !isStranger(header, end))
  {
    return false;
  }
  lose(end, isKnown(header) ? "a node of a size that its type does not have" : "a node of an unknown type");
  damaged_ = false;
  return true;
}

/// What is to be said of an end element that leads to a place before the file; nothing of other bytes.
std::string Recovery::reasonOfEnd(uint64_t offset, bool wide)
{
  TAVHeader header{};
  uint64_t distance = 0;
  const uint64_t eye = offset + (wide ? kHeaderSize64 : kHeaderSize32);
  if (!prober_.header(offset, wide, source_.size(), header) || !isEndElement(elmOf(header)) ||
      sizeOf(header) != kEyeSizeLength || !prober_.pairAt(eye, source_.size(), distance))
  {
    return {};
  }
  const uint64_t back = addSaturated(distance, wide ? 0 : 8); // that of a group of 32-bit children is 8 short
  return back <= eye ? std::string()
                     : "an end element whose group began " + counted(back - eye, "byte") +
                           " before the file: what is left of the group has lost its header";
}

/// Why bytes are lost in which no node is whole.
std::string Recovery::reasonAt(uint64_t offset)
{
  if (const auto other = otherStreamAt(source_, form_, offset))
  {
    return "no node is whole; " + otherStreamText(*other);
  }
  for (const bool wide : {true, false})
  {
    if (const std::string reason = reasonOfEnd(offset, wide); !reason.empty())
    {
      return reason;
    }
  }
  return "no node is whole";
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
    lose(std::max(to, from + (to == from && !byEnding ? 1 : 0)), reasonAt(from));
    return;
  }
  const uint64_t place = found.header().nodeOffset;
  if (place > from)
  {
    lose(place, reasonAt(from));
  }
  closeFinished();
  if (!takeEnd(place, is64(found.header())))
  {
    take(found);
  }
}

} // namespace tav::inspect
