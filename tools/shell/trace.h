/// @file trace.h
#pragma once

#include <cstdio>
#include <string>
#include <vector>

#include "tools/shell/options.h"

namespace tav::tool
{

/// The library's trace as text in a file, from now until the object goes: --trace and --trace-probe. It is written
/// under its own name at once, so that it is there when the program does not come to its end.
class TraceFile
{
public:
  explicit TraceFile(const Invocation& invocation);
  ~TraceFile();
  TraceFile(const TraceFile&) = delete;
  TraceFile& operator=(const TraceFile&) = delete;

  struct Filter
  {
    FILE* file = nullptr;
    std::vector<uint32_t> probes{}; ///< empty: all
  };

private:
  Filter filter_{};
};

} // namespace tav::tool
