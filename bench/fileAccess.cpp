/// What look-ups and walks of a file cost by the ways to get at it: times, and bytes that come from the device.
///   file_access FILE [MEBIBYTES]      makes FILE of so many MiB (100), asks, and removes it
/// A look-up passes 75 groups, whatever the file's size, and finds a number behind them. "first" is that of a reader
/// that was just opened, the file in the system's cache; "next" the look-ups behind it; "cold" reads from the device.
/// Times are the processor's, the system's part included, but for cold ones.
#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <filesystem>
#include <span>
#include <string>
#include <vector>

#include "tav/inspect.hpp"
#include "tav/tav.hpp"

namespace
{

constexpr uint64_t kMiB = uint64_t{1} << 20;
constexpr uint32_t kGroups = 75;
constexpr uint32_t kNumber = 4711;
constexpr const char* kPath = "/system/cpuOnline";
constexpr uint64_t kMostWalked = 512 * kMiB;

/// Groups of leaves, small ones where they are walked, and a number behind them.
void make(const std::filesystem::path& path, uint64_t bytes)
{
  tav::Writer writer(path, {.overwrite = true, .inPlace = true});
  const std::string text(bytes <= kMostWalked ? 21 : 4000, 'x');
  tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
  for (uint32_t group = 0; group < kGroups; ++group)
  {
    tav::Group host = root.group(TAV_ELM_CMN_HOST);
    for (const uint64_t end = writer.size() + bytes / kGroups; writer.size() < end;)
    {
      host.add(TAV_ELM_CMN_CPU_ONLINE, group);
      host.add(TAV_ELM_CMN_HOST_NAME, text);
    }
  }
  root.add(TAV_ELM_CMN_CPU_ONLINE, kNumber);
  root.close();
  writer.finish();
}

/// Takes the file out of the system's cache, as far as the system does that.
void forget(const std::filesystem::path& path)
{
  const int file = ::open(path.c_str(), O_RDONLY);
  ::fsync(file);
  ::posix_fadvise(file, 0, 0, POSIX_FADV_DONTNEED);
  ::close(file);
}

/// Bytes that this process has had from devices.
uint64_t fromDevice()
{
  std::FILE* const io = std::fopen("/proc/self/io", "r");
  unsigned long long bytes = 0;
  char line[80];
  while (io != nullptr && std::fgets(line, sizeof line, io) != nullptr &&
         std::sscanf(line, "read_bytes: %llu", &bytes) != 1)
  {
  }
  if (io != nullptr)
  {
    std::fclose(io);
  }
  return bytes;
}

template<class Work>
double microseconds(const Work& work)
{
  const auto start = std::chrono::steady_clock::now();
  work();
  return std::chrono::duration<double, std::micro>(std::chrono::steady_clock::now() - start).count();
}

double processorTime()
{
  timespec now{};
  ::clock_gettime(CLOCK_PROCESS_CPUTIME_ID, &now);
  return static_cast<double>(now.tv_sec) * 1e6 + static_cast<double>(now.tv_nsec) / 1e3;
}

/// The least of several times.
template<class Work>
double least(int rounds, const Work& work)
{
  double best = 1e18;
  for (int i = 0; i < rounds; ++i)
  {
    const double start = processorTime();
    work();
    best = std::min(best, processorTime() - start);
  }
  return best;
}

void demand(bool holds)
{
  if (!holds)
  {
    std::fprintf(stderr, "file_access: wrong answer\n");
    std::exit(1);
  }
}

void lookUp(const tav::Reader& reader)
{
  demand(reader.path(kPath)->as<uint32_t>() == kNumber);
}

void lookUp(const tav::inspect::Document& document)
{
  auto found = document.find(kPath);
  const auto first = found.begin();
  demand(first != std::default_sentinel && (*first).as<uint32_t>() == kNumber);
}

uint64_t walk(const tav::Node& root)
{
  uint64_t sum = 0;
  for (const tav::Node& node : root.descendants())
  {
    sum += node.elm() == TAV_ELM_CMN_CPU_ONLINE ? node.as<uint32_t>() : node.size();
  }
  return sum;
}

uint64_t walk(const tav::Reader& reader)
{
  return walk(reader.root());
}

uint64_t walk(const tav::inspect::Document& document)
{
  auto roots = document.roots();
  return walk(*roots.begin());
}

struct Costs
{
  const char* way;
  double first;
  double next;
  double walked;
};

/// One way to read the file, which is in the system's cache. `open` gives a reader.
template<class Open>
Costs warm(const char* way, const Open& open, bool walks = true)
{
  const double first = least(20, [&] { lookUp(open()); });
  const auto reader = open();
  const double next = least(200, [&] { lookUp(reader); });
  const double walked = walks ? least(7, [&] { demand(walk(open()) != 0); }) : 0.0;
  return {way, first, next, walked};
}

/// The same with a file that is not in the cache, and what is read of it.
template<class Open>
void tell(const Costs& costs, const std::filesystem::path& path, const Open& open)
{
  forget(path);
  const uint64_t before = fromDevice();
  const double cold = microseconds([&] { lookUp(open()); });
  std::printf("| %s | %.1f | %.2f | %.1f | %.0f | %.0f |\n", costs.way, costs.first, costs.next, costs.walked / 1000,
              cold, static_cast<double>(fromDevice() - before) / 1024);
}

std::vector<std::byte> all(const std::filesystem::path& path)
{
  std::vector<std::byte> bytes(static_cast<size_t>(std::filesystem::file_size(path)));
  std::FILE* const file = std::fopen(path.c_str(), "rb");
  demand(std::fread(bytes.data(), 1, bytes.size(), file) == bytes.size());
  std::fclose(file);
  return bytes;
}

} // namespace

int main(int count, char** words)
{
  if (count < 2)
  {
    std::fprintf(stderr, "file_access FILE [MEBIBYTES]\n");
    return 2;
  }
  const std::filesystem::path path = words[1];
  const uint64_t bytes = (count > 2 ? std::strtoull(words[2], nullptr, 10) : 100) * kMiB;
  make(path, bytes);
  const bool walks = bytes <= kMostWalked;
  const auto mapped = [&] { return tav::Reader(path, {.access = tav::Access::mapped}); };
  const auto ring = [&] { return tav::Reader(path, {.access = tav::Access::ring}); };
  const auto document = [&] { return tav::inspect::Document(path); };
  std::printf("| %llu MiB | first, us | next, us | walk, ms | cold, us | cold, KiB |\n"
              "| --- | ---: | ---: | ---: | ---: | ---: |\n",
              static_cast<unsigned long long>(bytes / kMiB));
  if (walks)
  {
    const std::vector<std::byte> memory = all(path);
    const Costs costs = warm("memory", [&] { return tav::Reader(std::span<const std::byte>(memory)); });
    std::printf("| %s | %.1f | %.2f | %.1f | | |\n", costs.way, costs.first, costs.next, costs.walked / 1000);
  }
  const Costs ofMapping = warm("`Access::mapped`", mapped, walks);
  const Costs ofRing = warm("`Access::ring`", ring, walks);
  const Costs ofDocument = warm("`Document`", document, walks);
  tell(ofMapping, path, mapped);
  tell(ofRing, path, ring);
  tell(ofDocument, path, document);
  std::filesystem::remove(path);
  return 0;
}
