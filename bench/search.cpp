/// W6: an 8-byte marker that is absent from 256 MiB of random bytes. "both" searches
/// for the marker and for its byte reversal in one pass.
#include <immintrin.h>

#include <algorithm>
#include <functional>
#include <memory>
#include <string_view>

#include <benchmark/benchmark.h>
#include <cstdint>
#include <cstring>

#include "bench/search.hpp"

using namespace search;

namespace
{

using Bytes = const unsigned char*;

uint64_t word(Bytes p)
{
  uint64_t w;
  std::memcpy(&w, p, 8);
  return w;
}
bool either(Bytes p)
{
  return word(p) == word(kMarker) || word(p) == word(kReversed);
}

} // namespace

namespace search
{

/// Random bytes; whatever happened to form a marker is broken up.
unsigned char* haystack()
{
  static const std::unique_ptr<unsigned char[]> block = [] {
    std::unique_ptr<unsigned char[]> p(new unsigned char[kMemoryBytes]);
    uint64_t s = 0xB10C;
    for (size_t i = 0; i < kMemoryBytes; i += 8)
    {
      uint64_t z = (s += 0x9E3779B97F4A7C15u);
      z = (z ^ (z >> 30)) * 0xBF58476D1CE4E5B9u;
      z = (z ^ (z >> 27)) * 0x94D049BB133111EBu;
      z ^= z >> 31;
      std::memcpy(p.get() + i, &z, 8);
    }
    for (size_t i = 0; i + 8 <= kMemoryBytes; ++i)
    {
      if (either(p.get() + i))
      {
        p[i] ^= 1;
      }
    }
    return p;
  }();
  return block.get();
}

} // namespace search

