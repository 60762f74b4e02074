/// The groups that are open around the place which a recovery has reached.
#include <gtest/gtest.h>

#include "inspect/recover/place.h"

using namespace tav::inspect;

namespace
{

class RecoveryPlace : public testing::Test
{
protected:
  Place place{{}, 1000};
};

} // namespace

TEST_F(RecoveryPlace, HasTheLimitOfTheInnermostGroupThatIsSure)
{
  EXPECT_TRUE(place.inFile());
  EXPECT_EQ(place.sureLimit(), 1000U);
  place.enter({.start = 0, .limit = 900, .wide = true, .sure = true});
  place.enter({.start = 16, .limit = 50, .wide = true});
  EXPECT_EQ(place.sureLimit(), 900U);
  place.enter({.start = 32, .limit = 48, .wide = true, .sure = true});
  EXPECT_EQ(place.sureLimit(), 48U);
  place.openTop();
  EXPECT_EQ(place.sureLimit(), 1000U);
  EXPECT_EQ(place.top().limit, 1000U);
  EXPECT_TRUE(place.top().open);
  EXPECT_FALSE(place.top().sure);
}

TEST_F(RecoveryPlace, HoldsNo64BitHeadersInAGroupOf32BitOnesThatIsConfirmed)
{
  place.enter({.start = 0, .limit = 900, .wide = false});
  EXPECT_TRUE(place.canHold(true)) << "its header may be the damaged part";
  EXPECT_TRUE(place.canHold(false));
  place.enter({.start = 16, .limit = 100, .wide = false, .sure = true});
  EXPECT_FALSE(place.canHold(true));
  EXPECT_TRUE(place.canHold(false));
  place.leave();
  place.enter({.start = 16, .limit = 100, .wide = false, .fixed = true});
  EXPECT_FALSE(place.canHold(true));
  place.enter({.start = 20, .limit = 100, .wide = true});
  EXPECT_TRUE(place.canHold(true));
}

TEST_F(RecoveryPlace, FindsTheInnermostGroupThatBeginsAtAnOffset)
{
  EXPECT_EQ(place.groupAt(0), 0U) << "the file is no group";
  place.enter({.start = 0, .limit = 900});
  place.enter({.start = 16, .limit = 800});
  place.enter({.start = 16, .limit = 700});
  place.enter({.start = 40, .limit = 600});
  EXPECT_EQ(place.groupAt(0), 1U);
  EXPECT_EQ(place.groupAt(16), 3U);
  EXPECT_EQ(place.groupAt(40), 4U);
  EXPECT_EQ(place.groupAt(17), 0U);
  EXPECT_EQ(place.groupAt(41), 0U);
}

TEST_F(RecoveryPlace, StretchesTheGroupsThatEndBefore)
{
  place.enter({.start = 0, .limit = 100});
  place.enter({.start = 16, .limit = 60});
  place.enter({.start = 32, .limit = 59});
  place.stretch(60);
  EXPECT_EQ(place.group(3).limit, 60U);
  EXPECT_EQ(place.group(2).limit, 60U);
  place.stretch(80);
  EXPECT_EQ(place.group(3).limit, 80U);
  EXPECT_EQ(place.group(2).limit, 80U);
  EXPECT_EQ(place.group(1).limit, 100U);
  place.stretch(120);
  EXPECT_EQ(place.group(1).limit, 120U);
  EXPECT_EQ(place.group(0).limit, 1000U);
}

TEST_F(RecoveryPlace, OpensAndCountsOnceTheGroupsThatANodeContradicts)
{
  place.enter({.start = 0, .limit = 100});
  place.enter({.start = 16, .limit = 60});
  place.enter({.start = 32, .limit = 50, .hidden = true});
  place.enter({.start = 40, .limit = 50});
  EXPECT_EQ(place.contradict(50), 0U);
  EXPECT_FALSE(place.top().open);
  EXPECT_EQ(place.contradict(70), 2U) << "one that is hidden is not written";
  for (const size_t at : {size_t{2}, size_t{3}, size_t{4}})
  {
    EXPECT_EQ(place.group(at).limit, 100U) << at;
    EXPECT_TRUE(place.group(at).open) << at;
  }
  EXPECT_FALSE(place.group(1).open);
  EXPECT_EQ(place.contradict(101), 1U) << "the others are counted";
  EXPECT_EQ(place.top().limit, 1000U);
}

TEST_F(RecoveryPlace, ExpectsNoGroupThatBeganBeforeIt)
{
  place.moveTo(30);
  place.expect({{.start = 10, .end = 90, .wide = true}, {.start = 30, .end = 80, .wide = true}});
  ASSERT_NE(place.lostGroup(), nullptr);
  EXPECT_EQ(place.lostGroup()->start, 30U);
  place.moveTo(31);
  EXPECT_EQ(place.lostGroup(), nullptr);
}
