#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "support/failingNew.h"
#include "support/reading.h"
#include "support/streams.h"
#include "support/traceLog.h"

namespace
{

using namespace test;
using namespace tav;
using testing::ElementsAre;
using testing::IsEmpty;

constexpr uint16_t kRoot = 1000;
constexpr uint16_t kWanted = 7;
constexpr uint16_t kOther = 8;

const auto kForms = testing::Values(Form{}, Form{.swap = true, .align = true}, Form{.buffered = true},
                                    Form{.buffered = true, .swap = true, .align = true});

/// A stream that is written first and then searched.
class FindElement : public testing::TestWithParam<Form>
{
protected:
  FindElement()
      : writer(GetParam()) { root = writer.add(group64(kRoot)).nodeOffset; }

  /// Closes the root and opens the stream for reading.
  void read()
  {
    writer.close();
    reader = std::make_unique<StreamReader>(writer.bytes(), GetParam());
    parent = headerAt(reader->handle(), root);
  }

  uint32_t find(uint32_t elm, uint16_t key = 0, uint32_t minDepth = 0, uint32_t maxDepth = 0,
                TAVHeader* resume = nullptr)
  {
    return tavFindElmInt(reader->handle(), &parent, minDepth, maxDepth, key, elm, resume, &stack, &out.data);
  }

