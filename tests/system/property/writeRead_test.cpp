/// What the writer put in comes back: through the walk forward and backward, over memory and through rings.
#include <algorithm>
#include <cstdint>
#include <string>
#include <utility>
#include <vector>

#include <gtest/gtest.h>

#include "support/byteRows.h"
#include "support/randomTree.h"
#include "support/streams.h"
#include "tav/tav.h"

namespace
{

using namespace test;

constexpr uint64_t kDefaultCases = 1500;

/// Runs a check for every seed and stops at the first that fails, which the message names.
template<class Check>
void forEachSeed(Check check)
{
  const Cases cases = casesOf(kDefaultCases);
  for (uint64_t seed = cases.first; seed < cases.first + cases.count; ++seed)
  {
    SCOPED_TRACE("TAV_TEST_SEED=" + std::to_string(seed) + " TAV_TEST_CASES=1");
    check(seed);
    if (::testing::Test::HasFailure())
    {
      return;
    }
  }
}

/// Memory with room behind the stream, memory that ends with it, and rings of several pages. Each ring holds the
/// largest element.
std::vector<Form> accessesOf(const Tree& tree)
{
  Form form = tree.form;
  std::vector<Form> forms{form};
  form.buffered = true;
  for (const uint64_t pageBytes : {8U, 24U, 64U, 4096U})
  {
    form.pageBytes = pageBytes;
    form.ringBytes = std::max<uint64_t>(pageBytes, 96);
    forms.push_back(form);
  }
  return forms;
}

void expectNode(const TAVHeaderData& node, const TreeNode& model, const Form& form)
{
  ASSERT_EQ(node.header.nodeOffset, model.offset);
  ASSERT_EQ(node.header.hdrType, model.wide ? TAV_HDR_64 : TAV_HDR_32);
  if (model.wide)
  {
    ASSERT_EQ(node.header.hdr64.size, model.size);
    ASSERT_EQ(node.header.hdr64.info, streamInfo(model, form));
    ASSERT_EQ(node.header.hdr64.type, model.type);
    ASSERT_EQ(node.header.hdr64.elm, model.elm);
  }
  else
  {
    ASSERT_EQ(node.header.hdr32.size, model.size);
    ASSERT_EQ(node.header.hdr32.type, model.type);
    ASSERT_EQ(node.header.hdr32.elm, model.elm);
  }
  if (model.group())
  {
    ASSERT_EQ(node.pDataBuf, nullptr);
    ASSERT_EQ(node.dataBufSize, 0U);
    return;
  }
  ASSERT_NE(node.pDataBuf, nullptr);
  ASSERT_GE(node.dataBufSize, model.size);
  ASSERT_EQ(payloadOf(node, model.size), streamPayload(model, form));
}

/// Steps through the children of a node and of all below it, in order, to the end of each level.
void expectChildren(TAVHandle* handle, TAVHeader* parent, const TreeNode& model, const Form& form)
{
  TAVHeaderData child{};
  TAVHeader* previous = nullptr;
  TAVHeader reference{};
  uint64_t span = 0;
  for (const TreeNode& expected : model.children)
  {
    ASSERT_EQ(tavGetNextChild(0, handle, parent, previous, &child), TAV_RC_OK) << "child at " << expected.offset;
    ASSERT_NO_FATAL_FAILURE(expectNode(child, expected, form));
    reference = child.header;
    previous = &reference;
    span += expected.end - expected.offset;
    if (expected.group())
    {
      ASSERT_NO_FATAL_FAILURE(expectChildren(handle, &reference, expected, form));
    }
  }
  ASSERT_EQ(tavGetNextChild(0, handle, parent, previous, &child), TAV_RC_NO_MORE_CHILDREN);
  if (!model.forgotten)
  {
    ASSERT_EQ(span, model.size) << "a group's size is the span of its children";
  }
}

void expectTree(TAVHandle* handle, const Tree& tree)
{
  TAVHeaderData root{};
  ASSERT_EQ(tavGetNextChild(0, handle, nullptr, nullptr, &root), TAV_RC_OK);
  ASSERT_NO_FATAL_FAILURE(expectNode(root, tree.root, tree.form));
  expectChildren(handle, &root.header, tree.root, tree.form);
}

TEST(WriteRead, EveryNodeComesBackInOrderWithItsHeaderOffsetAndPayload)
{
  forEachSeed([](uint64_t seed) {
    const Tree tree = randomTree(seed);
    const Bytes bytes = bytesOfTree(tree);
    ASSERT_EQ(bytes.size(), tree.root.end);
    for (const Form& form : accessesOf(tree))
    {
      SCOPED_TRACE(formName(form) + " pages of " + std::to_string(form.pageBytes));
      StreamReader reader(bytes, form);
      ASSERT_NO_FATAL_FAILURE(expectTree(reader.handle(), tree));
    }
  });
}

TEST(WriteRead, WhatARingWroteIsWhatMemoryHolds)
{
  forEachSeed([](uint64_t seed) {
    const Tree tree = randomTree(seed);
    const Bytes expected = bytesOfTree(tree);
    for (const Form& form : accessesOf(tree))
    {
      SCOPED_TRACE(formName(form) + " pages of " + std::to_string(form.pageBytes));
      StreamWriter writer(form, tree.root.end + 64);
      writeTree(writer, tree.root);
      Bytes bytes = writer.bytes();
      forgetSizes(bytes, tree.root);
      ASSERT_LE(expected.size() - bytes.size(), 7U) << "padding at the end need not be written";
      bytes.resize(expected.size());
      ASSERT_EQ(bytes, expected);
    }
  });
}

/// The node whose pair is the last thing in `node`, if there is one: the node itself, or one deep inside a group that
/// has no pair of its own.
const TreeNode* ownerOfLastPair(const TreeNode& node)
{
  if (!node.group())
  {
    return node.pair() ? &node : nullptr;
  }
  if (node.pair())
  {
    return &node;
  }
  return node.children.empty() ? nullptr : ownerOfLastPair(node.children.back());
}

/// Whether a pair's distance is the whole way back.
bool isTrue(const TreeNode& owner, const Form& form)
{
  return owner.group() ? owner.type == TAV_TYPE_HEADER64 : !form.align || owner.payload.size() % 8 == 0;
}

void expectStepsBack(TAVHandle* handle, const TreeNode& model, const Form& form, uint64_t& steps)
{
  for (size_t i = 0; i < model.children.size(); ++i)
  {
    const TreeNode& child = model.children[i];
    TAVHeaderData reference{};
    reference.header = child.wide ? header64(0, child.type, child.elm, 0, child.offset)
                                  : header32(0, child.type, child.elm, child.offset);
    const TreeNode* const owner = i != 0 ? ownerOfLastPair(model.children[i - 1]) : nullptr;
    TAVHeaderData out{};
    if (owner == nullptr)
    {
      const uint32_t rc = tavGetPrevNode(0, handle, &reference, &out);
      ASSERT_EQ(rc, child.offset < 16 ? TAV_RC_NO_MEMORY : TAV_RC_NOT_FOUND) << "before " << child.offset;
    }
    else if (isTrue(*owner, form) && owner->wide == child.wide)
    {
      ASSERT_EQ(tavGetPrevNode(0, handle, &reference, &out), TAV_RC_OK) << "before " << child.offset;
      ASSERT_NO_FATAL_FAILURE(expectNode(out, *owner, form));
      ++steps;
    }
    if (child.group())
    {
      ASSERT_NO_FATAL_FAILURE(expectStepsBack(handle, child, form, steps));
    }
  }
}

TEST(WriteRead, SteppingBackFromAnyNodeGivesTheNodeWhosePairEndsThere)
{
  uint64_t steps = 0;
  forEachSeed([&steps](uint64_t seed) {
    const Tree tree = randomTree(seed);
    const Bytes bytes = bytesOfTree(tree);
    for (const Form& form : accessesOf(tree))
    {
      SCOPED_TRACE(formName(form) + " pages of " + std::to_string(form.pageBytes));
      StreamReader reader(bytes, form);
      ASSERT_NO_FATAL_FAILURE(expectStepsBack(reader.handle(), tree.root, tree.form, steps));
    }
  });
  EXPECT_GE(steps, casesOf(kDefaultCases).count) << "too few pairs to tell anything";
}

/// Gives every node a pair that leads back: wide groups of type 2 throughout, payloads of whole words. Neither
/// payloads nor ids may hold the first byte of an eye catcher: right before one it would hide it.
void pairEverything(TreeNode& node)
{
  node.info |= TAV_INFO_EYE_SIZE;
  node.elm &= 0x3F3F;
  if (node.group())
  {
    node.type = TAV_TYPE_HEADER64;
  }
  else
  {
    node.payload.resize((node.payload.size() + 7) / 8 * 8);
    std::replace_if(
        node.payload.begin(), node.payload.end(), [](uint8_t byte) { return byte == 0xED || byte == 0xC0; },
        uint8_t{0});
  }
  node.wide = true;
  std::erase_if(node.children, [](const TreeNode& child) { return child.ending; });
  for (TreeNode& child : node.children)
  {
    pairEverything(child);
  }
}

void expectSameWayBack(TAVHandle* handle, TAVHeader* parent)
{
  std::vector<TAVHeaderData> forward;
  TAVHeaderData child{};
  TAVHeader* previous = nullptr;
  while (tavGetNextChild(0, handle, parent, previous, &child) == TAV_RC_OK)
  {
    forward.push_back(child);
    previous = &child.header;
  }
  ASSERT_FALSE(forward.empty()) << "there is an end element at least";
  TAVHeaderData back = forward.back();
  for (size_t left = forward.size() - 1; left != 0; --left)
  {
    ASSERT_EQ(tavGetPrevNode(0, handle, &back, &back), TAV_RC_OK);
    ASSERT_TRUE(sameBytes(back.header, forward[left - 1].header));
  }
  ASSERT_NE(tavGetPrevNode(0, handle, &back, &back), TAV_RC_OK) << "nothing stands before the first child";
  for (TAVHeaderData& node : forward)
  {
    if (node.header.hdr64.type == TAV_TYPE_HEADER64)
    {
      ASSERT_NO_FATAL_FAILURE(expectSameWayBack(handle, &node.header));
    }
  }
}

TEST(WriteRead, WalkingBackVisitsTheSameChildrenInReverse)
{
  forEachSeed([](uint64_t seed) {
    TreeLimits limits;
    limits.forget = false;
    Tree tree = randomTree(seed, limits);
    tree.form.root32 = false;
    pairEverything(tree.root);
    layOut(tree.root, 0, tree.form);
    const Bytes bytes = bytesOfTree(tree);
    for (const Form& form : accessesOf(tree))
    {
      SCOPED_TRACE(formName(form) + " pages of " + std::to_string(form.pageBytes));
      StreamReader reader(bytes, form);
      TAVHeaderData root{};
      ASSERT_EQ(tavGetNextChild(0, reader.handle(), nullptr, nullptr, &root), TAV_RC_OK);
      ASSERT_NO_FATAL_FAILURE(expectSameWayBack(reader.handle(), &root.header));
    }
  });
}

/// All nodes that carry a pair, each with its eye catcher's offset, in stream order.
void collectPairs(const TreeNode& node, std::vector<std::pair<uint64_t, const TreeNode*>>& pairs)
{
  for (const TreeNode& child : node.children)
  {
    collectPairs(child, pairs);
  }
  if (node.pair())
  {
    pairs.emplace_back(node.end - 16, &node);
  }
}

TEST(WriteRead, AnyIndexLeadsToTheNodeThatEndsAtTheNextEyeCatcher)
{
  forEachSeed([](uint64_t seed) {
    Tree tree = randomTree(seed);
    tree.form.root32 = false;
    pairEverything(tree.root);
    layOut(tree.root, 0, tree.form);
    const Bytes bytes = bytesOfTree(tree);
    std::vector<std::pair<uint64_t, const TreeNode*>> pairs;
    collectPairs(tree.root, pairs);
    const uint64_t stride = 1 + bytes.size() / 50;
    for (const Form& form : accessesOf(tree))
    {
      SCOPED_TRACE(formName(form) + " pages of " + std::to_string(form.pageBytes));
      StreamReader reader(bytes, form, 1);
      auto next = pairs.begin();
      for (uint64_t index = 0; index < bytes.size(); index += stride)
      {
        while (next != pairs.end() && next->first < index)
        {
          ++next;
        }
        TAVHeaderData out{};
        const uint32_t rc = tavFindNodeFromIndex(0, reader.handle(), index, 0, &out);
        ASSERT_EQ(rc, next != pairs.end() ? TAV_RC_OK : TAV_RC_NOT_FOUND) << "index " << index;
        if (rc == TAV_RC_OK)
        {
          ASSERT_NO_FATAL_FAILURE(expectNode(out, *next->second, tree.form)) << "index " << index;
        }
      }
    }
  });
}

TEST(RandomTrees, HaveEverythingThatTheFormatHas)
{
  uint64_t forgotten = 0, mixed = 0, narrow = 0, empty = 0, deep = 0, paddedPairs = 0;
  const auto count = [&](const auto& self, const TreeNode& node, const Form& form, uint32_t depth) -> void {
    forgotten += node.forgotten ? 1 : 0;
    mixed += node.group() && node.wide && node.type == TAV_TYPE_HEADER32 && !node.children.empty() ? 1 : 0;
    narrow += node.wide ? 0 : 1;
    empty += !node.group() && node.payload.empty() ? 1 : 0;
    deep += depth >= 4 ? 1 : 0;
    paddedPairs += !node.group() && node.pair() && form.align && node.payload.size() % 8 != 0 ? 1 : 0;
    for (const TreeNode& child : node.children)
    {
      self(self, child, form, depth + 1);
    }
  };
  for (uint64_t seed = 1; seed <= 300; ++seed)
  {
    const Tree tree = randomTree(seed);
    count(count, tree.root, tree.form, 0);
  }
  EXPECT_GT(forgotten, 20U);
  EXPECT_GT(mixed, 20U);
  EXPECT_GT(narrow, 200U);
  EXPECT_GT(empty, 50U);
  EXPECT_GT(deep, 20U);
  EXPECT_GT(paddedPairs, 20U);
}

} // namespace
