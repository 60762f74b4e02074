/// W1 to W5 with the C++ layer.
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <utility>

#include "bench/harness.hpp"
#include "bench/library/layer.hpp"
#include "bench/library/plain.hpp"

using namespace snapshot;

namespace
{

void addLeaf(tav::Group& group, const Model& model, const Leaf& leaf)
{
  switch (leaf.type)
  {
  case 'u': group.add(leaf.id, static_cast<uint32_t>(leaf.value)); break;
  case 'U': group.add(leaf.id, leaf.value); break;
  case 't':
  {
    TAVTimeStamp stamp;
    std::memcpy(&stamp, model.bytes(leaf), sizeof stamp);
    group.add(leaf.id, stamp);
    break;
  }
  default: group.add(leaf.id, std::string_view(model.bytes(leaf), leaf.size));
  }
}

void addHost(tav::Group& root, const Model& model)
{
  tav::Group host = root.group(kHostId);
  for (unsigned k = 0; k < kDatabases; ++k)
  {
    tav::Group database = host.group(static_cast<uint16_t>(kDatabaseId + k));
    for (unsigned j = 0; j < kApplications; ++j)
    {
      tav::Group application = database.group(static_cast<uint16_t>(kApplicationId + j));
      const Leaf* leaf = model.application(k, j);
      for (unsigned m = 0; m < kMetrics; ++m, ++leaf)
      {
        addLeaf(application, model, *leaf);
      }
    }
  }
}

std::span<const std::byte> encoded()
{
  return std::as_bytes(std::span(floor0::stream()));
}

/// Inlined, as the compiler does it with the plain operations' form.
[[gnu::always_inline]] inline uint64_t valueOf(const tav::Node& leaf)
{
  switch (leaf.type())
  {
  case TAV_TYPE_UINT32: return leaf.as<uint32_t>();
  case TAV_TYPE_UINT64: return leaf.as<uint64_t>();
  case TAV_TYPE_UTC_TIMESTAMP:
  {
    const auto stamp = leaf.as<TAVTimeStamp>();
    return sumTimestamp(&stamp);
  }
  default:
  {
    const auto text = leaf.as<std::string_view>();
    return sumString(text.data(), text.size());
  }
  }
}

uint64_t sumChildren(const tav::Node& group)
{
  uint64_t sum = 0;
  for (const tav::Node& child : group.children())
  {
    sum += child.isGroup() ? sumChildren(child) : valueOf(child);
  }
  return sum;
}

void encode(benchmark::State& state)
{
  std::vector<char> block(kBlockBytes);
  perEncoding(state, block, [&] { return library::encodeLayer(model(), std::as_writable_bytes(std::span(block))); });
}
BENCHMARK(encode)->Name("W1/layer");

/// Into the writer's own buffer, which grows: what most programs write first.
void encodeGrowing(benchmark::State& state)
{
  std::optional<tav::Writer> writer;
  std::span<const std::byte> written;
  perTree(state, [&] {
    written = library::encodeLayerGrowing(model(), writer);
    return written.size() == kStreamBytes ? kStreamBytes : 0;
  });
  if (fingerprint(reinterpret_cast<const char*>(written.data()), written.size()) != kStreamFingerprint)
  {
    state.SkipWithError("not the stream of the workload");
  }
}
BENCHMARK(encodeGrowing)->Name("W1/layer_growing");

void walkChildren(benchmark::State& state)
{
  perWalk(state, encoded().size(), [] { return library::walkLayerChildren(encoded()); });
}
BENCHMARK(walkChildren)->Name("W2/layer_children");

void walkDescendants(benchmark::State& state)
{
  perWalk(state, encoded().size(), [] { return library::walkLayerDescendants(encoded()); });
}
BENCHMARK(walkDescendants)->Name("W2/layer_descendants");

/// An index made before: for a program that looks up many paths in a stream that stays.
void findIndexed(benchmark::State& state)
{
  const tav::Reader reader(encoded());
  const tav::Index index(reader.root());
  const std::vector<tav::Path> paths = library::layerPaths();
  perPath(state, [&](const Path& path) { return library::findIndexed(index, paths[indexOf(path)]); });
}
BENCHMARK(findIndexed)->Name("W3/layer_index");

/// Making one, an item for each node.
void makeIndex(benchmark::State& state)
{
  const tav::Reader reader(encoded());
  perTree(state, [&] {
    const tav::Index index(reader.root());
    state.counters["bytes_a_node"] = static_cast<double>(index.memory()) / static_cast<double>(index.size());
    return index.size();
  });
}
BENCHMARK(makeIndex)->Name("W2/layer_index_made");

std::string pathText(const Path& path)
{
  return std::to_string(kHostId) + '/' + std::to_string(kDatabaseId + path.k) + '/' +
         std::to_string(kApplicationId + path.j) + '/' + std::to_string(kMetricId + path.m);
}

/// Path objects: read once, as a program keeps the paths that it looks up again and again.
void findPath(benchmark::State& state)
{
  const tav::Reader reader(encoded());
  const std::vector<tav::Path> paths = library::layerPaths();
  perPath(state, [&](const Path& path) { return library::findLayer(reader, paths[indexOf(path)]); });
}
BENCHMARK(findPath)->Name("W3/layer_path");

/// The text is read for each look-up.
void findText(benchmark::State& state)
{
  const tav::Reader reader(encoded());
  std::vector<std::string> paths;
  for (const Path& path : randomPaths())
  {
    paths.push_back(pathText(path));
  }
  perPath(state, [&](const Path& path) {
    const std::optional<tav::Node> found = reader.root().path(paths[indexOf(path)]);
    return found ? valueOf(*found) : 0;
  });
}
BENCHMARK(findText)->Name("W3/layer_path_text");

void print(benchmark::State& state)
{
  const auto printed = [](std::FILE* stream) -> size_t {
    const tav::Reader reader(encoded());
    return reader.print(stream, {.xml = true});
  };
  const size_t expected = library::checkedXmlBytes(printed);
  perTree(state, [=]() -> size_t {
    const size_t size = printed(devNull());
    return size == expected ? size : 0;
  });
}
BENCHMARK(print)->Name("W4file/layer_print_xml");

void validate(benchmark::State& state)
{
  perTree(state, [] {
    const tav::Reader reader(encoded());
    reader.validate(); // throws when the stream is not sound
    return encoded().size();
  });
}
BENCHMARK(validate)->Name("W5/layer_validate");

} // namespace

