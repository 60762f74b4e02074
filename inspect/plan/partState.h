/// Parts of a file and where walks stand.
#pragma once

#include <cstdint>
#include <vector>

#include "tav/inspect/plan.hpp"
#include "tav/inspect/streamWalk.hpp"
#include "tav/inspect/walker.hpp"

namespace tav::inspect
{

/// Where the walk through a part begins. Throws Error for a part that cannot be one of the file.
Walker::State stateOf(ByteSource& source, const Part& part);

/// All of a file as a part.
Part wholeOf(const ByteSource& source, const Form& form);

/// The groups around a place as a walk has given them out, from the root inwards.
std::vector<Event> groupsAround(const Walker::State& state);

/// What a walk through a part has found when it has come to its end.
PartEnd endOf(const StreamWalk& walk);

/// The part that begins where a walk stands. `streamOffset`: where the walk in its form began.
Part partAt(const Walker::State& state, const Form& form, uint64_t streamOffset);

} // namespace tav::inspect
