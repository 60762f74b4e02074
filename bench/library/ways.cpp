/// W9: the ways that people take first, at 1 MB and at 25 MB: a stream in the writer's own buffer, in the caller's
/// block, in a file; read from memory and from the file. Beside them the plain transfer of the same bytes.
#include <fcntl.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <span>
#include <string>
#include <vector>

#include "bench/harness.hpp"
#include "bench/library/layer.hpp"

using namespace snapshot;

namespace
{

constexpr size_t kSmall = 2; // hosts
constexpr size_t kLarge = 40;
constexpr size_t kPage = size_t{1} << 20;

/// A file that is removed at the end.
class File
{
public:
  File()
  {
    const char* const folder = std::getenv("BENCH_DIR");
    path_ = std::filesystem::path(folder != nullptr ? folder : "/tmp") / "tav-bench-ways";
  }
  ~File() { std::filesystem::remove(path_); }
  File(const File&) = delete;
  File& operator=(const File&) = delete;

  [[nodiscard]] const std::filesystem::path& path() const { return path_; }

private:
  std::filesystem::path path_;
};

/// Runs one pass over so many hosts per iteration.
template<class Pass>
void perHosts(benchmark::State& state, size_t hosts, const Pass& pass)
{
  bool works = pass();
  for ([[maybe_unused]] const auto iteration : state)
  {
    works &= pass();
    benchmark::ClobberMemory();
  }
  if (!works)
  {
    state.SkipWithError("a pass failed");
  }
  state.SetItemsProcessed(state.iterations() * static_cast<int64_t>(hosts * kLeaves));
}

const std::vector<char>& encoded(size_t hosts)
{
  static std::vector<char> streams[kLarge + 1];
  std::vector<char>& stream = streams[hosts];
  if (stream.empty())
  {
    stream.resize(streamBytes(hosts));
    floor0::encode(model(), stream.data(), hosts);
  }
  return stream;
}

void writeBlock(benchmark::State& state, size_t hosts)
{
  std::vector<std::byte> block(streamBytes(hosts) + 1);
  perHosts(state, hosts, [&] {
    tav::Writer writer{std::span(block)};
    library::writeTree(writer, model(), hosts);
    return writer.size() == streamBytes(hosts);
  });
}

void writeGrowing(benchmark::State& state, size_t hosts)
{
  perHosts(state, hosts, [&] {
    tav::Writer writer;
    library::writeTree(writer, model(), hosts);
    return writer.size() == streamBytes(hosts);
  });
}

void writeFile(benchmark::State& state, size_t hosts)
{
  const File file;
  perHosts(state, hosts, [&] {
    tav::Writer writer(file.path(), {.overwrite = true, .inPlace = true});
    library::writeTree(writer, model(), hosts);
    return writer.size() == streamBytes(hosts);
  });
}

void writePlain(benchmark::State& state, size_t hosts)
{
  const File file;
  const std::vector<char>& bytes = encoded(hosts);
  perHosts(state, hosts, [&] {
    const int handle = ::open(file.path().c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0600);
    bool works = handle >= 0;
    for (size_t at = 0; at < bytes.size(); at += kPage)
    {
      const size_t size = std::min(kPage, bytes.size() - at);
      works &= ::pwrite(handle, bytes.data() + at, size, static_cast<off_t>(at)) == static_cast<ssize_t>(size);
    }
    ::close(handle);
    return works;
  });
}

bool sums(const tav::Reader& reader, size_t hosts)
{
  return library::sumLayer(reader) == hosts * model().checksum;
}

void readMemory(benchmark::State& state, size_t hosts)
{
  const std::vector<char>& bytes = encoded(hosts);
  perHosts(state, hosts, [&] { return sums(tav::Reader(std::as_bytes(std::span(bytes))), hosts); });
}

/// The file of the stream, written plainly.
void fill(const File& file, size_t hosts)
{
  const std::vector<char>& bytes = encoded(hosts);
  std::FILE* const out = std::fopen(file.path().c_str(), "wb");
  std::fwrite(bytes.data(), 1, bytes.size(), out);
  std::fclose(out);
}

void readFile(benchmark::State& state, size_t hosts)
{
  const File file;
  fill(file, hosts);
  perHosts(state, hosts, [&] { return sums(tav::Reader(file.path()), hosts); });
}

void readPlain(benchmark::State& state, size_t hosts)
{
  const File file;
  fill(file, hosts);
  std::vector<char> page(kPage);
  perHosts(state, hosts, [&] {
    const int handle = ::open(file.path().c_str(), O_RDONLY);
    size_t at = 0;
    for (ssize_t got = 1; got > 0; at += static_cast<size_t>(std::max(got, ssize_t{0})))
    {
      got = ::pread(handle, page.data(), kPage, static_cast<off_t>(at));
    }
    ::close(handle);
    return at == streamBytes(hosts);
  });
}

BENCHMARK_CAPTURE(writeBlock, small, kSmall)->Name("W9write_1MB/layer_block");
BENCHMARK_CAPTURE(writeGrowing, small, kSmall)->Name("W9write_1MB/layer_growing");
BENCHMARK_CAPTURE(writeFile, small, kSmall)->Name("W9write_1MB/layer_file");
BENCHMARK_CAPTURE(writePlain, small, kSmall)->Name("W9write_1MB/pwrite_1MiB");
BENCHMARK_CAPTURE(writeBlock, large, kLarge)->Name("W9write_25MB/layer_block");
BENCHMARK_CAPTURE(writeGrowing, large, kLarge)->Name("W9write_25MB/layer_growing");
BENCHMARK_CAPTURE(writeFile, large, kLarge)->Name("W9write_25MB/layer_file");
BENCHMARK_CAPTURE(writePlain, large, kLarge)->Name("W9write_25MB/pwrite_1MiB");
BENCHMARK_CAPTURE(readMemory, small, kSmall)->Name("W9read_1MB/layer_memory");
BENCHMARK_CAPTURE(readFile, small, kSmall)->Name("W9read_1MB/layer_file");
BENCHMARK_CAPTURE(readPlain, small, kSmall)->Name("W9read_1MB/pread_1MiB");
BENCHMARK_CAPTURE(readMemory, large, kLarge)->Name("W9read_25MB/layer_memory");
BENCHMARK_CAPTURE(readFile, large, kLarge)->Name("W9read_25MB/layer_file");
BENCHMARK_CAPTURE(readPlain, large, kLarge)->Name("W9read_25MB/pread_1MiB");

} // namespace
