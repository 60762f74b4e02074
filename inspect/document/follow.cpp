#include "tav/inspect/follow.hpp"

#include <chrono>

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

FollowEnd goOnFollowing(Follower& follower, const std::string& path, const FollowOptions& how,
                        const std::function<void()>& caughtUp)
{
  using Clock = std::chrono::steady_clock;
  constexpr std::chrono::milliseconds longestWait(100); // how long a stop, or what no watch says of, can take
  kor::FileWatch watch(path);
  const auto look = [&](bool quiet) {
    const uint64_t count = follower.goOn(quiet);
    if (caughtUp)
    {
      caughtUp();
    }
    return count;
  };
  look(!how.existing);
  auto last = Clock::now();
  while (!how.stop.stop_requested())
  {
    watch.wait(static_cast<uint32_t>(longestWait.count()));
    const uint64_t count = look(false);
    const auto now = Clock::now();
    last = count != 0 ? now : last;
    if (how.timeout.count() != 0 && now - last >= how.timeout)
    {
      return FollowEnd::timedOut;
    }
  }
  return FollowEnd::stopped;
}

} // namespace

FollowEnd follow(const std::string& path, const FollowTold& told, const DocumentOptions& options,
                 const FollowOptions& how)
{
  if (options.from != 0)
  {
    throw notFollowed(path);
  }
  Follower follower(path, options, told, how.stop);
  return goOnFollowing(follower, path, how, told.caughtUp);
}

FollowEnd Document::follow(const std::function<void(const tav::Node&)>& onNode, const FollowOptions& options) const
{
  if (state_->path.empty())
  {
    throw notFollowed(state_->source->name());
  }
  Follower follower(state_->path, state_->options, onNode, options.stop);
  return goOnFollowing(follower, state_->path, options, {});
}

std::string pathText(const Arrival& arrival, PathStyle style)
{
  return textOfSteps(arrival.above.size() + 1, style, [&arrival](std::string& text, uint64_t i) {
    appendStep(text, i < arrival.above.size() ? arrival.above[static_cast<size_t>(i)] : arrival.node,
               arrival.source.dictionary());
  });
}

} // namespace tav::inspect
