#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <memory>

#include "support/elements.h"
#include "support/failingNew.h"
#include "support/traceLog.h"

namespace
{

using namespace test;
using namespace tav;
using testing::ElementsAre;
using testing::IsEmpty;

/// An entry that gives its number.
TAVHeader entry(uint64_t number)
{
  return header64(number, TAV_TYPE_HEADER64, 7, 0, 16 * number);
}

void fillTo(TAVHdrStack& stack, uint32_t count)
{
  while (stack.count < count)
  {
    const TAVHeader header = entry(stack.count);
    ASSERT_EQ(stack.push(&header), TAV_RC_OK);
  }
}

/// Whether the entries are those of fillTo.
bool isFilled(const TAVHdrStack& stack)
{
  for (uint32_t i = 0; i < stack.count; ++i)
  {
    if (stack.pEntries[i].nodeOffset != 16 * uint64_t{i} || stack.pEntries[i].hdr64.size != i)
    {
      return false;
    }
  }
  return true;
}

TEST(HdrStack, BeginsEmptyWithRoomFor1000)
{
  const TAVHdrStack stack;
  EXPECT_NE(stack.pEntries, nullptr);
  EXPECT_EQ(stack.capacity, 1000U);
  EXPECT_EQ(stack.count, 0U);
}

TEST(HdrStack, KeepsWholeHeadersByValue)
{
  TAVHdrStack stack;
  TAVHeader wide = header64(0x1122334455667788, TAV_TYPE_HEADER64, 9, 0x00400005, 0x10);
  TAVHeader narrow = header32(0x11223344, TAV_TYPE_HEADER32, 8, 0x20);
  const std::string wideBytes = bytesOf(wide);
  const std::string narrowBytes = bytesOf(narrow);
  ASSERT_EQ(stack.push(&wide), TAV_RC_OK);
  ASSERT_EQ(stack.push(&narrow), TAV_RC_OK);
  wide = {};
  narrow = {};

  EXPECT_EQ(stack.count, 2U);
  EXPECT_EQ(bytesOf(stack.pEntries[0]), wideBytes);
  EXPECT_EQ(bytesOf(stack.pEntries[1]), narrowBytes);
}

TEST(HdrStack, TopIsTheLastEntry)
{
  TAVHdrStack stack;
  EXPECT_EQ(stack.top(), nullptr);
  fillTo(stack, 3);
  EXPECT_EQ(stack.top(), stack.pEntries + 2);
  EXPECT_EQ(stack.count, 3U);
}

TEST(HdrStack, PopDropsTheLastEntry)
{
  TAVHdrStack stack;
  fillTo(stack, 2);
  EXPECT_EQ(stack.pop(), TAV_RC_OK);
  EXPECT_EQ(stack.count, 1U);
  EXPECT_EQ(stack.top()->hdr64.size, 0U);
}

TEST(HdrStack, PopCopiesTheLastEntryOut)
{
  TAVHdrStack stack;
  fillTo(stack, 2);
  TAVHeader out{};
  EXPECT_EQ(stack.pop(&out), TAV_RC_OK);
  EXPECT_EQ(bytesOf(out), bytesOf(entry(1)));
  EXPECT_EQ(stack.count, 1U);
}

TEST(HdrStack, AnEmptyStackHasNothingToPop)
{
  TAVHdrStack stack;
  TAVHeader out = entry(5);
  TraceLog trace;
  EXPECT_EQ(stack.pop(), TAV_RC_NO_MEMORY);
  EXPECT_EQ(stack.pop(&out), TAV_RC_NO_MEMORY);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::hdrStackPop, 10, TAV_RC_NO_MEMORY},
                                            Failure{probe::hdrStackPopCopy, 20, TAV_RC_NO_MEMORY}));
  EXPECT_EQ(bytesOf(out), bytesOf(entry(5)));
  EXPECT_EQ(stack.count, 0U);
  EXPECT_EQ(stack.capacity, 1000U);
}

TEST(HdrStack, NullHeadersAreRefused)
{
  TAVHdrStack stack;
  fillTo(stack, 1);
  TraceLog trace;
  EXPECT_EQ(stack.push(nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(stack.pop(nullptr), TAV_RC_BAD_PARAM);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::hdrStackPush, 10, TAV_RC_BAD_PARAM},
                                            Failure{probe::hdrStackPopCopy, 10, TAV_RC_BAD_PARAM}));
  EXPECT_EQ(stack.count, 1U);
}

TEST(HdrStack, The1000thEntryFitsWithoutGrowing)
{
  TAVHdrStack stack;
  TraceLog trace;
  fillTo(stack, 1000);
  EXPECT_THAT(trace.recordsOf(probe::hdrStackGrow), IsEmpty());
  EXPECT_EQ(stack.capacity, 1000U);
}

