#include "tools/shell/report.h"

#include <cstdio>

namespace tav::tool
{

std::string problemText(const Problem& problem)
{
  std::string text = "tav: ";
  if (!problem.file.empty())
  {
    text += problem.file + ": ";
  }
  if (problem.offset)
  {
    text += hexOffset(*problem.offset);
    text += problem.path.empty() ? ": " : " ";
  }
  if (!problem.path.empty())
  {
    text += problem.path + ": ";
  }
  text += problem.sentence;
  if (problem.code != TAV_RC_OK)
  {
    text += std::string(" (") + korCodeName(problem.code) + ")";
  }
  if (!problem.hint.empty())
  {
    text += "\n     " + problem.hint;
  }
  return text;
}

void report(const Problem& problem)
{
  std::fprintf(stderr, "%s\n", problemText(problem).c_str());
}

void report(std::string_view sentence)
{
  std::fprintf(stderr, "tav: %.*s\n", static_cast<int>(sentence.size()), sentence.data());
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
