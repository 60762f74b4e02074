#include "duckdb/src/given.h"
namespace tav::sql
{
void registerNodes(duckdb_connection) {}
}
