#include <algorithm>
#include <random>
#include <vector>

#include <gmock/gmock.h>

#include "inspect/judged.h"
#include "inspect/recover/search.h"
#include "inspect/streams.h"

using namespace tav::inspect;
using test::ByteRows;
using test::Bytes;

namespace
{

/// A search over bytes, from the root level of a file.
class Searched : public test::Judged
{
public:
  Searched(Bytes all, const tav::inspect::Form& form, uint64_t budget = kNoOffset)
      : Judged(std::move(all), form), search(source, form, place, judge, budget) {}

  RecoverySearch search;
};

} // namespace

/// What is searched in this machine's byte order and in the other one.
class Searching : public test::BothOrders
{
protected:
  /// A header that claims two numbers, which are all of its payload.
  void around(uint16_t type)
  {
    rows.h64(40, 0, type, TAV_ELM_CMN_HOST_NAME);
    number();
    number();
  }

  /// Whether the first node is believed on all of these footings when another one follows.
  bool believes(const std::vector<Footing>& footings)
  {
    number();
    Searched it(rows.bytes, form);
    Candidate found = it.judge.look(0, true);
    EXPECT_EQ(found.trust, Trust::followed);
    return std::all_of(footings.begin(), footings.end(),
                       [&](Footing footing) { return it.search.believe(found, footing); });
  }
};

INSTANTIATE_TEST_SUITE_P(Swapped, Searching, testing::Bool());

TEST_P(Searching, FindsTheFirstNodeBehindNoise)
{
  rows.fill(33, 0x5A);
  number();
  number();
  Searched it(rows.bytes, form);
  Candidate found;
  ASSERT_TRUE(it.search.findNext(0, rows.at(), found));
  EXPECT_EQ(found.header().nodeOffset, 33U);
  EXPECT_EQ(found.trust, Trust::followed);
  EXPECT_EQ(it.search.firstSure(0, rows.at(), true), 33U);
  ASSERT_TRUE(it.search.findNext(34, rows.at(), found));
  EXPECT_EQ(found.header().nodeOffset, 53U);
  EXPECT_FALSE(it.search.findNext(0, 33, found));
  EXPECT_EQ(it.search.firstSure(0, 33, true), 33U);
  EXPECT_FALSE(it.search.gaveUp());
}

TEST_P(Searching, FindsNodesWithTheOtherHeadersWhereSeveralFollowOneAnother)
{
  rows.fill(21, 0x5A);
  for (int i = 0; i < 3; ++i)
  {
    rows.h32(4, TAV_TYPE_UINT32, TAV_ELM_CMN_CPU_ONLINE).number(9, 4);
  }
  Searched it(rows.bytes, form);
  Candidate found;
  ASSERT_TRUE(it.search.findNext(0, rows.at(), found));
  EXPECT_EQ(found.header().nodeOffset, 21U);
  EXPECT_EQ(found.header().hdrType, TAV_HDR_32);
}

