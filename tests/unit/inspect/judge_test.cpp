#include <tuple>
#include <vector>

#include <gmock/gmock.h>

#include "inspect/judged.h"

using namespace tav::inspect;
using test::ByteRows;
using test::Bytes;
using test::Judged;

namespace
{

constexpr uint32_t kEye = TAV_INFO_EYE_SIZE;
constexpr uint16_t kUnknownType = 77;
constexpr uint16_t kUnknownElement = 12345;

/// Everything that a judge says of the node at an offset.
auto answer(const Judge& judge, uint64_t offset, bool wide)
{
  const Candidate found = judge.look(offset, wide);
  return std::tuple(found.trust, found.end, found.pairBytes, found.pairMissing, found.open, found.data.extra,
                    found.data.otherOrder, judge.goesOn(offset, wide), judge.isBoundary(offset),
                    judge.isRun(offset, wide), judge.isConfirmed(found));
}

} // namespace

/// What is judged in this machine's byte order and in the other one.
class Judging : public test::BothOrders
{
protected:
  Candidate lookAtFirst() { return Judged(rows.bytes, form).judge.look(0, true); }
};

INSTANTIATE_TEST_SUITE_P(Swapped, Judging, testing::Bool());

TEST_P(Judging, ANodeThatAnotherFollowsIsWorthMoreThanOneAlone)
{
  number();
  const uint64_t end = rows.at();
  rows.fill(40, 0x5A);
  EXPECT_EQ(lookAtFirst().trust, Trust::alone);
  rows.bytes.resize(end);
  number();
  const Candidate found = lookAtFirst();
  EXPECT_EQ(found.trust, Trust::followed);
  EXPECT_EQ(found.end, end);
  EXPECT_FALSE(found.isGroup());
}

TEST_P(Judging, APairThatLeadsBackIsWorthMost)
{
  number(TAV_ELM_CMN_CPU_ONLINE, kEye);
  rows.pair(20);
  rows.fill(40, 0x5A);
  const Candidate found = lookAtFirst();
  EXPECT_EQ(found.trust, Trust::paired);
  EXPECT_EQ(found.end, 36U);
  EXPECT_EQ(found.pairBytes, 0U);
  EXPECT_FALSE(found.data.otherOrder);
}

TEST_P(Judging, APairInTheOtherByteOrderIsKeptSoOfTextsThatAreWrittenSo)
{
  const auto look = [this](uint16_t type, uint64_t extra, bool other) {
    rows = ByteRows(GetParam());
    rows.h64(4, kEye, type, TAV_ELM_CMN_HOST_NAME).fill(4, 'a').fill(extra, 0x11);
    rows.data(ByteRows(GetParam() != other).pair(20).bytes);
    return lookAtFirst();
  };
  for (const bool other : {false, true})
  {
    for (const uint16_t type : {TAV_TYPE_ASCII_STRING, TAV_TYPE_UTF8_STRING, TAV_TYPE_UINT32, TAV_TYPE_BINARY})
    {
      const Candidate found = look(type, 0, other);
      EXPECT_EQ(found.trust, Trust::paired) << type;
      EXPECT_EQ(found.data.otherOrder, other && type == TAV_TYPE_ASCII_STRING) << type;
      EXPECT_EQ(found.end, 36U);
    }
    const Candidate found = look(TAV_TYPE_UTF8_STRING, 2, other);
    EXPECT_EQ(found.trust, Trust::paired);
    EXPECT_EQ(found.data.otherOrder, other);
    EXPECT_TRUE(found.data.extra);
    EXPECT_EQ(found.end, 38U);
  }
}

TEST_P(Judging, APairWithAnotherDistanceIsADamagedOne)
{
  number(TAV_ELM_CMN_CPU_ONLINE, kEye);
  rows.pair(21);
  const Candidate found = lookAtFirst();
  EXPECT_EQ(found.trust, Trust::followed);
  EXPECT_EQ(found.end, 36U);
  EXPECT_EQ(found.pairBytes, 16U);
}

