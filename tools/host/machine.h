/// @file machine.h
/// What the machine reports about itself.
#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <vector>

namespace tav::host
{
using Fact = std::optional<uint64_t>; ///< what the system does not tell is empty

struct CpuFacts
{
  Fact configured{};
  Fact online{};
  Fact speed{};          ///< MHz, of the first one
  Fact coresPerSocket{}; ///< of the first one
  Fact threadsPerCore{};
  Fact usage{};    ///< percent of all together since the last look, at the first one since the system was started
  Fact userTime{}; ///< all times in milliseconds, of all together since the system was started
  Fact niceTime{};
  Fact systemTime{};
  Fact idleTime{};
  Fact waitTime{};
  Fact interruptTime{};
  Fact stolenTime{};
};

/// All in bytes.
struct MemoryFacts
{
  Fact total{};
  Fact free{};
  Fact available{};
  Fact reserved{}; ///< that programs have been promised
  Fact buffers{};
  Fact cached{};
  Fact dirty{};
  Fact swapTotal{};
  Fact swapFree{};
};

struct LoadFacts
{
  Fact uptime{}; ///< seconds
  Fact last1{};  ///< average numbers of those that ran or would have, in hundredths, over so many minutes
  Fact last5{};
  Fact last15{};
  Fact running{};
  Fact processes{}; ///< with their threads
  Fact switches{};  ///< since the system was started
  Fact interrupts{};
  Fact started{};
};

struct DiskFacts
{
  std::string name{};
  Fact reads{};
  Fact readBytes{};
  Fact writes{};
  Fact writtenBytes{};
  Fact busyTime{}; ///< milliseconds
};

struct FileSystemFacts
{
  std::string folder{};
  std::string device{};
  std::string kind{};
  Fact id{};
  Fact total{}; ///< bytes
  Fact used{};
  Fact available{}; ///< to those who are not the administrator
};

struct TransferFacts
{
  Fact bytes{};
  Fact packets{};
  Fact errors{};
  Fact drops{};
};

struct NetworkFacts
{
  std::string name{};
  TransferFacts received{};
  TransferFacts sent{};
};

struct ProcessFacts
{
  uint64_t id = 0;
  std::string name{};
  uint64_t time = 0;   ///< of processors, in milliseconds
  uint64_t memory = 0; ///< bytes in memory
  uint64_t threads = 0;
  uint64_t recent = 0; ///< milliseconds since the last look
};

/// What this machine reports about itself.
struct MachineFacts
{
  std::string hostName{};
  std::string machine{}; ///< kind of processor
  std::string osName{};
  std::string osRelease{};
  std::string osVersion{};
  CpuFacts cpu{};
  MemoryFacts memory{};
  LoadFacts load{};
  std::vector<DiskFacts> disks{};
  std::vector<FileSystemFacts> fileSystems{};
  std::vector<NetworkFacts> networks{};
  std::vector<ProcessFacts> processes{}; ///< the busiest since the last look, the busiest first
};

inline constexpr size_t kMostDevices = 128; ///< disks, file systems and networks that are told, of each
inline constexpr size_t kMostProcesses = 10;

/// Looks at the machine any number of times, and remembers what the last look was.
class Machine
{
public:
  MachineFacts look();

private:
  uint64_t busy_ = 0; ///< of the processors
  uint64_t whole_ = 0;
  std::map<uint64_t, uint64_t> times_{}; ///< of the processes
};

inline MachineFacts describeMachine()
{
  return Machine().look();
}
} // namespace tav::host
