/// The sibling of a group that was never closed.
#pragma once

#include <cstdint>

#include "tav/tav.h"

namespace tav::inside
{

/// Reads the node behind the eye catcher that leads back to `reference`. What earlier scans through the handle have
/// shown is not read again.
uint32_t readAfterOpenGroup(TAVHandle& handle, const TAVHeader& parent, const TAVHeader& reference, TAVHeaderData& out);

} // namespace tav::inside
