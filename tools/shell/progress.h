/// @file progress.h
#pragma once

#include <chrono>
#include <cstdint>
#include <string>

#include "tav/inspect/source.hpp"
#include "tools/shell/names.h"

namespace tav::tool
{

/// A line on standard error that shows how far long work is: part, rate, remaining time. Only on a terminal and only
/// when the work takes more than half a second. Cheap to call for every node.
class Progress
{
public:
  Progress(std::string what, uint64_t totalBytes);
  /// Also shows how far a source has come inside one long payload. The source outlives this object.
  Progress(std::string what, ByteSource& source);
  ~Progress(); ///< wipes the line
  Progress(const Progress&) = delete;
  Progress& operator=(const Progress&) = delete;

  void at(uint64_t bytes)
  {
    if (active_ && (++calls_ & 1023) == 0)
    {
      show(bytes);
    }
  }

  /// The same for who calls seldom.
  void reach(uint64_t bytes)
  {
    if (active_)
    {
      show(bytes);
    }
  }

private:
  void show(uint64_t bytes);

  using Clock = std::chrono::steady_clock;
  std::string what_;
  ByteSource* source_ = nullptr;
  uint64_t total_;
  Clock::time_point start_ = Clock::now();
  Clock::time_point last_ = start_;
  uint64_t calls_ = 0;
  bool active_;
  bool shown_ = false;
};

} // namespace tav::tool
