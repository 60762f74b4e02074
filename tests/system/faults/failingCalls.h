/// The calls of the system that the library makes, each of which can be made to fail. They are put in front of the
/// system's own by preloading a library: see failingCalls.cpp.
#pragma once

#include <cstdint>

namespace faults
{

enum class Kind : uint8_t
{
  malloc,
  open,
  close,
  read,
  write,
  seek,
  stat,
  lock,
  sync,
  resize,
  remove
};
inline constexpr unsigned kKinds = 11;
inline constexpr const char* kKindNames[kKinds] = {"malloc", "open", "close", "read", "write", "seek",
                                                   "stat", "lock", "sync", "resize", "remove"};

/// An error that is none: the call transfers one byte only.
inline constexpr int kShort = -1;
/// An error in two steps: the call transfers one byte only, and the next one of its kind fails with EIO.
inline constexpr int kHalfway = -2;

/// Of one thread. Nothing counts or fails while `watching` is false, so that a test can go on with its own business.
struct Calls
{
  bool watching;
  Kind kind;     ///< which call fails
  uint64_t nth;  ///< from 1; 0: none
  int error;     ///< errno, or kShort
  bool happened; ///< the fault was met
  uint64_t counts[kKinds];
};

} // namespace faults

extern "C" {
/// The state of the calling thread.
faults::Calls* failingCalls();
/// Blocks that are allocated now, in the whole process.
int64_t failingCallsLiveBlocks();
}
