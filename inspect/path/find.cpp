// The nodes that several paths lead to, from what threads find in the parts of a file.
#include "tav/inspect/find.hpp"

#include <algorithm>
#include <bitset>
#include <memory>
#include <utility>

#include "inspect/path/reach.h"
#include "inspect/plan/partChain.h"
#include "inspect/walk/mostCounts.h"
#include "inspect/walk/pathSteps.h"

namespace tav::inspect
{

namespace
{

constexpr size_t kMostHits = size_t{64} * 1024; ///< that a part is remembered with; else they are found once more

/// What a walk through a part knows of a node that a path leads to.
struct Hit
{
  size_t path;
  size_t known; ///< groups around the node that are around the part, too: their places are not known yet
  size_t first; ///< in the steps behind those of all hits: its own
  size_t count; ///< of these, the node last
};

using Matchers = std::vector<PathMatcher>;

Matchers matchersOf(std::span<const Path> paths)
{
  return Matchers(paths.begin(), paths.end());
}

/// Before a place, how many siblings with an id there were in a group around it.
uint64_t countBefore(const Walker::State& state, size_t level, uint16_t elm)
{
  const size_t from = state.frames[level].counts;
  const size_t to = level + 1 < state.frames.size() ? state.frames[level + 1].counts : state.counts.size();
  for (size_t i = from; i < to; ++i)
  {
    if (state.counts[i].elm == elm)
    {
      return state.counts[i].count;
    }
  }
  return 0;
}

class FindJob
{
public:
  class Walk
  {
  public:
    /// `job`: null for a part that is tried. What it would tell is left to the walk that goes on.
    Walk(FindJob* job, ByteSource& source, const Form& form, Matchers matchers, const Walker::State& state, bool looks)
        : job_(job), looks_(looks), walker_(Walker::from(source, form, state)), matchers_(std::move(matchers))
    {
      for (size_t i = 1; i < state.frames.size(); ++i)
      {
        line_.push_back(state.frames[i].node);
      }
      known_ = line_.size();
      if (job != nullptr)
      {
        watch_ = std::make_unique<DamageWatch>(
            source, form, job->work_.passed ? job->work_.passed : [](const PassedOver&) {});
      }
      for (const Event& group : groupsAround(state))
      {
        job_ != nullptr ? watch_->see(walker_, group) : enter(group);
      }
    }

    bool step()
    {
      if ((job_ != nullptr && job_->isDone()) || !walker_.next(event_))
      {
        return false;
      }
      if (watch_)
      {
        watch_->see(walker_, event_);
        job_->reached(event_.offset);
      }
      if (event_.what == What::nodeBegin)
      {
        const bool reaches = job_ != nullptr ? tellMatches() : keepMatches();
        if (event_.node.isGroup() && !reaches)
        {
          walker_.skip();
        }
      }
      return true;
    }
    const Walker& walker() const { return walker_; }
    /// Damage is told of by the walk that goes on, which also steps over the group that nothing is asked of, if it can.
    bool isSpoilt() const
    {
      return spoilt_ || hits_.size() > kMostHits || event_.what == What::damaged ||
             (event_.what == What::nodeEnd && event_.node.isGroup() && event_.node.has(kOverrun));
    }
    static bool isPlain() { return true; }
    /// What is looked up below a node may ask for the damage before it, of which no walk tells.
    bool leansOnDamage() const { return looks_ || walker_.leansOnDamage(); }

    const std::vector<Hit>& hits() const { return hits_; }
    std::span<const Node> stepsOf(const Hit& hit) const { return std::span(steps_).subspan(hit.first, hit.count); }
    Matchers takeMatchers() { return std::move(matchers_); }

  private:
    /// A group around the part. Where a path looks ahead, more than its name would have to be known.
    void enter(const Event& group)
    {
      bool reaches = false;
      for (PathMatcher& matcher : matchers_)
      {
        if (!looks_)
        {
          static_cast<void>(matcher.matches(group.node));
          reaches = reaches || matcher.reachesBelow();
        }
      }
      spoilt_ = !reaches;
    }

    bool tellMatches()
    {
      bool reaches = false;
      for (size_t i = 0; i < matchers_.size(); ++i)
      {
        if (!job_->isOpen(i))
        {
          continue;
        }
        if (matchers_[i].matches(walker_, event_))
        {
          job_->tell({i, event_.node, walker_.source(), walker_.form(),
                      [this](PathStyle style) { return walker_.path(event_, style); }});
        }
        reaches = reaches || (job_->isOpen(i) && matchers_[i].reachesBelow());
      }
      return reaches;
    }

    bool keepMatches()
    {
      const auto depth = static_cast<size_t>(event_.depth);
      known_ = std::min(known_, depth);
      line_.resize(depth);
      line_.push_back(event_.node);
      if (depth == known_ && !children_[event_.node.elm()])
      {
        children_.set(event_.node.elm());
        spoilt_ = spoilt_ || ++kinds_ > kMostCounts / 2; // some may not be counted
      }
      bool reaches = false;
      for (size_t i = 0; i < matchers_.size(); ++i)
      {
        if (matchers_[i].matches(walker_, event_))
        {
          hits_.push_back({i, known_, steps_.size(), line_.size() - known_});
          steps_.insert(steps_.end(), line_.begin() + static_cast<ptrdiff_t>(known_), line_.end());
        }
        reaches = reaches || matchers_[i].reachesBelow();
      }
      return reaches;
    }

