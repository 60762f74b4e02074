#include <cstdint>
#include <utility>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "support/byteRows.h"
#include "support/streams.h"
#include "support/traceLog.h"
#include "tav/probes.h"
#include "tav/tav.h"

namespace
{

using namespace tav;
using namespace test;

constexpr uint32_t kRefused = 0x90000035;

/// What a scan gave, beginning as something that no scan gives.
struct Found
{
  uint32_t rc = 0xFFFFFFFF;
  uint64_t offset = 0xA5A5;
  uint64_t eyeSize = 0xA5A5;
  bool swapped = true;
  bool operator==(const Found&) const = default;
};

std::ostream& operator<<(std::ostream& out, const Found& found)
{
  return out << korCodeName(found.rc) << " at " << found.offset << ", distance " << found.eyeSize
             << (found.swapped ? ", swapped" : "");
}

Found failed(uint32_t rc)
{
  return {rc, 0, 0, false};
}

Found scan(TAVHandle* handle, uint64_t start, uint64_t length, bool unused = false)
{
  Found found;
  found.rc = tavFindEyeSizeComboInt(handle, start, length, unused, &found.offset, &found.eyeSize, &found.swapped);
  return found;
}

/// The parameter's byte order is that of the pairs; the handle's own does not count.
class EyeScan : public ::testing::TestWithParam<Form>
{
protected:
  Found scanRows(uint64_t start, uint64_t length, const Form& form)
  {
    StreamReader reader(rows.bytes, form);
    return scan(reader.handle(), start, length);
  }
  Found scanRows(uint64_t start = 0, uint64_t length = 0) { return scanRows(start, length, GetParam()); }
  [[nodiscard]] Found at(uint64_t offset, uint64_t eyeSize) const
  {
    return {TAV_RC_OK, offset, eyeSize, GetParam().swap};
  }
  /// What running off the end of the stream gives.
  [[nodiscard]] Found offTheEnd() const
  {
    return failed(GetParam().buffered ? TAV_RC_END_OF_STORAGE : TAV_RC_NOT_FOUND);
  }

