#include "tav/inspect/follow.hpp"

#include <chrono>
#include <functional>
#include <memory>
#include <utility>

#include "inspect/document/follower.h"
#include "inspect/document/state.h"
#include "inspect/walk/pathSteps.h"
#include "kor/fileWatch.h"
#include "tav/inspect/document.hpp"
#include "tav/inspect/path.hpp"
#include "tav/inspect/problem.hpp"

namespace tav::inspect
{

namespace
{

Error notFollowed(const std::string& name)
{
  return Error(Problem{.file = name,
                       .sentence = "only a file that was opened by its path, from its first byte on, can be followed",
                       .code = TAV_RC_NOT_SUPPORTED});
}

constexpr uint64_t kAll = ~uint64_t{0};

} // namespace

/// A follower, and what says when it is to look.
class Following::Work
{
public:
  template<class Told>
  Work(const std::string& path, const Told& told, const DocumentOptions& options, const FollowOptions& how,
       std::function<void()> caughtUp)
      : follower_(path, options, told, how.stop), watch_(path), caughtUp_(std::move(caughtUp)), isQuiet_(!how.existing)
  {
  }

  uint64_t look(uint64_t most)
  {
    const uint64_t count = follower_.goOn(isQuiet_, most);
    if (count < most)
    {
      isQuiet_ = false;
      if (caughtUp_)
      {
        caughtUp_();
      }
    }
    return count;
  }
  void wait(std::chrono::milliseconds longest) { watch_.wait(static_cast<uint32_t>(longest.count())); }

  FollowEnd run(const FollowOptions& how)
  {
    using Clock = std::chrono::steady_clock;
    constexpr std::chrono::milliseconds longestWait(100); // how long a stop, or what no watch says of, can take
    look(kAll);
    auto last = Clock::now();
    while (!how.stop.stop_requested())
    {
      wait(longestWait);
      const uint64_t count = look(kAll);
      const auto now = Clock::now();
      last = count != 0 ? now : last;
      if (how.timeout.count() != 0 && now - last >= how.timeout)
      {
        return FollowEnd::timedOut;
      }
    }
    return FollowEnd::stopped;
  }

private:
  Follower follower_;
  kor::FileWatch watch_;
  std::function<void()> caughtUp_;
  bool isQuiet_; ///< what is there already is passed over
};

Following::Following(const std::string& path, const FollowTold& told, const DocumentOptions& options,
                     const FollowOptions& how)
{
  if (options.from != 0)
  {
    throw notFollowed(path);
  }
  work_ = std::make_unique<Work>(path, told, options, how, told.caughtUp);
}

Following::~Following() = default;

Following::Following(Following&&) noexcept = default;

uint64_t Following::look(uint64_t most)
{
  return work_->look(most);
}

void Following::wait(std::chrono::milliseconds longest)
{
  work_->wait(longest);
}

FollowEnd follow(const std::string& path, const FollowTold& told, const DocumentOptions& options,
                 const FollowOptions& how)
{
  return Following(path, told, options, how).work_->run(how);
}

FollowEnd Document::follow(const std::function<void(const tav::Node&)>& onNode, const FollowOptions& options) const
{
  if (state_->path.empty())
  {
    throw notFollowed(state_->source->name());
  }
  return Following::Work(state_->path, onNode, state_->options, options, {}).run(options);
}

std::string pathText(const Arrival& arrival, PathStyle style)
{
  return textOfSteps(arrival.above.size() + 1, style, [&arrival](std::string& text, uint64_t i) {
    appendStep(text, i < arrival.above.size() ? arrival.above[static_cast<size_t>(i)] : arrival.node,
               arrival.source.dictionary());
  });
}

} // namespace tav::inspect
