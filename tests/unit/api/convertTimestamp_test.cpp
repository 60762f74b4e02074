#include <chrono>
#include <cstdint>
#include <ostream>
#include <random>
#include <string>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "support/traceLog.h"
#include "tav/probes.h"
#include "tav/tav.h"

namespace
{

using namespace tav;
using namespace test;

/// What the caller had in the fields of a date: values that no conversion gives.
constexpr uint16_t kBefore = 0xBEEF;

struct Date
{
  uint16_t year, month, day, hour, minute, second;

  bool operator==(const Date&) const = default;
};

std::ostream& operator<<(std::ostream& out, const Date& date)
{
  return out << date.year << '-' << date.month << '-' << date.day << ' ' << date.hour << ':' << date.minute << ':'
             << date.second;
}

TAVDate dateBefore()
{
  return {kBefore, kBefore, kBefore, kBefore, kBefore, kBefore, kBefore, kBefore, kBefore};
}

Date convert(uint64_t seconds, int16_t offsetMinutes)
{
  TAVDate date = dateBefore();
  EXPECT_EQ(tavTimeStampToDateInt({seconds, 0, 0, 0, offsetMinutes}, &date), TAV_RC_OK);
  return {date.year, date.month, date.day, date.hour, date.minute, date.second};
}

constexpr uint64_t kDay = 86400;

struct Conversion
{
  const char* name;
  uint64_t seconds;
  int16_t offsetMinutes;
  Date date;
};

void PrintTo(const Conversion& row, std::ostream* out)
{
  *out << row.seconds << " s, " << row.offsetMinutes << " min";
}

class TimestampToDate : public ::testing::TestWithParam<Conversion>
{
};

TEST_P(TimestampToDate, GivesTheDateThatStreamsHaveAlwaysShown)
{
  EXPECT_EQ(convert(GetParam().seconds, GetParam().offsetMinutes), GetParam().date);
}

std::string rowName(const ::testing::TestParamInfo<Conversion>& row)
{
  return row.param.name;
}

constexpr Conversion kPlainDates[] = {
    {"FirstSecond", 0, 0, {1970, 1, 1, 0, 0, 0}},
    {"LastSecondOfFirstDay", 86399, 0, {1970, 1, 1, 23, 59, 59}},
    {"SecondDay", 86400, 0, {1970, 1, 2, 0, 0, 0}},
    {"LastSecondOfAMinute", 59, 0, {1970, 1, 1, 0, 0, 59}},
    {"FirstMinute", 60, 0, {1970, 1, 1, 0, 1, 0}},
    {"FirstHour", 3600, 0, {1970, 1, 1, 1, 0, 0}},
    {"EndOfJanuary", 30 * kDay, 0, {1970, 1, 31, 0, 0, 0}},
    {"StartOfFebruary", 31 * kDay, 0, {1970, 2, 1, 0, 0, 0}},
    {"DayBeforeTheLastOfAYear", 363 * kDay, 0, {1970, 12, 30, 0, 0, 0}},
    {"NewYear", 365 * kDay, 0, {1971, 1, 1, 0, 0, 0}},
    {"MorningIn2024", 1705314600, 0, {2024, 1, 15, 10, 30, 0}},
    {"FirstOfMarchInALeapYear", 68256000, 0, {1972, 3, 1, 0, 0, 0}},
    {"NewYearAfterALeapYear", 94694400, 0, {1973, 1, 1, 0, 0, 0}},
};

constexpr Conversion kDatesOffByADay[] = {
    {"FirstOfFebruaryInALeapYear", 65750400, 0, {1972, 1, 31, 0, 0, 0}},
    {"LastOfFebruaryInALeapYear", 68169600, 0, {1972, 2, 28, 0, 0, 0}},
    {"LastOfFebruaryIn2000", 951782400, 0, {2000, 2, 28, 0, 0, 0}},
    {"LastDayBeforeALeapYear", 1703980800, 0, {2024, 1, 1, 0, 0, 0}},
    {"LastDayOfALeapYear", 1735603200, 0, {2025, kBefore, kBefore, 0, 0, 0}},
    {"LastDayOfALeapYearAtItsEnd", 1735603200 + kDay - 1, 0, {2025, kBefore, kBefore, 23, 59, 59}},
    {"LastDayBeforeACommonYear", 364 * kDay, 0, {1971, kBefore, kBefore, 0, 0, 0}},
    {"NewYear2100", 4102444800, 0, {2100, kBefore, kBefore, 0, 0, 0}},
    {"FirstOfMarch2100", 4107542400, 0, {2100, 2, 28, 0, 0, 0}},
    {"LastDayOf9999", 253402214400, 0, {9999, 11, 1, 0, 0, 0}},
};

constexpr Conversion kOffsets[] = {
    {"HourWestUndoesAnHour", 3600, -60, {1970, 1, 1, 0, 0, 0}},
    {"HalfHourZone", 0, 330, {1970, 1, 1, 5, 30, 0}},
    {"LargestOffset", 0, 32767, {1970, 1, 23, 18, 7, 0}},
    {"AcrossTheYear", 365 * kDay, -1, {1971, kBefore, kBefore, 23, 59, 0}},
    {"NegativeSumIsAFarYear", 0, -1, {64723, 6, 3, 6, 59, 16}},
    {"MostNegativeSum", 0, -32768, {64723, 5, 11, 12, 52, 16}},
    {"LargestSeconds", ~uint64_t{0}, 0, {64723, 6, 3, 7, 0, 15}},
    {"SumBeyond64BitsIsAFewSeconds", ~uint64_t{0}, 1, {1970, 1, 1, 0, 0, 59}},
};

// The leap rule looks at the whole year, though the date keeps 16 bits of it: 65636 is a leap year, 100 is not.
// Day 65536 * 1461 - 731 is where the count of leap cycles passes 16 bits and begins again at 0.
constexpr Conversion kFarYears[] = {
    {"LeapRuleOnTheWholeYear", 2009146032000, 0, {100, 1, 1, 0, 0, 0}},
    {"LastDayBeforeTheCyclesPass16Bits", (65536 * uint64_t{1461} - 732) * kDay, 0, {1968, 1, 1, 0, 0, 0}},
    {"FirstDayAfterTheCyclesPass16Bits", (65536 * uint64_t{1461} - 731) * kDay, 0, {2147, 7, 20, 0, 0, 0}},
};

INSTANTIATE_TEST_SUITE_P(Plain, TimestampToDate, ::testing::ValuesIn(kPlainDates), rowName);
INSTANTIATE_TEST_SUITE_P(OffByADay, TimestampToDate, ::testing::ValuesIn(kDatesOffByADay), rowName);
INSTANTIATE_TEST_SUITE_P(Offset, TimestampToDate, ::testing::ValuesIn(kOffsets), rowName);
INSTANTIATE_TEST_SUITE_P(Far, TimestampToDate, ::testing::ValuesIn(kFarYears), rowName);

TEST(TimestampToNoDate, IsABadArgument)
{
  EXPECT_EQ(tavTimeStampToDateInt({}, nullptr), TAV_RC_BAD_PARAM);
}

TEST(TimestampToNoDate, ReportsTheFailureAndNoResult)
{
  TraceLog trace;
  EXPECT_EQ(tavTimeStampToDateInt({}, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_THAT(trace.steps(), ElementsAre(Step{KOR_TRACE_ENTRY, probe::timeStampToDate, 0},
                                         Step{KOR_TRACE_VAR, probe::timeStampToDate, 0},
                                         Step{KOR_TRACE_ERROR, probe::timeStampToDate, 10},
                                         Step{KOR_TRACE_EXIT, probe::timeStampToDate, 0}));
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::timeStampToDate, 10, TAV_RC_BAD_PARAM}));
  EXPECT_EQ(trace.records().back().code, TAV_RC_BAD_PARAM);
}