  ByteRows rows{GetParam().swap};
};

TEST_P(EyeScan, FindsAPairAtItsFirstByte)
{
  rows.pair(0x1122334455667788).fill(1);
  EXPECT_EQ(scanRows(), at(0, 0x1122334455667788));
}

TEST_P(EyeScan, FindsAPairFurtherOn)
{
  rows.fill(100, 0x77).pair(40).fill(1);
  EXPECT_EQ(scanRows(3), at(100, 40));
}

TEST_P(EyeScan, FindsTheFirstOfTwoPairs)
{
  rows.fill(5).pair(7).pair(8).fill(1);
  EXPECT_EQ(scanRows(), at(5, 7));
  EXPECT_EQ(scanRows(6), at(21, 8));
}

TEST_P(EyeScan, TellsTheByteOrderOfThePairAndNotOfTheHandle)
{
  rows.fill(5).pair(0x0102).fill(1);
  Form other = GetParam();
  other.swap = !other.swap;
  EXPECT_EQ(scanRows(0, 0, other), at(5, 0x0102));
}

TEST_P(EyeScan, FindsAnEyeCatcherThatEndsAtTheLimit)
{
  rows.fill(4).pair(9).fill(1);
  EXPECT_EQ(scanRows(0, 12), at(4, 9));
  EXPECT_EQ(scanRows(4, 8), at(4, 9));
}

TEST_P(EyeScan, DoesNotFindAnEyeCatcherThatPassesTheLimit)
{
  rows.fill(4).pair(9).fill(1);
  EXPECT_EQ(scanRows(0, 11), failed(TAV_RC_NOT_FOUND));
  EXPECT_EQ(scanRows(4, 7), failed(TAV_RC_NOT_FOUND));
  EXPECT_EQ(scanRows(0, 1), failed(TAV_RC_NOT_FOUND));
}

TEST_P(EyeScan, DoesNotFindAnEyeCatcherWhoseFirstByteLiesBeforeTheStart)
{
  rows.pair(9).fill(1);
  EXPECT_EQ(scanRows(1), offTheEnd());
}

TEST_P(EyeScan, DoesNotTryTheByteThatBreaksAMatchAgain)
{
  const Bytes eye = eyeBytes(GetParam().swap);
  for (size_t matched = 1; matched < eye.size(); ++matched)
  {
    rows.bytes.assign(eye.begin(), eye.begin() + static_cast<ptrdiff_t>(matched));
    rows.data(eye).fill(9);
    EXPECT_EQ(scanRows(), offTheEnd()) << "after " << matched << " bytes of an eye catcher";
  }
}

TEST_P(EyeScan, FindsAnEyeCatcherBehindABrokenMatchAndAnotherByte)
{
  const Bytes eye = eyeBytes(GetParam().swap);
  rows.data({eye[0], eye[1], 0x55}).pair(3).fill(1);
  EXPECT_EQ(scanRows(), at(3, 3));
}

TEST_P(EyeScan, FindsAnEyeCatcherRightBehindAStartOfTheOtherOrder)
{
  const Bytes other = eyeBytes(!GetParam().swap);
  rows.data({other[0], other[1]}).pair(3).fill(1);
  EXPECT_EQ(scanRows(), at(2, 3));
}

TEST_P(EyeScan, FindsNothingInAStreamWithout)
{
  rows.fill(200, 0xED).fill(200, 0xC0);
  EXPECT_EQ(scanRows(), offTheEnd());
}

TEST_P(EyeScan, DoesNotFindAnEyeCatcherThatTheStreamCuts)
{
  rows.fill(10).pair(3);
  rows.bytes.resize(17);
  EXPECT_EQ(scanRows(), offTheEnd());
}

TEST_P(EyeScan, NeedsTheDistanceBehindTheEyeCatcher)
{
  for (uint64_t missing = 1; missing <= 8; ++missing)
  {
    rows.bytes.clear();
    rows.fill(10).pair(3);
    rows.bytes.resize(rows.at() - missing);
    TraceLog trace;
    const uint32_t expected = GetParam().buffered ? TAV_RC_END_OF_STORAGE : TAV_RC_NO_MEMORY;
    EXPECT_EQ(scanRows(), failed(expected));
    EXPECT_THAT(trace.failuresOf(probe::findEyeSizeCombo), ElementsAre(Failure{probe::findEyeSizeCombo, 70, expected}));
  }
}

TEST_P(EyeScan, SeesAPairThatEndsTheStreamInAFileButNotInABlock)
{
  rows.fill(10).pair(3);
  EXPECT_EQ(scanRows(), GetParam().buffered ? at(10, 3) : failed(TAV_RC_NO_MEMORY));
}

TEST_P(EyeScan, ReadsTheDistanceEvenBeyondTheLimit)
{
  rows.pair(0xFFFFFFFFFFFFFFF0).fill(1);
  EXPECT_EQ(scanRows(0, 8), at(0, 0xFFFFFFFFFFFFFFF0));
}

TEST_P(EyeScan, StartsAtTheEndWithNothing)
{
  rows.fill(24);
  EXPECT_EQ(scanRows(24), offTheEnd());
}

TEST_P(EyeScan, RefusesAStartBeyondTheEnd)
{
  rows.fill(24);
  for (const uint64_t start : {uint64_t{25}, ~uint64_t{0} - 7, ~uint64_t{0}})
  {
    TraceLog trace;
    const uint32_t expected = GetParam().buffered ? TAV_RC_END_OF_STORAGE : TAV_RC_NO_MEMORY;
    EXPECT_EQ(scanRows(start), failed(expected)) << start;
    EXPECT_THAT(trace.failuresOf(probe::findEyeSizeCombo), ElementsAre(Failure{probe::findEyeSizeCombo, 50, expected}));
  }
}

TEST_P(EyeScan, ReportsTheFailureOfTheSearchItself)
{
  rows.fill(24);
  TraceLog trace;
  EXPECT_EQ(scanRows(0, 24), failed(TAV_RC_NOT_FOUND));
  EXPECT_THAT(trace.failuresOf(probe::findEyeSizeCombo),
              ElementsAre(Failure{probe::findEyeSizeCombo, 60, TAV_RC_NOT_FOUND}));
}

TEST_P(EyeScan, IsNotAffectedByItsBool)
{
  rows.fill(3).pair(5).fill(1);
  StreamReader reader(rows.bytes, GetParam());
  EXPECT_EQ(scan(reader.handle(), 0, 0, true), at(3, 5));
  EXPECT_EQ(scan(reader.handle(), 0, 0, false), at(3, 5));
}

TEST_P(EyeScan, TracesEntryArgumentsResultAndExit)
{
  rows.fill(3).pair(5).fill(1);
  StreamReader reader(rows.bytes, GetParam());
  Found found;
  TraceLog trace;
  found.rc = tavFindEyeSizeComboInt(reader.handle(), 2, 30, true, &found.offset, &found.eyeSize, &found.swapped);
  ASSERT_EQ(found, at(3, 5));
  constexpr uint32_t id = probe::findEyeSizeCombo;
  EXPECT_THAT(trace.stepsOf(id), ElementsAre(Step{KOR_TRACE_ENTRY, id, 0}, Step{KOR_TRACE_VAR, id, 0},
                                             Step{KOR_TRACE_VAR, id, 100}, Step{KOR_TRACE_EXIT, id, 0}));
  EXPECT_THAT(trace.dump(id, 0).items,
              ElementsAre(bytesOf(reader.handle()), bytesOf(uint64_t{2}), bytesOf(uint64_t{30}), bytesOf(true),
                          bytesOf(&found.offset), bytesOf(&found.eyeSize), bytesOf(&found.swapped)));
  EXPECT_THAT(trace.dump(id, 100).items,
              ElementsAre(bytesOf(uint64_t{3}), bytesOf(uint64_t{5}), bytesOf(GetParam().swap)));
}

INSTANTIATE_TEST_SUITE_P(Forms, EyeScan, ::testing::ValuesIn(accessAndOrder()), kFormName);

/// A pair at every place of a page, and pages of several sizes: eye catcher and distance are cut everywhere.
TEST(EyeScanOverPages, FindsAPairWhereverAPageCutsIt)
{
  for (const bool swap : {false, true})
  {
    for (const uint64_t pageBytes : {8U, 16U, 24U, 64U})
    {
      for (const uint64_t pages : {1U, 2U, 3U})
      {
        for (uint64_t before = 0; before < 2 * pageBytes; ++before)
        {
          Form form;
          form.buffered = true;
          form.pageBytes = pageBytes;
          form.ringBytes = pages * pageBytes;
          StreamReader reader(ByteRows(swap).fill(before, 0x33).pair(0x0807060504030201).bytes, form);
          EXPECT_EQ(scan(reader.handle(), 0, 0), (Found{TAV_RC_OK, before, 0x0807060504030201, swap}))
              << before << " bytes before, " << pages << " pages of " << pageBytes;
        }
      }
    }
  }
}

TEST(EyeScanOverPages, StopsAtTheLimitWhateverThePages)
{
  Form form;
  form.buffered = true;
  form.pageBytes = 8;
  form.ringBytes = 16;
  StreamReader reader(ByteRows().fill(13, 0x33).pair(4).bytes, form);
  EXPECT_EQ(scan(reader.handle(), 0, 20).rc, TAV_RC_NOT_FOUND);
  EXPECT_EQ(scan(reader.handle(), 0, 21).rc, TAV_RC_OK);
}

TEST(EyeScanOverPages, PassesTheCodeOfAnyFetchOn)
{
  const Form form = onePage();
  const Bytes bytes = ByteRows().fill(30, 0x33).pair(4).bytes;
  const std::pair<uint64_t, uint32_t> rows[] = {{1, 50}, {2, 60}, {3, 60}, {4, 0}};
  for (const auto& [nth, point] : rows)
  {
    StreamReader reader(bytes, form);
    reader.vectorStorage().failAt(nth, kRefused);
    TraceLog trace;
    const Found found = scan(reader.handle(), 0, 0);
    if (point != 0)
    {
      EXPECT_EQ(found, failed(kRefused)) << nth;
      EXPECT_THAT(trace.failuresOf(probe::findEyeSizeCombo),
                  ElementsAre(Failure{probe::findEyeSizeCombo, point, kRefused}));
    }
    else
    {
      EXPECT_EQ(found.rc, TAV_RC_OK);
    }
  }
}

TEST(EyeScanOverPages, PassesTheCodeOfTheDistancesFetchOn)
{
  const Form form = onePage();
  StreamReader reader(ByteRows().fill(8, 0x33).pair(4).bytes, form);
  reader.vectorStorage().failAt(2, kRefused);
  TraceLog trace;
  EXPECT_EQ(scan(reader.handle(), 0, 0), failed(kRefused));
  EXPECT_THAT(trace.failuresOf(probe::findEyeSizeCombo), ElementsAre(Failure{probe::findEyeSizeCombo, 70, kRefused}));
}

TEST(EyeScanOverPages, LeavesTheHandlesChunkAlone)
{
  Form form;
  form.buffered = true;
  StreamReader reader(ByteRows().fill(8, 0x33).pair(4).bytes, form);
  const TAVHandle before = *reader.handle();
  EXPECT_EQ(scan(reader.handle(), 0, 0).rc, TAV_RC_OK);
  EXPECT_TRUE(sameBytes(*reader.handle(), before));
}

TEST(EyeScanOverPages, NeedsTheRing)
{
  Form form;
  form.buffered = true;
  StreamReader reader(Bytes(40), form);
  TAVCircularBuf* const ring = std::exchange(reader.handle()->pCircularBuf, nullptr);
  TraceLog trace;
  EXPECT_EQ(scan(reader.handle(), 0, 0), failed(TAV_RC_NO_CIRCULAR_BUF));
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::findEyeSizeCombo, 50, TAV_RC_NO_CIRCULAR_BUF}));
  reader.handle()->pCircularBuf = ring;
}

