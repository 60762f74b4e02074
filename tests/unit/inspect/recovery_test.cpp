#include <string>
#include <vector>

#include <gmock/gmock.h>

#include "inspect/judged.h"
#include "inspect/recover/recovery.h"
#include "inspect/streams.h"

using namespace tav::inspect;
using test::ByteRows;
using test::Bytes;

namespace
{

Bytes hostStream()
{
  tav::Writer writer;
  {
    tav::Group system = writer.group(TAV_ELM_CMN_SYSTEM);
    tav::Group host = system.group(TAV_ELM_CMN_HOST);
    host.add(TAV_ELM_CMN_HOST_NAME, "ada");
    host.add(TAV_ELM_CMN_CPU_ONLINE, uint32_t{8});
  }
  writer.finish();
  const auto bytes = writer.bytes();
  const auto* const first = reinterpret_cast<const uint8_t*>(bytes.data());
  return {first, first + bytes.size()};
}

/// What a recovery brings back, and what it says of the rest.
struct Recovered
{
  Recovered(const Bytes& bytes, const tav::inspect::Form& form, uint64_t search = kNoOffset)
  {
    ByteSource source("x", std::span<const uint8_t>(bytes));
    test::Made made;
    Rebuilder rebuilder(source, form, made.file(), [](uint64_t) {});
    Recovery recovery(source, form, rebuilder, search,
                      {.loss = [&](const Loss& loss) { losses.push_back(loss); },
                       .doubt = [&](const Doubt& doubt) { doubts.push_back(doubt); }});
    uint64_t before = 0;
    while (recovery.step())
    {
      EXPECT_GE(recovery.position(), before);
      before = recovery.position();
    }
    EXPECT_EQ(recovery.position(), bytes.size());
    EXPECT_EQ(rebuilder.depth(), 0U);
    totals = recovery.totals();
    stream = made.bytes();
  }

  std::vector<Loss> losses;
  std::vector<Doubt> doubts;
  RecoveryTotals totals;
  Bytes stream;
};

} // namespace

/// What is recovered in this machine's byte order and in the other one.
class Recovering : public test::BothOrders
{
};

INSTANTIATE_TEST_SUITE_P(Swapped, Recovering, testing::Bool());

TEST_P(Recovering, LeavesOutTheBytesBetweenNodesAndSetsTheSizeRight)
{
  rows.h64(60, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM);
  number();
  number();
  number();
  const Bytes whole = rows.bytes;
  ByteRows damaged(GetParam());
  damaged.h64(79, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM);
  damaged.data({whole.begin() + 16, whole.begin() + 36}).fill(19, 0x5A).data({whole.begin() + 36, whole.end()});
  const Recovered back(damaged.bytes, form);
  EXPECT_EQ(back.stream, whole);
  ASSERT_EQ(back.losses.size(), 1U);
  EXPECT_EQ(back.losses[0].offset, 36U);
  EXPECT_EQ(back.losses[0].length, 19U);
  EXPECT_EQ(back.losses[0].reason, "no node is whole");
  EXPECT_EQ(back.totals.kept, whole.size());
  EXPECT_EQ(back.totals.nodes, 4U);
}

TEST_P(Recovering, AGroupThatHasLostItsHeaderComesBackByItsEndElement)
{
  rows.h64(20 + 68 + 20 + 32, TAV_INFO_EYE_SIZE, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM);
  number();
  const uint64_t lost = rows.at();
  rows.fill(16, 0x5A); // the header of a group of a number and an end element
  number();
  rows.end64(16 + 20 + 16);
  number();
  rows.end64(16 + 20 + 68 + 20 + 16);
  const Recovered back(rows.bytes, form);
  EXPECT_EQ(back.totals.made, 1U);
  EXPECT_EQ(back.totals.closed, 0U);
  EXPECT_EQ(back.totals.ends, 2U);
  EXPECT_EQ(back.totals.nodes, 4U);
  ASSERT_EQ(back.losses.size(), 1U);
  EXPECT_EQ(back.losses[0].offset, lost);
  EXPECT_EQ(back.losses[0].length, 16U);
  Bytes expected = rows.bytes;
  const Bytes header = ByteRows(GetParam()).h64(52, TAV_INFO_EYE_SIZE, TAV_TYPE_HEADER64, TAV_ELM_CMN_DOC_ROOT).bytes;
  std::copy(header.begin(), header.end(), expected.begin() + static_cast<ptrdiff_t>(lost));
  EXPECT_EQ(back.stream, expected);
}

