/// The sibling of a group that was never closed.
#include <algorithm>
#include <cstdint>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "support/byteRows.h"
#include "support/nextChild.h"
#include "support/streams.h"
#include "support/traceLog.h"
#include "tav/probes.h"
#include "tav/tav.h"

namespace
{

using namespace tav;
using namespace test;

/// Root, an open group with an element that has a pair, the open group's end, and a sibling at 128.
class AfterOpenGroup : public NextChildTest
{
protected:
  AfterOpenGroup()
  {
    rows.h64(TAV_SIZE_UNKNOWN, 0, TAV_TYPE_HEADER64, 1);
    rows.h64(TAV_SIZE_UNKNOWN, TAV_INFO_EYE_SIZE, TAV_TYPE_HEADER64, 2);       // 16
    rows.h64(8, TAV_INFO_EYE_SIZE, TAV_TYPE_UINT64, 3).fill(8, 0x11).pair(24); // 32
    rows.end64(72);                                                            // 72, eye at 88
    rows.h64(4, 0, TAV_TYPE_UINT32, 4).fill(4, 0x22).fill(3);                  // 104
  }
  TAVHeader root = header64(TAV_SIZE_UNKNOWN, TAV_TYPE_HEADER64, 1);
  TAVHeader group = header64(TAV_SIZE_UNKNOWN, TAV_TYPE_HEADER64, 2, TAV_INFO_EYE_SIZE, 16);
};

TEST_P(AfterOpenGroup, TheSiblingStandsBehindThePairThatLeadsBackToIt)
{
  ASSERT_EQ(next(&root, &group), TAV_RC_OK);
  EXPECT_EQ(offset(), 104U);
  EXPECT_EQ(out.header.hdr64.elm, 4U);
  EXPECT_EQ(payloadOf(out, 4), hex("22 22 22 22"));
}

TEST_P(AfterOpenGroup, TheSiblingIsFoundFromTheEyeCatcherOn)
{
  ASSERT_EQ(next(&root, &group), TAV_RC_OK);
  EXPECT_EQ(trace.dump(probe::findNodeFromIndex, 0).items.at(0), bytesOf(uint64_t{4}));
  EXPECT_EQ(trace.dump(probe::findNodeFromIndex, 0).items.at(2), bytesOf(uint64_t{88}));
  EXPECT_EQ(trace.dump(probe::findNodeFromIndex, 0).items.at(3), bytesOf(uint64_t{0}));
}

TEST_P(AfterOpenGroup, TheScanBeginsAtTheGroup)
{
  ASSERT_EQ(next(&root, &group), TAV_RC_OK);
  const Record scan = trace.dump(probe::findEyeSizeCombo, 0);
  EXPECT_EQ(scan.items.at(1), bytesOf(uint64_t{16}));
  EXPECT_EQ(scan.items.at(3), bytesOf(true));
}

TEST_P(AfterOpenGroup, TheScanIsLimitedByTheParentsSizeAndNotByItsEnd)
{
  struct Limit
  {
    uint64_t size;
    uint64_t parentOffset;
    uint32_t rc;
  };
  // The eye catcher ends at 96. The limit is the size less the offset where the scan begins, at 16.
  const Limit limits[] = {
      {96, 0, TAV_RC_OK},
      {95, 0, TAV_RC_NOT_FOUND},
      {112, 8, TAV_RC_OK},
      {15, 0, TAV_RC_OK},
      {16, 0, TAV_RC_OK},
  };
  for (const Limit& limit : limits)
  {
    TAVHeader parent = header64(limit.size, TAV_TYPE_HEADER64, 1, 0, limit.parentOffset);
    EXPECT_EQ(next(&parent, &group), limit.rc) << limit.size;
  }
}

TEST_P(AfterOpenGroup, NeitherFormNorPlaceNorIdOfTheReferenceIsChecked)
{
  TAVHeader narrowParent = header64(TAV_SIZE_UNKNOWN, TAV_TYPE_HEADER32, 1, 0, 5000);
  group.hdr64.elm = TAV_ELM_CMN_END_HDR_EYE_SIZE;
  EXPECT_EQ(next(&narrowParent, &group), TAV_RC_OK);
  EXPECT_EQ(offset(), 104U);
}

TEST_P(AfterOpenGroup, AGroupOfAnotherSizeIsNotTheReference)
{
  rows.bytes[16] = 1; // the low byte, or the high one: no longer all ones
  EXPECT_NE(next(&root, &group), TAV_RC_OK);
}

TEST_P(AfterOpenGroup, APairThatLeadsBeforeTheStreamEndsTheStep)
{
  rows.bytes[88 + 8 + (GetParam().swap != kBigEndianHost ? 0 : 7)] = 0x10;
  EXPECT_EQ(next(&root, &group), TAV_RC_NO_MEMORY);
  EXPECT_EQ(failures(), one(60, TAV_RC_NO_MEMORY));
}

TEST_P(AfterOpenGroup, ANodeThatCannotBeReadEndsTheStep)
{
  // the size of the element that the first pair leads to
  rows.bytes[32 + (GetParam().swap != kBigEndianHost ? 0 : 7)] = 0x10;
  EXPECT_EQ(next(&root, &group), TAV_RC_DATA_TOO_LARGE);
  EXPECT_EQ(failures(), one(60, TAV_RC_DATA_TOO_LARGE));
}

TEST_P(AfterOpenGroup, AScanThatFindsNoPairEndsTheStep)
{
  rows.bytes.resize(72);
  const uint32_t expected = GetParam().buffered ? TAV_RC_END_OF_STORAGE : TAV_RC_NOT_FOUND;
  rows.fill(16);
  EXPECT_EQ(next(&root, &group), expected);
  EXPECT_EQ(failures(), one(60, expected));
}

TEST_P(AfterOpenGroup, NoNodeBehindThePairIsNotFound)
{
  rows.bytes.resize(105);
  EXPECT_EQ(next(&root, &group), TAV_RC_NOT_FOUND);
  EXPECT_EQ(failures(), one(60, TAV_RC_NOT_FOUND));
}

TEST_P(AfterOpenGroup, APairInTheOtherByteOrderLeadsBack)
{
  for (const ptrdiff_t word : {88, 96})
  {
    std::reverse(rows.bytes.begin() + word, rows.bytes.begin() + word + 8);
  }
  ASSERT_EQ(next(&root, &group), TAV_RC_OK);
  EXPECT_EQ(offset(), 104U);
}

TEST_P(AfterOpenGroup, TheSiblingMayBePutWhereTheReferenceIs)
{
  open(GetParam());
  TAVHeaderData child{};
  child.header = group;
  ASSERT_EQ(tavGetNextChild(0, reader->handle(), &root, &child.header, &child), TAV_RC_OK);
  EXPECT_EQ(child.header.nodeOffset, 104U);
}

INSTANTIATE_TEST_SUITE_P(Forms, AfterOpenGroup, ::testing::ValuesIn(accessAndOrder()), kFormName);

} // namespace
