/// A table as a page of metrics that monitoring systems read: the OpenMetrics text format.
#pragma once

#include <set>
#include <string>
#include <vector>

#include "tools/cmd/tableRows.h"

namespace tav::tool
{

/// Numbers and times are samples, a family a column; texts and bytes are the labels of their row's samples. Nothing is
/// written before all is known to be in order.
class MetricsWriter final : public RowWriter
{
public:
  explicit MetricsWriter(Output& out)
      : out_(out) {}

  void begin(const std::vector<OutColumn>& columns) override;
  void row(const OutRow& row) override;
  void end() override;

private:
  std::string labelsOf(const OutRow& row) const;
  std::string headOf(size_t column) const;

  Output& out_;
  std::vector<OutColumn> columns_{};
  std::vector<std::string> families_{}; ///< the names without the ending of counters
  std::vector<std::string> samples_{};
  std::set<std::string> seen_{}; ///< labels of rows
};

} // namespace tav::tool
