// The entry of the extension: what it adds to the engine.
#include "duckdb/src/files.h"
#include "duckdb/src/given.h"

namespace tav::sql
{

namespace
{

/// FROM 'day.tav' and FROM '2026-*/*.tav'.
void replace(duckdb_replacement_scan_info info, const char* name, void*)
{
  if (!isStreamName(name))
  {
    return;
  }
  const Value file(duckdb_create_varchar(name));
  duckdb_replacement_scan_set_function_name(info, "read_tav");
  duckdb_replacement_scan_add_parameter(info, file.get());
}

bool add(duckdb_extension_info info, duckdb_extension_access* access)
{
  duckdb_database const database = *access->get_database(info);
  duckdb_connection connection = nullptr;
  if (duckdb_connect(database, &connection) == DuckDBError)
  {
    access->set_error(info, "tav: the engine gives no connection");
    return false;
  }
  registerNodes(connection);
  registerTable(connection);
  duckdb_disconnect(&connection);
  duckdb_add_replacement_scan(database, replace, nullptr, nullptr);
  return true;
}

} // namespace

} // namespace tav::sql

DUCKDB_EXTENSION_ENTRYPOINT_CUSTOM(duckdb_extension_info info, duckdb_extension_access* access)
{
  return tav::sql::add(info, access);
}