  StreamWriter writer;
  std::unique_ptr<StreamReader> reader;
  uint64_t root = 0;
  TAVHeader parent{};
  TAVHdrStack stack;
  Untouched out;
};
INSTANTIATE_TEST_SUITE_P(Forms, FindElement, kForms, kFormName);

TEST_P(FindElement, GivesTheFirstDirectChildWithTheId)
{
  writer.add(u32(kOther, 1));
  const uint64_t expected = writer.add(u32(kWanted, 0x11223344)).nodeOffset;
  writer.add(u32(kWanted, 3));
  read();

  ASSERT_EQ(find(kWanted), TAV_RC_OK);
  EXPECT_EQ(out.data.header.nodeOffset, expected);
  EXPECT_EQ(out.data.header.hdrType, TAV_HDR_64);
  EXPECT_EQ(out.data.header.hdr64.elm, kWanted);
  EXPECT_EQ(out.data.header.hdr64.size, 4U);
  EXPECT_GE(out.data.dataBufSize, 4U);
  EXPECT_EQ(Bytes(out.data.pDataBuf, out.data.pDataBuf + 4),
            GetParam().swap != kBigEndianHost ? (Bytes{0x11, 0x22, 0x33, 0x44}) : (Bytes{0x44, 0x33, 0x22, 0x11}));
}

TEST_P(FindElement, PassesOverGroupsThatHoldTheId)
{
  writer.add(group64(kOther));
  writer.add(u32(kWanted, 1));
  writer.close();
  const uint64_t expected = writer.add(u32(kWanted, 2)).nodeOffset;
  read();

  ASSERT_EQ(find(kWanted), TAV_RC_OK);
  EXPECT_EQ(out.data.header.nodeOffset, expected);
  EXPECT_EQ(stack.count, 1U);
}

TEST_P(FindElement, GivesAGroupWithTheId)
{
  writer.add(u32(kOther, 1));
  const uint64_t expected = writer.add(group64(kWanted)).nodeOffset;
  writer.add(u32(kWanted, 1));
  writer.close();
  read();

  ASSERT_EQ(find(kWanted), TAV_RC_OK);
  EXPECT_EQ(out.data.header.nodeOffset, expected);
  EXPECT_EQ(out.data.pDataBuf, nullptr);
}

TEST_P(FindElement, ComparesTheKeyInTheLowElevenBitsOfInfo)
{
  writer.add(u32(kWanted, 1, true, 0x80000806)); // key 6
  writer.add(u32(kOther, 2, true, 0x005));
  const uint64_t expected = writer.add(u32(kWanted, 3, true, 0x80000805)).nodeOffset;
  read();

  ASSERT_EQ(find(kWanted, 5), TAV_RC_OK);
  EXPECT_EQ(out.data.header.nodeOffset, expected);
}

TEST_P(FindElement, TakesAnyKeyWhenNoneIsAskedFor)
{
  const uint64_t expected = writer.add(u32(kWanted, 1, true, 0x7FF)).nodeOffset;
  read();

  ASSERT_EQ(find(kWanted, 0), TAV_RC_OK);
  EXPECT_EQ(out.data.header.nodeOffset, expected);
}

TEST_P(FindElement, AKeyThatDoesNotFitElevenBitsMatchesNothing)
{
  writer.add(u32(kWanted, 1, true, 0x805));
  read();

  EXPECT_EQ(find(kWanted, 0x805), TAV_RC_NOT_FOUND);
}

TEST_P(FindElement, AnIdBeyondSixteenBitsMatchesNothing)
{
  writer.add(u32(kWanted, 1));
  read();

  EXPECT_EQ(find(0x10000 + kWanted), TAV_RC_NOT_FOUND);
}

TEST_P(FindElement, AKeyNeverMatchesA32BitHeader)
{
  const uint64_t narrow = writer.add(group64(kOther, TAV_TYPE_HEADER32)).nodeOffset;
  const uint64_t expected = writer.add(u32(kWanted, 1, false)).nodeOffset;
  writer.close();
  read();
  parent = headerAt(reader->handle(), narrow);

  EXPECT_EQ(find(kWanted, 1), TAV_RC_NOT_FOUND);
  stack.count = 0;
  ASSERT_EQ(find(kWanted, 0), TAV_RC_OK);
  EXPECT_EQ(out.data.header.nodeOffset, expected);
  EXPECT_EQ(out.data.header.hdrType, TAV_HDR_32);
}

TEST_P(FindElement, ResumingGivesEveryMatchOfALongListInOrder)
{
  std::vector<uint64_t> expected;
  for (uint32_t i = 0; i < 700; ++i)
  {
    const uint64_t offset = writer.add(u32(i % 3 == 0 ? kWanted : kOther, i)).nodeOffset;
    if (i % 3 == 0)
    {
      expected.push_back(offset);
    }
  }
  read();

  std::vector<uint64_t> found;
  TAVHeader* resume = nullptr;
  uint32_t rc = find(kWanted);
  for (; rc == TAV_RC_OK; rc = find(kWanted, 0, 0, 0, resume))
  {
    found.push_back(out.data.header.nodeOffset);
    resume = &out.data.header; // the found header serves as it is
  }
  EXPECT_EQ(rc, TAV_RC_NOT_FOUND);
  EXPECT_EQ(found, expected);
  EXPECT_EQ(stack.count, 1U);
}

TEST_P(FindElement, AGroupOnTheWayIsEnteredAndGivesControlBack)
{
  writer.add(u32(kOther, 1));
  const uint64_t group = writer.add(group64(kOther)).nodeOffset;
  writer.add(u32(kWanted, 2));
  writer.close();
  writer.add(u32(kWanted, 3));
  read();

  EXPECT_EQ(find(kWanted, 0, 0, 1), TAV_RC_OK);
  EXPECT_TRUE(out.isUntouched());
  ASSERT_EQ(stack.count, 2U);
  EXPECT_EQ(stack.pEntries[1].nodeOffset, group);
}

TEST_P(FindElement, GoesOnInTheGroupThatItEntered)
{
  const uint64_t group = writer.add(group64(kOther)).nodeOffset;
  const uint64_t first = writer.add(u32(kWanted, 1)).nodeOffset;
  const uint64_t second = writer.add(u32(kWanted, 2)).nodeOffset;
  writer.close();
  read();
  ASSERT_EQ(find(kWanted, 0, 1, 1), TAV_RC_OK);
  ASSERT_EQ(stack.pEntries[1].nodeOffset, group);

  TAVHeader resume = headerAt(reader->handle(), first);
  ASSERT_EQ(find(kWanted, 0, 1, 1, &resume), TAV_RC_OK);
  EXPECT_EQ(out.data.header.nodeOffset, second);
  EXPECT_EQ(stack.count, 2U);
}

TEST_P(FindElement, NeverClimbsOutOfAGroupAgain)
{
  writer.add(group64(kOther));
  const uint64_t last = writer.add(u32(kOther, 1)).nodeOffset;
  writer.close();
  writer.add(u32(kWanted, 2));
  read();
  ASSERT_EQ(find(kWanted, 0, 0, 1), TAV_RC_OK);

  TAVHeader resume = headerAt(reader->handle(), last);
  EXPECT_EQ(find(kWanted, 0, 0, 1, &resume), TAV_RC_NOT_FOUND);
  EXPECT_EQ(stack.count, 2U);
  EXPECT_TRUE(out.isUntouched());
}

TEST_P(FindElement, MatchesAboveTheLeastDepthDoNotCount)
{
  writer.add(u32(kWanted, 1));
  const uint64_t group = writer.add(group64(kWanted)).nodeOffset;
  writer.close();
  read();

  EXPECT_EQ(find(kWanted, 0, 1, 1), TAV_RC_OK); // entered, not found
  EXPECT_TRUE(out.isUntouched());
  ASSERT_EQ(stack.count, 2U);
  EXPECT_EQ(stack.pEntries[1].nodeOffset, group);
}

TEST_P(FindElement, GroupsBelowTheGreatestDepthAreNotEntered)
{
  writer.add(group64(kOther));
  writer.close();
  read();

  EXPECT_EQ(find(kWanted, 0, 0, 0), TAV_RC_NOT_FOUND);
  EXPECT_EQ(stack.count, 1U);
}

TEST_P(FindElement, TheDepthBoundsDoNotWrap)
{
  const uint64_t expected = writer.add(u32(kWanted, 1)).nodeOffset;
  read();

  EXPECT_EQ(find(kWanted, 0, ~0U, ~0U), TAV_RC_NOT_FOUND);
  EXPECT_TRUE(out.isUntouched());
  stack.count = 0;
  ASSERT_EQ(find(kWanted, 0, 0, ~0U), TAV_RC_OK);
  EXPECT_EQ(out.data.header.nodeOffset, expected);
}

TEST_P(FindElement, AnEmptyGroupHoldsNothing)
{
  read();

  TraceLog trace;
  EXPECT_EQ(find(kWanted), TAV_RC_NOT_FOUND);
  EXPECT_THAT(trace.failuresOf(probe::findElement), ElementsAre(Failure{probe::findElement, 70, TAV_RC_NOT_FOUND}));
  EXPECT_THAT(trace.failuresOf(probe::getNextChild),
              ElementsAre(Failure{probe::getNextChild, 120, TAV_RC_NO_MORE_CHILDREN}));
  EXPECT_TRUE(out.isUntouched());
  EXPECT_EQ(stack.count, 1U);
}

TEST_P(FindElement, AWalkThatFailsFindsNothing)
{
  writer.add(u32(kOther, 1));
  writer.add(u32(kWanted, 2));
  read();
  parent.hdr64.size = 10; // the second child would start behind the group

  TraceLog trace;
  EXPECT_EQ(find(kWanted), TAV_RC_NOT_FOUND);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::getNextChild, 110, TAV_RC_OUTSIDE_PARENT},
                                            Failure{probe::findElement, 70, TAV_RC_NOT_FOUND}));
}

