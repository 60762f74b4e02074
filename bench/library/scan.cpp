/// W6 with the plain operation: it always looks for both orders.
#include <cstring>
#include <span>
#include <string>

#include "bench/library/plain.hpp"
#include "bench/search.hpp"

namespace
{

using namespace search;

struct Hit
{
  uint32_t rc;
  uint64_t offset;
  uint64_t eyeSize;
  bool swapped;
};

Hit scan(TAVHandle* handle)
{
  Hit hit{};
  hit.rc = tavFindEyeSizeComboInt(handle, 0, 0, false, &hit.offset, &hit.eyeSize, &hit.swapped);
  return hit;
}

/// Puts a pair into the bytes, looks for it and takes it away again.
bool findsPair(TAVHandle* handle, const unsigned char (&marker)[9], bool swapped)
{
  const std::span<unsigned char, 16> place(haystack() + kCheckOffset, 16);
  unsigned char kept[16];
  std::memcpy(kept, place.data(), sizeof kept);
  std::memcpy(place.data(), marker, 8);
  const uint64_t size = 0x0102030405060708;
  std::memcpy(place.data() + 8, &size, sizeof size);
  const Hit hit = scan(handle);
  std::memcpy(place.data(), kept, sizeof kept);
  return hit.rc == TAV_RC_OK && hit.offset == kCheckOffset && hit.swapped == swapped &&
         hit.eyeSize == (swapped ? __builtin_bswap64(size) : size);
}

void scanAll(benchmark::State& state, size_t size)
{
  const library::MemoryHandle handle(haystack(), size, TAV_OPT_READ);
  if (!findsPair(handle.get(), kReversed, false) || !findsPair(handle.get(), kMarker, true))
  {
    state.SkipWithError("wrong search result");
    return;
  }
  for ([[maybe_unused]] const auto iteration : state)
  {
    const Hit hit = scan(handle.get());
    if (hit.rc != TAV_RC_NOT_FOUND)
    {
      state.SkipWithError("found the absent marker");
    }
  }
  state.SetBytesProcessed(state.iterations() * static_cast<int64_t>(size));
}
BENCHMARK_CAPTURE(scanAll, memory, kMemoryBytes)->Name("W6/tavFindEyeSizeComboInt");
BENCHMARK_CAPTURE(scanAll, cache, kCacheBytes)->Name("W6cache/tavFindEyeSizeComboInt");

} // namespace
