#include "inspect/table/cut.h"

#include <algorithm>
#include <cstddef>
#include <utility>
#include <vector>

#include "inspect/plan/partState.h"
#include "tav/inspect/table.hpp"

namespace tav::inspect
{

namespace
{

constexpr size_t kAnyNumber = ~size_t{0};

/// The most groups that are around a row.
size_t groupsAroundRows(const CompiledQuery& query)
{
  if (!cutsInGroups(query))
  {
    return 0; // that a file can be cut in
  }
  size_t most = 1;
  for (const auto* const steps : query.eachRoutes)
  {
    const bool anyLevel = std::any_of(steps->begin(), steps->end(), [](const detail::paths::Step& step) {
      return step.axis != detail::paths::Axis::child;
    });
    most = anyLevel ? kAnyNumber : std::max(most, steps->size());
  }
  return most - 1;
}

} // namespace

std::optional<uint32_t> stateAtCut(Automaton& automaton, const CompiledQuery& query, const Walker::State& at)
{
  const bool isStart = at.position == 0;
  if (!isStart && !(at.frames.size() == 1 ? query.divisible : cutsInGroups(query)))
  {
    return std::nullopt;
  }
  uint32_t state = Automaton::kAbove;
  for (size_t i = 1; i < at.frames.size(); ++i)
  {
    uint32_t before = 0;
    const Automaton::Move& move = automaton.move(state, at.frames[i].node.elm(), before);
    if (move.isRow)
    {
      return std::nullopt;
    }
    state = move.state;
  }
  return state;
}

std::vector<Part> planTable(ByteSource& source, const TableQuery& query, const PlanOptions& options)
{
  Automaton automaton(query.compiled());
  std::vector<Part> parts;
  PlanOptions own = options;
  own.maxDepth = std::min(own.maxDepth, groupsAroundRows(query.compiled()));
  for (Part& part : plan(source, own))
  {
    const auto state = stateAtCut(automaton, query.compiled(), stateOf(source, part));
    // Groups without rows are stepped over as a whole.
    if (parts.empty() || (state && (part.around.empty() || automaton.findsRows(*state))))
    {
      parts.push_back(std::move(part));
    }
    else
    {
      parts.back().size = part.end() - parts.back().offset;
    }
  }
  return parts;
}

} // namespace tav::inspect
