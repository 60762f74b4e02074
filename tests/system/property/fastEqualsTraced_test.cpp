/// A call that leaves a trace and one that does not answer the same, and leave the same behind. Two handles over equal
/// bytes take the same calls, one of them traced; headers are handed in as nobody should. TAV_TEST_SEED=<seed>
/// TAV_TEST_CASES=1 runs one case alone.
#include <array>
#include <cstring>
#include <gtest/gtest.h>
#include <vector>

#include "support/damage.h"
#include "support/platform.h"
#include "support/randomScript.h"
#include "support/randomTree.h"
#include "support/traceLog.h"

namespace
{

using namespace test;

constexpr uint64_t kDefaultCases = 600;
constexpr size_t kTraced = 1;

/// Where a handle's addresses count from.
const uint8_t* baseOf(const TAVHandle& handle)
{
  return handle.pCircularBuf != nullptr ? handle.pCircularBuf->pRing : handle.pDirectData;
}

uint64_t placeOf(const TAVHandle& handle, const uint8_t* address)
{
  return address != nullptr ? static_cast<uint64_t>(address - baseOf(handle)) : ~uint64_t{0};
}

/// What a caller can see of a handle after a call.
std::vector<uint64_t> stateOf(const TAVHandle& handle)
{
  std::vector<uint64_t> state{handle.curOffset, placeOf(handle, handle.pDirectData), handle.directDataSize,
                              handle.streamBytes};
  if (const TAVHdrStack* const stack = handle.pHdrStack)
  {
    state.insert(state.end(), {stack->count, stack->count != 0 ? stack->pEntries[stack->count - 1].nodeOffset : 0});
  }
  if (const TAVCircularBuf* const ring = handle.pCircularBuf)
  {
    state.insert(state.end(), {ring->head, ring->tail, ring->headOffset, ring->empty});
    state.insert(state.end(), ring->pPageFlags, ring->pPageFlags + 2 * ring->pageCount);
  }
  return state;
}

/// All but the bytes between the fields.
bool areEqual(const TAVHeader& one, const TAVHeader& other)
{
  return std::memcmp(&one.hdr64, &other.hdr64, sizeof one.hdr64) == 0 && one.hdrType == other.hdrType &&
         one.nodeOffset == other.nodeOffset;
}

/// Takes a call to both handles and compares codes, descriptors and states.
class Twins
{
public:
  Twins(TAVHandle* fast, TAVHandle* traced)
      : handles_{fast, traced} {}

  /// `call(handle, node)`, with a descriptor for each handle that begins as `node` and is what it became at the end.
  template<class Call>
  uint32_t take(const char* what, TAVHeaderData& node, Call call)
  {
    TAVHeaderData nodes[2] = {node, node};
    const uint32_t fast = call(handles_[0], nodes[0]);
    const uint32_t traced = traceOf([&] { return call(handles_[kTraced], nodes[kTraced]); });
    same(fast == traced, what, ": ", nameOf(fast), " fast, ", nameOf(traced), " traced");
    same(areEqual(nodes[0].header, nodes[1].header), what, ": headers differ");
    same(nodes[0].dataBufSize == nodes[1].dataBufSize && nodes[0].dataBufOffset == nodes[1].dataBufOffset, what,
         ": data of ", nodes[0].dataBufSize, " and ", nodes[1].dataBufSize);
    const bool callers = nodes[0].pDataBuf == node.pDataBuf && nodes[1].pDataBuf == node.pDataBuf;
    same(callers || placeOf(*handles_[0], nodes[0].pDataBuf) == placeOf(*handles_[1], nodes[1].pDataBuf), what,
         ": data in other places");
    const std::vector<uint64_t> states[2] = {stateOf(*handles_[0]), stateOf(*handles_[1])};
    same(states[0] == states[1], what, ": after ", nameOf(fast), " the handles are ", testing::PrintToString(states));
    node = nodes[0];
    return fast;
  }

  [[nodiscard]] TAVHandle* fast() const { return handles_[0]; }

private:
  template<class Call>
  static uint32_t traceOf(Call call)
  {
    const TraceLog trace;
    const uint32_t rc = call();
    same(!trace.records().empty(), "a traced call without a record");
    return rc;
  }

