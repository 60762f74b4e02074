// Payloads as Python values.
#include "python/src/values.h"

#include <datetime.h>

#include <type_traits>
#include <vector>

#include "tav/cpp/encode.hpp"
#include "tav/cpp/time.hpp"

namespace tav::python
{

namespace
{

PyObject* arrayType = nullptr; ///< array.array
PyObject* wordCode = nullptr;  ///< "Q"

constexpr uint64_t kSecondsOfDay = 86400;
constexpr uint64_t kMicroseconds = 1'000'000;

PyObject* rawBytes(const tav::detail::RawValue& raw)
{
  return PyBytes_FromStringAndSize(reinterpret_cast<const char*>(raw.bytes), static_cast<Py_ssize_t>(raw.size));
}

template<class Number>
PyObject* smallNumber(const tav::detail::RawValue& raw)
{
  Number number{};
  if (tav::detail::decode(raw, number) != TAV_RC_OK)
  {
    return rawBytes(raw);
  }
  if constexpr (std::is_signed_v<Number>)
  {
    return PyLong_FromLongLong(number);
  }
  else
  {
    return PyLong_FromUnsignedLongLong(number);
  }
}

/// A 128-bit number, by its bytes.
template<class Number>
PyObject* longNumber(const tav::detail::RawValue& raw)
{
  Number number{};
  if (tav::detail::decode(raw, number) != TAV_RC_OK)
  {
    return rawBytes(raw);
  }
  const auto words = tav::detail::joinHalves(static_cast<uint64_t>(number.high), number.low);
  return _PyLong_FromByteArray(reinterpret_cast<const unsigned char*>(words.data()), sizeof words,
                               kor::isLittleEndian ? 1 : 0, std::is_same_v<Number, Sint128> ? 1 : 0);
}

/// Seconds with what the fractions add to them, and the microseconds behind; false where 64 bits do not hold them.
bool wholeSeconds(const TAVTimeStamp& stamp, uint64_t& seconds, uint32_t& microseconds)
{
  const uint32_t fraction = uint32_t{stamp.fractionA} * 1000 + stamp.fractionB;
  seconds = stamp.seconds;
  microseconds = static_cast<uint32_t>(fraction % kMicroseconds);
  return layout::addChecked(seconds, fraction / kMicroseconds);
}

PyObject* moment(const tav::detail::RawValue& raw)
{
  constexpr uint64_t lastSecond = 253402300799; // of the year 9999
  TAVTimeStamp stamp{};
  if (tav::detail::decode(raw, stamp) != TAV_RC_OK)
  {
    return rawBytes(raw);
  }
  uint64_t seconds = 0;
  uint32_t microseconds = 0;
  if (!wholeSeconds(stamp, seconds, microseconds) || seconds > lastSecond)
  {
    return nanosecondsOf(stamp).release();
  }
  const tav::detail::Date date = tav::detail::dateOf(static_cast<int64_t>(seconds / kSecondsOfDay));
  const auto second = static_cast<int>(seconds % kSecondsOfDay);
  return PyDateTimeAPI->DateTime_FromDateAndTime(static_cast<int>(date.year), static_cast<int>(date.month),
                                                 static_cast<int>(date.day), second / 3600, second / 60 % 60,
                                                 second % 60, static_cast<int>(microseconds), PyDateTime_TimeZone_UTC,
                                                 PyDateTimeAPI->DateTimeType);
}

PyObject* text(const tav::detail::RawValue& raw)
{
  std::string_view characters;
  return tav::detail::decode(raw, characters) == TAV_RC_OK ? textOf(characters).release() : rawBytes(raw);
}

PyObject* words(const tav::detail::RawValue& raw)
{
  std::vector<uint64_t> numbers;
  if (tav::detail::decode(raw, numbers) != TAV_RC_OK)
  {
    return rawBytes(raw);
  }
  const Ref bytes = made(PyBytes_FromStringAndSize(reinterpret_cast<const char*>(numbers.data()),
                                                   static_cast<Py_ssize_t>(numbers.size() * sizeof(uint64_t))));
  return PyObject_CallFunctionObjArgs(arrayType, wordCode, bytes.get(), nullptr);
}

long long fieldOf(PyObject* delta, const char* name)
{
  const Ref field = made(PyObject_GetAttrString(delta, name));
  const long long number = PyLong_AsLongLong(field.get());
  if (number == -1 && PyErr_Occurred() != nullptr)
  {
    throw Raised{};
  }
  return number;
}

} // namespace

void prepareValues()
{
  PyDateTime_IMPORT;
  if (PyDateTimeAPI == nullptr)
  {
    throw Raised{};
  }
  const Ref module = made(PyImport_ImportModule("array"));
  arrayType = made(PyObject_GetAttrString(module.get(), "array")).release();
  wordCode = made(PyUnicode_InternFromString("Q")).release();
}

PyObject* valueOf(const tav::detail::RawValue& raw)
{
  switch (raw.type)
  {
  case TAV_TYPE_UINT8:
    return smallNumber<uint8_t>(raw);
  case TAV_TYPE_SINT8:
    return smallNumber<int8_t>(raw);
  case TAV_TYPE_UINT16:
    return smallNumber<uint16_t>(raw);
  case TAV_TYPE_SINT16:
    return smallNumber<int16_t>(raw);
  case TAV_TYPE_UINT32:
    return smallNumber<uint32_t>(raw);
  case TAV_TYPE_SINT32:
    return smallNumber<int32_t>(raw);
  case TAV_TYPE_UINT64:
    return smallNumber<uint64_t>(raw);
  case TAV_TYPE_SINT64:
    return smallNumber<int64_t>(raw);
  case TAV_TYPE_UINT128:
    return longNumber<Uint128>(raw);
  case TAV_TYPE_SINT128:
    return longNumber<Sint128>(raw);
  case TAV_TYPE_BYTE:
    return raw.size == 1 ? PyLong_FromLong(*raw.bytes) : rawBytes(raw);
  case TAV_TYPE_UTC_TIMESTAMP:
    return moment(raw);
  case TAV_TYPE_ASCII_STRING:
  case TAV_TYPE_UTF8_STRING:
    return text(raw);
  case TAV_TYPE_UINT64_ARRAY:
    return words(raw);
  default:
    return rawBytes(raw);
  }
}

Ref nanosecondsOf(const TAVTimeStamp& stamp)
{
  const Ref seconds = numberOf(stamp.seconds);
  const Ref billion = numberOf(1'000'000'000);
  const Ref whole = made(PyNumber_Multiply(seconds.get(), billion.get()));
  const Ref fraction = numberOf((uint64_t{stamp.fractionA} * 1000 + stamp.fractionB) * 1000);
  return made(PyNumber_Add(whole.get(), fraction.get()));
}

bool isMoment(PyObject* value)
{
  return PyDateTime_Check(value) != 0;
}

TAVTimeStamp stampOf(PyObject* value)
{
  const Ref zone = made(PyObject_CallMethod(value, "utcoffset", nullptr));
  if (zone.get() == Py_None)
  {
    raise(PyExc_ValueError, "a datetime without a time zone is no moment: datetime.now(timezone.utc) has one");
  }
  const Ref epoch = made(PyDateTimeAPI->DateTime_FromDateAndTime(1970, 1, 1, 0, 0, 0, 0, PyDateTime_TimeZone_UTC,
                                                                 PyDateTimeAPI->DateTimeType));
  const Ref since = made(PyNumber_Subtract(value, epoch.get()));
  const long long seconds = fieldOf(since.get(), "days") * static_cast<long long>(kSecondsOfDay) +
                            fieldOf(since.get(), "seconds");
  const long long microseconds = fieldOf(since.get(), "microseconds");
  if (seconds < 0)
  {
    fail(TAV_RC_OUTSIDE_PARENT, "a time before 1970");
  }
  const long long east = fieldOf(zone.get(), "days") * static_cast<long long>(kSecondsOfDay) +
                         fieldOf(zone.get(), "seconds");
  TAVTimeStamp stamp{};
  stamp.seconds = static_cast<uint64_t>(seconds);
  stamp.fractionA = static_cast<uint16_t>(microseconds / 1000);
  stamp.fractionB = static_cast<uint16_t>(microseconds % 1000);
  stamp.offsetMinutes = static_cast<decltype(stamp.offsetMinutes)>(east / 60);
  return stamp;
}

} // namespace tav::python
