/// Tables of arbitrary bytes: by the exact steps and by the Walker they are the same, at damage, too; rows that a path
/// finds are as many as there are rows; the columns can be handed out.
#include <span>
#include <string>
#include <vector>

#include "fuzz/input.h"
#include "tav/inspect.hpp"

namespace
{

using fuzz::demand;
using namespace tav::inspect;

struct Asked
{
  const char* each;
  std::vector<TableColumn> columns;
  std::optional<std::string> joiner{};
};

const std::vector<Asked> kAsked = {
    {"//*", {{"own", "."}, {"number", "cpuOnline"}, {"any", "*/*"}}},
    {"/*/*", {{"any", "*"}, {"name", "hostName"}, {"above", "../hostName"}}},
    {"//host[*]", {{"any", "*"}, {"deep", ".//cpuOnline"}}},
    {"//*", {{"own", "."}, {"any", "*"}, {"both", "host/* | *"}}, ", "},
};

struct Found
{
  std::string cells{};
  std::string told{};
  uint64_t rows = 0;
};

Found read(ByteSource& source, const Form& form, const TableQuery& query, OnDamage onDamage, bool onlyWalker)
{
  Found found;
  Table table(query);
  TableReader reader(source, form, query,
                     {.onDamage = onDamage, .onlyWalker = onlyWalker, .passedOver = [&](const PassedOver& passed) {
                        found.told += std::to_string(passed.offset) + passed.reason + '\n';
                      }});
  while (reader.next(table, 5)) demand(table.rows() > found.rows, "a batch without rows"), found.rows = table.rows();
  if (reader.stopped())
  {
    found.told += problemLine(*reader.stopped());
  }
  for (uint64_t row = 0; row < table.rows(); ++row)
  {
    for (size_t column = 0; column < table.columns().size(); ++column)
    {
      const Cell cell = table.cell(column, row);
      found.cells += static_cast<char>('0' + static_cast<int>(cell.kind));
      appendCell(found.cells, cell);
    }
  }
  ArrowArrayStream stream{};
  toArrow(table, &stream, {.batchRows = 7});
  uint64_t rows = 0;
  for (ArrowArray batch{}; stream.get_next(&stream, &batch) == 0 && batch.release != nullptr; batch.release(&batch))
  {
    rows += static_cast<uint64_t>(batch.length);
  }
  stream.release(&stream);
  demand(rows == table.rows(), "rows were handed out that are not there");
  return found;
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size)
{
  if (size > fuzz::kLargest)
  {
    return 0;
  }
  fuzz::Input input(data, size);
  const unsigned flags = input.byte();
  const Asked& asked = kAsked[input.byte() % kAsked.size()];
  const auto bytes = input.rest();
  const Form form{.swapped = (flags & 1U) != 0, .root64 = (flags & 4U) == 0, .aligned = (flags & 2U) != 0};
  const OnDamage onDamage = (flags & 8U) != 0 ? OnDamage::skip : OnDamage::stop;
  ByteSource source("x", std::span<const uint8_t>(bytes.data(), bytes.size()));
  const TableQuery query(asked.each, asked.columns, asked.joiner);
  const Found exact = read(source, form, query, onDamage, false);
  const Found walked = read(source, form, query, onDamage, true);
  demand(exact.cells == walked.cells && exact.rows == walked.rows, "the exact steps and the walker differ");
  demand(exact.told == walked.told, "they tell of different damage");
  return 0;
}
