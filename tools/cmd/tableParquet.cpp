#include "tools/cmd/tableParquet.h"

#include <algorithm>
#include <array>
#include <cstdlib>
#include <filesystem>
#include <set>
#include <string_view>
#include <system_error>

#include "tav/byteOrder.h"
#include "tav/inspect/jsonText.hpp"
#include "tools/host/child.h"
#include "tools/host/host.h"
#include "tools/shell/report.h"
#include "tools/shell/session.h"

namespace tav::tool
{

namespace
{

constexpr std::string_view kMark = "PAR1"; // which a Parquet file begins and ends with
constexpr uint64_t kLeast = 12;            // bytes: both, and a length between them

std::string variable(const char* name)
{
  const char* const value = std::getenv(name);
  return value == nullptr ? "" : value;
}

/// A text as SQL has it. It is one line, so that the engine's program takes no part of it for a command of its own.
std::string quotedForSql(std::string_view text)
{
  constexpr std::string_view digits = "0123456789abcdef";
  std::string quoted = "E'";
  for (const char c : text)
  {
    const auto byte = static_cast<unsigned char>(c);
    if (byte < 0x20 || byte == 0x7F)
    {
      quoted += {'\\', 'x', digits[byte >> 4U], digits[byte & 15U]};
      continue;
    }
    quoted += c == '\'' || c == '\\' ? std::string(2, c) : std::string(1, c);
  }
  return quoted + "'";
}

/// A name as SQL has it, where there is no escape in names.
std::string nameForSql(std::string_view name)
{
  std::string quoted = "\"";
  for (const char c : name)
  {
    if (static_cast<unsigned char>(c) < 0x20 || c == 0x7F)
    {
      throw Failure("table: the name of the column '" + shown(name, stderr) + "' has a control character",
                    "'--col NAME=PATH' gives it another name");
    }
    quoted += c == '"' ? std::string(2, c) : std::string(1, c);
  }
  return quoted + "\"";
}

std::string listed(const std::vector<std::string>& items)
{
  std::string list;
  for (const std::string& item : items)
  {
    list += (list.empty() ? "" : ", ") + item;
  }
  return list;
}

/// What the engine does not tell apart it would give a name of its own.
void requireDistinct(const ParquetTable& table, bool hasFile)
{
  std::vector<std::string> names;
  hasFile ? names.emplace_back("file") : "";
  for (const auto& label : table.labels)
  {
    names.push_back(label.first);
  }
  for (const TableColumn& column : table.columns)
  {
    names.push_back(column.name);
  }
  std::set<std::string> seen;
  for (const std::string& name : names)
  {
    std::string small = name;
    std::transform(small.begin(), small.end(), small.begin(),
                   [](char c) { return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c; });
    if (!seen.insert(small).second)
    {
      throw Failure("table: the name of the column '" + shown(name, stderr) +
                        "' is that of another one but for its capitals, which is one name in SQL",
                    "'--col NAME=PATH' gives it another name");
    }
  }
}

/// The columns on their way out. Inside they are c0, c1 and so on, which clash with no other name.
std::string selection(const ParquetTable& table, bool hasFile)
{
  std::vector<std::string> columns;
  hasFile ? columns.emplace_back("filename AS file") : "";
  for (const auto& [name, text] : table.labels)
  {
    columns.push_back(quotedForSql(text) + " AS " + nameForSql(name));
  }
  for (size_t i = 0; i < table.columns.size(); ++i)
  {
    columns.push_back("c" + std::to_string(i) + " AS " + nameForSql(table.columns[i].name));
  }
  return listed(columns);
}

/// What the options say of the form and of damage, as parameters of the function.
std::string parametersOf(const Invocation& invocation)
{
  const FormChoice form = formChoice(invocation);
  std::string parameters;
  if (form.swapped)
  {
    parameters += std::string(", byte_order := '") + (*form.swapped == kor::isLittleEndian ? "big" : "little") + "'";
  }
  if (form.root64)
  {
    parameters += *form.root64 ? ", root := 64" : ", root := 32";
  }
  if (form.aligned)
  {
    parameters += *form.aligned ? ", align := true" : ", align := false";
  }
  parameters += invocation.has("--join") ? ", join := " + quotedForSql(invocation.text("--join")) : "";
  parameters += invocation.text("--on-damage", "stop") == "skip" ? ", on_damage := 'skip'" : "";
  parameters += ", threads := " + std::to_string(jobsOf(invocation));
  return parameters + (invocation.has("--file") ? ", filename := true" : "");
}

std::string statementFor(const ParquetTable& table, const Invocation& invocation)
{
  std::vector<std::string> files;
  std::vector<std::string> columns;
  for (const std::string& file : table.files)
  {
    files.push_back(quotedForSql(file));
  }
  for (size_t i = 0; i < table.columns.size(); ++i)
  {
    columns.push_back("'c" + std::to_string(i) + "': " + quotedForSql(table.columns[i].path));
  }
  const std::string names =
      table.dictionary.isEmpty() ? "" : ", dictionary := '" + std::string(host::Child::sideName) + "'";
  // One thread, so that rows stay in their order.
  return "SET threads = 1; COPY (SELECT " + selection(table, invocation.has("--file")) + " FROM read_tav_table([" +
         listed(files) + "], each := " + quotedForSql(table.each) + ", columns := {" + listed(columns) + "}" +
         parametersOf(invocation) + names + ")) TO '" + host::Child::resultName +
         "' (FORMAT parquet, USE_TMP_FILE false);\n";
}

/// A dictionary file with the names, which is all that paths need.
std::string namesText(const Dictionary& dictionary)
{
  std::string text;
  for (const OwnElement& element : dictionary.elements())
  {
    text += (text.empty() ? "{\"" : ", \"") + std::to_string(element.id) + "\": {\"tag\": ";
    appendJsonString(text, element.tag);
    text += "}";
  }
  return text.empty() ? "" : text + "}";
}

/// Runs statements in the engine; its exit status. What they write to Child::resultName is given to `take`.
template<class Take>
int runIn(const std::string& program, const host::ChildTexts& texts, const Take& take)
{
  host::Child child;
  if (const uint32_t code = child.start(program, {"-unsigned", "-batch", "-bail"}, texts); code != TAV_RC_OK)
  {
    throw Failure(kTrouble, {.file = program, .sentence = "cannot be started", .code = code});
  }
  std::array<char, 65536> bytes;
  for (size_t count = 1; count != 0;)
  {
    if (const uint32_t code = child.read(bytes.data(), bytes.size(), count); code != TAV_RC_OK)
    {
      throw Failure(kTrouble, {.file = program, .sentence = "its result cannot be read", .code = code});
    }
    take(std::string_view(bytes.data(), count));
  }
  return child.wait();
}

std::string engineProgram()
{
  const char* const named = std::getenv("TAV_DUCKDB");
  const std::string name = named == nullptr ? "duckdb" : named;
  return name.empty() || name.find('/') != std::string::npos ? name : host::findProgram(name);
}

} // namespace

void checkParquet(const Invocation& invocation)
{
  for (const std::string& file : invocation.arguments())
  {
    std::error_code error;
    const auto status = std::filesystem::status(host::pathOf(file), error);
    if (file == "-" || (std::filesystem::exists(status) && !std::filesystem::is_regular_file(status)))
    {
      throw Failure("table: '" + shown(file, stderr) + "' can be read but once, and for Parquet it is read again",
                    "put it into a file first");
    }
  }
  if (invocation.has("--rate") || invocation.number("--from").value_or(0) != 0)
  {
    throw Failure(std::string("table: ") + (invocation.has("--rate") ? "--rate" : "--from") +
                  " does not go with --format parquet");
  }
}

ParquetEngine::ParquetEngine()
    : program_(engineProgram())
{
  const std::string extension = variable("TAV_DUCKDB_EXTENSION");
  load_ = "LOAD " + (extension.empty() ? "tav" : quotedForSql(extension)) + ";\n";
  if (!host::Child::isPossible())
  {
    throw Failure("table: on this system Parquet is written by DuckDB itself, with the extension 'tav'",
                  "docs/sql.md tells how");
  }
  const bool isThere = !program_.empty() && runIn(program_, {load_, {}}, [](std::string_view) {}) == 0;
  if (!isThere)
  {
    throw Failure(std::string("table: Parquet is written by DuckDB with the extension 'tav': ") +
                      (program_.empty() ? "its program 'duckdb' is not there" : "the extension is not there"),
                  "get 'duckdb' from https://duckdb.org onto PATH, or name it by TAV_DUCKDB, and say once: "
                  "duckdb -unsigned -c \"INSTALL 'tav.duckdb_extension'\", with the file of tav's release or build");
  }
}

void ParquetEngine::write(const ParquetTable& table, const Invocation& invocation, Output& out) const
{
  requireDistinct(table, invocation.has("--file"));
  const host::ChildTexts texts{load_ + statementFor(table, invocation), namesText(table.dictionary)};
  if (!isUtf8(texts.input))
  {
    throw Failure("table: the names of files and columns have to be UTF-8 for --format parquet");
  }
  std::string first;
  std::string last;
  const int status = runIn(program_, texts, [&](std::string_view bytes) {
    first += bytes.substr(0, kMark.size() - first.size());
    last += bytes.substr(bytes.size() - std::min(bytes.size(), kMark.size()));
    last.erase(0, last.size() - std::min(last.size(), kMark.size()));
    out.write(bytes);
  });
  if (status != 0 || first != kMark || last != kMark || out.written() < kLeast)
  {
    throw Failure(kTrouble, {.file = program_,
                             .sentence = status != 0 ? "DuckDB ended with status " + std::to_string(status) +
                                                           "; nothing is written"
                                                     : "ended without a table; nothing is written"});
  }
}

} // namespace tav::tool
