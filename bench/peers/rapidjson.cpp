/// RapidJSON: the streaming writer (SAX) and the reader. Timestamps are hexadecimal.
#include <rapidjson/filewritestream.h>
#include <rapidjson/prettywriter.h>
#include <rapidjson/reader.h>
#include <rapidjson/stringbuffer.h>
#include <rapidjson/writer.h>

#include "bench/harness.hpp"

using namespace snapshot;

namespace
{

using Size = rapidjson::SizeType;

template<class Writer>
void write(const Model& m, Writer& w)
{
  auto open = [&](unsigned id) {
    const std::string& s = nameOf(static_cast<uint16_t>(id));
    w.Key(s.data(), static_cast<Size>(s.size()));
    w.StartObject();
  };
  w.StartObject();
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
        const std::string& s = nameOf(leaf->id);
        w.Key(s.data(), static_cast<Size>(s.size()));
        switch (leaf->type)
        {
        case 'u': w.Uint(static_cast<unsigned>(leaf->value)); break;
        case 'U': w.Uint64(leaf->value); break;
        case 't':
        {
          char hex[32];
          hex16(m.bytes(*leaf), hex);
          w.String(hex, 32);
          break;
        }
        default: w.String(m.bytes(*leaf), leaf->size);
        }
      }
      w.EndObject();
    }
    w.EndObject();
  }
  for (int i = 0; i < 3; ++i)
  {
    w.EndObject();
  }
}

const std::string& document()
{
  static const std::string d = [] {
    rapidjson::StringBuffer b;
    rapidjson::Writer<rapidjson::StringBuffer> w(b);
    write(model(), w);
    return std::string(b.GetString(), b.GetSize());
  }();
  return d;
}

template<template<class, class, class, class, unsigned> class W>
void printMem(benchmark::State& state)
{
  using Writer = W<rapidjson::StringBuffer, rapidjson::UTF8<>, rapidjson::UTF8<>, rapidjson::CrtAllocator,
                   rapidjson::kWriteDefaultFlags>;
  rapidjson::StringBuffer b(nullptr, 8 << 20);
  perTree(state, [&] {
    b.Clear();
    Writer w(b);
    write(model(), w);
    return b.GetSize();
  });
}
BENCHMARK(printMem<rapidjson::Writer>)->Name("W4mem/rapidjson_Writer");
BENCHMARK(printMem<rapidjson::PrettyWriter>)->Name("W4mem/rapidjson_PrettyWriter");

void printFile(benchmark::State& state)
{
  std::vector<char> buffer(1 << 16);
  perTree(state, [&] {
    rapidjson::FileWriteStream f(devNull(), buffer.data(), buffer.size());
    rapidjson::Writer<rapidjson::FileWriteStream> w(f);
    write(model(), w);
    f.Flush();
    return document().size();
  });
}
BENCHMARK(printFile)->Name("W4file/rapidjson_Writer");

void validate(benchmark::State& state)
{
  perTree(state, []() -> size_t {
    rapidjson::Reader r;
    rapidjson::MemoryStream s(document().data(), document().size());
    rapidjson::BaseReaderHandler<> h;
    return r.Parse(s, h) ? document().size() : 0;
  });
}
BENCHMARK(validate)->Name("W5/rapidjson_Reader");

} // namespace
