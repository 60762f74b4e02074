// Behind damage: where the next node is, and what is said of the bytes before it.
#include <algorithm>
#include <cstring>

#include "tools/form.h"
#include "tools/recovery.h"
#include "tools/report.h"

namespace tav::tool
{

using namespace tav::layout;

/// Whether it is an end element that leads nowhere.
bool Recovery::isDamagedEnd(const Candidate& found, uint64_t limit)
{
  Ending ending;
  const TAVHeader& header = found.header();
  return isEndElement(elmOf(header)) && !readEnding(source_, form_, header.nodeOffset, is64(header), limit, ending);
}

/// Whether a 32-bit header without anything that speaks for it is the second half of a 64-bit one, which a node follows
/// and which begins at `from` or later.
bool Recovery::isTail(const Candidate& found, uint64_t from)
{
  const TAVHeader& header = found.header();
  constexpr uint64_t half = kHeaderSize64 - kHeaderSize32;
  TAVHeader whole{};
  return form_.root64 && !is64(header) && found.trust == Trust::alone &&
         header.nodeOffset >= addSaturated(from, half) &&
         prober_.header(header.nodeOffset - half, true, sureLimit(), whole) && sizeOf(whole) != 0 &&
         prober_.judge(header.nodeOffset - half, true, sureLimit()) == Belief::followed;
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
        const bool strange = found.isGroup() &&
                             (found.trust == Trust::alone
                                  ? isStrange(found) || found.open || (!own && sizeOf(found.header()) == 0)
                                  : isStrange(found) && found.open && isOdd(found.header()));
        if (!strange && !isTail(found, from) && !isDamagedEnd(found, to) && believe(found, false))
        {
          return true;
        }
      }
      if (form_.root64 && tryAt(window.data() + i, offset, !own, found) &&
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

/// Whether most of a payload, as far as one page goes, is eye catchers: a damaged size covers nodes with pairs.
bool Recovery::isMostlyEyes(const TAVHeader& data)
{
  std::vector<uint8_t> bytes(static_cast<size_t>(std::min<uint64_t>(sizeOf(data), ByteSource::kPage)));
  bytes.resize(source_.read(data.nodeOffset + headerLength(data.hdrType), bytes));
  uint64_t covered = 0;
  for (size_t i = 0; i + kEyeLength <= bytes.size();)
  {
    uint64_t word = 0;
    std::memcpy(&word, bytes.data() + i, sizeof word);
    const bool eye = word == TAV_EYE_CATCHER || word == kor::byteswap64(TAV_EYE_CATCHER);
    covered += eye ? kEyeLength : 0;
    i += eye ? kEyeLength : 1;
  }
  return covered * 2 > bytes.size();
}

/// Tells of a node beside lost bytes when its element or its payload says that it may be none.
void Recovery::doubt(const TAVHeader& node)
{
  const bool eyes = !isGroup(node) && isMostlyEyes(node);
  lastTold_ = true;
  if (Prober::isNamed(elmOf(node)) && !eyes)
  {
    return;
  }
  ++totals_.doubts;
  if (sinks_.doubt)
  {
    sinks_.doubt({node.nodeOffset, headerLength(node.hdrType) + (isGroup(node) ? 0 : sizeOf(node)),
                  eyes ? "stands beside lost bytes, and most of its payload is eye catchers"
                       : "stands beside lost bytes, and its element is not in the dictionary"});
  }
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

} // namespace tav::tool