TEST_P(FindElement, UsesAStackOfItsOwnWhenNoneIsGiven)
{
  const uint64_t expected = writer.add(u32(kWanted, 1)).nodeOffset;
  read();

  const int64_t before = allocations::live();
  EXPECT_EQ(tavFindElmInt(reader->handle(), &parent, 0, 0, 0, kWanted, nullptr, nullptr, &out.data), TAV_RC_OK);
  EXPECT_EQ(out.data.header.nodeOffset, expected);
  EXPECT_EQ(allocations::live(), before);
}

TEST_P(FindElement, FailsWithoutAStackOfItsOwn)
{
  writer.add(u32(kWanted, 1));
  read();

  TraceLog trace;
  const allocations::FailNth fail(1);
  EXPECT_EQ(tavFindElmInt(reader->handle(), &parent, 0, 0, 0, kWanted, nullptr, nullptr, &out.data),
            TAV_RC_NO_HDR_STACK);
  EXPECT_TRUE(fail.happened());
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::findElement, 40, TAV_RC_NO_HDR_STACK}));
  EXPECT_TRUE(out.isUntouched());
}

TEST_P(FindElement, AStackThatBeganWithoutABlockGrowsAtTheFirstPush)
{
  const uint64_t expected = writer.add(u32(kWanted, 1)).nodeOffset;
  read();

  const int64_t before = allocations::live();
  {
    const TraceLog trace; // without it a search over direct memory makes no stack of its own
    const allocations::FailNth fail(2);
    EXPECT_EQ(tavFindElmInt(reader->handle(), &parent, 0, 0, 0, kWanted, nullptr, nullptr, &out.data), TAV_RC_OK);
    EXPECT_TRUE(fail.happened());
  }
  EXPECT_EQ(out.data.header.nodeOffset, expected);
  EXPECT_EQ(allocations::live(), before);
}

