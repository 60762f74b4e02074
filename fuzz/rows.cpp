/// Rows of nodes of arbitrary bytes: they are those of a walk, however many are read at a time; and the rows of a
/// file's parts, one after another, are the file's, parents and values included.
#include <map>
#include <optional>
#include <span>
#include <string>
#include <utility>
#include <vector>

#include "fuzz/input.h"
#include "tav/inspect.hpp"
#include "tav/inspect/streamWalk.hpp"

namespace
{

using fuzz::demand;
using namespace tav::inspect;

struct Row
{
  int64_t parent = 0;
  uint64_t offset = 0;
  uint64_t depth = 0;
  std::string path{};
  std::string value{};

  bool operator==(const Row&) const = default;
};

/// All that a row tells of its value.
std::string valueOf(const NodeColumns& columns, size_t row)
{
  const ValueKind kind = columns.kind[row];
  std::string text{static_cast<char>('0' + static_cast<int>(kind))};
  for (const uint64_t number : {uint64_t{columns.id[row]}, uint64_t{columns.type[row]}, uint64_t{columns.key[row]},
                                columns.size[row], columns.number[row], static_cast<uint64_t>(columns.time[row])})
  {
    text += ' ' + std::to_string(number);
  }
  if (kind == ValueKind::wide || kind == ValueKind::text || kind == ValueKind::bytes)
  {
    const tav::detail::RawValue raw = columns.rest(row);
    text.append(reinterpret_cast<const char*>(raw.bytes), raw.length());
  }
  return text;
}

Row rowOf(const NodeColumns& columns, size_t row, bool paths)
{
  return {columns.parent[row], columns.offset[row], columns.depth[row],
          paths ? std::string(columns.paths[row]) : std::string(), valueOf(columns, row)};
}

std::vector<Row> wholeFile(ByteSource& source, const Form& form, OnDamage onDamage, bool paths, size_t atOnce)
{
  std::vector<Row> rows;
  NodeReader reader(source, form, {.onDamage = onDamage, .paths = paths});
  for (NodeColumns columns; reader.next(columns, atOnce); columns.clear())
  {
    demand(columns.count() != 0, "a batch without rows");
    for (size_t i = 0; i < columns.count(); ++i) rows.push_back(rowOf(columns, i, paths));
  }
  return rows;
}

void compareWithWalk(ByteSource& source, const Form& form, const std::vector<Row>& rows, bool isWhole)
{
  StreamWalk walk(source, form, [](const PassedOver&) {});
  std::map<uint64_t, int64_t> rowOfGroup;
  size_t at = 0;
  for (Event event; at < rows.size() && walk.next(event);)
  {
    if (event.what == What::nodeBegin && !isEndPiece(event))
    {
      const auto parent = rowOfGroup.find(event.node.parentOffset);
      const Row& row = rows[at];
      demand(row.offset == event.node.offset() && row.depth == event.depth, "a row that the walk does not come to");
      demand(row.path == walk.walker().path(event), "another path than the walk's");
      demand(row.parent == (parent == rowOfGroup.end() ? NodeColumns::kNoParent : parent->second), "another parent");
      rowOfGroup[event.node.offset()] = static_cast<int64_t>(at++);
    }
  }
  demand(at == rows.size(), "more rows than nodes");
  for (Event event; isWhole && walk.next(event);)
  {
    demand(event.what != What::nodeBegin || isEndPiece(event), "a node without a row");
  }
}

/// What was found in a part, with parents as its reader tells them.
struct Found
{
  std::vector<Row> rows{};
  std::vector<int64_t> open{};
};

std::vector<Row> inParts(ByteSource& source, std::vector<Part> parts)
{
  std::vector<Found> found(parts.size());
  std::vector<PartEnd> ends(parts.size());
  const auto read = [&](size_t i) {
    NodeReader reader(source, parts[i], {.onDamage = OnDamage::skip});
    NodeColumns columns;
    while (reader.next(columns, 3))
    {
    }
    found[i] = {{}, reader.open()};
    for (size_t row = 0; row < columns.count(); ++row) found[i].rows.push_back(rowOf(columns, row, false));
    ends[i] = reader.end();
  };
  for (size_t i = 0; i < parts.size(); ++i) read(i);
  while (const auto i = mendParts(parts, ends)) read(*i);

  std::vector<Row> all;
  std::vector<int64_t> around;
  for (const Found& part : found)
  {
    const auto before = static_cast<int64_t>(all.size());
    const auto inFile = [&](int64_t row) {
      return row >= 0 ? before + row : row == NodeColumns::kNoParent ? row
                                                                     : around.at(static_cast<size_t>(-2 - row));
    };
    for (Row row : part.rows)
    {
      row.parent = inFile(row.parent);
      all.push_back(std::move(row));
    }
    std::vector<int64_t> behind;
    for (const int64_t row : part.open) behind.push_back(inFile(row));
    around = std::move(behind);
  }
  return all;
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
  const uint64_t target = 1 + uint64_t{input.byte()};
  const auto bytes = input.rest();
  const FormChoice known{.swapped = (flags & 1U) != 0, .root64 = (flags & 4U) == 0, .aligned = (flags & 2U) != 0};
  const OnDamage onDamage = (flags & 8U) != 0 ? OnDamage::skip : OnDamage::stop;
  ByteSource source("x", std::span<const uint8_t>(bytes.data(), bytes.size()));
  const Form form = recognise(source, known).form;
  std::vector<Row> rows = wholeFile(source, form, onDamage, true, 5);
  compareWithWalk(source, form, rows, onDamage == OnDamage::skip);
  for (Row& row : rows) row.path.clear();
  demand(wholeFile(source, form, onDamage, false, NodeReader::kBatch) == rows, "read at once the rows differ");
  if (onDamage == OnDamage::skip)
  {
    demand(inParts(source, plan(source, {.targetBytes = target, .form = known})) == rows, "the parts have other rows");
  }
  return 0;
}
