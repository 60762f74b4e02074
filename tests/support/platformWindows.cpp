#include "support/platform.h"

#include <cstdlib>
#include <filesystem>
#include <io.h>
#include <stdexcept>
#include <system_error>

#include "kor/host.h"
#include "kor/windows.h"

#include <psapi.h> // behind the system's main header

namespace test
{

std::string makeFolder(const std::string& prefix)
{
  const std::filesystem::path parent = std::filesystem::temp_directory_path();
  for (unsigned attempt = 0; attempt < 1'000'000; ++attempt)
  {
    const std::filesystem::path folder =
        parent / (prefix + std::to_string(tav::kor::processId()) + "-" + std::to_string(attempt));
    if (std::filesystem::create_directory(folder))
    {
      return tav::kor::textOf(folder);
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
  // tmpfile puts its files at the root of the drive, where not everybody may write.
  wchar_t* const name = _wtempnam(nullptr, L"tav");
  FILE* const stream = name != nullptr ? _wfopen(name, L"w+bD") : nullptr;
  std::free(name);
  return stream;
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

uint64_t peakKibibytes()
{
  PROCESS_MEMORY_COUNTERS counters{};
  GetProcessMemoryInfo(GetCurrentProcess(), &counters, sizeof counters);
  return counters.PeakWorkingSetSize / 1024;
}

} // namespace test