TEST(HdrStack, The1001stEntryGrowsTheStackOnce)
{
  TAVHdrStack stack;
  fillTo(stack, 1000);
  TraceLog trace;
  fillTo(stack, 1200);
  EXPECT_THAT(trace.stepsOf(probe::hdrStackGrow),
              ElementsAre(Step{KOR_TRACE_ENTRY, probe::hdrStackGrow, 0}, Step{KOR_TRACE_VAR, probe::hdrStackGrow, 0},
                          Step{KOR_TRACE_VAR, probe::hdrStackGrow, 100}, Step{KOR_TRACE_EXIT, probe::hdrStackGrow, 0}));
  EXPECT_THAT(trace.dump(probe::hdrStackGrow, 100).items, ElementsAre(bytesOf(uint32_t{1200})));
  EXPECT_THAT(trace.dump(probe::hdrStackGrow, 0).items, ElementsAre(bytesOf(uint32_t{1000}), bytesOf(uint32_t{200})));
  EXPECT_EQ(stack.capacity, 1200U);
  fillTo(stack, 1201);
  EXPECT_EQ(stack.capacity, 1400U);
}

TEST(HdrStack, GrowingLeavesTheEntriesWhereTheyAre)
{
  TAVHdrStack stack;
  const TAVHeader* const entries = stack.pEntries;
  fillTo(stack, 4000);
  EXPECT_EQ(stack.pEntries, entries);
  EXPECT_TRUE(isFilled(stack));
}

TEST(HdrStack, EachGrowthTakesABlockThatIsReleasedWithTheStack)
{
  const int64_t before = allocations::live();
  {
    TAVHdrStack stack;
    EXPECT_EQ(allocations::live(), before + 1);
    fillTo(stack, 1001);
    EXPECT_EQ(allocations::live(), before + 2);
    fillTo(stack, 1201);
    EXPECT_EQ(allocations::live(), before + 3);
  }
  EXPECT_EQ(allocations::live(), before);
}

TEST(HdrStack, Holds4000EntriesAndRefusesTheNext)
{
  TAVHdrStack stack;
  fillTo(stack, 4000);
  EXPECT_EQ(stack.capacity, 4000U);
  const int64_t before = allocations::live();
  const TAVHeader header = entry(4000);
  for (int i = 0; i < 3; ++i)
  {
    EXPECT_EQ(stack.push(&header), TAV_RC_NO_MEMORY);
  }
  EXPECT_EQ(allocations::live(), before);
  EXPECT_EQ(stack.count, 4000U);
  EXPECT_EQ(stack.capacity, 4000U);
  EXPECT_TRUE(isFilled(stack));
}

TEST(HdrStack, ARefusalIsReportedOnItsWayUp)
{
  TAVHdrStack stack;
  fillTo(stack, 4000);
  const TAVHeader header = entry(4000);
  TraceLog trace;
  EXPECT_EQ(stack.push(&header), TAV_RC_NO_MEMORY);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::hdrStackGrow, 10, TAV_RC_NO_MEMORY},
                                            Failure{probe::hdrStackPush, 20, TAV_RC_NO_MEMORY}));
}

TEST(HdrStack, GoesOnAfterAGrowthThatFailed)
{
  TAVHdrStack stack;
  fillTo(stack, 1000);
  const TAVHeader header = entry(1000);
  {
    const allocations::FailNth fail(1);
    EXPECT_EQ(stack.push(&header), TAV_RC_NO_MEMORY);
  }
  EXPECT_EQ(stack.count, 1000U);
  EXPECT_EQ(stack.capacity, 1000U);
  EXPECT_EQ(stack.push(&header), TAV_RC_OK);
  EXPECT_EQ(stack.capacity, 1200U);
  EXPECT_TRUE(isFilled(stack));
}

/// A stack whose first block could not be allocated.
class HdrStackWithoutABlock : public testing::Test
{
protected:
  static std::unique_ptr<TAVHdrStack> make()
  {
    const allocations::FailNth fail(2); // the object, then its block
    std::unique_ptr<TAVHdrStack> stack(new (std::nothrow) TAVHdrStack);
    EXPECT_TRUE(fail.happened());
    return stack;
  }
};

TEST_F(HdrStackWithoutABlock, SaysNothingOfIt)
{
  TraceLog trace;
  const std::unique_ptr<TAVHdrStack> stack = make();
  EXPECT_EQ(stack->capacity, 0U);
  EXPECT_EQ(stack->count, 0U);
  EXPECT_EQ(stack->pEntries, nullptr);
  EXPECT_THAT(trace.failures(), IsEmpty());
  EXPECT_EQ(stack->top(), nullptr);
  EXPECT_EQ(stack->pop(), TAV_RC_NO_MEMORY);
}

TEST_F(HdrStackWithoutABlock, GrowsAtTheFirstPush)
{
  const std::unique_ptr<TAVHdrStack> stack = make();
  TraceLog trace;
  fillTo(*stack, 1);
  EXPECT_THAT(trace.dump(probe::hdrStackGrow, 0).items, ElementsAre(bytesOf(uint32_t{0}), bytesOf(uint32_t{200})));
  EXPECT_EQ(stack->capacity, 200U);
  EXPECT_EQ(stack->count, 1U);
}

