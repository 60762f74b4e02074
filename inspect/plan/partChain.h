/// One walk over a stream in one form that is made of walks through its parts, by several threads.
#pragma once

#include <algorithm>
#include <atomic>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <utility>
#include <vector>

#include "inspect/plan/partRun.h"
#include "inspect/plan/partState.h"
#include "tav/inspect/plan.hpp"

namespace tav::inspect
{

/// The parts for `threads`; none where one thread does it as well. `partBytes`: how long a part is; 0: by the size of
/// the file, of which a small one is not cut.
std::vector<Part> partsFor(ByteSource& source, const Form& form, unsigned threads, uint64_t partBytes);

/// The parts, each of which begins where the outermost group around it does that is to stay whole; none where that
/// leaves one.
std::vector<Part> withWhole(const ByteSource& source, std::vector<Part> parts,
                            const std::function<bool(const PartGroup&)>& isWhole);

/// Whether a walk stands where a part begins.
bool standsAt(const Walker& walk, const Part& part);

/// Threads walk through parts of which nobody knows yet whether the whole walk comes by there. The caller's thread
/// takes what they find in the order of the parts, as far as each ended just as the next begins. Where one did not, or
/// met something that only the whole walk can tell of, the caller's thread walks from the last place that is sure until
/// it comes to the beginning of a part.
///
/// A Job has, for its walk through a part or from a sure place:
///   using Walk                                         one piece of it, with
///     bool step()                                      goes on by an event; false at the end of the file
///     const Walker& walker() const
///     bool isSpoilt() const                            it has met what only the whole walk can tell of
///     bool isPlain() const                             nothing before the place has a say behind it, but for the walk
///     bool leansOnDamage() const                       as Walker's
///   std::unique_ptr<Walk> tryFrom(source, state)       called by any thread
///   std::unique_ptr<Walk> goOnFrom(source, state)      the others by the caller's
///   void take(Walk&)                                   what was found in it comes next
///   void reached(uint64_t offset)
/// and, where it asks for more,
///   bool mayFollow(source, const Walker::State& sure)  told before it takes a part that begins at a sure place, with
///                                                      bytes of the caller's thread; false: walk through it once more
///   bool isDone()                                      nothing more is asked for
template<class Job>
class PartChain
{
public:
  using Walk = typename Job::Walk;

  PartChain(ByteSource& source, const std::vector<Part>& parts, Job& job)
      : source_(source), parts_(parts), job_(job), tries_(parts.size())
  {
  }

  void run(unsigned threads)
  {
    Walker::State sure = stateOf(source_, parts_.front());
    PartRun run(source_, parts_.size(), threads, [this](const std::atomic<bool>& stop, ByteSource& source, size_t i) {
      tries_[i] = tryPart(stop, source, i);
    });
    for (size_t i = 0; i < parts_.size() && !isDone();)
    {
      const Try one = run.await(i) ? std::exchange(tries_[i], Try{}) : Try{};
      const bool joined = one.walk != nullptr && mayFollow(run.source(), sure) && join(sure, one);
      i = joined && one.seam ? i + 1 : goOn(run.source(), sure, i);
      job_.reached(i < parts_.size() ? parts_[i].offset : source_.size());
      run.passTo(i);
    }
  }

private:
  struct Try
  {
    std::shared_ptr<Walk> walk{}; ///< null: of no use
    Walker::State end{};
    bool seam = false; ///< the next part begins there
  };

  bool isDone() const
  {
    if constexpr (requires(const Job& job) { job.isDone(); })
    {
      return job_.isDone();
    }
    else
    {
      return false;
    }
  }

  bool mayFollow(ByteSource& source, const Walker::State& sure)
  {
    if constexpr (requires(Job & job) { job.mayFollow(source, sure); })
    {
      return job_.mayFollow(source, sure);
    }
    else
    {
      return true;
    }
  }

  Try tryPart(const std::atomic<bool>& stop, ByteSource& source, size_t i)
  {
    std::shared_ptr<Walk> walk = job_.tryFrom(source, stateOf(source, parts_[i]));
    const Walker& walker = walk->walker();
    const bool isLast = i + 1 == parts_.size();
    const uint64_t end = isLast ? kNoOffset : parts_[i + 1].offset;
    while (walker.place() < end || !walker.isBetween())
    {
      if (!walk->step())
      {
        return isLast ? Try{std::move(walk), walker.state(), true} : Try{};
      }
      if (walk->isSpoilt() || stop.load(std::memory_order_relaxed))
      {
        return {};
      }
    }
    // What it has found is right wherever it ends, as when it stepped over a group that goes on beyond the part.
    const bool seam = standsAt(walker, parts_[i + 1]);
    return walk->isPlain() ? Try{std::move(walk), walker.state(), seam} : Try{};
  }

  bool join(Walker::State& sure, const Try& one)
  {
    const Walker& walker = one.walk->walker();
    const bool wasDamaged = std::any_of(sure.frames.begin(), sure.frames.end(),
                                        [](const auto& frame) { return frame.lastDamage != 0; });
    Walker::State end = one.end;
    if ((one.walk->leansOnDamage() && wasDamaged) || !end.join(sure, walker.inherited()))
    {
      return false;
    }
    sure = std::move(end);
    job_.take(*one.walk);
    return true;
  }

  /// Walks on from the last sure place until it comes to the beginning of a part; returns which.
  size_t goOn(ByteSource& source, Walker::State& sure, size_t i)
  {
    const std::unique_ptr<Walk> walk = job_.goOnFrom(source, sure);
    const Walker& walker = walk->walker();
    for (++i; i < parts_.size();)
    {
      if (walker.place() < parts_[i].offset || !walker.isBetween())
      {
        if (!walk->step())
        {
          i = parts_.size();
        }
        continue;
      }
      if (standsAt(walker, parts_[i]) && walk->isPlain())
      {
        break;
      }
      i += walker.place() > parts_[i].offset || !walk->step() ? 1 : 0;
    }
    while (i == parts_.size() && walk->step())
    {
    }
    sure = walker.state();
    job_.take(*walk);
    return i;
  }

  ByteSource& source_;
  const std::vector<Part>& parts_;
  Job& job_;
  std::vector<Try> tries_;
};

/// Walks through all of a file by the caller's thread alone.
template<class Job>
auto walkThrough(ByteSource& source, const Form& form, Job& job)
{
  auto walk = job.goOnFrom(source, stateOf(source, wholeOf(source, form)));
  while (walk->step())
  {
  }
  return walk;
}

} // namespace tav::inspect
