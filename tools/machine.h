/// @file machine.h
/// Everything that the program asks of the operating system beside the library and the standard library. The one file
/// with system headers is machine.cpp.
#pragma once

#include <cstdint>
#include <cstdio>
#include <optional>
#include <string>
#include <vector>

namespace tav::tool
{

/// Whether a standard stream is a terminal.
bool isTerminal(FILE* stream);

/// Columns of the terminal on standard output; nothing when there is none.
std::optional<unsigned> terminalWidth();

/// Switches standard input and output to bytes, and makes a closed pipe an error of the write.
void prepareStandardStreams();

/// Removes a file when the program is interrupted or told to end; one file at a time, an empty path stands for none.
/// The program then ends as by the signal itself.
void removeOnInterrupt(const std::string& path);

/// The number of this process, for names of temporary files.
uint64_t processId();

/// Moves a file into place; without `replace` it never takes the place of another one, not even of one that appeared
/// just now. Returns a code of codes.h.
uint32_t moveIntoPlace(const std::string& from, const std::string& to, bool replace);

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

} // namespace tav::tool