TEST_P(Judging, WhereTheNextNodeStandsTellsThatAPairIsMissing)
{
  number(TAV_ELM_CMN_CPU_ONLINE, kEye);
  number();
  number();
  const Candidate found = lookAtFirst();
  EXPECT_EQ(found.trust, Trust::followed);
  EXPECT_EQ(found.end, 20U);
  EXPECT_TRUE(found.pairMissing);
}

TEST_P(Judging, WhereTheNextNodeStandsTellsOfTwoBytesBehindAText)
{
  for (const uint64_t extra : {uint64_t{0}, uint64_t{2}})
  {
    rows = ByteRows(GetParam());
    rows.h64(5, 0, TAV_TYPE_UTF8_STRING, TAV_ELM_CMN_HOST_NAME).number(65001, 2).fill(3, 'a').fill(extra, 0x11);
    number();
    number();
    const Candidate found = lookAtFirst();
    EXPECT_EQ(found.trust, Trust::followed);
    EXPECT_EQ(found.end, 21 + extra);
    EXPECT_EQ(found.data.extra, extra != 0);
  }
}

TEST_P(Judging, OneByteBehindATextIsNotAPartOfIt)
{
  for (const uint64_t between : {uint64_t{1}, uint64_t{3}})
  {
    rows = ByteRows(GetParam());
    rows.h64(5, 0, TAV_TYPE_UTF8_STRING, TAV_ELM_CMN_HOST_NAME).number(65001, 2).fill(3, 'a').fill(between, 0x11);
    number();
    number();
    const Candidate found = lookAtFirst();
    EXPECT_EQ(found.trust, Trust::alone) << between;
    EXPECT_EQ(found.end, 21U) << between;
  }
}

TEST_P(Judging, WhatIsLeftOfAGroupIsNotTakenWhereOneIsSearchedFor)
{
  const auto isTaken = [this] {
    const Judged it(rows.bytes, form);
    const Candidate found = it.judge.look(0, true);
    EXPECT_NE(found.trust, Trust::none);
    return it.judge.isWorthTaking(found, 0, rows.at());
  };
  rows.h64(20, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM);
  number();
  EXPECT_TRUE(isTaken());
  rows = ByteRows(GetParam());
  rows.fill(52, 0x5A).end64(52).bytes.erase(rows.bytes.begin(), rows.bytes.begin() + 52);
  EXPECT_FALSE(isTaken()) << "an end element of a group before the file";
  rows = ByteRows(GetParam());
  rows.h64(400, 0x20, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM); // flags that no group has, and more than there is
  number();
  EXPECT_FALSE(isTaken());
}

TEST_P(Judging, NothingSpeaksForHeadersThatNoNodeHas)
{
  rows.h64(4, 0, kUnknownType, TAV_ELM_CMN_CPU_ONLINE).fill(4);
  EXPECT_EQ(lookAtFirst().trust, Trust::none);
  rows = ByteRows(GetParam());
  rows.h64(5, 0, TAV_TYPE_UINT32, TAV_ELM_CMN_CPU_ONLINE).fill(5); // no size of this type
  EXPECT_EQ(lookAtFirst().trust, Trust::none);
  rows = ByteRows(GetParam());
  rows.h64(1000, 0, TAV_TYPE_BINARY, TAV_ELM_CMN_CPU_ONLINE).fill(5); // claims more than there is
  EXPECT_EQ(lookAtFirst().trust, Trust::none);
  rows = ByteRows(GetParam());
  rows.fill(40);
  EXPECT_EQ(lookAtFirst().trust, Trust::none);
}

