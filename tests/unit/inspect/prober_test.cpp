/// How much speaks for a place being a node.
#include <algorithm>

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

TEST_P(Probing, ANodeIsFollowedWhereTheLimitIsItsEndOrLeavesRoomForAnother)
{
  number();
  number();
  rows.fill(10, 0x5A);
  ByteSource source("x", std::span<const uint8_t>(rows.bytes));
  const Prober prober(source, form, 0);
  for (uint64_t limit = 0; limit <= rows.at(); ++limit)
  {
    const Belief expected = limit < 20                  ? Belief::none
                            : limit == 20 || limit > 39 ? Belief::followed
                                                        : Belief::named;
    EXPECT_EQ(prober.judge(0, true, limit), expected) << limit;
    // Of the second one, with nothing that could be a node behind it.
    EXPECT_EQ(prober.judge(20, true, limit), limit < 40    ? Belief::none
                                             : limit == 40 ? Belief::followed
                                                           : Belief::named)
        << limit;
  }
}

TEST_P(Probing, AGroupIsFollowedByItsFirstChildBeforeItsOwnEnd)
{
  for (const uint64_t size : {uint64_t{0}, uint64_t{16}, uint64_t{19}, uint64_t{20}, uint64_t{40}, uint64_t{41}})
  {
    rows = test::ByteRows(GetParam());
    rows.h64(size, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM);
    number();
    number();
    ByteSource source("x", std::span<const uint8_t>(rows.bytes));
    const Belief belief = Prober(source, form, 0).judge(0, true, rows.at());
    // Behind an empty one stands its sibling.
    const Belief expected = size == 41 ? Belief::none : size == 0 || size >= 20 ? Belief::followed
                                                                                : Belief::named;
    EXPECT_EQ(belief, expected) << size;
  }
}

TEST_P(Probing, AnEmptyGroupIsFollowedByASiblingWithItsOwnHeaders)
{
  for (const bool wideSibling : {true, false})
  {
    rows = test::ByteRows(GetParam());
    rows.h64(0, 0, TAV_TYPE_HEADER32, TAV_ELM_CMN_SYSTEM);
    wideSibling ? rows.h64(4, 0, TAV_TYPE_UINT32, TAV_ELM_CMN_CPU_ONLINE)
                : rows.h32(4, TAV_TYPE_UINT32, TAV_ELM_CMN_CPU_ONLINE);
    rows.number(9, 4);
    ByteSource source("x", std::span<const uint8_t>(rows.bytes));
    EXPECT_EQ(Prober(source, form, 0).judge(0, true, rows.at()), wideSibling ? Belief::followed : Belief::named);
  }
}

TEST_P(Probing, AChainGoesOverTheTwoBytesBehindATextToTheLimitOrANode)
{
  const auto chain = [this](uint64_t between, bool node) {
    rows = test::ByteRows(GetParam());
    rows.h64(5, 0, TAV_TYPE_UTF8_STRING, TAV_ELM_CMN_HOST_NAME).fill(5, 'a').fill(between, 0x5A);
    if (node)
    {
      number();
    }
    ByteSource source("x", std::span<const uint8_t>(rows.bytes));
    return Prober(source, form, 0).isChain(0, true, rows.at(), true);
  };
  for (const uint64_t between : {0U, 1U, 2U, 3U, 4U})
  {
    EXPECT_EQ(chain(between, false), between == 0 || between == 2) << between;
    EXPECT_EQ(chain(between, true), between == 0 || between == 2) << between;
  }
}

TEST_P(Probing, AChainGoesOverPairsWhateverTheyLeadTo)
{
  const auto chain = [this](uint16_t type, uint64_t between, bool pair) {
    rows = test::ByteRows(GetParam());
    rows.h64(5, 0, type, TAV_ELM_CMN_HOST_NAME).fill(5, 'a').fill(between, 0x5A);
    if (pair)
    {
      rows.pair(77);
    }
    number();
    ByteSource source("x", std::span<const uint8_t>(rows.bytes));
    return Prober(source, form, 0).isChain(0, true, rows.at(), true);
  };
  EXPECT_TRUE(chain(TAV_TYPE_ASCII_STRING, 0, true));
  EXPECT_FALSE(chain(TAV_TYPE_ASCII_STRING, 2, true)) << "only texts of a code page have two bytes more";
  EXPECT_FALSE(chain(TAV_TYPE_ASCII_STRING, 2, false));
  EXPECT_TRUE(chain(TAV_TYPE_UTF8_STRING, 0, true));
  EXPECT_TRUE(chain(TAV_TYPE_UTF8_STRING, 2, true));
  EXPECT_FALSE(chain(TAV_TYPE_UTF8_STRING, 1, true));
}