TEST_P(Recovering, NothingGoesBeyondTheEndOfAGroupThatHasLostItsHeader)
{
  rows.h64(16 + 20 + 24 + 32 + 40 + 32, TAV_INFO_EYE_SIZE, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM);
  const uint64_t lost = rows.at();
  rows.fill(16, 0x5A);
  number();
  const uint64_t data = rows.at();
  rows.h64(8 + 32 + 20, 0, TAV_TYPE_BINARY, TAV_ELM_CMN_HOST_NAME).fill(8, 0x77); // to behind the next number
  rows.end64(rows.at() + 16 - lost);
  number();
  number();
  rows.end64(rows.at() + 16);
  const Recovered back(rows.bytes, form);
  EXPECT_EQ(back.totals.nodes, 4U);
  EXPECT_EQ(back.totals.made, 1U);
  EXPECT_EQ(back.totals.ends, 2U);
  ASSERT_EQ(back.losses.size(), 2U);
  EXPECT_EQ(back.losses[0].offset, lost);
  EXPECT_EQ(back.losses[0].length, 16U);
  EXPECT_EQ(back.losses[1].offset, data);
  EXPECT_EQ(back.losses[1].length, 24U);
}

TEST_P(Recovering, AnyNumberOfEndElementsMayLeadToOnePlace)
{
  constexpr uint64_t kEnds = 100'000;
  rows.h64(TAV_SIZE_UNKNOWN, TAV_INFO_EYE_SIZE, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM);
  const uint64_t lost = rows.at();
  rows.fill(24, 0x5A);
  for (uint64_t i = 0; i < kEnds; ++i)
  {
    rows.end64(rows.at() + 16 - lost);
  }
  const Recovered back(rows.bytes, form);
  EXPECT_EQ(back.totals.made, kMostNested - 1) << "as deep as readers follow, with the group around them";
  EXPECT_EQ(back.totals.kept + back.totals.lost, rows.at());
}

TEST_P(Recovering, NodesThatHaveLostAllGroupsGetOne)
{
  rows.fill(23, 0x5A);
  number();
  number();
  const Recovered back(rows.bytes, form);
  EXPECT_EQ(back.totals.made, 1U);
  EXPECT_EQ(back.totals.closed, 0U);
  EXPECT_EQ(back.totals.nodes, 2U);
  EXPECT_EQ(back.stream.size(), 16U + 40U);
  EXPECT_EQ(back.totals.lost, 23U);
}

TEST_P(Recovering, ARootThatLosesAllStaysOpenForWhatFollows)
{
  rows.h64(23, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM).fill(23, 0x5A);
  rows.h64(20, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_HOST);
  number();
  // A root of size 0 would read as one that was never closed, so that it gets what comes behind it.
  ByteRows expected(GetParam());
  expected.h64(36, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM).h64(20, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_HOST);
  expected.h64(4, 0, TAV_TYPE_UINT32, TAV_ELM_CMN_CPU_ONLINE).number(9, 4);
  const Recovered back(rows.bytes, form);
  EXPECT_EQ(back.stream, expected.bytes);
  EXPECT_EQ(back.totals.lost, 23U);
  EXPECT_EQ(back.totals.nodes, 3U);
  EXPECT_EQ(back.totals.closed, 1U);
}

