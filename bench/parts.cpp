// W10: a file by one thread and by two in the same run, and what a plan costs. On a busy machine the time that passes
// says little: the share of the processors' time that the caller's thread used says how well the work was divided.
//   tav_parts [MIB]        the stream's length, 64 unless given
#include <algorithm>
#include <chrono>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <functional>
#include <optional>
#include <span>
#include <string>
#include <vector>

#include "tav/inspect.hpp"
#include "tav/tav.hpp"

namespace
{

using namespace tav::inspect;

/// One group of small leaves, or hosts of 20 leaves each.
std::vector<std::byte> stream(uint64_t bytes, bool flat)
{
  std::vector<std::byte> made(bytes + (bytes >> 3U) + 4096);
  tav::Writer writer{std::span(made)};
  {
    tav::Group system = writer.group(TAV_ELM_CMN_SYSTEM);
    for (uint32_t i = 0; writer.size() < bytes; ++i)
    {
      if (flat)
      {
        system.add(TAV_ELM_CMN_CPU_ONLINE, i);
        continue;
      }
      tav::Group host = system.group(TAV_ELM_CMN_HOST);
      for (uint32_t k = 0; k < 20; ++k)
      {
        k % 5 == 0 ? host.add(TAV_ELM_CMN_HOST_NAME, "ada") : host.add(TAV_ELM_CMN_CPU_ONLINE, i + k);
      }
    }
  }
  writer.finish();
  made.resize(writer.bytes().size());
  return made;
}

struct Cost
{
  double seconds = 0;
  double processor = 0; ///< of all threads
  double own = 0;       ///< of these, the caller's thread, on average: who does more of it is chance
};

double ownSeconds()
{
  std::timespec used{};
  clock_gettime(CLOCK_THREAD_CPUTIME_ID, &used);
  return static_cast<double>(used.tv_sec) + static_cast<double>(used.tv_nsec) * 1e-9;
}

Cost costOf(const std::function<void()>& work)
{
  const std::clock_t used = std::clock();
  const double usedHere = ownSeconds();
  const auto begin = std::chrono::steady_clock::now();
  work();
  const std::chrono::duration<double> passed = std::chrono::steady_clock::now() - begin;
  return {passed.count(), static_cast<double>(std::clock() - used) / CLOCKS_PER_SEC, ownSeconds() - usedHere};
}

void takeRound(Cost& best, const Cost& round, int rounds)
{
  best = {std::min(best.seconds, round.seconds), std::min(best.processor, round.processor),
          best.own + round.own / rounds};
}

constexpr Cost kNone{1e9, 1e9, 0};

/// One thread and two take turns, so that what disturbs the machine disturbs both; each is told by its best run. Where
/// no two processors are free, two threads cannot be faster: the work in all shows what splitting costs.
void compare(
    const std::string& what, const std::function<void(unsigned)>& work,
    const std::function<void()>& cleanUp = {})
{
  constexpr int rounds = 9;
  Cost one = kNone;
  Cost two = kNone;
  for (int i = 0; i < rounds; ++i)
  {
    takeRound(one, costOf([&] { work(1); }), rounds);
    if (cleanUp)
    {
      cleanUp();
    }
    takeRound(two, costOf([&] { work(2); }), rounds);
    if (cleanUp)
    {
      cleanUp();
    }
  }
  std::printf("W10/%s: one thread %.1f ms, two %.1f ms: %.2f times as fast; work in all %.3f times as much, the "
              "caller's thread did %.2f of what one does\n",
              what.c_str(), one.seconds * 1e3, two.seconds * 1e3, one.seconds / two.seconds,
              two.processor / one.processor, two.own / one.own);
}

void measure(uint64_t mebibytes, bool flat)
{
  const std::vector<std::byte> bytes = stream(mebibytes << 20U, flat);
  const std::string name = flat ? "flat" : "hosts";
  ByteSource source("x", std::span(reinterpret_cast<const uint8_t*>(bytes.data()), bytes.size()));
  size_t parts = 0;
  constexpr int rounds = 5;
  Cost planned = kNone;
  for (int i = 0; i < rounds; ++i)
  {
    takeRound(planned, costOf([&] { parts = plan(source, Form{}).size(); }), rounds);
  }
  std::printf("W10/plan_%s: %.2f ms for %zu parts: %.2f ms a GB\n", name.c_str(), planned.seconds * 1e3, parts,
              planned.seconds * 1e12 / static_cast<double>(bytes.size()));
  compare("check_" + name, [&](unsigned threads) { (void)check(source, {}, {.threads = threads}); });
  const TableQuery query(flat ? "/system/cpuOnline" : "/system/host", {{"n", flat ? "." : "cpuOnline"}});
  compare("table_" + name, [&](unsigned threads) {
    uint64_t rows = 0;
    readTable(source, {}, query, {.threads = threads}, [&](const Table& some) { rows += some.rows(); });
    if (rows < mebibytes)
    {
      std::printf("W10/table_%s: rows are missing\n", name.c_str());
    }
  });
  compare("schema_" + name, [&](unsigned threads) {
    Schema schema;
    schema.add(source, {}, {.threads = threads});
  });
  const std::vector<tav::Path> paths{pathOf("//memTotal"), pathOf(flat ? "/system/hostName" : "//hostName")};
  const std::vector<uint64_t> counts = findPaths(source, {}, paths, {});
  compare("find_" + name, [&](unsigned threads) {
    if (findPaths(source, {}, paths, {.threads = threads}) != counts)
    {
      std::printf("W10/find_%s: threads find something else\n", name.c_str());
    }
  });
  const tav::Reader reader(bytes);
  const tav::Node root = reader.root();
  const size_t nodes = tav::Index(root).size();
  std::optional<tav::Index> index;
  const auto makeIndex = [&](unsigned threads) {
    index.emplace(indexOf(root, {.threads = threads}));
    if (index->size() != nodes)
    {
      std::printf("W10/index_%s: threads see other nodes\n", name.c_str());
    }
  };
  compare("index_" + name, makeIndex, [&] { index.reset(); }); // making it is what threads share
}

} // namespace

int main(int argc, char** argv)
{
  const uint64_t mebibytes = argc > 1 ? std::strtoull(argv[1], nullptr, 10) : 64;
  measure(mebibytes, true);
  measure(mebibytes, false);
  return 0;
}
