/// @file table.hpp
/// Tables: a row for each node that a path leads to, columns by paths from there.
#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "tav/inspect/api.hpp"
#include "tav/inspect/damageWatch.hpp"
#include "tav/inspect/dictionary.hpp"
#include "tav/inspect/document.hpp"
#include "tav/inspect/plan.hpp"
#include "tav/inspect/problem.hpp"
#include "tav/inspect/source.hpp"
#include "tav/inspect/walker.hpp"

namespace tav::inspect
{

struct TableColumn
{
  std::string name{};
  std::string path{}; ///< from the row's node
};

struct CompiledQuery;

/// What a table is made of: the rows' path, and the columns. Read once; usable by any number of readers and threads.
class TableQuery
{
public:
  /// `joiner`: what stands between the values where a column's path leads to several, which makes the column text;
  /// without it the first value is taken. Paths that begin with no slash begin, that of the rows, at the roots, those
  /// of the columns at the row's node. A group that a column's path leads to has no value and is passed over.
  /// `dictionary`: names of own elements in paths.
  /// @throws Error as pathOf
  TAV_INSPECT_API TableQuery(std::string_view each, std::vector<TableColumn> columns,
                             std::optional<std::string> joiner = {}, const Dictionary& dictionary = {});

  TAV_INSPECT_API const std::vector<TableColumn>& columns() const noexcept;

  /// Whether the rows in a root follow from this root alone, so that parts of a file that begin with roots can be read
  /// apart and appended to each other.
  TAV_INSPECT_API bool isDivisible() const noexcept;

  /// Of the library's own use.
  const CompiledQuery& compiled() const noexcept { return *compiled_; }

private:
  std::shared_ptr<const CompiledQuery> compiled_;
};

/// What stands in a cell, and what a column is of.
enum class CellKind : uint8_t
{
  missing, ///< of a cell alone
  unsigned64,
  signed64,
  unsigned128,
  signed128,
  time, ///< nanoseconds since 1970 in UTC
  text,
  bytes
};

/// One cell. Valid as long as its table, until that is appended to.
struct Cell
{
  CellKind kind = CellKind::missing;
  uint64_t number = 0;     ///< of numbers and times, the lower half of those with 128 bits; two's complement
  uint64_t high = 0;       ///< the upper half of these
  std::string_view text{}; ///< of texts as they are, and of bytes as they are stored
};

/// Whole numbers in decimal, times as ISO 8601 in UTC with microseconds, texts as they are, bytes in hexadecimal; empty
/// when missing.
TAV_INSPECT_API std::string cellText(const Cell& cell);

/// The same, appended.
TAV_INSPECT_API void appendCell(std::string& to, const Cell& cell);

class TableChunk;

/// Rows of columns. A column's type follows from the values in it:
///
/// * numbers of unsigned element types are unsigned64, unsigned128 where one has 128 bits;
/// * with one of a signed type among them they are signed64 where all fit, else signed128 where all fit, else text;
/// * times, texts and bytes are what they are; any of them with another kind makes the column text, with each value as
///   cellText writes it; cells keep their own kinds;
/// * a column without a value is text.
///
/// Times that nanoseconds in 64 bits do not hold are texts, and so are arrays of words. What has no value for its type
/// or its size is bytes. Used by one thread at a time; copies share the cells.
class Table
{
public:
  TAV_INSPECT_API explicit Table(const TableQuery& query);
  TAV_INSPECT_API ~Table();
  TAV_INSPECT_API Table(const Table&);
  TAV_INSPECT_API Table& operator=(const Table&);
  TAV_INSPECT_API Table(Table&&) noexcept;
  TAV_INSPECT_API Table& operator=(Table&&) noexcept;

  const std::vector<TableColumn>& columns() const noexcept { return query_.columns(); }
  uint64_t rows() const noexcept { return starts_.back(); }
  TAV_INSPECT_API Cell cell(size_t column, uint64_t row) const;
  /// Looks at the column's cells.
  TAV_INSPECT_API CellKind type(size_t column) const;

  /// Puts the rows of another table of the same query behind these. Takes the cells over as they are.
  TAV_INSPECT_API void append(Table other);
  /// The same of a reader's result; of the library's own use, as is `chunks`.
  TAV_INSPECT_API void append(std::shared_ptr<const TableChunk> chunk);
  const std::vector<std::shared_ptr<const TableChunk>>& chunks() const noexcept { return chunks_; }

private:
  TableQuery query_;
  std::vector<std::shared_ptr<const TableChunk>> chunks_{};
  std::vector<uint64_t> starts_{0}; ///< the first row of each chunk, and behind the last one
};

class ColumnType;

/// The types that columns have over any number of tables of one query, which need not be kept for that.
class TableTypes
{
public:
  TAV_INSPECT_API explicit TableTypes(const TableQuery& query);
  TAV_INSPECT_API ~TableTypes();
  TableTypes(const TableTypes&) = delete;
  TableTypes& operator=(const TableTypes&) = delete;

