/// @file time.hpp
/// Moments, without the header that makes them: `<chrono>` is a fifth of the time that a small program takes to
/// compile, and who has a std::chrono::sys_time has included it.
#pragma once

#include <cstdint>
#include <ctime>
#include <ratio>
#include <type_traits>

#include "tav/tav.h"

namespace tav::detail
{

/// std::chrono::system_clock, known by what only it has: calendar time. libc++ gives it to the clock of its files, too,
/// which counts in 128 bits.
template<class T>
concept SystemClock = requires(const typename T::time_point& moment, std::time_t time)
{
  requires std::is_same_v<decltype(T::to_time_t(moment)), std::time_t>;
  requires std::is_same_v<decltype(T::from_time_t(time)), typename T::time_point>;
  requires sizeof(typename T::rep) <= sizeof(int64_t);
};

/// What a std::chrono::sys_time is made of.
template<class T>
struct SysTimeParts
{
  static constexpr bool isSysTime = false;
};
template<template<class, class> class TimePoint, SystemClock Clock, template<class, class> class Span, class Number,
         class Period>
struct SysTimeParts<TimePoint<Clock, Span<Number, Period>>>
{
  using Duration = Span<Number, Period>;
  using Seconds = Span<int64_t, std::ratio<1>>;
  using Milliseconds = Span<int64_t, std::milli>;
  using Microseconds = Span<int64_t, std::micro>;
  using RealSeconds = Span<double, std::ratio<1>>;
  using WholeSeconds = TimePoint<Clock, Seconds>;
  static constexpr bool isSysTime =
      std::is_same_v<typename Clock::time_point, TimePoint<Clock, typename Clock::duration>>;
};

template<class T>
concept SysTime = SysTimeParts<T>::isSysTime;

/// Fraction A holds the milliseconds, fraction B the microseconds of the millisecond. False for a time that seconds
/// since 1970 in 64 bits cannot tell. `floor` and `duration_cast` are those of the time's own namespace.
template<SysTime Time>
bool toTimeStamp(const Time& time, TAVTimeStamp& stamp) noexcept
{
  using Parts = SysTimeParts<Time>;
  constexpr double tooLate = 9.2e12; // the same in microseconds still fits 63 bits
  const double about = typename Parts::RealSeconds(time.time_since_epoch()).count();
  if (!(about >= 0 && about < tooLate))
  {
    return false;
  }
  const auto whole = floor<typename Parts::Seconds>(time);
  const auto fraction = duration_cast<typename Parts::Microseconds>(time - whole).count();
  stamp = {static_cast<uint64_t>(whole.time_since_epoch().count()), static_cast<uint16_t>(fraction / 1000),
           static_cast<uint16_t>(fraction % 1000), 0, 0};
  return true;
}

/// False for seconds that a clock of this precision cannot show.
template<SysTime Time>
bool fromTimeStamp(const TAVTimeStamp& stamp, Time& time) noexcept
{
  using Parts = SysTimeParts<Time>;
  constexpr double inMicroseconds = 9.2e12; // 63 bits
  constexpr double longest = typename Parts::RealSeconds(Parts::Duration::max()).count();
  constexpr double most = longest < inMicroseconds ? longest : inMicroseconds;
  constexpr double fractions = 100; // can add a minute
  if (!(static_cast<double>(stamp.seconds) < most - fractions))
  {
    return false;
  }
  const typename Parts::WholeSeconds whole{typename Parts::Seconds(static_cast<int64_t>(stamp.seconds))};
  const auto exact =
      whole + typename Parts::Milliseconds(stamp.fractionA) + typename Parts::Microseconds(stamp.fractionB);
  time = floor<typename Parts::Duration>(exact);
  return true;
}

/// A day of the Gregorian calendar.
struct Date
{
  int64_t year;
  uint32_t month;
  uint32_t day;
};

/// The date of a day, counted from 1970. Years are taken to begin in March, so that the day that some of them lack is
/// their last, and go by eras of 400 years, all of which are alike.
constexpr Date dateOf(int64_t days) noexcept
{
  constexpr int64_t daysOfEra = 146097;
  constexpr int64_t untilEpoch = 719468; // from the first of March of the year 0
  const int64_t sinceMarch = days + untilEpoch;
  const int64_t era = (sinceMarch >= 0 ? sinceMarch : sinceMarch - (daysOfEra - 1)) / daysOfEra;
  const auto dayOfEra = static_cast<uint32_t>(sinceMarch - era * daysOfEra);
  const uint32_t yearOfEra = (dayOfEra - dayOfEra / 1460 + dayOfEra / 36524 - dayOfEra / 146096) / 365;
  const uint32_t dayOfYear = dayOfEra - (365 * yearOfEra + yearOfEra / 4 - yearOfEra / 100);
  const uint32_t month = (5 * dayOfYear + 2) / 153; // from March
  const bool isNextYear = month >= 10;
  return {era * 400 + yearOfEra + (isNextYear ? 1 : 0), isNextYear ? month - 9 : month + 3,
          dayOfYear - (153 * month + 2) / 5 + 1};
}

} // namespace tav::detail