TEST_P(Probing, AChainOfSixteenNodesIsLongEnoughWhateverFollows)
{
  for (const unsigned count : {15U, 16U, 17U})
  {
    rows = test::ByteRows(GetParam());
    for (unsigned i = 0; i < count; ++i)
    {
      number();
    }
    const uint64_t end = rows.at();
    rows.fill(7, 0x5A);
    ByteSource source("x", std::span<const uint8_t>(rows.bytes));
    const Prober prober(source, form, 0);
    EXPECT_EQ(prober.isChain(0, true, rows.at()), count >= 16) << count;
    EXPECT_FALSE(prober.isChain(0, true, rows.at(), true)) << count;
    EXPECT_EQ(prober.isChain(0, true, end, true), count <= 16) << count;
  }
}

/// What an eye/size pair behind damaged bytes says of the place where nodes go on.
class ProbingPairs : public Probing
{
protected:
  Restart search(uint64_t from = 0, bool eitherWidth = false)
  {
    ByteSource source("x", std::span<const uint8_t>(rows.bytes));
    return Prober(source, form, kNoOffset).findRestart(from, true, eitherWidth, rows.at());
  }
};

INSTANTIATE_TEST_SUITE_P(Swapped, ProbingPairs, testing::Bool());

TEST_P(ProbingPairs, LeadBackToAGroupByItsSizeAndToADataElementByItsOwn)
{
  constexpr uint16_t kUnknownElement = 12345; // by its header alone a search passes such a node
  for (const bool wideChildren : {true, false})
  {
    for (const uint64_t wrong : {uint64_t{0}, uint64_t{1}, ~uint64_t{0}})
    {
      rows = test::ByteRows(GetParam());
      rows.fill(30, 0x5A);
      rows.h64(20 + 16 + wrong, TAV_INFO_EYE_SIZE, wideChildren ? TAV_TYPE_HEADER64 : TAV_TYPE_HEADER32,
               kUnknownElement);
      rows.fill(20, 0x5A).pair(wideChildren ? 36 : 28).fill(40, 0x5A);
      const Restart found = search();
      EXPECT_EQ(found.offset, wrong == 0 ? 30U : rows.at()) << wideChildren << wrong;
      EXPECT_EQ(found.byPair, wrong == 0);
    }
  }
  // What the distance leaves out is nine bytes at the most.
  rows = test::ByteRows(GetParam());
  rows.fill(30, 0x5A).h64(1, TAV_INFO_EYE_SIZE | TAV_INFO_ALIGNED8, TAV_TYPE_BINARY, kUnknownElement);
  rows.fill(1 + 7 + 2, 0x5A).pair(17).fill(40, 0x5A);
  EXPECT_EQ(search().offset, 30U);
  for (const uint64_t padding : {uint64_t{0}, uint64_t{3}, uint64_t{4}})
  {
    for (const uint64_t extra : {uint64_t{0}, uint64_t{1}, uint64_t{2}, uint64_t{3}})
    {
      rows = test::ByteRows(GetParam());
      rows.fill(30, 0x5A);
      rows.h64(5, TAV_INFO_EYE_SIZE | (padding != 0 ? TAV_INFO_ALIGNED8 : 0), TAV_TYPE_BINARY, kUnknownElement);
      rows.fill(5 + padding + extra, 0x5A).pair(21).fill(40, 0x5A);
      const bool right = padding != 4 && (extra == 0 || extra == 2);
      const bool also = padding == 4 && extra == 1; // three and two
      EXPECT_EQ(search().offset, right || also ? 30U : rows.at()) << padding << " and " << extra;
    }
  }
}

