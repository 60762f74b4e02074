// The one file of the program that knows the operating system.
#include "tools/machine.h"

#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <thread>

#include "tav/kor.h"

#if defined(_WIN32)
#include <fcntl.h>
#include <io.h>
#include <process.h>
#include <windows.h>
#else
#include <sys/ioctl.h>
#include <sys/utsname.h>
#include <unistd.h>
#endif

namespace tav::tool
{

namespace
{

// What a signal's handler may look at. The flag is set last when there is a path and cleared first when there is none.
char g_pathToRemove[4096];
volatile std::sig_atomic_t g_hasPath = 0;

#if defined(_WIN32)
constexpr int kSignals[] = {SIGINT, SIGTERM};
#else
constexpr int kSignals[] = {SIGINT, SIGTERM, SIGHUP};
#endif

extern "C" void endBySignal(int number)
{
  if (g_hasPath != 0)
  {
#if defined(_WIN32)
    std::remove(g_pathToRemove);
#else
    ::unlink(g_pathToRemove);
#endif
  }
  std::signal(number, SIG_DFL);
  std::raise(number);
}

/// A number behind a word at the start of a line, as the files below /proc have them.
std::optional<uint64_t> numberAfter(const std::string& text, const std::string& word)
{
  std::istringstream lines(text);
  for (std::string line; std::getline(lines, line);)
  {
    if (line.starts_with(word))
    {
      const size_t digit = line.find_first_of("0123456789", word.size());
      return digit == std::string::npos ? std::nullopt
                                        : std::optional<uint64_t>(std::strtoull(&line[digit], nullptr, 10));
    }
  }
  return std::nullopt;
}

std::string textAfter(const std::string& text, const std::string& word)
{
  std::istringstream lines(text);
  for (std::string line; std::getline(lines, line);)
  {
    const size_t colon = line.find(": ");
    if (line.starts_with(word) && colon != std::string::npos)
    {
      return line.substr(colon + 2);
    }
  }
  return {};
}

std::string contentOf(const char* path)
{
  const std::ifstream file(path, std::ios::binary);
  std::ostringstream text;
  text << file.rdbuf();
  return text.str();
}

#if !defined(_WIN32)
uint32_t codeOfErrno(int error)
{
  switch (error)
  {
  case ENOENT: return KOR_RC_NO_SUCH_FILE;
  case EACCES:
  case EPERM: return KOR_RC_NO_PERMISSION;
  case ENOSPC:
  case EDQUOT: return KOR_RC_NO_SPACE;
  case EEXIST: return KOR_RC_FILE_EXISTS;
  case EISDIR: return KOR_RC_IS_FOLDER;
  case EROFS: return KOR_RC_READ_ONLY;
  case EIO: return KOR_RC_IO_ERROR;
  default: return KOR_RC_OS_ERROR;
  }
}
#endif

void describeMemory(MachineFacts& facts)
{
#if defined(_WIN32)
  MEMORYSTATUSEX status{};
  status.dwLength = sizeof status;
  if (GlobalMemoryStatusEx(&status) != 0)
  {
    facts.memTotal = status.ullTotalPhys;
    facts.memFree = status.ullAvailPhys;
  }
#else
  const std::string memory = contentOf("/proc/meminfo");
  const auto bytes = [&](const char* word) {
    const auto kib = numberAfter(memory, word);
    return kib ? std::optional<uint64_t>(*kib * 1024) : std::nullopt;
  };
  facts.memTotal = bytes("MemTotal:");
  facts.memFree = bytes("MemFree:");
  facts.swapTotal = bytes("SwapTotal:");
  facts.swapFree = bytes("SwapFree:");
#endif
}

void describeProcessors(MachineFacts& facts)
{
#if defined(_WIN32)
  facts.cpu.online = std::thread::hardware_concurrency();
#else
  const auto count = [](int name) {
    const long value = ::sysconf(name);
    return value > 0 ? std::optional<uint64_t>(static_cast<uint64_t>(value)) : std::nullopt;
  };
  facts.cpu.configured = count(_SC_NPROCESSORS_CONF);
  facts.cpu.online = count(_SC_NPROCESSORS_ONLN);
  const std::string cpus = contentOf("/proc/cpuinfo");
  facts.cpu.vendor = textAfter(cpus, "vendor_id");
  facts.cpu.model = textAfter(cpus, "model name");
  facts.cpu.megahertz = numberAfter(cpus, "cpu MHz");
#endif
}

} // namespace

bool isTerminal(FILE* stream)
{
#if defined(_WIN32)
  return _isatty(_fileno(stream)) != 0;
#else
  return ::isatty(::fileno(stream)) != 0;
#endif
}

std::optional<unsigned> terminalWidth()
{
  if (!isTerminal(stdout))
  {
    return std::nullopt;
  }
#if !defined(_WIN32)
  winsize size{};
  if (::ioctl(::fileno(stdout), TIOCGWINSZ, &size) == 0 && size.ws_col != 0)
  {
    return size.ws_col;
  }
#endif
  return 80;
}

void prepareStandardStreams()
{
#if defined(_WIN32)
  _setmode(_fileno(stdin), _O_BINARY);
  _setmode(_fileno(stdout), _O_BINARY);
#else
  std::signal(SIGPIPE, SIG_IGN);
#endif
  for (const int number : kSignals)
  {
    // Who was told to ignore a signal (nohup) goes on ignoring it.
    if (std::signal(number, endBySignal) == SIG_IGN)
    {
      std::signal(number, SIG_IGN);
    }
  }
}

void removeOnInterrupt(const std::string& path)
{
  g_hasPath = 0;
  if (!path.empty() && path.size() < sizeof g_pathToRemove)
  {
    std::memcpy(g_pathToRemove, path.c_str(), path.size() + 1);
    g_hasPath = 1;
  }
}

uint64_t processId()
{
#if defined(_WIN32)
  return static_cast<uint64_t>(_getpid());
#else
  return static_cast<uint64_t>(::getpid());
#endif
}

uint32_t moveIntoPlace(const std::string& from, const std::string& to, bool replace)
{
#if defined(_WIN32)
  const DWORD flags = replace ? MOVEFILE_REPLACE_EXISTING : 0;
  return MoveFileExA(from.c_str(), to.c_str(), flags) != 0 ? TAV_RC_OK : KOR_RC_FILE_EXISTS;
#else
  if (!replace)
  {
    // A link is refused when the name is taken, even by a file that came this very moment.
    if (::link(from.c_str(), to.c_str()) == 0)
    {
      ::unlink(from.c_str());
      return TAV_RC_OK;
    }
    std::error_code error;
    if (errno == EEXIST || std::filesystem::exists(to, error))
    {
      return KOR_RC_FILE_EXISTS;
    }
    // A file system without links: the name was free a moment ago.
  }
  return ::rename(from.c_str(), to.c_str()) == 0 ? TAV_RC_OK : codeOfErrno(errno);
#endif
}

MachineFacts describeMachine()
{
  MachineFacts facts;
#if !defined(_WIN32)
  utsname name{};
  if (::uname(&name) == 0)
  {
    facts.hostName = name.nodename;
    facts.machine = name.machine;
    facts.osName = name.sysname;
    facts.osRelease = name.release;
    facts.osVersion = name.version;
  }
  facts.bootSeconds = numberAfter(contentOf("/proc/stat"), "btime");
  std::istringstream loads(contentOf("/proc/loadavg"));
  for (double load = 0; facts.loads.size() < 3 && loads >> load;)
  {
    facts.loads.push_back(load);
  }
#else
  facts.osName = "Windows";
#endif
  describeProcessors(facts);
  describeMemory(facts);
  return facts;
}

} // namespace tav::tool
