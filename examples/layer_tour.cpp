// A tour of the C++ layer: writes a small inventory, finds its way through it, changes a value, and reads the same
// stream from a file.
#include <chrono>
#include <cstdint>
#include <cstdio>
#include <exception>
#include <filesystem>
#include <string>
#include <system_error>
#include <vector>

#include "tav/tav.hpp"

namespace
{

struct Host
{
  const char* name;
  uint32_t processors;
  uint64_t memory;
};

void write(tav::Writer& writer, const std::vector<Host>& hosts)
{
  {
    tav::Group system = writer.group(TAV_ELM_CMN_SYSTEM, {.eyeSize = true});
    const tav::HeaderView total = system.add(TAV_ELM_CMN_CPU_TOTAL, uint32_t{0}); // not known yet
    uint32_t processors = 0;
    for (const Host& host : hosts)
    {
      tav::Group group = system.group(TAV_ELM_CMN_HOST, {.eyeSize = true});
      group.add(TAV_ELM_CMN_HOST_NAME, tav::Utf8{host.name});
      group.add(TAV_ELM_CMN_CPU_ONLINE, host.processors);
      group.add(TAV_ELM_CMN_MEM_TOTAL, host.memory);
      processors += host.processors;
    } // each group closes itself
    writer.update(total, processors);
  }
  writer.finish(); // reports what no destructor could
}

void show(const tav::Reader& reader)
{
  const tav::Node root = reader.root();
  std::printf("%u processors in all\n", root.path("cpuTotal")->as<uint32_t>());
  for (const tav::Node& host : root.all("host"))
  {
    std::printf("%-8s", host.path("hostName")->as<std::string>().c_str());
    for (auto node = host.path("hostName")->next(); node; node = node->next())
    {
      std::printf(" %.*s=%lld", static_cast<int>(node->tag().size()), node->tag().data(),
                  static_cast<long long>(node->asNumber<int64_t>()));
    }
    std::printf("\n");
  }
}

} // namespace

int main()
try
{
  const std::vector<Host> hosts{{"ada", 8, uint64_t{32} << 30U}, {"grace", 16, uint64_t{64} << 30U}};
  tav::Writer memory;
  write(memory, hosts);
  show(tav::Reader(memory.bytes()));

  // What is wrong comes as an exception, or as an error code where one is given.
  const tav::Reader reader(memory.bytes());
  std::error_code ec;
  static_cast<void>(reader.path("system/host/hostName")->as<uint32_t>(ec));
  std::printf("a name is no number: %s\n", ec.message().c_str());

  // A file works as memory does. A copy of a node outlives its reader.
  const auto path = std::filesystem::temp_directory_path() / "layer_tour.tav";
  tav::Writer file(path, {.overwrite = true});
  write(file, hosts);
  const auto last = [&path] {
    const tav::Reader fromFile(path);
    return fromFile.path("/system/host[2]/hostName")->copy();
  }();
  std::filesystem::remove(path);
  std::printf("the last host in the file is %s\n", last.as<std::string>().c_str());
  return 0;
}
catch (const std::exception& error)
{
  std::fprintf(stderr, "layer_tour: %s\n", error.what());
  return 1;
}
