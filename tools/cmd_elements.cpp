// tav elements: the dictionary.
#include <algorithm>
#include <cstdio>
#include <string>

#include "tav/dictionary.hpp"
#include "tools/options.h"
#include "tools/output.h"
#include "tools/path.h"
#include "tools/report.h"

namespace tav::tool
{

namespace
{

char lower(char c)
{
  return c >= 'A' && c <= 'Z' ? static_cast<char>(c + ('a' - 'A')) : c;
}

/// Whether a text matches a pattern with * and ?; without any of them, whether it holds the pattern. Letter case does
/// not count.
bool matchesPattern(std::string_view text, std::string_view pattern)
{
  size_t at = 0;
  size_t in = 0;
  size_t star = std::string_view::npos;
  size_t mark = 0;
  while (at < text.size())
  {
    if (in < pattern.size() && (pattern[in] == '?' || lower(pattern[in]) == lower(text[at])))
    {
      ++at;
      ++in;
    }
    else if (in < pattern.size() && pattern[in] == '*')
    {
      star = in++;
      mark = at;
    }
    else if (star != std::string_view::npos)
    {
      in = star + 1;
      at = ++mark;
    }
    else
    {
      return false;
    }
  }
  return pattern.find_first_not_of('*', in) == std::string_view::npos;
}

bool isWanted(const dictionary::Entry& entry, const std::string& pattern)
{
  const std::string_view digits = std::string_view(pattern).substr(pattern.starts_with('#') ? 1 : 0);
  if (!digits.empty() && digits.find_first_not_of("0123456789") == std::string_view::npos)
  {
    return digits == std::to_string(entry.id);
  }
  return matchesPattern(entry.tag, pattern) || matchesPattern(entry.name, pattern) ||
         matchesPattern(entry.constant, pattern);
}

int run(const Invocation& invocation)
{
  std::string pattern = invocation.arguments().empty() ? "*" : invocation.arguments().front();
  if (pattern.find_first_of("*?") == std::string::npos && pattern.find_first_not_of("#0123456789") != std::string::npos)
  {
    pattern.insert(0, 1, '*');
    pattern += '*';
  }
  Output out("-");
  bool any = false;
  for (const dictionary::Entry& entry : dictionary::entries())
  {
    if ((entry.constant == "INVALID_ELEMENT" && !invocation.has("--unused")) || !isWanted(entry, pattern))
    {
      continue;
    }
    any = true;
    char line[256];
    std::snprintf(line, sizeof line, "%5u  %-44.*s  %.*s\n", static_cast<unsigned>(entry.id),
                  static_cast<int>(entry.name.size()), entry.name.data(), static_cast<int>(entry.tag.size()),
                  entry.tag.data());
    out.write(line);
  }
  out.commit();
  if (!any)
  {
    const std::string similar = similarNames(invocation.arguments().front());
    report(Problem{.file = {},
                   .sentence = "no element matches '" + invocation.arguments().front() + "'",
                   .hint = similar.empty() ? "" : "did you mean " + similar + "?"});
    return kFindings;
  }
  return kFine;
}

const Registration registration{{
    .place = 130,
    .name = "elements",
    .arguments = "[PATTERN]",
    .inputs = 0,
    .summary = "the dictionary: id, name, tag",
    .description =
        "Lists the elements whose tag, enum name or constant holds PATTERN, or matches it when it has * or ?;\n"
        "letter case does not count. A number is an id. Exit status 1: none.",
    .options = {{.names = "--unused", .help = "the unused ids inside the ranges, too"}},
    .concerns = kNoConcern,
    .examples = {{"tav elements host", "every element with 'host' in one of its names"},
                 {"tav elements 60103", "the element with this id"}},
    .run = run,
}};

} // namespace

} // namespace tav::tool
