/// How far walks may go.
#include "api/walkGuard.h"

#include <gtest/gtest.h>

#include "support/elements.h"

namespace
{

using namespace tav::inside;

constexpr uint64_t kMiB = 0x100000;

uint64_t passes(LevelGuard& guard, uint64_t from, uint64_t to)
{
  uint64_t count = 0;
  while (guard.pass(from, to) && count < 1000000) ++count;
  return count;
}

TEST(LevelGuard, LetsEachDepthGoThroughTheStreamMoreThanOnce)
{
  LevelGuard guard(0, 10);
  EXPECT_EQ(passes(guard, 0, 8 * kMiB), 36U);
}

TEST(LevelGuard, CountsFromWhereTheSearchBegan)
{
  LevelGuard guard(64 * kMiB, 1);
  EXPECT_EQ(passes(guard, 64 * kMiB, 66 * kMiB), 18U);
}

TEST(LevelGuard, LetsAShortStreamBeSearchedALot)
{
  LevelGuard guard(0, 1);
  EXPECT_EQ(passes(guard, 0, 64), kMiB / 64);
}

TEST(LevelGuard, ALevelThatLeadsNowhereCostsNothing)
{
  LevelGuard guard(0, 1);
  EXPECT_EQ(passes(guard, 100, 100), 1000000U);
}

TEST(LevelGuard, DoesNotWrap)
{
  LevelGuard guard(0, ~uint64_t{0} / 4);
  EXPECT_TRUE(guard.pass(0, ~uint64_t{0}));
}

TEST(ChildGuard, LetsEachNodeBeTheChildOfAFewGroups)
{
  ChildGuard guard(test::header64(0, TAV_TYPE_HEADER64, 1, 0, kMiB));
  uint64_t visits = 0;
  while (guard.visit(2 * kMiB)) ++visits;
  EXPECT_EQ(visits, 4 * (kMiB / 8 + 1) - 1);
}

TEST(ChildGuard, LetsAShortStreamBeLookedAtALot)
{
  ChildGuard guard(test::header64(0, TAV_TYPE_HEADER64, 1));
  uint64_t visits = 0;
  while (guard.visit(64)) ++visits;
  EXPECT_EQ(visits, 4 * 0x2001U - 1);
}

} // namespace
