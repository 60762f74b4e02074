#include "tools/report.h"

#include <cstdio>

#include "kor/host.h"
#include "tools/value.h"

namespace tav::tool
{

std::string_view codeSentence(uint32_t code)
{
  switch (code)
  {
#define TAV_SENTENCE(name, value, sentence) \
  case value:                               \
    return sentence;
    TAV_CODE_LIST(TAV_SENTENCE)
#undef TAV_SENTENCE
  default:
    return "unknown code";
  }
}

std::string hexOffset(uint64_t offset)
{
  char text[24];
  std::snprintf(text, sizeof text, "0x%llx", static_cast<unsigned long long>(offset));
  return text;
}

std::string counted(uint64_t count, std::string_view singular)
{
  std::string text = std::to_string(count);
  text += ' ';
  text += singular;
  if (count != 1)
  {
    text += 's';
  }
  return text;
}

std::string byteText(uint64_t bytes)
{
  static constexpr const char* units[] = {"KiB", "MiB", "GiB", "TiB", "PiB", "EiB"};
  if (bytes < 10000)
  {
    return counted(bytes, "byte");
  }
  double value = static_cast<double>(bytes) / 1024;
  size_t unit = 0;
  while (value >= 1024 && unit + 1 < std::size(units))
  {
    value /= 1024;
    ++unit;
  }
  char text[32];
  std::snprintf(text, sizeof text, "%.1f %s", value, units[unit]);
  return text;
}

std::string problemText(const Problem& problem, std::FILE* where)
{
  const auto part = [where](const std::string& text) { return shown(text, where); };
  std::string text = "tav: ";
  if (!problem.file.empty())
  {
    text += part(problem.file) + ": ";
  }
  if (problem.offset)
  {
    text += hexOffset(*problem.offset);
    text += problem.path.empty() ? ": " : " ";
  }
  if (!problem.path.empty())
  {
    text += part(problem.path) + ": ";
  }
  text += part(problem.sentence);
  if (problem.code != TAV_RC_OK)
  {
    text += std::string(" (") + korCodeName(problem.code) + ")";
  }
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
  return kor::isTerminal(where) ? forTerminal(text) : std::string(text);
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

void failAt(const std::string& file, uint32_t code, std::string hint)
{
  Problem problem{file.empty() ? "''" : file};
  problem.sentence = codeSentence(code);
  problem.code = code;
  problem.hint = std::move(hint);
  throw Failure(kTrouble, problem);
}

} // namespace tav::tool
