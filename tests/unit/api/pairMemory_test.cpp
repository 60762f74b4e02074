/// What scans for the pairs of open groups keep.
#include "api/pairMemory.h"

#include <gtest/gtest.h>

#include "support/failingNew.h"

namespace
{

using tav::inside::PairMemory;

uint64_t endAt(const PairMemory& pairs, uint64_t place)
{
  uint64_t end = 0;
  return pairs.isCovered(place, end) ? end : 0;
}

uint64_t nextFrom(const PairMemory& pairs, uint64_t place)
{
  uint64_t start = 0;
  return pairs.findCovered(place, start) ? start : ~uint64_t{0};
}

TEST(PairMemory, KnowsWhatWasCovered)
{
  PairMemory pairs;
  pairs.cover(100, 200);
  const std::pair<uint64_t, uint64_t> ends[] = {{99, 0}, {100, 200}, {199, 200}, {200, 0}};
  for (const auto& [place, end] : ends)
  {
    EXPECT_EQ(endAt(pairs, place), end) << place;
  }
  EXPECT_EQ(nextFrom(pairs, 99), 100U);
  EXPECT_EQ(nextFrom(pairs, 100), ~uint64_t{0});
}

TEST(PairMemory, JoinsStretchesThatOverlapOrTouch)
{
  PairMemory pairs;
  pairs.cover(300, 400);
  pairs.cover(100, 200);
  pairs.cover(500, 600);
  EXPECT_EQ(nextFrom(pairs, 200), 300U);
  pairs.cover(200, 350);
  EXPECT_EQ(endAt(pairs, 100), 400U);
  pairs.cover(50, 1000);
  EXPECT_EQ(endAt(pairs, 50), 1000U);
  EXPECT_EQ(nextFrom(pairs, 50), ~uint64_t{0});
}

TEST(PairMemory, ANewStretchInsideAnotherChangesNothing)
{
  PairMemory pairs;
  pairs.cover(100, 400);
  pairs.cover(200, 300);
  EXPECT_EQ(endAt(pairs, 150), 400U);
  EXPECT_EQ(nextFrom(pairs, 150), ~uint64_t{0});
}

TEST(PairMemory, AnEmptyStretchCoversNothing)
{
  PairMemory pairs;
  pairs.cover(100, 100);
  EXPECT_EQ(nextFrom(pairs, 0), ~uint64_t{0});
}

TEST(PairMemory, KeepsTheFirstPairOfAGroup)
{
  PairMemory pairs;
  uint64_t eye = 0;
  EXPECT_FALSE(pairs.findPair(16, eye));
  EXPECT_TRUE(pairs.keepPair(16, 500));
  EXPECT_TRUE(pairs.keepPair(16, 300));
  EXPECT_TRUE(pairs.keepPair(16, 400));
  ASSERT_TRUE(pairs.findPair(16, eye));
  EXPECT_EQ(eye, 300U);
}

TEST(PairMemory, KeepsWhereScansEndedOnlyForAWholeWalk)
{
  PairMemory pairs;
  uint32_t rc = 0;
  pairs.keepEnd(64, TAV_RC_NOT_FOUND);
  EXPECT_FALSE(pairs.findEnd(64, rc));
  pairs.keepsEnds = true;
  pairs.keepEnd(64, TAV_RC_NOT_FOUND);
  ASSERT_TRUE(pairs.findEnd(64, rc));
  EXPECT_EQ(rc, TAV_RC_NOT_FOUND);
}

TEST(PairMemory, RefusesMoreThanItHasRoomForAndBeginsAnew)
{
  PairMemory pairs;
  for (uint64_t i = 0; i < PairMemory::kMostEntries; ++i)
  {
    ASSERT_TRUE(pairs.keepPair(i, 1000 + i));
  }
  EXPECT_FALSE(pairs.keepPair(PairMemory::kMostEntries, 7));
  EXPECT_TRUE(pairs.keepPair(5, 7)) << "what is there can still change";
  pairs.cover(0, 100);
  EXPECT_EQ(endAt(pairs, 0), 0U);
  pairs.makeRoom();
  EXPECT_TRUE(pairs.keepPair(PairMemory::kMostEntries, 7));
  uint64_t eye = 0;
  EXPECT_FALSE(pairs.findPair(5, eye));
}

TEST(PairMemory, WithoutMemoryItKnowsLess)
{
  PairMemory pairs;
  {
    const allocations::AllFail fails;
    EXPECT_FALSE(pairs.keepPair(16, 300));
    pairs.cover(100, 200);
  }
  EXPECT_EQ(endAt(pairs, 100), 0U);
  EXPECT_TRUE(pairs.keepPair(16, 300));
}

} // namespace
