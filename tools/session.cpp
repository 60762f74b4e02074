#include "tools/session.h"

#include "tools/report.h"

namespace tav::tool
{

FormChoice formChoice(const Invocation& invocation)
{
  FormChoice choice;
  if (const std::string order = invocation.text("--byte-order"); !order.empty())
  {
    choice.swapped = order == "swapped" || (order == "little" && !kor::isLittleEndian) ||
                     (order == "big" && kor::isLittleEndian);
  }
  if (invocation.has("--root"))
  {
    choice.root64 = invocation.text("--root") == "64";
  }
  if (invocation.has("--align") && invocation.has("--no-align"))
  {
    throw Failure("--align and --no-align exclude each other");
  }
  if (invocation.has("--align") || invocation.has("--no-align"))
  {
    choice.aligned = invocation.has("--align");
  }
  return choice;
}

uint64_t ringBytes(const Invocation& invocation)
{
  return invocation.number("--ring").value_or(kDefaultRing);
}

Stream openStream(const Invocation& invocation, const std::string& path, bool lenient)
{
  const SourceLimits limits{ringBytes(invocation), invocation.number("--spool-limit").value_or(kDefaultSpool)};
  Stream stream{ByteSource::open(path, limits), {}};
  stream.recognition = recognise(*stream.source, formChoice(invocation));
  if (!stream.recognition.isStream && !lenient)
  {
    Problem problem{stream.source->name()};
    problem.sentence =
        stream.source->size() == 0 ? "the file is empty" : "this is no stream, or nothing of it is whole";
    problem.hint = "'tav info' tells what was tried; --byte-order, --root and --align say how to read it";
    throw Failure(kTooDamaged, problem);
  }
  return stream;
}

Stream openStream(const Invocation& invocation)
{
  return openStream(invocation, invocation.arguments().at(0));
}

void tellStatistics(const Invocation& invocation, const ByteSource& source)
{
  if (invocation.has("--stats"))
  {
    report(Problem{.file = source.name(),
                   .sentence = std::to_string(source.bytesRead()) + " bytes read in " +
                               std::to_string(source.readCalls()) + " calls"});
  }
}

} // namespace tav::tool