  std::array<TAVHandle*, 2> handles_;
};

/// Changes one thing about a header, mostly to what it should never be.
void disturb(TAVHeader& header, Random& random)
{
  const uint64_t edge = random.pick<uint64_t>({0, 1, 2, 8, 15, 16, 17, 24, 64, 0xFFFFFFEF, 0xFFFFFFFF, 0x100000000});
  const uint64_t number = random.oneIn(2) ? edge : ~edge;
  switch (random.below(6))
  {
  case 0: header.hdrType = static_cast<uint16_t>(random.below(4)); break;
  case 1: header.nodeOffset = random.oneIn(2) ? number : header.nodeOffset + number; break;
  case 2: header.hdr64.size = random.oneIn(2) ? number : header.hdr64.size + number; break;
  case 3: header.hdr64.type = random.pick<uint16_t>({0, 1, 2, 3, 101, 0xFFFF}); break;
  case 4:
    header.hdr64.elm = random.pick<uint16_t>(
        {0, TAV_ELM_CMN_END_HDR_MARKER, TAV_ELM_CMN_END_HDR_EYE_SIZE, TAV_ELM_CMN_EYE_SIZE, 0xFFFF});
    break;
  default: header.hdr64.info ^= random.pick<uint32_t>({TAV_INFO_EYE_SIZE, TAV_INFO_ALIGNED8, 1, 0x80000000}); break;
  }
}

/// The form of a stream read through a ring, or in direct memory.
Form pickAccess(Form form, Random& random)
{
  form.buffered = random.oneIn(2);
  form.pageBytes = random.pick<uint64_t>({8, 24, 64, 100, 256, 4096});
  form.ringBytes = form.pageBytes * random.pick<uint64_t>({1, 2, 3, 7, 16});
  return form;
}

/// Wanders through a stream by every step there is.
class Wanderer
{
public:
  Wanderer(Twins& twins, Random& random, uint64_t size)
      : twins_(twins), random_(random), size_(size) {}

  void step()
  {
    TAVHeaderData out{};
    out.header = pick();
    switch (random_.below(16))
    {
    case 0:
    case 1: readNode(out); break;
    case 2:
    case 3: stepBack(out); break;
    case 4:
    case 5: search(out); break;
    case 6: validate(out); break;
    case 7: print(out); break;
    default: nextChild(out); break;
    }
  }

private:
  /// A node seen before, rarely disturbed.
  TAVHeader pick()
  {
    TAVHeader header = nodes_.empty() ? TAVHeader{} : nodes_[random_.below(nodes_.size())];
    if (random_.oneIn(12))
    {
      disturb(header, random_);
    }
    return header;
  }

  void keep(uint32_t rc, const TAVHeaderData& node)
  {
    if (rc == TAV_RC_OK && nodes_.size() < 60)
    {
      nodes_.push_back(node.header);
    }
  }

  void nextChild(TAVHeaderData& out)
  {
    TAVHeader parent = pick();
    TAVHeader before = random_.oneIn(2) ? last_ : pick();
    const bool root = nodes_.empty() || random_.oneIn(30);
    const bool first = random_.oneIn(4);
    const bool sameNode = random_.oneIn(6); // the reference's own descriptor is the answer's
    if (!first && !root && random_.oneIn(2))
    {
      parent = lastParent_;
    }
    if (sameNode)
    {
      out.header = before;
    }
    const uint64_t options = random_.oneIn(40) ? 1 : 0;
    const uint32_t rc = twins_.take("tavGetNextChild", out, [&](TAVHandle* handle, TAVHeaderData& node) {
      TAVHeader* const reference = first ? nullptr : sameNode ? &node.header
                                                              : &before;
      return tavGetNextChild(options, handle, root ? nullptr : &parent, reference, &node);
    });
    keep(rc, out);
    if (rc == TAV_RC_OK)
    {
      last_ = out.header;
      lastParent_ = parent;
    }
  }

  void readNode(TAVHeaderData& out)
  {
    const uint64_t offset = random_.oneIn(2) ? out.header.nodeOffset : random_.below(size_ + 20);
    const bool wide = random_.oneIn(2) ? tav::layout::is64(out.header) : random_.oneIn(2);
    keep(twins_.take(
             "tavReadNodeInt", out,
             [&](TAVHandle* handle, TAVHeaderData& node) { return tavReadNodeInt(0, handle, offset, wide, &node); }),
         out);
  }

