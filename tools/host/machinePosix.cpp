#include <cstdlib>
#include <sys/utsname.h>
#include <unistd.h>

#include "tools/host/machine.h"
#include "tools/host/machineParts.h"
#include "tools/host/procFilePosix.h"

namespace tav::host
{
namespace
{
void describeSystem(MachineFacts& facts)
{
  utsname name{};
  if (::uname(&name) != 0)
  {
    return;
  }
  facts.hostName = name.nodename;
  facts.machine = name.machine;
  facts.osName = name.sysname;
  facts.osRelease = name.release;
  facts.osVersion = name.version;
}

MemoryFacts describeMemory()
{
  const std::string memory = contentOf("/proc/meminfo");
  const auto bytes = [&](const char* word) { return times(numberAfter(memory, word), 1024); };
  return {.total = bytes("MemTotal:"),
          .free = bytes("MemFree:"),
          .available = bytes("MemAvailable:"),
          .reserved = bytes("Committed_AS:"),
          .buffers = bytes("Buffers:"),
          .cached = bytes("Cached:"),
          .dirty = bytes("Dirty:"),
          .swapTotal = bytes("SwapTotal:"),
          .swapFree = bytes("SwapFree:")};
}

/// "3.07" in hundredths.
Fact hundredths(std::string_view word)
{
  uint64_t whole = 0;
  uint64_t part = 0;
  const size_t dot = word.find('.');
  if (dot == std::string_view::npos || word.size() != dot + 3)
  {
    return std::nullopt;
  }
  const char* const end = word.data() + word.size();
  const bool isNumber = std::from_chars(word.data(), word.data() + dot, whole).ec == std::errc() &&
                        std::from_chars(word.data() + dot + 1, end, part).ec == std::errc();
  return isNumber ? Fact(whole * 100 + part) : std::nullopt;
}

void describeLoad(LoadFacts& load)
{
  const std::string uptime = contentOf("/proc/uptime");
  load.uptime = Words(uptime).number();
  const std::string averages = contentOf("/proc/loadavg");
  Words words(averages);
  load.last1 = hundredths(words.next());
  load.last5 = hundredths(words.next());
  load.last15 = hundredths(words.next());
  const std::string_view both = words.next(); // "2/345"
  load.running = Words(both).number();
  load.processes = Words(both.substr(std::min(both.size(), both.find('/') + 1))).number();
}

/// What does not change as the machine runs, but for processors that come and go.
void countProcessors(CpuFacts& cpu)
{
  const auto count = [](int name) {
    const long value = ::sysconf(name);
    return value > 0 ? Fact(static_cast<uint64_t>(value)) : std::nullopt;
  };
  cpu.configured = count(_SC_NPROCESSORS_CONF);
  cpu.online = count(_SC_NPROCESSORS_ONLN);
  // "cpu MHz\t\t: 2596.126": the lines of the first one are enough.
  const std::string text = contentOf("/proc/cpuinfo");
  const std::string first = text.substr(0, text.find("\n\n"));
  const auto value = [&first](std::string_view name) {
    const size_t at = first.find(name);
    const size_t colon = at == std::string::npos ? at : first.find(": ", at);
    return colon == std::string::npos ? std::nullopt : Words(std::string_view(first).substr(colon + 2)).number();
  };
  cpu.speed = value("cpu MHz");
  cpu.coresPerSocket = value("cpu cores");
  const Fact siblings = value("siblings");
  if (siblings && cpu.coresPerSocket.value_or(0) != 0) cpu.threadsPerCore = *siblings / *cpu.coresPerSocket;
}
} // namespace

MachineFacts Machine::look()
{
  MachineFacts facts;
  describeSystem(facts);
  countProcessors(facts.cpu);
  facts.memory = describeMemory();
  describeLoad(facts.load);
  const std::string text = contentOf("/proc/stat");
  facts.load.switches = numberAfter(text, "ctxt");
  facts.load.interrupts = numberAfter(text, "intr");
  facts.load.started = numberAfter(text, "processes");
  Words words(text);
  if (words.next() == "cpu")
  {
    const auto tick = static_cast<uint64_t>(std::max(1L, ::sysconf(_SC_CLK_TCK)));
    const auto next = [&] { return times(words.number(), 1000 / tick); };
    CpuFacts& cpu = facts.cpu;
    for (Fact* const time : {&cpu.userTime, &cpu.niceTime, &cpu.systemTime, &cpu.idleTime, &cpu.waitTime})
      *time = next();
    cpu.interruptTime = next().value_or(0) + next().value_or(0);
    cpu.stolenTime = next();
    const uint64_t idle = cpu.idleTime.value_or(0) + cpu.waitTime.value_or(0);
    const uint64_t busy = cpu.userTime.value_or(0) + cpu.niceTime.value_or(0) + cpu.systemTime.value_or(0) +
                          *cpu.interruptTime + cpu.stolenTime.value_or(0);
    if (busy >= busy_ && busy + idle > whole_) cpu.usage = (busy - busy_) * 100 / (busy + idle - whole_);
    busy_ = busy;
    whole_ = busy + idle;
  }
  facts.disks = lookAtDisks();
  facts.fileSystems = lookAtFileSystems();
  facts.networks = lookAtNetworks();
  facts.processes = lookAtProcesses(times_);
  return facts;
}
} // namespace tav::host
