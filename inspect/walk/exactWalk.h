/// Goes through a group whose every node is as a writer makes it, by the exact steps.
#pragma once

#include <cstdint>
#include <cstring>
#include <span>
#include <utility>
#include <vector>

#include "inspect/walk/sizeSuits.h"
#include "tav/core/bytes.hpp"
#include "tav/core/step.hpp"
#include "tav/inspect/node.hpp"
#include "tav/tav.h"

namespace tav::inspect
{

namespace exact
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

} // namespace exact

/// Goes from node to node by the steps of tav::core, over bytes in memory. At whatever leaves a Walker a choice, it
/// gives up: an open group, a size that does not suit its type or its level, bytes of padding or of a pair that are not
/// there, strings behind which two bytes more may stand. So a group that it gets through has the nodes that a Walker
/// finds in it, and no damage.
///
/// `Sink` is told of the nodes: `enter` of a group, and says whether it wants what is in it, `leave` of that one's end,
/// `data` of a data element. Offsets count from the group's first byte.
template<class Sink>
class ExactWalk
{
public:
  explicit ExactWalk(Sink& sink)
      : sink_(sink) {}

  /// The bytes of a closed group from its header to its end. The sink has entered it. False when it gave up, at
  /// `reached()`: what the sink was told is to be taken back.
  bool through(std::span<const uint8_t> bytes, const Form& form, bool wide);

  /// Whether groups have been taken for plain so far: in this machine's order, without paddings and pairs. Then the
  /// same bytes are to be tried again after a failure, from which on they are not.
  bool expectMore() { return std::exchange(plain_, false); }

  /// Offset in the bytes of the node at which it gave up.
  uint64_t reached() const { return reached_; }

private:
  enum class Way : uint8_t
  {
    down,
    up,
    notHere
  };
  struct Around
  {
    core::Level level;
    core::Node group;
  };

  template<class Bytes>
  bool walk(const Bytes& bytes, const core::Node& group);
  template<bool wide, class Bytes>
  Way onLevel(const Bytes& bytes, const core::Level& level, bool first, core::Node& node);
  template<class Bytes>
  Way enter(const Bytes& bytes, const core::Node& group, const core::Level& level);

  Sink& sink_;
  std::vector<Around> around_{};
  uint64_t reached_ = 0;
  bool plain_ = true;
};

template<class Sink>
template<class Bytes>
typename ExactWalk<Sink>::Way ExactWalk<Sink>::enter(const Bytes& bytes, const core::Node& group,
                                                     const core::Level& level)
{
  // Behind an element that ends its group, the steps find nothing, even when it is a group itself.
  if ((!group.wide() && group.type() == TAV_TYPE_HEADER64) || layout::isEndElement(group.elm()))
  {
    return Way::notHere;
  }
  if (sink_.enter(group))
  {
    around_.push_back({level, group});
    return Way::down;
  }
  const bool sure =
      (group.info() & TAV_INFO_EYE_SIZE) == 0 || exact::pairEnds(bytes, group, core::levelBelowClosed(group));
  return sure ? Way::up : Way::notHere;
}

/// Goes on on a level to a group that is wanted, or to its end.
template<class Sink>
template<bool wide, class Bytes>
typename ExactWalk<Sink>::Way ExactWalk<Sink>::onLevel(const Bytes& bytes, const core::Level& level, bool first,
                                                       core::Node& node)
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
    if (!suits || (!bare && !exact::endsWell(bytes, node, level.end)) ||
        (node.type() == TAV_TYPE_UTF8_STRING && !exact::endsAtItsSize(bytes, node, level.end))) [[unlikely]]
    {
      return Way::notHere;
    }
    sink_.data(node, place.header + header, bytes.form.swap);
  }
}

template<class Sink>
template<class Bytes>
bool ExactWalk<Sink>::walk(const Bytes& bytes, const core::Node& group)
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
    sink_.leave();
    node = around_.back().group;
    level = around_.back().level;
    around_.pop_back();
  }
}

template<class Sink>
bool ExactWalk<Sink>::through(std::span<const uint8_t> bytes, const Form& form, bool wide)
{
  TAVHandle handle{};
  handle.pDirectData = const_cast<uint8_t*>(bytes.data()); // which is only read
  handle.directDataSize = bytes.size();
  handle.swapBytes = form.swapped ? 1 : 0;
  handle.alignMode = form.aligned ? 1 : 0;
  const core::Node group{0, layout::decodeFields(bytes.data(), wide, form.swapped), wide};
  const bool isPlain = plain_ && !form.swapped && !form.aligned;
  return isPlain ? walk(exact::Block<core::HostForm>(handle), group) : walk(exact::Block<core::AnyForm>(handle), group);
}

} // namespace tav::inspect
