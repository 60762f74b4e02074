/// W7: 1 GiB written and read in order, the page cache warm. The file is made once and
/// written over. Reads add up what they read, so that mapped pages are really touched.
#include <fcntl.h>
#include <sys/mman.h>
#include <unistd.h>

#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>
#include <vector>

#include <benchmark/benchmark.h>

#include "bench/file.hpp"
#include "bench/floorApi.hpp"

using namespace file;

namespace file
{

const std::string& path()
{
  static const std::string& p = *[] { // never destroyed: the exit handler needs it
    const char* dir = std::getenv("BENCH_DIR");
    std::string s = std::string(dir ? dir : "/tmp") + "/tav-bench-file";
    const int fd = ::open(s.c_str(), O_RDWR | O_CREAT | O_TRUNC, 0600);
    std::vector<char> page(kPageBytes, 'x');
    for (size_t at = 0; at < kFileBytes; at += kPageBytes)
    {
      if (::pwrite(fd, page.data(), kPageBytes, static_cast<off_t>(at)) < 0)
      {
        std::abort();
      }
    }
    ::fsync(fd);
    ::close(fd);
    std::atexit([] { ::unlink(path().c_str()); });
    return new std::string(s);
  }();
  return p;
}

uint64_t sumWords(const char* bytes, size_t size)
{
  uint64_t s = 0, w;
  for (; size >= 8; bytes += 8, size -= 8)
  {
    std::memcpy(&w, bytes, 8);
    s += w;
  }
  return s;
}

} // namespace file

