// Recovery where the form is in doubt: which of the ways is taken, and what is said of the others.
#include <vector>

#include <gmock/gmock.h>

#include "inspect/recover/endings.h"
#include "inspect/streams.h"
#include "support/byteRows.h"

using namespace tav::inspect;
using test::ByteRows;
using test::Bytes;

namespace
{

/// What comes of a recovery that chooses the form.
struct Chosen
{
  Chosen(const Bytes& bytes, const Recognition& found, RecoverBestOptions options = {})
  {
    ByteSource source("x", std::span<const uint8_t>(bytes));
    test::Made made;
    options.makeFile = [this] {
      ++files;
      return makeScratch();
    };
    outcome = recoverBest(source, found, made.file(), options);
    stream = made.bytes();
  }

  Outcome outcome;
  Bytes stream;
  size_t files = 0; ///< one for each form that was tried where there were several
};

bool same(const Form& a, const Form& b)
{
  return a.swapped == b.swapped && a.root64 == b.root64 && a.aligned == b.aligned;
}

} // namespace

/// In this machine's byte order and in the other one.
class RecoveringBest : public testing::TestWithParam<bool>
{
protected:
  tav::inspect::Form form{.swapped = GetParam()};
  tav::inspect::Form otherOrder{.swapped = !GetParam()};
  tav::inspect::Form padded{.swapped = GetParam(), .aligned = true};

  /// A root of `count` numbers whose header is `lost` where asked; `size` bytes each.
  Bytes numbers(unsigned count, bool lost, uint64_t size = 4)
  {
    const uint16_t type = size == 4 ? TAV_TYPE_UINT32 : TAV_TYPE_UINT64;
    ByteRows rows(GetParam());
    rows.h64(count * (16 + size), 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM);
    for (unsigned i = 0; i < count; ++i)
    {
      rows.h64(size, 0, type, TAV_ELM_CMN_CPU_ONLINE).number(9, static_cast<unsigned>(size));
    }
    if (lost)
    {
      std::fill_n(rows.bytes.begin(), 16, uint8_t{0x5A});
    }
    return rows.bytes;
  }
};

INSTANTIATE_TEST_SUITE_P(Swapped, RecoveringBest, testing::Bool());

TEST_P(RecoveringBest, ASoundStreamIsReadInItsFormAlone)
{
  const Bytes bytes = numbers(5, false);
  ByteSource source("x", std::span<const uint8_t>(bytes));
  const Chosen it(bytes, recognise(source));
  EXPECT_TRUE(same(it.outcome.taken.form, form));
  EXPECT_FALSE(it.outcome.other);
  EXPECT_TRUE(it.outcome.taken.lostNothing());
  EXPECT_EQ(it.outcome.taken.bytes, bytes.size());
  EXPECT_EQ(it.outcome.taken.written, bytes.size());
  EXPECT_EQ(it.stream, bytes);
}

TEST_P(RecoveringBest, WhereTheStartIsLostTheFormThatKeepsMostIsTaken)
{
  const Bytes bytes = numbers(20, true);
  ByteSource source("x", std::span<const uint8_t>(bytes));
  const Recognition found = recognise(source);
  ASSERT_TRUE(found.damagedStart);
  const Chosen it(bytes, found);
  EXPECT_TRUE(same(it.outcome.taken.form, form));
  EXPECT_EQ(it.outcome.taken.totals.nodes, 20U);
  EXPECT_EQ(it.outcome.taken.totals.lost, 16U);
  EXPECT_EQ(it.stream.size(), it.outcome.taken.written);
  EXPECT_EQ(Bytes(it.stream.end() - 400, it.stream.end()), Bytes(bytes.end() - 400, bytes.end()));
}

