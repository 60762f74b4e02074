/// What the C++ layer costs above the plain operations: the same 24,000-leaf tree written and walked with both.
///   layer_cost                      times, and each pair's ratio
///   layer_cost --once PART          a part once, for a counter of instructions:
///     valgrind --tool=callgrind --toggle-collect='plainWrite*' layer_cost --once plainWrite
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <map>
#include <span>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include <benchmark/benchmark.h>

#include "tav/tav.hpp"

namespace
{

constexpr uint64_t kGroups = 240;
constexpr uint64_t kLeaves = 100; // a group
constexpr uint64_t kSum = kGroups * kLeaves * (kLeaves - 1) / 2;

std::vector<std::byte> room()
{
  return std::vector<std::byte>(kGroups * (16 + kLeaves * 24) + 1024);
}

void demand(bool works)
{
  if (!works)
  {
    std::fputs("layer_cost: an operation failed\n", stderr);
    std::exit(1);
  }
}

TAVHeaderData node(uint64_t size, uint16_t type, uint16_t elm, void* payload)
{
  TAVHeaderData data{};
  data.header.hdr64 = {size, 0, type, elm};
  data.header.hdrType = TAV_HDR_64;
  data.pDataBuf = static_cast<uint8_t*>(payload);
  data.dataBufSize = payload != nullptr ? size : 0;
  return data;
}

} // namespace

// Outside the unnamed namespace and never inlined, so that a profiler finds them by name.

[[gnu::noinline]] uint64_t plainWrite(std::span<std::byte> block)
{
  TAVSSMemory storage(block.data(), block.size());
  TAVInitParam param(&storage, TAV_OPT_WRITE);
  TAVHandle* handle = nullptr;
  demand(tavInitHandle(&handle, &param) == TAV_RC_OK);
  TAVHeaderData root = node(TAV_SIZE_UNKNOWN, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM, nullptr);
  demand(tavAddElement(0, handle, &root) == TAV_RC_OK);
  for (uint64_t i = 0; i < kGroups; ++i)
  {
    TAVHeaderData group = node(TAV_SIZE_UNKNOWN, TAV_TYPE_HEADER64, TAV_ELM_CMN_HOST, nullptr);
    demand(tavAddElement(0, handle, &group) == TAV_RC_OK);
    for (uint64_t value = 0; value < kLeaves; ++value)
    {
      uint64_t copy = value;
      TAVHeaderData leaf = node(sizeof copy, TAV_TYPE_UINT64, TAV_ELM_CMN_MEM_TOTAL, &copy);
      demand(tavAddElement(0, handle, &leaf) == TAV_RC_OK);
    }
    demand(tavCloseHeader(0, handle) == TAV_RC_OK);
  }
  demand(tavCloseHeader(0, handle) == TAV_RC_OK);
  const uint64_t size = handle->streamBytes;
  demand(tavTermHandle(&handle) == TAV_RC_OK);
  return size;
}

[[gnu::noinline]] uint64_t layerWrite(std::span<std::byte> block)
{
  tav::Writer writer(block);
  {
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
    for (uint64_t i = 0; i < kGroups; ++i)
    {
      tav::Group group = root.group(TAV_ELM_CMN_HOST);
      for (uint64_t value = 0; value < kLeaves; ++value)
      {
        group.add(TAV_ELM_CMN_MEM_TOTAL, value);
      }
    }
  }
  writer.finish();
  return writer.size();
}

/// What a program has to look at before it takes a value, whatever the stream's form: as the layer does.
inline uint64_t plainValue(const TAVHandle& handle, const TAVHeaderData& leaf)
{
  const bool wide = leaf.header.hdrType == TAV_HDR_64;
  demand((wide ? leaf.header.hdr64.type : leaf.header.hdr32.type) == TAV_TYPE_UINT64);
  demand((wide ? leaf.header.hdr64.size : leaf.header.hdr32.size) == sizeof(uint64_t));
  uint64_t value = 0;
  std::memcpy(&value, leaf.pDataBuf, sizeof value);
  return handle.swapBytes != 0 ? tav::kor::byteswap64(value) : value;
}

inline bool isGroup(const TAVHeader& header)
{
  const uint16_t type = header.hdrType == TAV_HDR_64 ? header.hdr64.type : header.hdr32.type;
  return type == TAV_TYPE_HEADER32 || type == TAV_TYPE_HEADER64;
}

inline bool isEnd(const TAVHeader& header)
{
  const uint16_t elm = header.hdrType == TAV_HDR_64 ? header.hdr64.elm : header.hdr32.elm;
  return elm == TAV_ELM_CMN_END_HDR_MARKER || elm == TAV_ELM_CMN_END_HDR_EYE_SIZE;
}

[[gnu::noinline]] uint64_t plainWalk(std::span<std::byte> block)
{
  TAVSSMemory storage(block.data(), block.size());
  TAVInitParam param(&storage, TAV_OPT_READ);
  TAVHandle* handle = nullptr;
  demand(tavInitHandle(&handle, &param) == TAV_RC_OK);
  TAVHeaderData root{};
  demand(tavGetNextChild(0, handle, nullptr, nullptr, &root) == TAV_RC_OK);
  uint64_t sum = 0;
  TAVHeaderData group{};
  for (TAVHeader* before = nullptr; tavGetNextChild(0, handle, &root.header, before, &group) == TAV_RC_OK;)
  {
    before = &group.header;
    TAVHeaderData leaf{};
    for (TAVHeader* last = nullptr; tavGetNextChild(0, handle, &group.header, last, &leaf) == TAV_RC_OK;)
    {
      last = &leaf.header;
      sum += isEnd(leaf.header) ? 0 : plainValue(*handle, leaf);
    }
  }
  demand(tavTermHandle(&handle) == TAV_RC_OK);
  return sum;
}