TEST_P(FindElement, OverDirectMemoryNothingIsAllocated)
{
  const uint64_t expected = writer.add(u32(kWanted, 1)).nodeOffset;
  read();
  if ((reader->handle()->options & TAV_OPT_DIRECT) == 0)
  {
    GTEST_SKIP() << "through a ring there is a stack";
  }

  const allocations::FailNth fail(1);
  EXPECT_EQ(tavFindElmInt(reader->handle(), &parent, 0, 0, 0, kWanted, nullptr, nullptr, &out.data), TAV_RC_OK);
  EXPECT_FALSE(fail.happened());
  EXPECT_EQ(out.data.header.nodeOffset, expected);
}

TEST_P(FindElement, AFullStackRefusesTheParent)
{
  writer.add(u32(kWanted, 1));
  read();
  for (uint32_t i = 0; i < 4000; ++i)
  {
    ASSERT_EQ(stack.push(&parent), TAV_RC_OK);
  }

  TraceLog trace;
  EXPECT_EQ(find(kWanted), TAV_RC_NO_MEMORY);
  EXPECT_THAT(trace.failuresOf(probe::findElement), ElementsAre(Failure{probe::findElement, 50, TAV_RC_NO_MEMORY}));
  EXPECT_EQ(stack.count, 4000U);
  EXPECT_TRUE(out.isUntouched());
}

TEST_P(FindElement, AFullStackRefusesAGroupOnTheWay)
{
  const uint64_t first = writer.add(u32(kOther, 1)).nodeOffset;
  writer.add(group64(kOther));
  writer.close();
  read();
  for (uint32_t i = 0; i < 4000; ++i)
  {
    ASSERT_EQ(stack.push(&parent), TAV_RC_OK);
  }

  TraceLog trace;
  TAVHeader resume = headerAt(reader->handle(), first);
  EXPECT_EQ(find(kWanted, 0, 0, 5000, &resume), TAV_RC_NO_MEMORY);
  EXPECT_THAT(trace.failuresOf(probe::findElement), ElementsAre(Failure{probe::findElement, 70, TAV_RC_NO_MEMORY}));
  EXPECT_EQ(stack.count, 4000U);
}

TEST_P(FindElement, AResumePointNeedsThePlaceOfTheLastSearch)
{
  const uint64_t first = writer.add(u32(kWanted, 1)).nodeOffset;
  writer.add(u32(kWanted, 2));
  read();
  TAVHeader resume = headerAt(reader->handle(), first);

  TraceLog trace;
  EXPECT_EQ(find(kWanted, 0, 0, 0, &resume), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tavFindElmInt(reader->handle(), &parent, 0, 0, 0, kWanted, &resume, nullptr, &out.data), TAV_RC_BAD_PARAM);
  const Failure expected{probe::findElement, 60, TAV_RC_BAD_PARAM};
  EXPECT_THAT(trace.failures(), ElementsAre(expected, expected));
  EXPECT_TRUE(out.isUntouched());
  EXPECT_EQ(stack.count, 0U);
}

