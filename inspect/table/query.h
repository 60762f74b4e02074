/// What a table's paths are when they have been read.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "tav/inspect/path.hpp"
#include "tav/inspect/table.hpp"
#include "tav/path/compiled.hpp"

namespace tav::inspect
{

/// A column whose path has more in it than names on the way down.
struct SoughtColumn
{
  uint32_t column = 0;
  const detail::paths::Compiled* path = nullptr;
  bool absolute = false; ///< a route begins above the roots
  size_t above = 0;      ///< the most levels above the row's node that a route leads up to
  size_t bound = 0;      ///< not 0: its value follows from the node so many levels above the row alone
};

struct CompiledQuery
{
  /// Children by names, one after another, from the row's node; where no row is inside of another one, levels, too.
  struct Chain
  {
    uint32_t column = 0;
    const std::vector<detail::paths::Step>* steps = nullptr;
  };

  CompiledQuery(std::string_view eachText, std::vector<TableColumn> givenColumns,
                std::optional<std::string> givenJoiner, const Dictionary& dictionary);
  CompiledQuery(const CompiledQuery&) = delete;
  CompiledQuery& operator=(const CompiledQuery&) = delete;

  Path each;
  std::vector<TableColumn> columns;
  std::optional<std::string> joiner;
  std::vector<Path> columnPaths{}; ///< of the columns
  bool eachIsPlain = false;        ///< the rows' path has names and levels alone: `eachRoutes`
  std::vector<const std::vector<detail::paths::Step>*> eachRoutes{};
  std::vector<Chain> chains{};
  std::vector<SoughtColumn> sought{};
  bool divisible = false;

private:
  void addColumn(uint32_t column);
};

} // namespace tav::inspect
