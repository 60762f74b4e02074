/// Walks over open groups, whose scans leave out what others have looked at, answer what scans of all bytes answer.
/// TAV_TEST_SEED=<seed> TAV_TEST_CASES=1 runs one case alone.
#include <array>
#include <cstdint>
#include <gtest/gtest.h>
#include <ostream>
#include <string>
#include <vector>

#include "support/damage.h"
#include "support/environment.h"
#include "support/openGroupSoup.h"
#include "support/plainSteps.h"
#include "support/streams.h"

namespace
{

using namespace test;

constexpr uint64_t kCases = 1500;
constexpr uint64_t kMostSteps = 3000;

struct Access
{
  const char* name;
  uint64_t pageBytes; ///< 0: memory
  uint64_t ringPages;
  bool swap;
  bool seeks = true;

  friend std::ostream& operator<<(std::ostream& out, const Access& access) { return out << access.name; }
};

class OpenGroups : public testing::TestWithParam<Access>
{
protected:
  [[nodiscard]] Form form() const
  {
    Form form;
    form.buffered = GetParam().pageBytes != 0;
    form.swap = GetParam().swap;
    form.pageBytes = GetParam().pageBytes;
    form.ringBytes = GetParam().pageBytes * GetParam().ringPages;
    return form;
  }

  void prepare(StreamReader& reader) const
  {
    if (!GetParam().seeks)
    {
      reader.vectorStorage().attributes &= ~TAV_ATTR_SEEK;
    }
  }

  static Bytes streamOf(uint64_t seed, bool swap)
  {
    std::mt19937_64 random(seed);
    Bytes bytes = OpenGroupSoup(seed, swap, 4 + random() % 60, seed % 4 == 0).bytes();
    if (seed % 5 == 0)
    {
      Damage damage(bytes, seed);
      const Bytes root(bytes.begin(), bytes.begin() + 16);
      damage.flipBits();
      std::copy(root.begin(), root.end(), bytes.begin());
    }
    return bytes;
  }

  template<class Check>
  void forEachStream(Check check)
  {
    const uint64_t first = fromEnvironment("TAV_TEST_SEED", 1);
    const uint64_t count = fromEnvironment("TAV_TEST_CASES", kCases);
    for (uint64_t seed = first; seed < first + count && !HasFailure(); ++seed)
    {
      SCOPED_TRACE("TAV_TEST_SEED=" + std::to_string(seed) + " TAV_TEST_CASES=1");
      const Bytes bytes = streamOf(seed, GetParam().swap);
      StreamReader plain(bytes, form());
      StreamReader reader(bytes, form());
      prepare(plain);
      prepare(reader);
      check(plain.handle(), reader.handle());
    }
  }

