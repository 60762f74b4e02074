/// Parts of a file and where walks stand.
#pragma once

#include <cstdint>

#include "tav/inspect/plan.hpp"
#include "tav/inspect/walker.hpp"

namespace tav::inspect
{

/// Where the walk through a part begins. Throws Error for a part that cannot be one of the file.
Walker::State stateOf(ByteSource& source, const Part& part);

/// The part that begins where a walk stands. `streamOffset`: where the walk in its form began.
Part partAt(const Walker::State& state, const Form& form, uint64_t streamOffset);

} // namespace tav::inspect
