/// Payloads as Python values, and back.
#pragma once

#include <cstdint>
#include <limits>

#include "python/src/object.h"
#include "tav/cpp/decode.hpp"

namespace tav::python
{

/// Imports what values need of Python.
void prepareValues();

/// The value of a data element, a new reference: int, datetime in UTC, str, bytes, array.array. One whose size does
/// not suit its type, and one of an unknown type, is its bytes; a moment beyond the year 9999 is its nanoseconds since
/// 1970, an int. Null after a failure.
PyObject* valueOf(const tav::detail::RawValue& raw);

/// Nanoseconds since 1970 of a timestamp, as an int of any width.
Ref nanosecondsOf(const TAVTimeStamp& stamp);

/// The same where 64 bits hold them.
inline bool nanosecondsFit(const TAVTimeStamp& stamp, int64_t& nanoseconds) noexcept
{
  constexpr uint64_t most = std::numeric_limits<int64_t>::max();
  constexpr uint64_t billion = 1'000'000'000;
  constexpr uint64_t mostFraction = uint64_t{UINT16_MAX} * 1'001'000;
  const uint64_t fraction = (uint64_t{stamp.fractionA} * 1000 + stamp.fractionB) * 1000;
  const bool fits = stamp.seconds <= (most - mostFraction) / billion || stamp.seconds <= (most - fraction) / billion;
  nanoseconds = fits ? static_cast<int64_t>(stamp.seconds * billion + fraction) : 0;
  return fits;
}

/// A moment from a datetime that knows its zone.
TAVTimeStamp stampOf(PyObject* moment);
bool isMoment(PyObject* value);

/// A value's payload in this machine's order, and its type.
struct Encoded
{
  uint16_t type = 0;
  std::string bytes{};
};

/// The payload of a Python value: of a type that is given, or of the one that `tav json` reads from such a value.
Encoded encode(PyObject* value, PyObject* type);

/// A value as `tav set` takes it.
std::string editText(PyObject* value);

} // namespace tav::python