namespace library
{

void writeTree(tav::Writer& writer, const Model& model, size_t hosts)
{
  {
    tav::Group root = writer.group(kRootId);
    for (size_t i = 0; i < hosts; ++i)
    {
      addHost(root, model);
    }
  }
  writer.finish();
}

size_t encodeLayer(const Model& model, std::span<std::byte> block)
{
  tav::Writer writer(block);
  writeTree(writer, model);
  return writer.size();
}

std::span<const std::byte> encodeLayerGrowing(const Model& model, std::optional<tav::Writer>& writer)
{
  writer.emplace();
  writeTree(*writer, model);
  return std::as_const(*writer).bytes();
}

uint64_t walkLayerChildren(std::span<const std::byte> stream)
{
  const tav::Reader reader(stream);
  return sumChildren(reader.root());
}

uint64_t walkLayerDescendants(std::span<const std::byte> stream)
{
  return sumLayer(tav::Reader(stream));
}

uint64_t sumLayer(const tav::Reader& reader)
{
  uint64_t sum = 0;
  for (const tav::Node& node : reader.root().descendants())
  {
    sum += node.isGroup() ? 0 : valueOf(node);
  }
  return sum;
}

std::vector<tav::Path> layerPaths()
{
  std::vector<tav::Path> paths;
  for (const Path& path : randomPaths())
  {
    paths.emplace_back(pathText(path));
  }
  return paths;
}

uint64_t findIndexed(const tav::Index& index, const tav::Path& path)
{
  const std::optional<tav::Node> found = index.find(path);
  return found ? valueOf(*found) : 0;
}

uint64_t findLayer(const tav::Reader& reader, const tav::Path& path)
{
  const std::optional<tav::Node> found = reader.root().path(path);
  return found ? valueOf(*found) : 0;
}

} // namespace library
