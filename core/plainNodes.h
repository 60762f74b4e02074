/// Passing over what most streams consist of, in a few instructions for each node.
#pragma once

#include <cstdint>

#include "core/bytes.h"
#include "tav/core/search.hpp"

namespace tav::core
{

/// The nodes of a level in a block that need no closer look: most of it, in a plain stream.
class PlainNodes
{
public:
  /// The handle is known to have a block to read.
  PlainNodes(const TAVHandle& handle, const Level& level)
  {
    if (level.wide && level.fits && LibraryWay::isHostWith(handle, TAV_OPT_DIRECT))
    {
      start_ = level.start;
      level_ = BlockLevel(BlockBytes<HostForm>(handle), level.end);
    }
  }

  /// To the last of them behind a node, or from the level's start; false when there is none. `pass(level, spot)` passes
  /// over those from a spot on, as passNodes.
  template<class Pass>
  [[gnu::always_inline]] bool behind(bool first, Node& node, const Pass& pass) const
  {
    const uint64_t start = first ? start_ : node.is64 ? core::behind(node)
                                                      : ~uint64_t{0};
    uint8_t* spot = level_.at(start);
    const uint8_t* const last = pass(level_, spot);
    if (last != nullptr)
    {
      node = {static_cast<uint64_t>(last - level_.base), decodeFields(last, true, false), true};
    }
    return last != nullptr;
  }

private:
  BlockLevel level_;
  uint64_t start_ = 0;
};

} // namespace tav::core