TEST(EyeScanOverMemory, NeedsTheBlock)
{
  StreamReader reader(Bytes(40));
  reader.handle()->pDirectData = nullptr;
  TraceLog trace;
  EXPECT_EQ(scan(reader.handle(), 0, 0), failed(TAV_RC_NO_MEMORY));
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::findEyeSizeCombo, 50, TAV_RC_NO_MEMORY}));
}

TEST(EyeScanOverMemory, CountsFromTheBlocksOffset)
{
  StreamReader reader(ByteRows().fill(10).pair(6).fill(1).bytes);
  reader.handle()->curOffset = 1000;
  EXPECT_EQ(scan(reader.handle(), 1000, 0), (Found{TAV_RC_OK, 1010, 6, false}));
  EXPECT_EQ(scan(reader.handle(), 1010, 8), (Found{TAV_RC_OK, 1010, 6, false}));
  EXPECT_EQ(scan(reader.handle(), 1011, 0), failed(TAV_RC_NOT_FOUND));
  EXPECT_EQ(scan(reader.handle(), 999, 0), failed(TAV_RC_NO_MEMORY));
  EXPECT_EQ(scan(reader.handle(), 1027, 0), failed(TAV_RC_NOT_FOUND));
  EXPECT_EQ(scan(reader.handle(), 1028, 0), failed(TAV_RC_NO_MEMORY));
}