TEST_P(Judging, AGroupIsWorthMostWhereItsEndElementLeadsBack)
{
  rows.h64(20 + 32, kEye, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM);
  number();
  const ByteRows open = rows;
  rows.end64(16 + 20 + 16);
  const Candidate found = lookAtFirst();
  EXPECT_EQ(found.trust, Trust::paired);
  EXPECT_EQ(found.end, rows.at());
  EXPECT_FALSE(found.open);
  rows = open;
  const Candidate cut = lookAtFirst();
  EXPECT_EQ(cut.trust, Trust::followed);
  EXPECT_TRUE(cut.open);
}

TEST_P(Judging, ASizeThatIsConfirmedEndsAGroupAndAnyOtherOnlyWhereNodesGoOn)
{
  number();
  number();
  rows.fill(30, 0x5A);
  Judged it(rows.bytes, form);
  it.place.enter({.start = 0, .limit = 20, .wide = true});
  EXPECT_TRUE(it.judge.isBoundary(20));
  it.place.leave();
  it.place.enter({.start = 0, .limit = 45, .wide = true});
  EXPECT_FALSE(it.judge.isBoundary(45));
  EXPECT_FALSE(it.judge.isBoundary(44));
  it.place.leave();
  it.place.enter({.start = 0, .limit = 45, .wide = true, .sure = true});
  EXPECT_TRUE(it.judge.isBoundary(45));
  EXPECT_TRUE(it.judge.isBoundary(rows.at()));
}

TEST_P(Judging, AGroupWhoseHeaderIsLostEndsWhatStandsBeforeIt)
{
  rows.fill(50, 0x5A);
  Judged it(rows.bytes, form);
  EXPECT_FALSE(it.judge.isBoundary(30));
  it.place.expect({{.start = 10, .end = 20, .wide = true}, {.start = 30, .end = 40, .wide = true}});
  EXPECT_FALSE(it.judge.isBoundary(30)); // the one before it is next
  EXPECT_TRUE(it.judge.isBoundary(10));
  it.place.moveTo(11);
  EXPECT_TRUE(it.judge.isBoundary(30));
  it.place.passLostGroup();
  EXPECT_FALSE(it.judge.isBoundary(30));
}

TEST_P(Judging, ARootThatWentElsewhereIsSureByTheSizeOfTheFile)
{
  for (const uint64_t missing : {uint64_t{15}, uint64_t{16}, uint64_t{17}})
  {
    rows = ByteRows(GetParam());
    rows.fill(50, 0x5A).h64(50 + 16 + 60 - missing, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM);
    number();
    number();
    number();
    const Judged it(rows.bytes, form);
    EXPECT_EQ(it.judge.isSure(rows.bytes.data() + 50, 50, true), missing == 16) << missing;
  }
}

TEST_P(Judging, NodesLeadOnlyToWhereOneOfThemEnds)
{
  number();
  number(TAV_ELM_CMN_CPU_ONLINE, kEye);
  rows.pair(20);
  number();
  rows.fill(20, 0x5A);
  const Judged it(rows.bytes, form);
  EXPECT_TRUE(it.judge.leadsTo(0, true, 20));
  EXPECT_TRUE(it.judge.leadsTo(0, true, 56));
  EXPECT_TRUE(it.judge.leadsTo(0, true, 76));
  EXPECT_FALSE(it.judge.leadsTo(0, true, 40));
  EXPECT_FALSE(it.judge.leadsTo(1, true, 20));
  EXPECT_TRUE(it.judge.isRun(0, true));
  EXPECT_TRUE(it.judge.holdsRun(0, 1));
  EXPECT_FALSE(it.judge.holdsRun(1, 20));
}

TEST_P(Judging, AnElementThatNobodyKnowsCountsWhereANodeFollows)
{
  number(kUnknownElement);
  const uint64_t end = rows.at();
  number();
  EXPECT_EQ(Judged(rows.bytes, form).judge.beliefAt(0, true, rows.at()), Belief::named);
  rows.bytes.resize(end);
  rows.fill(30, 0x5A);
  EXPECT_EQ(Judged(rows.bytes, form).judge.beliefAt(0, true, rows.at()), Belief::typed);
}

