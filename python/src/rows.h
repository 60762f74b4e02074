/// The nodes of streams as rows, column by column.
#pragma once

#include <cstddef>
#include <memory>
#include <utility>

#include "python/src/reader.h"
#include "tav/inspect/nodeColumns.hpp"

namespace tav::python
{

/// Rows of nodes, and of what sort their numbers are. What does not fit a word is left in the stream, which stays as
/// long as the rows.
class Rows
{
public:
  explicit Rows(std::shared_ptr<Opened> opened)
      : opened_(std::move(opened)) {}

  /// Reads all streams. Called without the interpreter.
  void fill(inspect::ByteSource& source, bool withPaths, Pass& pass);

  const inspect::Dictionary& dictionary() const { return opened_->input.dictionary; }

  inspect::NodeColumns columns{};
  bool hasNegative = false;
  bool hasUpper = false; ///< numbers that only unsigned 64 bits hold
  bool hasWide = false;

private:
  void seeNumbers(size_t from);

  std::shared_ptr<Opened> opened_;
};

/// Whether a row's number is the two's complement of what may be negative.
inline bool isSignedNumber(uint16_t type)
{
  return tav::detail::isIntegerType(type) && (type - TAV_TYPE_UINT8) % 2 != 0;
}

} // namespace tav::python
