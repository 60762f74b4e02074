/// The memory that work takes: prints the process's peak resident bytes after it.
///   tav_memory nothing            the program alone
///   tav_memory write FILE BYTES   a stream of so many bytes, elements of 1 KiB in groups of 1,000, through the ring
///   tav_memory walk FILE          all of it
///   tav_memory handles COUNT      handles for writing into memory, opened and closed one after the other
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <filesystem>
#include <fstream>
#include <span>
#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

#include "tav/tav.hpp"

namespace
{

constexpr uint16_t kElm = 1000;
constexpr size_t kElementBytes = 1024;
constexpr size_t kPayloadBytes = kElementBytes - sizeof(TAVHeader64);
constexpr int kGroupSize = 1000;

void write(const char* path, uint64_t bytes)
{
  const std::vector<std::byte> payload(kPayloadBytes, std::byte{0x5A});
  tav::Writer writer(std::filesystem::path(path), {.overwrite = true});
  {
    tav::Group root = writer.group(kElm);
    while (writer.size() < bytes)
    {
      tav::Group group = root.group(kElm);
      for (int i = 0; i < kGroupSize; ++i)
      {
        group.add(kElm, payload);
      }
    }
  }
  writer.finish();
}

void walk(const char* path)
{
  const tav::Reader reader{std::filesystem::path(path)};
  uint64_t elements = 0;
  for (const tav::Node& node : reader.root().descendants())
  {
    elements += !node.isGroup() && node.as<std::span<const std::byte>>().back() == std::byte{0x5A} ? 1 : 0;
  }
  if (elements == 0 || elements % kGroupSize != 0 || elements * kElementBytes > reader.root().size())
  {
    throw std::runtime_error("the walk did not see every element");
  }
}

void handles(uint64_t count)
{
  std::byte block[64] = {};
  TAVSSMemory storage(block, sizeof block);
  for (uint64_t i = 0; i < count; ++i)
  {
    TAVInitParam param(&storage, TAV_OPT_WRITE);
    TAVHandle* handle = nullptr;
    if (tavInitHandle(&handle, &param) != TAV_RC_OK || tavTermHandle(&handle) != TAV_RC_OK)
    {
      throw std::runtime_error("a handle could not be opened and closed");
    }
  }
}

bool work(std::string_view part, int count, char** arguments)
{
  if (part == "write" && count == 2)
  {
    write(arguments[0], std::strtoull(arguments[1], nullptr, 10));
    return true;
  }
  if (part == "walk" && count == 1)
  {
    walk(arguments[0]);
    return true;
  }
  if (part == "handles" && count == 1)
  {
    handles(std::strtoull(arguments[0], nullptr, 10));
    return true;
  }
  return part == "nothing" && count == 0;
}

/// The system keeps what a process inherited out of this count, other than out of getrusage.
uint64_t peakBytes()
{
  std::ifstream status("/proc/self/status");
  for (std::string line; std::getline(status, line);)
  {
    if (line.starts_with("VmHWM:"))
    {
      constexpr uint64_t kilobyte = 1024;
      return std::strtoull(line.c_str() + line.find(':') + 1, nullptr, 10) * kilobyte;
    }
  }
  throw std::runtime_error("the system does not tell the peak");
}

} // namespace

int main(int argc, char** argv)
try
{
  if (argc < 2 || !work(argv[1], argc - 2, argv + 2))
  {
    std::fputs("usage: tav_memory nothing | write FILE BYTES | walk FILE | handles COUNT\n", stderr);
    return 2;
  }
  std::printf("%llu\n", static_cast<unsigned long long>(peakBytes()));
  return 0;
}
catch (const std::exception& error)
{
  std::fprintf(stderr, "tav_memory: %s\n", error.what());
  return 1;
}
