/// Streams for the tests of the inspection library, and what they write down of them.
#pragma once

#include <cstdint>
#include <span>
#include <string>
#include <vector>

#include "support/damage.h"
#include "support/randomTree.h"
#include "tav/inspect.hpp"
#include "tav/tav.hpp"

namespace test
{

using Bytes = std::vector<uint8_t>;

/// How a stream of this form is read.
inline tav::inspect::Form readForm(const Form& form)
{
  return {.swapped = form.swap, .root64 = !form.root32, .aligned = form.align};
}

/// How many findings a check has of a stream, without notes.
inline uint64_t defects(const Bytes& bytes, const tav::inspect::Form& form)
{
  tav::inspect::ByteSource source("x", std::span<const uint8_t>(bytes));
  uint64_t count = 0;
  tav::inspect::Checker checker(
      source, form, [](tav::inspect::RuleId) { return true; },
      [&](const tav::inspect::Finding& finding) { count += ruleOf(finding.rule).note ? 0 : 1; });
  while (checker.step())
  {
  }
  return count;
}

/// A sink that keeps what it is given.
class Kept final : public tav::inspect::Sink
{
public:
  void write(std::string_view bytes) override { text += bytes; }

  std::string text;
};

/// What a file of scratch bytes has in the end.
class Made
{
public:
  tav::inspect::PatchFile& file() { return file_; }

  Bytes bytes()
  {
    Bytes all(static_cast<size_t>(file_.length()));
    all.resize(file_.read(0, all));
    return all;
  }

private:
  std::unique_ptr<tav::inspect::Scratch> scratch_ = tav::inspect::makeScratch();
  tav::inspect::PatchFile file_{scratch_->file()};
};

/// The stream that a document is.
inline Bytes bytesOfJson(const std::string& text)
{
  tav::inspect::MemoryText document("document", text);
  Made made;
  tav::inspect::fromJson(document, made.file(), {});
  return made.bytes();
}

/// Damages a stream in one of several ways that the seed chooses.
inline Bytes damaged(Bytes bytes, uint64_t seed)
{
  Damage damage(bytes, seed);
  switch (seed % 4)
  {
  case 0: damage.flipBits(); break;
  case 1: damage.setBytes(); break;
  // Not by resize(), in which g++ for aarch64 sees how it could grow.
  case 2:
    bytes.erase(bytes.end() - static_cast<ptrdiff_t>(std::min<size_t>(bytes.size() - 1, seed % 97)), bytes.end());
    break;
  default: bytes.insert(bytes.begin() + static_cast<ptrdiff_t>(seed % bytes.size()), 1 + seed % 40, uint8_t{0x5A});
  }
  return bytes;
}

/// Adds random children of the kinds that producers write: named elements, sizes that suit their types.
inline void addNamed(tav::Group& group, std::mt19937_64& random, uint32_t depth)
{
  const bool pairs = random() % 2 == 0;
  for (uint64_t i = 1 + random() % 5; i != 0; --i)
  {
    switch (random() % (depth == 0 ? 3 : 5))
    {
    case 0: group.add(TAV_ELM_CMN_CPU_ONLINE, static_cast<uint32_t>(random()), {.eyeSize = pairs}); break;
    case 1: group.add(TAV_ELM_CMN_HOST_NAME, std::string(1 + random() % 20, 'a'), {.eyeSize = pairs}); break;
    case 2: group.add(TAV_ELM_CMN_MEM_TOTAL, uint64_t{random()}, {.eyeSize = pairs}); break;
    default:
      tav::Group child = group.group(TAV_ELM_CMN_HOST, {.eyeSize = pairs});
      addNamed(child, random, depth - 1);
    }
  }
}

/// A sound stream as a producer writes it.
inline Bytes namedStream(uint64_t seed, bool swap = false, bool align = false)
{
  std::mt19937_64 random(seed);
  tav::Writer writer({.byteOrder = swap ? tav::ByteOrder::swapped : tav::ByteOrder::native, .align8 = align});
  {
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM, {.eyeSize = true});
    addNamed(root, random, 4);
  }
  writer.finish();
  const auto bytes = writer.bytes();
  const auto* const first = reinterpret_cast<const uint8_t*>(bytes.data());
  return {first, first + bytes.size()};
}

/// A stream with a group in it that has the id of an element that ends a group.
inline Bytes streamWithGroupNamedAsAnEnd(uint32_t number)
{
  tav::Writer writer;
  {
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
    {
      tav::Group named = root.group(TAV_ELM_CMN_END_HDR_EYE_SIZE);
      named.add(TAV_ELM_CMN_CPU_ONLINE, number);
    }
    root.add(TAV_ELM_CMN_CPU_ONLINE, uint32_t{2});
  }
  writer.finish();
  const auto bytes = writer.bytes();
  const auto* const first = reinterpret_cast<const uint8_t*>(bytes.data());
  return {first, first + bytes.size()};
}

/// All nodes of a tree in stream order.
inline void listNodes(const TreeNode& node, std::vector<const TreeNode*>& list)
{
  list.push_back(&node);
  for (const TreeNode& child : node.children)
  {
    listNodes(child, list);
  }
}

} // namespace test
