/// Damaged and hostile streams: whatever the bytes say, every reading operation ends in a code, stays inside the block
/// or the ring, and a walk visits no more nodes than the stream has room for.
#include <algorithm>
#include <array>
#include <cstdint>
#include <functional>
#include <random>
#include <string>
#include <utility>
#include <vector>

#include <gtest/gtest.h>

#include "support/byteRows.h"
#include "support/damage.h"
#include "support/prober.h"
#include "support/randomTree.h"
#include "support/streams.h"
#include "tav/probes.h"
#include "tav/tav.h"

namespace
{

using namespace test;

constexpr uint64_t kDefaultCases = 2500;

/// Memory, a ring of one small page, rings of more.
std::vector<Form> accessesOf(const Form& form)
{
  std::vector<Form> forms{form};
  forms.front().buffered = false;
  for (const auto& [page, ring] : {std::pair<uint64_t, uint64_t>{8, 8}, {16, 48}, {64, 640}})
  {
    Form buffered = form;
    buffered.buffered = true;
    buffered.pageBytes = page;
    buffered.ringBytes = ring;
    forms.push_back(buffered);
  }
  return forms;
}

void probe(const Bytes& bytes, const Form& form, uint64_t seed)
{
  for (const Form& access : accessesOf(form))
  {
    SCOPED_TRACE(formName(access) + ", ring of " + std::to_string(access.ringBytes));
    Prober(bytes, access, seed).everything();
  }
}

void forEachSeed(uint64_t count, const std::function<void(uint64_t)>& check)
{
  const Cases cases = casesOf(count);
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

Tree smallTree(uint64_t seed)
{
  TreeLimits limits;
  limits.depth = 4;
  limits.width = 4;
  limits.payload = 24;
  return randomTree(seed, limits);
}

void collectOffsets(const TreeNode& node, std::vector<uint64_t>& offsets)
{
  offsets.push_back(node.offset);
  if (node.pair())
  {
    offsets.push_back(node.end - 8); // the distance
  }
  for (const TreeNode& child : node.children)
  {
    collectOffsets(child, offsets);
  }
}

TEST(HostileStream, TruncatedAtEveryLength)
{
  forEachSeed(12, [](uint64_t seed) {
    const Tree tree = smallTree(seed);
    const Bytes bytes = bytesOfTree(tree);
    const uint64_t longest = std::min<uint64_t>(bytes.size(), 400);
    for (uint64_t length = 0; length <= longest && !::testing::Test::HasFailure(); ++length)
    {
      SCOPED_TRACE("cut to " + std::to_string(length));
      probe({bytes.begin(), bytes.begin() + static_cast<ptrdiff_t>(length)}, tree.form, seed);
    }
  });
}

TEST(HostileStream, DamagedInAnyWay)
{
  forEachSeed(kDefaultCases, [](uint64_t seed) {
    const Tree tree = smallTree(seed);
    Bytes bytes = bytesOfTree(tree);
    std::vector<uint64_t> offsets;
    collectOffsets(tree.root, offsets);
    Damage damage(bytes, seed);
    switch (seed % 6)
    {
    case 0: damage.flipBits(); break;
    case 1: damage.setBytes(); break;
    case 2: damage.setSizes(offsets); break;
    case 3: damage.setHeaders(offsets); break;
    case 4: damage.plantPairs(offsets); break;
    default:
      damage.setHeaders(offsets);
      damage.plantPairs(offsets);
      damage.setSizes(offsets);
      break;
    }
    probe(bytes, tree.form, seed);
  });
}

/// Counts the steps of a walk that an operation makes inside.
class StepCounter
{
public:
  StepCounter() { korTraceStart(&StepCounter::sink, this); }
  ~StepCounter() { korTraceStop(); }
  StepCounter(const StepCounter&) = delete;
  StepCounter& operator=(const StepCounter&) = delete;

  uint64_t steps = 0;

private:
  static void sink(void* context, const KORTraceRecord* record)
  {
    const bool step = record->probe == tav::probe::getNextChild && record->kind == KOR_TRACE_ENTRY;
    static_cast<StepCounter*>(context)->steps += step ? 1 : 0;
  }
};

/// Each open group holds an element whose payload is the pair that ends the group, so that what follows it is both its
/// second child and its sibling. 12 groups have 592 bytes.
Bytes overlappingOpenGroups(int count = 12)
{
  ByteRows rows;
  for (int i = 0; i < count; ++i)
  {
    rows.h64(TAV_SIZE_UNKNOWN, TAV_INFO_EYE_SIZE, TAV_TYPE_HEADER64, 9).h64(16, 0, TAV_TYPE_BINARY, 7).pair(32);
  }
  rows.h64(0, 0, TAV_TYPE_BINARY, TAV_ELM_CMN_END_HDR_MARKER);
  return rows.bytes;
}

TEST(HostileStream, OfOpenGroupsThatOverlapIsNotValidatedOverAndOver)
{
  const Bytes bytes = overlappingOpenGroups();
  StreamReader reader(bytes);
  TAVHeader root = header64(TAV_SIZE_UNKNOWN, TAV_TYPE_HEADER64, 9, TAV_INFO_EYE_SIZE);
  const StepCounter counter;
  tavValidateSubtreeInt(0, reader.handle(), &root);
  EXPECT_LE(counter.steps, mostSteps(bytes.size())) << "twice as many for every further group";
}

TEST(HostileStream, OfOpenGroupsThatOverlapFarBehindIsNotValidatedOverAndOver)
{
  constexpr uint64_t before = 0x10000;
  const Bytes groups = overlappingOpenGroups(20);
  Bytes bytes(before);
  bytes.insert(bytes.end(), groups.begin(), groups.end());
  StreamReader reader(bytes);
  TAVHeader root = header64(TAV_SIZE_UNKNOWN, TAV_TYPE_HEADER64, 9, TAV_INFO_EYE_SIZE, before);
  const StepCounter counter;
  tavValidateSubtreeInt(0, reader.handle(), &root);
  EXPECT_LE(counter.steps, mostSteps(groups.size())) << "what stands before gives it no more";
}

TEST(HostileStream, OfOpenGroupsThatOverlapIsNotSearchedOverAndOver)
{
  const Bytes bytes = overlappingOpenGroups(24);
  StreamReader reader(bytes);
  TAVHeader root = header64(TAV_SIZE_UNKNOWN, TAV_TYPE_HEADER64, 9, TAV_INFO_EYE_SIZE);
  std::vector<TAVPathEntry> path(12, {0, 9});
  path.push_back({0, 8}); // which no group has
  TAVFindLogicalGroupParam param{0, path.data(), static_cast<uint32_t>(path.size()), nullptr, 0};
  TAVHeaderData found{};
  const StepCounter counter;
  EXPECT_EQ(tavFindLogicalGroup(0, reader.handle(), &root, &param, &found), TAV_RC_OUTSIDE_PARENT);
  EXPECT_LE(counter.steps, bytes.size() / 8 * bytes.size() / 8) << "four times as many for every two groups";
}

TEST(HostileStream, OfOpenGroupsThatOverlapIsNotPrintedOverAndOver)
{
  const Bytes bytes = overlappingOpenGroups();
  StreamReader reader(bytes);
  std::array<char, 80> piece{};
  TAVPrintParam param{0, piece.data(), piece.size(), nullptr};
  uint64_t printed = 0;
  const StepCounter counter;
  tavPrintSubtree(TAV_PRINT_SUBTREE, reader.handle(), nullptr, &param, &printed);
  EXPECT_LE(counter.steps, mostSteps(bytes.size())) << "twice as many for every further group";
}

TEST(HostileStream, OfRandomBytes)
{
  forEachSeed(600, [](uint64_t seed) {
    std::mt19937_64 random(seed);
    Bytes bytes(1 + random() % 300);
    for (uint8_t& byte : bytes)
    {
      byte = random() % 3 == 0 ? static_cast<uint8_t>(random()) : static_cast<uint8_t>(random() % 3);
    }
    Form form;
    form.swap = random() % 2 == 0;
    form.align = random() % 2 == 0;
    form.root32 = random() % 2 == 0;
    probe(bytes, form, seed);
  });
}

} // namespace
