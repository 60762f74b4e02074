// Python values as payloads.
#include <array>
#include <optional>

#include "python/src/names.h"
#include "python/src/values.h"
#include "tav/cpp/encode.hpp"

namespace tav::python
{

namespace
{

/// The bytes of an object with a buffer, while this lives.
class Buffer
{
public:
  explicit Buffer(PyObject* object) { done(PyObject_GetBuffer(object, &view_, PyBUF_FORMAT | PyBUF_ANY_CONTIGUOUS)); }
  Buffer(const Buffer&) = delete;
  Buffer& operator=(const Buffer&) = delete;
  ~Buffer() { PyBuffer_Release(&view_); }

  std::string bytes() const { return {static_cast<const char*>(view_.buf), static_cast<size_t>(view_.len)}; }
  /// The letter of its items' type, of one in this machine's order.
  char letter() const
  {
    const std::string_view format = view_.format != nullptr ? view_.format : "B";
    const std::string_view letters = format.starts_with('@') || format.starts_with('=') ? format.substr(1) : format;
    return letters.size() == 1 ? letters.front() : '\0';
  }
  bool isWords() const { return view_.itemsize == 8 && (letter() == 'Q' || letter() == 'L'); }
  bool isBytes() const { return view_.itemsize == 1 && (letter() == 'B' || letter() == 'b' || letter() == 'c'); }

private:
  Py_buffer view_{};
};

template<class Number>
std::string rawOf(const Number& number)
{
  return {reinterpret_cast<const char*>(&number), sizeof number};
}

struct IntegerForm
{
  size_t size;
  bool isSigned;
};

std::optional<IntegerForm> integerForm(uint16_t type)
{
  switch (type)
  {
  case TAV_TYPE_UINT128:
    return IntegerForm{16, false};
  case TAV_TYPE_SINT128:
    return IntegerForm{16, true};
  case TAV_TYPE_BYTE:
    return IntegerForm{1, false};
  default:
    if (!tav::detail::isIntegerType(type))
    {
      return std::nullopt;
    }
    return IntegerForm{layout::typeInfo(type).valueSize, (type - TAV_TYPE_UINT8) % 2 != 0};
  }
}

/// A whole number in the bytes of a type; nothing where it does not fit.
std::optional<std::string> integerBytes(PyObject* number, const IntegerForm& form)
{
  std::array<unsigned char, 16> bytes{};
  auto* const digits = reinterpret_cast<PyLongObject*>(number);
  const int failed =
      _PyLong_AsByteArray(digits, bytes.data(), form.size, kor::isLittleEndian ? 1 : 0, form.isSigned ? 1 : 0);
  if (failed != 0)
  {
    if (PyErr_ExceptionMatches(PyExc_OverflowError) == 0)
    {
      throw Raised{};
    }
    PyErr_Clear();
    return std::nullopt;
  }
  return std::string(reinterpret_cast<const char*>(bytes.data()), form.size);
}

/// The type that the number has as `tav build` reads it: of 32, 64 or 128 bits.
Encoded encodeNumber(PyObject* value)
{
  const Ref number = made(PyNumber_Index(value));
  const bool isNegative = _PyLong_Sign(number.get()) < 0;
  constexpr std::array<uint16_t, 3> plain = {TAV_TYPE_UINT32, TAV_TYPE_UINT64, TAV_TYPE_UINT128};
  constexpr std::array<uint16_t, 3> withSign = {TAV_TYPE_SINT32, TAV_TYPE_SINT64, TAV_TYPE_SINT128};
  for (const uint16_t type : isNegative ? withSign : plain)
  {
    auto bytes = integerBytes(number.get(), *integerForm(type));
    if (bytes)
    {
      return {type, std::move(*bytes)};
    }
  }
  fail(TAV_RC_OUTSIDE_PARENT, "the number does not fit 128 bits");
}

Encoded encodeNumberAs(PyObject* value, uint16_t type, const IntegerForm& form)
{
  const Ref number = made(PyNumber_Index(value));
  auto bytes = integerBytes(number.get(), form);
  if (!bytes)
  {
    fail(TAV_RC_OUTSIDE_PARENT, "the number does not fit the type");
  }
  return {type, std::move(*bytes)};
}

Encoded encodeText(PyObject* value, std::optional<uint16_t> type)
{
  std::string text = bytesOfText(value);
  const bool isAscii = tav::detail::isAscii(text);
  if (!isAscii && !tav::detail::isUtf8(text))
  {
    fail(TAV_RC_BAD_PARAM, "the text is no UTF-8; bytes can be added as they are");
  }
  const uint16_t own = isAscii ? TAV_TYPE_ASCII_STRING : TAV_TYPE_UTF8_STRING;
  const uint16_t wanted = type.value_or(own);
  if (wanted == TAV_TYPE_ASCII_STRING && !isAscii)
  {
    fail(TAV_RC_BAD_PARAM, "the text is not ASCII");
  }
  if (wanted == TAV_TYPE_UTF8_STRING)
  {
    text.insert(0, rawOf(kCodePageUtf8));
  }
  return {wanted, std::move(text)};
}

Encoded encodeWords(PyObject* values)
{
  const Ref items = made(PySequence_Fast(values, "a sequence of whole numbers is expected"));
  Encoded encoded{TAV_TYPE_UINT64_ARRAY};
  const Py_ssize_t count = PySequence_Fast_GET_SIZE(items.get());
  for (Py_ssize_t i = 0; i < count; ++i)
  {
    encoded.bytes += encodeNumberAs(PySequence_Fast_GET_ITEM(items.get(), i), TAV_TYPE_UINT64, {8, false}).bytes;
  }
  return encoded;
}

/// Nanoseconds since 1970: what they have below a microsecond a timestamp cannot tell.
TAVTimeStamp stampOfNanoseconds(PyObject* value)
{
  const Ref number = made(PyNumber_Index(value));
  const unsigned long long nanoseconds = PyLong_AsUnsignedLongLong(number.get());
  if (PyErr_Occurred() != nullptr)
  {
    PyErr_Clear();
    fail(TAV_RC_OUTSIDE_PARENT, "a time before 1970, or beyond 64 bits of nanoseconds");
  }
  const uint64_t microseconds = nanoseconds / 1000;
  TAVTimeStamp stamp{};
  stamp.seconds = microseconds / 1'000'000;
  stamp.fractionA = static_cast<uint16_t>(microseconds / 1000 % 1000);
  stamp.fractionB = static_cast<uint16_t>(microseconds % 1000);
  return stamp;
}

[[noreturn]] void refuse(PyObject* value)
{
  PyErr_Format(PyExc_TypeError,
               "%.100s has no type in a stream: int, str, datetime, bytes, and sequences of whole numbers have one",
               Py_TYPE(value)->tp_name);
  throw Raised{};
}

[[noreturn]] void refuseAs(PyObject* value, uint16_t type)
{
  const Ref name = Ref::borrowed(typeNameOf(type));
  PyErr_Format(PyExc_TypeError, "%.100s is no value for the type %S; bytes are its payload as they are",
               Py_TYPE(value)->tp_name, name.get());
  throw Raised{};
}

bool isSequence(PyObject* value)
{
  return PyList_Check(value) != 0 || PyTuple_Check(value) != 0;
}

Encoded encodeBuffer(PyObject* value)
{
  const Buffer buffer(value);
  if (!buffer.isWords() && !buffer.isBytes())
  {
    raise(PyExc_TypeError, "a buffer of bytes or of unsigned 64-bit numbers is expected");
  }
  return {buffer.isWords() ? TAV_TYPE_UINT64_ARRAY : TAV_TYPE_BINARY, buffer.bytes()};
}

Encoded encodeByValue(PyObject* value)
{
  if (PyBool_Check(value) != 0)
  {
    return {TAV_TYPE_UINT8, std::string(1, value == Py_True ? '\1' : '\0')};
  }
  if (PyUnicode_Check(value) != 0)
  {
    return encodeText(value, std::nullopt);
  }
  if (isMoment(value))
  {
    return {TAV_TYPE_UTC_TIMESTAMP, rawOf(stampOf(value))};
  }
  if (PyIndex_Check(value) != 0) // before buffers, which NumPy's numbers have, too
  {
    return encodeNumber(value);
  }
  if (isSequence(value))
  {
    return encodeWords(value);
  }
  return PyObject_CheckBuffer(value) != 0 ? encodeBuffer(value) : (refuse(value), Encoded{});
}

Encoded encodeAs(PyObject* value, uint16_t type)
{
  const auto integer = integerForm(type);
  if (integer && PyIndex_Check(value) != 0)
  {
    return encodeNumberAs(value, type, *integer);
  }
  if (PyUnicode_Check(value) != 0 && (type == TAV_TYPE_ASCII_STRING || type == TAV_TYPE_UTF8_STRING))
  {
    return encodeText(value, type);
  }
  if (type == TAV_TYPE_UTC_TIMESTAMP && isMoment(value))
  {
    return {type, rawOf(stampOf(value))};
  }
  if (type == TAV_TYPE_UTC_TIMESTAMP && PyIndex_Check(value) != 0)
  {
    return {type, rawOf(stampOfNanoseconds(value))};
  }
  if (type == TAV_TYPE_UINT64_ARRAY && isSequence(value))
  {
    return encodeWords(value);
  }
  if (PyObject_CheckBuffer(value) == 0 || layout::isGroupType(type))
  {
    refuseAs(value, type);
  }
  return {type, Buffer(value).bytes()};
}

} // namespace

Encoded encode(PyObject* value, PyObject* type)
{
  return type == nullptr || type == Py_None ? encodeByValue(value) : encodeAs(value, typeOf(type));
}

std::string editText(PyObject* value)
{
  if (PyUnicode_Check(value) != 0)
  {
    return bytesOfText(value);
  }
  if (isMoment(value))
  {
    return bytesOfText(made(PyObject_CallMethod(value, "isoformat", nullptr)).get());
  }
  if (PyIndex_Check(value) != 0)
  {
    return bytesOfText(made(PyObject_Str(made(PyNumber_Index(value)).get())).get());
  }
  if (isSequence(value))
  {
    std::string text;
    const Ref items = made(PySequence_Fast(value, "a sequence is expected"));
    for (Py_ssize_t i = 0; i < PySequence_Fast_GET_SIZE(items.get()); ++i)
    {
      text += (text.empty() ? "" : " ") + editText(PySequence_Fast_GET_ITEM(items.get(), i));
    }
    return "[" + text + "]";
  }
  if (PyObject_CheckBuffer(value) == 0)
  {
    refuse(value);
  }
  return bytesOfText(made(PyObject_CallMethod(made(PyBytes_FromObject(value)).get(), "hex", nullptr)).get());
}

} // namespace tav::python
