/// @file decode.hpp
/// Payloads as C++ values.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <utility>
#include <vector>

#include "tav/cpp/header.hpp"
#include "tav/cpp/values.hpp"

namespace tav::detail
{

/// A payload as stored in the stream.
struct RawValue
{
  uint16_t type;
  const uint8_t* bytes;
  uint64_t size;
  bool swap; ///< the stream is in the other byte order

  [[nodiscard]] size_t length() const noexcept
  {
    return static_cast<size_t>(size);
  }
};

/// Copies a fixed-size value into this machine's order. TAV_RC_NOT_SUPPORTED for another type, TAV_RC_OUTSIDE_PARENT
/// for another size.
template<class Value>
uint32_t fixedValue(const RawValue& raw, uint16_t type, Value& out) noexcept
{
  if (raw.type != type)
  {
    return TAV_RC_NOT_SUPPORTED;
  }
  if (raw.size != sizeof out)
  {
    return TAV_RC_OUTSIDE_PARENT;
  }
  const layout::SwapRule rule = layout::typeInfo(type).swapRule;
  std::array<uint8_t, sizeof out> reversed;
  const uint8_t* from = raw.bytes;
  if (raw.swap && layout::swappedPrefix(rule, sizeof out) == sizeof out)
  {
    layout::swapPayload(rule, raw.bytes, reversed.data(), sizeof out);
    from = reversed.data();
  }
  std::memcpy(&out, from, sizeof out);
  return TAV_RC_OK;
}

/// The type of an integer or a timestamp.
template<class T>
constexpr uint16_t fixedType() noexcept
{
  if constexpr (std::same_as<T, TAVTimeStamp>)
  {
    return TAV_TYPE_UTC_TIMESTAMP;
  }
  else
  {
    return integerType<T>();
  }
}

template<StreamInteger T>
uint32_t decode(const RawValue& raw, T& out) noexcept
{
  return fixedValue(raw, integerType<T>(), out);
}

inline uint32_t decode(const RawValue& raw, std::byte& out) noexcept
{
  return fixedValue(raw, TAV_TYPE_BYTE, out);
}

inline uint32_t decode(const RawValue& raw, TAVTimeStamp& out) noexcept
{
  return fixedValue(raw, TAV_TYPE_UTC_TIMESTAMP, out);
}

/// Any of the 128-bit types.
template<Integer128 T>
uint32_t decode(const RawValue& raw, T& out) noexcept
{
  if constexpr (BuiltinInteger128<T>)
  {
    return fixedValue(raw, std::same_as<T, BuiltinUint128> ? TAV_TYPE_UINT128 : TAV_TYPE_SINT128, out);
  }
  else
  {
    std::array<uint64_t, 2> words{};
    const uint32_t rc = fixedValue(raw, std::same_as<T, Uint128> ? TAV_TYPE_UINT128 : TAV_TYPE_SINT128, words);
    const auto [first, second] = words;
    out.high = static_cast<decltype(out.high)>(kor::isLittleEndian ? second : first);
    out.low = kor::isLittleEndian ? first : second;
    return rc;
  }
}

/// The moment. The time zone of the stamp is for showing it and moves nothing.
template<SysTime Time>
uint32_t decode(const RawValue& raw, Time& out) noexcept
{
  TAVTimeStamp stamp{};
  const uint32_t rc = decode(raw, stamp);
  return rc == TAV_RC_OK && !fromTimeStamp(stamp, out) ? TAV_RC_OUTSIDE_PARENT : rc;
}

inline uint32_t decode(const RawValue& raw, Utf8& out) noexcept
{
  if (raw.type != TAV_TYPE_UTF8_STRING)
  {
    return TAV_RC_NOT_SUPPORTED;
  }
  uint16_t codePage = 0;
  if (raw.size < sizeof codePage)
  {
    return TAV_RC_OUTSIDE_PARENT;
  }
  std::memcpy(&codePage, raw.bytes, sizeof codePage);
  out.codePage = raw.swap ? kor::byteswap16(codePage) : codePage;
  out.text = {reinterpret_cast<const char*>(raw.bytes) + sizeof codePage, raw.length() - sizeof codePage};
  return TAV_RC_OK;
}

/// Text of either string type, whatever its code page: which of them a text was written as follows from its characters.
inline uint32_t decode(const RawValue& raw, std::string_view& out) noexcept
{
  if (raw.type == TAV_TYPE_ASCII_STRING)
  {
    out = {reinterpret_cast<const char*>(raw.bytes), raw.length()};
    return TAV_RC_OK;
  }
  Utf8 view;
  const uint32_t rc = decode(raw, view);
  out = view.text;
  return rc;
}

inline uint32_t decode(const RawValue& raw, Utf8Text& out)
{
  Utf8 view;
  const uint32_t rc = decode(raw, view);
  out.text.assign(view.text);
  out.codePage = view.codePage;
  return rc;
}

/// Text of code page 1208 only: others are not what the type says.
inline uint32_t decode(const RawValue& raw, std::u8string_view& out) noexcept
{
  Utf8 view;
  const uint32_t rc = decode(raw, view);
  if (rc != TAV_RC_OK)
  {
    return rc;
  }
  if (view.codePage != kCodePageUtf8)
  {
    return TAV_RC_NOT_SUPPORTED;
  }
  out = {reinterpret_cast<const char8_t*>(view.text.data()), view.text.size()};
  return TAV_RC_OK;
}

inline uint32_t decode(const RawValue& raw, std::u8string& out)
{
  std::u8string_view view;
  const uint32_t rc = decode(raw, view);
  out.assign(view);
  return rc;
}

inline uint32_t decode(const RawValue& raw, std::string& out)
{
  std::string_view view;
  const uint32_t rc = decode(raw, view);
  out.assign(view);
  return rc;
}

inline uint32_t decode(const RawValue& raw, std::span<const std::byte>& out) noexcept
{
  if (raw.type != TAV_TYPE_BINARY)
  {
    return TAV_RC_NOT_SUPPORTED;
  }
  out = {reinterpret_cast<const std::byte*>(raw.bytes), raw.length()};
  return TAV_RC_OK;
}

inline uint32_t decode(const RawValue& raw, std::vector<std::byte>& out)
{
  std::span<const std::byte> view;
  const uint32_t rc = decode(raw, view);
  out.assign(view.begin(), view.end());
  return rc;
}

inline uint32_t decode(const RawValue& raw, std::vector<uint64_t>& out)
{
  if (raw.type != TAV_TYPE_UINT64_ARRAY)
  {
    return TAV_RC_NOT_SUPPORTED;
  }
  if (raw.size % sizeof(uint64_t) != 0)
  {
    return TAV_RC_OUTSIDE_PARENT;
  }
  out.resize(raw.length() / sizeof(uint64_t));
  auto* const to = reinterpret_cast<uint8_t*>(out.data());
  if (raw.swap)
  {
    layout::swapPayload(layout::SwapRule::all64, raw.bytes, to, raw.size);
  }
  else if (raw.size != 0)
  {
    std::memcpy(to, raw.bytes, raw.length());
  }
  return TAV_RC_OK;
}

template<class T>
concept Decodable = requires(const RawValue& raw, T& out)
{
  {
    decode(raw, out)
    } -> std::same_as<uint32_t>;
};

/// The number in a node of any integer type, if `T` can hold it.
template<StreamInteger T>
uint32_t decodeNumber(const RawValue& raw, T& out) noexcept
{
  const auto fit = [&out](auto number) {
    if (!std::in_range<T>(number))
    {
      return TAV_RC_OUTSIDE_PARENT;
    }
    out = static_cast<T>(number); // NOLINT(bugprone-signed-char-misuse): a number, which keeps its sign
    return TAV_RC_OK;
  };
  const auto read = [&](auto number) {
    const uint32_t rc = decode(raw, number);
    return rc == TAV_RC_OK ? fit(number) : rc;
  };
  const auto readLong = [&](auto number) {
    const uint32_t rc = decode(raw, number);
    const bool negative = std::cmp_less(number.high, 0);
    const auto sign = static_cast<uint64_t>(number.high); // all ones above a negative number, else zero
    const auto low = static_cast<int64_t>(number.low);
    const bool isShort = negative ? sign == ~uint64_t{0} && low < 0 : sign == 0;
    return rc != TAV_RC_OK ? rc : !isShort ? TAV_RC_OUTSIDE_PARENT
                              : negative   ? fit(low)
                                           : fit(number.low);
  };
  switch (raw.type)
  {
  case TAV_TYPE_UINT8:
    return read(uint8_t{});
  case TAV_TYPE_SINT8:
    return read(int8_t{});
  case TAV_TYPE_UINT16:
    return read(uint16_t{});
  case TAV_TYPE_SINT16:
    return read(int16_t{});
  case TAV_TYPE_UINT32:
    return read(uint32_t{});
  case TAV_TYPE_SINT32:
    return read(int32_t{});
  case TAV_TYPE_UINT64:
    return read(uint64_t{});
  case TAV_TYPE_SINT64:
    return read(int64_t{});
  case TAV_TYPE_UINT128:
    return readLong(Uint128{});
  case TAV_TYPE_SINT128:
    return readLong(Sint128{});
  default:
    return TAV_RC_NOT_SUPPORTED;
  }
}

/// The C++ type that a data element's value is read as; empty for a type without one.
inline std::string_view readerOf(uint16_t type) noexcept
{
  switch (type)
  {
  case TAV_TYPE_ASCII_STRING:
  case TAV_TYPE_UTF8_STRING:
    return "std::string";
  case TAV_TYPE_UINT8:
    return "uint8_t";
  case TAV_TYPE_SINT8:
    return "int8_t";
  case TAV_TYPE_UINT16:
    return "uint16_t";
  case TAV_TYPE_SINT16:
    return "int16_t";
  case TAV_TYPE_UINT32:
    return "uint32_t";
  case TAV_TYPE_SINT32:
    return "int32_t";
  case TAV_TYPE_UINT64:
    return "uint64_t";
  case TAV_TYPE_SINT64:
    return "int64_t";
  case TAV_TYPE_UTC_TIMESTAMP:
    return "TAVTimeStamp";
  case TAV_TYPE_BINARY:
    return "std::vector<std::byte>";
  case TAV_TYPE_UINT128:
    return "tav::Uint128";
  case TAV_TYPE_SINT128:
    return "tav::Sint128";
  case TAV_TYPE_BYTE:
    return "std::byte";
  case TAV_TYPE_UINT64_ARRAY:
    return "std::vector<uint64_t>";
  default:
    return {};
  }
}

inline bool isIntegerType(uint16_t type) noexcept
{
  return (type >= TAV_TYPE_UINT8 && type <= TAV_TYPE_SINT64) || type == TAV_TYPE_UINT128 || type == TAV_TYPE_SINT128;
}

/// Why a value could not be read as a `T`: "the node is a Sint32: asNumber<uint32_t>()". Empty when the code says it.
template<class T>
[[gnu::noinline, gnu::cold]] std::string readingRefusal(uint32_t code, const HeaderView& node, bool isGroup)
{
  const uint16_t type = node.type();
  if (isGroup)
  {
    return code == TAV_RC_NOT_SUPPORTED ? "the node is a group" : "";
  }
  if (code == TAV_RC_OUTSIDE_PARENT && layout::typeInfo(type).known)
  {
    const uint8_t exact = layout::typeInfo(type).valueSize;
    const bool isSized = exact == 0 || node.size() == exact;
    return isSized ? "the node's value does not fit" : "the node is " + typeText(type) + " of another size";
  }
  if (code != TAV_RC_NOT_SUPPORTED)
  {
    return {};
  }
  const std::string reader(readerOf(type));
  std::string text = "the node is " + typeText(type) + ": ";
  if constexpr (StreamInteger<T>)
  {
    if (isIntegerType(type))
    {
      return text + "asNumber<" + std::string(readerOf(integerType<T>())) + ">()";
    }
  }
  return text + (reader.empty() ? "payload()" : "as<" + reader + ">()");
}

} // namespace tav::detail

namespace tav
{

/// What Node::as gives.
template<class T>
concept Readable = detail::Decodable<T>;

} // namespace tav
