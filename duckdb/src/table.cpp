// read_tav_table: a row for each node that a path leads to, columns by paths from there.
#include <algorithm>
#include <exception>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "duckdb/src/given.h"
#include "duckdb/src/parts.h"
#include "duckdb/src/types.h"
#include "duckdb/src/vectors.h"
#include "tav/inspect/table.hpp"

namespace tav::sql
{

namespace
{

using inspect::Cell;
using inspect::CellKind;
using inspect::Table;

/// What a call is bound to.
struct TableCall
{
  explicit TableCall(duckdb_bind_info info)
      : given(info), each(textOf(info)), joiner(joinerOf(info)), query(queryOf(columnsOf(info))) {}

  /// The rows with some of the columns.
  inspect::TableQuery queryOf(std::vector<inspect::TableColumn> columns) const
  {
    return {each, std::move(columns), joiner, given.dictionary};
  }

  static std::string textOf(duckdb_bind_info info);
  static std::optional<std::string> joinerOf(duckdb_bind_info info);
  static std::vector<inspect::TableColumn> columnsOf(duckdb_bind_info info);

  Given given;
  std::string each;
  std::optional<std::string> joiner;
  inspect::TableQuery query; ///< with all of them
  std::vector<duckdb_type> types{};
  bool hasFile = false; ///< the file's name is the last column
};

std::vector<inspect::TableColumn> TableCall::columnsOf(duckdb_bind_info info)
{
  const Value given = named(info, "columns");
  if (!given || given.id() != DUCKDB_TYPE_STRUCT)
  {
    throw inspect::Error("columns := {'name': 'path', ...} says what the columns are");
  }
  std::vector<inspect::TableColumn> columns;
  for (idx_t i = 0; i < duckdb_struct_type_child_count(given.type()); ++i)
  {
    const Value path(duckdb_get_struct_child(given.get(), i));
    inspect::TableColumn column{Value::taken(duckdb_struct_type_child_name(given.type(), i)), {}};
    if (!path || path.id() != DUCKDB_TYPE_VARCHAR)
    {
      throw inspect::Error("columns: the path of '" + column.name + "' is no text");
    }
    column.path = path.text();
    columns.push_back(std::move(column));
  }
  return columns;
}

std::string TableCall::textOf(duckdb_bind_info info)
{
  const Value path = named(info, "each");
  if (!path)
  {
    throw inspect::Error("each := 'path' says which nodes are the rows, for instance '/system'");
  }
  return path.text();
}

std::optional<std::string> TableCall::joinerOf(duckdb_bind_info info)
{
  const Value text = named(info, "join");
  return text ? std::optional(text.text()) : std::nullopt;
}

/// The rows of one file.
class FileRows
{
public:
  FileRows(const Given& given, const inspect::TableQuery& query, const std::string& file)
      : name(file), document_(given.open(file)),
        reader_(document_.source(), document_.form(), query, {.onDamage = given.onDamage}) {}

  /// The next rows; false behind the last. Throws Error at damage, unless that is skipped.
  bool next(Table& rows, uint64_t count)
  {
    const bool more = reader_.next(rows, count);
    if (!more && reader_.stopped())
    {
      throw inspect::Error(*reader_.stopped());
    }
    Given::requireLength(name, document_);
    return more;
  }

  std::string name;

private:
  inspect::Document document_;
  inspect::TableReader reader_;
};

/// How many threads the engine has now; 1 where it does not say.
int64_t threadsOf(duckdb_connection connection)
{
  int64_t threads = 1;
  duckdb_result result{};
  if (duckdb_query(connection, "SELECT current_setting('threads')::BIGINT", &result) == DuckDBSuccess)
  {
    duckdb_data_chunk chunk = duckdb_fetch_chunk(result);
    if (chunk != nullptr && duckdb_data_chunk_get_size(chunk) == 1)
    {
      threads = *static_cast<const int64_t*>(duckdb_vector_get_data(duckdb_data_chunk_get_vector(chunk, 0)));
    }
    duckdb_destroy_data_chunk(&chunk);
  }
  duckdb_destroy_result(&result);
  return threads;
}

/// By how many threads the types of the columns are found: as many as asked for, or as the engine had when it loaded
/// the extension.
unsigned threadsFor(duckdb_bind_info info)
{
  const Value given = named(info, "threads");
  const int64_t threads =
      given ? duckdb_get_int64(given.get()) : *static_cast<const int64_t*>(duckdb_bind_get_extra_info(info));
  if (threads < 1)
  {
    throw inspect::Error("threads is 1 or more");
  }
  constexpr int64_t most = 256;
  return static_cast<unsigned>(std::min(threads, most));
}

void bindTable(duckdb_bind_info info)
{
  guarded(info, duckdb_bind_set_error, [&] {
    auto call = std::make_unique<TableCall>(info);
    TableShape shape = shapeOf(call->given, call->query, threadsFor(info));
    call->types = std::move(shape.types);
    for (size_t i = 0; i < call->types.size(); ++i)
    {
      duckdb_bind_add_result_column(info, call->query.columns()[i].name.c_str(), Type(call->types[i]).get());
    }
    const Value filename = named(info, "filename");
    call->hasFile = filename && duckdb_get_bool(filename.get());
    if (call->hasFile)
    {
      duckdb_bind_add_result_column(info, "filename", Type(DUCKDB_TYPE_VARCHAR).get());
    }
    duckdb_bind_set_cardinality(info, shape.rows, true);
    duckdb_bind_set_bind_data(info, call.release(), destroy<TableCall>);
  });
}

constexpr size_t kFileColumn = ~size_t{0};

/// What the threads of one scan share.
struct TableScan
{
  TableScan(const TableCall& bound, duckdb_init_info info);

