/// The columns of read_tav.
#pragma once

#include <array>
#include <cstdint>
#include <string>
#include <unordered_map>
#include <utility>
#include <vector>

#include "duckdb/src/vectors.h"
#include "tav/inspect/dictionary.hpp"
#include "tav/inspect/nodeColumns.hpp"

namespace tav::sql
{

struct NodeColumn
{
  const char* name;
  duckdb_type type;
};

enum NodeColumnNumber : size_t
{
  kFile,
  kOrd,
  kParent,
  kDepth,
  kOffset,
  kSize,
  kId,
  kTag,
  kType,
  kKey,
  kNumber,
  kText,
  kTime,
  kBytes,
  kPath
};

inline constexpr std::array<NodeColumn, 15> nodeColumns{{{"file", DUCKDB_TYPE_VARCHAR},
                                                         {"ord", DUCKDB_TYPE_UBIGINT},
                                                         {"parent", DUCKDB_TYPE_UBIGINT},
                                                         {"depth", DUCKDB_TYPE_UINTEGER},
                                                         {"offset", DUCKDB_TYPE_UBIGINT},
                                                         {"size", DUCKDB_TYPE_UBIGINT},
                                                         {"id", DUCKDB_TYPE_USMALLINT},
                                                         {"tag", DUCKDB_TYPE_VARCHAR},
                                                         {"type", DUCKDB_TYPE_VARCHAR},
                                                         {"key", DUCKDB_TYPE_USMALLINT},
                                                         {"number", DUCKDB_TYPE_HUGEINT},
                                                         {"text", DUCKDB_TYPE_VARCHAR},
                                                         {"time", DUCKDB_TYPE_TIMESTAMP_NS},
                                                         {"bytes", DUCKDB_TYPE_BLOB},
                                                         {"path", DUCKDB_TYPE_VARCHAR}}};

/// The rows that a thread has read.
struct NodeRows
{
  uint64_t first = 0;            ///< of the columns' first row, in the file
  std::vector<int64_t> around{}; ///< the rows of the groups around a part
  bool isPart = false;           ///< parents in the columns count from its first row
  const inspect::NodeColumns* columns = nullptr;
  std::string file{};
};

/// Names that repeat, as they stand in the chunk that is filled.
class NodeNames
{
public:
  explicit NodeNames(inspect::Dictionary dictionary)
      : dictionary_(std::move(dictionary)) {}

  /// Forgets what stands in the chunk before.
  void begin();
  void putTag(Vector& to, idx_t row, uint16_t id);
  void putType(Vector& to, idx_t row, uint16_t type);

private:
  /// Where a name was put in this chunk.
  struct Last
  {
    uint32_t chunk = 0;
    idx_t row = 0;
  };
  static constexpr size_t kNumbers = size_t{1} << 16U; ///< of ids, and of types

  /// `nameOf`: the name of a number, empty for none.
  template<class NameOf>
  void putName(std::vector<Last>& known, Vector& to, idx_t row, uint16_t number, const NameOf& nameOf) const;

  inspect::Dictionary dictionary_;
  uint32_t chunk_ = 0;
  std::vector<Last> tags_{};
  std::vector<Last> types_{};
};

/// Fills a column of a chunk with so many rows.
void fillColumn(Vector& to, size_t column, const NodeRows& rows, size_t from, size_t count, NodeNames& names);

} // namespace tav::sql
