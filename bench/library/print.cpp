/// W4 with the plain operations.
#include <cstdio>
#include <string>

#include "bench/library/plain.hpp"

using namespace snapshot;

namespace
{

using library::kXml;

/// The characters of the whole tree; 0 after a failure.
size_t print(TAVPrintParam param, uint64_t options)
{
  return library::printPlain(library::encoded(), library::encodedSize(), param, options);
}

size_t count(const std::string& text, const char* piece)
{
  size_t found = 0;
  for (size_t at = text.find(piece); at != std::string::npos; at = text.find(piece, at + 1))
  {
    ++found;
  }
  return found;
}

/// The characters of the operation's own XML.
size_t checkedXmlBytes()
{
  return library::checkedXmlBytes([](std::FILE* stream) { return print({0, nullptr, 0, stream}, kXml); });
}

void printFile(benchmark::State& state)
{
  const size_t expected = checkedXmlBytes();
  perTree(state, [=]() -> size_t {
    const size_t printed = print({0, nullptr, 0, devNull()}, kXml);
    return printed == expected ? printed : 0;
  });
}
BENCHMARK(printFile)->Name("W4file/tavPrintSubtree_xml");

void printTextFile(benchmark::State& state)
{
  perTree(state, [] { return print({0, nullptr, 0, devNull()}, kXml & ~TAV_PRINT_XML); });
}
BENCHMARK(printTextFile)->Name("W4file/tavPrintSubtree_text");

/// All of the text in memory: through a stream of the C library.
void printMemory(benchmark::State& state)
{
  const size_t expected = checkedXmlBytes();
  std::vector<char> block(kTextBytes);
  std::FILE* stream = fmemopen(block.data(), block.size(), "w");
  std::setvbuf(stream, nullptr, _IOFBF, 1 << 16);
  perTree(state, [&]() -> size_t {
    std::rewind(stream);
    const size_t printed = print({0, nullptr, 0, stream}, kXml);
    std::fflush(stream);
    return printed == expected ? printed : 0;
  });
  std::fclose(stream);
}
BENCHMARK(printMemory)->Name("W4mem/tavPrintSubtree_xml_fmemopen");

/// A caller's buffer, which keeps the last piece only.
void printBuffer(benchmark::State& state)
{
  const size_t expected = checkedXmlBytes();
  std::vector<char> block(1 << 16);
  perTree(state, [&]() -> size_t {
    const size_t printed = print({0, block.data(), block.size(), nullptr}, kXml);
    return printed == expected ? printed : 0;
  });
}
BENCHMARK(printBuffer)->Name("W4mem/tavPrintSubtree_xml_last_piece");

} // namespace

size_t library::printPlain(void* block, uint64_t size, TAVPrintParam param, uint64_t options)
{
  const MemoryHandle handle(block, size, TAV_OPT_READ);
  uint64_t printed = 0;
  return tavPrintSubtree(options, handle.get(), nullptr, &param, &printed) == TAV_RC_OK ? printed : 0;
}

size_t library::checkedXmlBytes(const std::function<size_t(std::FILE*)>& printed)
{
  std::string text(kTextBytes, '\0');
  std::FILE* stream = fmemopen(text.data(), text.size(), "w");
  const size_t size = printed(stream);
  std::fclose(stream);
  if (size == 0 || text[size - 1] == '\0' || text[size] != '\0')
  {
    return 0;
  }
  text.resize(size);
  size_t at = 0;
  for (const Leaf& leaf : model().leaves) // timestamps are shown as dates
  {
    if (leaf.type != 't')
    {
      const std::string value = leaf.type == 's' ? std::string(model().bytes(leaf), leaf.size)
                                                 : std::to_string(leaf.value);
      at = text.find('>' + value + '<', at);
      if (at == std::string::npos)
      {
        return 0;
      }
    }
  }
  return count(text, "</") == kLeaves + kGroups ? size : 0;
}