  static TAVHeader rootOf(TAVHandle* handle)
  {
    TAVHeaderData root{};
    check(tavReadNodeInt(0, handle, 0, true, &root), "root");
    return root.header;
  }
};

/// Whether all cases together came to what they are about; a few alone need not.
bool isEnough(uint64_t count, uint64_t least)
{
  return fromEnvironment("TAV_TEST_CASES", kCases) < kCases || count > least;
}

bool areEqual(const TAVHeader& one, const TAVHeader& other)
{
  return one.hdrType == other.hdrType && one.nodeOffset == other.nodeOffset &&
         std::memcmp(&one.hdr64, &other.hdr64, tav::layout::headerLength(one.hdrType)) == 0;
}

TEST_P(OpenGroups, AreSteppedOverAsByScansOfAllBytes)
{
  uint64_t scans = 0;
  forEachStream([&](TAVHandle* plain, TAVHandle* handle) {
    std::vector<TAVHeader> stack{rootOf(handle)};
    TAVHeader previous{};
    bool first = true;
    for (uint64_t steps = 0; !stack.empty() && steps < kMostSteps; ++steps)
    {
      TAVHeader parent = stack.back();
      TAVHeader reference = previous;
      TAVHeader* const pReference = first ? nullptr : &reference;
      TAVHeaderData expected{};
      TAVHeaderData out{};
      const uint32_t rc = plainNextChild(plain, &parent, pReference, &expected);
      ASSERT_EQ(tavGetNextChild(0, handle, &parent, pReference, &out), rc) << "behind " << previous.nodeOffset;
      scans += !first && rc == TAV_RC_OK && tav::layout::isSizeUnknown(reference) ? 1 : 0;
      if (rc == TAV_RC_OK)
      {
        ASSERT_TRUE(areEqual(out.header, expected.header)) << out.header.nodeOffset;
        ASSERT_EQ(out.dataBufSize, expected.dataBufSize);
        const uint64_t size = out.pDataBuf != nullptr ? std::min(tav::layout::sizeOf(out.header), out.dataBufSize) : 0;
        ASSERT_EQ(out.pDataBuf == nullptr, expected.pDataBuf == nullptr);
        ASSERT_TRUE(size == 0 || std::memcmp(out.pDataBuf, expected.pDataBuf, size) == 0);
      }
      first = rc == TAV_RC_OK && tav::layout::isGroup(out.header);
      previous = out.header;
      if (first)
      {
        stack.push_back(out.header);
      }
      else if (rc != TAV_RC_OK) // whatever it was: a walk that goes on behind damage comes to more places
      {
        previous = stack.back();
        stack.pop_back();
      }
    }
  });
  EXPECT_TRUE(isEnough(scans, kCases)) << "the streams have siblings behind open groups";
}

TEST_P(OpenGroups, AreValidatedAsByScansOfAllBytes)
{
  uint64_t sound = 0;
  forEachStream([&](TAVHandle* plain, TAVHandle* handle) {
    TAVHeader root = rootOf(handle);
    const uint32_t rc = plainValidate(plain, root);
    EXPECT_EQ(tavValidateHierarchy(0, handle, &root), rc);
    EXPECT_EQ(tavValidateHierarchy(0, handle, &root), rc) << "again";
    sound += rc == TAV_RC_OK ? 1 : 0;
  });
  EXPECT_TRUE(isEnough(sound, kCases / 50)) << "some of them are walked to their end";
}

TEST_P(OpenGroups, ArePrintedToTheSameEnd)
{
  forEachStream([&](TAVHandle* plain, TAVHandle* handle) {
    const uint32_t rc = plainValidate(plain, rootOf(handle));
    std::array<char, 80> piece{};
    TAVPrintParam param{0, piece.data(), piece.size(), nullptr};
    uint64_t printed = 0;
    EXPECT_EQ(tavPrintSubtree(TAV_PRINT_SUBTREE, handle, nullptr, &param, &printed), rc);
  });
}

TEST_P(OpenGroups, AreSearchedForPathsAsByScansOfAllBytes)
{
  uint64_t matches = 0;
  forEachStream([&](TAVHandle* plain, TAVHandle* handle) {
    TAVHeader root = rootOf(handle);
    for (const std::vector<uint16_t>& ids : {std::vector<uint16_t>{1, 2}, {2, 1, 3}, {1, 1, 2, 2}, {3, 99}})
    {
      uint64_t offset = 0;
      const uint32_t rc = plainPath(plain, root, ids, offset);
      if (rc == TAV_RC_BAD_PARAM)
      {
        continue;
      }
      std::vector<TAVPathEntry> path;
      for (const uint16_t id : ids) path.push_back({0, id});
      TAVFindLogicalGroupParam param{0, path.data(), static_cast<uint32_t>(path.size()), nullptr, 0};
      TAVHeaderData found{};
      ASSERT_EQ(tavFindLogicalGroup(0, handle, &root, &param, &found), rc);
      if (rc == TAV_RC_OK)
      {
        ASSERT_EQ(found.header.nodeOffset, offset);
        ++matches;
      }
    }
  });
  EXPECT_TRUE(isEnough(matches, kCases / 20)) << "some of the paths are there";
}

INSTANTIATE_TEST_SUITE_P(Ways, OpenGroups,
                         testing::Values(Access{"Memory", 0, 0, false}, Access{"MemorySwapped", 0, 0, true},
                                         Access{"OnePage", 64, 1, false}, Access{"TwoPages", 32, 2, true},
                                         Access{"TenPages", 24, 10, false},
                                         Access{"WithoutSeeking", 64, 2, false, false}),
                         [](const auto& access) { return access.param.name; });

} // namespace
