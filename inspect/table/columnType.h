/// What type a column has for what is in it.
#pragma once

#include <cstddef>
#include <cstdint>

#include "inspect/table/chunk.h"

namespace tav::inspect
{

class ColumnType
{
public:
  /// Looks at a column's cells.
  void see(const TableChunk& chunk, size_t column);

  CellKind kind() const;

  /// Whether a number has more than the 38 digits that decimals of 128 bits hold.
  bool exceedsDecimal() const { return exceedsDecimal_; }

  /// Whether an unsigned number of 128 bits does not fit into a signed one.
  bool exceedsSigned() const { return exceedsSigned_; }

private:
  void seeWide(const Cell& cell);
  bool has(CellKind kind) const { return (kinds_ >> static_cast<unsigned>(kind) & 1U) != 0; }

  unsigned kinds_ = 0;  ///< a bit a kind
  uint64_t most64_ = 0; ///< the greatest of the unsigned ones with 64 bits
  bool exceedsSigned_ = false;
  bool exceedsDecimal_ = false;
};

} // namespace tav::inspect
