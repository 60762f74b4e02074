// Describes the machine that it runs on as a stream, reads the stream back, and prints it as text and as XML.
// With a file name the same stream goes to that file, too, and is printed from there through a ring of pages.
#include <sys/sysinfo.h>
#include <sys/utsname.h>
#include <unistd.h>

#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <filesystem>
#include <string>
#include <system_error>

#include "tav/tav.hpp"

namespace
{

void demand(bool works, const char* what)
{
  if (!works)
  {
    throw std::system_error(errno, std::generic_category(), what);
  }
}

struct Machine
{
  utsname name{};
  uint32_t processors = 0;
  uint32_t processorsOnline = 0;
  uint64_t memoryTotal = 0; // all in bytes
  uint64_t memoryFree = 0;
  uint64_t swapTotal = 0;
  uint64_t swapFree = 0;
};

Machine lookAround()
{
  Machine machine;
  demand(uname(&machine.name) == 0, "uname");
  machine.processors = static_cast<uint32_t>(sysconf(_SC_NPROCESSORS_CONF));
  machine.processorsOnline = static_cast<uint32_t>(sysconf(_SC_NPROCESSORS_ONLN));
  struct sysinfo memory = {};
  demand(sysinfo(&memory) == 0, "sysinfo");
  const uint64_t unit = memory.mem_unit;
  machine.memoryTotal = memory.totalram * unit;
  machine.memoryFree = memory.freeram * unit;
  machine.swapTotal = memory.totalswap * unit;
  machine.swapFree = memory.freeswap * unit;
  return machine;
}

void describe(const Machine& machine, tav::Writer& writer)
{
  constexpr tav::GroupOptions findable{.eyeSize = true};
  {
    tav::Group system = writer.group(TAV_ELM_CMN_SYSTEM, findable);
    tav::Group host = system.group(TAV_ELM_CMN_HOST, findable);
    host.add(TAV_ELM_CMN_HOST_NAME, machine.name.nodename);
    host.add(TAV_ELM_CMN_MACHINE_ID, machine.name.machine);
    {
      tav::Group os = host.group(TAV_ELM_CMN_OS, findable);
      os.add(TAV_ELM_CMN_OS_NAME, machine.name.sysname);
      os.add(TAV_ELM_CMN_OS_RELEASE, machine.name.release);
      os.add(TAV_ELM_CMN_OS_VERSION, machine.name.version);
    }
    {
      tav::Group cpu = host.group(TAV_ELM_CMN_CPU, findable);
      cpu.add(TAV_ELM_CMN_CPU_CONFIG, machine.processors);
      cpu.add(TAV_ELM_CMN_CPU_ONLINE, machine.processorsOnline);
    }
    tav::Group memory = host.group(TAV_ELM_CMN_MEMORY, findable);
    memory.add(TAV_ELM_CMN_MEM_TOTAL, machine.memoryTotal);
    memory.add(TAV_ELM_CMN_MEM_FREE, machine.memoryFree);
    memory.add(TAV_ELM_CMN_SWAP_MEM_TOTAL, machine.swapTotal);
    memory.add(TAV_ELM_CMN_SWAP_MEM_FREE, machine.swapFree);
  }
  writer.finish();
}

std::string textOf(const tav::Reader& reader)
{
  char* text = nullptr;
  size_t size = 0;
  FILE* stream = open_memstream(&text, &size);
  demand(stream != nullptr, "open_memstream");
  reader.print(stream);
  reader.print(stream, {.xml = true});
  std::fclose(stream);
  const std::string result(text, size);
  std::free(text);
  return result;
}

} // namespace

int main(int argc, char** argv)
try
{
  const Machine machine = lookAround();
  tav::Writer memory;
  describe(machine, memory);
  const std::string text = textOf(tav::Reader(memory.bytes()));
  std::fputs(text.c_str(), stdout);
  if (argc > 1)
  {
    const std::filesystem::path path = argv[1];
    tav::Writer file(path, {.overwrite = true});
    describe(machine, file);
    const bool same = textOf(tav::Reader(path)) == text;
    std::printf("\n%llu bytes in %s: printed from there, the text is %s.\n",
                static_cast<unsigned long long>(file.size()), path.c_str(), same ? "the same" : "another");
    return same ? 0 : 1;
  }
  return 0;
}
catch (const std::exception& error)
{
  std::fprintf(stderr, "snapshot: %s\n", error.what());
  return 2;
}
