#include "inspect/c/node.h"

namespace tav::inspect
{

namespace
{

// The fourth reserved word: whose node it is, and what has no field of its own.
constexpr unsigned kFlagBits = 8;
constexpr uint64_t kSwapped = 0x1;
constexpr uint64_t kAligned = 0x2;
constexpr uint64_t kHasParent = 0x4;
constexpr uint64_t kWideParent = 0x8;
constexpr uint64_t kFlags = (uint64_t{1} << kFlagBits) - 1;

uint64_t ownerWord(const tav_reader& reader)
{
  return static_cast<uint64_t>(reinterpret_cast<uintptr_t>(&reader)) << kFlagBits;
}

/// A payload in reading order is not copied twice; one of a file has its bytes in pages.
constexpr uint64_t kMostWindow = kDefaultRing;

} // namespace

bool take(const tav_reader& reader, const tav_node& node, PlacedNode& placed)
{
  const uint64_t flags = node.reserved[3] & kFlags;
  const bool isWide = node.header_bits == 64;
  if ((node.reserved[3] & ~kFlags) != ownerWord(reader) || !(isWide || node.header_bits == 32))
  {
    return false;
  }
  placed.header = {};
  placed.header.nodeOffset = node.offset;
  layout::setHeader({node.size, node.info, node.type, node.elm}, isWide, placed.header);
  placed.parent = {};
  if ((flags & kHasParent) != 0)
  {
    placed.parent.nodeOffset = node.reserved[0];
    const uint64_t rest = node.reserved[2];
    layout::setHeader({node.reserved[1], static_cast<uint32_t>(rest >> 32U), static_cast<uint16_t>(rest >> 16U),
                       static_cast<uint16_t>(rest)},
                      (flags & kWideParent) != 0, placed.parent);
  }
  placed.form = {.swapped = (flags & kSwapped) != 0, .root64 = isWide, .aligned = (flags & kAligned) != 0};
  return true;
}

void give(const tav_reader& reader, const PlacedNode& placed, const uint8_t* payload, tav_node& out)
{
  const layout::HeaderFields fields = layout::fieldsOf(placed.header);
  const bool isGroup = layout::isGroup(placed.header);
  const bool hasParent = placed.parent.hdrType != 0;
  tav_node node{};
  node.offset = placed.header.nodeOffset;
  node.size = fields.size;
  node.info = fields.info;
  node.type = fields.type;
  node.elm = fields.elm;
  node.header_bits = layout::is64(placed.header) ? 64 : 32;
  node.is_group = isGroup ? 1 : 0;
  if (!isGroup)
  {
    node.payload = payload != nullptr ? payload : payloadOf(reader, placed.header);
    node.payload_size = node.payload != nullptr ? fields.size : 0;
  }
  if (hasParent)
  {
    const layout::HeaderFields parent = layout::fieldsOf(placed.parent);
    node.reserved[0] = placed.parent.nodeOffset;
    node.reserved[1] = parent.size;
    node.reserved[2] = uint64_t{parent.info} << 32U | uint64_t{parent.type} << 16U | parent.elm;
  }
  node.reserved[3] = ownerWord(reader) | (placed.form.swapped ? kSwapped : 0) | (placed.form.aligned ? kAligned : 0) |
                     (hasParent ? kHasParent : 0) | (hasParent && layout::is64(placed.parent) ? kWideParent : 0);
  out = node;
}

const uint8_t* payloadOf(const tav_reader& reader, const TAVHeader& node)
{
  static constexpr uint8_t nothing = 0;
  ByteSource& source = *reader.state().source;
  const uint64_t from = payloadOffset(node);
  const uint64_t size = layout::sizeOf(node);
  if (from > source.size() || size > source.size() - from)
  {
    throw Error(Problem{.file = source.name(),
                        .offset = node.nodeOffset,
                        .sentence = "ends past the end of the file",
                        .code = TAV_RC_DATA_TOO_LARGE});
  }
  if (size == 0)
  {
    return &nothing;
  }
  if (source.isMemory())
  {
    return source.view(from).data();
  }
  if (size > kMostWindow)
  {
    return nullptr;
  }
  reader.window.resize(static_cast<size_t>(size));
  static_cast<void>(source.read(from, reader.window));
  return reader.window.data();
}

} // namespace tav::inspect
