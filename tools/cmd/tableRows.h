/// Rows of a table on their way out, and the forms of text that they are written in.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "tav/inspect.hpp"
#include "tools/shell/names.h"
#include "tools/shell/options.h"
#include "tools/shell/output.h"

namespace tav::tool
{

/// What stands in a cell that is written.
struct OutCell
{
  Cell cell{};
  std::string own{};   ///< a text made here
  bool isOwn = false;  ///< it stands for the cell
  bool isText = false; ///< of one made here: else it is a number
};

using OutRow = std::vector<OutCell>;

/// A column that is written.
struct OutColumn
{
  std::string name{};
  std::string help{};     ///< what it is: its path; empty for what is no column of the table
  std::string unit{};     ///< of the dictionary; empty: none is known
  bool isCounter = false; ///< its values only rise, until what counts begins anew
};

/// Takes rows, all with the same columns.
class RowWriter
{
public:
  RowWriter() = default;
  RowWriter(const RowWriter&) = delete;
  RowWriter& operator=(const RowWriter&) = delete;
  virtual ~RowWriter() = default;

  virtual void begin(const std::vector<OutColumn>& columns) = 0;
  virtual void row(const OutRow& row) = 0;
  virtual void end() {}
};

/// What the invocation's --format asks for. `out` outlives it.
std::unique_ptr<RowWriter> makeRowWriter(const Invocation& invocation, Output& out);

} // namespace tav::tool