  /// Looks at the cells of a table.
  TAV_INSPECT_API void see(const Table& table);
  /// As Table::type of all tables so far, one behind the other.
  TAV_INSPECT_API CellKind type(size_t column) const;
  /// Whether an unsigned number of 128 bits is among the cells that a signed one does not hold.
  TAV_INSPECT_API bool exceedsSigned(size_t column) const;

private:
  std::vector<ColumnType> types_;
};

struct TableOptions
{
  OnDamage onDamage = OnDamage::stop;
  WalkStart start{};              ///< where reading begins: at a root
  uint64_t end = ~uint64_t{0};    ///< roots that begin there or behind are not read
  bool onlyWalker = false;        ///< takes every node by the Walker's steps: slow, for comparisons
  DamageWatch::Sink passedOver{}; ///< is told of the damage that `skip` passes over
  /// `readTable` works on a source of 4 MiB or more with so many threads, with the same result. All callbacks are
  /// called by the caller's. Where a path asks for more than names on the way down, each root is one thread's work;
  /// where it asks for more than one root, all is.
  unsigned threads = 1;
  uint64_t partBytes = 0;                   ///< how long the parts are that threads take; 0: by the source's size
  uint64_t batchRows = 65536;               ///< that `readTable` hands out at once, or more where they come together
  std::function<void(uint64_t)> progress{}; ///< with several threads: all before this offset was read
};

/// Reads rows in one pass over a source, every stream in it in its own form. Memory: the rows that are not handed out
/// yet, and what is read at once, at most 16 MiB of a file. Rows come in the order in which their nodes begin; those
/// inside of another row's node wait for that to end.
///
/// What lies in closed groups whose every node is as a writer makes it is read by the exact steps, all else by the
/// Walker, with the same result. Used by one thread.
class TableReader
{
public:
  /// `source` outlives the reader.
  TAV_INSPECT_API TableReader(ByteSource& source, const Form& form, const TableQuery& query,
                              const TableOptions& options = {});
  /// The rows that begin in a part of `planTable`; the options' start and end are of no account. Throws Error for a
  /// part in which such rows cannot be told from those before and behind it.
  TAV_INSPECT_API TableReader(ByteSource& source, const TableQuery& query, const Part& part,
                              const TableOptions& options = {});
  TAV_INSPECT_API ~TableReader();
  TableReader(const TableReader&) = delete;
  TableReader& operator=(const TableReader&) = delete;

  /// Reads on until there are at least `rows` more, and as many as come together; false when there are none any more.
  /// Throws Error when the source does.
  TAV_INSPECT_API bool next(Table& out, uint64_t rows = kBatch);

  /// The damage at which reading has stopped. The rows before it have been handed out: those whose nodes had ended.
  TAV_INSPECT_API const std::optional<Problem>& stopped() const noexcept;

  /// Of a part, when `next` has returned false and nothing has stopped it: where it ended.
  TAV_INSPECT_API PartEnd end() const;

  static constexpr uint64_t kBatch = 65536;

private:
  class State;
  std::unique_ptr<State> state_;
};

/// Hands all rows of a source out in pieces, in their order. Returns the damage at which reading has stopped. Throws
/// Error when the source does, and what the callbacks throw.
TAV_INSPECT_API std::optional<Problem> readTable(ByteSource& source, const Form& form, const TableQuery& query,
                                                 const TableOptions& options,
                                                 const std::function<void(const Table&)>& rows);

/// Cuts a file as `plan` does, only where a table can be read apart: the rows behind follow from the bytes behind. Rows
/// by names are cut anywhere outside of rows, others between roots, or not at all.
TAV_INSPECT_API std::vector<Part> planTable(ByteSource& source, const TableQuery& query,
                                            const PlanOptions& options = {});

/// All rows of a source. Throws Error at damage unless it is skipped.
TAV_INSPECT_API Table readTable(ByteSource& source, const Form& form, const TableQuery& query,
                                const TableOptions& options = {});

/// The same of a document, which keeps the account of what is passed over.
TAV_INSPECT_API Table readTable(const Document& document, const TableQuery& query,
                                OnDamage onDamage = OnDamage::stop);

} // namespace tav::inspect
