#include "support/platform.h"

#include <cstdlib>
#include <filesystem>
#include <stdexcept>
#include <sys/resource.h>
#include <unistd.h>

#if defined(__EMSCRIPTEN__)
#include <emscripten.h>

// There dup2 opens a file's path once more, and a temporary file has none any more.
EM_JS(int, copyDescriptor, (int from), {
  const to = FS.nextfd();
  FS.streams[to] = FS.streams[from];
  return to;
})
EM_JS(void, putDescriptor, (int from, int to), { FS.streams[to] = FS.streams[from]; })
EM_JS(void, forgetDescriptor, (int which), { FS.streams[which] = null; })
#endif

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

#if defined(__EMSCRIPTEN__)
bool mapsFiles()
{
  return false;
}

int redirectOutput(FILE* stream)
{
  std::fflush(stdout);
  const int before = copyDescriptor(fileno(stdout));
  putDescriptor(fileno(stream), fileno(stdout));
  return before;
}

void restoreOutput(int before)
{
  std::fflush(stdout);
  putDescriptor(before, fileno(stdout));
  forgetDescriptor(before);
}
#else
bool mapsFiles()
{
  return true;
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
#endif

uint64_t peakKibibytes()
{
  rusage usage{};
  getrusage(RUSAGE_SELF, &usage);
  return static_cast<uint64_t>(usage.ru_maxrss);
}

} // namespace test
