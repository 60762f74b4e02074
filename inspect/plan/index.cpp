#include "tav/inspect/index.hpp"

#include <algorithm>
#include <atomic>
#include <cstddef>
#include <span>
#include <thread>
#include <vector>

#include "inspect/plan/partChain.h"

namespace tav::inspect
{

namespace
{

/// Threads for pieces of work, the caller's among them. Fewer will do when the system gives no more.
class Crew
{
public:
  using Piece = void (*)(void* of, size_t i);

  explicit Crew(unsigned threads)
      : threads_(threads)
  {
  }

  static void run(void* to, size_t count, Piece piece, void* of)
  {
    std::atomic<size_t> next{0};
    const auto serve = [&]() {
      for (size_t i = next++; i < count; i = next++)
      {
        piece(of, i);
      }
    };
    std::vector<std::thread> helpers;
    for (unsigned i = 1; i < static_cast<const Crew*>(to)->threads_ && i < count; ++i)
    {
      try
      {
        helpers.emplace_back(serve);
      }
      catch (const std::system_error&)
      {
        break;
      }
    }
    serve();
    for (std::thread& helper : helpers)
    {
      helper.join();
    }
  }

private:
  unsigned threads_;
};

/// Where parts of the walk through a node may begin.
class Seams
{
public:
  Seams(const tav::Node& start, const tav::detail::IndexBytes& readable, const IndexOptions& options)
  {
    const uint64_t from = start.offset();
    if (readable.bytes.size() <= from || !start.isGroup())
    {
      return;
    }
    const uint64_t left = readable.bytes.size() - from;
    const uint64_t header = start.width() == tav::Width::bits64 ? layout::kHeaderSize64 : layout::kHeaderSize32;
    const uint64_t length = start.isOpen() || left <= header ? left : header + std::min(left - header, start.size());
    const auto* const first = reinterpret_cast<const uint8_t*>(readable.bytes.data());
    ByteSource source("stream", std::span(first + from, static_cast<size_t>(length)));
    const Form form{.swapped = readable.options.byteOrder == tav::ByteOrder::swapped,
                    .root64 = start.width() == tav::Width::bits64,
                    .aligned = readable.options.align8};
    for (const Part& part : partsFor(source, form, options.threads, options.partBytes))
    {
      add(part, from);
    }
    for (size_t i = 0; i < offsets_.size(); ++i)
    {
      seams_.push_back({around_[i], offsets_[i]});
    }
  }

  std::span<const tav::detail::IndexSeam> all() const { return seams_; }

private:
  /// Parts between streams are behind the node.
  void add(const Part& part, uint64_t from)
  {
    if (part.around.empty() || part.around.front().offset != 0)
    {
      return;
    }
    std::vector<uint64_t> groups;
    for (const PartGroup& group : part.around)
    {
      groups.push_back(from + group.offset);
    }
    around_.push_back(std::move(groups));
    offsets_.push_back(from + part.offset);
  }

  std::vector<std::vector<uint64_t>> around_{};
  std::vector<uint64_t> offsets_{};
  std::vector<tav::detail::IndexSeam> seams_{};
};

} // namespace

tav::Index indexOf(const tav::Node& start, const IndexOptions& options)
{
  Crew crew(options.threads);
  const Seams seams(start, tav::detail::indexBytesOf(start), options);
  return tav::Index(start, tav::detail::IndexWork{seams.all(), &crew, Crew::run});
}

tav::Index indexOf(const tav::Node& start, const IndexOptions& options, std::error_code& ec)
{
  Crew crew(options.threads);
  const Seams seams(start, tav::detail::indexBytesOf(start), options);
  return {start, tav::detail::IndexWork{seams.all(), &crew, Crew::run}, ec};
}

} // namespace tav::inspect
