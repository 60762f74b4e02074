/// Where a file can be cut so that its parts make the same rows.
#pragma once

#include <cstdint>
#include <optional>

#include "inspect/table/automaton.h"
#include "tav/inspect/walker.hpp"

namespace tav::inspect
{

/// Whether rows follow from the bytes behind a place inside of a group, too: places among siblings, and nodes that may
/// be before it, are asked for neither by the rows' path nor by a column's.
inline bool cutsInGroups(const CompiledQuery& query)
{
  return query.eachIsPlain && query.sought.empty();
}

/// The automaton's state at a place, when no row is around it and those behind follow from the bytes behind.
std::optional<uint32_t> stateAtCut(Automaton& automaton, const CompiledQuery& query, const Walker::State& at);

} // namespace tav::inspect