TEST_P(RecoveringBest, TheOrderOfTheWaysDoesNotChangeWhichIsTaken)
{
  const Bytes bytes = numbers(6, true);
  for (const bool rightFirst : {true, false})
  {
    Recognition found;
    found.form = form;
    found.isStream = rightFirst; // then it goes first, wherever it stands among the possible ones
    found.possible = {otherOrder, form};
    const Chosen it(bytes, found);
    EXPECT_EQ(it.files, 2U);
    EXPECT_TRUE(same(it.outcome.taken.form, form));
    ASSERT_TRUE(it.outcome.other);
    EXPECT_TRUE(same(it.outcome.other->form, otherOrder));
    EXPECT_LT(it.outcome.other->totals.nodes, 6U);
    EXPECT_EQ(it.stream.size(), 16U + 120U);
  }
}

TEST_P(RecoveringBest, NothingElseIsTriedWhereNothingIsLost)
{
  const Bytes bytes = numbers(6, false);
  Recognition found;
  found.form = form;
  found.isStream = true;
  found.possible = {otherOrder, form};
  const Chosen it(bytes, found);
  EXPECT_EQ(it.files, 1U);
  EXPECT_FALSE(it.outcome.other);
  EXPECT_EQ(it.stream, bytes);
}

TEST_P(RecoveringBest, WhereNoFormIsGivenTheRecognisedOneIsUsed)
{
  const Bytes bytes = numbers(3, true);
  Recognition found;
  found.form = form;
  const Chosen it(bytes, found);
  EXPECT_TRUE(same(it.outcome.taken.form, form));
  EXPECT_EQ(it.outcome.taken.totals.nodes, 3U);
  EXPECT_EQ(it.files, 0U);
}

TEST_P(RecoveringBest, AWayThatFindsTheSameIsNotToldOf)
{
  const Bytes bytes = numbers(6, true, 8); // which no padding follows
  Recognition found;
  found.form = form;
  found.possible = {form, padded, otherOrder};
  const Chosen it(bytes, found);
  EXPECT_TRUE(same(it.outcome.taken.form, form));
  ASSERT_TRUE(it.outcome.other);
  EXPECT_TRUE(same(it.outcome.other->form, otherOrder));
}

TEST_P(RecoveringBest, AnotherByteOrderIsToldOfRatherThanAnotherPadding)
{
  const Bytes bytes = numbers(9, true); // of four bytes each, which padding would follow
  for (const bool paddedFirst : {true, false})
  {
    Recognition found;
    found.form = form;
    found.possible = paddedFirst ? std::vector<tav::inspect::Form>{form, padded, otherOrder}
                                 : std::vector<tav::inspect::Form>{form, otherOrder, padded};
    const Chosen it(bytes, found);
    EXPECT_TRUE(same(it.outcome.taken.form, form));
    ASSERT_TRUE(it.outcome.other);
    EXPECT_TRUE(same(it.outcome.other->form, otherOrder));
  }
}

TEST_P(RecoveringBest, ListsAsManyLossesAsAskedAndCountsAll)
{
  Bytes bytes = numbers(4, true);
  for (int i = 0; i < 3; ++i)
  {
    const Bytes more = numbers(4, true);
    bytes.insert(bytes.end(), more.begin(), more.end());
  }
  for (const size_t listed : {size_t{0}, size_t{2}, size_t{1000}})
  {
    Recognition found;
    found.form = form;
    std::vector<uint64_t> places;
    const Chosen it(bytes, found, {.listed = listed, .progress = [&](uint64_t at) { places.push_back(at); }});
    EXPECT_EQ(it.outcome.taken.totals.losses, 4U);
    EXPECT_EQ(it.outcome.taken.losses.size(), std::min<size_t>(listed, 4));
    EXPECT_EQ(it.outcome.taken.totals.lost, 64U);
    ASSERT_FALSE(places.empty());
    EXPECT_TRUE(std::is_sorted(places.begin(), places.end()));
    EXPECT_LE(places.back(), bytes.size());
  }
}

namespace
{

/// The one is taken before the other, and not the other way round.
void expectMore(const Account& one, const Account& other)
{
  EXPECT_TRUE(one.keepsMoreThan(other));
  EXPECT_FALSE(other.keepsMoreThan(one));
}

} // namespace