TEST_P(Searching, GivesUpWhenItsBudgetIsUsedUp)
{
  rows.fill(40'000, 0x5A);
  number();
  number();
  Searched it(rows.bytes, form, 1000);
  Candidate found;
  EXPECT_FALSE(it.search.findNext(0, rows.at(), found));
  EXPECT_TRUE(it.search.gaveUp());
}

TEST_P(Searching, GivesUpBehindAWholeStepThatItsBudgetDoesNotCover)
{
  constexpr uint64_t kAtOnce = uint64_t{16} * 1024;
  rows.fill(kAtOnce + 100, 0x5A);
  const uint64_t node = rows.at();
  number();
  number();
  for (const uint64_t budget : {kAtOnce - 1, kAtOnce})
  {
    Searched it(rows.bytes, form, budget);
    Candidate found;
    EXPECT_EQ(it.search.findNext(0, rows.at(), found), budget == kAtOnce);
    EXPECT_EQ(it.search.gaveUp(), budget != kAtOnce);
    EXPECT_EQ(found.header().nodeOffset, budget == kAtOnce ? node : 0);
  }
}

TEST_P(Searching, MissesNothingAtTheBordersOfWhatItReadsAtOnce)
{
  for (const uint64_t step : {uint64_t{4} * 1024, uint64_t{16} * 1024})
  {
    for (const uint64_t before : {step - 16, step - 1, step, step + 1, 2 * step - 1, 2 * step})
    {
      rows = ByteRows(GetParam());
      rows.fill(before, 0x5A);
      number();
      number();
      Searched it(rows.bytes, form);
      Candidate found;
      ASSERT_TRUE(it.search.findNext(0, rows.at(), found));
      EXPECT_EQ(found.header().nodeOffset, before);
      EXPECT_EQ(it.search.firstSure(0, rows.at(), true), before);
    }
  }
}

TEST_P(Searching, OnSoundFootingOneNodeInsideOfANumberSpeaksNotAgainstIt)
{
  rows.h64(4, 0, TAV_TYPE_UINT32, TAV_ELM_CMN_CPU_ONLINE);
  number(); // which begins in the payload of the one before
  rows.fill(50, 0x5A);
  Searched it(rows.bytes, form);
  for (const Footing footing : {Footing::sound, Footing::damaged, Footing::searched})
  {
    Candidate found = it.judge.look(0, true);
    EXPECT_EQ(found.trust, Trust::alone);
    EXPECT_EQ(it.search.believe(found, footing), footing == Footing::sound);
  }
}

TEST_P(Searching, RemembersNothingForNodesWithOtherHeaders)
{
  rows.fill(33, 0x5A);
  number();
  rows.fill(50, 0x5A);
  Searched it(rows.bytes, form);
  for (int i = 0; i < 2; ++i)
  {
    EXPECT_EQ(it.search.firstSure(0, rows.at(), true), 33U);
    EXPECT_EQ(it.search.firstSure(0, rows.at(), false), rows.at()) << "one alone is too little with other headers";
  }
}

TEST_P(Searching, ATextThatNodesFillIsNotBelieved)
{
  around(TAV_TYPE_ASCII_STRING);
  EXPECT_FALSE(believes({Footing::sound}));
}

TEST_P(Searching, ATextThatNodesFillIsNotBelievedForAPairThatIsDamaged)
{
  for (const uint64_t filled : {uint64_t{40}, uint64_t{41}})
  {
    rows = ByteRows(GetParam());
    rows.h64(filled, TAV_INFO_EYE_SIZE, TAV_TYPE_ASCII_STRING, TAV_ELM_CMN_HOST_NAME);
    number();
    number();
    rows.fill(filled - 40, 'a').pair(16);
    Searched it(rows.bytes, form);
    Candidate found = it.judge.look(0, true);
    ASSERT_EQ(found.trust, Trust::followed);
    EXPECT_EQ(it.search.believe(found, Footing::sound), filled != 40) << "they end before its end";
  }
}

TEST_P(Searching, FindsANodeOfNoMoreThanItsHeaderAtTheEndOfTheFile)
{
  rows.fill(12, 0x5A).h32(0, TAV_TYPE_ASCII_STRING, TAV_ELM_CMN_HOST_NAME);
  EXPECT_EQ(Searched(rows.bytes, form).search.firstSure(0, rows.at(), false), 12U);
  rows.bytes.pop_back();
  EXPECT_EQ(Searched(rows.bytes, form).search.firstSure(0, rows.at(), false), rows.at());
}

TEST_P(Searching, BytesThatNodesFillAreBelieved)
{
  around(TAV_TYPE_BINARY);
  EXPECT_TRUE(believes({Footing::sound, Footing::searched}));
}

TEST_P(Searching, AClaimThatCoversNodesIsBelievedWhereNothingInItIsSurer)
{
  rows.h64(24, 0, TAV_TYPE_ASCII_STRING, TAV_ELM_CMN_HOST_NAME).fill(24, 'a').fill(20, 0x5A);
  Searched sound(rows.bytes, form);
  Candidate found = sound.judge.look(0, true);
  ASSERT_EQ(found.trust, Trust::alone);
  EXPECT_TRUE(sound.search.believe(found, Footing::damaged));
  // The same with a node in the payload that goes on beyond its end.
  rows = ByteRows(GetParam());
  rows.h64(24, 0, TAV_TYPE_ASCII_STRING, TAV_ELM_CMN_HOST_NAME).fill(8, 'a');
  number();
  number();
  rows.fill(20, 0x5A);
  Searched covering(rows.bytes, form);
  found = covering.judge.look(0, true);
  ASSERT_EQ(found.trust, Trust::alone);
  EXPECT_FALSE(covering.search.believe(found, Footing::damaged));
}

TEST_P(Searching, PaddingThatIsNotThereIsTakenAway)
{
  rows.h64(4, TAV_INFO_ALIGNED8, TAV_TYPE_BINARY, TAV_ELM_CMN_HOST_NAME).fill(4, 0xAA); // no padding follows
  number();
  number();
  Searched it(rows.bytes, form);
  Candidate found = it.judge.look(0, true);
  ASSERT_EQ(found.end, 24U);
  ASSERT_TRUE(it.search.believe(found, Footing::sound));
  EXPECT_EQ(found.end, 20U);
}

TEST_P(Searching, ANodeOfAnUnknownTypeBetweenOthersIsAStranger)
{
  number();
  rows.h64(12, 0, 77, TAV_ELM_CMN_CPU_ONLINE).fill(12, 0x5A);
  number();
  number();
  Searched it(rows.bytes, form);
  uint64_t end = 0;
  EXPECT_TRUE(it.search.isStranger(it.judge.look(20, true).header(), end));
  EXPECT_EQ(end, 48U);
  EXPECT_FALSE(it.search.isStranger(it.judge.look(0, true).header(), end)); // its type is known
}

TEST_P(Searching, AGroupWhoseTypeIsDamagedIsNoStranger)
{
  rows.h64(40, 0, 77, TAV_ELM_CMN_SYSTEM);
  number();
  number();
  number();
  Searched it(rows.bytes, form);
  uint64_t end = 0;
  EXPECT_FALSE(it.search.isStranger(it.judge.look(0, true).header(), end));
}

TEST(Search, RemembersWhatItFoundAndNothingElse)
{
  size_t found = 0;
  for (uint64_t seed = 0; seed < 40; ++seed)
  {
    SCOPED_TRACE(seed);
    const Bytes bytes = test::damaged(test::namedStream(seed), seed);
    Searched remembering(bytes, {});
    std::mt19937_64 random(seed);
    for (int i = 0; i < 30; ++i)
    {
      const uint64_t from = random() % bytes.size();
      const uint64_t to = from + random() % (bytes.size() - from + 1);
      const bool wide = random() % 4 != 0;
      const uint64_t sure = remembering.search.firstSure(from, to, wide);
      ASSERT_EQ(sure, Searched(bytes, {}).search.firstSure(from, to, wide)) << from << " to " << to;
      found += sure < to ? 1 : 0;
    }
  }
  EXPECT_GT(found, 200U);
}
