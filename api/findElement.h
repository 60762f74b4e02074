/// The search of tavFindElmInt, for operations that search level after level.
#pragma once

#include <cstdint>

#include "tav/tav.h"

namespace tav::inside
{

/// What tavFindElmInt looks for.
struct Wanted
{
  uint32_t minDepth;
  uint32_t maxDepth;
  uint16_t infoKey;
  uint32_t elm;
};

/// As tavFindElmInt. `reached` receives the offset of the last node that the search came to, if it came to any.
uint32_t findElement(TAVHandle* handle, TAVHeader* parent, const Wanted& wanted, TAVHeader* resume, TAVHdrStack* stack,
                     TAVHeaderData* out, uint64_t& reached);

} // namespace tav::inside