TEST_P(Recovering, GroupsThatTheEndOfAnotherClosesAreCountedOnceWhereTheyWereOpen)
{
  for (const uint64_t size : {uint64_t{20}, uint64_t{TAV_SIZE_UNKNOWN}})
  {
    ByteRows stream(GetParam());
    stream.h64(16 + 20 + 32, TAV_INFO_EYE_SIZE, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM);
    stream.h64(size, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_HOST);
    stream.h64(4, 0, TAV_TYPE_UINT32, TAV_ELM_CMN_CPU_ONLINE).number(9, 4);
    stream.end64(16 + 16 + 20 + 16);
    const Recovered back(stream.bytes, form);
    EXPECT_EQ(back.totals.closed, size == 20 ? 0U : 1U);
    EXPECT_EQ(back.totals.nodes, 3U);
    EXPECT_EQ(back.totals.lost, 0U);
    ByteRows expected(GetParam());
    expected.h64(16 + 20 + 32, TAV_INFO_EYE_SIZE, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM);
    expected.h64(20, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_HOST);
    expected.h64(4, 0, TAV_TYPE_UINT32, TAV_ELM_CMN_CPU_ONLINE).number(9, 4);
    expected.end64(16 + 16 + 20 + 16);
    EXPECT_EQ(back.stream, expected.bytes);
  }
}

TEST_P(Recovering, AGroupThatIsConfirmedStretchesTheOneAroundIt)
{
  const auto stream = [this](uint64_t size) {
    rows = ByteRows(GetParam());
    rows.h64(size, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM);
    rows.h64(72, TAV_INFO_EYE_SIZE, TAV_TYPE_HEADER64, TAV_ELM_CMN_HOST);
    number();
    number();
    return rows.end64(72).bytes;
  };
  const Bytes whole = stream(88);
  for (const uint64_t size : {uint64_t{36}, uint64_t{30}}) // behind the first number, and in it
  {
    const Recovered back(stream(size), form);
    EXPECT_EQ(back.stream, whole) << size;
    EXPECT_TRUE(back.losses.empty()) << size;
    EXPECT_EQ(back.totals.nodes, 4U);
    EXPECT_EQ(back.totals.closed, 1U) << "one of the two sizes was wrong";
  }
}

TEST_P(Recovering, ADamagedPairIsMadeAnew)
{
  rows.h64(72, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM);
  rows.h64(4, TAV_INFO_EYE_SIZE, TAV_TYPE_UINT32, TAV_ELM_CMN_CPU_ONLINE).number(9, 4);
  const uint64_t pair = rows.at();
  rows.pair(20);
  rows.h64(4, TAV_INFO_EYE_SIZE, TAV_TYPE_UINT32, TAV_ELM_CMN_CPU_ONLINE).number(9, 4).pair(20);
  Bytes damaged = rows.bytes;
  damaged[pair] ^= 0x40; // in the eye catcher
  const Recovered back(damaged, form);
  EXPECT_EQ(back.stream, rows.bytes);
  EXPECT_EQ(back.totals.pairs, 1U);
  EXPECT_EQ(back.totals.lost, 16U);
}

TEST_P(Recovering, ZerosBehindTheStreamAreKeptInTheAccountAndNotWritten)
{
  rows.h64(20, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM);
  number();
  const Bytes whole = rows.bytes;
  rows.fill(100);
  const Recovered back(rows.bytes, form);
  EXPECT_EQ(back.stream, whole);
  EXPECT_EQ(back.totals.zeros, 100U);
  EXPECT_EQ(back.totals.kept, rows.at());
  EXPECT_TRUE(back.losses.empty());
}

