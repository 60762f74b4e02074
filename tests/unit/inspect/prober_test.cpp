/// How much speaks for a place being a node.
#include <gtest/gtest.h>

#include "inspect/judged.h"
#include "inspect/walk/prober.h"

using namespace tav::inspect;

namespace
{

class Probing : public test::BothOrders
{
protected:
  /// Of a text with so many bytes between it and its pair.
  Belief beliefOf(uint16_t type, uint64_t between)
  {
    test::ByteRows text(GetParam());
    text.h64(5, TAV_INFO_EYE_SIZE, type, TAV_ELM_CMN_HOST_NAME).fill(5, 'a').fill(between, 0x5A).pair(16 + 5);
    ByteSource source("x", std::span<const uint8_t>(text.bytes));
    return Prober(source, form, 0).judge(0, true, text.bytes.size());
  }
};

} // namespace

INSTANTIATE_TEST_SUITE_P(Swapped, Probing, testing::Bool());

TEST_P(Probing, ATextMayHaveTwoBytesBeforeItsPairThatItDoesNotCount)
{
  EXPECT_EQ(beliefOf(TAV_TYPE_UTF8_STRING, 0), Belief::followed);
  EXPECT_EQ(beliefOf(TAV_TYPE_UTF8_STRING, 2), Belief::followed);
  for (const uint64_t between : {1U, 3U, 4U})
  {
    EXPECT_LT(beliefOf(TAV_TYPE_UTF8_STRING, between), Belief::followed) << between;
  }
  EXPECT_EQ(beliefOf(TAV_TYPE_ASCII_STRING, 0), Belief::followed);
  EXPECT_LT(beliefOf(TAV_TYPE_ASCII_STRING, 2), Belief::followed) << "only texts of a code page have them";
}

TEST_P(Probing, ASearchMissesNothingAtTheBordersOfWhatItReadsAtOnce)
{
  constexpr uint64_t kAtOnce = uint64_t{64} * 1024;
  for (const uint64_t before : {kAtOnce - 17, kAtOnce - 16, kAtOnce - 1, kAtOnce, kAtOnce + 1, 2 * kAtOnce})
  {
    rows = test::ByteRows(GetParam());
    rows.fill(before, 0x5A);
    number();
    number();
    ByteSource source("x", std::span<const uint8_t>(rows.bytes));
    const Restart found = Prober(source, form, kNoOffset).findRestart(0, true, false, rows.at());
    EXPECT_EQ(found.offset, before);
    EXPECT_FALSE(found.gaveUp);
  }
}

TEST_P(Probing, ASearchGoesBackToTheNodeThatAPairEndsWhateverItsElementIs)
{
  rows.fill(30, 0x5A);
  number(12345, TAV_INFO_EYE_SIZE);
  rows.pair(20);
  ByteSource source("x", std::span<const uint8_t>(rows.bytes));
  EXPECT_EQ(Prober(source, form, kNoOffset).findRestart(29, true, false, rows.at()).offset, 30U);
  // The node where the search begins is the damaged one.
  EXPECT_EQ(Prober(source, form, kNoOffset).findRestart(30, true, false, rows.at()).offset, rows.at());
}

TEST_P(Probing, ASearchPassesAPairThatLeadsNowhere)
{
  rows.fill(30, 0x5A).pair(20).fill(30, 0x5A);
  const uint64_t node = rows.at();
  number();
  number();
  ByteSource source("x", std::span<const uint8_t>(rows.bytes));
  EXPECT_EQ(Prober(source, form, kNoOffset).findRestart(0, true, false, rows.at()).offset, node);
}

TEST_P(Probing, AGroupOfUnknownSizeEndsAChainWhereThreeNodesStandBeforeIt)
{
  for (const uint64_t before : {2U, 3U, 4U})
  {
    rows = test::ByteRows(GetParam());
    for (uint64_t i = 0; i < before; ++i)
    {
      number();
    }
    rows.h64(TAV_SIZE_UNKNOWN, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM).fill(40, 0x5A);
    ByteSource source("x", std::span<const uint8_t>(rows.bytes));
    EXPECT_EQ(Prober(source, form, 0).isChain(0, true, rows.at()), before > 2) << before;
  }
}

TEST_P(Probing, ZerosAtTheEndAreToldOfWhereTheyAreEightOrMore)
{
  for (const uint64_t zeros : {uint64_t{7}, uint64_t{8}, uint64_t{3 * ByteSource::kPage}})
  {
    rows = test::ByteRows(GetParam());
    rows.fill(30, 0x5A).fill(zeros);
    ByteSource source("x", std::span<const uint8_t>(rows.bytes));
    Prober prober(source, form, kNoOffset);
    EXPECT_EQ(prober.zerosStart(0), zeros < 8 ? rows.at() : 30U) << zeros;
    EXPECT_EQ(prober.zerosStart(30), zeros < 8 ? rows.at() : 30U) << zeros;
    EXPECT_EQ(prober.zerosStart(rows.at() - 7), rows.at());
    bool gaveUp = true;
    EXPECT_TRUE(prober.zerosToEnd(30, gaveUp));
    EXPECT_FALSE(gaveUp);
    EXPECT_FALSE(prober.zerosToEnd(29, gaveUp));
  }
}

TEST_P(Probing, APairEndsAGroupFromItsHeaderOn)
{
  for (const bool wideChildren : {true, false})
  {
    const uint64_t distance = wideChildren ? 40 : 32; // that of a group of 32-bit children is 8 short
    for (const uint64_t more : {0U, 1U})
    {
      rows = test::ByteRows(GetParam());
      rows.fill(4, 0x5A).h64(40, 0, wideChildren ? TAV_TYPE_HEADER64 : TAV_TYPE_HEADER32, TAV_ELM_CMN_SYSTEM).fill(24);
      rows.pair(distance + more);
      ByteSource source("x", std::span<const uint8_t>(rows.bytes));
      const Prober prober(source, form, 0);
      TAVHeader group{};
      ASSERT_TRUE(prober.header(4, true, rows.at(), group));
      EXPECT_EQ(prober.pairEnds(44, rows.at(), group), more == 0);
      EXPECT_FALSE(prober.pairEnds(43, rows.at(), group));
    }
  }
}
