/// A stream of 100 MB in memory, validated and walked: for a comparison of the same source as WebAssembly and as native
/// code (web/bench/native.mjs). Prints a line for each way, its name and its seconds: the best of three passes, after
/// one that is not measured, in which what compiles while it runs comes to an end.
#include <algorithm>
#include <chrono>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <span>
#include <system_error>
#include <vector>

#include "bench/floor.hpp"
#include "tav/inspect.hpp"
#include "tav/tav.hpp"

namespace
{

constexpr size_t kHosts = 158; // 100 MB
constexpr int kPasses = 3;
constexpr uint64_t kNodes = 1 + kHosts * (snapshot::kGroups - 1 + snapshot::kLeaves);

void demand(bool works, const char* what)
{
  if (!works)
  {
    std::fprintf(stderr, "tav_walk_memory: %s failed\n", what);
    std::exit(1);
  }
}

std::vector<char> stream()
{
  std::vector<char> bytes(snapshot::streamBytes(kHosts));
  demand(floor0::encode(snapshot::model(), bytes.data(), kHosts) == bytes.size(), "making the stream");
  return bytes;
}

/// A handle over the stream, as a program opens it.
class OpenedStream
{
public:
  explicit OpenedStream(std::vector<char>& bytes)
      : storage_(bytes.data(), bytes.size())
  {
    TAVInitParam param(&storage_, TAV_OPT_READ);
    demand(tavInitHandle(&handle_, &param) == TAV_RC_OK, "opening");
    demand(tavGetNextChild(0, handle_, nullptr, nullptr, &root_) == TAV_RC_OK, "reading the root");
  }
  ~OpenedStream() { tavTermHandle(&handle_); }
  OpenedStream(const OpenedStream&) = delete;
  OpenedStream& operator=(const OpenedStream&) = delete;

  TAVHandle* handle() const { return handle_; }
  TAVHeader* root() { return &root_.header; }

private:
  TAVSSMemory storage_;
  TAVHandle* handle_ = nullptr;
  TAVHeaderData root_{};
};

uint64_t countBelow(TAVHandle* handle, TAVHeader* parent)
{
  uint64_t nodes = 0;
  TAVHeaderData node;
  TAVHeader* previous = nullptr;
  while (tavGetNextChild(0, handle, parent, previous, &node) == TAV_RC_OK)
  {
    previous = &node.header;
    nodes += 1 + (node.header.hdr64.type == TAV_TYPE_HEADER64 ? countBelow(handle, previous) : 0);
  }
  return nodes;
}

/// Each takes all nodes in its way and says how many these were.
/// @{
uint64_t validate(std::vector<char>& bytes)
{
  OpenedStream stream(bytes);
  return tavValidateHierarchy(0, stream.handle(), stream.root()) == TAV_RC_OK ? kNodes : 0;
}

uint64_t walkChildren(std::vector<char>& bytes)
{
  OpenedStream stream(bytes);
  return 1 + countBelow(stream.handle(), stream.root());
}

uint64_t walkLayer(std::vector<char>& bytes)
{
  std::error_code failure;
  const tav::Reader reader(std::as_bytes(std::span(bytes)), {}, failure);
  const tav::Node root = reader.root(failure);
  uint64_t nodes = 1;
  for (const tav::Node& node : root.descendants(failure))
  {
    nodes += node.elm() != 0 ? 1 : 0;
  }
  return failure ? 0 : nodes;
}

uint64_t walkPieces(std::vector<char>& bytes)
{
  tav::inspect::ByteSource source("memory", {reinterpret_cast<const uint8_t*>(bytes.data()), bytes.size()});
  const tav::inspect::Form form = tav::inspect::recognise(source, {}).form;
  tav::inspect::Walker walker(source, form);
  uint64_t nodes = 0;
  for (tav::inspect::Event event; walker.next(event);)
  {
    nodes += event.what == tav::inspect::What::nodeBegin ? 1 : 0;
  }
  return nodes;
}
/// @}

void measure(const char* name, uint64_t (*work)(std::vector<char>&), std::vector<char>& bytes)
{
  double best = 1e9;
  for (int pass = 0; pass <= kPasses; ++pass)
  {
    const auto begin = std::chrono::steady_clock::now();
    demand(work(bytes) == kNodes, name);
    const std::chrono::duration<double> passed = std::chrono::steady_clock::now() - begin;
    best = pass == 0 ? best : std::min(best, passed.count());
  }
  std::printf("%s %.6f\n", name, best);
}

} // namespace

int main()
{
  std::vector<char> bytes = stream();
  measure("validate", validate, bytes);
  measure("walk", walkChildren, bytes);
  measure("walk by the C++ layer", walkLayer, bytes);
  measure("walk of the inspection library", walkPieces, bytes);
}
