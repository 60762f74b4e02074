#include "tools/shell/session.h"

#include <algorithm>
#include <optional>
#include <thread>
#include <utility>

#include "tav/inspect.hpp"
#include "tools/shell/dictionary.h"
#include "tools/shell/hints.h"
#include "tools/shell/input.h"
#include "tools/shell/report.h"

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

std::vector<uint16_t> requireIds(const std::string& option, const std::string& name, const Dictionary& dictionary)
{
  std::vector<uint16_t> ids = idsOf(name, dictionary);
  if (ids.empty())
  {
    const std::string similar = similarNames(name, dictionary);
    throw Failure(option + ": no element has the name '" + name + "'",
                  similar.empty() ? "'tav elements' lists the names" : "did you mean " + similar + "?");
  }
  return ids;
}

unsigned jobsOf(const Invocation& invocation)
{
  constexpr uint64_t most = 256;
  const uint64_t jobs = invocation.number("--jobs").value_or(1);
  return static_cast<unsigned>(std::min(jobs != 0 ? jobs : std::thread::hardware_concurrency(), most));
}

OptionSpec jobsOption()
{
  return {.names = "-j,--jobs",
          .kind = ValueKind::number,
          .value = "N",
          .help = "work on a file of 4 MiB or more with N processors, 1 unless given; 0: with all of them"};
}

uint64_t ringBytes(const Invocation& invocation)
{
  return invocation.number("--ring").value_or(kDefaultRing);
}

Stream openStream(const Invocation& invocation, const std::string& path, uint64_t from, bool lenient)
{
  return openStream(invocation, path, from, formChoice(invocation), lenient);
}

Stream openStream(const Invocation& invocation, const std::string& path, uint64_t from, const FormChoice& choice,
                  bool lenient)
{
  const InputLimits limits{ringBytes(invocation), invocation.number("--spool-limit").value_or(kDefaultSpool)};
  Stream stream{openSource(path, limits, from), {}};
  stream.source->setDictionary(dictionaryFor(invocation, path));
  stream.recognition = recognise(*stream.source, choice);
  const bool formGiven = choice.swapped || choice.root64 || choice.aligned;
  if (!formGiven)
  {
    stream.kind = otherKindOf(*stream.source, stream.recognition);
  }
  if (!stream.isStream() && !lenient)
  {
    throw Failure(kTooDamaged, noStream(stream));
  }
  return stream;
}

Problem noStream(const Stream& stream)
{
  Problem problem{stream.source->name()};
  if (stream.kind)
  {
    problem.sentence = "this is " + std::string(stream.kind->text) + ", no stream";
    problem.hint = hintOf(*stream.kind);
    return problem;
  }
  problem.sentence =
      stream.source->size() == 0 ? "the file is empty, no stream" : "this is no stream, or nothing of it is whole";
  problem.hint = stream.source->size() == 0
                     ? ""
                     : "'tav info' tells what was tried; --byte-order, --root and --align say how to read it";
  return problem;
}

Stream openStream(const Invocation& invocation, bool lenient)
{
  return openStream(invocation, invocation.arguments().at(0), invocation.number("--from").value_or(0), lenient);
}

DamageNotices::DamageNotices(Stream& stream)
    : stream_(stream), watch_(stream.bytes(), stream.form(), [this](PassedOver passed) { add(std::move(passed)); })
{
}

void DamageNotices::add(PassedOver passed)
{
  ++places_;
  if (passed_.size() < kMostLines)
  {
    passed.sentence += passed.otherStream ? readsFrom(*stream_.source, passed.offset) : "";
    passed_.push_back(std::move(passed));
  }
}

Status DamageNotices::tell() const
{
  const std::string& name = stream_.source->name();
  for (const PassedOver& passed : passed_)
  {
    report(Problem{name, passed.offset, passed.path, passed.sentence, passed.code});
  }
  if (places_ > passed_.size())
  {
    report(Problem{.file = name,
                   .sentence = "passed over " + counted(places_ - passed_.size(), "more place") +
                               "; 'tav check' tells all"});
  }
  return places_ == 0 ? kFine : kFindings;
}

Status forFile(const Invocation& invocation, const std::string& name,
               const std::function<Status(Stream&, DamageNotices&)>& work)
{
  std::optional<Stream> stream;
  std::optional<DamageNotices> notices;
  Status status = kFine;
  try
  {
    try
    {
      stream.emplace(openStream(invocation, name, invocation.number("--from").value_or(0)));
    }
    catch (const Failure& failure)
    {
      report(failure.problem);
      return failure.status;
    }
    notices.emplace(*stream);
    status = work(*stream, *notices);
    tellStatistics(invocation, stream->bytes());
  }
  catch (const Error& error)
  {
    report(withHint(error.problem()));
    status = statusOf(error);
  }
  return notices ? std::max(status, notices->tell()) : status;
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
