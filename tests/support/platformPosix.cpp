#include "support/platform.h"

#include <cstdlib>
#include <filesystem>
#include <stdexcept>
#include <sys/resource.h>
#include <unistd.h>

namespace test
{

std::string makeFolder(const std::string& prefix)
{
  std::string pattern = (std::filesystem::temp_directory_path() / (prefix + "XXXXXX")).string();
  if (mkdtemp(pattern.data()) == nullptr)
  {
    throw std::runtime_error("no folder " + pattern);
  }
  return pattern;
}

const char* nullDevice()
{
  return "/dev/null";
}

FILE* temporaryStream()
{
  return std::tmpfile();
}

/// Not here: a stream that was read may keep what it read, and a new file costs little.
bool emptyStream(FILE* /*stream*/)
{
  return false;
}

int redirectOutput(FILE* stream)
{
  std::fflush(stdout);
  const int before = dup(fileno(stdout));
  dup2(fileno(stream), fileno(stdout));
  return before;
}

void restoreOutput(int before)
{
  std::fflush(stdout);
  dup2(before, fileno(stdout));
  close(before);
}

uint64_t peakKibibytes()
{
  rusage usage{};
  getrusage(RUSAGE_SELF, &usage);
  return static_cast<uint64_t>(usage.ru_maxrss);
}

} // namespace test
