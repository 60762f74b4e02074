/// Seeded random trees: a plain model of a stream, how the library writes it, and where everything must stand.
#pragma once

#include <algorithm>
#include <cstdint>
#include <random>
#include <stdexcept>
#include <vector>

#include "support/elements.h"
#include "support/environment.h"
#include "support/streams.h"
#include "tav/tav.h"

namespace test
{

/// How many cases a property test runs, and from which seed on. The environment's TAV_TEST_SEED and TAV_TEST_CASES
/// replace the defaults.
struct Cases
{
  uint64_t first;
  uint64_t count;
};

inline Cases casesOf(uint64_t count, uint64_t seed = 1)
{
  return {fromEnvironment("TAV_TEST_SEED", seed), fromEnvironment("TAV_TEST_CASES", count)};
}

/// One node of the model. Places and stream sizes are worked out by `layOut`, not by the library.
struct TreeNode
{
  bool wide = true;
  uint16_t type = TAV_TYPE_BINARY;
  uint16_t elm = 0;
  uint32_t info = 0;         ///< as the caller gives it
  uint64_t declaredSize = 0; ///< of a group: what its header says while it is open
  bool forgotten = false;    ///< a group whose size is made unknown after writing
  bool ending = false;       ///< the end element that closing a group appends
  Bytes payload;             ///< as the caller gives it
  std::vector<TreeNode> children;

  uint64_t offset = 0; ///< of the header
  uint64_t size = 0;   ///< that the stream must show
  uint64_t end = 0;    ///< behind payload, padding and pair

  [[nodiscard]] bool group() const { return type == TAV_TYPE_HEADER32 || type == TAV_TYPE_HEADER64; }
  [[nodiscard]] bool pair() const { return wide && (info & TAV_INFO_EYE_SIZE) != 0; }
  [[nodiscard]] uint64_t headerLength() const { return wide ? 16 : 8; }
  [[nodiscard]] bool wideChildren() const { return wide && type == TAV_TYPE_HEADER64; }
};

struct Tree
{
  Form form; ///< byte order, alignment and the root's header form; access is up to the test
  TreeNode root;
};

struct TreeLimits
{
  uint32_t depth = 5;
  uint32_t width = 5;
  uint32_t payload = 60;
  bool forget = true; ///< some groups end up with an unknown size
};

/// The bytes of a payload as they stand in a stream of the other byte order.
inline Bytes reversedPayload(uint16_t type, Bytes payload)
{
  std::vector<size_t> units;
  switch (type)
  {
  case TAV_TYPE_UINT16:
  case TAV_TYPE_SINT16:
  case TAV_TYPE_UTF8_STRING: units = {2}; break;
  case TAV_TYPE_UINT32:
  case TAV_TYPE_SINT32: units = {4}; break;
  case TAV_TYPE_UINT64:
  case TAV_TYPE_SINT64: units = {8}; break;
  case TAV_TYPE_UTC_TIMESTAMP: units = {8, 2, 2, 2, 2}; break;
  case TAV_TYPE_UINT128:
  case TAV_TYPE_SINT128: units = {16}; break;
  case TAV_TYPE_UINT64_ARRAY: units.assign(payload.size() / 8, 8); break;
  default: break;
  }
  size_t needed = 0;
  for (const size_t unit : units)
  {
    needed += unit;
  }
  auto at = payload.begin();
  for (const size_t unit : units)
  {
    if (needed <= payload.size())
    {
      std::reverse(at, at + static_cast<ptrdiff_t>(unit));
      at += static_cast<ptrdiff_t>(unit);
    }
  }
  return payload;
}

/// Sets offset, size and end of a node and all below it, and adds the end elements that closing appends.
inline void layOut(TreeNode& node, uint64_t offset, const Form& form)
{
  node.offset = offset;
  const uint64_t content = offset + node.headerLength();
  if (!node.group())
  {
    node.size = node.payload.size();
    const uint64_t padded = form.align ? (node.size + 7) / 8 * 8 : node.size;
    node.end = content + padded + (node.pair() ? 16 : 0);
    return;
  }
  if (node.pair() && (node.children.empty() || !node.children.back().ending))
  {
    TreeNode ending;
    ending.wide = node.wideChildren();
    ending.elm = TAV_ELM_CMN_END_HDR_EYE_SIZE;
    ending.ending = true;
    ending.payload.assign(16, 0);
    node.children.push_back(ending);
  }
  uint64_t at = content;
  for (TreeNode& child : node.children)
  {
    layOut(child, at, form);
    if (child.ending)
    {
      const uint64_t distance = at - content + (child.wide ? 32 : 16);
      child.payload = bytesOfValue(TAV_EYE_CATCHER);
      const Bytes second = bytesOfValue(distance);
      child.payload.insert(child.payload.end(), second.begin(), second.end());
      if (form.swap)
      {
        std::reverse(child.payload.begin(), child.payload.begin() + 8);
        std::reverse(child.payload.begin() + 8, child.payload.end());
      }
    }
    at = child.end;
  }
  node.end = at;
  node.size = node.forgotten ? TAV_SIZE_UNKNOWN : at - content;
}

/// The payload's bytes that the stream must hold.
inline Bytes streamPayload(const TreeNode& node, const Form& form)
{
  return form.swap && !node.ending ? reversedPayload(node.type, node.payload) : node.payload;
}

/// `info` that the stream must show: under alignment the writer flags every wide header.
inline uint32_t streamInfo(const TreeNode& node, const Form& form)
{
  return node.wide ? node.info | (form.align ? TAV_INFO_ALIGNED8 : 0U) : 0U;
}

/// Makes trees from a seed, the same on every machine.
class TreeMaker
{
public:
  TreeMaker(uint64_t seed, const TreeLimits& limits)
      : random_(seed), limits_(limits) {}

