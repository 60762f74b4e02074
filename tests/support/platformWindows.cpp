#include "support/platform.h"

#include <atomic>
#include <filesystem>
#include <io.h>
#include <stdexcept>
#include <system_error>

#include "kor/windows.h"
#include "tools/host/host.h"

#include <psapi.h> // behind the system's main header

namespace test
{

std::string makeFolder(const std::string& prefix)
{
  const std::filesystem::path parent = std::filesystem::temp_directory_path();
  for (unsigned attempt = 0; attempt < 1'000'000; ++attempt)
  {
    const std::filesystem::path folder =
        parent / (prefix + std::to_string(tav::host::processId()) + "-" + std::to_string(attempt));
    if (std::filesystem::create_directory(folder))
    {
      return tav::host::textOf(folder);
    }
  }
  throw std::runtime_error("no folder below " + parent.string());
}

const char* nullDevice()
{
  return "NUL";
}

FILE* temporaryStream()
{
  // tmpfile puts its files at the root of the drive, where not everybody may write, and two processes that ask for a
  // temporary name at the same time may get the same one.
  static std::atomic<unsigned> count{0};
  const std::filesystem::path path =
      std::filesystem::temp_directory_path() /
      ("tav-stream-" + std::to_string(tav::host::processId()) + "-" + std::to_string(count++));
  return _wfopen(path.c_str(), L"w+bD"); // D: it goes when it is closed
}

bool emptyStream(FILE* stream)
{
  std::rewind(stream);
  std::fflush(stream); // or what was read stays in its buffer
  return _chsize_s(_fileno(stream), 0) == 0;
}

int redirectOutput(FILE* stream)
{
  std::fflush(stdout);
  const int before = _dup(_fileno(stdout));
  _dup2(_fileno(stream), _fileno(stdout));
  return before;
}

void restoreOutput(int before)
{
  std::fflush(stdout);
  _dup2(before, _fileno(stdout));
  _close(before);
}

bool mapsFiles()
{
  return true;
}

uint64_t peakKibibytes()
{
  PROCESS_MEMORY_COUNTERS counters{};
  GetProcessMemoryInfo(GetCurrentProcess(), &counters, sizeof counters);
  return counters.PeakWorkingSetSize / 1024;
}

} // namespace test