TEST_P(Recovering, WhatIsNotSearchedIsUnread)
{
  rows.h64(20, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM);
  number();
  rows.fill(50'000, 0x5A);
  number();
  number();
  const Recovered back(rows.bytes, form, 1000);
  EXPECT_GT(back.totals.unread, 0U);
  EXPECT_EQ(back.totals.nodes, 2U);
  EXPECT_EQ(back.totals.kept + back.totals.lost + back.totals.unread, rows.at());
}

TEST_P(Recovering, ANodeOfAnUnknownTypeGoesAlone)
{
  rows.h64(64, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM);
  number();
  rows.h64(8, 0, 77, TAV_ELM_CMN_CPU_ONLINE).fill(8, 0x5A);
  number();
  const Recovered back(rows.bytes, form);
  ASSERT_EQ(back.losses.size(), 1U);
  EXPECT_EQ(back.losses[0].offset, 36U);
  EXPECT_EQ(back.losses[0].length, 24U);
  EXPECT_EQ(back.losses[0].reason, "a node of an unknown type");
  EXPECT_EQ(back.totals.nodes, 3U);
}

TEST_P(Recovering, SaysWhichNodesBesideLostBytesMayBeNone)
{
  rows.h64(56 + 19, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM);
  number();
  rows.h64(4, TAV_INFO_EYE_SIZE, TAV_TYPE_UINT32, 12345).number(9, 4).pair(20); // an element that nobody knows
  rows.fill(19, 0x5A);
  const Recovered back(rows.bytes, form);
  ASSERT_EQ(back.doubts.size(), 1U);
  EXPECT_EQ(back.doubts[0].offset, 36U);
  EXPECT_EQ(back.doubts[0].length, 20U);
  EXPECT_EQ(back.totals.doubts, 1U);
}

TEST_P(Recovering, DoubtsNoNodeBehindOneThatCameBack)
{
  rows.h64(19 + 20 + 36, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM).fill(19, 0x5A);
  number();
  rows.h64(4, TAV_INFO_EYE_SIZE, TAV_TYPE_UINT32, 12345).number(9, 4).pair(20); // an element that nobody knows
  const Recovered back(rows.bytes, form);
  EXPECT_EQ(back.totals.nodes, 3U);
  EXPECT_EQ(back.totals.lost, 19U);
  EXPECT_TRUE(back.doubts.empty());
}

TEST_P(Recovering, DoubtsNoNodeBehindAnEndElement)
{
  rows.h64(19 + 16 + 16 + 36, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM);
  const uint64_t group = rows.at();
  rows.h64(19 + 32, TAV_INFO_EYE_SIZE, TAV_TYPE_HEADER64, TAV_ELM_CMN_HOST).fill(19, 0x5A);
  rows.end64(rows.at() + 16 - group);
  rows.h64(4, TAV_INFO_EYE_SIZE, TAV_TYPE_UINT32, 12345).number(9, 4).pair(20); // an element that nobody knows
  const Recovered back(rows.bytes, form);
  EXPECT_EQ(back.totals.lost, 19U);
  EXPECT_EQ(back.totals.nodes, 3U);
  EXPECT_TRUE(back.doubts.empty());
}

TEST_P(Recovering, NodesOfGroupsThatAreTooDeepComeBackInTheDeepestThatIsNot)
{
  constexpr uint64_t kGroups = kMostNested + 3;
  for (uint64_t i = 0; i < kGroups; ++i)
  {
    rows.h64((kGroups - 1 - i) * 48 + 36 + 32, TAV_INFO_EYE_SIZE, TAV_TYPE_HEADER64, TAV_ELM_CMN_HOST);
  }
  rows.h64(4, TAV_INFO_EYE_SIZE, TAV_TYPE_UINT32, 12345).number(9, 4).pair(20); // an element that nobody knows
  for (uint64_t i = kGroups; i-- > 0;)
  {
    rows.end64(rows.at() + 16 - 16 * i);
  }
  const Recovered back(rows.bytes, form);
  EXPECT_EQ(back.totals.nodes, kMostNested + 1);
  EXPECT_EQ(back.totals.ends, kMostNested);
  EXPECT_EQ(back.totals.closed + back.totals.made + back.totals.pairs, 0U);
  EXPECT_EQ(back.stream.size(), 48 * kMostNested + 36);
  ASSERT_EQ(back.losses.size(), 6U);
  EXPECT_EQ(back.totals.lost, 3U * 48);
  for (uint64_t i = 0; i < 3; ++i)
  {
    EXPECT_EQ(back.losses[i].offset, 16 * (kMostNested + i));
    EXPECT_EQ(back.losses[i].length, 16U);
    EXPECT_EQ(back.losses[i].reason,
              "of a group nested more than 4000 deep; nodes in it go to the group around it");
    EXPECT_EQ(back.losses[3 + i].offset, 16 * kGroups + 36 + 32 * i);
    EXPECT_EQ(back.losses[3 + i].length, 32U);
  }
  EXPECT_EQ(back.doubts.size(), 1U) << "lost bytes follow the node whose element nobody knows";
}

TEST_P(Recovering, OfAnEndElementWithADamagedPairThePairAloneIsLost)
{
  rows.h64(52, TAV_INFO_EYE_SIZE, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM);
  number();
  const uint64_t end = rows.at();
  rows.end64(52);
  Bytes damaged = rows.bytes;
  damaged[end + 16] ^= 0x40; // in the eye catcher
  const Recovered back(damaged, form);
  EXPECT_EQ(back.stream, rows.bytes);
  ASSERT_EQ(back.losses.size(), 1U);
  EXPECT_EQ(back.losses[0].offset, end + 16);
  EXPECT_EQ(back.losses[0].length, 16U);
  EXPECT_EQ(back.totals.kept, end + 16);
  EXPECT_EQ(back.totals.pairs, 1U);
}

TEST_P(Recovering, TheTwoBytesBehindATextComeBackWithIt)
{
  rows.h64(16 + 5 + 2 + 40, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM);
  rows.h64(5, 0, TAV_TYPE_UTF8_STRING, TAV_ELM_CMN_HOST_NAME).number(65001, 2).fill(3, 'a').fill(2, 0x11);
  number();
  number();
  const Recovered back(rows.bytes, form);
  EXPECT_EQ(back.stream, rows.bytes);
  EXPECT_EQ(back.totals.kept, rows.at());
}

TEST(Recovery, TellsOfLossesInTheirOrder)
{
  size_t losses = 0;
  for (uint64_t seed = 0; seed < 300; ++seed)
  {
    SCOPED_TRACE(seed);
    const Bytes bytes = test::damaged(test::namedStream(seed), seed);
    const Recovered back(bytes, {});
    uint64_t end = 0;
    uint64_t lost = 0;
    for (const Loss& loss : back.losses)
    {
      EXPECT_GE(loss.offset, end);
      EXPECT_GT(loss.length, 0U);
      EXPECT_FALSE(loss.reason.empty());
      end = loss.offset + loss.length;
      lost += loss.length;
    }
    EXPECT_EQ(lost, back.totals.lost);
    EXPECT_EQ(back.losses.size(), back.totals.losses);
    EXPECT_EQ(back.totals.kept + lost, bytes.size());
    losses += back.losses.size();
  }
  EXPECT_GT(losses, 100U);
}

TEST(Recover, BringsASoundStreamBackByteForByte)
{
  for (uint64_t seed = 0; seed < 200; ++seed)
  {
    SCOPED_TRACE(seed);
    const tav::inspect::Form form{.swapped = seed % 2 == 0, .aligned = seed % 4 < 2};
    const Bytes bytes = test::namedStream(seed, form.swapped, form.aligned);
    ByteSource source("x", std::span<const uint8_t>(bytes));
    test::Made made;
    const RecoveryTotals totals = recover(source, form, made.file());
    EXPECT_EQ(totals.lost + totals.unread, 0U);
    EXPECT_EQ(totals.kept, bytes.size());
    EXPECT_TRUE(made.bytes() == bytes);
  }
}

/// Where a page was not full, zeros stand between streams; they are no damage, and roots stay roots.
TEST(Recover, BringsStreamsBackThatZerosPart)
{
  for (uint64_t seed = 0; seed < 60; ++seed)
  {
    SCOPED_TRACE(seed);
    const tav::inspect::Form form{.swapped = seed % 2 == 0, .aligned = seed % 4 < 2};
    Bytes bytes;
    Bytes streams;
    uint64_t zeros = 0;
    for (const size_t gap : {size_t{16}, size_t{100}, 16 + static_cast<size_t>(seed) * 97, size_t{0}})
    {
      const Bytes stream = test::namedStream(seed + gap, form.swapped, form.aligned);
      bytes.insert(bytes.end(), stream.begin(), stream.end());
      bytes.resize(bytes.size() + gap);
      streams.insert(streams.end(), stream.begin(), stream.end());
      zeros += gap;
    }
    ByteSource source("x", std::span<const uint8_t>(bytes));
    test::Made made;
    const RecoveryTotals totals = recover(source, form, made.file());
    EXPECT_EQ(totals.kept, bytes.size());
    EXPECT_EQ(totals.zeros, zeros);
    EXPECT_EQ(totals.closed + totals.made, 0U);
    EXPECT_TRUE(made.bytes() == streams);
  }
}

/// Fewer bytes than a header has hide no root: what is behind them is one.
TEST(Recover, BringsStreamsBackThatAFewBytesPart)
{
  for (uint64_t seed = 0; seed < 60; ++seed)
  {
    SCOPED_TRACE(seed);
    const Bytes first = test::namedStream(seed);
    const Bytes second = test::namedStream(seed + 1000);
    Bytes streams = first;
    streams.insert(streams.end(), second.begin(), second.end());
    Bytes bytes = first;
    bytes.resize(bytes.size() + 1 + seed % 7, 'x');
    bytes.insert(bytes.end(), second.begin(), second.end());
    ByteSource source("x", std::span<const uint8_t>(bytes));
    test::Made made;
    const RecoveryTotals totals = recover(source, {}, made.file());
    EXPECT_EQ(totals.lost, 1 + seed % 7);
    EXPECT_EQ(totals.closed + totals.made, 0U);
    EXPECT_TRUE(made.bytes() == streams);
  }
}

TEST(Recover, AccountsForEveryByteAndLeavesASoundStream)
{
  const auto structure = [](RuleId id) {
    return id == RuleId::damaged || id == RuleId::pastParent || id == RuleId::pastFile || id == RuleId::headerCut ||
           id == RuleId::groupOpen || id == RuleId::groupSize || id == RuleId::behindStream;
  };
  for (uint64_t seed = 0; seed < 600; ++seed)
  {
    SCOPED_TRACE(seed);
    const test::Tree tree = test::randomTree(seed);
    const Bytes bytes = test::damaged(test::bytesOfTree(tree), seed);
    const tav::inspect::Form form = test::readForm(tree.form);
    ByteSource source("x", std::span<const uint8_t>(bytes));
    test::Made made;
    uint64_t lost = 0;
    const RecoveryTotals totals =
        recover(source, form, made.file(), {.lost = [&](const Loss& loss) { lost += loss.length; }});
    EXPECT_EQ(totals.kept + totals.lost + totals.unread, bytes.size());
    EXPECT_EQ(totals.lost, lost);
    const Bytes sound = made.bytes();
    ByteSource result("y", std::span<const uint8_t>(sound));
    Checker checker(result, form, structure, [](const Finding& finding) {
      ADD_FAILURE() << ruleOf(finding.rule).id << " at " << finding.offset << ": " << finding.sentence;
    });
    while (checker.step())
    {
    }
  }
}

TEST(Recover, ClosesAGroupThatWasLeftOpen)
{
  Bytes bytes = hostStream();
  std::fill_n(bytes.begin(), 8, uint8_t{0xFF}); // the root's size
  ByteSource source("x", std::span<const uint8_t>(bytes));
  test::Made made;
  const RecoveryTotals totals = recover(source, {}, made.file());
  EXPECT_EQ(totals.closed, 1U);
  EXPECT_EQ(totals.nodes, 4U);
  EXPECT_EQ(made.bytes(), hostStream());
}