namespace
{

template<class Pass>
void perFile(benchmark::State& state, Pass&& pass)
{
  const int fd = ::open(path().c_str(), O_RDWR);
  for (auto _ : state)
  {
    uint64_t v = pass(fd);
    benchmark::DoNotOptimize(v);
  }
  ::close(fd);
  state.SetBytesProcessed(state.iterations() * static_cast<int64_t>(kFileBytes));
}

/// Reads the file page by page, and adds up what `sumOf` says of each.
template<class Sum>
uint64_t sumPages(int fd, std::vector<char>& page, Sum sumOf)
{
  uint64_t sum = 0;
  for (size_t at = 0; at < kFileBytes; at += page.size())
  {
    if (::pread(fd, page.data(), page.size(), static_cast<off_t>(at)) < 0)
    {
      std::abort();
    }
    sum += sumOf(page);
  }
  return sum;
}

void preadPages(benchmark::State& state, size_t pageSize)
{
  std::vector<char> page(pageSize);
  perFile(state, [&](int fd) {
    return sumPages(fd, page, [](const std::vector<char>& bytes) { return sumWords(bytes.data(), bytes.size()); });
  });
}
void pwritePages(benchmark::State& state, size_t pageSize)
{
  std::vector<char> page(pageSize, 'y');
  perFile(state, [&](int fd) -> uint64_t {
    for (size_t at = 0; at < kFileBytes; at += pageSize)
    {
      if (::pwrite(fd, page.data(), pageSize, static_cast<off_t>(at)) < 0)
      {
        std::abort();
      }
    }
    return 0;
  });
}

void pwriteNew(benchmark::State& state)
{
  std::vector<char> page(kPageBytes, 'y');
  perFile(state, [&](int fd) -> uint64_t {
    if (::ftruncate(fd, 0) != 0)
    {
      std::abort();
    }
    for (size_t at = 0; at < kFileBytes; at += kPageBytes)
    {
      if (::pwrite(fd, page.data(), kPageBytes, static_cast<off_t>(at)) < 0)
      {
        std::abort();
      }
    }
    return 0;
  });
}

/// The same pages, filled and emptied in small pieces: the floor of a buffered stream.
void preadPieces(benchmark::State& state)
{
  std::vector<char> page(kPageBytes + kPieceBytes);
  perFile(state, [&](int fd) {
    uint64_t s = 0;
    char piece[kPieceBytes];
    size_t at = 0, have = 0, pos = 0;
    while (at < kFileBytes || have - pos >= kPieceBytes)
    {
      if (have - pos < kPieceBytes)
      {
        std::memmove(page.data(), page.data() + pos, have - pos);
        have -= pos;
        pos = 0;
        if (::pread(fd, page.data() + have, kPageBytes, static_cast<off_t>(at)) < 0)
        {
          std::abort();
        }
        have += kPageBytes;
        at += kPageBytes;
      }
      std::memcpy(piece, page.data() + pos, kPieceBytes);
      benchmark::DoNotOptimize(piece);
      s += sumWords(piece, kPieceBytes);
      pos += kPieceBytes;
    }
    return s;
  });
}
void pwritePieces(benchmark::State& state)
{
  std::vector<char> page(kPageBytes + kPieceBytes);
  perFile(state, [&](int fd) -> uint64_t {
    char piece[kPieceBytes] = "piece";
    size_t at = 0, pos = 0;
    for (size_t done = 0; done + kPieceBytes <= kFileBytes; done += kPieceBytes)
    {
      benchmark::DoNotOptimize(piece);
      std::memcpy(page.data() + pos, piece, kPieceBytes);
      pos += kPieceBytes;
      if (pos >= kPageBytes)
      {
        if (::pwrite(fd, page.data(), kPageBytes, static_cast<off_t>(at)) < 0)
        {
          std::abort();
        }
        at += kPageBytes;
        pos -= kPageBytes;
        std::memcpy(page.data(), page.data() + kPageBytes, pos);
      }
    }
    return 0;
  });
}

/// Each page read before it is written: the least that a stream costs that does not know that a page will be full.
void preadPwritePages(benchmark::State& state)
{
  std::vector<char> page(kPageBytes);
  perFile(state, [&](int fd) -> uint64_t {
    for (size_t at = 0; at < kFileBytes; at += kPageBytes)
    {
      const auto offset = static_cast<off_t>(at);
      if (::pread(fd, page.data(), kPageBytes, offset) < 0 || ::pwrite(fd, page.data(), kPageBytes, offset) < 0)
      {
        std::abort();
      }
    }
    return 0;
  });
}

constexpr uint64_t kPagePieces = kPageBytes / kPieceBytes; // the last bytes of each page are unused
constexpr uint64_t kPieceData = kPieceBytes - sizeof(floor0::Header);
constexpr uint64_t kPieceWords = kPieceData / sizeof(uint64_t);

/// What the pieces' payloads add up to: the first word of piece i is i.
constexpr uint64_t kPiecesSum = [] {
  const uint64_t pieces = kFileBytes / kPageBytes * kPagePieces;
  return pieces * (pieces - 1) / 2;
}();

/// Fills a page by a call a piece, and writes it; the first piece's number comes in and the next one's goes out.
void writePageByCalls(int fd, size_t at, std::vector<char>& page, uint64_t& number)
{
  floorApi::Handle handle;
  floorApi::init(&handle, page.data(), kPageBytes);
  handle.depth = 1; // below some group
  uint64_t words[kPieceWords] = {};
  for (uint64_t i = 0; i < kPagePieces; ++i)
  {
    words[0] = number++;
    floorApi::Node node;
    node.header = {kPieceData, 0, floor0::kString, 1000};
    node.data = words;
    if (floorApi::addTuned(0, &handle, &node) != 0)
    {
      std::abort();
    }
  }
  if (::pwrite(fd, page.data(), kPageBytes, static_cast<off_t>(at)) < 0)
  {
    std::abort();
  }
}

uint64_t writeByCalls(int fd)
{
  std::vector<char> page(kPageBytes);
  uint64_t number = 0;
  for (size_t at = 0; at < kFileBytes; at += kPageBytes)
  {
    writePageByCalls(fd, at, page, number);
  }
  return number;
}

uint64_t sumPageByCalls(std::vector<char>& page)
{
  floorApi::Handle handle;
  floorApi::init(&handle, page.data(), kPagePieces * kPieceBytes);
  floorApi::Node nodes[2];
  const floorApi::Node* previous = nullptr;
  uint64_t sum = 0;
  for (size_t i = 0; floorApi::nextChild(0, &handle, nullptr, previous, &nodes[i]) == 0; i ^= 1U)
  {
    previous = &nodes[i];
    sum += sumWords(static_cast<const char*>(nodes[i].data), kPieceData);
  }
  return sum;
}

/// The own page behind a library boundary: one call for each piece, as floorApi.hpp says.
void pwriteCalls(benchmark::State& state)
{
  perFile(state, [](int fd) { return writeByCalls(fd); });
}

/// Reads the pages that writeByCalls has written; `sumOf` adds up the payloads of one.
template<class Sum>
void preadWritten(benchmark::State& state, Sum sumOf)
{
  const int made = ::open(path().c_str(), O_RDWR);
  writeByCalls(made);
  ::close(made);
  std::vector<char> page(kPageBytes);
  uint64_t wrong = 0;
  perFile(state, [&](int fd) {
    const uint64_t sum = sumPages(fd, page, sumOf);
    wrong += sum != kPiecesSum;
    return sum;
  });
  if (wrong != 0)
  {
    state.SkipWithError("what was written reads back otherwise");
  }
}

void preadCalls(benchmark::State& state)
{
  preadWritten(state, sumPageByCalls);
}

/// Pieces added to a page in place, without a call: the floor of a ring whose steps are in the caller's code. Each page
/// is read before it is written, as a ring has to.
void pwriteInPlace(benchmark::State& state)
{
  std::vector<char> page(kPageBytes);
  perFile(state, [&](int fd) {
    uint64_t number = 0;
    for (size_t at = 0; at < kFileBytes; at += kPageBytes)
    {
      uint64_t words[kPieceWords] = {};
      const auto offset = static_cast<off_t>(at);
      bool works = ::pread(fd, page.data(), kPageBytes, offset) >= 0;
      char* to = page.data();
      for (uint64_t i = 0; i < kPagePieces; ++i)
      {
        words[0] = number++;
        to = floor0::add(to, 1000, floor0::kString, words, kPieceData);
      }
      works &= ::pwrite(fd, page.data(), kPageBytes, offset) >= 0;
      if (!works)
      {
        std::abort();
      }
    }
    return number;
  });
}

uint64_t sumPageInPlace(const std::vector<char>& page)
{
  uint64_t sum = 0;
  const char* const end = page.data() + kPagePieces * kPieceBytes;
  for (const char* node = page.data(); node < end;)
  {
    floor0::Header header;
    std::memcpy(&header, node, sizeof header);
    node += sizeof header;
    sum += sumWords(node, header.size);
    node += header.size;
  }
  return sum;
}

/// The same pages, walked in place.
void preadInPlace(benchmark::State& state)
{
  preadWritten(state, sumPageInPlace);
}

void stdioRead(benchmark::State& state, size_t buffer, bool unlocked)
{
  path();
  for (auto _ : state)
  {
    std::FILE* f = std::fopen(path().c_str(), "r");
    if (buffer)
    {
      std::setvbuf(f, nullptr, _IOFBF, buffer);
    }
    char piece[kPieceBytes];
    uint64_t s = 0;
    while ((unlocked ? ::fread_unlocked(piece, 1, kPieceBytes, f) : std::fread(piece, 1, kPieceBytes, f)) ==
           kPieceBytes)
    {
      s += sumWords(piece, kPieceBytes);
    }
    benchmark::DoNotOptimize(s);
    std::fclose(f);
  }
  state.SetBytesProcessed(state.iterations() * static_cast<int64_t>(kFileBytes));
}
void stdioWrite(benchmark::State& state, size_t buffer, bool unlocked)
{
  path();
  for (auto _ : state)
  {
    std::FILE* f = std::fopen(path().c_str(), "r+");
    if (buffer)
    {
      std::setvbuf(f, nullptr, _IOFBF, buffer);
    }
    const char piece[kPieceBytes] = "piece";
    for (size_t done = 0; done + kPieceBytes <= kFileBytes; done += kPieceBytes)
    {
      if (unlocked)
      {
        ::fwrite_unlocked(piece, 1, kPieceBytes, f);
      }
      else
      {
        std::fwrite(piece, 1, kPieceBytes, f);
      }
    }
    std::fclose(f);
  }
  state.SetBytesProcessed(state.iterations() * static_cast<int64_t>(kFileBytes));
}

/// Mapped and unmapped inside the measurement: page faults are part of the price.
void mmapRead(benchmark::State& state, int flags)
{
  perFile(state, [&](int fd) {
    void* p = ::mmap(nullptr, kFileBytes, PROT_READ, MAP_SHARED | flags, fd, 0);
    ::madvise(p, kFileBytes, MADV_SEQUENTIAL);
    const uint64_t s = sumWords(static_cast<const char*>(p), kFileBytes);
    ::munmap(p, kFileBytes);
    return s;
  });
}
void mmapWrite(benchmark::State& state)
{
  std::vector<char> page(kPageBytes, 'z');
  perFile(state, [&](int fd) -> uint64_t {
    char* p = static_cast<char*>(::mmap(nullptr, kFileBytes, PROT_READ | PROT_WRITE, MAP_SHARED, fd, 0));
    for (size_t at = 0; at < kFileBytes; at += kPageBytes)
    {
      std::memcpy(p + at, page.data(), kPageBytes);
    }
    ::munmap(p, kFileBytes);
    return 0;
  });
}

/// Memory alone: 1 GiB copied through a page, no file.
void memcpyPages(benchmark::State& state)
{
  std::vector<char> big(kFileBytes, 'a'), page(kPageBytes);
  for (auto _ : state)
  {
    uint64_t s = 0;
    for (size_t at = 0; at < kFileBytes; at += kPageBytes)
    {
      std::memcpy(page.data(), big.data() + at, kPageBytes);
      s += sumWords(page.data(), kPageBytes);
    }
    benchmark::DoNotOptimize(s);
  }
  state.SetBytesProcessed(state.iterations() * static_cast<int64_t>(kFileBytes));
}

constexpr size_t kKiB = 1024;
BENCHMARK_CAPTURE(preadPages, a, 4 * kKiB)->Name("W7read/pread_4KiB")->UseRealTime();
BENCHMARK_CAPTURE(preadPages, b, 64 * kKiB)->Name("W7read/pread_64KiB")->UseRealTime();
BENCHMARK_CAPTURE(preadPages, c, 256 * kKiB)->Name("W7read/pread_256KiB")->UseRealTime();
BENCHMARK_CAPTURE(preadPages, d, kPageBytes)->Name("W7read/pread_1MiB")->UseRealTime();
BENCHMARK_CAPTURE(preadPages, e, 4 * kPageBytes)->Name("W7read/pread_4MiB")->UseRealTime();
BENCHMARK(preadPieces)->Name("W7read/pread_1MiB_40B_pieces")->UseRealTime();
BENCHMARK(preadInPlace)->Name("W7read/pread_1MiB_40B_in_place")->UseRealTime();
BENCHMARK(preadCalls)->Name("W7read/pread_1MiB_40B_floor_api")->UseRealTime();
BENCHMARK_CAPTURE(stdioRead, a, 0, false)->Name("W7read/fread_40B_default_buffer")->UseRealTime();
BENCHMARK_CAPTURE(stdioRead, b, kPageBytes, false)->Name("W7read/fread_40B_1MiB_buffer")->UseRealTime();
BENCHMARK_CAPTURE(stdioRead, c, kPageBytes, true)->Name("W7read/fread_unlocked_40B_1MiB_buffer")->UseRealTime();
BENCHMARK_CAPTURE(mmapRead, a, 0)->Name("W7read/mmap")->UseRealTime();
BENCHMARK_CAPTURE(mmapRead, b, MAP_POPULATE)->Name("W7read/mmap_populate")->UseRealTime();
BENCHMARK(memcpyPages)->Name("W7read/memcpy_no_file")->UseRealTime();
BENCHMARK(pwriteNew)->Name("W7new/pwrite_1MiB")->UseRealTime();
BENCHMARK_CAPTURE(pwritePages, a, 4 * kKiB)->Name("W7write/pwrite_4KiB")->UseRealTime();
BENCHMARK_CAPTURE(pwritePages, b, 64 * kKiB)->Name("W7write/pwrite_64KiB")->UseRealTime();
BENCHMARK_CAPTURE(pwritePages, c, 256 * kKiB)->Name("W7write/pwrite_256KiB")->UseRealTime();
BENCHMARK_CAPTURE(pwritePages, d, kPageBytes)->Name("W7write/pwrite_1MiB")->UseRealTime();
BENCHMARK_CAPTURE(pwritePages, e, 4 * kPageBytes)->Name("W7write/pwrite_4MiB")->UseRealTime();
BENCHMARK(pwritePieces)->Name("W7write/pwrite_1MiB_40B_pieces")->UseRealTime();
BENCHMARK(pwriteInPlace)->Name("W7write/pread_pwrite_1MiB_40B_in_place")->UseRealTime();
BENCHMARK(pwriteCalls)->Name("W7write/pwrite_1MiB_40B_floor_api_tuned")->UseRealTime();
BENCHMARK(preadPwritePages)->Name("W7write/pread_pwrite_1MiB")->UseRealTime();
BENCHMARK_CAPTURE(stdioWrite, a, 0, false)->Name("W7write/fwrite_40B_default_buffer")->UseRealTime();
BENCHMARK_CAPTURE(stdioWrite, b, kPageBytes, false)->Name("W7write/fwrite_40B_1MiB_buffer")->UseRealTime();
BENCHMARK_CAPTURE(stdioWrite, c, kPageBytes, true)->Name("W7write/fwrite_unlocked_40B_1MiB_buffer")->UseRealTime();
BENCHMARK(mmapWrite)->Name("W7write/mmap")->UseRealTime();

} // namespace
