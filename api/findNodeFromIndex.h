/// Finding the node behind a pair.
#pragma once

#include <cstdint>

#include "tav/tav.h"

namespace tav::inside
{

/// The step of tavFindNodeFromIndex with option 0x4 and no limit, for walks: it does not seek twice behind pairs that
/// no readable node follows.
uint32_t readBehindPair(TAVHandle& handle, uint64_t eyeOffset, TAVHeaderData& out);

} // namespace tav::inside