TEST(TimestampTrace, IsEntryArgumentsResultAndExit)
{
  TAVDate date = dateBefore();
  TraceLog trace;
  ASSERT_EQ(tavTimeStampToDateInt({}, &date), TAV_RC_OK);
  EXPECT_THAT(trace.steps(), ElementsAre(Step{KOR_TRACE_ENTRY, probe::timeStampToDate, 0},
                                         Step{KOR_TRACE_VAR, probe::timeStampToDate, 0},
                                         Step{KOR_TRACE_VAR, probe::timeStampToDate, 20},
                                         Step{KOR_TRACE_EXIT, probe::timeStampToDate, 0}));
  EXPECT_EQ(trace.records().back().code, TAV_RC_OK);
}

TEST(TimestampTrace, ShowsTheTimestampAndThePointer)
{
  const TAVTimeStamp timestamp{1705314600, 0x1234, 0x5678, 0x9ABC, -60};
  TAVDate date = dateBefore();
  TraceLog trace;
  ASSERT_EQ(tavTimeStampToDateInt(timestamp, &date), TAV_RC_OK);
  const Record arguments = trace.dump(probe::timeStampToDate, 0);
  EXPECT_THAT(arguments.items, ElementsAre(bytesOf(timestamp), bytesOf(&date)));
  EXPECT_EQ(arguments.items.at(0).size(), 16U);
}

