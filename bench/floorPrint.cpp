/// W4 for the floors: the stream as indented XML, one line per leaf, three blanks a level.
#include <charconv>

#include "bench/harness.hpp"

using namespace snapshot;

namespace
{

const char* streamEnd()
{
  return floor0::stream().data() + floor0::stream().size();
}

/// Writes into a block that is known to be large enough.
struct BlockSink
{
  char* at;
  void text(const char* p, size_t n)
  {
    std::memcpy(at, p, n);
    at += n;
  }
  void blanks(size_t n)
  {
    std::memset(at, ' ', n);
    at += n;
  }
  void number(uint64_t v) { at = std::to_chars(at, at + 20, v).ptr; }
};

template<class Sink>
void tag(Sink& out, const char* open, size_t openSize, uint16_t id, const char* close, size_t closeSize)
{
  const std::string& name = nameOf(id);
  out.text(open, openSize);
  out.text(name.data(), name.size());
  out.text(close, closeSize);
}

void printXml(BlockSink& out, const char* at, const char* end, unsigned depth)
{
  while (at < end)
  {
    floor0::Header h;
    std::memcpy(&h, at, sizeof h);
    at += sizeof h;
    out.blanks(3 * depth);
    if (h.type == floor0::kGroup)
    {
      tag(out, "<", 1, h.id, ">\n", 2);
      printXml(out, at, at + h.size, depth + 1);
      out.blanks(3 * depth);
    }
    else
    {
      tag(out, "<", 1, h.id, ">", 1);
      if (h.type == floor0::kString)
      {
        out.text(at, h.size);
      }
      else if (h.type == floor0::kTimestamp)
      {
        hex16(at, out.at);
        out.at += 32;
      }
      else
      {
        out.number(floor0::sumPayload(h, at));
      }
    }
    tag(out, "</", 2, h.id, ">\n", 2);
    at += h.size;
  }
}

size_t printXml(std::vector<char>& block)
{
  BlockSink out{block.data()};
  printXml(out, floor0::stream().data(), streamEnd(), 0);
  return static_cast<size_t>(out.at - block.data());
}

void printFloorMem(benchmark::State& state)
{
  std::vector<char> block(16 << 20);
  perTree(state, [&] { return printXml(block); });
}
BENCHMARK(printFloorMem)->Name("W4mem/floor_to_chars_xml");

void printFloorFile(benchmark::State& state)
{
  std::vector<char> block(16 << 20);
  perTree(state, [&] { return std::fwrite(block.data(), 1, printXml(block), devNull()); });
}
BENCHMARK(printFloorFile)->Name("W4file/floor_to_chars_xml");

/// The same text with the tags, indentation included, made ready once per id, everything
/// copied in whole pieces that may run over what is needed, and numbers written eight
/// digits at a time without a branch on their length: near the practical limit.

/// The eight decimal digits of v < 10^8 as bytes 0..9, the first in the lowest byte.
inline uint64_t eightDigits(uint64_t v)
{
  uint64_t x = v / 10000 | (v % 10000) << 32; // two of four digits
  uint64_t q = (x * 10486 >> 20) & 0x0000007F0000007Fu;
  x = q | (x - 100 * q) << 16; // four of two
  q = (x * 103 >> 10) & 0x000F000F000F000Fu;
  return q | (x - 10 * q) << 8; // eight of one
}
inline char* writeEight(char* out, uint64_t v)
{
  const uint64_t text = eightDigits(v) | 0x3030303030303030u;
  std::memcpy(out, &text, 8);
  return out + 8;
}
inline char* writeNumber(char* out, uint64_t v)
{
  constexpr uint64_t k8 = 100000000;
  if (v >= k8 * k8)
  {
    return writeEight(writeEight(writeNumber(out, v / (k8 * k8)), v / k8 % k8), v % k8);
  }
  if (v >= k8)
  {
    return writeEight(writeNumber(out, v / k8), v % k8);
  }
  const uint64_t d = eightDigits(v);
  const int zeros = __builtin_ctzll(d | uint64_t{1} << 56) / 8; // a lone 0 keeps its last digit
  const uint64_t text = (d | 0x3030303030303030u) >> 8 * zeros;
  std::memcpy(out, &text, 8);
  return out + 8 - zeros;
}

struct ReadyTag
{
  char text[48];
  uint32_t size = 0;
};
struct ReadyTags
{
  std::vector<ReadyTag> open{kIdLimit}, close{kIdLimit};
  ReadyTags()
  {
    for (uint16_t id = kMetricId; id < kIdLimit; ++id)
    {
      const bool leaf = id < kApplicationId;
      const size_t depth = leaf ? 4 : id < kDatabaseId ? 3
                                  : id < kHostId       ? 2
                                  : id < kRootId       ? 1
                                                       : 0;
      const std::string indent(3 * depth, ' ');
      set(open[id], indent + "<" + nameOf(id) + (leaf ? ">" : ">\n"));
      set(close[id], (leaf ? "" : indent) + "</" + nameOf(id) + ">\n");
    }
  }
  static void set(ReadyTag& t, const std::string& s)
  {
    t.size = static_cast<uint32_t>(s.size());
    s.copy(t.text, sizeof t.text);
  }
};

inline char* copyOver(char* to, const char* from, size_t n)
{
  for (size_t i = 0; i < n; i += 16)
  {
    std::memcpy(to + i, from + i, 16);
  }
  return to + n;
}
inline char* copyTag(char* to, const ReadyTag& t)
{
  std::memcpy(to, t.text, 48);
  return to + t.size;
}

char* printReady(const ReadyTags& tags, char* out, const char* at, const char* end)
{
  while (at < end)
  {
    floor0::Header h;
    std::memcpy(&h, at, sizeof h);
    at += sizeof h;
    out = copyTag(out, tags.open[h.id]);
    switch (h.type)
    {
    case floor0::kGroup: out = printReady(tags, out, at, at + h.size); break;
    case floor0::kString: out = copyOver(out, at, h.size); break;
    case floor0::kTimestamp:
      hex16(at, out);
      out += 32;
      break;
    default: out = writeNumber(out, floor0::sumPayload(h, at));
    }
    out = copyTag(out, tags.close[h.id]);
    at += h.size;
  }
  return out;
}

void printReadyMem(benchmark::State& state)
{
  const ReadyTags tags;
  std::vector<char> in = floor0::stream();
  const size_t size = in.size();
  in.resize(size + 16); // copyOver reads past the last string
  std::vector<char> block(16 << 20), plain(16 << 20);
  auto print = [&] {
    return static_cast<size_t>(printReady(tags, block.data(), in.data(), in.data() + size) - block.data());
  };
  if (print() != printXml(plain) || std::memcmp(block.data(), plain.data(), print()) != 0)
  {
    state.SkipWithError("differs from the plain floor");
    return;
  }
  perTree(state, print);
}
BENCHMARK(printReadyMem)->Name("W4mem/floor_ready_tags_xml");

/// The same text through formatted output, a call per piece: the plain way.
size_t printStdio(std::FILE* f, const char* at, const char* end, int depth)
{
  int n = 0;
  size_t total = 0;
  while (at < end)
  {
    floor0::Header h;
    std::memcpy(&h, at, sizeof h);
    at += sizeof h;
    const char* name = nameOf(h.id).c_str();
    if (h.type == floor0::kGroup)
    {
      n = std::fprintf(f, "%*s<%s>\n", 3 * depth, "", name);
      total += printStdio(f, at, at + h.size, depth + 1);
      n += std::fprintf(f, "%*s</%s>\n", 3 * depth, "", name);
    }
    else
    {
      n = std::fprintf(f, "%*s<%s>", 3 * depth, "", name);
      switch (h.type)
      {
      case floor0::kString: n += std::fprintf(f, "%.*s", static_cast<int>(h.size), at); break;
      case floor0::kTimestamp:
      {
        char hex[33] = {};
        hex16(at, hex);
        n += std::fprintf(f, "%s", hex);
        break;
      }
      default: n += std::fprintf(f, "%llu", static_cast<unsigned long long>(floor0::sumPayload(h, at)));
      }
      n += std::fprintf(f, "</%s>\n", name);
    }
    total += static_cast<size_t>(n);
    at += h.size;
  }
  return total;
}
void printStdioFile(benchmark::State& state)
{
  perTree(state, [] { return printStdio(devNull(), floor0::stream().data(), streamEnd(), 0); });
}
BENCHMARK(printStdioFile)->Name("W4file/stdio_fprintf_xml");

void printStdioMem(benchmark::State& state)
{
  std::vector<char> block(16 << 20);
  std::FILE* f = fmemopen(block.data(), block.size(), "w");
  std::setvbuf(f, nullptr, _IOFBF, 1 << 16);
  perTree(state, [&] {
    std::rewind(f);
    const size_t n = printStdio(f, floor0::stream().data(), streamEnd(), 0);
    std::fflush(f);
    return n;
  });
  std::fclose(f);
}
BENCHMARK(printStdioMem)->Name("W4mem/stdio_fmemopen_xml");

} // namespace