  const TableCall& call;
  std::vector<size_t> wanted{};               ///< columns of the call; kFileColumn
  std::vector<size_t> places{};               ///< of the wanted columns in `query`
  std::optional<inspect::TableQuery> query{}; ///< with the columns alone that are wanted
  Tasks tasks;
};

TableScan::TableScan(const TableCall& bound, duckdb_init_info info)
    : call(bound), tasks(bound.given, [this](inspect::ByteSource& source, const inspect::PlanOptions& options) {
        return inspect::planTable(source, *query, options);
      })
{
  std::vector<inspect::TableColumn> columns;
  for (idx_t i = 0; i < duckdb_init_get_column_count(info); ++i)
  {
    const idx_t column = duckdb_init_get_column_index(info, i);
    const bool isOne = column < call.types.size();
    wanted.push_back(isOne ? static_cast<size_t>(column) : kFileColumn);
    places.push_back(columns.size());
    if (isOne)
    {
      columns.push_back(call.query.columns()[column]);
    }
  }
  query.emplace(call.queryOf(std::move(columns)));
}

/// What one thread reads.
struct TableThread
{
  std::string name{};                          ///< of the file at hand
  std::optional<inspect::Document> document{}; ///< of which parts are read
  std::unique_ptr<FileRows> file{};            ///< read as a whole
  std::optional<Table> rows{};
  uint64_t row = 0; ///< the next one of `rows`
};

void initTable(duckdb_init_info info)
{
  guarded(info, duckdb_init_set_error, [&] {
    const auto& call = *static_cast<const TableCall*>(duckdb_init_get_bind_data(info));
    auto scan = std::make_unique<TableScan>(call, info);
    duckdb_init_set_max_threads(info, scan->tasks.count());
    duckdb_init_set_init_data(info, scan.release(), destroy<TableScan>);
  });
}

void initTableThread(duckdb_init_info info)
{
  guarded(info, duckdb_init_set_error, [&] {
    duckdb_init_set_init_data(info, std::make_unique<TableThread>().release(), destroy<TableThread>);
  });
}

/// All rows of a part. It is read once more where the parts before it do not lead to it.
void readPart(const TableScan& scan, const Task& task, TableThread& thread)
{
  if (!thread.document || thread.name != task.file)
  {
    thread.document.emplace(scan.call.given.open(task.file));
  }
  try
  {
    for (;;)
    {
      thread.rows.emplace(*scan.query);
      inspect::TableReader reader(thread.document->source(), *scan.query, task.parted->part(task.part),
                                  {.onDamage = scan.call.given.onDamage});
      while (reader.next(*thread.rows))
      {
      }
      Given::requireLength(task.file, *thread.document);
      const auto end = reader.stopped() ? inspect::PartEnd{} : reader.end();
      const bool isSure = task.parted->settle(task.part, 0, {}, end).has_value();
      if (isSure && reader.stopped())
      {
        throw inspect::Error(*reader.stopped());
      }
      if (isSure)
      {
        return;
      }
    }
  }
  catch (...)
  {
    task.parted->fail(std::current_exception());
    throw;
  }
}

/// Begins with the next file, or reads a part of one; false where none is left.
bool begin(TableScan& scan, TableThread& thread)
{
  const std::optional<Task> task = scan.tasks.next();
  if (!task)
  {
    return false;
  }
  if (task->parted != nullptr)
  {
    readPart(scan, *task, thread);
  }
  else
  {
    thread.file = std::make_unique<FileRows>(scan.call.given, *scan.query, task->file);
  }
  thread.name = task->file;
  return true;
}

/// Whether there are rows that have not been handed out.
bool advance(TableScan& scan, TableThread& thread)
{
  constexpr uint64_t batch = 4096;
  while (!thread.rows || thread.row == thread.rows->rows())
  {
    thread.rows.reset();
    thread.row = 0;
    if (thread.file == nullptr)
    {
      if (!begin(scan, thread))
      {
        return false;
      }
      continue;
    }
    thread.rows.emplace(*scan.query);
    if (!thread.file->next(*thread.rows, batch))
    {
      thread.file.reset();
      thread.rows.reset();
    }
  }
  return true;
}

[[noreturn]] void failAsChanged(const std::string& file)
{
  throw inspect::Error(
      inspect::Problem{.file = file, .sentence = "changed while the query ran: its values have other types now"});
}

/// Puts a cell into a column whose type holds it: the types are those of all cells.
void putCell(Vector& to, duckdb_type type, idx_t row, const Cell& cell, std::string& buffer, const std::string& file)
{
  const bool isSigned = cell.kind == CellKind::signed64;
  const uint64_t sign = isSigned && (cell.number >> 63U) != 0 ? ~uint64_t{0} : 0;
  const bool is64 = isSigned || cell.kind == CellKind::unsigned64;
  const bool is128 = cell.kind == CellKind::signed128 || cell.kind == CellKind::unsigned128;
  bool fits = true;
  if (cell.kind == CellKind::missing)
  {
    to.putNull(row);
    return;
  }
  switch (type)
  {
  case DUCKDB_TYPE_UBIGINT:
    fits = cell.kind == CellKind::unsigned64;
    to.put(row, cell.number);
    break;
  case DUCKDB_TYPE_BIGINT:
    fits = isSigned || (is64 && (cell.number >> 63U) == 0);
    to.put(row, cell.number);
    break;
  case DUCKDB_TYPE_TIMESTAMP_NS:
    fits = cell.kind == CellKind::time;
    to.put(row, cell.number);
    break;
  case DUCKDB_TYPE_HUGEINT:
    fits = is64 || cell.kind == CellKind::signed128 || (is128 && (cell.high >> 63U) == 0);
    to.putHuge(row, cell.number, is64 ? sign : cell.high);
    break;
  case DUCKDB_TYPE_UHUGEINT:
    fits = cell.kind == CellKind::unsigned64 || cell.kind == CellKind::unsigned128;
    to.putHuge(row, cell.number, cell.high);
    break;
  case DUCKDB_TYPE_BLOB:
    fits = cell.kind == CellKind::bytes;
    to.putBytes(row, cell.text);
    break;
  default:
    if (cell.kind == CellKind::text)
    {
      to.putText(row, cell.text);
      break;
    }
    buffer.clear();
    inspect::appendCell(buffer, cell);
    to.putText(row, buffer);
  }
  if (!fits)
  {
    failAsChanged(file);
  }
}

void fill(const TableScan& scan, TableThread& thread, duckdb_data_chunk output)
{
  const uint64_t count = std::min<uint64_t>(duckdb_vector_size(), thread.rows->rows() - thread.row);
  std::string buffer;
  for (size_t i = 0; i < scan.wanted.size(); ++i)
  {
    Vector to(output, i);
    for (idx_t row = 0; row < count; ++row)
    {
      if (scan.wanted[i] == kFileColumn)
      {
        to.putText(row, thread.name);
        continue;
      }
      const Cell cell = thread.rows->cell(scan.places[i], thread.row + row);
      putCell(to, scan.call.types[scan.wanted[i]], row, cell, buffer, thread.name);
    }
  }
  thread.row += count;
  duckdb_data_chunk_set_size(output, count);
}

void scanTable(duckdb_function_info info, duckdb_data_chunk output)
{
  guarded(info, duckdb_function_set_error, [&] {
    auto& scan = *static_cast<TableScan*>(duckdb_function_get_init_data(info));
    auto& thread = *static_cast<TableThread*>(duckdb_function_get_local_init_data(info));
    if (advance(scan, thread))
    {
      fill(scan, thread, output);
    }
    else
    {
      duckdb_data_chunk_set_size(output, 0);
    }
  });
}

} // namespace

void registerTable(duckdb_connection connection)
{
  auto threads = std::make_unique<int64_t>(threadsOf(connection));
  const Type any(DUCKDB_TYPE_ANY);
  const Type text(DUCKDB_TYPE_VARCHAR);
  const Type truth(DUCKDB_TYPE_BOOLEAN);
  const Type number(DUCKDB_TYPE_BIGINT);
  duckdb_table_function function = duckdb_create_table_function();
  duckdb_table_function_set_name(function, "read_tav_table");
  addParameters(function);
  duckdb_table_function_add_named_parameter(function, "each", text.get());
  duckdb_table_function_add_named_parameter(function, "columns", any.get());
  duckdb_table_function_add_named_parameter(function, "join", text.get());
  duckdb_table_function_add_named_parameter(function, "filename", truth.get());
  duckdb_table_function_add_named_parameter(function, "threads", number.get());
  duckdb_table_function_set_extra_info(function, threads.release(), destroy<int64_t>);
  duckdb_table_function_set_bind(function, bindTable);
  duckdb_table_function_set_init(function, initTable);
  duckdb_table_function_set_local_init(function, initTableThread);
  duckdb_table_function_set_function(function, scanTable);
  duckdb_table_function_supports_projection_pushdown(function, true);
  duckdb_register_table_function(connection, function);
  duckdb_destroy_table_function(&function);
}

} // namespace tav::sql
