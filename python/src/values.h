/// Payloads as Python values, and back.
#pragma once

#include <cstdint>

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
