/// libbson. Keys are the decimal ids; 32-bit values are int32, 64-bit int64.
#include <bson/bson.h>

#include "bench/harness.hpp"

using namespace snapshot;

namespace
{

struct Key
{
  const char* text;
  int size;
};
Key key(unsigned id)
{
  const std::string& s = digitsOf(static_cast<uint16_t>(id));
  return {s.c_str(), static_cast<int>(s.size())};
}

size_t encode(const Model& m, bson_t* doc)
{
  bson_reinit(doc); // keeps the block
  bson_t root, host, db, app;
  Key k0 = key(kRootId), k1 = key(kHostId);
  bson_append_document_begin(doc, k0.text, k0.size, &root);
  bson_append_document_begin(&root, k1.text, k1.size, &host);
  for (unsigned k = 0; k < kDatabases; ++k)
  {
    Key kd = key(kDatabaseId + k);
    bson_append_document_begin(&host, kd.text, kd.size, &db);
    for (unsigned j = 0; j < kApplications; ++j)
    {
      Key ka = key(kApplicationId + j);
      bson_append_document_begin(&db, ka.text, ka.size, &app);
      const Leaf* leaf = m.application(k, j);
      for (unsigned i = 0; i < kMetrics; ++i, ++leaf)
      {
        Key n = key(leaf->id);
        switch (leaf->type)
        {
        case 'u': bson_append_int32(&app, n.text, n.size, static_cast<int32_t>(leaf->value)); break;
        case 'U': bson_append_int64(&app, n.text, n.size, static_cast<int64_t>(leaf->value)); break;
        case 't':
          bson_append_binary(&app, n.text, n.size, BSON_SUBTYPE_BINARY,
                             reinterpret_cast<const uint8_t*>(m.bytes(*leaf)), 16);
          break;
        default: bson_append_utf8(&app, n.text, n.size, m.bytes(*leaf), static_cast<int>(leaf->size));
        }
      }
      bson_append_document_end(&db, &app);
    }
    bson_append_document_end(&host, &db);
  }
  bson_append_document_end(&root, &host);
  bson_append_document_end(doc, &root);
  return doc->len;
}

bson_t* document()
{
  static bson_t* doc = [] {
    bson_t* d = bson_new();
    bson_reserve_buffer(d, 4 << 20);
    encode(model(), d);
    return d;
  }();
  return doc;
}

void encodeBson(benchmark::State& state)
{
  bson_t* d = bson_new();
  bson_reserve_buffer(d, 4 << 20);
  perTree(state, [&] { return encode(model(), d); });
  bson_destroy(d);
}
BENCHMARK(encodeBson)->Name("W1/bson");

uint64_t sum(const bson_iter_t* it)
{
  switch (bson_iter_type_unsafe(it))
  {
  case BSON_TYPE_INT32: return static_cast<uint32_t>(bson_iter_int32_unsafe(it));
  case BSON_TYPE_INT64: return static_cast<uint64_t>(bson_iter_int64_unsafe(it));
  case BSON_TYPE_BINARY:
  {
    bson_subtype_t subtype;
    uint32_t n;
    const uint8_t* p;
    bson_iter_binary(it, &subtype, &n, &p);
    return sumTimestamp(p);
  }
  default:
  {
    uint32_t n;
    const char* p = bson_iter_utf8(it, &n);
    return sumString(p, n);
  }
  }
}

uint64_t walk(bson_iter_t* it)
{
  uint64_t total = 0;
  while (bson_iter_next(it))
  {
    if (bson_iter_type_unsafe(it) == BSON_TYPE_DOCUMENT)
    {
      bson_iter_t child;
      if (bson_iter_recurse(it, &child))
      {
        total += walk(&child);
      }
    }
    else
    {
      total += sum(it);
    }
  }
  return total;
}
void walkBson(benchmark::State& state)
{
  bson_t* d = document();
  perWalk(state, d->len, [&] {
    bson_iter_t it;
    bson_iter_init(&it, d);
    return walk(&it);
  });
}
BENCHMARK(walkBson)->Name("W2/bson");

void findBson(benchmark::State& state)
{
  bson_t* d = document();
  perPath(state, [&](const Path& p) -> uint64_t {
    const unsigned ids[] = {kRootId, kHostId, kDatabaseId + unsigned{p.k}, kApplicationId + unsigned{p.j},
                            kMetricId + unsigned{p.m}};
    bson_iter_t it, child;
    bson_iter_init(&it, d);
    for (unsigned i = 0; i < 5; ++i)
    {
      Key n = key(ids[i]);
      if (!bson_iter_find_w_len(&it, n.text, n.size))
      {
        return 0;
      }
      if (i < 4)
      {
        bson_iter_recurse(&it, &child);
        it = child;
      }
    }
    return sum(&it);
  });
}
BENCHMARK(findBson)->Name("W3/bson");

void printBson(benchmark::State& state)
{
  bson_t* d = document();
  perTree(state, [&] {
    size_t n = 0;
    char* s = bson_as_json(d, &n);
    bson_free(s);
    return n;
  });
}
BENCHMARK(printBson)->Name("W4mem/bson_as_json");

void validate(benchmark::State& state, bson_validate_flags_t flags)
{
  bson_t* d = document();
  perTree(state, [&]() -> size_t {
    size_t offset = 0;
    return bson_validate(d, flags, &offset) ? d->len : 0;
  });
}
BENCHMARK_CAPTURE(validate, none, BSON_VALIDATE_NONE)->Name("W5/bson");
BENCHMARK_CAPTURE(validate, utf8, BSON_VALIDATE_UTF8)->Name("W5/bson_utf8");

} // namespace
