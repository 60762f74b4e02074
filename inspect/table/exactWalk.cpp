#include "inspect/table/exactWalk.h"

#include <cstring>

#include "inspect/walk/sizeSuits.h"

namespace tav::inspect
{

namespace
{

template<class Form>
using Block = core::BlockOf<Form, core::PlainWay>;

/// Whether an eye catcher stands at a place before `end`.
template<class Bytes>
bool hasPair(const Bytes& bytes, uint64_t offset, uint64_t end, uint64_t& distance)
{
  if (offset > end || end - offset < layout::kEyeSizeLength)
  {
    return false;
  }
  layout::EyeSizeBytes pair{};
  std::memcpy(pair.data(), bytes.base + offset, pair.size());
  const layout::EyeSize read = layout::decodeEyeSize(pair, bytes.form.swap);
  distance = read.distance;
  return read.eye == TAV_EYE_CATCHER;
}

/// Whether what stands behind a data element's payload is what its header announces, and ends on its level.
template<class Bytes>
bool endsWell(const Bytes& bytes, const core::Node& node, uint64_t end)
{
  uint64_t length = 0;
  uint64_t behind = 0;
  if (!core::lengthOf(bytes.form.alignAll, node, length) || !layout::addFits(node.offset(), length, behind) ||
      behind > end)
  {
    return false;
  }
  if (layout::isEndElement(node.elm()) && behind != end)
  {
    return false;
  }
  uint64_t distance = 0;
  return (node.info() & TAV_INFO_EYE_SIZE) == 0 || hasPair(bytes, behind - layout::kEyeSizeLength, end, distance);
}

/// Whether a UTF-8 string ends where its size says: two bytes that no size counts can follow, when a header behind them
/// would be at least as likely as one before. One of a type that is known, and no larger than its level, would be.
template<class Bytes>
bool endsAtItsSize(const Bytes& bytes, const core::Node& node, uint64_t end)
{
  uint64_t length = 0;
  if (!core::lengthOf(bytes.form.alignAll, node, length))
  {
    return false;
  }
  const uint64_t behind = node.offset() + length + sizeof(uint16_t);
  if (behind > end || (node.info() & TAV_INFO_EYE_SIZE) != 0)
  {
    return true;
  }
  if (end - behind < core::lengthOfHeader(node.wide()))
  {
    return behind != end;
  }
  const layout::HeaderFields other = layout::decodeFields(bytes.base + behind, node.wide(), bytes.form.swap);
  const bool isKnown = layout::isGroupType(other.type) || layout::typeInfo(other.type).known;
  return !isKnown ||
         (!layout::isGroupType(other.type) && other.size > end - behind - core::lengthOfHeader(node.wide()));
}

/// Whether the pair at a group's end leads back to it.
template<class Bytes>
bool pairEnds(const Bytes& bytes, const core::Node& group, const core::Level& below)
{
  uint64_t distance = 0;
  const uint64_t missing = group.wide() && !below.wide ? 8 : 0; // as the writer makes it
  return below.end - below.start >= layout::kEyeSizeLength &&
         hasPair(bytes, below.end - layout::kEyeSizeLength, below.end, distance) &&
         below.end - layout::kEyeSizeLength - group.offset() == layout::addSaturated(distance, missing);
}

} // namespace

template<class Bytes>
ExactWalk::Way ExactWalk::enter(const Bytes& bytes, const core::Node& group, const core::Level& level)
{
  if (!group.wide() && group.type() == TAV_TYPE_HEADER64)
  {
    return Way::notHere;
  }
  const Automaton::Move move = filling_.meet(group.elm());
  if (!filling_.automaton().isDead(move.state))
  {
    filling_.enter(move);
    around_.push_back({level, group});
    return Way::down;
  }
  if (move.isRow)
  {
    filling_.enter(move);
    filling_.leave();
  }
  const bool sure = (group.info() & TAV_INFO_EYE_SIZE) == 0 || pairEnds(bytes, group, core::levelBelowClosed(group));
  return sure ? Way::up : Way::notHere;
}

/// Goes on on a level to a group that is wanted, or to its end.
template<bool wide, class Bytes>
ExactWalk::Way ExactWalk::onLevel(const Bytes& bytes, const core::Level& level, bool first, core::Node& node)
{
  constexpr uint64_t header = core::lengthOfHeader(wide);
  for (core::Node before = node;; before = node, first = false)
  {
    before.is64 = wide;
    core::Place place = bytes.nowhere();
    const uint32_t code = core::findNext<wide>(bytes, level, first, before, place);
    if (code != TAV_RC_OK) [[unlikely]]
    {
      reached_ = first ? level.start : before.offset();
      return code == TAV_RC_NO_MORE_CHILDREN ? Way::up : Way::notHere;
    }
    node = {place.offset, layout::decodeFields(place.header, wide, bytes.form.swap), wide};
    reached_ = place.offset;
    const uint64_t start = place.offset + header;
    if (start > level.end || node.size() > level.end - start) [[unlikely]]
    {
      return Way::notHere;
    }
    if (node.group()) [[unlikely]]
    {
      const Way way = enter(bytes, node, level);
      if (way != Way::up)
      {
        return way;
      }
      continue;
    }
    const bool suits = layout::typeInfo(node.type()).known && sizeSuits(node.type(), node.size());
    const bool bare = core::isBare(node) && !bytes.form.alignAll;
    if (!suits || (!bare && !endsWell(bytes, node, level.end)) ||
        (node.type() == TAV_TYPE_UTF8_STRING && !endsAtItsSize(bytes, node, level.end))) [[unlikely]]
    {
      return Way::notHere;
    }
    filling_.data(filling_.meet(node.elm()), {node.type(), place.header + header, node.size(), bytes.form.swap});
  }
}

template<class Bytes>
bool ExactWalk::walk(const Bytes& bytes, const core::Node& group)
{
  core::Level level = core::levelBelowClosed(group);
  core::Node node = group;
  around_.clear();
  for (bool first = true;;)
  {
    const Way way = level.wide ? onLevel<true>(bytes, level, first, node) : onLevel<false>(bytes, level, first, node);
    if (way == Way::notHere)
    {
      return false;
    }
    first = way == Way::down;
    if (first)
    {
      level = core::levelBelowClosed(node);
      continue;
    }
    if (around_.empty())
    {
      return true;
    }
    filling_.leave();
    node = around_.back().group;
    level = around_.back().level;
    around_.pop_back();
  }
}

bool ExactWalk::through(std::span<const uint8_t> bytes, const Form& form, bool wide)
{
  TAVHandle handle{};
  handle.pDirectData = const_cast<uint8_t*>(bytes.data()); // which is only read
  handle.directDataSize = bytes.size();
  handle.swapBytes = form.swapped ? 1 : 0;
  handle.alignMode = form.aligned ? 1 : 0;
  const core::Node group{0, layout::decodeFields(bytes.data(), wide, form.swapped), wide};
  const bool isPlain = plain_ && !form.swapped && !form.aligned;
  return isPlain ? walk(Block<core::HostForm>(handle), group) : walk(Block<core::AnyForm>(handle), group);
}

} // namespace tav::inspect