TEST_P(FindElement, TracesArgumentsAndResult)
{
  writer.add(u32(kWanted, 1, true, 3));
  read();

  TraceLog trace;
  ASSERT_EQ(find(kWanted, 3, 0, 9), TAV_RC_OK);
  EXPECT_THAT(trace.stepsOf(probe::findElement),
              ElementsAre(Step{KOR_TRACE_ENTRY, probe::findElement, 0}, Step{KOR_TRACE_VAR, probe::findElement, 0},
                          Step{KOR_TRACE_VAR, probe::findElement, 100}, Step{KOR_TRACE_EXIT, probe::findElement, 0}));
  TAVHandle* const handle = reader->handle();
  TAVHdrStack* const pStack = &stack;
  TAVHeaderData* const pOut = &out.data;
  EXPECT_THAT(trace.dump(probe::findElement, 0).items,
              ElementsAre(bytesOf(handle), bytesOf(parent), bytesOf(uint32_t{0}), bytesOf(uint32_t{9}),
                          bytesOf(uint16_t{3}), bytesOf(uint32_t{kWanted}), "", bytesOf(pStack), bytesOf(pOut)));
  EXPECT_THAT(trace.dump(probe::findElement, 100).items, ElementsAre(bytesOf(out.data)));
  EXPECT_EQ(trace.recordsOf(probe::findElement).back().code, TAV_RC_OK);
}

TEST_P(FindElement, TracesTheResumePoint)
{
  writer.add(u32(kWanted, 1));
  read();
  ASSERT_EQ(find(kWanted), TAV_RC_OK);

  TraceLog trace;
  TAVHeader resume = out.data.header;
  EXPECT_EQ(find(kWanted, 0, 0, 0, &resume), TAV_RC_NOT_FOUND);
  EXPECT_EQ(trace.dump(probe::findElement, 0).items.at(6), bytesOf(resume));
  EXPECT_EQ(trace.recordsOf(probe::findElement).back().code, TAV_RC_NOT_FOUND);
}

TEST(FindElementArguments, AreCheckedInTheirOrder)
{
  StreamReader reader(Bytes(16, 0));
  TAVHeader parent = header64(0, TAV_TYPE_HEADER64, kRoot);
  TAVHdrStack stack;
  Untouched out;
  TraceLog trace;
  EXPECT_EQ(tavFindElmInt(nullptr, nullptr, 0, 0, 0, 7, nullptr, &stack, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tavFindElmInt(reader.handle(), nullptr, 0, 0, 0, 7, nullptr, &stack, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tavFindElmInt(reader.handle(), &parent, 0, 0, 0, 7, &parent, &stack, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tavFindElmInt(reader.handle(), nullptr, 0, 0, 0, 7, nullptr, nullptr, &out.data), TAV_RC_BAD_PARAM);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::findElement, 10, TAV_RC_BAD_PARAM},
                                            Failure{probe::findElement, 20, TAV_RC_BAD_PARAM},
                                            Failure{probe::findElement, 30, TAV_RC_BAD_PARAM},
                                            Failure{probe::findElement, 20, TAV_RC_BAD_PARAM}));
  EXPECT_TRUE(out.isUntouched());
  EXPECT_EQ(stack.count, 0U);
  EXPECT_THAT(trace.recordsOf(probe::getNextChild), IsEmpty());
}

TEST(FindElementMode, AHandleForWritingFindsNothing)
{
  StreamWriter writer;
  TAVHeader parent = writer.add(group64(kRoot));
  writer.add(u32(kWanted, 1));
  Untouched out;
  TraceLog trace;
  EXPECT_EQ(tavFindElmInt(writer.handle(), &parent, 0, 0, 0, kWanted, nullptr, nullptr, &out.data), TAV_RC_NOT_FOUND);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::getNextChild, 40, TAV_RC_WRONG_MODE},
                                            Failure{probe::findElement, 70, TAV_RC_NOT_FOUND}));
}

} // namespace
