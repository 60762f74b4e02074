/// @file progressSteps.h
/// How far a work is, for who wants to know: not at each node, which would take longer than looking at most of them.
#pragma once

#include <cstdint>
#include <functional>

namespace tav::inspect
{

class ProgressSteps
{
public:
  /// `tell` outlives it; nothing in it: nobody wants to know.
  explicit ProgressSteps(const std::function<void(uint64_t)>& tell)
      : tell_(tell)
  {
  }

  /// Told at first, and then of places that are a step away from the one that was told last.
  void at(uint64_t offset)
  {
    if (offset - told_ >= kStep && tell_) // also where it is before that
    {
      told_ = offset;
      tell_(offset);
    }
  }

private:
  static constexpr uint64_t kStep = uint64_t{64} * 1024;

  const std::function<void(uint64_t)>& tell_;
  uint64_t told_ = ~uint64_t{0} - kStep; ///< a step away from all places
};

} // namespace tav::inspect
