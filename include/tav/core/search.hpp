/// @file search.hpp
/// Looking for an element among the nodes of a level, in a few instructions for each that is passed.
#pragma once

#include <cstdint>

#include "tav/core/step.hpp"

namespace tav::core
{

/// Passes over the nodes of a level in a block, from `spot` on, while each `isOther(node)`, is whole, of `leastType` at
/// least, ends no group, has its sibling right behind it, and may be passed by `visit(node)`, which sees no node that
/// the rest speaks against. Returns the last of them, or null; `spot` becomes the place of what has to be looked at.
template<class IsOther, class Visit>
[[gnu::always_inline]] inline const uint8_t* passNodes(const BlockLevel& level, uint8_t*& spot, uint32_t leastType,
                                                       const IsOther& isOther, const Visit& visit)
{
  const uint8_t* last = nullptr;
  for (Place place{}; level.find(spot, place); spot += kHeaderSize64 + load<uint64_t>(last))
  {
    const NodeFound<true> found{{spot, false}, place.offset};
    if (!isOther(found) || found.type() < leastType || !isBare(found) || !BlockLevel::holds(found.size(), place) ||
        !visit(found)) [[unlikely]]
    {
      break;
    }
    last = spot;
  }
  return last;
}

/// Passes over nodes that are not the element that is looked for; over groups only with `overGroups`.
[[gnu::always_inline]] inline const uint8_t* passOthers(const BlockLevel& level, uint8_t*& spot, uint32_t elm,
                                                        bool overGroups)
{
  const uint32_t leastType = overGroups ? TAV_TYPE_HEADER32 : TAV_TYPE_HEADER64 + 1;
  const auto isOther = [elm](const NodeFound<true>& found) { return found.elm() != elm; };
  return passNodes(level, spot, leastType, isOther, [](const NodeFound<true>& /*found*/) { return true; });
}

/// The first child of a group that is the element looked for, in a block in host order; false says nothing.
template<class Way>
[[gnu::always_inline]] inline bool findChild(const BlockOf<HostForm, Way>& block, TAVHandle& handle,
                                             const TAVHeader& parent, uint16_t elm, TAVHeaderData& out)
{
  const Level level = levelBelowClosed(nodeOf(parent));
  if (!level.wide || !level.fits) [[unlikely]]
  {
    return false;
  }
  const BlockLevel places(block, level.end);
  uint8_t* spot = places.at(level.start);
  passOthers(places, spot, elm, true);
  Place place{};
  if (!places.find(spot, place)) [[unlikely]]
  {
    return false;
  }
  const NodeFound<true> found{{spot, false}, place.offset};
  const bool isWhole = isGroupType(found.type()) || (found.type() != 0 && BlockLevel::holds(found.size(), place));
  return found.elm() == elm && isBare(found) && isWhole && handOut<true>(block, handle, place, out) == TAV_RC_OK;
}

} // namespace tav::core
