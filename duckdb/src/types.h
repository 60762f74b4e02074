/// The types of a table's columns.
#pragma once

#include <cstdint>
#include <vector>

#include "duckdb/src/given.h"
#include "tav/inspect/table.hpp"

namespace tav::sql
{

/// What is known of a table before its rows are handed out.
struct TableShape
{
  std::vector<duckdb_type> types{}; ///< of the columns
  uint64_t rows = 0;
};

/// A column's type follows from all of its values in all files, so all are read, by `threads` with the result of one.
/// Throws Error for the first file, in their order, that cannot be read.
TableShape shapeOf(const Given& given, const inspect::TableQuery& query, unsigned threads);

} // namespace tav::sql