  Tree make()
  {
    Tree tree;
    tree.form.swap = chance(2);
    tree.form.align = chance(2);
    tree.form.root32 = chance(4);
    tree.root = group(!tree.form.root32, limits_.depth, tree.form);
    if (limits_.forget && leadsBack(tree.root, tree.form) && tree.root.pair() && chance(2))
    {
      forget(tree.root);
    }
    layOut(tree.root, 0, tree.form);
    return tree;
  }

private:
  uint64_t below(uint64_t bound) { return random_() % bound; }
  bool chance(uint64_t oneIn) { return below(oneIn) == 0; }
  uint16_t element() { return static_cast<uint16_t>(below(chance(2) ? 400 : 65000)); }
  uint32_t flags() { return static_cast<uint32_t>(below(0x800)) | (chance(2) ? TAV_INFO_EYE_SIZE : 0U); }

  TreeNode group(bool wide, uint32_t depth, const Form& form)
  {
    TreeNode node;
    node.wide = wide;
    node.type = wide && !chance(4) ? TAV_TYPE_HEADER64 : TAV_TYPE_HEADER32;
    node.elm = element();
    node.info = wide ? flags() : 0;
    const uint64_t declared[] = {0, wide ? TAV_SIZE_UNKNOWN : 0xFFFFFFFF, below(1000)};
    node.declaredSize = declared[below(3)];
    const uint64_t count = below(limits_.width + 1);
    for (uint64_t i = 0; i < count; ++i)
    {
      node.children.push_back(depth > 1 && chance(3) ? group(node.wideChildren(), depth - 1, form)
                                                     : data(node.wideChildren()));
    }
    return node;
  }

