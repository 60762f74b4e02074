#include "inspect/table/query.h"

#include <algorithm>
#include <utility>

#include "inspect/path/reach.h"

namespace tav::inspect
{

namespace
{

namespace paths = detail::paths;
using paths::Axis;
using paths::Route;
using paths::Step;

constexpr size_t kMostPlainSteps = 64; ///< of a route that the automaton follows

/// Whether a route asks for names alone.
bool isPlain(const Route& route, bool levels)
{
  const auto plain = [levels](const Step& step) {
    return step.predicates.empty() && (step.axis == Axis::child || (levels && step.axis == Axis::descendantOrSelf));
  };
  return route.ups == 0 && route.attribute == paths::Attribute::none && route.steps.size() <= kMostPlainSteps &&
         std::all_of(route.steps.begin(), route.steps.end(), plain);
}

SoughtColumn soughtColumn(uint32_t column, const paths::Compiled& path)
{
  SoughtColumn sought{.column = column, .path = &path};
  const size_t ups = path.routes[path.main.front()].ups;
  bool isBound = ups != 0;
  for (const uint32_t index : path.main)
  {
    const Route& route = path.routes[index];
    sought.absolute = sought.absolute || route.absolute;
    sought.above = std::max(sought.above, route.ups + route.climb);
    isBound = isBound && !route.absolute && !route.hasParents && route.ups == ups;
  }
  sought.bound = isBound ? ups : 0;
  return sought;
}

} // namespace

CompiledQuery::CompiledQuery(std::string_view eachText, std::vector<TableColumn> givenColumns,
                             std::optional<std::string> givenJoiner, const Dictionary& dictionary)
    : each(pathOf(eachText, dictionary)), columns(std::move(givenColumns)), joiner(std::move(givenJoiner))
{
  const paths::Compiled& rows = each.compiled();
  eachIsPlain = std::all_of(rows.main.begin(), rows.main.end(),
                            [&](uint32_t index) { return isPlain(rows.routes[index], true); });
  for (const uint32_t index : rows.main)
  {
    if (eachIsPlain)
    {
      eachRoutes.push_back(&rows.routes[index].steps);
    }
  }
  divisible = staysInRoot(rows);
  columnPaths.reserve(columns.size());
  for (const TableColumn& column : columns)
  {
    columnPaths.push_back(pathOf(column.path, dictionary));
  }
  for (uint32_t i = 0; i < columnPaths.size(); ++i)
  {
    addColumn(i);
  }
}

void CompiledQuery::addColumn(uint32_t column)
{
  const paths::Compiled& path = columnPaths[column].compiled();
  // Of rows inside of each other, as many levels would have to be kept in mind as there are.
  const bool rowsNest = !eachIsPlain || std::any_of(eachRoutes.begin(), eachRoutes.end(), [](const auto* steps) {
    return std::any_of(steps->begin(), steps->end(), [](const Step& step) { return step.axis != Axis::child; });
  });
  const auto isChain = [&](uint32_t index) {
    const Route& route = path.routes[index];
    const bool endsInChild = route.steps.empty() || route.steps.back().axis == Axis::child;
    return !route.absolute && isPlain(route, !rowsNest && endsInChild);
  };
  if (!std::all_of(path.main.begin(), path.main.end(), isChain))
  {
    sought.push_back(soughtColumn(column, path));
    divisible = divisible && !sought.back().absolute;
    return;
  }
  for (const uint32_t index : path.main)
  {
    chains.push_back({column, &path.routes[index].steps});
  }
}

TableQuery::TableQuery(std::string_view each, std::vector<TableColumn> columns, std::optional<std::string> joiner,
                       const Dictionary& dictionary)
    : compiled_(std::make_shared<const CompiledQuery>(each, std::move(columns), std::move(joiner), dictionary))
{
}

const std::vector<TableColumn>& TableQuery::columns() const noexcept
{
  return compiled_->columns;
}

bool TableQuery::isDivisible() const noexcept
{
  return compiled_->divisible;
}

} // namespace tav::inspect
