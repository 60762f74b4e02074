/// @file machine.h
/// What the machine tells about itself.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

namespace tav::host
{
struct CpuFacts
{
  std::string vendor{}; ///< as the processor gives it; empty when unknown
  std::string model{};
  std::optional<uint64_t> configured{};
  std::optional<uint64_t> online{};
  std::optional<uint64_t> megahertz{};
};

/// What this machine tells about itself; what it does not tell is empty.
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
  std::optional<uint64_t> bootSeconds{}; ///< since 1970
  std::vector<double> loads{};           ///< of the last 1, 5 and 15 minutes
};

MachineFacts describeMachine();
} // namespace tav::host