TEST_P(Judging, NothingIsTriedWhoseTypeOrElementNobodyKnows)
{
  number(kUnknownElement);
  number();
  const Judged it(rows.bytes, form);
  Candidate found;
  EXPECT_FALSE(it.judge.tryAt(rows.bytes.data(), 0, true, found));
  EXPECT_TRUE(it.judge.tryAt(rows.bytes.data() + 20, 20, true, found));
  EXPECT_EQ(found.header().nodeOffset, 20U);
}

TEST_P(Judging, ANodeOfAnUnknownTypeEndsByItsSize)
{
  rows.h64(8, 0, kUnknownType, TAV_ELM_CMN_CPU_ONLINE).fill(8, 0x5A);
  rows.h64(8, kEye, kUnknownType, TAV_ELM_CMN_CPU_ONLINE).fill(8, 0x5A).pair(24);
  rows.h64(8, kEye, kUnknownType, TAV_ELM_CMN_CPU_ONLINE).fill(8, 0x5A).pair(23);
  const Judged it(rows.bytes, form);
  uint64_t end = 0;
  EXPECT_TRUE(it.judge.endOfStranger(it.judge.look(0, true).header(), rows.at(), end));
  EXPECT_EQ(end, 24U);
  EXPECT_TRUE(it.judge.endOfStranger(it.judge.look(24, true).header(), rows.at(), end));
  EXPECT_EQ(end, 64U);
  EXPECT_FALSE(it.judge.endOfStranger(it.judge.look(64, true).header(), rows.at(), end)); // its pair is another node's
}

TEST_P(Judging, OnlyBytesAndArraysMayHoldNodes)
{
  for (const uint16_t type : {TAV_TYPE_BINARY, TAV_TYPE_UINT64_ARRAY, TAV_TYPE_ASCII_STRING, TAV_TYPE_UTF8_STRING})
  {
    rows = ByteRows(GetParam());
    rows.h64(8, 0, type, TAV_ELM_CMN_HOST_NAME).fill(8, 'a');
    number();
    Candidate found = lookAtFirst();
    ASSERT_EQ(found.trust, Trust::followed) << type;
    EXPECT_FALSE(Judge::isExact(found.header()));
    EXPECT_EQ(Judge::mayHoldNodes(found), type == TAV_TYPE_BINARY || type == TAV_TYPE_UINT64_ARRAY);
    found.pairMissing = true;
    EXPECT_FALSE(Judge::mayHoldNodes(found));
  }
}

namespace
{

/// A text of a code page, and bytes behind it in which a node may begin at once or behind two bytes: the second one's
/// type is the first one's element, its flags are the first one's type, and its element is in the first one's payload.
/// Little-endian.
class TextBeforeEither
{
public:
  /// Of the node that begins at once.
  TextBeforeEither(uint64_t size, uint16_t type, uint16_t otherType)
  {
    rows.h64(5, 0, TAV_TYPE_UTF8_STRING, TAV_ELM_CMN_HOST_NAME).fill(5, 'a');
    rows.h64(size, 0, type, otherType).number(TAV_ELM_CMN_HOST_NAME, 2);
  }

  /// Whether the two bytes are taken for a part of the text, by who expects them or not.
  bool isExtra(bool expected) const
  {
    const Judged it(rows.bytes, {.swapped = test::kBigEndianHost, .extra = expected});
    const Candidate found = it.judge.look(0, true);
    EXPECT_EQ(found.trust, Trust::followed);
    EXPECT_EQ(found.end, found.data.extra ? 23U : 21U);
    return found.data.extra;
  }

  void number() { rows.h64(4, 0, TAV_TYPE_UINT32, TAV_ELM_CMN_CPU_ONLINE).number(9, 4); }

  ByteRows rows{test::kBigEndianHost};
};

} // namespace

