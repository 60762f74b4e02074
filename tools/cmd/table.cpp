// tav table: a row for each node that a path leads to.
#include <algorithm>
#include <functional>
#include <optional>
#include <set>

#include "tav/inspect.hpp"
#include "tav/path/compiled.hpp"
#include "tools/cmd/tableParquet.h"
#include "tools/cmd/tableRates.h"
#include "tools/cmd/tableRows.h"
#include "tools/shell/dictionary.h"
#include "tools/shell/options.h"
#include "tools/shell/output.h"
#include "tools/shell/progress.h"
#include "tools/shell/report.h"
#include "tools/shell/session.h"

namespace tav::tool
{

namespace
{

struct NamedText
{
  std::string name{};
  std::string text{};
};

/// "NAME=TEXT" in its parts; no name where what is before the first = is no word.
NamedText namedText(const std::string& given)
{
  const size_t equals = std::min(given.find('='), given.size());
  const std::string name = given.substr(0, equals);
  const auto isWord = [](char c) {
    return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || c == '_';
  };
  const bool named = equals != given.size() && !name.empty() && std::all_of(name.begin(), name.end(), isWord);
  return named ? NamedText{name, given.substr(equals + 1)} : NamedText{{}, given};
}

std::vector<TableColumn> columnsOf(const Invocation& invocation)
{
  std::vector<TableColumn> columns;
  for (const std::string& given : invocation.all("--col"))
  {
    const NamedText column = namedText(given);
    columns.push_back({column.name.empty() ? column.text : column.name, column.text});
  }
  if (!invocation.has("--each") || columns.empty())
  {
    throw Failure("table: --each and at least one --col say what the rows and the columns are",
                  "for instance --each /system --col host/hostName");
  }
  return columns;
}

std::vector<NamedText> labelsOf(const Invocation& invocation)
{
  std::vector<NamedText> labels;
  for (const std::string& given : invocation.all("--label"))
  {
    labels.push_back(namedText(given));
    if (labels.back().name.empty())
    {
      throw Failure("table: --label '" + shown(given, stderr) + "' is not NAME=TEXT",
                    "a name is a word of letters, digits and _");
    }
  }
  return labels;
}

class Tabler
{
public:
  explicit Tabler(const Invocation& invocation)
      : invocation_(invocation), labels_(labelsOf(invocation)),
        dictionary_(dictionaryFor(invocation, invocation.arguments().front())), query_(queryFor(dictionary_)),
        onDamage_(invocation.text("--on-damage", "stop") == "skip" ? OnDamage::skip : OnDamage::stop)
  {
    check();
    nameColumns();
    if (invocation.has("--rate"))
    {
      requireCounters();
      rates_.emplace(columns_);
    }
  }

  Status run()
  {
    return invocation_.text("--format") == "parquet" ? runParquet() : runText();
  }

private:
  Status runText()
  {
    Output out(invocation_.text("--output", "-"), invocation_.has("--force"));
    const auto writer = makeRowWriter(invocation_, out);
    writer->begin(columns_);
    Status status = kFine;
    for (const std::string& name : invocation_.arguments())
    {
      status = std::max(status, readFile(name, *writer));
    }
    writer->end();
    out.commit();
    return rows_ == 0 ? std::max(status, kFindings) : status;
  }

  /// The engine tells of damage in its own words, and not of what is passed over: so the files are read here first.
  Status runParquet()
  {
    const ParquetEngine engine;
    Output out(invocation_.text("--output", "-"), invocation_.has("--force"));
    ParquetTable table{.each = invocation_.text("--each"), .columns = query_.columns()};
    for (const NamedText& label : labels_)
    {
      table.labels.emplace_back(label.name, label.text);
    }
    Status status = kFine;
    for (const std::string& name : invocation_.arguments())
    {
      const Status one = readFile(name, [](const Table&) {});
      status = std::max(status, one);
      if (one < kTrouble)
      {
        addTo(table, name);
      }
    }
    if (stopped_)
    {
      throw Failure(status, {.sentence = "table: nothing is written, since Parquet is all rows or none",
                             .hint = "'--on-damage skip' goes on behind the damage"});
    }
    if (!table.files.empty())
    {
      engine.write(table, invocation_, out);
      out.commit();
    }
    return rows_ == 0 ? std::max(status, kFindings) : status;
  }

  /// A file that the engine is to read, too.
  void addTo(ParquetTable& table, const std::string& name) const
  {
    if (!table.files.empty() && table.dictionary != dictionary_)
    {
      throw Failure("table: own elements have other names in '" + shown(name, stderr) + "' than in the files before",
                    "--dictionary says what they are called in all");
    }
    table.files.push_back(name);
    table.dictionary = dictionary_;
  }

  static std::optional<std::string> joinerOf(const Invocation& invocation)
  {
    return invocation.has("--join") ? std::optional(invocation.text("--join")) : std::nullopt;
  }

  TableQuery queryFor(const Dictionary& dictionary) const
  {
    return {invocation_.text("--each"), columnsOf(invocation_), joinerOf(invocation_), dictionary};
  }

