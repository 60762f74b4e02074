/// Runs the reading operations over families of hostile streams of rising lengths. A counter of instructions counts
/// those of `tavMeasured`; the names of the measurements go to standard output, in their order.
///   scale_hostile FAMILY LEAST MOST FORM...
/// LEAST, MOST: lengths in bytes, doubled from one to the next. FORM: access (memory, ring1, ring2, ring10), and after
/// it + for each of swapped, aligned.
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <functional>
#include <string>
#include <vector>

#include "api/walkGuard.h"
#include "support/hostileFamilies.h"
#include "tav/layout.hpp"
#include "tav/tav.hpp"

/// By this name instructions are counted.
extern "C" [[gnu::noinline]] void tavMeasured(const std::function<void()>& work)
{
  work();
}

namespace
{

using namespace test;
namespace layout = tav::layout;

constexpr uint64_t kPage = 512;
constexpr uint64_t kMostPrinted = 0x1000000; ///< behind a stream with so much output no longer one is printed

/// What an operation gives: how many bytes it printed.
using Operation = std::function<uint64_t(StreamReader&)>;

TAVHeader rootOf(TAVHandle* handle)
{
  TAVHeaderData root{};
  check(tavReadNodeInt(0, handle, 0, true, &root), "root");
  return root.header;
}

uint64_t validate(StreamReader& reader)
{
  TAVHeader root = rootOf(reader.handle());
  tavValidateHierarchy(0, reader.handle(), &root);
  return 0;
}

uint64_t print(StreamReader& reader, uint64_t options)
{
  static FILE* const nowhere = std::fopen("/dev/null", "w"); // what is printed in pieces is cut, and so not counted
  TAVPrintParam param{0, nullptr, 0, nowhere};
  uint64_t printed = 0;
  tavPrintSubtree(options, reader.handle(), nullptr, &param, &printed);
  return printed;
}

/// Every node by single steps, as far as a walk may go.
uint64_t walk(StreamReader& reader)
{
  TAVHeaderData node{};
  if (tavGetNextChild(0, reader.handle(), nullptr, nullptr, &node) != TAV_RC_OK)
  {
    return 0;
  }
  tav::inside::WalkGuard guard(node.header);
  std::vector<TAVHeader> stack{node.header};
  bool first = true;
  while (!stack.empty())
  {
    TAVHeader previous = node.header;
    const uint32_t rc =
        tavGetNextChild(0, reader.handle(), &stack.back(), first ? nullptr : &previous, &node);
    first = rc == TAV_RC_OK && layout::isGroup(node.header);
    if (rc == TAV_RC_NO_MORE_CHILDREN)
    {
      node.header = stack.back();
      stack.pop_back();
    }
    else if (rc != TAV_RC_OK || !guard.visit(node.header.nodeOffset))
    {
      return 0;
    }
    if (first)
    {
      stack.push_back(node.header);
    }
  }
  return 0;
}

/// Where the last eight pairs end.
std::vector<uint64_t> lastPairs(StreamReader& reader)
{
  std::vector<uint64_t> ends;
  uint64_t from = 0;
  uint64_t distance = 0;
  bool swapped = false;
  while (tavFindEyeSizeComboInt(reader.handle(), from, 0, true, &from, &distance, &swapped) == TAV_RC_OK)
  {
    from += 16;
    ends.push_back(from);
  }
  return {ends.end() - static_cast<ptrdiff_t>(std::min<size_t>(ends.size(), 8)), ends.end()};
}

uint64_t walkBack(StreamReader& reader)
{
  for (const uint64_t end : lastPairs(reader))
  {
    TAVHeaderData at{header64(0, TAV_TYPE_BINARY, 1, 0, end), nullptr, 0, 0};
    while (tavGetPrevNode(0, reader.handle(), &at, &at) == TAV_RC_OK)
    {}
  }
  return 0;
}

/// Each node that an index leads to, from each node's place.
uint64_t nodesFromIndex(StreamReader& reader, uint64_t options)
{
  TAVHeaderData node{};
  uint64_t index = 0;
  for (uint64_t calls = 0; calls < 64; ++calls)
  {
    if (tavFindNodeFromIndex(options, reader.handle(), index, 0, &node) != TAV_RC_OK)
    {
      break;
    }
    index = std::max(index, node.header.nodeOffset) + 16;
  }
  return 0;
}

/// For what is not there, in each of eight levels, each below the first group of the one above.
uint64_t search(StreamReader& reader)
{
  TAVHeader parent = rootOf(reader.handle());
  for (int level = 0; level < 8; ++level)
  {
    TAVHeaderData found{};
    tavFindElmInt(reader.handle(), &parent, 0, 0, 0, 1000, nullptr, nullptr, &found);
    TAVHdrStack stack;
    if (tavFindElmInt(reader.handle(), &parent, 0, 1, 0, 1000, nullptr, &stack, &found) != TAV_RC_OK)
    {
      break;
    }
    parent = *stack.top();
  }
  return 0;
}

/// A path whose first entry is there and whose last one is not.
uint64_t searchPath(StreamReader& reader)
{
  TAVHeader root = rootOf(reader.handle());
  TAVHeaderData found{};
  TAVHeaderData child{};
  uint16_t elm = 0;
  TAVHeader previous{};
  for (uint32_t rc = tavGetNextChild(0, reader.handle(), &root, nullptr, &child); rc == TAV_RC_OK;
       rc = tavGetNextChild(0, reader.handle(), &root, &previous, &child))
  {
    previous = child.header;
    if (layout::isGroup(child.header))
    {
      elm = layout::elmOf(child.header);
      break;
    }
  }
  if (elm == 0)
  {
    return 0;
  }
  std::vector<TAVPathEntry> path(6, TAVPathEntry{0, elm});
  path.push_back({0, 1000});
  TAVFindLogicalGroupParam param{0, path.data(), static_cast<uint32_t>(path.size()), nullptr, 0};
  tavFindLogicalGroup(0, reader.handle(), &root, &param, &found);
  return 0;
}

/// The walk of the C++ layer.
uint64_t walkLayer(StreamReader& reader)
{
  const TAVHandle& handle = *reader.handle();
  tav::StreamOptions options;
  options.byteOrder = handle.swapBytes != 0 ? tav::ByteOrder::swapped : tav::ByteOrder::native;
  options.align8 = handle.alignMode != 0;
  options.ringBytes = handle.pCircularBuf != nullptr ? handle.pCircularBuf->ringSize : kPage;
  const tav::Reader stream(reader.storage(), options);
  std::error_code ec;
  uint64_t nodes = 0;
  for (const tav::Node& node : stream.root().descendants(ec)) nodes += node.offset() != 0 ? 1 : 0;
  return nodes == ~uint64_t{0} ? 1 : 0;
}

struct Named
{
  const char* name;
  Operation run;
};

const std::vector<Named>& operations()
{
  static const std::vector<Named> all{
      {"validate", validate},
      {"print-text", [](StreamReader& reader) { return print(reader, TAV_PRINT_SUBTREE | TAV_PRINT_DATA); }},
      {"print-xml",
       [](StreamReader& reader) {
         return print(reader, TAV_PRINT_SUBTREE | TAV_PRINT_DATA | TAV_PRINT_XML | TAV_PRINT_ATTRIBUTES);
       }},
      {"search", search},
      {"path", searchPath},
      {"walk", walk},
      {"walk-layer", walkLayer},
      {"walk-back", walkBack},
      {"index", [](StreamReader& reader) { return nodesFromIndex(reader, 0); }},
      {"index-after", [](StreamReader& reader) { return nodesFromIndex(reader, 4); }},
  };
  return all;
}

Form formOf(const std::string& text)
{
  Form form;
  form.swap = text.find("+swapped") != std::string::npos;
  form.align = text.find("+aligned") != std::string::npos;
  form.buffered = text.compare(0, 4, "ring") == 0;
  form.pageBytes = kPage;
  form.ringBytes = form.buffered ? kPage * std::strtoull(text.c_str() + 4, nullptr, 10) : 0;
  return form;
}

uint64_t measure(const std::string& form, const char* name, uint64_t length, const std::function<uint64_t()>& work)
{
  // Called by an address that the compiler cannot know, or it would measure a copy of another name.
  void (*volatile const measured)(const std::function<void()>&) = tavMeasured;
  uint64_t printed = 0;
  const auto start = std::chrono::steady_clock::now();
  measured([&] { printed = work(); });
  const std::chrono::duration<double> seconds = std::chrono::steady_clock::now() - start;
  std::printf("%s %s %llu %llu %.6f\n", form.c_str(), name, static_cast<unsigned long long>(length),
              static_cast<unsigned long long>(printed), seconds.count());
  std::fflush(stdout);
  return printed;
}

} // namespace

int main(int argc, char** argv)
{
  if (argc == 1)
  {
    for (const HostileFamily& family : hostileFamilies()) std::printf("%s\n", family.name);
    return 0;
  }
  const uint64_t least = argc > 3 ? std::strtoull(argv[2], nullptr, 0) : 0;
  const uint64_t most = argc > 3 ? std::strtoull(argv[3], nullptr, 0) : 0;
  const auto family = std::find_if(hostileFamilies().begin(), hostileFamilies().end(),
                                   [&](const HostileFamily& one) { return std::strcmp(one.name, argv[1]) == 0; });
  if (least == 0 || family == hostileFamilies().end())
  {
    std::fputs("scale_hostile FAMILY LEAST MOST FORM...\n", stderr);
    return 2;
  }
  for (int i = 4; i < argc; ++i)
  {
    const Form form = formOf(argv[i]);
    for (const Named& operation : operations())
    {
      uint64_t printed = 0;
      for (uint64_t length = least; length <= most && printed <= kMostPrinted; length *= 2)
      {
        StreamReader reader(hostileStream(*family, length, form.swap), form);
        printed = measure(argv[i], operation.name, length, [&] { return operation.run(reader); });
      }
    }
  }
  return 0;
}