class EyeScanArguments : public ::testing::Test
{
protected:
  StreamReader reader{ByteRows().pair(1).fill(1).bytes};
  Found found;
};

TEST_F(EyeScanArguments, CheckTheHandleFirst)
{
  TraceLog trace;
  EXPECT_EQ(tavFindEyeSizeComboInt(nullptr, 0, 0, false, nullptr, nullptr, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::findEyeSizeCombo, 10, TAV_RC_BAD_PARAM}));
  constexpr uint32_t id = probe::findEyeSizeCombo;
  EXPECT_THAT(trace.steps(), ElementsAre(Step{KOR_TRACE_ENTRY, id, 0}, Step{KOR_TRACE_VAR, id, 0},
                                         Step{KOR_TRACE_ERROR, id, 10}, Step{KOR_TRACE_EXIT, id, 0}));
}

TEST_F(EyeScanArguments, CheckTheOffsetSecond)
{
  TraceLog trace;
  EXPECT_EQ(tavFindEyeSizeComboInt(reader.handle(), 0, 0, false, nullptr, nullptr, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::findEyeSizeCombo, 20, TAV_RC_BAD_PARAM}));
}

TEST_F(EyeScanArguments, CheckTheEyeSizeThird)
{
  TraceLog trace;
  EXPECT_EQ(tavFindEyeSizeComboInt(reader.handle(), 0, 0, false, &found.offset, nullptr, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::findEyeSizeCombo, 30, TAV_RC_BAD_PARAM}));
}

TEST_F(EyeScanArguments, CheckTheByteOrderLast)
{
  TraceLog trace;
  EXPECT_EQ(tavFindEyeSizeComboInt(reader.handle(), 0, 0, false, &found.offset, &found.eyeSize, nullptr),
            TAV_RC_BAD_PARAM);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::findEyeSizeCombo, 40, TAV_RC_BAD_PARAM}));
}

TEST_F(EyeScanArguments, ZeroTheOutputsThatAreThere)
{
  EXPECT_EQ(scan(nullptr, 0, 0), failed(TAV_RC_BAD_PARAM));

  EXPECT_EQ(tavFindEyeSizeComboInt(reader.handle(), 0, 0, false, nullptr, &found.eyeSize, &found.swapped),
            TAV_RC_BAD_PARAM);
  EXPECT_EQ(found.eyeSize, 0U);
  EXPECT_FALSE(found.swapped);

  EXPECT_EQ(tavFindEyeSizeComboInt(reader.handle(), 0, 0, false, &found.offset, nullptr, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(found.offset, 0U);
}

} // namespace
