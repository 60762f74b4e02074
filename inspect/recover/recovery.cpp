#include "inspect/recover/recovery.h"

#include <algorithm>
#include <utility>

#include "inspect/recover/endings.h"

namespace tav::inspect
{

using namespace tav::layout;

Recovery::Recovery(ByteSource& source, const Form& form, Rebuilder& rebuilder, uint64_t search, Sinks sinks,
                   unsigned threads)
    : source_(source), form_(form), threads_(threads), rebuilder_(rebuilder), prober_(source, form, kNoOffset),
      place_(form, source.size()), judge_(source, form, place_), search_(source, form, place_, judge_, search),
      ledger_(source, place_, std::move(sinks)), nesting_(form, place_, rebuilder, ledger_)
{
}

bool Recovery::step()
{
  nesting_.closeFinished();
  if (position() >= source_.size())
  {
    nesting_.closeAll();
    return false;
  }
  if (enterLost() || takeEnding())
  {
    return true;
  }
  Candidate found = judge_.look(position(), place_.top().wide);
  // What no reader knows cannot come back; a group whose type is damaged looks like that, too, and has nodes inside.
  const bool known = Judge::isKnown(found.header()) && !isEndElement(elmOf(found.header()));
  if (known && found.trust != Trust::none && search_.believe(found, footing()))
  {
    take(found);
    return true;
  }
  if (!endByZeros() && !passZeros() && !loseStranger(found.header()))
  {
    gap();
  }
  return true;
}

RecoveryTotals Recovery::totals() const
{
  RecoveryTotals totals = ledger_.totals();
  totals.ends = rebuilder_.endElements();
  return totals;
}

void Recovery::index(uint64_t from)
{
  if (!indexed_)
  {
    indexed_ = true;
    place_.expect(findEndings(source_, form_, from, threads_));
  }
}

/// An end element: it closes the group that it leads back to, and all that are still open inside of it.
bool Recovery::takeEnd(uint64_t offset, bool wide)
{
  Ending ending;
  if (!readEnding(source_, form_, offset, wide, place_.sureLimit(), ending))
  {
    return false;
  }
  const size_t at = place_.groupAt(ending.start);
  if (at == 0)
  {
    ledger_.lose(ending.end, "an end element whose group is lost");
    return true;
  }
  if (place_.group(at).hidden)
  {
    loseNested(ending.end);
  }
  else
  {
    ledger_.keep(ending.end);
  }
  ledger_.setDamaged(false);
  nesting_.closeTo(at, ending.end);
  return true;
}

bool Recovery::takeEnding()
{
  return takeEnd(position(), place_.top().wide) || takeDamagedEnd();
}

/// An end element whose pair is damaged, or a mark without one. It can end an open group only, and is made anew if it
/// has to be.
bool Recovery::takeDamagedEnd()
{
  const OpenGroup& top = place_.top();
  TAVHeader header{};
  if (place_.inFile() || !prober_.header(position(), top.wide, place_.sureLimit(), header) ||
      !isEndElement(elmOf(header)) || !(typeOf(header) == TAV_TYPE_BINARY || sizeOf(header) == 0) ||
      sizeOf(header) > kEyeSizeLength)
  {
    return false;
  }
  const uint64_t start = position() + headerLength(header.hdrType);
  const uint64_t end = std::min(source_.size(), start + sizeOf(header));
  const uint64_t behind = search_.firstSure(start, end, top.wide);
  const std::string before = reasonOfEnd(source_, form_, position(), top.wide);
  if (top.hidden)
  {
    loseNested(start);
  }
  else
  {
    ledger_.keep(start);
    ++ledger_.totals().pairs;
  }
  if (behind != start)
  {
    ledger_.lose(behind, before.empty() ? "a damaged pair of an end element" : before);
  }
  if (top.open)
  {
    nesting_.closeOpen();
  }
  ledger_.setDamaged(false);
  return true;
}

/// Enters the group that begins here by what its end element says, and searches its first bytes where its header is
/// damaged; false when there is none.
bool Recovery::enterLost()
{
  const Entered entered = enterEnding();
  if (entered == Entered::headless)
  {
    gap();
  }
  return entered != Entered::none;
}

/// Where an end element says that a group begins whose header is damaged.
Recovery::Entered Recovery::enterEnding()
{
  const Ending* const next = place_.lostGroup();
  if (next == nullptr || next->start != position())
  {
    return Entered::none;
  }
  const Ending ending = *next;
  place_.passLostGroup();
  if (ending.end > place_.sureLimit() || !place_.canHold(true))
  {
    return Entered::none;
  }
  TAVHeader header{};
  const bool whole = prober_.header(position(), true, source_.size(), header) && isGroup(header) &&
                     Prober::isNamed(elmOf(header)) && hasChildren64(header) == ending.wide && hasEyeSize(header);
  place_.stretch(ending.end); // what was open before and ends inside of it has a wrong size
  nesting_.fit(true, true);
  nesting_.open({.start = position(), .limit = ending.end, .wide = ending.wide, .sure = true, .counted = !whole},
                whole ? header : madeHeader(true, ending.wide, true));
  ledger_.setDamaged(!whole);
  if (!whole)
  {
    ledger_.totals().made += place_.top().hidden ? 0 : 1;
    return Entered::headless;
  }
  nesting_.countClosed();
  keepHeader(header);
  return Entered::whole;
}

/// A damaged pair is not where a node begins.
void Recovery::trimPair(Candidate& found)
{
  index(position());
  const uint64_t start = found.end - found.pairBytes;
  const Ending* const lost = place_.lostGroup();
  if ((lost != nullptr && lost->start > position() && lost->start < found.end) ||
      search_.firstSure(start, found.end, is64(found.header())) < found.end)
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
  const TAVHeader& header = found.header();
  nesting_.fit(is64(header), found.isGroup());
  // A node that goes on beyond a size that nothing confirms contradicts it.
  ledger_.totals().closed +=
      place_.contradict(found.isGroup() ? position() + headerLength(header.hdrType) : found.end);
  ledger_.comesBack(header);
  if (found.isGroup())
  {
    takeGroup(found);
    ledger_.setDamaged(false);
    ledger_.cameBackTo(position());
    return;
  }
  const uint64_t end = found.end - found.pairBytes;
  ++ledger_.totals().nodes;
  ledger_.cameBackTo(end);
  rebuilder_.add(found.data);
  ledger_.keep(end);
  ledger_.totals().pairs += found.pairBytes != 0 || found.pairMissing ? 1 : 0;
  if (found.pairBytes != 0)
  {
    ledger_.lose(found.end, "a damaged pair");
  }
  ledger_.setDamaged(false);
}

void Recovery::takeGroup(const Candidate& found)
{
  const TAVHeader& header = found.header();
  if (hasEyeSize(header) && found.trust != Trust::paired && !indexed_)
  {
    index(position());
    if (enterLost()) // its size is damaged; its end element knows
    {
      return;
    }
  }
  OpenGroup group{.start = position(), .wide = hasChildren64(header), .sure = found.trust == Trust::paired};
  group.fixed = place_.inFile() && !ledger_.isDamaged();
  const uint64_t around = place_.top().limit;
  const bool repaired = found.open || found.end > around;
  group.claim = !repaired && place_.inFile() && !group.sure && endsTooSoon(header, found.end) ? found.end : 0;
  group.open = repaired || group.claim != 0;
  group.limit = group.open ? around : found.end;
  if (group.sure && found.end > around)
  {
    place_.stretch(found.end);
    group.limit = found.end;
    group.open = false;
  }
  if (nesting_.isTooDeep(group.wide))
  {
    loseNested(group.limit); // the group around cannot hold its nodes
    return;
  }
  nesting_.open(group, header);
  if (repaired)
  {
    nesting_.countClosed();
  }
  keepHeader(header);
}

/// Accounts for the header of the group that was opened last.
void Recovery::keepHeader(const TAVHeader& header)
{
  const uint64_t end = position() + headerLength(header.hdrType);
  if (place_.top().hidden)
  {
    loseNested(end);
    return;
  }
  ++ledger_.totals().nodes;
  ledger_.keep(end);
}

/// Of a group that is too deep, nothing is written but the nodes in it.
void Recovery::loseNested(uint64_t to)
{
  ledger_.lose(to, "of a group nested more than " + std::to_string(kMostNested) +
                       " deep; nodes in it go to the group around it");
  ledger_.setDamaged(false);
}

/// A node that no reader takes but that is no damage goes alone: what follows it can have a name that nobody knows, and
/// no search finds that.
bool Recovery::loseStranger(const TAVHeader& header)
{
  uint64_t end = 0;
  if (ledger_.isDamaged() || !search_.isStranger(header, end))
  {
    return false;
  }
  ledger_.lose(end, Judge::isKnown(header) ? "a node of a size that its type does not have"
                                           : "a node of an unknown type");
  ledger_.setDamaged(false);
  return true;
}

/// Whether there is more than zeros where a root ends by its size, and no other root begins, and what is in it does not
/// end there.
bool Recovery::endsTooSoon(const TAVHeader& root, uint64_t end)
{
  bool gaveUp = false;
  const uint64_t start = position() + headerLength(root.hdrType);
  return end < source_.size() && !judge_.goesOn(end, form_.root64) && !prober_.zerosToEnd(end, gaveUp) &&
         (start == end || !prober_.isWholeChain(start, hasChildren64(root), end));
}

bool Recovery::mayEndInZeros() const
{
  const OpenGroup& top = place_.top();
  return top.limit == source_.size() && (top.open || place_.inFile());
}

bool Recovery::endByZeros()
{
  bool gaveUp = false;
  if (!mayEndInZeros() || !prober_.zerosToEnd(position(), gaveUp))
  {
    return false;
  }
  ledger_.keepZeros(source_.size());
  return true;
}

/// Zeros between a root and the next one, where a page was not full.
bool Recovery::passZeros()
{
  const bool isBetween = place_.inFile() && !ledger_.isDamaged() && position() != 0;
  const uint64_t end = isBetween ? prober_.behindZeros(position()) : position();
  if (end == position() || !prober_.rootBegins(end))
  {
    return false;
  }
  ledger_.keepZeros(end);
  return true;
}

/// Passes over damaged bytes, and takes what begins behind them.
void Recovery::gap()
{
  index(position());
  Entered entered = Entered::headless;
  while (entered == Entered::headless) // any number of end elements may lead here
  {
    entered = enterEnding();
  }
  if (entered == Entered::whole)
  {
    return;
  }
  const uint64_t from = position();
  const uint64_t to = endOfGap();
  Candidate found;
  if (!search_.findNext(from, to, found))
  {
    search_.gaveUp() ? ledger_.leaveUnread() : loseGap(to);
    return;
  }
  const uint64_t place = found.header().nodeOffset;
  if (place > from)
  {
    const bool canHideRoot = from == 0 || !place_.inFile() || ledger_.isDamaged() ||
                             place - from >= (form_.root64 ? kHeaderSize64 : kHeaderSize32);
    ledger_.lose(place, reasonAt(source_, form_, from));
    ledger_.setDamaged(canHideRoot || !found.isGroup());
  }
  nesting_.closeFinished();
  if (!takeEnd(place, is64(found.header())))
  {
    take(found);
  }
}

/// Where the next node has to begin at the latest: a group ends there, or one begins whose header is lost.
uint64_t Recovery::endOfGap() const
{
  const OpenGroup& top = place_.top();
  const uint64_t sure = place_.sureLimit();
  const uint64_t to = top.sure || top.open ? std::min(sure, top.limit) : sure;
  const Ending* const lost = place_.lostGroup();
  const bool byEnding = lost != nullptr && lost->start > position() && lost->start < to && lost->end <= sure;
  return byEnding ? lost->start : to;
}

/// Gives up what was searched in vain, but for the zeros that the file ends in.
void Recovery::loseGap(uint64_t to)
{
  const uint64_t from = position();
  if (to == source_.size() && mayEndInZeros())
  {
    to = std::max(from, prober_.zerosStart(from));
  }
  ledger_.lose(std::max(to, from + 1), reasonAt(source_, form_, from));
}

} // namespace tav::inspect