TEST_F(HdrStackWithoutABlock, HoldsAsMuchAsAnyOther)
{
  const int64_t before = allocations::live();
  {
    const std::unique_ptr<TAVHdrStack> stack = make();
    fillTo(*stack, 4000);
    EXPECT_EQ(stack->capacity, 4000U);
    EXPECT_TRUE(isFilled(*stack));
    const TAVHeader header = entry(4000);
    EXPECT_EQ(stack->push(&header), TAV_RC_NO_MEMORY);
  }
  EXPECT_EQ(allocations::live(), before);
}

TEST_F(HdrStackWithoutABlock, RefusesWhileThereIsNoMemory)
{
  const std::unique_ptr<TAVHdrStack> stack = make();
  const TAVHeader header = entry(0);
  const allocations::FailNth fail(1);
  EXPECT_EQ(stack->push(&header), TAV_RC_NO_MEMORY);
  EXPECT_EQ(stack->capacity, 0U);
  EXPECT_EQ(stack->count, 0U);
}

TEST(HdrStackTrace, ShowsTheLifeOfAStack)
{
  TraceLog trace;
  {
    const TAVHdrStack stack;
  }
  EXPECT_THAT(trace.steps(), ElementsAre(Step{KOR_TRACE_ENTRY, 0x88A001A, 0}, Step{KOR_TRACE_VAR, 0x88A001A, 100},
                                         Step{KOR_TRACE_EXIT, 0x88A001A, 0}, Step{KOR_TRACE_ENTRY, 0x88A001B, 0},
                                         Step{KOR_TRACE_EXIT, 0x88A001B, 0}));
  EXPECT_THAT(trace.dump(0x88A001A, 100).items, ElementsAre(bytesOf(uint32_t{1000})));
}

TEST(HdrStackTrace, PushShowsTheHeaderTheCountAndTheCapacity)
{
  TAVHdrStack stack;
  fillTo(stack, 2);
  const TAVHeader header = entry(2);
  TraceLog trace;
  ASSERT_EQ(stack.push(&header), TAV_RC_OK);
  EXPECT_THAT(trace.steps(), ElementsAre(Step{KOR_TRACE_ENTRY, 0x88A001D, 0}, Step{KOR_TRACE_VAR, 0x88A001D, 0},
                                         Step{KOR_TRACE_EXIT, 0x88A001D, 0}));
  EXPECT_THAT(trace.dump(probe::hdrStackPush, 0).items,
              ElementsAre(bytesOf(header), bytesOf(uint32_t{2}), bytesOf(uint32_t{1000})));
}

TEST(HdrStackTrace, TopShowsTheCountAndTheEntry)
{
  TAVHdrStack stack;
  fillTo(stack, 2);
  TraceLog trace;
  stack.top();
  EXPECT_THAT(trace.steps(), ElementsAre(Step{KOR_TRACE_ENTRY, 0x88A0020, 0}, Step{KOR_TRACE_VAR, 0x88A0020, 0},
                                         Step{KOR_TRACE_EXIT, 0x88A0020, 0}));
  EXPECT_THAT(trace.dump(probe::hdrStackTop, 0).items, ElementsAre(bytesOf(uint32_t{2}), bytesOf(entry(1))));
}

TEST(HdrStackTrace, TheTwoPopsHaveProbesOfTheirOwn)
{
  TAVHdrStack stack;
  fillTo(stack, 2);
  TAVHeader out{};
  TAVHeader* const pOut = &out;
  TraceLog trace;
  stack.pop();
  stack.pop(pOut);
  EXPECT_THAT(trace.steps(), ElementsAre(Step{KOR_TRACE_ENTRY, 0x88A001F, 0}, Step{KOR_TRACE_VAR, 0x88A001F, 0},
                                         Step{KOR_TRACE_VAR, 0x88A001F, 100}, Step{KOR_TRACE_EXIT, 0x88A001F, 0},
                                         Step{KOR_TRACE_ENTRY, 0x88A001E, 0}, Step{KOR_TRACE_VAR, 0x88A001E, 0},
                                         Step{KOR_TRACE_VAR, 0x88A001E, 100}, Step{KOR_TRACE_EXIT, 0x88A001E, 0}));
  EXPECT_THAT(trace.dump(0x88A001F, 0).items, ElementsAre(bytesOf(uint32_t{2})));
  EXPECT_THAT(trace.dump(0x88A001F, 100).items, ElementsAre(bytesOf(uint32_t{1})));
  EXPECT_THAT(trace.dump(0x88A001E, 0).items, ElementsAre(bytesOf(pOut), bytesOf(uint32_t{1})));
  EXPECT_THAT(trace.dump(0x88A001E, 100).items, ElementsAre(bytesOf(out), bytesOf(uint32_t{0})));
}

} // namespace