[[gnu::noinline]] uint64_t plainDescend(std::span<std::byte> block)
{
  TAVSSMemory storage(block.data(), block.size());
  TAVInitParam param(&storage, TAV_OPT_READ);
  TAVHandle* handle = nullptr;
  demand(tavInitHandle(&handle, &param) == TAV_RC_OK);
  TAVHeaderData node{};
  demand(tavGetNextChild(0, handle, nullptr, nullptr, &node) == TAV_RC_OK);
  uint64_t sum = 0;
  std::vector<TAVHeader> open{node.header};
  bool first = true;
  while (!open.empty())
  {
    const uint32_t rc = tavGetNextChild(0, handle, &open.back(), first ? nullptr : &node.header, &node);
    if (rc == TAV_RC_NO_MORE_CHILDREN)
    {
      node.header = open.back();
      open.pop_back();
      first = false;
      continue;
    }
    demand(rc == TAV_RC_OK);
    first = isGroup(node.header);
    if (first)
    {
      open.push_back(node.header);
    }
    else
    {
      sum += isEnd(node.header) ? 0 : plainValue(*handle, node);
    }
  }
  demand(tavTermHandle(&handle) == TAV_RC_OK);
  return sum;
}

[[gnu::noinline]] uint64_t layerWalk(std::span<std::byte> block)
{
  const tav::Reader reader(block);
  uint64_t sum = 0;
  for (const tav::Node& group : reader.root().children())
  {
    for (const tav::Node& leaf : group.children())
    {
      sum += leaf.as<uint64_t>();
    }
  }
  return sum;
}

[[gnu::noinline]] uint64_t layerDescend(std::span<std::byte> block)
{
  const tav::Reader reader(block);
  uint64_t sum = 0;
  for (const tav::Node& leaf : reader.root().descendants())
  {
    sum += leaf.isGroup() ? 0 : leaf.as<uint64_t>();
  }
  return sum;
}

namespace
{

using Part = uint64_t (*)(std::span<std::byte>);
constexpr std::pair<const char*, Part> kParts[] = {{"plainWrite", plainWrite},
                                                   {"layerWrite", layerWrite},
                                                   {"plainWalk", plainWalk},
                                                   {"layerWalk", layerWalk},
                                                   {"plainDescend", plainDescend},
                                                   {"layerDescend", layerDescend}};

/// Every part gives what the others give, or the comparison says nothing.
std::vector<std::byte> checkedStream()
{
  std::vector<std::byte> plain = room();
  std::vector<std::byte> layer = room();
  plain.resize(plainWrite(plain));
  layer.resize(layerWrite(layer));
  demand(plain == layer);
  demand(plainWalk(plain) == kSum && layerWalk(plain) == kSum);
  demand(plainDescend(plain) == kSum && layerDescend(plain) == kSum);
  return plain;
}

/// The usual table, and the times by name.
class Times : public benchmark::ConsoleReporter
{
public:
  void ReportRuns(const std::vector<Run>& runs) override
  {
    ConsoleReporter::ReportRuns(runs);
    for (const Run& run : runs)
    {
      if (run.aggregate_name == "median")
      {
        medians[run.run_name.function_name] = run.GetAdjustedCPUTime();
      }
    }
  }
  std::map<std::string, double> medians;
};

int compare(std::vector<std::byte>& stream)
{
  std::vector<std::byte> block = room();
  for (const auto& [name, part] : kParts)
  {
    const bool writes = std::string_view(name).ends_with("Write");
    std::vector<std::byte>& used = writes ? block : stream;
    const auto measure = [part = part, &used](benchmark::State& state) {
      for ([[maybe_unused]] const auto pass : state)
      {
        benchmark::DoNotOptimize(part(used));
      }
    };
    benchmark::RegisterBenchmark(name, measure)->Unit(benchmark::kMicrosecond)->Repetitions(15)->ReportAggregatesOnly();
  }
  Times times;
  benchmark::RunSpecifiedBenchmarks(&times);
  auto& medians = times.medians;
  std::printf("\nlayer / plain, medians: write %.3f, walk by children %.3f, by descendants %.3f\n",
              medians["layerWrite"] / medians["plainWrite"], medians["layerWalk"] / medians["plainWalk"],
              medians["layerDescend"] / medians["plainDescend"]);
  return 0;
}

int once(std::string_view wanted, std::vector<std::byte>& stream)
{
  for (const auto& [name, part] : kParts)
  {
    if (name == wanted)
    {
      std::vector<std::byte> block = room();
      const bool writes = wanted.ends_with("Write");
      std::printf("%llu\n", static_cast<unsigned long long>(part(writes ? block : stream)));
      return 0;
    }
  }
  std::fputs("layer_cost: no such part\n", stderr);
  return 2;
}

} // namespace

int main(int argc, char** argv)
{
  std::vector<std::byte> stream = checkedStream();
  if (argc == 3 && std::string_view(argv[1]) == "--once")
  {
    return once(argv[2], stream);
  }
  benchmark::Initialize(&argc, argv);
  return compare(stream);
}
