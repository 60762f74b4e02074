/// pugixml: an element per node, the value as text (already decimal or hexadecimal).
#include <pugixml.hpp>

#include "bench/harness.hpp"

using namespace snapshot;

namespace
{

void build(const Model& m, pugi::xml_document& doc)
{
  auto child = [](pugi::xml_node in, unsigned id) {
    return in.append_child(nameOf(static_cast<uint16_t>(id)).c_str());
  };
  pugi::xml_node host = child(child(doc, kRootId), kHostId);
  for (unsigned k = 0; k < kDatabases; ++k)
  {
    pugi::xml_node db = child(host, kDatabaseId + k);
    for (unsigned j = 0; j < kApplications; ++j)
    {
      pugi::xml_node app = child(db, kApplicationId + j);
      const Leaf* leaf = m.application(k, j);
      for (unsigned i = 0; i < kMetrics; ++i, ++leaf)
      {
        pugi::xml_text text = child(app, leaf->id).text();
        switch (leaf->type)
        {
        case 'u':
        case 'U': text.set(static_cast<unsigned long long>(leaf->value)); break;
        case 't':
        {
          char hex[33] = {};
          hex16(m.bytes(*leaf), hex);
          text.set(hex);
          break;
        }
        default: text.set(std::string(m.bytes(*leaf), leaf->size).c_str());
        }
      }
    }
  }
}

struct BlockWriter : pugi::xml_writer
{
  char* begin;
  char* at;
  explicit BlockWriter(char* p)
      : begin(p), at(p) {}
  void write(const void* data, size_t n) override
  {
    std::memcpy(at, data, n);
    at += n;
  }
};

const pugi::xml_document& tree()
{
  static pugi::xml_document doc;
  if (!doc.first_child())
  {
    build(model(), doc);
  }
  return doc;
}

void printMem(benchmark::State& state)
{
  std::vector<char> out(16 << 20);
  perTree(state, [&] {
    BlockWriter w(out.data());
    tree().save(w, "   ");
    return static_cast<size_t>(w.at - w.begin);
  });
}
BENCHMARK(printMem)->Name("W4mem/pugixml_save_dom");

void printFile(benchmark::State& state)
{
  std::vector<char> out(16 << 20);
  BlockWriter size(out.data());
  tree().save(size, "   ");
  const size_t n = static_cast<size_t>(size.at - size.begin);
  perTree(state, [&] {
    pugi::xml_writer_file w(devNull());
    tree().save(w, "   ");
    return n;
  });
}
BENCHMARK(printFile)->Name("W4file/pugixml_save_dom");

void printBuild(benchmark::State& state)
{
  std::vector<char> out(16 << 20);
  perTree(state, [&] {
    pugi::xml_document doc;
    build(model(), doc);
    BlockWriter w(out.data());
    doc.save(w, "   ");
    return static_cast<size_t>(w.at - w.begin);
  });
}
BENCHMARK(printBuild)->Name("W4mem/pugixml_build+save");

void validate(benchmark::State& state)
{
  std::vector<char> text(16 << 20);
  BlockWriter w(text.data());
  tree().save(w, "   ");
  text.resize(static_cast<size_t>(w.at - w.begin));
  perTree(state, [&]() -> size_t {
    pugi::xml_document doc;
    return doc.load_buffer(text.data(), text.size()) ? text.size() : 0;
  });
}
BENCHMARK(validate)->Name("W5/pugixml_load_buffer");

} // namespace
