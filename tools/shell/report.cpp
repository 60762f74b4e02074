#include "tools/shell/report.h"

#include <cstdio>

#include "tav/inspect/value.hpp"
#include "tools/host/host.h"

namespace tav::tool
{

std::string problemText(const Problem& problem, std::FILE* where)
{
  const auto part = [where](const std::string& text) { return shown(text, where); };
  Problem parts = problem;
  for (std::string* const each : {&parts.file, &parts.path, &parts.sentence})
  {
    *each = part(*each);
  }
  std::string text = "tav: " + problemLine(parts);
  if (!problem.hint.empty())
  {
    text += "\n     " + part(problem.hint);
  }
  return text;
}

void report(const Problem& problem)
{
  std::fprintf(stderr, "%s\n", problemText(problem, stderr).c_str());
}

void report(std::string_view sentence)
{
  report(Problem{.file = {}, .sentence = std::string(sentence)});
}

std::string shown(std::string_view text, std::FILE* where)
{
  return host::isTerminal(where) ? forTerminal(text) : std::string(text);
}

Status statusOf(const Error& error)
{
  return error.trouble() == Trouble::notFound ? kFindings : kTrouble;
}

Failure::Failure(Status exitStatus, Problem what)
    : std::runtime_error(what.sentence), status(exitStatus), problem(std::move(what))
{
}

Failure::Failure(std::string sentence, std::string hint)
    : std::runtime_error(sentence), status(kTrouble)
{
  problem.sentence = std::move(sentence);
  problem.hint = std::move(hint);
}

} // namespace tav::tool
