/// libcbor: the streaming encoder with indefinite-length maps, the streaming
/// decoder with callbacks, and the tree that cbor_load builds.
#include <cbor.h>

#include "bench/harness.hpp"

using namespace snapshot;

namespace
{

size_t encode(const Model& m, std::vector<unsigned char>& out)
{
  unsigned char* at = out.data();
  size_t left = out.size();
  auto took = [&](size_t n) {
    at += n;
    left -= n;
  };
  auto open = [&](unsigned id) {
    took(cbor_encode_uint(id, at, left));
    took(cbor_encode_indef_map_start(at, left));
  };
  auto body = [&](const char* p, size_t n) {
    std::memcpy(at, p, n);
    took(n);
  };
  took(cbor_encode_indef_map_start(at, left));
  open(kRootId);
  open(kHostId);
  for (unsigned k = 0; k < kDatabases; ++k)
  {
    open(kDatabaseId + k);
    for (unsigned j = 0; j < kApplications; ++j)
    {
      open(kApplicationId + j);
      const Leaf* leaf = m.application(k, j);
      for (unsigned i = 0; i < kMetrics; ++i, ++leaf)
      {
        took(cbor_encode_uint(leaf->id, at, left));
        switch (leaf->type)
        {
        case 'u':
        case 'U': took(cbor_encode_uint(leaf->value, at, left)); break;
        case 't':
          took(cbor_encode_bytestring_start(16, at, left));
          body(m.bytes(*leaf), 16);
          break;
        default:
          took(cbor_encode_string_start(leaf->size, at, left));
          body(m.bytes(*leaf), leaf->size);
        }
      }
      took(cbor_encode_break(at, left));
    }
    took(cbor_encode_break(at, left));
  }
  for (int i = 0; i < 3; ++i)
  {
    took(cbor_encode_break(at, left));
  }
  return static_cast<size_t>(at - out.data());
}

const std::vector<unsigned char>& document()
{
  static const std::vector<unsigned char> d = [] {
    std::vector<unsigned char> v(4 << 20);
    v.resize(encode(model(), v));
    return v;
  }();
  return d;
}

void encodeCbor(benchmark::State& state)
{
  std::vector<unsigned char> out(4 << 20);
  perTree(state, [&] { return encode(model(), out); });
}
BENCHMARK(encodeCbor)->Name("W1/libcbor_stream");

/// Keys and values alternate in a map; a map or a break leaves us before a key.
struct Walk
{
  uint64_t sum = 0;
  bool value = false;
  void number(uint64_t v)
  {
    if (value)
    {
      sum += v;
    }
    value = !value;
  }
};
cbor_callbacks walkCallbacks()
{
  cbor_callbacks c = cbor_empty_callbacks;
  c.uint8 = [](void* w, uint8_t v) { static_cast<Walk*>(w)->number(v); };
  c.uint16 = [](void* w, uint16_t v) { static_cast<Walk*>(w)->number(v); };
  c.uint32 = [](void* w, uint32_t v) { static_cast<Walk*>(w)->number(v); };
  c.uint64 = [](void* w, uint64_t v) { static_cast<Walk*>(w)->number(v); };
  c.indef_map_start = [](void* w) { static_cast<Walk*>(w)->value = false; };
  c.byte_string = [](void* w, cbor_data p, size_t) { static_cast<Walk*>(w)->number(sumTimestamp(p)); };
  c.string = [](void* w, cbor_data p, size_t n) {
    static_cast<Walk*>(w)->number(sumString(reinterpret_cast<const char*>(p), n));
  };
  return c;
}
bool decode(const cbor_callbacks& c, void* context)
{
  const unsigned char* at = document().data();
  size_t left = document().size();
  while (left > 0)
  {
    cbor_decoder_result r = cbor_stream_decode(at, left, &c, context);
    if (r.status != CBOR_DECODER_FINISHED)
    {
      return false;
    }
    at += r.read;
    left -= r.read;
  }
  return true;
}
void walkCbor(benchmark::State& state)
{
  const cbor_callbacks c = walkCallbacks();
  perWalk(state, document().size(), [&] {
    Walk w;
    decode(c, &w);
    return w.sum;
  });
}
BENCHMARK(walkCbor)->Name("W2/libcbor_stream");

void printCbor(benchmark::State& state)
{
  cbor_load_result r;
  cbor_item_t* item = cbor_load(document().data(), document().size(), &r);
  perTree(state, [&] {
    cbor_describe(item, devNull());
    return document().size();
  });
  cbor_decref(&item);
}
BENCHMARK(printCbor)->Name("W4file/libcbor_describe");

void validateStream(benchmark::State& state)
{
  perTree(state, [] { return decode(cbor_empty_callbacks, nullptr) ? document().size() : 0; });
}
BENCHMARK(validateStream)->Name("W5/libcbor_stream");

void validateLoad(benchmark::State& state)
{
  perTree(state, []() -> size_t {
    cbor_load_result r;
    cbor_item_t* item = cbor_load(document().data(), document().size(), &r);
    if (!item)
    {
      return 0;
    }
    cbor_decref(&item);
    return document().size();
  });
}
BENCHMARK(validateLoad)->Name("W5/libcbor_load");

} // namespace
