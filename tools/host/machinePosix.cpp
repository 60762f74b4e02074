#include <cstdlib>
#include <fstream>
#include <sstream>
#include <sys/utsname.h>
#include <unistd.h>

#include "tools/host/machine.h"

namespace tav::host
{
namespace
{
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
}
} // namespace

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
  describeProcessors(facts.cpu);
  describeMemory(facts);
  return facts;
}
} // namespace tav::host
