/// The step that the library alone takes: walks with the node in registers.
#pragma once

#include <cstdint>

#include "core/bytes.h"
#include "core/fastWay.h"
#include "tav/core/step.hpp"

namespace tav::core
{

/// The step of a walk, from node to node.
template<bool Wide, class Bytes>
[[gnu::always_inline]] inline uint32_t step(const Bytes& bytes, const Level& level, bool first, Node& node,
                                            Place& place)
{
  if (!first && node.is64 != Wide) [[unlikely]]
  {
    return kNotHere;
  }
  Node before = node;
  before.is64 = Wide; // which the compiler knows from here on
  const uint32_t rc = findNext<Wide>(bytes, level, first, before, place);
  if (rc == TAV_RC_OK) [[likely]]
  {
    node = {place.offset, decodeFields(place.header, Wide, bytes.form.swap), Wide};
  }
  return rc;
}

} // namespace tav::core