TEST(RecoveryAccount, OfWaysThatDifferInThePaddingTheOneWithMoreNodesAndFewerGapsKeepsMore)
{
  Account plain{.totals = {.kept = 10, .nodes = 9, .losses = 3}};
  Account padded{.form = {.aligned = true}, .totals = {.kept = 1000, .nodes = 8, .losses = 3}};
  expectMore(plain, padded); // whatever the bytes are
  padded.totals.losses = 1;
  expectMore(padded, plain);
  padded.totals.losses = 2;
  EXPECT_FALSE(plain.keepsMoreThan(padded));
  EXPECT_FALSE(padded.keepsMoreThan(plain));
}

TEST(RecoveryAccount, OfOthersTheOneWithMoreNodesAndBytesAndOfEqualsTheOneWithFewerMadeGroups)
{
  for (const tav::inspect::Form& form : {tav::inspect::Form{.swapped = true}, tav::inspect::Form{.root64 = false}})
  {
    Account one{.totals = {.kept = 100, .nodes = 6, .made = 2}};
    Account other{.form = form, .totals = {.kept = 50, .nodes = 11, .made = 1}};
    expectMore(one, other);
    other.totals.nodes = 12;
    expectMore(other, one);
    other.totals.nodes = 13;
    expectMore(other, one);
    other.totals = one.totals;
    EXPECT_FALSE(one.keepsMoreThan(other));
    EXPECT_FALSE(other.keepsMoreThan(one));
  }
}

TEST(RecoveryAccount, IsLikeAnotherThatKeepsAsMuchInAsManyNodesWithAsManyGaps)
{
  const Account one{.totals = {.kept = 100, .nodes = 6, .losses = 3}, .written = 90};
  const Account same{.form = {.swapped = true}, .totals = one.totals, .written = 90};
  EXPECT_TRUE(one.isLike(same));
  Account other = one;
  ++other.written;
  EXPECT_FALSE(one.isLike(other));
  for (uint64_t RecoveryTotals::*const part : {&RecoveryTotals::kept, &RecoveryTotals::nodes, &RecoveryTotals::losses})
  {
    other = one;
    ++(other.totals.*part);
    EXPECT_FALSE(one.isLike(other));
  }
}

/// End elements at and across the borders of the stretches that threads take.
TEST_P(RecoveringBest, EndElementsAreTheSameByAnyNumberOfThreads)
{
  constexpr uint64_t kStretch = 64 * ByteSource::kPage;
  ByteRows rows(GetParam());
  rows.fill(64, 0x5A);
  // So far before a border that the eye catcher is there, across it, or behind it.
  for (const uint64_t before : {uint64_t{24}, uint64_t{17}, uint64_t{16}, uint64_t{9}, uint64_t{0}})
  {
    const uint64_t border = (rows.at() / kStretch + 1) * kStretch;
    rows.fill(border - before - rows.at(), 0x5A);
    rows.end64(rows.at() + 16 - before); // groups that begin at places of their own
  }
  ByteSource source("x", std::span<const uint8_t>(rows.bytes));
  const std::vector<Ending> alone = findEndings(source, form, 0);
  ASSERT_EQ(alone.size(), 5U);
  for (const unsigned threads : {2U, 3U})
  {
    const std::vector<Ending> together = findEndings(source, form, 0, threads);
    ASSERT_EQ(together.size(), alone.size());
    for (size_t i = 0; i < alone.size(); ++i)
    {
      EXPECT_EQ(together[i].start, alone[i].start);
      EXPECT_EQ(together[i].end, alone[i].end);
      EXPECT_EQ(together[i].wide, alone[i].wide);
    }
  }
  EXPECT_EQ(findEndings(source, form, 10, 2).size(), 3U); // groups that begin at 16, 17 and 24
  EXPECT_TRUE(findEndings(source, {.swapped = GetParam(), .root64 = false}, 0, 2).empty());
}
