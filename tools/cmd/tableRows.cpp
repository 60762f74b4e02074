#include "tools/cmd/tableRows.h"

#include <algorithm>
#include <string_view>

#include "tools/cmd/tableMetrics.h"

namespace tav::tool
{

namespace
{

constexpr size_t kMostKept = size_t{64} * 1024; ///< bytes of lines that are handed over at once

class LineWriter : public RowWriter
{
public:
  LineWriter(Output& out, std::string_view lineEnd)
      : out_(out), lineEnd_(lineEnd) {}

  void end() override
  {
    out_.write(line_);
    line_.clear();
  }

protected:
  std::string& line() { return line_; }
  void endLine()
  {
    line_ += lineEnd_;
    if (line_.size() >= kMostKept)
    {
      end();
    }
  }

private:
  Output& out_;
  std::string_view lineEnd_;
  std::string line_{};
};

bool isMissing(const OutCell& cell)
{
  return !cell.isOwn && cell.cell.kind == CellKind::missing;
}

bool isText(const OutCell& cell)
{
  return cell.isOwn ? cell.isText : cell.cell.kind == CellKind::text;
}

std::string_view textOf(const OutCell& cell)
{
  return cell.isOwn ? std::string_view(cell.own) : cell.cell.text;
}

/// RFC 4180, but lines end as they are asked to.
class CsvWriter final : public LineWriter
{
public:
  using LineWriter::LineWriter;

  void begin(const std::vector<OutColumn>& columns) override
  {
    for (size_t i = 0; i < columns.size(); ++i)
    {
      line() += i == 0 ? "" : ",";
      putText(columns[i].name);
    }
    endLine();
  }

  void row(const OutRow& row) override
  {
    for (size_t i = 0; i < row.size(); ++i)
    {
      line() += i == 0 ? "" : ",";
      put(row[i]);
    }
    endLine();
  }

private:
  void put(const OutCell& cell)
  {
    if (isText(cell))
    {
      putText(textOf(cell));
    }
    else
    {
      cell.isOwn ? void(line() += cell.own) : appendCell(line(), cell.cell);
    }
  }

  /// An empty text has quotation marks; what is missing has none.
  void putText(std::string_view text)
  {
    if (!text.empty() && text.find_first_of(",\"\r\n") == std::string_view::npos)
    {
      line() += text;
      return;
    }
    line() += '"';
    for (const char c : text)
    {
      line().append(c == '"' ? 2 : 1, c);
    }
    line() += '"';
  }
};

class TsvWriter final : public LineWriter
{
public:
  using LineWriter::LineWriter;

  void begin(const std::vector<OutColumn>& columns) override
  {
    for (size_t i = 0; i < columns.size(); ++i)
    {
      line() += i == 0 ? "" : "\t";
      putText(columns[i].name);
    }
    endLine();
  }

  void row(const OutRow& row) override
  {
    for (size_t i = 0; i < row.size(); ++i)
    {
      line() += i == 0 ? "" : "\t";
      if (isText(row[i]))
      {
        putText(textOf(row[i]));
      }
      else
      {
        row[i].isOwn ? void(line() += row[i].own) : appendCell(line(), row[i].cell);
      }
    }
    endLine();
  }

private:
  void putText(std::string_view text)
  {
    for (const char c : text)
    {
      switch (c)
      {
      case '\t': line() += "\\t"; break;
      case '\n': line() += "\\n"; break;
      case '\r': line() += "\\r"; break;
      case '\\': line() += "\\\\"; break;
      default: line() += c;
      }
    }
  }
};

/// One object a line. Whole numbers of 64 bits are numbers, those of 128 bits texts, as readers would round them.
class JsonWriter final : public LineWriter
{
public:
  using LineWriter::LineWriter;

  void begin(const std::vector<OutColumn>& columns) override
  {
    for (const OutColumn& column : columns)
    {
      std::string key = keys_.empty() ? "{" : ", ";
      appendJsonString(key, column.name);
      keys_.push_back(key + ": ");
    }
  }

  void row(const OutRow& row) override
  {
    for (size_t i = 0; i < row.size(); ++i)
    {
      line() += keys_[i];
      put(row[i]);
    }
    line() += '}';
    endLine();
  }

private:
  void put(const OutCell& cell)
  {
    const CellKind kind = cell.cell.kind;
    if (isMissing(cell))
    {
      line() += "null";
    }
    else if (isText(cell))
    {
      putText(textOf(cell));
    }
    else if (cell.isOwn)
    {
      line() += cell.own;
    }
    else if (kind == CellKind::unsigned64 || kind == CellKind::signed64)
    {
      appendCell(line(), cell.cell);
    }
    else
    {
      line() += '"';
      appendCell(line(), cell.cell);
      line() += '"';
    }
  }

  /// What is no UTF-8 stands as escapes, as 'tav get --json' shows it.
  void putText(std::string_view text)
  {
    if (isUtf8(text))
    {
      appendJsonString(line(), text);
      return;
    }
    const std::string escaped = quoted(text);
    appendJsonString(line(), std::string_view(escaped).substr(1, escaped.size() - 2));
  }

  std::vector<std::string> keys_{};
};

} // namespace

std::unique_ptr<RowWriter> makeRowWriter(const Invocation& invocation, Output& out)
{
  const std::string format = invocation.text("--format", "csv");
  const std::string_view lineEnd = invocation.has("--crlf") ? "\r\n" : "\n";
  if (format == "tsv")
  {
    return std::make_unique<TsvWriter>(out, lineEnd);
  }
  if (format == "jsonl")
  {
    return std::make_unique<JsonWriter>(out, lineEnd);
  }
  if (format == "openmetrics")
  {
    return std::make_unique<MetricsWriter>(out);
  }
  return std::make_unique<CsvWriter>(out, lineEnd);
}

} // namespace tav::tool
