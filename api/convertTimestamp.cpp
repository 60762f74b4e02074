/// Timestamps to calendar dates.
#include <array>

#include "tav/probes.h"
#include "tav/tav.h"
#include "trace/traceFrame.h"

using namespace tav;
using namespace tav::inside;

namespace
{

constexpr std::array<uint64_t, 13> kMonthStarts{0, 31, 59, 90, 120, 151, 181, 212, 243, 273, 304, 334, 365};
constexpr uint64_t kEpochYear = 1968;       // the first year of a leap cycle
constexpr uint64_t kDaysToEpoch = 731;      // from there to 1970
constexpr uint64_t kDaysOfFourYears = 1461; // one leap day among them
constexpr uint64_t kDaysOfYear = 365;
constexpr uint64_t kLastDayOfJanuary = 30;

constexpr bool isLeapYear(uint64_t year)
{
  return (year % 4 == 0 && year % 100 != 0) || year % 400 == 0;
}

/// Year, month and day of a day count. The single correction for leap years leaves February of a leap year a day late,
/// and a year's last day without a month or in the next year; dates in existing texts are these.
void setDay(uint64_t days, TAVDate& date)
{
  uint64_t shifted = days + kDaysToEpoch;
  shifted -= static_cast<uint16_t>(shifted / kDaysOfFourYears);
  const uint64_t year = kEpochYear + shifted / kDaysOfYear;
  uint64_t day = shifted % kDaysOfYear;
  if (isLeapYear(year) && day <= kLastDayOfJanuary)
  {
    ++day;
  }
  for (size_t month = 1; month < kMonthStarts.size(); ++month)
  {
    if (kMonthStarts[month - 1] < day && day <= kMonthStarts[month])
    {
      date.month = static_cast<uint16_t>(month);
      date.day = static_cast<uint16_t>(day - kMonthStarts[month - 1]);
    }
  }
  date.year = static_cast<uint16_t>(year);
}

void convert(const TAVTimeStamp& timestamp, TAVDate& date)
{
  date.fractionA = timestamp.fractionA;
  date.fractionB = timestamp.fractionB;
  date.further = timestamp.further;
  const uint64_t seconds = timestamp.seconds + static_cast<uint64_t>(int64_t{timestamp.offsetMinutes} * 60);
  const uint64_t minutes = seconds / 60;
  const uint64_t hours = minutes / 60;
  date.second = static_cast<uint16_t>(seconds % 60);
  date.minute = static_cast<uint16_t>(minutes % 60);
  date.hour = static_cast<uint16_t>(hours % 24);
  setDay(hours / 24, date);
}

} // namespace

uint32_t tavTimeStampToDateInt(TAVTimeStamp timestamp, TAVDate* date)
{
  TraceFrame frame(probe::timeStampToDate);
  frame.dump(0, timestamp, date);
  if (frame.require(10, date != nullptr, TAV_RC_BAD_PARAM))
  {
    convert(timestamp, *date);
    frame.dump(20, trace::record(date));
  }
  return frame.code();
}
