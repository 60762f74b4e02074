/// A stream that goes through a ring is the stream that direct memory would hold, and reads the same. Random scripts
/// over every kind of ring; a failure names the seed, and TAV_TEST_SEED=<seed> TAV_TEST_CASES=1 runs it alone.
#include <array>
#include <gtest/gtest.h>
#include <set>
#include <tuple>
#include <utility>

#include "support/environment.h"
#include "support/randomScript.h"
#include "support/twinReader.h"

namespace
{

using namespace test;

constexpr uint64_t kCases = 52'000; ///< over the four forms together
constexpr uint64_t kForms = 4;

/// Large pages cost time by their size alone and have less to say about node boundaries, so they come up less often.
ScriptCase caseOf(uint64_t seed, bool swap, bool align)
{
  Random random(seed ^ 0x5EED);
  ScriptCase one;
  one.seed = seed;
  const uint64_t turn = random.below(100);
  one.pageUnit = turn < 2 ? 0x100000 : turn < 7 ? 0x10000
                                   : turn < 16  ? 4096
                                                : random.pick<uint64_t>({8, 12, 24, 64});
  one.ringPages = random.oneIn(12) ? 0 : random.pick<uint64_t>({1, 2, 3, 10});
  one.swap = swap;
  one.align = align;
  return one;
}

void runCase(const ScriptCase& one)
{
  Random random(one.seed);
  TwinWriter writer(one, random);
  writer.run();
  TwinReader reader(one, random, writer.stream(), writer.root32());
  reader.run(writer.nodes());
}

class RingEqualsDirect : public testing::TestWithParam<std::tuple<bool, bool>>
{};

TEST_P(RingEqualsDirect, ForRandomStreams)
{
  const auto [swap, align] = GetParam();
  const uint64_t seed = fromEnvironment("TAV_TEST_SEED", 1);
  const uint64_t total = fromEnvironment("TAV_TEST_CASES", kCases);
  const uint64_t count = (total + kForms - 1) / kForms;
  std::set<std::pair<uint64_t, uint64_t>> rings;
  int failed = 0;
  for (uint64_t i = 0; i < count && failed < 3; ++i)
  {
    const ScriptCase one = caseOf(seed + i, swap, align);
    rings.emplace(one.pageUnit, one.ringPages);
    try
    {
      runCase(one);
    }
    catch (const std::exception& difference)
    {
      ++failed;
      ADD_FAILURE() << one << ": " << difference.what();
    }
  }
  if (count >= kCases / kForms && failed == 0)
  {
    EXPECT_EQ(rings.size(), 7U * 5U) << "every page unit with every ring";
  }
}

INSTANTIATE_TEST_SUITE_P(Forms, RingEqualsDirect, testing::Combine(testing::Bool(), testing::Bool()),
                         [](const auto& form) {
                           return std::string(std::get<0>(form.param) ? "Swapped" : "Native") +
                                  (std::get<1>(form.param) ? "Aligned" : "Packed");
                         });

} // namespace
