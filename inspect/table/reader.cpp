#include <algorithm>
#include <utility>

#include "inspect/document/state.h"
#include "inspect/table/parts.h"
#include "inspect/table/reading.h"
#include "tav/inspect/table.hpp"

namespace tav::inspect
{

class TableReader::State : public TableReading
{
public:
  using TableReading::TableReading;

  State(ByteSource& source, const Part& part, const Walker::State& at, const TableQuery& query,
        const TableOptions& options)
      : TableReading(source, part.form, query, options, at, part.streamOffset)
  {
    confineTo(part, at);
  }

  /// Whether there are rows.
  bool read(uint64_t wanted)
  {
    while ((hasOpenRows() || rows() < wanted) && step())
    {
    }
    return rows() != 0;
  }
};

TableReader::TableReader(ByteSource& source, const Form& form, const TableQuery& query, const TableOptions& options)
    : state_(std::make_unique<State>(source, form, query, options))
{
}

TableReader::TableReader(ByteSource& source, const TableQuery& query, const Part& part, const TableOptions& options)
    : state_(std::make_unique<State>(source, part, stateOf(source, part), query, options))
{
}

TableReader::~TableReader() = default;

bool TableReader::next(Table& out, uint64_t rows)
{
  if (!state_->read(std::max<uint64_t>(rows, 1)))
  {
    return false;
  }
  out.append(state_->take());
  return true;
}

const std::optional<Problem>& TableReader::stopped() const noexcept
{
  return state_->stopped();
}

PartEnd TableReader::end() const
{
  return state_->end();
}

std::optional<Problem> readTable(ByteSource& source, const Form& form, const TableQuery& query,
                                 const TableOptions& options, const std::function<void(const Table&)>& rows)
{
  const std::vector<Part> parts = tableParts(source, form, query, options);
  if (!parts.empty())
  {
    return readTableParts(source, form, query, options, parts, rows);
  }
  TableReader reader(source, form, query, options);
  for (Table some(query); reader.next(some, options.batchRows); some = Table(query))
  {
    rows(some);
  }
  return reader.stopped();
}

Table readTable(ByteSource& source, const Form& form, const TableQuery& query, const TableOptions& options)
{
  Table table(query);
  if (const auto stopped = readTable(source, form, query, options, [&](const Table& rows) { table.append(rows); }))
  {
    throw Error(*stopped);
  }
  return table;
}

Table readTable(const Document& document, const TableQuery& query, OnDamage onDamage)
{
  DocumentState& state = DocumentState::of(document);
  return readTable(*state.source, state.recognition.form, query,
                   {.onDamage = onDamage, .passedOver = [&state](const PassedOver& passed) { state.add(passed); }});
}

} // namespace tav::inspect
