#include "duckdb/src/given.h"

#include <filesystem>
#include <optional>
#include <system_error>
#include <utility>

#include "duckdb/src/files.h"
#include "tav/byteOrder.h"
#include "tav/inspect/problem.hpp"

namespace tav::sql
{

namespace
{

void addFiles(std::vector<std::string>& to, const Value& name)
{
  if (!name || name.id() != DUCKDB_TYPE_VARCHAR)
  {
    throw inspect::Error("a file is named by a text, several by a list of texts");
  }
  for (std::string& file : filesOf(name.text()))
  {
    to.push_back(std::move(file));
  }
}

std::vector<std::string> filesIn(duckdb_bind_info info)
{
  std::vector<std::string> files;
  const Value given(duckdb_bind_get_parameter(info, 0));
  if (given && given.id() == DUCKDB_TYPE_LIST)
  {
    for (idx_t i = 0; i < duckdb_get_list_size(given.get()); ++i)
    {
      addFiles(files, Value(duckdb_get_list_child(given.get(), i)));
    }
    if (files.empty())
    {
      throw inspect::Error("the list names no file");
    }
    return files;
  }
  addFiles(files, given);
  return files;
}

/// Whether a parameter is the second of two words; nothing where it was not given.
std::optional<bool> isSecond(duckdb_bind_info info, const char* name, const char* first, const char* second)
{
  const Value given = named(info, name);
  if (!given)
  {
    return {};
  }
  const std::string word = given.text();
  if (word != first && word != second)
  {
    throw inspect::Error(std::string(name) + " is '" + first + "' or '" + second + "'");
  }
  return word == second;
}

} // namespace

Value named(duckdb_bind_info info, const char* name)
{
  return Value(duckdb_bind_get_named_parameter(info, name));
}

Given::Given(duckdb_bind_info info)
    : files(filesIn(info))
{
  const std::optional<bool> big = isSecond(info, "byte_order", "little", "big");
  if (big)
  {
    form.swapped = *big == kor::isLittleEndian;
  }
  if (const Value root = named(info, "root"))
  {
    const int64_t bits = duckdb_get_int64(root.get());
    if (bits != 32 && bits != 64)
    {
      throw inspect::Error("root is 32 or 64, the bits of the first node's header");
    }
    form.root64 = bits == 64;
  }
  if (const Value align = named(info, "align"))
  {
    form.aligned = duckdb_get_bool(align.get());
  }
  if (isSecond(info, "on_damage", "stop", "skip").value_or(false))
  {
    onDamage = inspect::OnDamage::skip;
  }
  if (const Value names = named(info, "dictionary"))
  {
    dictionary = inspect::Dictionary::open(names.text());
  }
}

inspect::Document Given::open(const std::string& file) const
{
  inspect::DocumentOptions options;
  options.form = form;
  options.dictionary = dictionary;
  return inspect::Document(std::filesystem::path(file), options);
}

void Given::requireLength(const std::string& file, const inspect::Document& document)
{
  std::error_code ec;
  if (std::filesystem::file_size(file, ec) < document.source().size())
  {
    throw inspect::Error(inspect::Problem{.file = file, .sentence = "was made shorter while it was read"});
  }
}

void addParameters(duckdb_table_function function)
{
  const Type any(DUCKDB_TYPE_ANY);
  const Type text(DUCKDB_TYPE_VARCHAR);
  const Type number(DUCKDB_TYPE_BIGINT);
  const Type truth(DUCKDB_TYPE_BOOLEAN);
  duckdb_table_function_add_parameter(function, any.get());
  duckdb_table_function_add_named_parameter(function, "byte_order", text.get());
  duckdb_table_function_add_named_parameter(function, "root", number.get());
  duckdb_table_function_add_named_parameter(function, "align", truth.get());
  duckdb_table_function_add_named_parameter(function, "on_damage", text.get());
  duckdb_table_function_add_named_parameter(function, "dictionary", text.get());
}

} // namespace tav::sql
