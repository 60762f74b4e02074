/// W2table: a table of all leaves of the workload, a row each application. What it costs above the walk that it takes.
#include <span>
#include <string>
#include <vector>

#include "bench/library/plain.hpp"
#include "tav/inspect/table.hpp"

using namespace snapshot;

namespace
{

using tav::inspect::ByteSource;
using tav::inspect::CellKind;
using tav::inspect::Table;
using tav::inspect::TableColumn;
using tav::inspect::TableQuery;

TableQuery leavesOf(const char* each)
{
  std::vector<TableColumn> columns;
  for (unsigned metric = 0; metric < kMetrics; ++metric)
  {
    columns.push_back({nameOf(static_cast<uint16_t>(kMetricId + metric)), '#' + std::to_string(kMetricId + metric)});
  }
  return {each, columns};
}

/// Whether every number of the workload stands in its cell.
bool holdsAll(const Table& table)
{
  bool holds = table.rows() == size_t{kDatabases} * kApplications;
  for (size_t i = 0; holds && i < kLeaves; ++i)
  {
    const Leaf& leaf = model().leaves[i];
    const tav::inspect::Cell cell = table.cell(i % kMetrics, i / kMetrics);
    const bool isNumber = leaf.type == 'u' || leaf.type == 'U';
    const bool isText = leaf.type == 's' && cell.text == std::string_view(model().bytes(leaf), leaf.size);
    holds = isNumber ? cell.number == leaf.value : leaf.type == 't' ? cell.kind == CellKind::time
                                                                    : isText;
  }
  return holds;
}

void fill(benchmark::State& state, const char* each, bool onlyWalker)
{
  const TableQuery query = leavesOf(each);
  ByteSource source("workload",
                    std::span(reinterpret_cast<const uint8_t*>(library::encoded()), library::encodedSize()));
  const auto read = [&] { return readTable(source, {}, query, {.onlyWalker = onlyWalker}); };
  if (!holdsAll(read()))
  {
    state.SkipWithError("not the values of the workload");
    return;
  }
  perTree(state, [&]() -> size_t { return read().rows() == 0 ? 0 : library::encodedSize(); });
}
BENCHMARK_CAPTURE(fill, names, "/#5000/#4000/*/*", false)->Name("W2table/tavTable");
BENCHMARK_CAPTURE(fill, condition, "/#5000/#4000/*/*[#1000]", false)->Name("W2table/tavTable_condition");
BENCHMARK_CAPTURE(fill, walker, "/#5000/#4000/*/*", true)->Name("W2table/tavTable_walker_alone");

} // namespace