    FindJob* job_;
    bool looks_;
    Walker walker_;
    Matchers matchers_;
    std::unique_ptr<DamageWatch> watch_{};
    Event event_{};
    // Of a part that is tried:
    bool spoilt_ = false;
    std::vector<Node> line_{};      ///< the groups around the place, and the node
    size_t known_ = 0;              ///< how many of them are around the part, too
    std::bitset<65536> children_{}; ///< the ids in the groups around the part
    size_t kinds_ = 0;              ///< how many those are
    std::vector<Hit> hits_{};
    std::vector<Node> steps_{}; ///< that lead to them
  };

  FindJob(const Form& form, std::span<const Path> paths, const PathWork& work, bool looks)
      : form_(form), paths_(paths), work_(work), looks_(looks), matchers_(matchersOf(paths)), found_(paths.size())
  {
  }

  std::unique_ptr<Walk> tryFrom(ByteSource& source, const Walker::State& state) const
  {
    return std::make_unique<Walk>(nullptr, source, form_, matchersOf(paths_), state, looks_);
  }
  std::unique_ptr<Walk> goOnFrom(ByteSource& source, const Walker::State& state)
  {
    return std::make_unique<Walk>(this, source, form_, std::exchange(matchers_, {}), state, looks_);
  }

  bool mayFollow(ByteSource& source, const Walker::State& sure)
  {
    source_ = &source;
    before_ = sure;
    return sure.counts.size() <= kMostCounts / 2;
  }

  void take(Walk& walk)
  {
    matchers_ = walk.takeMatchers();
    for (const Hit& hit : walk.hits())
    {
      if (isOpen(hit.path))
      {
        tellHit(hit, walk.stepsOf(hit));
      }
    }
  }

  void reached(uint64_t offset) const
  {
    if (work_.progress)
    {
      work_.progress(offset);
    }
  }

  bool isOpen(size_t path) const { return work_.all || found_[path] == 0; }
  bool isDone() const
  {
    return !work_.all && std::none_of(found_.begin(), found_.end(), [](uint64_t count) { return count == 0; });
  }

  const std::vector<uint64_t>& found() const { return found_; }

private:
  void tellHit(const Hit& hit, std::span<const Node> steps)
  {
    if (!work_.found)
    {
      ++found_[hit.path];
      return;
    }
    Node node = steps.back();
    node.ordinal += steps.size() == 1 ? countBefore(before_, hit.known, node.elm()) : 0;
    tell({hit.path, node, *source_, form_, [&](PathStyle style) { return pathOfHit(hit, steps, style); }});
  }

  /// The first step behind the groups around the part was counted from the part's beginning.
  std::string pathOfHit(const Hit& hit, std::span<const Node> steps, PathStyle style) const
  {
    const Dictionary& dictionary = source_->dictionary();
    return textOfSteps(hit.known + steps.size(), style, [&](std::string& text, uint64_t i) {
      const auto level = static_cast<size_t>(i);
      Node step = level < hit.known ? before_.frames[level + 1].node : steps[level - hit.known];
      step.ordinal += i == hit.known ? countBefore(before_, hit.known, step.elm()) : 0;
      appendStep(text, step, dictionary);
    });
  }

  void tell(const PathMatch& match)
  {
    ++found_[match.path];
    if (work_.found)
    {
      work_.found(match);
    }
  }

  Form form_;
  std::span<const Path> paths_;
  const PathWork& work_;
  bool looks_;        ///< a path looks ahead
  Matchers matchers_; ///< at the sure place
  std::vector<uint64_t> found_;
  ByteSource* source_ = nullptr;
  Walker::State before_{}; ///< where the part began that is taken next
};

std::vector<Part> partsOf(ByteSource& source, const Form& form, std::span<const Path> paths, const PathWork& work,
                          bool looks)
{
  const auto staysIn = [](const Path& path) { return staysInRoot(path.compiled()); };
  // A path that has its node is not asked any more: which groups are stepped over depends on what was found before.
  if (!work.all && paths.size() > 1)
  {
    return {};
  }
  if (looks && !std::all_of(paths.begin(), paths.end(), staysIn))
  {
    return {};
  }
  return withWhole(source, partsFor(source, form, work.threads, work.partBytes),
                   [looks](const PartGroup&) { return looks; });
}

} // namespace

std::vector<uint64_t> findPaths(ByteSource& source, const Form& form, std::span<const Path> paths,
                                const PathWork& work)
{
  const bool looks = std::any_of(paths.begin(), paths.end(), PathMatcher::looksAhead);
  const std::vector<Part> parts = partsOf(source, form, paths, work, looks);
  FindJob job(form, paths, work, looks);
  if (job.isDone())
  {
    return job.found();
  }
  if (!parts.empty())
  {
    PartChain<FindJob>(source, parts, job).run(work.threads);
    return job.found();
  }
  walkThrough(source, form, job);
  return job.found();
}

} // namespace tav::inspect
