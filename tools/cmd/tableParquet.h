/// A table as Parquet, which DuckDB makes of the files with the extension `tav`.
#pragma once

#include <string>
#include <utility>
#include <vector>

#include "tav/inspect.hpp"
#include "tools/shell/names.h"
#include "tools/shell/options.h"
#include "tools/shell/output.h"

namespace tav::tool
{

/// What is asked of the engine.
struct ParquetTable
{
  std::vector<std::string> files{};
  std::string each{};
  std::vector<TableColumn> columns{};
  std::vector<std::pair<std::string, std::string>> labels{}; ///< columns of one text: names and texts
  Dictionary dictionary{};                                   ///< of all files
};

/// Throws Failure for what the engine cannot be asked for: files that are read but once, for instance.
void checkParquet(const Invocation& invocation);

/// The engine's program, with the extension in it.
class ParquetEngine
{
public:
  /// Finds both: the program by TAV_DUCKDB, else as `duckdb` on PATH; the extension by TAV_DUCKDB_EXTENSION, else where
  /// the engine has installed it. Throws Failure, which says how to get what is missing.
  ParquetEngine();

  /// Writes the table, its rows in their order. Throws Failure where the engine ends otherwise than with a table.
  void write(const ParquetTable& table, const Invocation& invocation, Output& out) const;

private:
  std::string program_;
  std::string load_; ///< the statement that loads the extension
};

} // namespace tav::tool