TEST(TimestampTrace, ShowsTheDate)
{
  TAVDate date = dateBefore();
  TraceLog trace;
  ASSERT_EQ(tavTimeStampToDateInt({1705314600, 1, 2, 3, 0}, &date), TAV_RC_OK);
  const Record result = trace.dump(probe::timeStampToDate, 20);
  EXPECT_THAT(result.items, ElementsAre(bytesOf(date)));
  EXPECT_EQ(result.items.at(0).size(), 18U);
}

TEST(TimestampTrace, CarriesItsProbe)
{
  EXPECT_EQ(probe::timeStampToDate, 0x088A0080U);
}

TEST(TimestampFields, AreCopiedUnchanged)
{
  TAVDate date = dateBefore();
  ASSERT_EQ(tavTimeStampToDateInt({0, 0x1234, 0xFFFF, 0x8001, -32768}, &date), TAV_RC_OK);
  EXPECT_EQ(date.fractionA, 0x1234);
  EXPECT_EQ(date.fractionB, 0xFFFF);
  EXPECT_EQ(date.further, 0x8001);
}

TEST(TimestampFields, OfFractionsDoNotMoveTheClock)
{
  TAVDate date = dateBefore();
  ASSERT_EQ(tavTimeStampToDateInt({59, 0xFFFF, 0xFFFF, 0xFFFF, 0}, &date), TAV_RC_OK);
  EXPECT_EQ(date.second, 59);
  EXPECT_EQ(date.minute, 0);
}

TEST(TimestampCalendar, IsRightUntil2100ButInLeapFebruariesAndOnTheLastDayOfAYear)
{
  using namespace std::chrono;
  for (sys_days day = sys_days(1970y / 1 / 1); day < sys_days(2100y / 1 / 1); day += days(1))
  {
    const year_month_day real(day);
    const bool leapFebruary = real.year().is_leap() && real.month() == February;
    const bool lastDay = real.month() == December && real.day() == 31d;
    const auto seconds = static_cast<uint64_t>(day.time_since_epoch().count()) * kDay;
    const Date expected{static_cast<uint16_t>(static_cast<int>(real.year())),
                        static_cast<uint16_t>(static_cast<unsigned>(real.month())),
                        static_cast<uint16_t>(static_cast<unsigned>(real.day())), 0, 0, 0};
    EXPECT_EQ(convert(seconds, 0) == expected, !leapFebruary && !lastDay) << expected;
  }
}

/// The arithmetic once more, step by step in the order of its definition and without sharing a line with the library.
Date stepByStep(uint64_t seconds, int16_t offset)
{
  static const int kStarts[13] = {0, 31, 59, 90, 120, 151, 181, 212, 243, 273, 304, 334, 365};
  Date date{kBefore, kBefore, kBefore, kBefore, kBefore, kBefore};
  // Adding or taking away, as modulo 2^64 allows, instead of a sign-extended product.
  uint64_t t = seconds;
  t = offset < 0 ? t - uint64_t{60} * static_cast<uint64_t>(-int32_t{offset}) : t + uint64_t{60} * uint64_t(offset);
  date.second = uint16_t(t % 60);
  date.minute = uint16_t(t / 60 % 60);
  date.hour = uint16_t(t / 3600 % 24);
  uint64_t n = t / 86400 + 731;
  n -= (n / 1461) & 0xFFFF;
  const uint64_t year = 1968 + n / 365;
  int d = int(n - n / 365 * 365);
  const bool leap = year % 400 == 0 || (year % 100 != 0 && year % 4 == 0);
  if (leap && d < 31)
  {
    d += 1;
  }
  for (int k = 12; k >= 1; --k)
  {
    if (d > kStarts[k - 1] && d <= kStarts[k])
    {
      date.month = uint16_t(k);
      date.day = uint16_t(d - kStarts[k - 1]);
      break;
    }
  }
  date.year = uint16_t(year);
  return date;
}

class SecondsBelow : public ::testing::TestWithParam<unsigned>
{
};

TEST_P(SecondsBelow, ConvertLikeTheStepsOfTheDefinition)
{
  std::mt19937_64 random(GetParam());
  for (int i = 0; i < 50000; ++i)
  {
    const uint64_t seconds = random() >> (64 - GetParam());
    const auto offset = static_cast<int16_t>(random());
    ASSERT_EQ(convert(seconds, offset), stepByStep(seconds, offset)) << seconds << " s, " << offset << " min";
  }
}

INSTANTIATE_TEST_SUITE_P(PowersOfTwo, SecondsBelow, ::testing::Values(8, 20, 31, 32, 33, 36, 43, 48, 64));

} // namespace
