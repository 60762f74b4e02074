/// Glue between the peers and Google Benchmark.
#pragma once

#include <benchmark/benchmark.h>

#include "bench/floor.hpp"
#include "bench/workload.hpp"

namespace snapshot
{

/// Runs one pass over the tree per iteration; `pass` returns the bytes that count
/// for the throughput (0 = nothing produced, a failure).
template<class Pass>
void perTree(benchmark::State& state, Pass&& pass)
{
  size_t bytes = pass(); // warm-up and check
  if (bytes == 0)
  {
    state.SkipWithError("the peer failed on the workload");
    return;
  }
  bool works = true;
  for ([[maybe_unused]] const auto iteration : state)
  {
    bytes = pass();
    works &= bytes != 0;
    benchmark::DoNotOptimize(bytes);
    benchmark::ClobberMemory();
  }
  if (!works)
  {
    state.SkipWithError("a later pass failed");
  }
  state.SetItemsProcessed(state.iterations() * static_cast<int64_t>(kLeaves));
  state.SetBytesProcessed(state.iterations() * static_cast<int64_t>(bytes));
  state.counters["bytes"] = static_cast<double>(bytes);
}

/// Room for the encoded workload in every peer's form.
inline constexpr size_t kBlockBytes = size_t{4} << 20;
inline constexpr size_t kTextBytes = size_t{16} << 20; // as text

/// FNV-1a, by which an encoder of our format shows that it wrote the workload byte for byte.
inline uint64_t fingerprint(const char* bytes, size_t size)
{
  uint64_t hash = 0xCBF29CE484222325;
  for (size_t i = 0; i < size; ++i)
  {
    hash = (hash ^ static_cast<unsigned char>(bytes[i])) * 0x100000001B3;
  }
  return hash;
}
inline constexpr uint64_t kStreamFingerprint = 0xAAAA613CF5D7781E;

/// As perTree for an encoder of our format: every pass's length is checked, and the bytes of
/// the last one.
template<class Encode>
void perEncoding(benchmark::State& state, std::vector<char>& block, Encode&& encode)
{
  const auto isWorkload = [&] { return fingerprint(block.data(), kStreamBytes) == kStreamFingerprint; };
  perTree(state, [&]() -> size_t { return encode() == kStreamBytes ? kStreamBytes : 0; });
  if (!isWorkload())
  {
    state.SkipWithError("not the stream of the workload");
  }
}

/// As perTree for a pass that returns a checksum, which must be the model's.
template<class Walk>
void perWalk(benchmark::State& state, size_t encodedBytes, Walk&& walk)
{
  perTree(state, [&]() -> size_t { return walk() == model().checksum ? encodedBytes : 0; });
}

/// Which of the random paths this is.
inline size_t indexOf(const Path& path)
{
  return static_cast<size_t>(&path - randomPaths().data());
}

/// One look-up per iteration over the random paths; `find` returns sumLeaf of the metric.
template<class Find>
void perPath(benchmark::State& state, Find&& find)
{
  const auto& paths = randomPaths();
  for (size_t n = 0; n < 256; ++n)
  {
    const Path& p = paths[n];
    if (find(p) != sumLeaf(model(), model().application(p.k, p.j)[p.m]))
    {
      state.SkipWithError("wrong value found");
      return;
    }
  }
  size_t i = 0;
  for ([[maybe_unused]] const auto iteration : state)
  {
    uint64_t v = find(paths[i++ % paths.size()]);
    benchmark::DoNotOptimize(v);
  }
  state.SetItemsProcessed(state.iterations());
}

} // namespace snapshot