  TreeNode data(bool wide)
  {
    struct Kind
    {
      uint16_t type;
      uint64_t size; ///< 0: any
    };
    static constexpr Kind kinds[] = {
        {TAV_TYPE_ASCII_STRING, 0},
        {TAV_TYPE_UINT8, 1},
        {TAV_TYPE_SINT8, 1},
        {TAV_TYPE_UINT16, 2},
        {TAV_TYPE_SINT16, 2},
        {TAV_TYPE_UINT32, 4},
        {TAV_TYPE_SINT32, 4},
        {TAV_TYPE_UINT64, 8},
        {TAV_TYPE_SINT64, 8},
        {TAV_TYPE_UTC_TIMESTAMP, 16},
        {TAV_TYPE_BINARY, 0},
        {TAV_TYPE_UTF8_STRING, 0},
        {TAV_TYPE_UINT128, 16},
        {TAV_TYPE_SINT128, 16},
        {TAV_TYPE_BYTE, 1},
        {TAV_TYPE_UINT64_ARRAY, 0},
        {TAV_TYPE_UINT64, 11},
        {TAV_TYPE_UINT32, 0},
        {59, 0},
        {0x7FFF, 0},
    };
    const Kind& kind = kinds[below(std::size(kinds))];
    TreeNode node;
    node.wide = wide;
    node.type = kind.type;
    node.elm = element();
    node.info = wide ? flags() : 0;
    const uint64_t size = chance(8) ? 0 : kind.size != 0 ? kind.size
                                                         : below(limits_.payload + 1);
    for (uint64_t i = 0; i < size; ++i)
    {
      node.payload.push_back(static_cast<uint8_t>(random_()));
    }
    return node;
  }

  /// Whether every pair inside leads to the start of a node that can be read: not so for padded elements, nor for wide
  /// groups of type 1, whose distance counts 8 bytes too few.
  static bool leadsBack(const TreeNode& node, const Form& form)
  {
    if (node.pair() && node.group() && node.type == TAV_TYPE_HEADER32)
    {
      return false;
    }
    if (node.pair() && !node.group() && form.align && node.payload.size() % 8 != 0)
    {
      return false;
    }
    return std::all_of(node.children.begin(), node.children.end(),
                       [&form](const TreeNode& child) { return leadsBack(child, form); });
  }

  /// Only the child of a group of unknown size becomes one: a known size limits the search for the pair too early.
  void forget(TreeNode& node)
  {
    node.forgotten = true;
    for (TreeNode& child : node.children)
    {
      if (child.group() && child.pair() && chance(2))
      {
        forget(child);
      }
    }
  }

  std::mt19937_64 random_;
  TreeLimits limits_;
};

inline Tree randomTree(uint64_t seed, const TreeLimits& limits = {})
{
  return TreeMaker(seed, limits).make();
}

/// Writes a node and all below it, and closes what it opens.
inline void writeTree(StreamWriter& writer, const TreeNode& node)
{
  if (node.ending)
  {
    return;
  }
  const uint64_t size = node.group() ? node.declaredSize : node.payload.size();
  Bytes payload = node.payload;
  payload.reserve(1); // a data element of size 0 still needs a pointer
  TAVHeaderData data{};
  data.header = node.wide ? header64(size, node.type, node.elm, node.info)
                          : header32(static_cast<uint32_t>(size), node.type, node.elm);
  data.pDataBuf = payload.data();
  check(tavAddElement(0, writer.handle(), &data), "tavAddElement");
  if (data.header.nodeOffset != node.offset)
  {
    throw std::runtime_error("the node does not stand where the model has it");
  }
  if (!node.group())
  {
    return;
  }
  for (const TreeNode& child : node.children)
  {
    writeTree(writer, child);
  }
  writer.close();
}

/// Overwrites the sizes that are to be unknown.
inline void forgetSizes(Bytes& stream, const TreeNode& node)
{
  if (node.forgotten)
  {
    std::fill_n(stream.begin() + static_cast<ptrdiff_t>(node.offset), 8, uint8_t{0xFF});
  }
  for (const TreeNode& child : node.children)
  {
    forgetSizes(stream, child);
  }
}

/// The tree's bytes as the library writes them.
inline Bytes bytesOfTree(const Tree& tree)
{
  StreamWriter writer(tree.form, tree.root.end + 64);
  writeTree(writer, tree.root);
  Bytes bytes = writer.bytes();
  forgetSizes(bytes, tree.root);
  return bytes;
}

} // namespace test
