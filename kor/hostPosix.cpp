#include <algorithm>
#include <csignal>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <sstream>
#include <sys/ioctl.h>
#include <sys/utsname.h>
#include <unistd.h>

#include "kor/host.h"
#include "kor/interruptedFiles.h"

namespace tav::kor
{
namespace
{
// What a signal's handler may look at.
InterruptedFiles<char> filesToRemove;
volatile std::sig_atomic_t held = 0;
volatile std::sig_atomic_t waiting = 0; ///< the number of a signal that came while it was held

extern "C" void endBySignal(int number)
{
  if (held != 0)
  {
    waiting = number;
    return;
  }
  filesToRemove.each([](const char* path) { ::unlink(path); });
  std::signal(number, SIG_DFL);
  std::raise(number);
}

/// A number behind a word at the start of a line, as the files below /proc have them.
std::optional<uint64_t> numberAfter(const std::string& text, const std::string& word)
{
  std::istringstream lines(text);
  for (std::string line; std::getline(lines, line);)
  {
    if (!line.starts_with(word)) continue;
    const size_t digit = line.find_first_of("0123456789", word.size());
    if (digit == std::string::npos) return std::nullopt;
    return std::strtoull(&line[digit], nullptr, 10);
  }
  return std::nullopt;
}

std::string textAfter(const std::string& text, const std::string& word)
{
  std::istringstream lines(text);
  for (std::string line; std::getline(lines, line);)
  {
    const size_t colon = line.find(": ");
    if (line.starts_with(word) && colon != std::string::npos) return line.substr(colon + 2);
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

void describeMemory(MachineFacts& facts)
{
  const std::string memory = contentOf("/proc/meminfo");
  const auto bytes = [&](const char* word) {
    const auto kib = numberAfter(memory, word);
    return kib ? std::optional<uint64_t>(*kib * 1024) : std::nullopt;
  };
  facts.memTotal = bytes("MemTotal:");
  facts.memFree = bytes("MemFree:");
  facts.swapTotal = bytes("SwapTotal:");
  facts.swapFree = bytes("SwapFree:");
}

void describeProcessors(CpuFacts& cpu)
{
  const auto count = [](int name) {
    const long value = ::sysconf(name);
    return value > 0 ? std::optional<uint64_t>(static_cast<uint64_t>(value)) : std::nullopt;
  };
  cpu.configured = count(_SC_NPROCESSORS_CONF);
  cpu.online = count(_SC_NPROCESSORS_ONLN);
  const std::string cpus = contentOf("/proc/cpuinfo");
  cpu.vendor = textAfter(cpus, "vendor_id");
  cpu.model = textAfter(cpus, "model name");
  cpu.megahertz = numberAfter(cpus, "cpu MHz");
}
} // namespace

std::vector<std::string> commandLine(int argc, char** argv)
{
  return {argv + std::min(argc, 1), argv + argc};
}

bool isTerminal(FILE* stream)
{
  return ::isatty(::fileno(stream)) != 0;
}

std::optional<unsigned> terminalWidth()
{
  if (!isTerminal(stdout)) return std::nullopt;
  winsize size{};
  if (::ioctl(::fileno(stdout), TIOCGWINSZ, &size) == 0 && size.ws_col != 0) return size.ws_col;
  return 80;
}

void prepareStandardStreams()
{
  std::signal(SIGPIPE, SIG_IGN);
  std::signal(SIGXFSZ, SIG_IGN);
  for (const int number : {SIGINT, SIGTERM, SIGHUP, SIGQUIT})
  {
    // Who was told to ignore a signal (nohup) goes on ignoring it.
    if (std::signal(number, endBySignal) == SIG_IGN) std::signal(number, SIG_IGN);
  }
}

void removeOnInterrupt(const std::string& path)
{
  filesToRemove.add(path);
}

void keepOnInterrupt(const std::string& path)
{
  filesToRemove.drop(path);
}

HeldInterrupts::HeldInterrupts()
{
  held = 1;
}

HeldInterrupts::~HeldInterrupts()
{
  held = 0;
  if (waiting != 0) endBySignal(waiting);
}

uint64_t processId()
{
  return static_cast<uint64_t>(::getpid());
}

MachineFacts describeMachine()
{
  MachineFacts facts;
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
  for (double load = 0; facts.loads.size() < 3 && loads >> load;) facts.loads.push_back(load);
  describeProcessors(facts.cpu);
  describeMemory(facts);
  return facts;
}
} // namespace tav::kor