namespace
{

Bytes viaMemmem(Bytes b, Bytes e)
{
  return static_cast<Bytes>(memmem(b, static_cast<size_t>(e - b), kMarker, 8));
}

Bytes viaStdSearch(Bytes b, Bytes e)
{
  Bytes p = std::search(b, e, kMarker, kMarker + 8);
  return p == e ? nullptr : p;
}

Bytes viaHorspool(Bytes b, Bytes e)
{
  static const std::boyer_moore_horspool_searcher searcher(kMarker, kMarker + 8);
  Bytes p = std::search(b, e, searcher);
  return p == e ? nullptr : p;
}

Bytes viaMemchr(Bytes b, Bytes e)
{
  while (e - b >= 8)
  {
    b = static_cast<Bytes>(std::memchr(b, kMarker[0], static_cast<size_t>(e - b - 7)));
    if (!b || std::memcmp(b, kMarker, 8) == 0)
    {
      return b;
    }
    ++b;
  }
  return nullptr;
}

Bytes viaStringView(Bytes b, Bytes e)
{
  const std::string_view hay(reinterpret_cast<const char*>(b), static_cast<size_t>(e - b));
  const auto at = hay.find(std::string_view(reinterpret_cast<const char*>(kMarker), 8));
  return at == std::string_view::npos ? nullptr : b + at;
}

/// A word at every byte, compared with both: what one writes first.
Bytes bothWord(Bytes b, Bytes e)
{
  for (; e - b >= 8; ++b)
  {
    if (either(b))
    {
      return b;
    }
  }
  return nullptr;
}

/// Any occurrence covers exactly one position that is 7 modulo 8, so look at every eighth
/// byte only: both orders consist of the same eight bytes, 248 of 256 values rule out all.
Bytes bothStride(Bytes b, Bytes e)
{
  static const auto in = [] {
    struct
    {
      bool of[256] = {};
    } t;
    for (int i = 0; i < 8; ++i)
    {
      t.of[kMarker[i]] = true;
    }
    return t;
  }();
  for (Bytes p = b + 7; p < e; p += 8)
  {
    if (!in.of[*p])
    {
      continue;
    }
    for (Bytes q = p - 7; q <= p && q + 8 <= e; ++q)
    {
      if (either(q))
      {
        return q;
      }
    }
  }
  return nullptr;
}

/// The middle bytes mirror each other: for both orders bytes 3 and 4 are {EE, DD} in one
/// order or the other, so their minimum is DD and their maximum EE.
Bytes bothSse2(Bytes b, Bytes e)
{
  const __m128i lo = _mm_set1_epi8(static_cast<char>(0xDD)), hi = _mm_set1_epi8(static_cast<char>(0xEE));
  for (; e - b >= 16 + 7; b += 16)
  {
    const __m128i x = _mm_loadu_si128(reinterpret_cast<const __m128i*>(b + 3));
    const __m128i y = _mm_loadu_si128(reinterpret_cast<const __m128i*>(b + 4));
    const __m128i m = _mm_and_si128(_mm_cmpeq_epi8(_mm_min_epu8(x, y), lo), _mm_cmpeq_epi8(_mm_max_epu8(x, y), hi));
    for (unsigned bits = static_cast<unsigned>(_mm_movemask_epi8(m)); bits; bits &= bits - 1)
    {
      Bytes p = b + __builtin_ctz(bits);
      if (either(p))
      {
        return p;
      }
    }
  }
  return bothWord(b, e);
}

__attribute__((target("avx2,bmi"))) Bytes bothAvx2(Bytes b, Bytes e)
{
  const __m256i lo = _mm256_set1_epi8(static_cast<char>(0xDD)), hi = _mm256_set1_epi8(static_cast<char>(0xEE));
  auto hits = [&](Bytes p) __attribute__((target("avx2,bmi")))
  {
    const __m256i x = _mm256_loadu_si256(reinterpret_cast<const __m256i*>(p + 3));
    const __m256i y = _mm256_loadu_si256(reinterpret_cast<const __m256i*>(p + 4));
    return _mm256_and_si256(_mm256_cmpeq_epi8(_mm256_min_epu8(x, y), lo), _mm256_cmpeq_epi8(_mm256_max_epu8(x, y), hi));
  };
  for (; e - b >= 128 + 7; b += 128)
  {
    const __m256i m0 = hits(b), m1 = hits(b + 32), m2 = hits(b + 64), m3 = hits(b + 96);
    const __m256i any = _mm256_or_si256(_mm256_or_si256(m0, m1), _mm256_or_si256(m2, m3));
    if (_mm256_testz_si256(any, any))
    {
      continue;
    }
    for (int i = 0; i < 128; ++i)
    {
      if (either(b + i))
      {
        return b + i;
      }
    }
  }
  return bothWord(b, e);
}

/// The physical limit: every byte is read once.
__attribute__((target("avx2"))) uint64_t readAll(Bytes b, Bytes e)
{
  __m256i s[4] = {};
  for (; e - b >= 128; b += 128)
  {
    for (int i = 0; i < 4; ++i)
    {
      s[i] = _mm256_add_epi64(s[i], _mm256_loadu_si256(reinterpret_cast<const __m256i*>(b + 32 * i)));
    }
  }
  const __m256i t = _mm256_add_epi64(_mm256_add_epi64(s[0], s[1]), _mm256_add_epi64(s[2], s[3]));
  uint64_t w[4];
  std::memcpy(w, &t, 32);
  return w[0] + w[1] + w[2] + w[3];
}

void find(benchmark::State& state, Bytes (*finder)(Bytes, Bytes), bool both, size_t size)
{
  unsigned char* b = haystack();
  // Check that it finds what is there, near the end of a block of odd length.
  for (Bytes marker : {Bytes(kMarker), Bytes(kReversed)})
  {
    unsigned char keep[8];
    unsigned char* at = b + kCheckOffset;
    std::memcpy(keep, at, 8);
    std::memcpy(at, marker, 8);
    const bool found = finder(b, at + 8) == at;
    std::memcpy(at, keep, 8);
    if (found != (both || marker == Bytes(kMarker)))
    {
      state.SkipWithError("wrong search result");
      return;
    }
  }
  for (auto _ : state)
  {
    Bytes p = finder(b, b + size);
    benchmark::DoNotOptimize(p);
    if (p)
    {
      state.SkipWithError("found the absent marker");
    }
  }
  state.SetBytesProcessed(state.iterations() * static_cast<int64_t>(size));
}
void readMemory(benchmark::State& state, size_t size)
{
  unsigned char* b = haystack();
  for (auto _ : state)
  {
    uint64_t v = readAll(b, b + size);
    benchmark::DoNotOptimize(v);
  }
  state.SetBytesProcessed(state.iterations() * static_cast<int64_t>(size));
}

void add(const char* name, Bytes (*finder)(Bytes, Bytes), bool both)
{
  benchmark::RegisterBenchmark((std::string("W6/") + name).c_str(), find, finder, both, kMemoryBytes);
  benchmark::RegisterBenchmark((std::string("W6cache/") + name).c_str(), find, finder, both, kCacheBytes);
}

[[maybe_unused]] const int registered = [] {
  struct
  {
    const char* name;
    Bytes (*find)(Bytes, Bytes);
    bool both;
  } const all[] = {
      {"memmem", viaMemmem, false},
      {"std_search", viaStdSearch, false},
      {"std_horspool", viaHorspool, false},
      {"memchr+memcmp", viaMemchr, false},
      {"string_view_find", viaStringView, false},
      {"both_word_per_byte", bothWord, true},
      {"both_stride8_table", bothStride, true},
      {"both_sse2", bothSse2, true},
  };
  for (const auto& [name, finder, both] : all)
  {
    add(name, finder, both);
  }
  __builtin_cpu_init();
  if (__builtin_cpu_supports("avx2"))
  {
    add("both_avx2", bothAvx2, true);
    benchmark::RegisterBenchmark("W6/read_bandwidth", readMemory, kMemoryBytes);
    benchmark::RegisterBenchmark("W6cache/read_bandwidth", readMemory, kCacheBytes);
  }
  return 0;
}();

} // namespace
