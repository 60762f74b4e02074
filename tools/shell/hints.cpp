#include "tools/shell/hints.h"

#include <array>
#include <utility>

namespace tav::tool
{

Problem withHint(Problem problem)
{
  switch (problem.remedy)
  {
  case Remedy::none: break;
  case Remedy::readWide: problem.hint += "; --root 64 reads it otherwise"; break;
  case Remedy::makeWide:
    problem.sentence = "build: " + problem.sentence;
    problem.hint = "--root 64 makes them";
    break;
  case Remedy::beginBefore: problem.sentence = "--from: " + problem.sentence; break;
  case Remedy::showBytes:
    problem.hint += problem.hint.empty() ? "" : "\n     ";
    problem.hint += "'tav hex --at " + hexOffset(problem.offset.value_or(0)) + "' shows the bytes there";
    break;
  }
  return problem;
}

std::string_view hintOf(const FileKind& kind)
{
  constexpr std::array<std::pair<std::string_view, std::string_view>, 4> kHints{{
      {"gzip", "'gzip -dc FILE | tav info -' looks into what it holds"},
      {"zip", "'unzip -p FILE NAME | tav info -' looks into what it holds"},
      {"zstd", "'zstd -dc FILE | tav info -' looks into what it holds"},
      {"json", "'tav build FILE -o OUT' makes a stream of what 'tav json' wrote"},
  }};
  for (const auto& [name, hint] : kHints)
  {
    if (kind.name == name)
    {
      return kind.isEmpty ? "it is empty" : hint;
    }
  }
  return {};
}

std::string readsFrom(const ByteSource& source, uint64_t offset)
{
  return "; --from " + hexOffset(source.from() + offset) + " reads it";
}

std::vector<std::string> reasonTexts(const ByteSource& source, const Recognition& found)
{
  std::vector<std::string> texts;
  for (const Reason& reason : found.because)
  {
    texts.push_back(reason.sentence + (reason.other ? readsFrom(source, *reason.other) : ""));
  }
  return texts;
}

std::string formOptions(const Form& form)
{
  return std::string("--byte-order ") + (form.swapped != kor::isLittleEndian ? "little" : "big") + " --root " +
         (form.root64 ? "64" : "32") + (form.aligned ? " --align" : " --no-align");
}

} // namespace tav::tool
