/// End elements: what a damaged stream's groups are found by when their headers are lost.
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "inspect/judged.h"
#include "inspect/recover/endings.h"

using namespace tav::inspect;
using test::ByteRows;
using test::Bytes;

namespace
{

constexpr uint32_t kEye = TAV_INFO_EYE_SIZE;

/// What an end element says that is read with this limit.
struct Read
{
  Read(const Bytes& bytes, const tav::inspect::Form& form, uint64_t offset, bool wide, uint64_t limit)
  {
    ByteSource source("x", std::span<const uint8_t>(bytes));
    there = readEnding(source, form, offset, wide, limit, ending);
  }

  bool there = false;
  Ending ending;
};

} // namespace

class EndingOfAGroup : public test::BothOrders
{
protected:
  /// A group of one number from 0 to 36, and an end element with this distance up to 68.
  Bytes group(uint64_t distance, uint64_t size = 52, uint32_t info = kEye, uint16_t type = TAV_TYPE_HEADER64)
  {
    rows = ByteRows(GetParam());
    rows.h64(size, info, type, TAV_ELM_CMN_SYSTEM);
    number();
    return rows.end64(distance).bytes;
  }
};

INSTANTIATE_TEST_SUITE_P(Swapped, EndingOfAGroup, testing::Bool());

TEST_P(EndingOfAGroup, LeadsBackToItsHeader)
{
  const Read read(group(52), form, 36, true, 68);
  ASSERT_TRUE(read.there);
  EXPECT_EQ(read.ending.start, 0U);
  EXPECT_EQ(read.ending.end, 68U);
  EXPECT_TRUE(read.ending.wide);
}

TEST_P(EndingOfAGroup, OfChildrenWithHeadersOf32BitsHasADistanceThatIs8Short)
{
  rows.h64(36, kEye, TAV_TYPE_HEADER32, TAV_ELM_CMN_SYSTEM);
  rows.h32(4, TAV_TYPE_UINT32, TAV_ELM_CMN_CPU_ONLINE).number(9, 4);
  rows.h32(16, TAV_TYPE_BINARY, TAV_ELM_CMN_END_HDR_EYE_SIZE).pair(28);
  const Read read(rows.bytes, form, 28, false, 52);
  ASSERT_TRUE(read.there);
  EXPECT_EQ(read.ending.start, 0U);
  EXPECT_EQ(read.ending.end, 52U);
  EXPECT_FALSE(read.ending.wide);
}

TEST_P(EndingOfAGroup, BeginsBehindAWholeHeaderOfTheGroup)
{
  EXPECT_FALSE(Read(group(53), form, 36, true, 68).there) << "before the file";
  EXPECT_TRUE(Read(group(32), form, 36, true, 68).there) << "an empty group";
  EXPECT_FALSE(Read(group(31), form, 36, true, 68).there);
}

TEST_P(EndingOfAGroup, LiesWholeBeforeTheLimit)
{
  EXPECT_TRUE(Read(group(52), form, 36, true, 69).there);
  for (const uint64_t limit : {uint64_t{67}, uint64_t{36}, uint64_t{35}, uint64_t{0}})
  {
    EXPECT_FALSE(Read(group(52), form, 36, true, limit).there) << limit;
  }
}

TEST_P(EndingOfAGroup, IsNoneWhenAnyOfItsFieldsIsDamaged)
{
  for (const uint64_t field : {36U, 36U + 12, 36U + 14, 52U}) // size, type, element, eye catcher
  {
    Bytes bytes = group(52);
    bytes[field] ^= 0x10;
    EXPECT_FALSE(Read(bytes, form, 36, true, 68).there) << field;
  }
}

TEST_P(EndingOfAGroup, IsOfUseWhereTheHeaderSaysSomethingElse)
{
  const auto agrees = [this](const Bytes& bytes) {
    ByteSource source("x", std::span<const uint8_t>(bytes));
    EXPECT_EQ(findEndings(source, form, 0).size(), headerAgrees(source, form, {0, 68, true}) ? 0U : 1U);
    EXPECT_TRUE(findEndings(source, form, 1).empty()) << "the group begins before";
    return headerAgrees(source, form, {0, 68, true});
  };
  EXPECT_TRUE(agrees(group(52)));
  EXPECT_TRUE(agrees(group(52, TAV_SIZE_UNKNOWN)));
  EXPECT_FALSE(agrees(group(52, 51)));
  EXPECT_FALSE(agrees(group(52, 52, 0)));
  EXPECT_FALSE(agrees(group(52, 52, kEye, TAV_TYPE_HEADER32)));
  EXPECT_FALSE(agrees(group(52, 52, kEye, TAV_TYPE_BINARY)));
}

TEST(EndingsOfGroups, AreKeptUpToAMostByAnyNumberOfThreads)
{
  ByteRows rows;
  constexpr uint64_t kMost = uint64_t{256} * 1024;
  rows.fill(16, 0x5A);
  for (uint64_t i = 0; i < kMost + 5; ++i)
  {
    rows.end64(32); // of an empty group, whose header is the pair before
  }
  ByteSource source("x", std::span<const uint8_t>(rows.bytes));
  for (const unsigned threads : {1U, 2U})
  {
    const std::vector<Ending> found = findEndings(source, {}, 0, threads);
    ASSERT_EQ(found.size(), kMost);
    EXPECT_EQ(found.front().start, 0U);
    EXPECT_EQ(found.back().start, 32 * (kMost - 1));
  }
}

TEST_P(EndingOfAGroup, ComesBehindThatOfALongerOneFromTheSamePlace)
{
  rows.fill(40, 0x5A);
  rows.end64(40);      // from 16 on
  rows.end64(72);      // likewise
  rows.end64(104 - 8); // from 24 on
  ByteSource source("x", std::span<const uint8_t>(rows.bytes));
  const std::vector<Ending> found = findEndings(source, form, 0);
  ASSERT_EQ(found.size(), 3U);
  EXPECT_EQ(found[0].start, 16U);
  EXPECT_EQ(found[0].end, 104U);
  EXPECT_EQ(found[1].start, 16U);
  EXPECT_EQ(found[1].end, 72U);
  EXPECT_EQ(found[2].start, 24U);
  EXPECT_EQ(found[2].end, 136U);
}
