#include "tools/cmd/tableMetrics.h"

#include <algorithm>
#include <string_view>

namespace tav::tool
{

namespace
{

constexpr std::string_view kTotal = "_total";

bool isLabel(const OutCell& cell)
{
  return cell.isOwn ? cell.isText : cell.cell.kind == CellKind::text || cell.cell.kind == CellKind::bytes;
}

/// Letters, digits and _, no digit first.
void requireName(const std::string& name)
{
  const auto isWord = [](char c) {
    return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || c == '_';
  };
  const bool digitFirst = !name.empty() && name.front() >= '0' && name.front() <= '9';
  if (name.empty() || digitFirst || name.starts_with("__") || !std::all_of(name.begin(), name.end(), isWord))
  {
    throw Failure("table: '" + shown(name, stderr) + "' is no name of a metric or a label",
                  "'--col NAME=PATH' gives it one of letters, digits and _, with no digit first");
  }
}

std::string escapedLabel(std::string_view text)
{
  std::string escaped;
  for (const char c : text)
  {
    const std::string_view whole = c == '\\' ? "\\\\" : c == '"' ? "\\\""
                                                    : c == '\n'  ? "\\n"
                                                                 : std::string_view(&c, 1);
    escaped += whole;
  }
  return escaped;
}

/// Times are seconds since 1970.
std::string numberOf(const Cell& cell)
{
  if (cell.kind != CellKind::time)
  {
    return cellText(cell);
  }
  constexpr uint64_t second = 1'000'000'000;
  std::string fraction = std::to_string(cell.number % second);
  fraction.insert(0, 9 - fraction.size(), '0');
  return std::to_string(cell.number / second) + '.' + fraction;
}

} // namespace

void MetricsWriter::begin(const std::vector<OutColumn>& columns)
{
  columns_ = columns;
  samples_.resize(columns.size());
  for (const OutColumn& column : columns)
  {
    requireName(column.name);
    const bool ends = column.isCounter && column.name.ends_with(kTotal);
    families_.push_back(column.name.substr(0, column.name.size() - (ends ? kTotal.size() : 0)));
    if (families_.back().empty() ||
        std::find(families_.begin(), families_.end() - 1, families_.back()) != families_.end() - 1)
    {
      throw Failure("table: two metrics are called '" + families_.back() + "'");
    }
  }
}

std::string MetricsWriter::labelsOf(const OutRow& row) const
{
  std::string labels;
  for (size_t i = 0; i < row.size(); ++i)
  {
    if (!isLabel(row[i]))
    {
      continue;
    }
    const std::string text = row[i].isOwn ? row[i].own : cellText(row[i].cell);
    const std::string escaped = isUtf8(text) ? text : forTerminal(text);
    labels += (labels.empty() ? "" : ",") + columns_[i].name + "=\"" + escapedLabel(escaped) + '"';
  }
  return labels;
}

void MetricsWriter::row(const OutRow& row)
{
  const std::string labels = labelsOf(row);
  if (!seen_.insert(labels).second)
  {
    throw Failure("table: two rows have the same labels" + (labels.empty() ? "" : ": " + shown(labels, stderr)),
                  "a column of texts, --file or --label tells them apart");
  }
  for (size_t i = 0; i < row.size(); ++i)
  {
    if (isLabel(row[i]) || row[i].cell.kind == CellKind::missing)
    {
      continue;
    }
    samples_[i] += families_[i] + std::string(columns_[i].isCounter ? kTotal : "") +
                   (labels.empty() ? "" : '{' + labels + '}') + ' ' + numberOf(row[i].cell) + '\n';
  }
}

std::string MetricsWriter::headOf(size_t column) const
{
  const std::string& family = families_[column];
  const OutColumn& about = columns_[column];
  std::string head = "# TYPE " + family + (about.isCounter ? " counter" : " gauge") + '\n';
  if (!about.unit.empty() && family.ends_with('_' + about.unit)) // which the format asks of units
  {
    head += "# UNIT " + family + ' ' + about.unit + '\n';
  }
  return head + "# HELP " + family + ' ' + escapedLabel(about.help) + '\n';
}

void MetricsWriter::end()
{
  for (size_t i = 0; i < columns_.size(); ++i)
  {
    if (!samples_[i].empty())
    {
      out_.write(headOf(i));
      out_.write(samples_[i]);
    }
  }
  out_.write("# EOF\n");
}

} // namespace tav::tool