  void stepBack(TAVHeaderData& out)
  {
    TAVHeaderData reference{pick(), nullptr, 0, 0};
    keep(twins_.take(
             "tavGetPrevNode", out,
             [&](TAVHandle* handle, TAVHeaderData& node) { return tavGetPrevNode(0, handle, &reference, &node); }),
         out);
  }

  void search(TAVHeaderData& out)
  {
    TAVHeader parent = pick();
    TAVHeader resume = pick();
    const bool fresh = random_.oneIn(2);
    const bool own = random_.oneIn(2);
    const uint32_t elm = tav::layout::elmOf(pick());
    const auto deepest = static_cast<uint32_t>(random_.below(3));
    uint32_t counts[2] = {};
    keep(twins_.take("tavFindElmInt", out,
                     [&](TAVHandle* handle, TAVHeaderData& node) {
                       TAVHdrStack stack;
                       if (own && !fresh)
                       {
                         stack.push(&parent);
                       }
                       const uint32_t rc = tavFindElmInt(handle, &parent, 0, deepest, 0, elm, fresh ? nullptr : &resume,
                                                         own ? &stack : nullptr, &node);
                       counts[handle == twins_.fast() ? 0 : 1] = stack.count;
                       return rc;
                     }),
         out);
    same(counts[0] == counts[1], "stacks after a search hold ", counts[0], " and ", counts[1]);
  }

  void validate(TAVHeaderData& node)
  {
    const bool whole = random_.oneIn(2);
    const uint64_t options = whole ? 0 : random_.below(2);
    twins_.take("validation", node, [&](TAVHandle* handle, TAVHeaderData& one) {
      return whole ? tavValidateHierarchy(options, handle, &one.header)
                   : tavValidateSubtreeInt(options, handle, &one.header);
    });
  }

  void print(TAVHeaderData& node)
  {
    // Without the descriptors: they show addresses.
    const uint64_t options =
        TAV_PRINT_SUBTREE |
        random_.pick<uint64_t>({TAV_PRINT_HEADERS | TAV_PRINT_DATA, TAV_PRINT_DATA, TAV_PRINT_DATA | TAV_PRINT_XML,
                                TAV_PRINT_DATA | TAV_PRINT_XML | TAV_PRINT_ATTRIBUTES});
    const bool whole = random_.oneIn(2);
    std::string texts[2];
    twins_.take("tavPrintSubtree", node, [&](TAVHandle* handle, TAVHeaderData& one) {
      CaughtStream stream;
      TAVPrintParam param{0, nullptr, 0, stream.get()};
      uint64_t printed = 0;
      const uint32_t rc = tavPrintSubtree(options, handle, whole ? nullptr : &one, &param, &printed);
      texts[handle == twins_.fast() ? 0 : 1] = stream.text() + std::to_string(printed);
      return rc;
    });
    same(texts[0] == texts[1], "printed texts differ");
  }

