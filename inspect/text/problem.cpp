#include "tav/inspect/problem.hpp"

#include <utility>

#include "tav/inspect/phrases.hpp"

namespace tav::inspect
{

std::string problemLine(const Problem& problem)
{
  std::string text = problem.file.empty() ? "" : problem.file + ": ";
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
  return problem.code == TAV_RC_OK ? text : text + " (" + korCodeName(problem.code) + ")";
}

Error::Error(Problem what, Trouble kind)
    : std::system_error(makeError(what.code == TAV_RC_OK ? TAV_RC_BAD_PARAM : what.code), what.sentence),
      problem_(std::move(what)), trouble_(kind)
{
}

Error::Error(std::string sentence, std::string hint)
    : Error(Problem{.sentence = std::move(sentence), .hint = std::move(hint)})
{
}

void failAt(const std::string& file, uint32_t code, std::string hint)
{
  throw Error(Problem{.file = file.empty() ? "''" : file,
                      .sentence = std::string(codeSentence(code)),
                      .code = code,
                      .hint = std::move(hint)});
}

} // namespace tav::inspect
