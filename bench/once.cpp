/// Passes of the workloads, each a single time: for a counter of instructions, which gives the same numbers again.
///   tav_once PART[:HOSTS]...      the passes in order; HOSTS: how often the stream holds the workload's host, 1
///   valgrind --tool=callgrind --toggle-collect=measuredWork --dump-after=measuredWork tav_once walk:1 walk:2
#include <cstdio>
#include <cstdlib>
#include <functional>
#include <map>
#include <optional>
#include <span>
#include <string>
#include <vector>

#include "bench/library/layer.hpp"
#include "bench/library/plain.hpp"
#include "bench/library/ringSteps.hpp"

using namespace snapshot;

using Work = std::function<bool()>;

/// Found by name by the counter: weak, so that no optimiser makes a copy of it under another name. What is behind
/// the call keeps it a call.
extern "C" [[gnu::noinline, gnu::weak]] bool measuredWork(const Work& work)
{
  bool works = work();
  benchmark::DoNotOptimize(works);
  return works;
}

namespace
{

/// A stream of so many hosts, and a block for a copy of it.
struct Streams
{
  explicit Streams(size_t hostCount)
      : hosts(hostCount), encoded(streamBytes(hosts)), block(encoded.size() + 1)
  {
    floor0::encode(model(), encoded.data(), hosts);
    library::addThroughRing(library::RingHandle(buffered, TAV_OPT_WRITE).get(), kLeaves);
  }
  [[nodiscard]] bool isSum(uint64_t sum) const { return sum == hosts * model().checksum; }
  [[nodiscard]] const char* end() const { return encoded.data() + encoded.size(); }

