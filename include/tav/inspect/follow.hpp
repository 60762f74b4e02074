/// @file follow.hpp
/// Following a file that grows.
#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>
#include <span>
#include <string>
#if __has_include(<stop_token>)
#include <stop_token>
#else
#include <atomic>
#endif

#include "tav/inspect/api.hpp"
#include "tav/inspect/damageWatch.hpp"
#include "tav/inspect/documentOptions.hpp"
#include "tav/inspect/walker.hpp"

namespace tav::inspect
{

#if defined(__cpp_lib_jthread)
using StopToken = std::stop_token;
using StopSource = std::stop_source;
#else
/// Where the standard library has no std::stop_token: the part of it that is asked for, over a flag of the caller's.
class StopToken
{
public:
  StopToken() = default;
  explicit StopToken(const std::atomic<bool>& asked)
      : asked_(&asked) {}
  bool stop_requested() const noexcept { return asked_ != nullptr && asked_->load(std::memory_order_relaxed); }

private:
  const std::atomic<bool>* asked_ = nullptr;
};

/// The part of std::stop_source that goes with it. Must outlive its tokens.
class StopSource
{
public:
  StopSource() = default;
  StopSource(const StopSource&) = delete;
  StopSource& operator=(const StopSource&) = delete;

  StopToken get_token() const { return StopToken(asked_); }
  bool request_stop() noexcept { return !asked_.exchange(true); }
  bool stop_requested() const noexcept { return asked_.load(std::memory_order_relaxed); }

private:
  std::atomic<bool> asked_{false};
};
#endif

/// How a file is followed.
struct FollowOptions
{
  StopToken stop{};                     ///< ends it, at the latest after a tenth of a second
  std::chrono::milliseconds timeout{0}; ///< ends it when no node has come for so long; 0: nothing does
  bool existing = true;                 ///< begins with what is there already
};

/// Why following has ended.
enum class FollowEnd : uint8_t
{
  stopped,
  timedOut
};

/// What has become of the file at a path.
enum class FileChange : uint8_t
{
  missing,  ///< no file is there; what was open is read on until another one comes
  appeared, ///< one has come where none was
  replaced, ///< another one has taken its place and is read from its start
  shortened ///< what was told of it was cut off, or it was begun again; it is read from its start
};

/// A node that has come. All of it is valid during the call.
struct Arrival
{
  const Node& node;            ///< of a group that is open: kOpen
  std::span<const Node> above; ///< the groups around it, the root first
  ByteSource& source;          ///< the file as it is now
  const Form& form;            ///< of its stream
};

/// Who is told of what; those that are empty are not.
struct FollowTold
{
  std::function<void(const Arrival&)> node{};    ///< a group when it was opened, a data element when it is whole
  std::function<void(const Arrival&)> rootEnd{}; ///< a root has ended: closed, or left open in a file that was replaced
  std::function<void(const PassedOver&)> damage{};
  std::function<void(FileChange)> change{};
  std::function<void()> caughtUp{}; ///< all that is there was told; also at every look that finds nothing new
};

/// Following step by step, for programs that have a loop of their own. Used by one thread.
class Following
{
public:
  /// As `follow` below; of `how` the timeout is the loop's own.
  TAV_INSPECT_API Following(const std::string& path, const FollowTold& told, const DocumentOptions& options = {},
                            const FollowOptions& how = {});
  TAV_INSPECT_API ~Following();
  TAV_INSPECT_API Following(Following&&) noexcept;

  /// Tells of what is there and was not told yet, of `most` nodes at the most. Returns how many nodes came, with those
  /// that are passed over because they were there before: fewer than `most` where that was all.
  /// @throws Error as `follow`, and what the callbacks throw
  TAV_INSPECT_API uint64_t look(uint64_t most = ~uint64_t{0});
  /// Returns when the file may have changed, at the latest after so long.
  TAV_INSPECT_API void wait(std::chrono::milliseconds longest);

private:
  friend class Document;
  friend FollowEnd follow(const std::string& path, const FollowTold& told, const DocumentOptions& options,
                          const FollowOptions& how);
  class Work;
  std::unique_ptr<Work> work_;
};

/// As Document::follow, with all that is known of each node. The file need not be there yet, nor have a stream in it.
/// @throws Error as Document::follow, and what the callbacks throw
TAV_INSPECT_API FollowEnd follow(const std::string& path, const FollowTold& told, const DocumentOptions& options = {},
                                 const FollowOptions& how = {});

/// The path of a node that has come, written as Walker::path does.
TAV_INSPECT_API std::string pathText(const Arrival& arrival, PathStyle style = PathStyle::whole);

} // namespace tav::inspect
