/// @file encode.hpp
/// C++ values as payloads.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <new>
#include <utility>

#include "tav/core/fastWay.hpp"
#include "tav/cpp/text.hpp"
#include "tav/cpp/time.hpp"
#include "tav/cpp/values.hpp"

namespace tav::detail
{

/// The C++ type of an integer type code; void for others.
template<uint16_t Type>
constexpr auto makeIntegerOf() noexcept
{
  // clang-format off
  if constexpr (Type == TAV_TYPE_UINT8 || Type == TAV_TYPE_BYTE)
  {
    return std::type_identity<uint8_t>();
  }
  else if constexpr (Type == TAV_TYPE_SINT8)
  {
    return std::type_identity<int8_t>();
  }
  else if constexpr (Type == TAV_TYPE_UINT16)
  {
    return std::type_identity<uint16_t>();
  }
  else if constexpr (Type == TAV_TYPE_SINT16)
  {
    return std::type_identity<int16_t>();
  }
  else if constexpr (Type == TAV_TYPE_UINT32)
  {
    return std::type_identity<uint32_t>();
  }
  else if constexpr (Type == TAV_TYPE_SINT32)
  {
    return std::type_identity<int32_t>();
  }
  else if constexpr (Type == TAV_TYPE_UINT64)
  {
    return std::type_identity<uint64_t>();
  }
  else if constexpr (Type == TAV_TYPE_SINT64)
  {
    return std::type_identity<int64_t>();
  }
  else
  {
    return std::type_identity<void>();
  }
  // clang-format on
}

template<uint16_t Type>
using IntegerOf = typename decltype(makeIntegerOf<Type>())::type;

/// The 16 bytes of a value of two halves, in this machine's order.
constexpr std::array<uint64_t, 2> joinHalves(uint64_t high, uint64_t low) noexcept
{
  return kor::isLittleEndian ? std::array<uint64_t, 2>{low, high} : std::array<uint64_t, 2>{high, low};
}

template<class T>
constexpr bool isNullPointer(const T& value) noexcept
{
  if constexpr (std::is_pointer_v<T>)
  {
    return value == nullptr;
  }
  else
  {
    return false;
  }
}

/// Text up to its NUL; an array that has none ends with its last character.
template<class T>
std::string_view textOf(const T& value) noexcept
{
  if constexpr (std::is_array_v<T>)
  {
    constexpr size_t size = std::extent_v<T>;
    const void* const end = std::memchr(value, '\0', size);
    return {value, end != nullptr ? static_cast<size_t>(static_cast<const char*>(end) - value) : size};
  }
  else
  {
    return value;
  }
}

/// Whether a `write` puts payloads where the next node begins, or answers kNotHere: another one is called then.
template<class Write>
concept WritesInPlace = std::remove_cvref_t<Write>::isInPlace;

/// Calls `write(type, bytes, size)` with the payload of UTF-8 text: code page and bytes. Short texts are not allocated.
template<class Write>
uint32_t withUtf8Payload(std::string_view text, uint16_t codePage, Write&& write) noexcept
{
  std::array<uint8_t, 256> room;
  const size_t size = sizeof codePage + text.size();
  if constexpr (WritesInPlace<Write>)
  {
    if (size > room.size())
    {
      return core::kNotHere; // what allocates is for the way that can tell of it
    }
  }
  auto* const larger = size > room.size() ? static_cast<uint8_t*>(::operator new(size, std::nothrow)) : nullptr;
  uint8_t* const bytes = size > room.size() ? larger : room.data();
  if (bytes == nullptr)
  {
    return TAV_RC_NO_MEMORY;
  }
  std::memcpy(bytes, &codePage, sizeof codePage);
  if (!text.empty())
  {
    std::memcpy(bytes + sizeof codePage, text.data(), text.size());
  }
  const uint32_t rc = write(TAV_TYPE_UTF8_STRING, bytes, uint64_t{size});
  ::operator delete(larger);
  return rc;
}

/// Calls `write(type, bytes, size)` with a 128-bit value.
template<Integer128 T, class Write>
[[gnu::always_inline]] inline uint32_t withHalves(const T& value, Write&& write) noexcept
{
  if constexpr (BuiltinInteger128<T>)
  {
    return write(std::same_as<T, BuiltinUint128> ? TAV_TYPE_UINT128 : TAV_TYPE_SINT128, bytesOf(&value),
                 uint64_t{sizeof value});
  }
  else
  {
    const auto words = joinHalves(static_cast<uint64_t>(value.high), value.low);
    return write(std::same_as<T, Uint128> ? TAV_TYPE_UINT128 : TAV_TYPE_SINT128, bytesOf(words.data()),
                 uint64_t{sizeof words});
  }
}

/// Out of line: the usual text shall not pay for it.
template<class Write>
[[gnu::noinline]] uint32_t withTextBeyondAscii(std::string_view text, Write&& write) noexcept
{
  return isUtf8(text) ? withUtf8Payload(text, kCodePageUtf8, write) : TAV_RC_BAD_PARAM;
}

/// Calls `write(type, bytes, size)` with a text: an ASCII String where it is ASCII, else a UTF8 String where it is
/// that. Other bytes are TAV_RC_BAD_PARAM.
template<class Write>
[[gnu::always_inline]] inline uint32_t withText(std::string_view text, Write&& write) noexcept
{
  if (isAscii(text)) [[likely]]
  {
    return write(TAV_TYPE_ASCII_STRING, bytesOf(text.data()), uint64_t{text.size()});
  }
  if constexpr (WritesInPlace<Write>)
  {
    return core::kNotHere; // so that what is written in place needs no place in memory itself
  }
  else
  {
    return withTextBeyondAscii(text, write);
  }
}

/// Calls `write(type, bytes, size)` with a text, a UTF-8 text, bytes or words. A null pointer is TAV_RC_BAD_PARAM.
template<class T, class Write>
[[gnu::always_inline]] inline uint32_t withView(const T& value, Write&& write) noexcept
{
  if (isNullPointer(value))
  {
    return TAV_RC_BAD_PARAM;
  }
  if constexpr (Text<T>)
  {
    return withText(textOf(value), write);
  }
  else if constexpr (Utf8View<T>)
  {
    const std::u8string_view text = value;
    return withUtf8Payload({reinterpret_cast<const char*>(text.data()), text.size()}, kCodePageUtf8, write);
  }
  else if constexpr (BytesView<T>)
  {
    const std::span<const std::byte> bytes = value;
    return write(TAV_TYPE_BINARY, bytesOf(bytes.data()), uint64_t{bytes.size()});
  }
  else
  {
    const std::span<const uint64_t> words = value;
    return write(TAV_TYPE_UINT64_ARRAY, bytesOf(words.data()), uint64_t{words.size_bytes()});
  }
}

/// Calls `write(type, bytes, size)` with a value's payload in this machine's byte order, and returns its code. A value
/// that its type cannot hold is TAV_RC_OUTSIDE_PARENT.
template<Addable T, class Write>
[[gnu::always_inline]] inline uint32_t withPayload(const T& value, Write&& write) noexcept
{
  if constexpr (StreamInteger<T>)
  {
    return write(integerType<T>(), bytesOf(&value), uint64_t{sizeof value});
  }
  else if constexpr (std::same_as<T, std::byte>)
  {
    return write(TAV_TYPE_BYTE, bytesOf(&value), uint64_t{sizeof value});
  }
  else if constexpr (Integer128<T>)
  {
    return withHalves(value, write);
  }
  else if constexpr (std::same_as<T, TAVTimeStamp>)
  {
    return write(TAV_TYPE_UTC_TIMESTAMP, bytesOf(&value), uint64_t{sizeof value});
  }
  else if constexpr (SysTime<T>)
  {
    TAVTimeStamp stamp;
    return toTimeStamp(value, stamp) ? withPayload(stamp, write) : TAV_RC_OUTSIDE_PARENT;
  }
  else if constexpr (std::same_as<T, Utf8> || std::same_as<T, Utf8Text>)
  {
    return withUtf8Payload(value.text, value.codePage, write);
  }
  else
  {
    return withView(value, write);
  }
}

/// As withPayload, for a node whose type is there already: ASCII fits a UTF8 String, too.
template<Addable T, class Write>
uint32_t withPayloadFor(uint16_t type, const T& value, Write&& write) noexcept
{
  if constexpr (Text<T>)
  {
    if (type == TAV_TYPE_UTF8_STRING && !isNullPointer(value) && isUtf8(textOf(value)))
    {
      return withUtf8Payload(textOf(value), kCodePageUtf8, write);
    }
  }
  return withPayload(value, write);
}

/// A value for a call on the side: small ones as a copy, so that the value itself needs no place in memory.
template<class T>
[[gnu::always_inline]] inline decltype(auto) kept(const T& value) noexcept
{
  if constexpr (std::is_trivially_copyable_v<T> && !std::is_array_v<T> && sizeof(T) <= 2 * sizeof(uint64_t))
  {
    return T(value);
  }
  else
  {
    return (value);
  }
}

/// Why withPayload refused a value; null when its code says it.
template<class T>
const char* refusalOf(const T& value, uint32_t code) noexcept
{
  if constexpr (SysTime<T>)
  {
    return code == TAV_RC_OUTSIDE_PARENT ? "a time before 1970, or too late for a timestamp" : nullptr;
  }
  else if constexpr (Text<T>)
  {
    const bool isRefused = code == TAV_RC_BAD_PARAM;
    return !isRefused             ? nullptr
           : isNullPointer(value) ? "the text is a null pointer"
           : !isUtf8(textOf(value))
               ? "the text is neither ASCII nor UTF-8; tav::Utf8 takes a code page, Binary any bytes"
               : nullptr;
  }
  else
  {
    return code == TAV_RC_BAD_PARAM && isNullPointer(value) ? "the text is a null pointer" : nullptr;
  }
}

/// As withPayload, with an integer as a value of a given type.
template<uint16_t Type, StreamInteger T, class Write>
[[gnu::always_inline]] inline uint32_t withPayloadAs(T value, Write&& write) noexcept
{
  using Number = IntegerOf<Type>;
  if constexpr (Type == TAV_TYPE_SINT128 || Type == TAV_TYPE_UINT128)
  {
    const bool negative = std::cmp_less(value, 0);
    const auto words = joinHalves(negative ? ~uint64_t{0} : 0, static_cast<uint64_t>(value));
    return negative && Type == TAV_TYPE_UINT128 ? TAV_RC_OUTSIDE_PARENT
                                                : write(Type, bytesOf(words.data()), uint64_t{sizeof words});
  }
  else
  {
    const auto number = static_cast<Number>(value);
    return std::in_range<Number>(value) ? write(Type, bytesOf(&number), uint64_t{sizeof number})
                                        : TAV_RC_OUTSIDE_PARENT;
  }
}

/// The type codes that withPayloadAs takes.
template<uint16_t Type>
inline constexpr bool isIntegerTypeCode =
    !std::is_void_v<IntegerOf<Type>> || Type == TAV_TYPE_UINT128 || Type == TAV_TYPE_SINT128;

} // namespace tav::detail