  void check() const
  {
    const std::vector<std::string>& files = invocation_.arguments();
    const std::string format = invocation_.text("--format", "csv");
    if (std::count(files.begin(), files.end(), "-") > 1)
    {
      throw Failure("table: only one of the files can be standard input");
    }
    if (format == "parquet")
    {
      checkParquet(invocation_);
    }
    if (format == "openmetrics" && invocation_.has("--rate"))
    {
      throw Failure("table: metrics are counters; their readers make rates of them, --rate does not");
    }
    if (invocation_.has("--crlf") && format != "csv" && format != "tsv")
    {
      throw Failure("table: --crlf is for --format csv and tsv");
    }
  }

  /// Where it is decided what a column counts, and in what unit.
  OutColumn described(const TableColumn& column, const std::vector<std::string>& counters) const
  {
    OutColumn about{.name = column.name, .help = column.path};
    const OwnElement* const element = ownElementOf(column.path);
    about.isCounter = about.name.ends_with("_total") || (element != nullptr && element->kind == ElementKind::counter) ||
                      std::find(counters.begin(), counters.end(), about.name) != counters.end();
    if (element != nullptr)
    {
      about.unit = element->unit;
      about.help = element->text.empty() ? about.help : element->text;
    }
    return about;
  }

  /// What a path leads to, where that is one own element.
  const OwnElement* ownElementOf(const std::string& text) const
  {
    const Path path = pathOf(text, dictionary_);
    const detail::paths::Compiled& compiled = path.compiled();
    const bool isOne = compiled.main.size() == 1 && !compiled.routes[compiled.main.front()].steps.empty();
    return isOne ? dictionary_.find(compiled.routes[compiled.main.front()].steps.back().only) : nullptr;
  }

  void nameColumns()
  {
    if (invocation_.has("--file"))
    {
      columns_.push_back({.name = "file"});
    }
    for (const NamedText& label : labels_)
    {
      columns_.push_back({.name = label.name});
    }
    const std::vector<std::string> counters = invocation_.all("--counter");
    for (const TableColumn& column : query_.columns())
    {
      columns_.push_back(described(column, counters));
    }
    std::set<std::string> names;
    for (const OutColumn& column : columns_)
    {
      if (!names.insert(column.name).second)
      {
        throw Failure("table: two columns are called '" + shown(column.name, stderr) + "'",
                      "'--col NAME=PATH' gives one another name");
      }
    }
    for (const std::string& counter : counters)
    {
      if (std::none_of(query_.columns().begin(), query_.columns().end(),
                       [&](const TableColumn& column) { return column.name == counter; }))
      {
        throw Failure("table: --counter: no column is called '" + shown(counter, stderr) + "'");
      }
    }
  }

  void requireCounters() const
  {
    if (std::none_of(columns_.begin(), columns_.end(), [](const OutColumn& column) { return column.isCounter; }))
    {
      throw Failure("table: --rate: no column is a counter",
                    "--counter NAME says that a column is one; those whose names end in _total are, and what a "
                    "dictionary file calls one");
    }
  }

  Status readFile(const std::string& name, RowWriter& writer)
  {
    OutRow row = beginRow(name);
    return readFile(name, [&](const Table& rows) { writeRows(rows, row, writer); });
  }

  Status readFile(const std::string& name, const std::function<void(const Table&)>& take)
  {
    return forFile(invocation_, name, [&](Stream& stream, DamageNotices& notices) {
      useNamesOf(stream.bytes().dictionary());
      const unsigned jobs = jobsOf(invocation_);
      Progress progress("table " + stream.source->name(), stream.bytes());
      const auto stopped =
          readTable(stream.bytes(), stream.form(), query_,
                    {.onDamage = onDamage_,
                     .passedOver = [&](const PassedOver& passed) { notices.add(passed); },
                     .threads = jobs,
                     .batchRows = 4096,
                     .progress = [&](uint64_t offset) { jobs > 1 ? progress.reach(offset) : void(); }},
                    [&](const Table& rows) {
                      take(rows);
                      rows_ += rows.rows();
                    });
      if (stopped)
      {
        report(*stopped);
        stopped_ = true;
      }
      return stopped ? kFindings : kFine;
    });
  }

  /// Reads the paths anew where own elements have other names than in the file before.
  void useNamesOf(const Dictionary& dictionary)
  {
    if (dictionary_ != dictionary)
    {
      query_ = queryFor(dictionary);
      dictionary_ = dictionary;
    }
  }

  /// A row with the columns that are the same in all of a file.
  OutRow beginRow(const std::string& name) const
  {
    OutRow row(columns_.size());
    size_t first = 0;
    if (invocation_.has("--file"))
    {
      row[first++] = {.own = name, .isOwn = true, .isText = true};
    }
    for (const NamedText& label : labels_)
    {
      row[first++] = {.own = label.text, .isOwn = true, .isText = true};
    }
    return row;
  }

