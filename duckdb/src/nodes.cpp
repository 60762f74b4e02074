// read_tav: a row for each node.
#include <algorithm>
#include <array>
#include <exception>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "duckdb/src/nodeFill.h"
#include "duckdb/src/parts.h"

namespace tav::sql
{

namespace
{

using inspect::NodeColumns;

struct NodesCall
{
  explicit NodesCall(duckdb_bind_info info)
      : given(info) {}

  Given given;
};

/// How many rows there are, about: what a node takes of most streams. The engine sees by that which side of a join is
/// the smaller one.
uint64_t estimated(const std::vector<std::string>& files)
{
  constexpr uint64_t typical = 24;
  uint64_t rows = 1;
  for (const std::string& file : files)
  {
    rows += sizeOf(file) / typical;
  }
  return rows;
}

void bindNodes(duckdb_bind_info info)
{
  guarded(info, duckdb_bind_set_error, [&] {
    auto call = std::make_unique<NodesCall>(info);
    for (const NodeColumn& column : nodeColumns)
    {
      duckdb_bind_add_result_column(info, column.name, Type(column.type).get());
    }
    duckdb_bind_set_cardinality(info, estimated(call->given.files), false);
    duckdb_bind_set_bind_data(info, call.release(), destroy<NodesCall>);
  });
}

std::vector<inspect::Part> planNodes(inspect::ByteSource& source, const inspect::PlanOptions& options)
{
  return inspect::plan(source, options);
}

/// What the threads of one scan share.
struct NodeScan
{
  NodeScan(const NodesCall& call, std::vector<size_t> columns)
      : given(call.given),
        wanted(std::move(columns)), options{.onDamage = given.onDamage,
                                            .values = wants(kNumber) || wants(kText) || wants(kTime) || wants(kBytes),
                                            .paths = wants(kPath)},
        tasks(given, options.paths ? Tasks::Plan() : planNodes)
  {
  }

  bool wants(size_t column) const { return std::find(wanted.begin(), wanted.end(), column) != wanted.end(); }

  const Given& given;
  std::vector<size_t> wanted;
  inspect::NodeReaderOptions options;
  Tasks tasks;
};

/// What one thread reads.
class NodeThread
{
public:
  explicit NodeThread(const inspect::Dictionary& dictionary)
      : names_(dictionary) {}

  /// Whether there are rows that have not been handed out.
  bool advance(NodeScan& scan);
  void fill(const NodeScan& scan, duckdb_data_chunk output);

private:
  void open(const NodeScan& scan, const std::string& file);
  void readPart(const NodeScan& scan, const Task& task);
  void readWhole();

  std::optional<inspect::Document> document_{};
  std::string file_{};
  std::optional<inspect::NodeReader> reader_{}; ///< of a whole file
  NodeColumns columns_{};
  NodeRows rows_{};
  size_t row_ = 0; ///< the next one of the columns
  NodeNames names_;
};

void NodeThread::open(const NodeScan& scan, const std::string& file)
{
  if (!document_ || file != file_)
  {
    reader_.reset();
    document_.emplace(scan.given.open(file));
    file_ = file;
  }
}

void NodeThread::readPart(const NodeScan& scan, const Task& task)
{
  try
  {
    for (;;)
    {
      columns_.clear();
      inspect::NodeReader reader(document_->source(), task.parted->part(task.part), scan.options);
      reader.next(columns_, ~size_t{0});
      Given::requireLength(file_, *document_);
      const std::vector<int64_t> open = reader.open();
      auto before = task.parted->settle(task.part, columns_.count(), open, reader.end());
      if (before && reader.stopped())
      {
        throw inspect::Error(*reader.stopped());
      }
      if (before)
      {
        rows_ = {.first = before->rows, .around = std::move(before->around), .isPart = true};
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

void NodeThread::readWhole()
{
  rows_.first += columns_.count();
  columns_.clear();
  const bool more = reader_->next(columns_, duckdb_vector_size());
  Given::requireLength(file_, *document_);
  if (more)
  {
    return;
  }
  if (reader_->stopped())
  {
    throw inspect::Error(*reader_->stopped());
  }
  reader_.reset();
}

bool NodeThread::advance(NodeScan& scan)
{
  while (row_ == columns_.count())
  {
    row_ = 0;
    if (reader_)
    {
      readWhole();
      continue;
    }
    columns_.clear();
    const std::optional<Task> task = scan.tasks.next();
    if (!task)
    {
      return false;
    }
    open(scan, task->file);
    rows_ = {};
    if (task->parted != nullptr)
    {
      readPart(scan, *task);
    }
    else
    {
      reader_.emplace(document_->source(), document_->form(), scan.options);
    }
  }
  return true;
}

void NodeThread::fill(const NodeScan& scan, duckdb_data_chunk output)
{
  const size_t count = std::min<size_t>(duckdb_vector_size(), columns_.count() - row_);
  rows_.columns = &columns_;
  rows_.file = file_;
  names_.begin();
  for (size_t i = 0; i < scan.wanted.size(); ++i)
  {
    if (scan.wanted[i] < nodeColumns.size())
    {
      Vector to(output, i);
      fillColumn(to, scan.wanted[i], rows_, row_, count, names_);
    }
  }
  row_ += count;
  duckdb_data_chunk_set_size(output, count);
}

void initNodes(duckdb_init_info info)
{
  guarded(info, duckdb_init_set_error, [&] {
    const auto& call = *static_cast<const NodesCall*>(duckdb_init_get_bind_data(info));
    std::vector<size_t> wanted;
    for (idx_t i = 0; i < duckdb_init_get_column_count(info); ++i)
    {
      wanted.push_back(static_cast<size_t>(duckdb_init_get_column_index(info, i)));
    }
    auto scan = std::make_unique<NodeScan>(call, std::move(wanted));
    duckdb_init_set_max_threads(info, scan->tasks.count());
    duckdb_init_set_init_data(info, scan.release(), destroy<NodeScan>);
  });
}

void initNodeThread(duckdb_init_info info)
{
  guarded(info, duckdb_init_set_error, [&] {
    const auto& call = *static_cast<const NodesCall*>(duckdb_init_get_bind_data(info));
    auto thread = std::make_unique<NodeThread>(call.given.dictionary);
    duckdb_init_set_init_data(info, thread.release(), destroy<NodeThread>);
  });
}

void scanNodes(duckdb_function_info info, duckdb_data_chunk output)
{
  guarded(info, duckdb_function_set_error, [&] {
    auto& scan = *static_cast<NodeScan*>(duckdb_function_get_init_data(info));
    auto& thread = *static_cast<NodeThread*>(duckdb_function_get_local_init_data(info));
    if (thread.advance(scan))
    {
      thread.fill(scan, output);
    }
    else
    {
      duckdb_data_chunk_set_size(output, 0);
    }
  });
}

} // namespace

void registerNodes(duckdb_connection connection)
{
  duckdb_table_function function = duckdb_create_table_function();
  duckdb_table_function_set_name(function, "read_tav");
  addParameters(function);
  duckdb_table_function_set_bind(function, bindNodes);
  duckdb_table_function_set_init(function, initNodes);
  duckdb_table_function_set_local_init(function, initNodeThread);
  duckdb_table_function_set_function(function, scanNodes);
  duckdb_table_function_supports_projection_pushdown(function, true);
  duckdb_register_table_function(connection, function);
  duckdb_destroy_table_function(&function);
}

} // namespace tav::sql