TEST(Judge, OfTwoPlacesBehindATextTakesTheOneThatOtherTextsSpeakFor)
{
  TextBeforeEither text(22, TAV_TYPE_ASCII_STRING, TAV_TYPE_ASCII_STRING);
  text.number(); // to which both lead
  EXPECT_TRUE(text.isExtra(true));
  EXPECT_FALSE(text.isExtra(false));
}

TEST(Judge, OfTwoPlacesBehindATextTakesTheOneThatNodesFollowFromFartherOn)
{
  TextBeforeEither atOnce(52, TAV_TYPE_ASCII_STRING, TAV_TYPE_ASCII_STRING);
  atOnce.number();
  atOnce.rows.fill(30, 0x5A);
  atOnce.number();
  EXPECT_FALSE(atOnce.isExtra(true));
  EXPECT_FALSE(atOnce.isExtra(false));
  TextBeforeEither behind(22 + 16, TAV_TYPE_ASCII_STRING, TAV_TYPE_ASCII_STRING);
  behind.number();
  behind.rows.h64(50, 0, TAV_TYPE_BINARY, TAV_ELM_CMN_HOST_NAME); // at whose payload the first node ends
  behind.number();
  behind.rows.fill(30, 0x5A);
  EXPECT_TRUE(behind.isExtra(true));
  EXPECT_TRUE(behind.isExtra(false));
}

TEST(Judge, OfTwoPlacesBehindATextTakesTheOneWhereASizeCanBeNoOther)
{
  TextBeforeEither atOnce(16, TAV_TYPE_UTC_TIMESTAMP, TAV_TYPE_ASCII_STRING);
  atOnce.rows.pair(0).bytes.resize(atOnce.rows.at() - 2); // the other one's, for so its flags are
  atOnce.rows.h64(22, 0, TAV_TYPE_ASCII_STRING, TAV_TYPE_ASCII_STRING).number(TAV_ELM_CMN_HOST_NAME, 2);
  atOnce.number();
  EXPECT_FALSE(atOnce.isExtra(true));
  EXPECT_FALSE(atOnce.isExtra(false));
  // Of four bytes, padded to eight, which the other one's size of 4 * 2^16 gives.
  TextBeforeEither behind(4 << 16, TAV_TYPE_ASCII_STRING, TAV_TYPE_UINT32);
  behind.rows.number(9, 8);
  behind.rows.h64((4 << 16) - 26, 0, TAV_TYPE_BINARY, TAV_ELM_CMN_HOST_NAME).fill((4 << 16) - 26, 0x5A);
  EXPECT_TRUE(behind.isExtra(true));
  EXPECT_TRUE(behind.isExtra(false));
}

TEST(Judge, KeepsNothingOfWhatItWasAsked)
{
  size_t nodes = 0;
  for (uint64_t seed = 0; seed < 60; ++seed)
  {
    SCOPED_TRACE(seed);
    const bool swap = seed % 2 != 0;
    const Bytes bytes = test::damaged(test::namedStream(seed, swap, seed % 4 > 1), seed);
    const tav::inspect::Form form{.swapped = swap, .aligned = seed % 4 > 1};
    const Judged asked(bytes, form);
    std::vector<decltype(answer(asked.judge, 0, true))> answers;
    for (uint64_t at = 0; at < bytes.size(); ++at)
    {
      answers.push_back(answer(asked.judge, at, true));
      answers.push_back(answer(asked.judge, at, false));
      nodes += std::get<0>(answers.back()) != Trust::none ? 1 : 0;
    }
    for (uint64_t at = bytes.size(); at-- > 0;)
    {
      ASSERT_EQ(answer(asked.judge, at, false), answers[2 * at + 1]) << at;
      ASSERT_EQ(answer(Judged(bytes, form).judge, at, true), answers[2 * at]) << at;
    }
  }
  EXPECT_GT(nodes, 100U);
}
