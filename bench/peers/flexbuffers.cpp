/// FlexBuffers. Maps want string keys (the decimal ids) and sort them at the end.
#include <flatbuffers/flexbuffers.h>

#include "bench/harness.hpp"

using namespace snapshot;

namespace
{

const char* key(unsigned id)
{
  return digitsOf(static_cast<uint16_t>(id)).c_str();
}

size_t encode(const Model& m, flexbuffers::Builder& b)
{
  b.Clear();
  const size_t top = b.StartMap();
  const size_t root = b.StartMap(key(kRootId));
  const size_t host = b.StartMap(key(kHostId));
  for (unsigned k = 0; k < kDatabases; ++k)
  {
    const size_t db = b.StartMap(key(kDatabaseId + k));
    for (unsigned j = 0; j < kApplications; ++j)
    {
      const size_t app = b.StartMap(key(kApplicationId + j));
      const Leaf* leaf = m.application(k, j);
      for (unsigned i = 0; i < kMetrics; ++i, ++leaf)
      {
        b.Key(key(leaf->id));
        switch (leaf->type)
        {
        case 'u':
        case 'U': b.UInt(leaf->value); break;
        case 't': b.Blob(m.bytes(*leaf), 16); break;
        default: b.String(m.bytes(*leaf), leaf->size);
        }
      }
      b.EndMap(app);
    }
    b.EndMap(db);
  }
  b.EndMap(host);
  b.EndMap(root);
  b.EndMap(top);
  b.Finish();
  return b.GetSize();
}

const std::vector<uint8_t>& document()
{
  static const std::vector<uint8_t> d = [] {
    flexbuffers::Builder b(4 << 20);
    encode(model(), b);
    return b.GetBuffer();
  }();
  return d;
}
flexbuffers::Reference root()
{
  return flexbuffers::GetRoot(document().data(), document().size());
}

void encodeFlex(benchmark::State& state)
{
  flexbuffers::Builder b(4 << 20);
  perTree(state, [&] { return encode(model(), b); });
}
BENCHMARK(encodeFlex)->Name("W1/flexbuffers");

uint64_t sum(flexbuffers::Reference r)
{
  switch (r.GetType())
  {
  case flexbuffers::FBT_MAP:
  {
    uint64_t total = 0;
    const flexbuffers::TypedVector keys = r.AsMap().Keys();
    const flexbuffers::Vector values = r.AsMap().Values();
    for (size_t i = 0, n = values.size(); i < n; ++i)
    {
      benchmark::DoNotOptimize(*keys[i].AsKey());
      total += sum(values[i]);
    }
    return total;
  }
  case flexbuffers::FBT_UINT: return r.AsUInt64();
  case flexbuffers::FBT_BLOB: return sumTimestamp(r.AsBlob().data());
  default:
  {
    flexbuffers::String s = r.AsString();
    return sumString(s.c_str(), s.length());
  }
  }
}
void walkFlex(benchmark::State& state)
{
  perWalk(state, document().size(), [] { return sum(root()); });
}
BENCHMARK(walkFlex)->Name("W2/flexbuffers");

void findFlex(benchmark::State& state)
{
  perPath(state, [](const Path& p) {
    return sum(root()
                   .AsMap()[key(kRootId)]
                   .AsMap()[key(kHostId)]
                   .AsMap()[key(kDatabaseId + unsigned{p.k})]
                   .AsMap()[key(kApplicationId + unsigned{p.j})]
                   .AsMap()[key(kMetricId + unsigned{p.m})]);
  });
}
BENCHMARK(findFlex)->Name("W3/flexbuffers");

void printFlex(benchmark::State& state)
{
  std::string out;
  perTree(state, [&] {
    out.clear();
    root().ToString(true, true, out);
    return out.size();
  });
}
BENCHMARK(printFlex)->Name("W4mem/flexbuffers_ToString");

void validateFlex(benchmark::State& state)
{
  std::vector<uint8_t> reuse;
  perTree(state, [&] {
    return flexbuffers::VerifyBuffer(document().data(), document().size(), &reuse) ? document().size() : 0;
  });
}
BENCHMARK(validateFlex)->Name("W5/flexbuffers_Verify");

} // namespace
