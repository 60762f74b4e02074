/// W1, W2, W3 and W5 for the floors: minimal code on the stream format.
#include "bench/floor.hpp"
#include "bench/floorApi.hpp"
#include "bench/harness.hpp"

using namespace snapshot;

namespace floor0
{
const std::vector<char>& stream()
{
  static const std::vector<char> s = [] {
    std::vector<char> block(4 << 20);
    block.resize(encode(model(), block.data()));
    return block;
  }();
  return s;
}
} // namespace floor0

namespace
{

const char* streamEnd()
{
  return floor0::stream().data() + floor0::stream().size();
}

void encodeFloor(benchmark::State& state)
{
  std::vector<char> block(4 << 20);
  perTree(state, [&] { return floor0::encode(model(), block.data()); });
}
BENCHMARK(encodeFloor)->Name("W1/floor");

/// The physical limit of W1: copying the finished stream.
void encodeMemcpy(benchmark::State& state)
{
  std::vector<char> block(4 << 20);
  perTree(state, [&] {
    std::memcpy(block.data(), floor0::stream().data(), floor0::stream().size());
    return floor0::stream().size();
  });
}
BENCHMARK(encodeMemcpy)->Name("W1/memcpy_of_result");

using Add = uint32_t (*)(uint64_t, floorApi::Handle*, const floorApi::Node*);

template<Add add>
size_t encodeApi(const Model& m, char* block, size_t capacity)
{
  floorApi::Handle h;
  uint32_t rc = floorApi::init(&h, block, capacity);
  auto group = [&](unsigned id) {
    const floorApi::Node n{{~uint64_t{0}, 0, floor0::kGroup, static_cast<uint16_t>(id)}, 0, nullptr};
    rc |= add(0, &h, &n);
  };
  group(kRootId);
  group(kHostId);
  for (unsigned k = 0; k < kDatabases; ++k)
  {
    group(kDatabaseId + k);
    for (unsigned j = 0; j < kApplications; ++j)
    {
      group(kApplicationId + j);
      const Leaf* leaf = m.application(k, j);
      for (unsigned i = 0; i < kMetrics; ++i, ++leaf)
      {
        const floorApi::Node n{{leaf->size, 0, floor0::typeOf(leaf->type), leaf->id}, 0, m.payload(*leaf)};
        rc |= add(0, &h, &n);
      }
      rc |= floorApi::closeGroup(0, &h);
    }
    rc |= floorApi::closeGroup(0, &h);
  }
  rc |= floorApi::closeGroup(0, &h);
  rc |= floorApi::closeGroup(0, &h);
  return rc == 0 && std::memcmp(block, floor0::stream().data(), 64) == 0 ? h.offset : 0;
}
template<Add add>
void encodeFloorApi(benchmark::State& state)
{
  std::vector<char> block(4 << 20);
  perTree(state, [&] { return encodeApi<add>(model(), block.data(), block.size()); });
  if (std::memcmp(block.data(), floor0::stream().data(), floor0::stream().size()) != 0)
  {
    state.SkipWithError("differs from W1/floor");
  }
}
BENCHMARK(encodeFloorApi<floorApi::add>)->Name("W1/floor_api");
BENCHMARK(encodeFloorApi<floorApi::addTuned>)->Name("W1/floor_api_tuned");

void walkFloor(benchmark::State& state)
{
  perWalk(state, floor0::stream().size(), [] { return floor0::walk(floor0::stream().data(), streamEnd()); });
}
BENCHMARK(walkFloor)->Name("W2/floor");

/// Headers only: what a walk costs that looks at no payload.
uint64_t walkHeaders(const char* at, const char* end)
{
  uint64_t nodes = 0;
  while (at < end)
  {
    floor0::Header h;
    std::memcpy(&h, at, sizeof h);
    at += sizeof h;
    nodes += 1 + (h.type == floor0::kGroup ? walkHeaders(at, at + h.size) : 0);
    at += h.size;
  }
  return nodes;
}
void walkFloorHeaders(benchmark::State& state)
{
  perTree(state, [] {
    const bool ok = walkHeaders(floor0::stream().data(), streamEnd()) == kLeaves + kGroups;
    return ok ? floor0::stream().size() : 0;
  });
}
BENCHMARK(walkFloorHeaders)->Name("W2/floor_headers_only");

uint64_t walkApi(const floorApi::Handle& h, const floorApi::Node* parent)
{
  uint64_t sum = 0;
  floorApi::Node node[2];
  floorApi::Node* previous = nullptr;
  for (unsigned i = 0; floorApi::nextChild(0, &h, parent, previous, &node[i & 1]) == 0; ++i)
  {
    previous = &node[i & 1];
    sum += previous->header.type == floor0::kGroup
               ? walkApi(h, previous)
               : floor0::sumPayload(previous->header, static_cast<const char*>(previous->data));
  }
  return sum;
}
void walkFloorApi(benchmark::State& state)
{
  std::vector<char> block = floor0::stream();
  floorApi::Handle h;
  floorApi::init(&h, block.data(), block.size());
  perWalk(state, block.size(), [&] { return walkApi(h, nullptr); });
}
BENCHMARK(walkFloorApi)->Name("W2/floor_api");

void findFloor(benchmark::State& state)
{
  perPath(state, [](const Path& p) { return floor0::find(floor0::stream().data(), p); });
}
BENCHMARK(findFloor)->Name("W3/floor");

uint64_t findApi(const floorApi::Handle& h, const Path& p)
{
  const unsigned ids[] = {kRootId, kHostId, kDatabaseId + unsigned{p.k}, kApplicationId + unsigned{p.j},
                          kMetricId + unsigned{p.m}};
  floorApi::Node parent, node;
  const floorApi::Node* in = nullptr;
  for (unsigned id : ids)
  {
    const floorApi::Node* previous = nullptr;
    do {
      if (floorApi::nextChild(0, &h, in, previous, &node) != 0)
      {
        return 0;
      }
      previous = &node;
    } while (node.header.id != id);
    parent = node;
    in = &parent;
  }
  return floor0::sumPayload(node.header, static_cast<const char*>(node.data));
}
void findFloorApi(benchmark::State& state)
{
  std::vector<char> block = floor0::stream();
  floorApi::Handle h;
  floorApi::init(&h, block.data(), block.size());
  perPath(state, [&](const Path& p) { return findApi(h, p); });
}
BENCHMARK(findFloorApi)->Name("W3/floor_api");

void validateFloor(benchmark::State& state)
{
  perTree(state, [] {
    const bool ok = floor0::validate(floor0::stream().data(), streamEnd()) == kLeaves + kGroups;
    return ok ? floor0::stream().size() : 0;
  });
}
BENCHMARK(validateFloor)->Name("W5/floor");

} // namespace
