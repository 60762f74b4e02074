/// What both functions are given: files, and how they are to be read.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "duckdb/src/engine.h"
#include "tav/inspect/dictionary.hpp"
#include "tav/inspect/document.hpp"

namespace tav::sql
{

struct Given
{
  /// Reads the parameters of a call. Throws Error for what makes no sense.
  explicit Given(duckdb_bind_info info);

  /// Opens one of the files. Throws Error, with its name.
  inspect::Document open(const std::string& file) const;

  /// Throws Error where a file has become shorter since it was opened: what was read of it then is not all.
  static void requireLength(const std::string& file, const inspect::Document& document);

  std::vector<std::string> files{};
  inspect::FormChoice form{};
  inspect::OnDamage onDamage = inspect::OnDamage::stop;
  inspect::Dictionary dictionary{};
};

/// Adds the parameters that it reads to a function.
void addParameters(duckdb_table_function function);

/// A named parameter.
Value named(duckdb_bind_info info, const char* name);

void registerNodes(duckdb_connection connection);
void registerTable(duckdb_connection connection);

} // namespace tav::sql
