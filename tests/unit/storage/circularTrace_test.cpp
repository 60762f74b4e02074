/// What the ring's operations and steps leave in a trace when they succeed.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "storage/ringFixture.h"

namespace
{

using namespace test;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
namespace probe = tav::probe;

/// The items of one record.
using Items = std::vector<std::string>;

template<class... Values>
Items itemsOf(const Values&... values)
{
  return {bytesOf(values)...};
}

/// The dumps of a probe at a point, in order.
std::vector<Items> dumpsOf(const TraceLog& trace, uint32_t id, uint32_t point)
{
  std::vector<Items> dumps;
  for (const Record& record : trace.recordsOf(id))
  {
    if (record.kind == KOR_TRACE_VAR && record.point == point)
    {
      dumps.push_back(record.items);
    }
  }
  return dumps;
}

TEST(RingTrace, ShowsThatItIsEmptyAndHowMuchItCaches)
{
  SmallRing small(100);
  TraceLog trace;
  EXPECT_FALSE(small.ring.isCached(3));
  EXPECT_THAT(dumpsOf(trace, probe::cbIsEmpty, 100), ElementsAre(itemsOf(uint8_t{1})));
  EXPECT_THAT(dumpsOf(trace, probe::cbCachedCount, 100), IsEmpty());
  small.cache(0, 40, 12);
  trace.clear();
  EXPECT_TRUE(small.ring.isCached(43));
  EXPECT_THAT(dumpsOf(trace, probe::cbIsEmpty, 100), ElementsAre(itemsOf(uint8_t{0})));
  EXPECT_THAT(dumpsOf(trace, probe::cbCachedCount, 100), ElementsAre(itemsOf(uint64_t{12})));
}

TEST(RingTrace, ShowsTheIndexOfAnOffset)
{
  SmallRing small(100);
  small.cache(20, 40, 12);
  TraceLog trace;
  EXPECT_TRUE(small.ring.isCached(46)); // behind the ring's end
  EXPECT_FALSE(small.ring.isCached(52));
  EXPECT_THAT(dumpsOf(trace, probe::cbOffsetToIndex, 0), ElementsAre(itemsOf(uint64_t{46}), itemsOf(uint64_t{52})));
  EXPECT_THAT(dumpsOf(trace, probe::cbOffsetToIndex, 100),
              ElementsAre(itemsOf(true, uint64_t{2}), itemsOf(false, uint64_t{0})));
}

TEST(RingTrace, ShowsThePagesThatAreMarked)
{
  SmallRing small(100);
  small.cache(4, 40, 16);
  TraceLog trace;
  ASSERT_EQ(small.ring.markPages(46, 9), TAV_RC_OK);
  EXPECT_THAT(dumpsOf(trace, probe::cbMarkPages, 100), ElementsAre(itemsOf(uint64_t{1}, uint64_t{2})));
  EXPECT_THAT(dumpsOf(trace, probe::cbPageOfIndex, 0), ElementsAre(itemsOf(uint64_t{10}), itemsOf(uint64_t{19})));
  EXPECT_THAT(dumpsOf(trace, probe::cbPageOfIndex, 100), ElementsAre(itemsOf(uint64_t{1}), itemsOf(uint64_t{2})));
}

TEST(RingTrace, ShowsWhatAFillLeavesCached)
{
  SmallRing small(100);
  TraceLog trace;
  ASSERT_EQ(small.ring.reposition(32, 0, 1), TAV_RC_OK);
  EXPECT_THAT(dumpsOf(trace, probe::cbReadPages, 100), ElementsAre(itemsOf(uint64_t{2}, uint64_t{16})));
  EXPECT_THAT(dumpsOf(trace, probe::cbFill, 100), ElementsAre(itemsOf(uint64_t{32}, uint64_t{16})));
  EXPECT_THAT(dumpsOf(trace, probe::cbReposition, 100), ElementsAre(itemsOf(uint64_t{32}, uint64_t{16})));
}

TEST(RingTrace, ShowsNoResultOfAFillThatFailed)
{
  SmallRing small(100);
  small.storage.failAt(1, KOR_RC_IO_ERROR);
  TraceLog trace;
  ASSERT_EQ(small.ring.reposition(32, 0, 1), KOR_RC_IO_ERROR);
  for (const uint32_t id : {probe::cbReadPages, probe::cbFill, probe::cbReposition})
  {
    EXPECT_THAT(dumpsOf(trace, id, 100), IsEmpty()) << probe::functionName(id);
  }
}

TEST(RingTrace, ShowsHowManyPagesAreReleased)
{
  SmallRing small(100);
  small.cache(0, 40, 20);
  TraceLog trace;
  ASSERT_EQ(small.ring.reset(), TAV_RC_OK);
  ASSERT_EQ(small.ring.reset(), TAV_RC_OK);
  EXPECT_THAT(dumpsOf(trace, probe::cbReleasePages, 100),
              ElementsAre(itemsOf(uint64_t{3}, uint64_t{0}), itemsOf(uint64_t{0}, uint64_t{0})));
}

TEST(RingTrace, ShowsNoResultOfAReleaseThatFailed)
{
  SmallRing small(100);
  small.cache(0, 40, 20);
  small.storage.failAt(1, KOR_RC_IO_ERROR);
  TraceLog trace;
  ASSERT_EQ(small.ring.reset(), KOR_RC_IO_ERROR);
  EXPECT_THAT(dumpsOf(trace, probe::cbReleasePages, 100), IsEmpty());
}

TEST(RingTrace, ShowsWhereAWriteEnded)
{
  SmallRing small(100);
  small.cache(0, 40, 20);
  TraceLog trace;
  ASSERT_EQ(small.write(42, {1, 2, 3}), TAV_RC_OK);
  ASSERT_EQ(small.write(80, {1, 2, 3, 4}, true), TAV_RC_OK); // straight to the storage
  EXPECT_THAT(dumpsOf(trace, probe::cbWrite, 100), ElementsAre(itemsOf(uint64_t{45}), itemsOf(uint64_t{84})));
  small.storage.failAt(1, KOR_RC_IO_ERROR);
  trace.clear();
  ASSERT_EQ(small.write(90, {1}, true), KOR_RC_IO_ERROR);
  EXPECT_THAT(dumpsOf(trace, probe::cbWrite, 100), IsEmpty());
}

TEST(RingTrace, ShowsTheOffsetOfABackwardChunk)
{
  SmallRing small(100);
  small.cache(2, 40, 12);
  TraceLog trace;
  ASSERT_EQ(small.chunk(44, 3, true), TAV_RC_OK);
  EXPECT_THAT(dumpsOf(trace, probe::cbIndexToOffset, 100), ElementsAre(itemsOf(small.area.chunkOffset)));
}

} // namespace
