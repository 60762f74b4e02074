/// msgpack-c (the C library). Map keys are the 16-bit ids; lengths are known ahead.
#include <msgpack.h>

#include "bench/harness.hpp"

using namespace snapshot;

namespace
{

struct Block
{
  char* at;
  char* end;
};
int writeBlock(void* data, const char* p, size_t n)
{
  auto b = static_cast<Block*>(data);
  if (n > static_cast<size_t>(b->end - b->at))
  {
    return -1;
  }
  std::memcpy(b->at, p, n);
  b->at += n;
  return 0;
}

size_t encode(const Model& m, std::vector<char>& out)
{
  Block b{out.data(), out.data() + out.size()};
  msgpack_packer pk;
  msgpack_packer_init(&pk, &b, writeBlock);
  auto open = [&](unsigned id, size_t n) {
    msgpack_pack_uint16(&pk, static_cast<uint16_t>(id));
    msgpack_pack_map(&pk, n);
  };
  msgpack_pack_map(&pk, 1);
  open(kRootId, 1);
  open(kHostId, kDatabases);
  for (unsigned k = 0; k < kDatabases; ++k)
  {
    open(kDatabaseId + k, kApplications);
    for (unsigned j = 0; j < kApplications; ++j)
    {
      open(kApplicationId + j, kMetrics);
      const Leaf* leaf = m.application(k, j);
      for (unsigned i = 0; i < kMetrics; ++i, ++leaf)
      {
        msgpack_pack_uint16(&pk, leaf->id);
        switch (leaf->type)
        {
        case 'u': msgpack_pack_uint32(&pk, static_cast<uint32_t>(leaf->value)); break;
        case 'U': msgpack_pack_uint64(&pk, leaf->value); break;
        case 't': msgpack_pack_bin_with_body(&pk, m.bytes(*leaf), 16); break;
        default: msgpack_pack_str_with_body(&pk, m.bytes(*leaf), leaf->size);
        }
      }
    }
  }
  return static_cast<size_t>(b.at - out.data());
}

const std::vector<char>& document()
{
  static const std::vector<char> d = [] {
    std::vector<char> v(4 << 20);
    v.resize(encode(model(), v));
    return v;
  }();
  return d;
}

void encodeMsgpack(benchmark::State& state)
{
  std::vector<char> out(4 << 20);
  perTree(state, [&] { return encode(model(), out); });
}
BENCHMARK(encodeMsgpack)->Name("W1/msgpack_c");

uint64_t walk(const msgpack_object& o)
{
  switch (o.type)
  {
  case MSGPACK_OBJECT_MAP:
  {
    uint64_t total = 0;
    for (uint32_t i = 0; i < o.via.map.size; ++i)
    {
      benchmark::DoNotOptimize(o.via.map.ptr[i].key.via.u64);
      total += walk(o.via.map.ptr[i].val);
    }
    return total;
  }
  case MSGPACK_OBJECT_POSITIVE_INTEGER: return o.via.u64;
  case MSGPACK_OBJECT_BIN: return sumTimestamp(o.via.bin.ptr);
  default: return sumString(o.via.str.ptr, o.via.str.size);
  }
}

bool unpack(msgpack_unpacked* u)
{
  size_t offset = 0;
  return msgpack_unpack_next(u, document().data(), document().size(), &offset) == MSGPACK_UNPACK_SUCCESS;
}

void walkMsgpack(benchmark::State& state)
{
  msgpack_unpacked u;
  msgpack_unpacked_init(&u);
  perWalk(state, document().size(), [&] { return unpack(&u) ? walk(u.data) : 0; });
  msgpack_unpacked_destroy(&u);
}
BENCHMARK(walkMsgpack)->Name("W2/msgpack_c_unpack+walk");

void walkMsgpackDom(benchmark::State& state)
{
  msgpack_unpacked u;
  msgpack_unpacked_init(&u);
  unpack(&u);
  perWalk(state, document().size(), [&] { return walk(u.data); });
  msgpack_unpacked_destroy(&u);
}
BENCHMARK(walkMsgpackDom)->Name("W2dom/msgpack_c");

void findMsgpack(benchmark::State& state)
{
  msgpack_unpacked u;
  msgpack_unpacked_init(&u);
  unpack(&u);
  perPath(state, [&](const Path& p) -> uint64_t {
    const unsigned ids[] = {kRootId, kHostId, kDatabaseId + unsigned{p.k}, kApplicationId + unsigned{p.j},
                            kMetricId + unsigned{p.m}};
    const msgpack_object* o = &u.data;
    for (unsigned id : ids)
    {
      const msgpack_object_kv* kv = o->via.map.ptr;
      while (kv->key.via.u64 != id)
      {
        ++kv;
      }
      o = &kv->val;
    }
    return walk(*o);
  });
  msgpack_unpacked_destroy(&u);
}
BENCHMARK(findMsgpack)->Name("W3dom/msgpack_c");

void printMsgpackFile(benchmark::State& state)
{
  msgpack_unpacked u;
  msgpack_unpacked_init(&u);
  unpack(&u);
  std::vector<char> text(16 << 20);
  const int size = msgpack_object_print_buffer(text.data(), text.size(), u.data);
  perTree(state, [&] {
    msgpack_object_print(devNull(), u.data);
    return static_cast<size_t>(size);
  });
  msgpack_unpacked_destroy(&u);
}
BENCHMARK(printMsgpackFile)->Name("W4file/msgpack_c_print");

void printMsgpackMem(benchmark::State& state)
{
  msgpack_unpacked u;
  msgpack_unpacked_init(&u);
  unpack(&u);
  std::vector<char> out(16 << 20);
  perTree(state, [&] { return static_cast<size_t>(msgpack_object_print_buffer(out.data(), out.size(), u.data)); });
  msgpack_unpacked_destroy(&u);
}
BENCHMARK(printMsgpackMem)->Name("W4mem/msgpack_c_print");

void validateMsgpack(benchmark::State& state)
{
  msgpack_unpacked u;
  msgpack_unpacked_init(&u);
  perTree(state, [&] { return unpack(&u) ? document().size() : 0; });
  msgpack_unpacked_destroy(&u);
}
BENCHMARK(validateMsgpack)->Name("W5/msgpack_c_unpack");

} // namespace