  void writeRows(const Table& rows, OutRow& row, RowWriter& writer)
  {
    const size_t first = columns_.size() - query_.columns().size();
    for (uint64_t i = 0; i < rows.rows(); ++i)
    {
      for (size_t column = 0; column < query_.columns().size(); ++column)
      {
        row[first + column] = {.cell = rows.cell(column, i)};
      }
      rates_ ? rates_->apply(row) : void();
      writer.row(row);
    }
  }

  const Invocation& invocation_;
  std::vector<NamedText> labels_;
  Dictionary dictionary_; ///< of the file at hand, the first one to begin with
  TableQuery query_;      ///< with its names
  OnDamage onDamage_;
  std::vector<OutColumn> columns_{};
  std::optional<Rates> rates_{};
  uint64_t rows_ = 0;
  bool stopped_ = false; ///< at damage, in one of the files
};

int run(const Invocation& invocation)
{
  return Tabler(invocation).run();
}

const Registration registration{{
    .place = 54,
    .name = "table",
    .arguments = "FILE...",
    .inputs = ~size_t{0},
    .summary = "a table of nodes: a row each, columns by paths",
    .description =
        "Writes a row for each node that --each leads to, in the order of the stream, with the columns in the order\n"
        "given: the value of the first data element that a --col leads to from the row's node. Paths are those of\n"
        "'tav get'. A column is called NAME, a word of letters, digits and _, or as its path is written. Numbers are\n"
        "in decimal, times ISO 8601 in UTC, bytes in hexadecimal. Where there is no value, or a group, the cell is\n"
        "empty; an empty text is \"\" in CSV. CSV follows RFC 4180, with line feeds unless --crlf is given. TSV\n"
        "writes tabs, line ends and backslashes in texts as \\t, \\n, \\r and \\\\. JSON lines have null for what is\n"
        "missing, and numbers of 128 bits as texts.\n\n"
        "--rate puts in place of a counter's value what it rose by in a second since the row before, by the first\n"
        "time in the rows, from file to file. The first cell is empty, and so is one where the counter went down,\n"
        "which begins it anew. Counters are columns whose names end in _total, those that --counter\n"
        "names, and own elements that a dictionary file calls counters.\n\n"
        "--format openmetrics makes a page of metrics of one snapshot: numbers are samples, gauges or counters, and\n"
        "the texts of a row its labels, which no two rows may share.\n\n"
        "--format parquet has DuckDB read the files with the extension 'tav', after they were read here. Its program\n"
        "is 'duckdb' on PATH, or what TAV_DUCKDB names; the extension is the one that is installed there, or the file\n"
        "that TAV_DUCKDB_EXTENSION names. At damage nothing is written then, unless it is skipped.\n\n"
        "At damage a file ends with its rows so far, those whose nodes had ended; --on-damage skip goes on behind it.\n"
        "Both are told on standard error with exit status 1, as it is when there is no row, but for the header. A\n"
        "file that cannot be read, or is no stream, is told, and the next one is read; the exit status is the highest\n"
        "that one of the files gives. Memory grows with the rows inside of a row's node alone.",
    .options = {{.names = "--each",
                 .kind = ValueKind::text,
                 .value = "PATH",
                 .help = "a row for each of these nodes",
                 .required = true},
                {.names = "--col",
                 .kind = ValueKind::text,
                 .value = "[NAME=]PATH",
                 .help = "a column, by a path from the row's node",
                 .many = true,
                 .required = true},
                {.names = "--file", .help = "the name of the file as the first column"},
                {.names = "--label",
                 .kind = ValueKind::text,
                 .value = "NAME=TEXT",
                 .help = "a column with this text in every row",
                 .many = true},
                {.names = "--join",
                 .kind = ValueKind::text,
                 .value = "SEP",
                 .help = "all values that a column's path leads to, with SEP between them"},
                {.names = "--rate", .help = "counters as what they rose by in a second"},
                {.names = "--counter",
                 .kind = ValueKind::text,
                 .value = "NAME",
                 .help = "this column counts up",
                 .many = true},
                {.names = "--format",
                 .kind = ValueKind::choice,
                 .value = "FORMAT",
                 .help = "what is written: csv unless given; parquet by DuckDB, if that is installed",
                 .choices = {"csv", "tsv", "jsonl", "openmetrics", "parquet"}},
                {.names = "--crlf", .help = "end lines with CR LF"},
                {.names = "--on-damage",
                 .kind = ValueKind::choice,
                 .value = "WAY",
                 .help = "at damage: stop, which ends the file's rows, or skip",
                 .choices = {"stop", "skip"}},
                {.names = "-o,--output",
                 .kind = ValueKind::file,
                 .value = "OUT",
                 .help = "where the table goes, standard output unless given"},
                jobsOption()},
    .examples = {{"tav table day.tav --each /system --col time=timestamp --col host/hostName", "a series as CSV"},
                 {"tav table *.tav --each //host --col hostName --col ../timestamp --file > hosts.csv",
                  "every host of many files"},
                 {"tav table day.tav --each /system --col time=timestamp --col n=tq_rows_read --counter n --rate",
                  "rates of a counter"}},
    .run = run,
}};

} // namespace

} // namespace tav::tool
