// Checks a file by one thread or several.
#include <array>
#include <cstddef>
#include <memory>
#include <utility>

#include "inspect/plan/partChain.h"
#include "inspect/walk/progressSteps.h"
#include "tav/inspect/checker.hpp"

namespace tav::inspect
{

namespace
{

using Wanted = std::array<bool, static_cast<size_t>(RuleId::count)>;

Wanted wantedOf(const CheckOptions& options)
{
  Wanted wanted{};
  for (const Rule& rule : rules())
  {
    wanted[static_cast<size_t>(rule.rule)] = options.wanted ? options.wanted(rule.rule) : !rule.note;
  }
  return wanted;
}

class CheckJob
{
public:
  struct Walk
  {
    bool step()
    {
      const bool goesOn = checker.step();
      if (goesOn)
      {
        progress.at(checker.position());
      }
      return goesOn;
    }
    const Walker& walker() const { return checker.walker(); }
    bool isSpoilt() const { return checker.findings() + checker.damages() != 0; }
    bool isPlain() const { return checker.isPlain(); }
    bool leansOnDamage() const { return walker().leansOnDamage(); }

    Checker checker;
    ProgressSteps progress;
  };

  CheckJob(const Form& form, const CheckOptions& options, const Wanted& wanted)
      : form_(form), options_(options), wanted_(wanted) {}

  std::unique_ptr<Walk> tryFrom(ByteSource& source, const Walker::State& state) const
  {
    return begin(source, state, {}, false, untold_);
  }
  std::unique_ptr<Walk> goOnFrom(ByteSource& source, const Walker::State& state) const
  {
    const auto sink = options_.sink ? options_.sink : [](const Finding&) {};
    return begin(source, state, sink, rootEnded_, options_.progress);
  }
  void take(const Walk& walk)
  {
    totals_.nodes += walk.checker.nodes();
    totals_.endElements += walk.checker.endElements();
    rootEnded_ = rootEnded_ || walk.checker.rootEnded();
  }
  void reached(uint64_t offset) const
  {
    if (options_.progress)
    {
      options_.progress(offset);
    }
  }
  const CheckTotals& totals() const { return totals_; }

private:
  std::unique_ptr<Walk> begin(ByteSource& source, const Walker::State& state, Checker::Sink sink, bool rootEnded,
                              const std::function<void(uint64_t)>& progress) const
  {
    const auto wanted = [this](RuleId rule) { return wanted_[static_cast<size_t>(rule)]; };
    // NOLINTNEXTLINE(modernize-make-unique): clang 14 makes no aggregate of arguments in parentheses
    return std::unique_ptr<Walk>(new Walk{
        Checker(source, form_, wanted, std::move(sink), options_.style, state, rootEnded), ProgressSteps(progress)});
  }

  Form form_;
  const CheckOptions& options_;
  const Wanted& wanted_;
  const std::function<void(uint64_t)> untold_{};
  CheckTotals totals_{};
  bool rootEnded_ = false;
};

} // namespace

CheckTotals check(ByteSource& source, const Form& form, const CheckOptions& options)
{
  const Wanted wanted = wantedOf(options);
  const std::vector<Part> parts = partsFor(source, form, options.threads, options.partBytes);
  CheckJob job(form, options, wanted);
  if (!parts.empty())
  {
    PartChain<CheckJob>(source, parts, job).run(options.threads);
    return job.totals();
  }
  job.take(*walkThrough(source, form, job));
  return job.totals();
}

} // namespace tav::inspect
