#include <algorithm>
#include <cstdint>
#include <memory>
#include <utility>
#include <vector>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "support/byteRows.h"
#include "support/nextChild.h"
#include "support/rows.h"
#include "support/streams.h"
#include "support/traceLog.h"
#include "tav/probes.h"
#include "tav/tav.h"

namespace
{

using namespace tav;
using namespace test;

constexpr uint32_t kId = probe::getNextChild;
constexpr uint64_t kNear64 = ~uint64_t{0} - 7;

class NextChild : public NextChildTest
{
};

// --- the stream's first node -----------------------------------------------------------------------------------------

TEST_P(NextChild, OfTheStreamIsTheNodeAtOffset0)
{
  rows.h64(0, 0, TAV_TYPE_HEADER64, 7).fill(40);
  ASSERT_EQ(next(nullptr, nullptr), TAV_RC_OK);
  EXPECT_EQ(offset(), 0U);
  EXPECT_EQ(out.header.hdrType, TAV_HDR_64);
  EXPECT_EQ(out.header.hdr64.elm, 7U);
}

TEST_P(NextChild, OfTheStreamIsTheNodeAtOffset0WhateverTheReference)
{
  rows.h64(0, 0, TAV_TYPE_HEADER64, 7).fill(40);
  TAVHeader references[] = {header64(0, TAV_TYPE_BINARY, TAV_ELM_CMN_END_HDR_MARKER, 0, 0),
                            header64(TAV_SIZE_UNKNOWN, TAV_TYPE_BINARY, 7, 0, 0), header32(1, 1, 1, 99999)};
  for (TAVHeader& reference : references)
  {
    ASSERT_EQ(next(nullptr, &reference), TAV_RC_OK);
    EXPECT_EQ(offset(), 0U);
  }
}

TEST_P(NextChild, OfTheStreamIsReadWithANarrowHeaderWhenTheHandleSaysSo)
{
  rows.h32(0, TAV_TYPE_HEADER32, 7).fill(40);
  Form form = GetParam();
  form.root32 = true;
  open(form);
  ASSERT_EQ(next(nullptr, nullptr), TAV_RC_OK);
  EXPECT_EQ(out.header.hdrType, TAV_HDR_32);
  EXPECT_EQ(out.header.hdr32.elm, 7U);
}

TEST_P(NextChild, OfAnEmptyStreamIsTheEnd)
{
  EXPECT_EQ(next(nullptr, nullptr), TAV_RC_NO_MORE_CHILDREN);
  EXPECT_EQ(failures(), one(120, TAV_RC_NO_MORE_CHILDREN));
}

TEST_P(NextChild, OfAStreamShorterThanAHeaderCannotBeRead)
{
  rows.fill(3);
  EXPECT_EQ(next(nullptr, nullptr), endCode());
  EXPECT_EQ(failures(), one(130, endCode()));
}

// --- first children --------------------------------------------------------------------------------------------------

TEST_P(NextChild, BeginsRightBehindAWideParentsHeader)
{
  rows.fill(5).h64(32, 0, TAV_TYPE_HEADER64, 1).h64(16, 0, TAV_TYPE_HEADER64, 2).h64(0, 0, TAV_TYPE_HEADER64, 3);
  TAVHeader parent = header64(32, TAV_TYPE_HEADER64, 1, 0, 5);
  ASSERT_EQ(next(&parent, nullptr), TAV_RC_OK);
  EXPECT_EQ(offset(), 21U);
  EXPECT_EQ(out.header.hdrType, TAV_HDR_64);
  EXPECT_EQ(out.header.hdr64.elm, 2U);
}

TEST_P(NextChild, HasANarrowHeaderInAWideParentOfType1)
{
  rows.h64(8, 0, TAV_TYPE_HEADER32, 1).h32(0, TAV_TYPE_HEADER32, 2);
  TAVHeader parent = header64(8, TAV_TYPE_HEADER32, 1);
  ASSERT_EQ(next(&parent, nullptr), TAV_RC_OK);
  EXPECT_EQ(offset(), 16U);
  EXPECT_EQ(out.header.hdrType, TAV_HDR_32);
  EXPECT_EQ(out.header.hdr32.elm, 2U);
}

TEST_P(NextChild, HasANarrowHeaderInANarrowParent)
{
  rows.h32(8, TAV_TYPE_HEADER32, 1).h32(0, TAV_TYPE_HEADER32, 2);
  TAVHeader parent = header32(8, TAV_TYPE_HEADER32, 1);
  ASSERT_EQ(next(&parent, nullptr), TAV_RC_OK);
  EXPECT_EQ(offset(), 8U);
  EXPECT_EQ(out.header.hdrType, TAV_HDR_32);
}

TEST_P(NextChild, HasANarrowHeaderInANarrowParentWhateverItsType)
{
  rows.h32(8, TAV_TYPE_HEADER64, 1).h32(0, TAV_TYPE_HEADER32, 2).fill(8);
  TAVHeader parent = header32(8, TAV_TYPE_HEADER64, 1);
  ASSERT_EQ(next(&parent, nullptr), TAV_RC_OK);
  EXPECT_EQ(out.header.hdrType, TAV_HDR_32);
}

TEST_P(NextChild, OfAnEmptyGroupIsTheEnd)
{
  rows.h64(0, 0, TAV_TYPE_HEADER64, 1).fill(40);
  TAVHeader parents[] = {header64(0, TAV_TYPE_HEADER64, 1), header64(0, TAV_TYPE_HEADER32, 1),
                         header32(0, TAV_TYPE_HEADER32, 1)};
  for (TAVHeader& parent : parents)
  {
    EXPECT_EQ(next(&parent, nullptr), TAV_RC_NO_MORE_CHILDREN);
    EXPECT_EQ(failures(), one(120, TAV_RC_NO_MORE_CHILDREN));
  }
}

TEST_P(NextChild, OfAnOpenWideGroupIsReadWithoutABound)
{
  rows.h64(TAV_SIZE_UNKNOWN, 0, TAV_TYPE_HEADER64, 1).h64(0, 0, TAV_TYPE_HEADER64, 2);
  TAVHeader parent = header64(TAV_SIZE_UNKNOWN, TAV_TYPE_HEADER64, 1);
  ASSERT_EQ(next(&parent, nullptr), TAV_RC_OK);
  EXPECT_EQ(offset(), 16U);
}

TEST_P(NextChild, OfAnOpenNarrowGroupIsBoundAt4GiB)
{
  rows.h32(0xFFFFFFFF, TAV_TYPE_HEADER32, 1).h32(0, TAV_TYPE_HEADER32, 2);
  TAVHeader parent = header32(0xFFFFFFFF, TAV_TYPE_HEADER32, 1);
  ASSERT_EQ(next(&parent, nullptr), TAV_RC_OK);
  EXPECT_EQ(offset(), 8U);
  parent.nodeOffset = 0xFFFFFFFF - 8;
  EXPECT_EQ(next(&parent, nullptr), TAV_RC_NO_MORE_CHILDREN);
  parent.nodeOffset = 0xFFFFFFFF - 7;
  EXPECT_EQ(next(&parent, nullptr), TAV_RC_OUTSIDE_PARENT);
  EXPECT_EQ(failures(), one(110, TAV_RC_OUTSIDE_PARENT));
  parent.nodeOffset = 0xFFFFFFFF - 9;
  EXPECT_EQ(next(&parent, nullptr), endCode());
}

TEST_P(NextChild, LiesOutsideAParentWhoseContentWouldPass64Bits)
{
  rows.fill(32);
  TAVHeader parents[] = {header64(0, TAV_TYPE_HEADER64, 1, 0, kNear64), header32(0, TAV_TYPE_HEADER32, 1, kNear64 + 1),
                         header64(TAV_SIZE_UNKNOWN, TAV_TYPE_HEADER64, 1, 0, kNear64),
                         header64(TAV_SIZE_UNKNOWN - 1, TAV_TYPE_HEADER64, 1, 0, 0),
                         header64(TAV_SIZE_UNKNOWN - 15, TAV_TYPE_HEADER64, 1, 0, 0)};
  for (TAVHeader& parent : parents)
  {
    EXPECT_EQ(next(&parent, nullptr), TAV_RC_OUTSIDE_PARENT);
    EXPECT_EQ(failures(), one(110, TAV_RC_OUTSIDE_PARENT));
  }
}

TEST_P(NextChild, MayEndAtTheLastOffset)
{
  rows.fill(32);
  TAVHeader parent = header64(TAV_SIZE_UNKNOWN - 16, TAV_TYPE_HEADER64, 1);
  EXPECT_EQ(next(&parent, nullptr), TAV_RC_OK);
}

// --- siblings --------------------------------------------------------------------------------------------------------

TEST_P(NextChild, AfterAGroupBeginsWhereItsSizeEnds)
{
  rows.h64(64, 0, TAV_TYPE_HEADER64, 1).h64(13, TAV_INFO_ALIGNED8 | TAV_INFO_EYE_SIZE, TAV_TYPE_HEADER64, 2).fill(13);
  rows.h64(0, 0, TAV_TYPE_HEADER64, 3).fill(30);
  Form form = GetParam();
  form.align = true; // neither flag nor alignment moves what follows a group
  open(form);
  TAVHeader parent = header64(64, TAV_TYPE_HEADER64, 1);
  TAVHeader child = header64(13, TAV_TYPE_HEADER64, 2, TAV_INFO_ALIGNED8 | TAV_INFO_EYE_SIZE, 16);
  ASSERT_EQ(next(&parent, &child), TAV_RC_OK);
  EXPECT_EQ(offset(), 45U);
  EXPECT_EQ(out.header.hdr64.elm, 3U);
}

TEST_P(NextChild, AfterANarrowGroupBeginsWhereItsSizeEnds)
{
  rows.fill(80);
  Form form = GetParam();
  form.align = true;
  open(form);
  TAVHeader parent = header32(64, TAV_TYPE_HEADER32, 1);
  TAVHeader child = header32(5, TAV_TYPE_HEADER32, 2, 8);
  ASSERT_EQ(next(&parent, &child), TAV_RC_OK);
  EXPECT_EQ(offset(), 21U);
}

struct Spacing
{
  const char* reason;
  bool wide;
  uint64_t size;
  uint32_t info;
  bool align;
  uint64_t distance;
};

const Spacing kSpacings[] = {
    {"narrow", false, 5, 0, false, 13},
    {"narrow, padded", false, 5, 0, true, 16},
    {"narrow, a whole multiple needs no padding", false, 8, 0, true, 16},
    {"narrow, empty", false, 0, 0, true, 8},
    {"wide", true, 5, 0, false, 21},
    {"wide, padded by the handle", true, 5, 0, true, 24},
    {"wide, padded by its flag", true, 5, TAV_INFO_ALIGNED8, false, 24},
    {"wide, padded by both", true, 5, TAV_INFO_ALIGNED8, true, 24},
    {"wide, a whole multiple needs no padding", true, 16, TAV_INFO_ALIGNED8, true, 32},
    {"wide, empty", true, 0, TAV_INFO_ALIGNED8, true, 16},
    {"wide with a pair", true, 8, TAV_INFO_EYE_SIZE, false, 40},
    {"wide with padding and a pair", true, 9, TAV_INFO_EYE_SIZE, true, 48},
    {"wide with a pair and no padding", true, 9, TAV_INFO_EYE_SIZE, false, 41},
    {"wide with a pair and other flags", true, 8, 0xFFFFFFFF & ~TAV_INFO_ALIGNED8, false, 40},
    {"wide with all flags but these", true, 5, ~(TAV_INFO_ALIGNED8 | TAV_INFO_EYE_SIZE), false, 21},
};

TEST_P(NextChild, AfterAnElementBeginsBehindItsDataPaddingAndPair)
{
  rows.fill(200);
  for (const Spacing& row : kSpacings)
  {
    Form form = GetParam();
    form.align = row.align;
    open(form);
    const uint64_t first = row.wide ? 16 : 8;
    TAVHeader parent = row.wide ? header64(150, TAV_TYPE_HEADER64, 1) : header32(150, TAV_TYPE_HEADER32, 1);
    TAVHeader child = row.wide ? header64(row.size, TAV_TYPE_BINARY, 2, row.info, first)
                               : header32(static_cast<uint32_t>(row.size), TAV_TYPE_BINARY, 2, first);
    ASSERT_EQ(next(&parent, &child), TAV_RC_OK) << row.reason;
    EXPECT_EQ(offset() - first, row.distance) << row.reason;
    EXPECT_EQ(out.header.hdrType, row.wide ? TAV_HDR_64 : TAV_HDR_32) << row.reason;
  }
}

TEST_P(NextChild, EndsWhereTheParentEndsAndLiesOutsideOneThatTheReferenceOverruns)
{
  struct Row
  {
    uint64_t size;
    uint32_t point;
    uint32_t code;
  };
  rows.fill(80);
  for (const Row& row : {Row{8, 120, TAV_RC_NO_MORE_CHILDREN}, Row{9, 110, TAV_RC_OUTSIDE_PARENT}})
  {
    TAVHeader parent = header64(24, TAV_TYPE_HEADER64, 1);
    TAVHeader child = header64(row.size, TAV_TYPE_BINARY, 2, 0, 16);
    EXPECT_EQ(next(&parent, &child), row.code);
    EXPECT_EQ(failures(), one(row.point, row.code));
  }
}

TEST_P(NextChild, LiesOutsideWhenItWouldPass64Bits)
{
  rows.fill(80);
  TAVHeader closed = header64(64, TAV_TYPE_HEADER64, 1);
  TAVHeader open = header64(TAV_SIZE_UNKNOWN, TAV_TYPE_HEADER64, 1);
  TAVHeader children[] = {
      header64(TAV_SIZE_UNKNOWN - 1, TAV_TYPE_BINARY, 2, 0, 16),
      header64(TAV_SIZE_UNKNOWN - 1, TAV_TYPE_HEADER64, 2, 0, 16),
      header64(TAV_SIZE_UNKNOWN - 31, TAV_TYPE_BINARY, 2, TAV_INFO_EYE_SIZE, 16),
      header64(TAV_SIZE_UNKNOWN - 1, TAV_TYPE_BINARY, 2, TAV_INFO_ALIGNED8 | TAV_INFO_EYE_SIZE, 16)};
  for (TAVHeader& child : children)
  {
    EXPECT_EQ(next(&closed, &child), TAV_RC_OUTSIDE_PARENT) << child.hdr64.size;
    EXPECT_EQ(next(&open, &child), TAV_RC_OUTSIDE_PARENT) << child.hdr64.size;
    EXPECT_EQ(failures(), one(110, TAV_RC_OUTSIDE_PARENT));
  }
}

TEST_P(NextChild, IsRefusedAfterAnEndElementWithoutReading)
{
  rows.fill(80);
  for (const uint16_t elm : {TAV_ELM_CMN_END_HDR_MARKER, TAV_ELM_CMN_END_HDR_EYE_SIZE})
  {
    TAVHeader wideParent = header64(64, TAV_TYPE_HEADER64, 1);
    TAVHeader wide = header64(0, TAV_TYPE_BINARY, elm, 0, 16);
    EXPECT_EQ(next(&wideParent, &wide), TAV_RC_NO_MORE_CHILDREN);
    EXPECT_EQ(failures(), one(90, TAV_RC_NO_MORE_CHILDREN));
    EXPECT_THAT(trace.recordsOf(probe::readNode), IsEmpty());
    TAVHeader narrowParent = header32(64, TAV_TYPE_HEADER32, 1);
    TAVHeader narrow = header32(0, TAV_TYPE_BINARY, elm, 8);
    EXPECT_EQ(next(&narrowParent, &narrow), TAV_RC_NO_MORE_CHILDREN);
    EXPECT_TRUE(sameBytes(out, untouched()));
  }
}

TEST_P(NextChild, FollowsAnEyeSizeElement)
{
  rows.fill(80);
  TAVHeader parent = header64(64, TAV_TYPE_HEADER64, 1);
  TAVHeader child = header64(16, TAV_TYPE_BINARY, TAV_ELM_CMN_EYE_SIZE, 0, 16);
  EXPECT_EQ(next(&parent, &child), TAV_RC_OK);
  EXPECT_EQ(offset(), 48U);
}

TEST_P(NextChild, IsRefusedForAReferenceOfTheOtherHeaderForm)
{
  rows.fill(80);
  std::pair<TAVHeader, TAVHeader> mixtures[] = {
      {header64(64, TAV_TYPE_HEADER32, 1), header64(0, TAV_TYPE_BINARY, 2, 0, 16)},
      {header64(64, TAV_TYPE_HEADER64, 1), header32(0, TAV_TYPE_BINARY, 2, 16)},
      {header32(64, TAV_TYPE_HEADER32, 1), header64(0, TAV_TYPE_BINARY, 2, 0, 8)},
  };
  for (auto& [parent, child] : mixtures)
  {
    EXPECT_EQ(next(&parent, &child), TAV_RC_BAD_PARAM);
    EXPECT_EQ(failures(), one(70, TAV_RC_BAD_PARAM));
  }
}

TEST_P(NextChild, IsRefusedForAReferenceBehindItsParent)
{
  rows.fill(80);
  TAVHeader parent = header64(24, TAV_TYPE_HEADER64, 1);
  for (const uint64_t at : {uint64_t{40}, uint64_t{41}, ~uint64_t{0}})
  {
    TAVHeader child = header64(0, TAV_TYPE_BINARY, 2, 0, at);
    EXPECT_EQ(next(&parent, &child), TAV_RC_BAD_PARAM);
    EXPECT_EQ(failures(), one(80, TAV_RC_BAD_PARAM));
  }
  TAVHeader last = header64(0, TAV_TYPE_BINARY, 2, 0, 39);
  EXPECT_EQ(next(&parent, &last), TAV_RC_OUTSIDE_PARENT);
}

TEST_P(NextChild, ChecksFormThenPlaceThenEndElement)
{
  rows.fill(80);
  TAVHeader parent = header64(24, TAV_TYPE_HEADER32, 1);
  TAVHeader allWrong = header64(0, TAV_TYPE_BINARY, TAV_ELM_CMN_END_HDR_MARKER, 0, 40);
  EXPECT_EQ(next(&parent, &allWrong), TAV_RC_BAD_PARAM);
  EXPECT_EQ(failures(), one(70, TAV_RC_BAD_PARAM));
  TAVHeader wrongPlace = header32(0, TAV_TYPE_BINARY, TAV_ELM_CMN_END_HDR_MARKER, 40);
  EXPECT_EQ(next(&parent, &wrongPlace), TAV_RC_BAD_PARAM);
  EXPECT_EQ(failures(), one(80, TAV_RC_BAD_PARAM));
}

TEST_P(NextChild, IsNotSupportedAfterAnElementOfUnknownSize)
{
  rows.fill(80);
  TAVHeader wideParent = header64(64, TAV_TYPE_HEADER32, 1); // its children's form is not looked at
  TAVHeader wide = header64(TAV_SIZE_UNKNOWN, TAV_TYPE_BINARY, 2, 0, 16);
  EXPECT_EQ(next(&wideParent, &wide), TAV_RC_NOT_SUPPORTED);
  EXPECT_EQ(failures(), one(50, TAV_RC_NOT_SUPPORTED));
  TAVHeader narrowParent = header32(64, TAV_TYPE_HEADER32, 1);
  TAVHeader narrow = header32(0xFFFFFFFF, TAV_TYPE_BINARY, 2, 8);
  EXPECT_EQ(next(&narrowParent, &narrow), TAV_RC_NOT_SUPPORTED);
}

TEST_P(NextChild, TakesAWideElementOf4GiBLess1ForOneOfKnownSize)
{
  rows.fill(80);
  TAVHeader parent = header64(64, TAV_TYPE_HEADER64, 1);
  TAVHeader child = header64(0xFFFFFFFF, TAV_TYPE_BINARY, 2, 0, 16);
  EXPECT_EQ(next(&parent, &child), TAV_RC_OUTSIDE_PARENT);
}

TEST_P(NextChild, PassesTheReadersCodeOn)
{
  rows.h64(16, 0, TAV_TYPE_HEADER64, 1).h64(99, 0, TAV_TYPE_BINARY, 2).fill(3);
  TAVHeader parent = header64(16, TAV_TYPE_HEADER64, 1);
  EXPECT_EQ(next(&parent, nullptr), TAV_RC_DATA_TOO_LARGE);
  EXPECT_EQ(failures(), one(130, TAV_RC_DATA_TOO_LARGE));
}

TEST_P(NextChild, DoesNotAskThatTheChildEndsInsideItsParent)
{
  rows.h64(16, 0, TAV_TYPE_HEADER64, 1).h64(3, 0, TAV_TYPE_BINARY, 2).fill(3);
  TAVHeader parent = header64(1, TAV_TYPE_HEADER64, 1);
  EXPECT_EQ(next(&parent, nullptr), TAV_RC_OK);
}

TEST_P(NextChild, MayBePutWhereTheReferenceIs)
{
  rows.h64(32, 0, TAV_TYPE_HEADER64, 1).h64(0, 0, TAV_TYPE_HEADER64, 2).h64(0, 0, TAV_TYPE_HEADER64, 3);
  open(GetParam());
  TAVHeader parent = header64(32, TAV_TYPE_HEADER64, 1);
  TAVHeaderData child{};
  ASSERT_EQ(tavGetNextChild(0, reader->handle(), &parent, nullptr, &child), TAV_RC_OK);
  ASSERT_EQ(tavGetNextChild(0, reader->handle(), &parent, &child.header, &child), TAV_RC_OK);
  EXPECT_EQ(child.header.hdr64.elm, 3U);
  EXPECT_EQ(tavGetNextChild(0, reader->handle(), &parent, &child.header, &child), TAV_RC_NO_MORE_CHILDREN);
  EXPECT_EQ(child.header.hdr64.elm, 3U);
}

TEST_P(NextChild, LeavesParentAndReferenceUntouchedOnFailure)
{
  rows.h64(40, 0, TAV_TYPE_HEADER64, 1).h64(0, 0, TAV_TYPE_HEADER64, 2).h64(99, 0, TAV_TYPE_BINARY, 3).fill(3);
  TAVHeader parent = header64(40, TAV_TYPE_HEADER64, 1);
  TAVHeader child = header64(0, TAV_TYPE_HEADER64, 2, 0, 16);
  const TAVHeader parentBefore = parent;
  const TAVHeader childBefore = child;
  EXPECT_EQ(next(&parent, &child), TAV_RC_DATA_TOO_LARGE);
  EXPECT_TRUE(sameBytes(parent, parentBefore));
  EXPECT_TRUE(sameBytes(child, childBefore));
}

// --- arguments and trace ---------------------------------------------------------------------------------------------

TEST_P(NextChild, TracesEntryArgumentsResultAndExit)
{
  rows.h64(16, 0, TAV_TYPE_HEADER64, 1).h64(0, 0, TAV_TYPE_HEADER64, 2).fill(30);
  TAVHeader parent = header64(16, TAV_TYPE_HEADER64, 1);
  ASSERT_EQ(next(&parent, nullptr), TAV_RC_OK);
  EXPECT_THAT(trace.stepsOf(kId), ElementsAre(Step{KOR_TRACE_ENTRY, kId, 0}, Step{KOR_TRACE_VAR, kId, 0},
                                              Step{KOR_TRACE_VAR, kId, 100}, Step{KOR_TRACE_EXIT, kId, 0}));
  EXPECT_THAT(trace.dump(kId, 0).items,
              ElementsAre(bytesOf(uint64_t{0}), bytesOf(reader->handle()), "Parent and reference child headers",
                          bytesOf(parent), "", bytesOf(&out)));
  EXPECT_THAT(trace.dump(kId, 100).items, ElementsAre(bytesOf(out)));
  EXPECT_EQ(trace.recordsOf(kId).back().code, TAV_RC_OK);
}

INSTANTIATE_TEST_SUITE_P(Forms, NextChild, ::testing::ValuesIn(accessAndOrder()), kFormName);

struct Fault : Row
{
  bool handle;
  bool out;
  uint64_t options;
  uint32_t point;
  uint32_t code;
};

/// Each row has the faults of all later rows, too: the first one gives code and point.
const Fault kFaults[] = {
    {"Handle", false, false, 1, 10, TAV_RC_BAD_PARAM},
    {"Descriptor", true, false, 1, 20, TAV_RC_BAD_PARAM},
    {"Options", true, true, 1, 30, TAV_RC_BAD_OPTIONS},
    {"HighOptions", true, true, uint64_t{1} << 63, 30, TAV_RC_BAD_OPTIONS},
    {"Mode", true, true, 0, 40, TAV_RC_WRONG_MODE},
};

class NextChildFault : public ::testing::TestWithParam<Fault>
{
};

TEST_P(NextChildFault, IsFoundInTheOrderOfTheArguments)
{
  const Fault& fault = GetParam();
  StreamWriter writer;
  writer.add(group64(1));
  TAVHeaderData out = untouched();
  TAVHeader parent = header32(0, TAV_TYPE_HEADER32, 1);
  TAVHeader child = header64(TAV_SIZE_UNKNOWN, TAV_TYPE_BINARY, 1);
  TraceLog trace;
  EXPECT_EQ(tavGetNextChild(fault.options, fault.handle ? writer.handle() : nullptr, &parent, &child,
                            fault.out ? &out : nullptr),
            fault.code);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{kId, fault.point, fault.code}));
  EXPECT_EQ(trace.records().back().code, fault.code);
  EXPECT_TRUE(sameBytes(out, untouched()));
}