TEST_P(ProbingPairs, OfALostNodeAreFollowedByTheNext)
{
  const auto next = [this](const test::ByteRows& behind) {
    rows = test::ByteRows(GetParam());
    rows.fill(30, 0x5A).pair(20);
    const uint64_t end = rows.at();
    rows.data(behind.bytes);
    const Restart found = search();
    EXPECT_EQ(found.byPair, found.offset == end);
    return found.offset == end;
  };
  const auto wide = [](uint16_t type, uint16_t elm) {
    test::ByteRows node(GetParam());
    return node.h64(4, 0, type, elm).fill(4, 0x5A).fill(20, 0x5A);
  };
  const auto narrow = [](uint16_t elm) {
    test::ByteRows node(GetParam());
    return node.h32(4, TAV_TYPE_UINT32, elm).fill(4, 0x5A).fill(20, 0x5A);
  };
  EXPECT_TRUE(next(test::ByteRows(GetParam()))) << "the end";
  EXPECT_TRUE(next(wide(TAV_TYPE_BINARY, 12345))) << "a type is enough for a 64-bit header";
  EXPECT_FALSE(next(wide(77, 12345)));
  EXPECT_TRUE(next(narrow(TAV_ELM_CMN_CPU_ONLINE)));
  EXPECT_FALSE(next(narrow(12345))) << "and not for a 32-bit one";
}

TEST_P(ProbingPairs, OfTheOtherByteOrderCountAsWell)
{
  for (const uint64_t behind : {uint64_t{0}, uint64_t{1}})
  {
    rows = test::ByteRows(GetParam());
    rows.fill(30, 0x5A).data(test::ByteRows(!GetParam()).pair(20).bytes).fill(behind, 0x5A);
    const Restart found = search();
    EXPECT_EQ(found.offset, rows.at());
    EXPECT_EQ(found.byPair, behind == 0);
  }
}

TEST_P(Probing, ASearchEndsWhereItsBudgetIsUsedUp)
{
  constexpr uint64_t kAtOnce = uint64_t{64} * 1024;
  rows.fill(kAtOnce, 0x5A);
  const uint64_t node = rows.at() + 50;
  rows.fill(50, 0x5A);
  number();
  ByteSource source("x", std::span<const uint8_t>(rows.bytes));
  for (const uint64_t budget : {kAtOnce - 1, kAtOnce})
  {
    Prober prober(source, form, budget);
    const Restart found = prober.findRestart(0, true, false, rows.at());
    EXPECT_EQ(found.gaveUp, budget < kAtOnce) << "looked at " << kAtOnce;
    EXPECT_EQ(found.offset, budget < kAtOnce ? rows.at() : node);
    EXPECT_EQ(prober.spent(), kAtOnce);
  }
  Prober small(source, form, 10);
  const Restart all = small.findRestart(10, true, false, 40);
  EXPECT_FALSE(all.gaveUp) << "there was no more";
  EXPECT_EQ(all.offset, 40U);
  EXPECT_EQ(small.spent(), 30U);
  const Restart none = small.findRestart(0, true, false, rows.at());
  EXPECT_TRUE(none.gaveUp) << "all is spent";
  EXPECT_EQ(none.offset, rows.at());
  EXPECT_EQ(small.spent(), 30U);
}

TEST_P(Probing, LookingForZerosEndsWhereTheBudgetIsUsedUp)
{
  constexpr uint64_t kPages = 4;
  rows.fill(10, 0x5A).fill(kPages * ByteSource::kPage - 10);
  test::Made made;
  made.file().append(std::span<const uint8_t>(rows.bytes));
  made.file().flush();
  ByteSource inMemory("x", std::span<const uint8_t>(rows.bytes));
  bool gaveUp = true;
  Prober enough(inMemory, form, rows.at() - 10);
  EXPECT_TRUE(enough.zerosToEnd(10, gaveUp));
  EXPECT_FALSE(gaveUp);
  EXPECT_EQ(enough.spent(), rows.at() - 10);
  EXPECT_FALSE(enough.zerosToEnd(9, gaveUp)) << "there is something else";
  EXPECT_FALSE(gaveUp);
  EXPECT_FALSE(enough.zerosToEnd(0, gaveUp)) << "as is known by now";
  EXPECT_EQ(enough.spent(), 2 * rows.at() - 19) << "without another look";
  Prober never(inMemory, form, 0);
  EXPECT_TRUE(never.zerosToEnd(10, gaveUp)) << "one look shows all there is in memory";
  EXPECT_FALSE(gaveUp);
  // From the end on page after page: the one where it gives up is still looked at.
  for (uint64_t pages = 0; pages < kPages; ++pages)
  {
    Prober prober(inMemory, form, pages * ByteSource::kPage);
    const uint64_t seen = std::min(pages + 1, kPages) * ByteSource::kPage;
    EXPECT_EQ(prober.zerosStart(0), std::max<uint64_t>(10, rows.at() - seen)) << pages;
  }
  Prober all(inMemory, form, kNoOffset);
  EXPECT_EQ(all.zerosStart(0), 10U);
  EXPECT_EQ(all.zerosStart(11), 11U);
}
