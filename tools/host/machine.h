/// @file machine.h
/// What the machine reports about itself.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

namespace tav::host
{
struct CpuFacts
{
  std::optional<uint64_t> configured{};
  std::optional<uint64_t> online{};
};

/// What this machine reports about itself; what it does not report is empty.
struct MachineFacts
{
  std::string hostName{};
  std::string machine{}; ///< kind of processor
  std::string osName{};
  std::string osRelease{};
  std::string osVersion{};
  CpuFacts cpu{};
  std::optional<uint64_t> memTotal{}; ///< all in bytes
  std::optional<uint64_t> memFree{};
  std::optional<uint64_t> swapTotal{};
  std::optional<uint64_t> swapFree{};
};

MachineFacts describeMachine();
} // namespace tav::host
