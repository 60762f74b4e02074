/// The nodes of a stream by a face of the library, a line a node, for comparison with what was written and with other
/// faces: offset, bits of the header, payload's bytes, type, element, depth, and the payload of a data element in hex.
///   nodes_face operations|layer|c FILE native|swapped 32|64 padded|plain
#include <bit>
#include <cstdio>
#include <fstream>
#include <iostream>
#include <iterator>
#include <stdexcept>
#include <string>
#include <vector>

#include "tav/layout.hpp"
#include "tav/tav.hpp"
#include "tav/tav_c.h"

namespace
{

struct Form
{
  bool swapped = false; ///< not this machine's byte order
  bool root32 = false;
  bool padded = false;
};

void demand(uint32_t rc, const char* what)
{
  if (rc != TAV_RC_OK)
  {
    throw std::runtime_error(std::string(what) + " failed with " + std::to_string(rc));
  }
}

bool ended(uint32_t rc, const char* what)
{
  if (rc == TAV_RC_NO_MORE_CHILDREN)
  {
    return true;
  }
  demand(rc, what);
  return false;
}

bool endsGroup(uint16_t elm)
{
  return elm == 65000 || elm == 65001;
}

struct Line
{
  uint64_t offset = 0;
  int bits = 0;
  uint64_t size = 0;
  uint16_t type = 0;
  uint16_t elm = 0;
};

void tell(const Line& node, size_t depth, const uint8_t* payload, uint64_t bytes)
{
  std::printf("%llu %d %llu %u %u %zu ", static_cast<unsigned long long>(node.offset), node.bits,
              static_cast<unsigned long long>(node.size), node.type, node.elm, depth);
  for (uint64_t i = 0; i < bytes; ++i)
  {
    std::printf("%02x", payload[i]);
  }
  std::printf("\n");
}

/// The plain operations, over the bytes in memory.
class Operations
{
public:
  Operations(std::vector<uint8_t>& bytes, const Form& form)
      : storage_(bytes.data(), bytes.size())
  {
    const uint64_t options = TAV_OPT_READ | (form.root32 ? TAV_OPT_ROOT32 : 0);
    TAVInitParam param(&storage_, options, 0, 0, form.swapped ? TAV_BYTE_ORDER_SWAPPED : uint8_t{0},
                       form.padded ? uint8_t{1} : uint8_t{0});
    demand(tavInitHandle(&handle_, &param), "tavInitHandle");
  }
  ~Operations()
  {
    tavTermHandle(&handle_);
  }
  Operations(const Operations&) = delete;
  Operations& operator=(const Operations&) = delete;

  void walk(bool root32)
  {
    TAVHeaderData root{};
    demand(tavReadNodeInt(0, handle_, 0, !root32, &root), "tavReadNodeInt");
    below(root, 0);
  }

private:
  void below(const TAVHeaderData& node, size_t depth)
  {
    const bool group = tav::layout::isGroup(node.header);
    if (!endsGroup(tav::layout::elmOf(node.header)))
    {
      tell({node.header.nodeOffset, tav::layout::is64(node.header) ? 64 : 32, tav::layout::sizeOf(node.header),
            tav::layout::typeOf(node.header), tav::layout::elmOf(node.header)},
           depth, node.pDataBuf, group ? 0 : tav::layout::sizeOf(node.header));
    }
    if (!group)
    {
      return;
    }
    TAVHeader parent = node.header;
    TAVHeaderData child{};
    TAVHeader last{};
    for (TAVHeader* before = nullptr; !ended(tavGetNextChild(0, handle_, &parent, before, &child), "tavGetNextChild");)
    {
      last = child.header;
      below(child, depth + 1);
      before = &last;
    }
  }

  TAVSSMemory storage_;
  TAVHandle* handle_ = nullptr;
};

void byOperations(const std::string& path, const Form& form)
{
  std::ifstream file(path, std::ios::binary);
  std::vector<uint8_t> bytes{std::istreambuf_iterator<char>(file), {}};
  bytes.resize(bytes.size() + 32); // a pair that ends with the block is not seen
  Operations(bytes, form).walk(form.root32);
}

/// The C++ layer, over the file.
void byLayerBelow(const tav::Node& node, size_t depth)
{
  const tav::PayloadView payload = node.payload();
  tell({node.offset(), node.width() == tav::Width::bits64 ? 64 : 32, node.size(), node.type(), node.elm()}, depth,
       reinterpret_cast<const uint8_t*>(payload.data()), payload.size());
  for (const tav::Node& child : node.children())
  {
    byLayerBelow(child, depth + 1);
  }
}

void byLayer(const std::string& path, const Form& form)
{
  const tav::StreamOptions options{
      .byteOrder = form.swapped ? tav::ByteOrder::swapped : tav::ByteOrder::native,
      .align8 = form.padded,
      .root = form.root32 ? tav::Width::bits32 : tav::Width::bits64,
  };
  const tav::Reader reader(path, options);
  byLayerBelow(reader.root(), 0);
}

/// The C interface, over the file.
void byCBelow(tav_reader* reader, const tav_node& node, size_t depth)
{
  tell({node.offset, node.header_bits, node.size, node.type, node.elm}, depth, node.payload, node.payload_size);
  if (node.is_group == 0)
  {
    return;
  }
  tav_node child;
  for (uint32_t rc = tav_first_child(reader, &node, &child); !ended(rc, "a step");
       rc = tav_next_sibling(reader, &child, &child))
  {
    byCBelow(reader, child, depth + 1);
  }
}

void byC(const std::string& path, const Form& form)
{
  const bool big = form.swapped != (std::endian::native == std::endian::big);
  const tav_form known{big ? uint8_t{2} : uint8_t{1}, form.root32 ? uint8_t{32} : uint8_t{64},
                       form.padded ? uint8_t{2} : uint8_t{1}};
  tav_reader* reader = nullptr;
  demand(tav_open_file(path.c_str(), &known, &reader), "tav_open_file");
  tav_node root;
  const uint32_t rc = tav_next_root(reader, nullptr, &root);
  if (rc == TAV_RC_OK)
  {
    byCBelow(reader, root, 0);
  }
  tav_close(reader);
  demand(rc, "tav_next_root");
}

} // namespace

int main(int argc, char** argv)
try
{
  if (argc != 6)
  {
    std::cerr << "usage: nodes_face operations|layer|c FILE native|swapped 32|64 padded|plain\n";
    return 2;
  }
  const std::string face = argv[1];
  const Form form{argv[3] == std::string("swapped"), argv[4] == std::string("32"), argv[5] == std::string("padded")};
  if (face == "operations")
  {
    byOperations(argv[2], form);
  }
  else if (face == "layer")
  {
    byLayer(argv[2], form);
  }
  else
  {
    byC(argv[2], form);
  }
  return 0;
}
catch (const std::exception& error)
{
  std::cerr << "nodes_face: " << error.what() << "\n";
  return 1;
}