INSTANTIATE_TEST_SUITE_P(Rows, NextChildFault, ::testing::ValuesIn(kFaults),
                         kRowName);

/// A storage that does not tell its size, and one that gives a wrong one with a failure.
class SizelessStorage : public VectorStorage
{
public:
  using VectorStorage::VectorStorage;
  uint32_t getTotalSize(uint64_t* pSize) override
  {
    if (told != 0)
    {
      *pSize = told;
    }
    return TAV_RC_NOT_SUPPORTED;
  }
  uint64_t told = 0;
};

TEST(NextChildOfASizelessStorage, GoesByTheSizeThatWasStoredAndNotByTheCode)
{
  SizelessStorage storage(64, ByteRows().h64(0, 0, TAV_TYPE_HEADER64, 9).bytes, VectorStorage::kReadOnly);
  Form form;
  form.buffered = true;
  Handle handle(storage, TAV_OPT_READ, form);
  TAVHeaderData out{};
  EXPECT_EQ(tavGetNextChild(0, handle.get(), nullptr, nullptr, &out), TAV_RC_NO_MORE_CHILDREN);
  storage.told = 5;
  EXPECT_EQ(tavGetNextChild(0, handle.get(), nullptr, nullptr, &out), TAV_RC_OK);
  EXPECT_EQ(out.header.hdr64.elm, 9U);
}

} // namespace
