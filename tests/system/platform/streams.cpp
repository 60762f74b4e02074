// tav_streams: writes streams into a folder, or reads the ones that a build for another platform wrote there. What a
// stream holds depends on its number alone: half of them have their high bytes first, so that a machine of either kind
// writes half of them in its own byte order and half of them in the other one.
//
//   tav_streams write FOLDER COUNT
//   tav_streams read FOLDER COUNT
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <iterator>
#include <stdexcept>
#include <string>

#include "support/randomTree.h"
#include "support/writing.h"
#include "tav/tav.h"

namespace
{

using namespace test;

/// The tree's payloads are the bytes that the stream shows; the writer takes numbers as this machine has them.
void giveHostOrder(TreeNode& node, const Form& form)
{
  if (!node.ending)
  {
    node.payload = streamPayload(node, form); // turning twice is not turning
  }
  for (TreeNode& child : node.children)
  {
    giveHostOrder(child, form);
  }
}

Tree treeOf(uint64_t number)
{
  Tree tree = randomTree(number);
  const bool bigEndian = number % 2 == 0;
  tree.form.swap = bigEndian != kBigEndianHost;
  giveHostOrder(tree.root, tree.form);
  layOut(tree.root, 0, tree.form);
  return tree;
}

void expect(bool holds, const TreeNode& node, const char* what)
{
  if (!holds)
  {
    throw std::runtime_error(std::string(what) + " of the node at " + std::to_string(node.offset));
  }
}

void expectNode(const TAVHeaderData& found, const TreeNode& node, const Form& form)
{
  const Element shown{found.header, {}};
  expect(found.header.nodeOffset == node.offset, node, "offset");
  expect((found.header.hdrType == TAV_HDR_64) == node.wide, node, "header form");
  expect(shown.type() == node.type && shown.elm() == node.elm, node, "type and element");
  expect(shown.size() == (node.wide ? node.size : static_cast<uint32_t>(node.size)), node, "size");
  expect(!node.wide || found.header.hdr64.info == streamInfo(node, form), node, "information");
  if (!node.group())
  {
    const Bytes payload(found.pDataBuf, found.pDataBuf + node.size);
    expect(payload == streamPayload(node, form), node, "payload");
  }
}

void expectChildren(TAVHandle* handle, TAVHeader* parent, const TreeNode& node, const Form& form)
{
  TAVHeaderData child{};
  TAVHeader reference{};
  TAVHeader* previous = nullptr;
  for (const TreeNode& expected : node.children)
  {
    check(tavGetNextChild(0, handle, parent, previous, &child), "tavGetNextChild");
    expectNode(child, expected, form);
    reference = child.header;
    previous = &reference;
    if (expected.group())
    {
      expectChildren(handle, &reference, expected, form);
    }
  }
}

Bytes contentOf(const std::string& path)
{
  std::ifstream file(path, std::ios::binary);
  return {std::istreambuf_iterator<char>(file), {}};
}

void readStream(const std::string& path, const Tree& tree)
{
  const Bytes bytes = contentOf(path);
  if (bytes != bytesOfTree(tree))
  {
    throw std::runtime_error("other bytes than this platform writes");
  }
  StreamReader reader(bytes, tree.form, 16);
  TAVHeaderData root{};
  check(tavGetNextChild(0, reader.handle(), nullptr, nullptr, &root), "tavGetNextChild");
  expectNode(root, tree.root, tree.form);
  expectChildren(reader.handle(), &root.header, tree.root, tree.form);
}

void writeStream(const std::string& path, const Tree& tree)
{
  const Bytes bytes = bytesOfTree(tree);
  std::ofstream file(path, std::ios::binary);
  file.write(reinterpret_cast<const char*>(bytes.data()), static_cast<std::streamsize>(bytes.size()));
  if (!file.flush())
  {
    throw std::runtime_error("cannot be written");
  }
}

} // namespace

int main(int argc, char** argv)
{
  const std::string command = argc == 4 ? argv[1] : "";
  if (command != "write" && command != "read")
  {
    std::fputs("tav_streams write|read FOLDER COUNT\n", stderr);
    return 2;
  }
  const uint64_t count = std::strtoull(argv[3], nullptr, 10);
  for (uint64_t number = 1; number <= count; ++number)
  {
    const std::string path = std::string(argv[2]) + "/" + std::to_string(number) + ".tav";
    try
    {
      (command == "write" ? writeStream : readStream)(path, treeOf(number));
    }
    catch (const std::exception& error)
    {
      std::fprintf(stderr, "%s: %s\n", path.c_str(), error.what());
      return 1;
    }
  }
  std::printf("%s %llu streams\n", command.c_str(), static_cast<unsigned long long>(count));
  return count != 0 ? 0 : 1;
}
