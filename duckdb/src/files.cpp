#include "duckdb/src/files.h"

#include <algorithm>
#include <filesystem>
#include <string_view>
#include <system_error>

#include "tav/inspect/problem.hpp"

namespace tav::sql
{

namespace
{

namespace fs = std::filesystem;

bool isPattern(std::string_view text)
{
  return text.find_first_of("*?[") != std::string_view::npos;
}

/// Whether a character is one of a set; `at` is behind its opening bracket and is put behind the closing one. A bracket
/// without an end is nothing special.
bool isInSet(std::string_view pattern, size_t& at, char c, bool& isSet)
{
  const bool negated = at < pattern.size() && (pattern[at] == '!' || pattern[at] == '^');
  const size_t first = at + (negated ? 1 : 0);
  const size_t end = pattern.find(']', first + 1);
  isSet = end != std::string_view::npos;
  if (!isSet)
  {
    return false;
  }
  bool found = false;
  for (size_t i = first; i < end; ++i)
  {
    const bool isRange = i + 2 < end && pattern[i + 1] == '-';
    found = found || (isRange ? pattern[i] <= c && c <= pattern[i + 2] : pattern[i] == c);
    i += isRange ? 2 : 0;
  }
  at = end + 1;
  return found != negated;
}

/// Goes back to the last star alone, so that the time is that of the product of both lengths at the most.
bool matches(std::string_view pattern, std::string_view name)
{
  size_t at = 0;
  size_t star = std::string_view::npos;
  size_t from = 0;
  for (size_t i = 0; i < name.size();)
  {
    size_t behind = at + 1;
    bool fits = false;
    if (at < pattern.size() && pattern[at] == '*')
    {
      star = at++;
      from = i;
      continue;
    }
    if (at < pattern.size())
    {
      bool isSet = false;
      const bool isIn = pattern[at] == '[' && isInSet(pattern, behind, name[i], isSet);
      fits = isSet ? isIn : pattern[at] == '?' || pattern[at] == name[i];
    }
    if (fits)
    {
      at = behind;
      ++i;
    }
    else if (star != std::string_view::npos)
    {
      at = star + 1;
      i = ++from;
    }
    else
    {
      return false;
    }
  }
  return pattern.find_first_not_of('*', at) == std::string_view::npos;
}

/// What is in a folder, by names; nothing where it cannot be read.
std::vector<fs::path> entriesOf(const fs::path& folder)
{
  std::vector<fs::path> entries;
  std::error_code ec;
  for (fs::directory_iterator entry(folder.empty() ? "." : folder, ec), end; !ec && entry != end; entry.increment(ec))
  {
    entries.push_back(folder / entry->path().filename());
  }
  std::sort(entries.begin(), entries.end());
  return entries;
}

bool isHidden(const fs::path& path)
{
  return path.filename().string().starts_with('.');
}

/// A folder and all folders below it. Links to folders are not followed, so that none is come to twice.
std::vector<fs::path> foldersBelow(const fs::path& top)
{
  std::vector<fs::path> folders{top};
  for (size_t i = 0; i < folders.size(); ++i)
  {
    for (const fs::path& entry : entriesOf(fs::path(folders[i])))
    {
      std::error_code ec;
      if (!isHidden(entry) && fs::is_directory(fs::symlink_status(entry, ec)))
      {
        folders.push_back(entry);
      }
    }
  }
  return folders;
}

std::vector<fs::path> stepInto(const std::vector<fs::path>& folders, const std::string& step)
{
  std::vector<fs::path> found;
  for (const fs::path& folder : folders)
  {
    if (step == "**")
    {
      const std::vector<fs::path> below = foldersBelow(folder);
      found.insert(found.end(), below.begin(), below.end());
    }
    else if (!isPattern(step))
    {
      found.push_back(folder / step);
    }
    else
    {
      for (const fs::path& entry : entriesOf(folder))
      {
        const bool wanted = (step.front() == '.' || !isHidden(entry)) && matches(step, entry.filename().string());
        wanted ? found.push_back(entry) : void();
      }
    }
  }
  return found;
}

} // namespace

std::vector<std::string> filesOf(const std::string& name)
{
  std::error_code ec;
  if (!isPattern(name) || fs::is_regular_file(name, ec))
  {
    return {name}; // opening it says what is wrong with it
  }
  const fs::path path(name);
  std::vector<fs::path> found{path.root_path()};
  for (const fs::path& step : path.relative_path())
  {
    found = stepInto(found, step.string());
  }
  std::vector<std::string> files;
  for (const fs::path& file : found)
  {
    if (fs::is_regular_file(file, ec))
    {
      files.push_back(file.string());
    }
  }
  std::sort(files.begin(), files.end());
  files.erase(std::unique(files.begin(), files.end()), files.end());
  if (files.empty())
  {
    throw inspect::Error("no file matches '" + name + "'");
  }
  return files;
}

bool isStreamName(const std::string& name)
{
  constexpr std::string_view ending = ".tav";
  return name.size() > ending.size() &&
         std::equal(ending.rbegin(), ending.rend(), name.rbegin(),
                    [](char expected, char c) { return expected == (c >= 'A' && c <= 'Z' ? c - 'A' + 'a' : c); });
}

} // namespace tav::sql
