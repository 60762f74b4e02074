#include "tav/inspect/checker.hpp"

#include <algorithm>
#include <array>
#include <utility>

#include "inspect/check/sentences.h"
#include "inspect/text/scan.h"
#include "inspect/walk/prober.h"
#include "inspect/walk/sizeSuits.h"
#include "tav/inspect/phrases.hpp"
#include "tav/inspect/value.hpp"

namespace tav::inspect
{

using namespace tav::layout;

namespace
{

constexpr uint64_t kMostNested = 4000; ///< groups that the library can have open at a time

} // namespace

Checker::Checker(ByteSource& source, const Form& form, std::function<bool(RuleId)> wanted, Sink sink, PathStyle style)
    : source_(source), form_(form), wanted_(std::move(wanted)), sink_(std::move(sink)), style_(style),
      walker_(source, form)
{
  Group file;
  file.wide = form.root64;
  groups_.push_back(file);
}

Checker::Checker(ByteSource& source, const Form& form, std::function<bool(RuleId)> wanted, Sink sink, PathStyle style,
                 const Walker::State& state, bool rootEnded)
    : source_(source), form_(form), wanted_(std::move(wanted)), sink_(std::move(sink)), style_(style),
      walker_(Walker::from(source, form, state)), rootEnded_(rootEnded)
{
  Group file;
  file.wide = form.root64;
  groups_.push_back(file);
  for (size_t i = 1; i < state.frames.size(); ++i)
  {
    enter(state.frames[i].node);
  }
}

bool Checker::isPlain() const
{
  const auto isPlainGroup = [](const Group& group) {
    return !group.ended && !group.damagedTail && group.afterEnd == 0 && group.lastClaim == 0;
  };
  return deepOpen_ == 0 && !deepTold_ && std::all_of(groups_.begin(), groups_.end(), isPlainGroup);
}

void Checker::found(RuleId rule, uint64_t offset, uint64_t length, std::string sentence, bool otherStream)
{
  if (wanted_(rule))
  {
    ++findings_;
    if (sink_)
    {
      sink_({rule, offset, length, path(), std::move(sentence), otherStream});
    }
  }
}

template<class Say>
[[gnu::noinline, gnu::cold]] void Checker::foundThat(RuleId rule, uint64_t length, const Say& say)
{
  found(rule, event_.offset, length, say());
}

std::string Checker::path() const
{
  // So deep, a whole path is longer than anyone reads; the offset gives the place.
  return style_ == PathStyle::whole && event_.depth > kMostNested ? std::string() : walker_.path(event_, style_);
}

bool Checker::step()
{
  if (!walker_.goOn(event_))
  {
    return false;
  }
  switch (event_.what)
  {
  case What::nodeBegin: beginNode(); break;
  case What::payload: checkText(); break;
  case What::extra:
    foundThat(RuleId::stringExtra, event_.length,
              [] { return "two bytes stand behind this string that no size counts"; });
    break;
  case What::padding: checkPadding(); break;
  case What::pair: checkDataPair(); break;
  case What::nodeEnd: event_.node.isGroup() ? endGroup() : endNode(); break;
  case What::damaged:
    ++damages_;
    placeIsTaken();
    checkDamage();
    groups_.back().damagedTail = true;
    break;
  case What::zeros: checkZeros(); break;
  default: break;
  }
  return true;
}

void Checker::placeIsTaken()
{
  Group& group = groups_.back();
  if (group.ended && group.afterEnd == 0)
  {
    group.afterEnd = event_.offset;
    foundThat(RuleId::afterEnd, 0, [] { return "stands behind the end element of the group around it"; });
  }
}

void Checker::beginNode()
{
  isEndNode(event_.node) ? ++endElements_ : ++nodes_;
  placeIsTaken();
  groups_.back().damagedTail = false;
  paddingCut_ = 0;
  checkHeader();
  if (event_.node.isGroup())
  {
    beginGroup();
  }
  else if (event_.node.elm() == TAV_ELM_CMN_END_HDR_EYE_SIZE)
  {
    checkEndElement();
  }
}

void Checker::checkHeader()
{
  const Node& node = event_.node;
  const uint64_t length = node.headerLength();
  if (node.has(kBadGroupType))
  {
    foundThat(RuleId::groupType, length,
              [] { return "a group with a 32-bit header announces children with 64-bit headers"; });
  }
  if (node.depth == 0 && !node.isGroup())
  {
    foundThat(RuleId::rootNoGroup, length, [] { return "a data element outside any group"; });
  }
  if (!Prober::isNamed(node.elm()))
  {
    foundThat(RuleId::elementUnknown, length,
              [&] { return "element " + std::to_string(node.elm()) + " is not in the dictionary"; });
  }
  if (!node.isGroup() && !isDataType(node.header))
  {
    foundThat(RuleId::typeUnknown, length, [&] { return "type " + std::to_string(node.type()) + " is unknown"; });
  }
  else if (!node.isGroup() && !sizeSuits(node.type(), node.size()))
  {
    foundThat(RuleId::sizeType, length, [&] { return sizeSentence(node.header); });
  }
  if (node.is64() && ((node.info() & TAV_INFO_ALIGNED8) != 0) != form_.aligned)
  {
    foundThat(RuleId::alignFlag, length, [&] {
      return form_.aligned ? "does not announce padding, in a stream that is padded"
                           : "announces padding, in a stream that is not padded";
    });
  }
  if (node.isGroup() && node.depth >= kMostNested && !deepTold_)
  {
    deepTold_ = true;
    foundThat(RuleId::tooDeep, length,
              [&] { return "lies in " + counted(node.depth, "group") + "; the library can follow 3,999"; });
  }
}

void Checker::beginGroup()
{
  enter(event_.node);
}

void Checker::enter(const Node& node)
{
  Group group;
  group.node = node;
  group.wide = hasChildren64(node.header);
  group.cutClaim = groups_.back().cutClaim;
  if (!node.has(kOpen))
  {
    group.claimedEnd = addSaturated(node.payloadOffset(), node.size());
    if (node.has(kOverrun) && node.limit == source_.size())
    {
      group.cutClaim = group.claimedEnd;
    }
  }
  groups_.push_back(std::move(group));
}

void Checker::checkEndElement()
{
  const Node& node = event_.node;
  const bool infoFits = !node.is64() || (node.info() & ~TAV_INFO_ALIGNED8) == 0;
  if (node.type() != TAV_TYPE_BINARY || node.size() != kEyeSizeLength || !infoFits)
  {
    found(RuleId::endForm, node.offset(), node.headerLength(),
          "an end element of " + counted(node.size(), "byte") + ", type " + std::to_string(node.type()) + ", info " +
              hexOffset(node.info()) + " instead of 16 bytes, type 101, info 0");
    return;
  }
  if (groups_.size() > 1)
  {
    const uint64_t before = node.offset() - groups_.back().node.payloadOffset();
    checkPair(node.payloadOffset(), groupDistance(before, node.is64()), false);
  }
}

void Checker::checkDataPair()
{
  const Node& node = event_.node;
  const bool byString = node.type() == TAV_TYPE_ASCII_STRING || node.has(kExtra);
  checkPair(event_.offset, dataDistance(node.size()), byString);
}

void Checker::checkPair(uint64_t offset, uint64_t expected, bool eitherOrder)
{
  EyeSizeBytes bytes{};
  if (source_.read(offset, bytes) != bytes.size())
  {
    return;
  }
  EyeSize pair = decodeEyeSize(bytes, form_.swapped);
  const EyeSize other = decodeEyeSize(bytes, !form_.swapped);
  if (pair.eye != TAV_EYE_CATCHER && other.eye == TAV_EYE_CATCHER)
  {
    if (!eitherOrder)
    {
      found(RuleId::pairOrder, offset, kEyeSizeLength, "the eye/size pair is in the other byte order");
      return;
    }
    pair = other;
  }
  if (pair.eye != TAV_EYE_CATCHER)
  {
    found(RuleId::eyeDamaged, offset, kEyeSizeLength, "the eye catcher is damaged: " + hexOffset(pair.eye));
  }
  else if (pair.distance != expected)
  {
    found(RuleId::pairDistance, offset, kEyeSizeLength,
          "the distance of the eye/size pair is " + std::to_string(pair.distance) + " instead of " +
              std::to_string(expected));
  }
}

void Checker::checkText()
{
  const Node& node = event_.node;
  const bool utf8 = node.type() == TAV_TYPE_UTF8_STRING;
  const auto isAsked = [&] {
    return wanted_(RuleId::utf8Invalid) || wanted_(RuleId::stringNul) || wanted_(RuleId::stringHigh);
  };
  if ((!utf8 && node.type() != TAV_TYPE_ASCII_STRING) || !isAsked())
  {
    return;
  }
  const uint64_t end = event_.offset + event_.length;
  TextScan scan(event_.offset + (utf8 ? std::min<uint64_t>(2, event_.length) : 0));
  while (scan.position() < end)
  {
    const auto bytes = source_.view(scan.position());
    if (bytes.empty())
    {
      return;
    }
    scan.take(bytes.first(static_cast<size_t>(std::min<uint64_t>(bytes.size(), end - scan.position()))));
  }
  scan.finish();
  if (utf8 && scan.invalid() != TextScan::kNowhere)
  {
    found(RuleId::utf8Invalid, scan.invalid(), 0, "the string holds bytes that are no UTF-8");
  }
  if (scan.nul() != TextScan::kNowhere)
  {
    found(RuleId::stringNul, scan.nul(), 1, "the string holds a NUL");
  }
  if (!utf8 && scan.high() != TextScan::kNowhere)
  {
    found(RuleId::stringHigh, scan.high(), 1, "the ASCII string holds a character beyond 127");
  }
}

void Checker::checkPadding()
{
  std::array<uint8_t, 8> bytes{};
  const size_t got =
      source_.read(event_.offset, std::span(bytes).first(static_cast<size_t>(std::min<uint64_t>(8, event_.length))));
  if (std::any_of(bytes.begin(), bytes.begin() + static_cast<ptrdiff_t>(got), [](uint8_t byte) { return byte != 0; }))
  {
    found(RuleId::paddingDirty, event_.offset, event_.length, "the padding is not zero");
  }
}

void Checker::endNode()
{
  const Node& node = event_.node;
  checkDataEnd();
  checkClaim(event_.offset, true);
  if (groups_.size() > 1 && isEndElement(node.elm()))
  {
    groups_.back().ended = true;
  }
}

void Checker::checkDataEnd()
{
  const Node& node = event_.node;
  if (const uint64_t missing = missingPadding(event_, form_); missing != 0)
  {
    tellPadding(missing);
  }
  if (node.has(kNoPair))
  {
    foundThat(RuleId::pairMissing, 0, [] { return "announces an eye/size pair, but none is there"; });
  }
}

void Checker::tellPadding(uint64_t missing)
{
  const Node& node = event_.node;
  paddingCut_ = event_.offset == source_.size() ? missing : 0;
  found(RuleId::paddingMissing, node.payloadOffset() + node.size() + (node.has(kExtra) ? 2 : 0), 0,
        counted(missing, "byte") + " of padding " + (missing == 1 ? "is" : "are") + " not there");
}

void Checker::checkClaim(uint64_t offset, bool boundary)
{
  Group& group = groups_.back();
  if (group.lastClaim != 0 && !(boundary && offset < group.lastClaim))
  {
    tellClaim(group, offset);
  }
}

void Checker::tellClaim(Group& group, uint64_t offset)
{
  const bool exact = offset == group.lastClaim;
  const RuleId rule = exact ? RuleId::afterEnd : RuleId::groupSize;
  findings_ += wanted_(rule) ? 1 : 0;
  if (sink_ && wanted_(rule))
  {
    const std::string sentence = exact ? "stands behind the end element of this group, but inside its size"
                                       : "says that it ends at " + hexOffset(group.lastClaim) +
                                             ", but its end element ends at " + hexOffset(group.lastClaimEnd);
    sink_({rule, exact ? group.lastClaimEnd : group.lastClaimer, 0, group.lastClaimPath, sentence});
  }
  group.lastClaim = 0;
}

void Checker::endGroup()
{
  checkClaim(event_.offset, false);
  Group group = std::move(groups_.back());
  groups_.pop_back();
  const Node& node = event_.node;
  bool open = false;
  if (node.has(kOverrun))
  {
    checkOverrun(group);
  }
  else if (node.has(kOpen) && event_.end != End::byEndElement)
  {
    const bool empty = node.size() == 0 && event_.offset == node.payloadOffset(); // sound when it was closed at once
    open = !empty;
  }
  else if (node.has(kOpen) && isSizeUnknown(node.header))
  {
    found(RuleId::sizeUnknown, node.offset(), node.headerLength(), "its size is all ones; its end element ends it");
  }
  else if (node.has(kOpen))
  {
    found(RuleId::groupSize, node.offset(), node.headerLength(),
          "its size is 0, but its end element ends at " + hexOffset(event_.offset));
  }
  else if (hasEyeSize(node.header) && !group.ended && !group.damagedTail)
  {
    found(RuleId::endMissing, node.offset(), node.headerLength(), "announces an eye/size pair, but has no end element");
  }
  tellOpen(open);
  if (node.has(kWrongSize))
  {
    Group& parent = groups_.back();
    parent.lastClaim = group.claimedEnd;
    parent.lastClaimer = node.offset();
    parent.lastClaimEnd = event_.offset;
    parent.lastClaimPath = path();
  }
  else
  {
    checkClaim(event_.offset, true);
  }
  if (groups_.size() == 1)
  {
    rootEnded_ = true;
    deepTold_ = false;
  }
}

void Checker::tellOpen(bool open)
{
  if (event_.node.depth > kMostNested)
  {
    deepOpen_ += open ? 1 : 0; // told together: a line for each says no more
    return;
  }
  const uint64_t below = event_.node.depth == kMostNested ? std::exchange(deepOpen_, 0) : 0;
  if (open || below != 0)
  {
    const std::string more = below == 0 ? "" : counted(below, "group") + " in it";
    found(RuleId::groupOpen, event_.node.offset(), event_.node.headerLength(),
          below == 0 ? "was never closed"
          : open     ? "was never closed, nor " + std::string(below == 1 ? "was " : "were ") + more
                     : more + (below == 1 ? " was" : " were") + " never closed");
  }
}

void Checker::checkOverrun(const Group& group)
{
  const Node& node = group.node;
  const uint64_t around = groups_.back().cutClaim;
  if (event_.end == End::byEndElement)
  {
    found(RuleId::groupSize, node.offset(), node.headerLength(),
          "says that it ends at " + hexOffset(group.claimedEnd) + ", but its end element ends at " +
              hexOffset(event_.offset));
  }
  else if (node.limit < source_.size())
  {
    found(RuleId::pastParent, node.offset(), node.headerLength(),
          endsPast(group.claimedEnd - node.limit, "its parent"));
  }
  else if (around != kNoOffset)
  {
    if (group.claimedEnd > around)
    {
      found(RuleId::pastParent, node.offset(), node.headerLength(), endsPast(group.claimedEnd - around, "its parent"));
    }
  }
  else if (group.claimedEnd - source_.size() != paddingCut_)
  {
    found(RuleId::pastFile, node.offset(), node.headerLength(),
          endsPast(group.claimedEnd - source_.size(), "the end of the file"));
  }
}

} // namespace tav::inspect