  size_t hosts;
  std::vector<char> encoded;
  std::vector<char> block;
  library::BufferedMemory buffered{library::ringBytes(kLeaves)}; ///< as many elements as the host has leaves
};

/// All random paths; `find` returns what floor0::find does.
template<class Find>
bool findAll(Find&& find)
{
  bool works = true;
  for (const Path& path : randomPaths())
  {
    works &= find(path) == sumLeaf(model(), model().application(path.k, path.j)[path.m]);
  }
  return works;
}

bool findPlain(Streams& streams, bool ownStack)
{
  const library::MemoryHandle handle(streams.encoded.data(), streams.encoded.size(), TAV_OPT_READ);
  TAVHdrStack stack;
  return findAll([&](const Path& path) { return library::findPlain(handle.get(), path, ownStack ? &stack : nullptr); });
}

bool findLayer(Streams& streams, const std::vector<tav::Path>& paths)
{
  const tav::Reader reader(std::as_bytes(std::span(streams.encoded)));
  return findAll([&](const Path& path) {
    return library::findLayer(reader, paths[static_cast<size_t>(&path - randomPaths().data())]);
  });
}

bool encodePlain(Streams& streams, library::Filling filling)
{
  return library::encodePlain(model(), streams.block.data(), streams.block.size(), filling, streams.hosts) ==
         streams.encoded.size();
}

bool printXml(Streams& streams)
{
  return library::printPlain(streams.encoded.data(), streams.encoded.size(), {0, nullptr, 0, devNull()},
                             library::kXml) != 0;
}

bool printLayer(Streams& streams)
{
  const tav::Reader reader(std::as_bytes(std::span(streams.encoded)));
  return reader.print(devNull(), {.xml = true}) != 0;
}

bool addThroughRing(Streams& streams)
{
  const library::RingHandle handle(streams.buffered, TAV_OPT_WRITE);
  return library::addThroughRing(handle.get(), kLeaves);
}

bool stepThroughRing(Streams& streams)
{
  const library::RingHandle handle(streams.buffered, TAV_OPT_READ);
  return library::stepThroughRing(handle.get()) == kLeaves * (kLeaves - 1) / 2;
}

const std::map<std::string, std::function<bool(Streams&)>> kParts = {
    {"nothing", [](Streams&) { return true; }},
    {"W1/floor", [](Streams& s) { return floor0::encode(model(), s.block.data(), s.hosts) == s.encoded.size(); }},
    {"W1/tavAddElement", [](Streams& s) { return encodePlain(s, library::Filling::sized); }},
    {"W1/tavAddElement_kept_descriptor", [](Streams& s) { return encodePlain(s, library::Filling::kept); }},
    {"W1/tavAddElement_zeroed_descriptor", [](Streams& s) { return encodePlain(s, library::Filling::zeroed); }},
    {"W1/tavAddElement_initialized_descriptor",
     [](Streams& s) { return encodePlain(s, library::Filling::initialized); }},
    {"W1/layer",
     [](Streams& s) {
       return library::encodeLayer(model(), std::as_writable_bytes(std::span(s.block))) == s.encoded.size();
     }},
    {"W1/layer_growing",
     [](Streams& s) {
       std::optional<tav::Writer> writer;
       return library::encodeLayerGrowing(model(), writer).size() == s.encoded.size();
     }},
    {"W2/floor", [](Streams& s) { return s.isSum(floor0::walk(s.encoded.data(), s.end())); }},
    {"W2/tavGetNextChild",
     [](Streams& s) { return s.isSum(library::walkPlain(s.encoded.data(), s.encoded.size())); }},
    {"W2/layer_children",
     [](Streams& s) { return s.isSum(library::walkLayerChildren(std::as_bytes(std::span(s.encoded)))); }},
    {"W2/layer_descendants",
     [](Streams& s) { return s.isSum(library::walkLayerDescendants(std::as_bytes(std::span(s.encoded)))); }},
    {"W3/floor",
     [](Streams& s) { return findAll([&s](const Path& path) { return floor0::find(s.encoded.data(), path); }); }},
    {"W3/tavFindElmInt", [](Streams& s) { return findPlain(s, false); }},
    {"W3/tavFindElmInt_own_stack", [](Streams& s) { return findPlain(s, true); }},
    {"W3/layer_path", [paths = library::layerPaths()](Streams& s) { return findLayer(s, paths); }},
    {"index/made", [](Streams& s) {
       const tav::Reader reader(std::as_bytes(std::span(s.encoded)));
       return tav::Index(reader.root()).size() == kLeaves + kGroups - 1;
     }},
    {"index/made_and_W3", [paths = library::layerPaths()](Streams& s) {
       const tav::Reader reader(std::as_bytes(std::span(s.encoded)));
       const tav::Index index(reader.root());
       return findAll([&](const Path& path) {
         return library::findIndexed(index, paths[static_cast<size_t>(&path - randomPaths().data())]);
       });
     }},
    {"W4file/tavPrintSubtree_xml", printXml},
    {"W4file/layer_print_xml", printLayer},
    {"W5/floor", [](Streams& s) { return floor0::validate(s.encoded.data(), s.end()) != 0; }},
    {"W5/tavValidateHierarchy", [](Streams& s) { return library::validatePlain(s.encoded.data(), s.encoded.size()); }},
    {"ring/tavAddElement", addThroughRing},
    {"ring/tavGetNextChild", stepThroughRing},
    {"ring/layer_add", [](Streams& s) {
       tav::Writer writer(s.buffered);
       return library::addThroughRing(writer, kLeaves);
     }},
    {"ring/layer_children", [](Streams& s) {
       return library::stepThroughRing(tav::Reader(s.buffered)) == kLeaves * (kLeaves - 1) / 2;
     }},
};

bool run(const std::string& argument)
{
  const size_t colon = argument.find(':');
  const size_t hosts = colon == std::string::npos ? 1 : std::strtoull(argument.c_str() + colon + 1, nullptr, 10);
  const auto part = kParts.find(argument.substr(0, colon));
  if (part == kParts.end() || hosts == 0)
  {
    std::fprintf(stderr, "tav_once: no such part: %s\n", argument.c_str());
    return false;
  }
  Streams streams(hosts);
  const bool works = measuredWork([&] { return part->second(streams); });
  std::printf("%s %s\n", argument.c_str(), works ? "ok" : "failed");
  return works;
}

} // namespace

int main(int argc, char** argv)
{
  model();
  randomPaths();
  devNull();
  bool works = argc > 1;
  for (int i = 1; i < argc; ++i)
  {
    works &= run(argv[i]);
  }
  return works ? 0 : 1;
}
