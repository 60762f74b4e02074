#include "duckdb/src/types.h"

#include <algorithm>
#include <cstddef>
#include <exception>
#include <mutex>
#include <optional>
#include <string>
#include <system_error>
#include <thread>
#include <utility>

#include "duckdb/src/parts.h"

namespace tav::sql
{

namespace
{

using inspect::CellKind;

duckdb_type typeOf(const inspect::TableTypes& types, size_t column)
{
  switch (types.type(column))
  {
  case CellKind::unsigned64: return DUCKDB_TYPE_UBIGINT;
  case CellKind::signed64: return DUCKDB_TYPE_BIGINT;
  case CellKind::signed128: return DUCKDB_TYPE_HUGEINT;
  case CellKind::unsigned128: return types.exceedsSigned(column) ? DUCKDB_TYPE_UHUGEINT : DUCKDB_TYPE_HUGEINT;
  case CellKind::time: return DUCKDB_TYPE_TIMESTAMP_NS;
  case CellKind::bytes: return DUCKDB_TYPE_BLOB;
  default: return DUCKDB_TYPE_VARCHAR;
  }
}

/// Reads the files. All threads work together on a large one; of the others each thread takes one after the other.
class Search
{
public:
  Search(const Given& given, const inspect::TableQuery& query)
      : given_(given), query_(query), types_(query), failed_(given.files.size()) {}

  void run(unsigned threads)
  {
    for (size_t file = 0; file < given_.files.size(); ++file)
    {
      if (sizeOf(given_.files[file]) >= kLargeFile)
      {
        read(file, threads);
      }
      else
      {
        small_.push_back(file);
      }
    }
    readSmall(threads);
    if (failure_)
    {
      std::rethrow_exception(failure_);
    }
  }

  TableShape shape() const
  {
    TableShape shape{.rows = rows_};
    for (size_t i = 0; i < query_.columns().size(); ++i)
    {
      shape.types.push_back(typeOf(types_, i));
    }
    return shape;
  }

private:
  void readSmall(unsigned threads)
  {
    const size_t helpers = std::min<size_t>(threads, small_.size());
    std::vector<std::thread> running;
    running.reserve(helpers);
    try
    {
      for (size_t i = 1; i < helpers; ++i)
      {
        running.emplace_back([this] { serve(); });
      }
    }
    catch (const std::system_error&)
    {
      // The others, or this thread alone, do it all the same.
    }
    serve();
    for (std::thread& thread : running)
    {
      thread.join();
    }
  }

  void serve()
  {
    for (std::optional<size_t> file = next(); file; file = next())
    {
      read(*file, 1);
    }
  }

  std::optional<size_t> next()
  {
    const std::lock_guard lock(mutex_);
    return next_ < small_.size() ? std::optional(small_[next_++]) : std::nullopt;
  }

  /// Nothing is thrown here: what has failed is told when all files before it have been read.
  void read(size_t file, unsigned threads)
  {
    try
    {
      if (isOfNoUse(file))
      {
        return;
      }
      const std::string& name = given_.files[file];
      const inspect::Document document = given_.open(name);
      const inspect::TableOptions options{.onDamage = given_.onDamage, .threads = threads};
      const auto stopped = inspect::readTable(document.source(), document.form(), query_, options,
                                              [this](const inspect::Table& rows) { see(rows); });
      if (stopped)
      {
        throw inspect::Error(*stopped);
      }
      Given::requireLength(name, document);
    }
    catch (...)
    {
      fail(file, std::current_exception());
    }
  }

  void see(const inspect::Table& rows)
  {
    const std::lock_guard lock(mutex_);
    types_.see(rows);
    rows_ += rows.rows();
  }

  /// Whether a file before this one has failed.
  bool isOfNoUse(size_t file)
  {
    const std::lock_guard lock(mutex_);
    return file > failed_;
  }

  void fail(size_t file, std::exception_ptr failure)
  {
    const std::lock_guard lock(mutex_);
    if (file < failed_)
    {
      failed_ = file;
      failure_ = std::move(failure);
    }
  }

  const Given& given_;
  const inspect::TableQuery& query_;
  std::mutex mutex_{};
  inspect::TableTypes types_;
  uint64_t rows_ = 0;
  std::vector<size_t> small_{};
  size_t next_ = 0; ///< of `small_`
  size_t failed_;   ///< the first file that has failed
  std::exception_ptr failure_{};
};

} // namespace

TableShape shapeOf(const Given& given, const inspect::TableQuery& query, unsigned threads)
{
  Search search(given, query);
  search.run(threads);
  return search.shape();
}

} // namespace tav::sql
