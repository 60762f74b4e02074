#include "tools/cmd/following.h"

#include <utility>

#include "tools/host/host.h"
#include "tools/shell/dictionary.h"

namespace tav::tool
{

namespace
{

using inspect::Arrival;
using inspect::FileChange;
using inspect::FollowTold;

const char* sentenceOf(FileChange change)
{
  switch (change)
  {
  case FileChange::missing: return "there is no such file; waiting for one";
  case FileChange::appeared: return "a file has appeared; following it";
  case FileChange::replaced: return "another file has taken the place; following it";
  default: return "the file was made shorter, or begun again; reading it from its start";
  }
}

void refuseUnsuited(const Invocation& invocation)
{
  const std::string name = invocation.command().name;
  for (const char* const option : {"--from", "--stats"})
  {
    if (invocation.has(option))
    {
      throw Failure(name + ": --follow and " + option + " exclude each other");
    }
  }
  if (invocation.arguments().at(0) == "-")
  {
    throw Failure(name + ": --follow needs a FILE", "what comes through a pipe is read when all of it is there");
  }
}

/// Tells of the file, and stops at an interrupt.
class Follow
{
public:
  Follow(const Invocation& invocation, FollowTold told, Output& out)
      : path_(invocation.arguments().at(0)), told_(std::move(told)), out_(out) {}

  Status run(const Invocation& invocation)
  {
    const host::CaughtInterrupt caught;
    FollowTold mine;
    mine.node = [this](const Arrival& arrival) { take(told_.node, arrival); };
    mine.rootEnd = [this](const Arrival& arrival) { take(told_.rootEnd, arrival); };
    mine.damage = [this](const inspect::PassedOver& passed) {
      status_ = kFindings;
      report(Problem{path_, passed.offset, passed.path, passed.sentence, passed.code});
    };
    mine.change = [this](FileChange change) { tell(change); };
    mine.caughtUp = [this] { look(); };
    inspect::follow(path_, mine,
                    {.form = formChoice(invocation),
                     .ringBytes = ringBytes(invocation),
                     .dictionary = dictionaryFor(invocation, path_)},
                    {.stop = stop_.get_token()});
    return status_;
  }

private:
  void take(const std::function<void(const Arrival&)>& told, const Arrival& arrival)
  {
    hasNodes_ = true;
    if (told && !stop_.stop_requested())
    {
      told(arrival);
      out_.flush();
    }
    stopIfInterrupted();
  }
  void tell(FileChange change)
  {
    isMissing_ = change == FileChange::missing;
    report(Problem{.file = path_, .sentence = sentenceOf(change)});
    if (told_.change)
    {
      told_.change(change);
    }
  }
  void look()
  {
    if (!hasNodes_ && !isMissing_ && !std::exchange(hasSaidNone_, true))
    {
      report(Problem{.file = path_, .sentence = "no stream is in it so far; waiting for one"});
    }
    stopIfInterrupted();
  }
  void stopIfInterrupted()
  {
    if (host::CaughtInterrupt::hasCome())
    {
      stop_.request_stop();
    }
  }

  std::string path_;
  FollowTold told_;
  Output& out_;
  StopSource stop_{};
  Status status_ = kFine;
  bool hasNodes_ = false;
  bool isMissing_ = false;
  bool hasSaidNone_ = false;
};

} // namespace

FoundNode foundIn(const Walker& walker, const Event& event)
{
  return {walker.source(), walker.form(), event.node,
          [&walker, &event](PathStyle style) { return walker.path(event, style); }};
}

FoundNode foundIn(const Arrival& arrival)
{
  return {arrival.source, arrival.form, arrival.node,
          [&arrival](PathStyle style) { return inspect::pathText(arrival, style); }};
}

OptionSpec followOption()
{
  return {.names = "--follow",
          .help = "go on as the file grows, or another takes its place"};
}

Status followFile(const Invocation& invocation, FollowTold told, Output& out)
{
  refuseUnsuited(invocation);
  return Follow(invocation, std::move(told), out).run(invocation);
}

} // namespace tav::tool
