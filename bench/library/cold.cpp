/// W1, W2 and W5 over a stream of 1 GiB, which no cache holds.
#include <memory>
#include <span>

#include "bench/library/layer.hpp"
#include "bench/library/plain.hpp"

using namespace snapshot;

namespace
{

constexpr size_t kHosts = (size_t{1} << 30) / kStreamBytes;
constexpr size_t kColdBytes = streamBytes(kHosts);

/// Made when the first of these runs. Over direct memory the last byte of a block is never used.
std::span<char> cold()
{
  static const auto block = [] {
    auto bytes = std::make_unique_for_overwrite<char[]>(kColdBytes + 1);
    floor0::encode(model(), bytes.get(), kHosts);
    return bytes;
  }();
  return {block.get(), kColdBytes + 1};
}

template<class Pass>
void perStream(benchmark::State& state, Pass&& pass)
{
  cold();
  bool works = true;
  for ([[maybe_unused]] const auto iteration : state)
  {
    works &= pass();
  }
  if (!works)
  {
    state.SkipWithError("a pass failed");
  }
  state.SetItemsProcessed(state.iterations() * static_cast<int64_t>(kHosts * kLeaves));
  state.SetBytesProcessed(state.iterations() * static_cast<int64_t>(kColdBytes));
}

constexpr auto walks = [](benchmark::State& state, auto walk) {
  perStream(state, [&] { return walk() == kHosts * model().checksum; });
};

void encodeFloor(benchmark::State& state)
{
  perStream(state, [] { return floor0::encode(model(), cold().data(), kHosts) == kColdBytes; });
}
BENCHMARK(encodeFloor)->Name("W1cold/floor");

void encodeCold(benchmark::State& state)
{
  perStream(state, [] {
    return library::encodePlain(model(), cold().data(), cold().size(), library::Filling::sized, kHosts) == kColdBytes;
  });
}
BENCHMARK(encodeCold)->Name("W1cold/tavAddElement");

void walkFloor(benchmark::State& state)
{
  walks(state, [] { return floor0::walk(cold().data(), cold().data() + kColdBytes); });
}
BENCHMARK(walkFloor)->Name("W2cold/floor");

void walkCold(benchmark::State& state)
{
  walks(state, [] { return library::walkPlain(cold().data(), kColdBytes); });
}
BENCHMARK(walkCold)->Name("W2cold/tavGetNextChild");

void walkLayer(benchmark::State& state)
{
  walks(state, [] { return library::walkLayerDescendants(std::as_bytes(cold().first(kColdBytes))); });
}
BENCHMARK(walkLayer)->Name("W2cold/layer_descendants");

void validateFloor(benchmark::State& state)
{
  perStream(state, [] { return floor0::validate(cold().data(), cold().data() + kColdBytes) != 0; });
}
BENCHMARK(validateFloor)->Name("W5cold/floor");

void validateCold(benchmark::State& state)
{
  perStream(state, [] { return library::validatePlain(cold().data(), kColdBytes); });
}
BENCHMARK(validateCold)->Name("W5cold/tavValidateHierarchy");

} // namespace
