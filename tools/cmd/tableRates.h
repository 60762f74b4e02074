/// Counters as what they counted in a second.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "tools/cmd/tableRows.h"

namespace tav::tool
{

/// Follows the rows of a table, file after file, and puts in place of each counter's value the difference to the last
/// row that had one, by the seconds between the two. The time of a row is its first one.
///
/// There is no rate, and the cell is empty, where it is the counter's first value, where its row has no time or none
/// later than that one's, and where the value is less: then what counts has begun anew, and so does the series.
class Rates
{
public:
  explicit Rates(const std::vector<OutColumn>& columns);

  void apply(OutRow& row);

private:
  struct Last
  {
    Cell value{};
    int64_t time = 0;
  };

  std::vector<size_t> counters_{};
  std::vector<std::optional<Last>> last_;
};

} // namespace tav::tool
