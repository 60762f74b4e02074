#include "tav/inspect/problem.hpp"

#include <utility>

#include "tav/inspect/phrases.hpp"

namespace tav::inspect
{

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