  Twins& twins_;
  Random& random_;
  uint64_t size_;
  std::vector<TAVHeader> nodes_;
  TAVHeader last_{};
  TAVHeader lastParent_{};
};

/// A small tree's bytes, sound or damaged.
Bytes pickStream(const Tree& tree, Random& random, uint64_t seed)
{
  Bytes bytes = bytesOfTree(tree);
  Damage damage(bytes, seed);
  switch (random.below(4))
  {
  case 0: damage.flipBits(); break;
  case 1: damage.setBytes(); break;
  default: break;
  }
  return bytes;
}

void readCase(uint64_t seed)
{
  Random random(seed);
  TreeLimits limits;
  limits.depth = 4;
  limits.width = 6;
  const Tree tree = randomTree(seed, limits);
  const Form form = pickAccess(tree.form, random);
  const Bytes bytes = pickStream(tree, random, seed);
  StreamReader fast(bytes, form);
  StreamReader traced(bytes, form);
  Twins twins(fast.handle(), traced.handle());
  Wanderer wanderer(twins, random, bytes.size());
  for (int i = 0; i < 60; ++i)
  {
    wanderer.step();
  }
}

/// A node as a writer may be given it, mostly a sound one.
Element pickNode(Random& random, bool wide, Bytes payload)
{
  const uint16_t elm = static_cast<uint16_t>(1 + random.below(5000));
  const uint32_t info = random.oneIn(3) ? TAV_INFO_EYE_SIZE : 0;
  if (random.oneIn(8))
  {
    return wide ? group64(elm, random.oneIn(3) ? TAV_TYPE_HEADER32 : TAV_TYPE_HEADER64, info, TAV_SIZE_UNKNOWN)
                : Element{header32(0, random.oneIn(4) ? TAV_TYPE_HEADER64 : TAV_TYPE_HEADER32, elm), {}};
  }
  return element(wide,
                 random.pick<uint16_t>({TAV_TYPE_BINARY, TAV_TYPE_UINT32, TAV_TYPE_UINT64, TAV_TYPE_ASCII_STRING}), elm,
                 std::move(payload), info);
}

void addNode(Twins& twins, Random& random, bool usual)
{
  const TAVHdrStack& stack = *twins.fast()->pHdrStack;
  const bool wide = stack.count == 0 || tav::layout::typeOf(stack.pEntries[stack.count - 1]) == TAV_TYPE_HEADER64;
  constexpr uint64_t longest = 300;
  Bytes payload(random.oneIn(4) ? random.below(longest) : random.pick<uint64_t>({1, 4, 8, 16, 24, 33}));
  for (uint8_t& byte : payload) byte = static_cast<uint8_t>(random.next());
  payload.reserve(1);
  Element node = pickNode(random, usual || random.oneIn(10) ? wide : !wide, std::move(payload));
  TAVHeaderData data = node.data();
  if (!usual)
  {
    const uint64_t there = node.payload.size();
    disturb(data.header, random);
    data.dataBufSize = tav::layout::sizeOf(data.header) <= there && random.oneIn(2) ? 0 : there;
    if (random.oneIn(6))
    {
      data.pDataBuf = nullptr;
    }
    // Without a length the header's size is believed.
    if (data.dataBufSize == 0 && tav::layout::sizeOf(data.header) > there)
    {
      return;
    }
  }
  const uint64_t options = random.oneIn(50) ? 1 : 0;
  twins.take("tavAddElement", data,
             [&](TAVHandle* handle, TAVHeaderData& one) { return tavAddElement(options, handle, &one); });
}

void writeCase(uint64_t seed)
{
  Random random(seed);
  Form form = pickAccess({}, random);
  form.swap = random.oneIn(4);
  form.align = random.oneIn(4);
  form.root32 = random.oneIn(8);
  const uint64_t block = random.oneIn(2) ? 0x4000 : random.below(2000);
  StreamWriter fast(form, block);
  StreamWriter traced(form, block);
  Twins twins(fast.handle(), traced.handle());
  for (int i = 0; i < 60; ++i)
  {
    if (random.oneIn(12))
    {
      TAVHeaderData none{};
      const uint64_t abandon = random.oneIn(3) ? 1 : 0;
      twins.take("tavCloseHeader", none,
                 [&](TAVHandle* handle, TAVHeaderData&) { return tavCloseHeader(abandon, handle); });
      continue;
    }
    addNode(twins, random, !random.oneIn(6));
  }
  const Bytes bytes = fast.bytes();
  const Bytes others = traced.bytes();
  const auto difference = std::mismatch(bytes.begin(), bytes.end(), others.begin(), others.end());
  same(bytes == others, form, ": the streams differ at ", difference.first - bytes.begin(), " of ", bytes.size());
}

void forEachCase(void (*run)(uint64_t seed))
{
  const Cases cases = casesOf(kDefaultCases);
  for (uint64_t seed = cases.first; seed < cases.first + cases.count; ++seed)
  {
    SCOPED_TRACE("seed " + std::to_string(seed));
    ASSERT_NO_THROW(run(seed));
  }
}

TEST(FastEqualsTraced, ForEveryStepThroughAStream)
{
  forEachCase(readCase);
}

TEST(FastEqualsTraced, ForEveryNodeThatIsAdded)
{
  forEachCase(writeCase);
}

} // namespace
