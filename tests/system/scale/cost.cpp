/// Runs each operation over streams of N, 2N and 4N nodes. A counter of instructions counts those of `tavMeasured`;
/// the names and sizes of the measurements go to standard output, in their order.
///   scale_cost N
#include <cstdio>
#include <cstdlib>
#include <functional>

#include "support/streams.h"

/// By this name instructions are counted.
extern "C" [[gnu::noinline]] void tavMeasured(const std::function<void()>& work)
{
  work();
}

namespace
{

using namespace test;

void measure(const char* access, const char* what, uint64_t nodes, const std::function<void()>& work)
{
  std::printf("%s %s %llu\n", access, what, static_cast<unsigned long long>(nodes));
  tavMeasured(work);
}

void writeSiblings(StreamWriter& writer, uint64_t nodes)
{
  writer.add(group64(TAV_ELM_CMN_SYSTEM));
  for (uint64_t i = 0; i < nodes; ++i) writer.add(u32(TAV_ELM_CMN_CPU_SPEED, 7, true, TAV_INFO_EYE_SIZE));
  writer.close();
}

void writeGroups(StreamWriter& writer, uint64_t nodes)
{
  writer.add(group64(TAV_ELM_CMN_SYSTEM));
  for (uint64_t i = 0; i < nodes / 4; ++i)
  {
    writer.add(group64(TAV_ELM_CMN_HOST, TAV_TYPE_HEADER64, TAV_INFO_EYE_SIZE));
    writer.add(ascii(TAV_ELM_CMN_HOST_NAME, "ada"));
    writer.add(u64(TAV_ELM_CMN_CPU_SPEED, 7));
    writer.close();
  }
  writer.close();
}

void walk(TAVHandle* handle)
{
  TAVHeaderData root{};
  check(tavGetNextChild(0, handle, nullptr, nullptr, &root), "root");
  TAVHeaderData nodes[2]{};
  uint32_t rc = tavGetNextChild(0, handle, &root.header, nullptr, &nodes[0]);
  for (unsigned i = 0; rc == TAV_RC_OK; ++i)
  {
    rc = tavGetNextChild(0, handle, &root.header, &nodes[i % 2].header, &nodes[(i + 1) % 2]);
  }
  if (rc != TAV_RC_NO_MORE_CHILDREN)
  {
    check(rc, "walk");
  }
}

void walkBack(TAVHandle* handle, uint64_t end)
{
  TAVHeaderData at{header64(0, TAV_TYPE_BINARY, 1, 0, end), nullptr, 0, 0};
  while (tavGetPrevNode(0, handle, &at, &at) == TAV_RC_OK)
  {}
}

TAVHeader rootOf(TAVHandle* handle)
{
  TAVHeaderData root{};
  check(tavGetNextChild(0, handle, nullptr, nullptr, &root), "root");
  return root.header;
}

void scan(TAVHandle* handle, uint64_t from)
{
  uint64_t found = 0;
  uint64_t distance = 0;
  bool swapped = false;
  while (tavFindEyeSizeComboInt(handle, from, 0, true, &found, &distance, &swapped) == TAV_RC_OK) from = found + 16;
}

void searchInVain(TAVHandle* handle)
{
  TAVHeader root = rootOf(handle);
  TAVHeaderData found{};
  if (tavFindElmInt(handle, &root, 0, 0, 0, 1, nullptr, nullptr, &found) != TAV_RC_NOT_FOUND)
  {
    std::abort();
  }
}

void print(TAVHandle* handle, uint64_t options)
{
  char piece[256];
  TAVPrintParam param{0, piece, sizeof piece, nullptr};
  uint64_t printed = 0;
  check(tavPrintSubtree(options, handle, nullptr, &param, &printed), "print");
}

void measureAll(const char* access, const Form& form, uint64_t nodes)
{
  Bytes streams[2];
  for (unsigned i = 0; i < 2; ++i)
  {
    StreamWriter writer(form, 60 * nodes + 4096);
    if (i == 0)
      measure(access, "write-siblings", nodes, [&] { writeSiblings(writer, nodes); });
    else
      measure(access, "write-groups", nodes, [&] { writeGroups(writer, nodes); });
    streams[i] = writer.bytes();
  }
  StreamReader siblings(streams[0], form, 32);
  StreamReader groups(streams[1], form, 32);
  TAVHeader root = rootOf(groups.handle());
  measure(access, "walk", nodes, [&] { walk(siblings.handle()); });
  measure(access, "walk-back", nodes, [&] { walkBack(siblings.handle(), streams[0].size()); });
  measure(access, "scan", nodes, [&] { scan(siblings.handle(), 0); });
  measure(access, "search", nodes, [&] { searchInVain(siblings.handle()); });
  measure(access, "validate", nodes, [&] { check(tavValidateHierarchy(0, groups.handle(), &root), "validate"); });
  measure(access, "print-text", nodes, [&] { print(groups.handle(), TAV_PRINT_SUBTREE | TAV_PRINT_DATA); });
  measure(access, "print-xml", nodes,
          [&] { print(groups.handle(), TAV_PRINT_SUBTREE | TAV_PRINT_DATA | TAV_PRINT_XML | TAV_PRINT_ATTRIBUTES); });
}

} // namespace

int main(int argc, char** argv)
{
  const uint64_t nodes = argc > 1 ? std::strtoull(argv[1], nullptr, 0) : 200;
  Form ring;
  ring.buffered = true;
  ring.pageBytes = 512;
  ring.ringBytes = 4 * 512;
  for (const uint64_t times : {1U, 2U, 4U})
  {
    measureAll("memory", Form{}, times * nodes);
    measureAll("ring", ring, times * nodes);
  }
  return 0;
}
