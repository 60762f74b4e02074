/// The ring asks for less and less memory while memory is short.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "storage/ringFixture.h"
#include "support/failingNew.h"

namespace
{

using namespace test;
using testing::ElementsAre;

constexpr uint64_t kMiB = 0x100000;
constexpr uint64_t kAnySize = ~uint64_t{0};

TEST(RingAllocation, TriesFewerPagesDownToOne)
{
  VectorStorage storage(kMiB);
  uint32_t rc = 77;
  TraceLog trace;
  const allocations::OnlySizes none(0, kMiB - 1);
  const TAVCircularBuf ring(&storage, 10 * kMiB, &rc);
  EXPECT_THAT(none.asked(), ElementsAre(10 * kMiB, 8 * kMiB, 6 * kMiB, 5 * kMiB, 4 * kMiB, 3 * kMiB, kMiB));
  EXPECT_EQ(rc, TAV_RC_NO_MEMORY);
  EXPECT_EQ(ring.status, TAV_RC_NO_MEMORY);
  EXPECT_EQ(ring.pageCount, 0U);
  EXPECT_EQ(ring.ringSize, 0U);
  EXPECT_EQ(ring.pRing, nullptr);
  EXPECT_EQ(ring.pPageFlags, nullptr);
  EXPECT_THAT(trace.failuresOf(tav::probe::circularBuf),
              ElementsAre(Failure{tav::probe::circularBuf, 40, TAV_RC_NO_MEMORY}));
}

struct Granted
{
  uint64_t largest; ///< pages
  uint64_t pages;
};

class RingOfWhatIsGranted : public testing::TestWithParam<Granted>
{};

TEST_P(RingOfWhatIsGranted, IsUsable)
{
  VectorStorage storage(kMiB, pattern(0, 100));
  uint32_t rc = 77;
  const allocations::OnlySizes limit(0, GetParam().largest * kMiB);
  TAVCircularBuf ring(&storage, 10 * kMiB, &rc);
  EXPECT_EQ(rc, TAV_RC_OK);
  EXPECT_EQ(ring.pageCount, GetParam().pages);
  EXPECT_EQ(ring.ringSize, GetParam().pages * kMiB);
  TAVCBUserArea area{};
  EXPECT_EQ(ring.getChunk(3, 5, &area, false, false), TAV_RC_OK);
  EXPECT_EQ(area.pChunk[0], byteAt(3));
}

INSTANTIATE_TEST_SUITE_P(Rows, RingOfWhatIsGranted,
                         testing::Values(Granted{10, 10}, Granted{9, 8}, Granted{7, 6}, Granted{5, 5}, Granted{4, 4},
                                         Granted{3, 3}, Granted{2, 1}, Granted{1, 1}));

TEST(RingAllocation, GivesTheRingBackWhenTheFlagsFail)
{
  VectorStorage storage(64);
  const int64_t before = allocations::live();
  uint32_t rc = 77;
  const allocations::OnlySizes noFlags(64, kAnySize);
  const TAVCircularBuf ring(&storage, 256, &rc);
  EXPECT_THAT(noFlags.asked(), ElementsAre(256U, 8U, 192U, 6U, 64U, 2U));
  EXPECT_EQ(rc, TAV_RC_NO_MEMORY);
  EXPECT_EQ(allocations::live(), before);
}

TEST(RingAllocation, OfTheRingOrOfItsFlagsFailsOnceAndTheNextSizeServes)
{
  for (const uint64_t nth : {1U, 2U})
  {
    VectorStorage storage(8);
    uint32_t rc = 77;
    const allocations::FailNth failing(nth);
    const TAVCircularBuf ring(&storage, 80, &rc);
    EXPECT_TRUE(failing.happened()) << nth;
    EXPECT_EQ(rc, TAV_RC_OK) << nth;
    EXPECT_EQ(ring.pageCount, 8U) << nth;
  }
}

TEST(RingAllocation, IsGivenBackAtTheEnd)
{
  VectorStorage storage(64);
  const int64_t before = allocations::live();
  {
    const TAVCircularBuf ring(&storage, 256, nullptr);
    EXPECT_EQ(allocations::live(), before + 2);
  }
  EXPECT_EQ(allocations::live(), before);
}

} // namespace
