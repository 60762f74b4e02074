/// @file values.hpp
/// Values of the stream as C++ types, and C++ values as payloads.
#pragma once

#include <array>
#include <chrono>
#include <compare>
#include <concepts>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <span>
#include <string>
#include <string_view>
#include <type_traits>
#include <utility>
#include <vector>

#include "tav/layout.hpp"

namespace tav
{

/// The order of a stream's bytes, seen from this machine.
enum class ByteOrder : uint8_t
{
  native,
  swapped
};

/// The two forms of a header.
enum class Width : uint8_t
{
  bits32 = TAV_HDR_32,
  bits64 = TAV_HDR_64
};

inline constexpr uint16_t kCodePageUtf8 = 1208;

/// UTF-8 text to be written, as an ordinary element that a walk passes correctly.
struct Utf8
{
  std::string_view text;
  uint16_t codePage = kCodePageUtf8;
};

/// UTF-8 text that was read.
struct Utf8Text
{
  std::string text;
  uint16_t codePage = kCodePageUtf8;
  bool operator==(const Utf8Text&) const = default;
};

/// 128-bit values, in two halves that any compiler has.
struct Uint128
{
  uint64_t high = 0;
  uint64_t low = 0;
  auto operator<=>(const Uint128&) const = default;
};

struct Sint128
{
  int64_t high = 0;
  uint64_t low = 0;
  auto operator<=>(const Sint128&) const = default;
};

/// The integers that have a type in the stream. bool and the character types are not among them: they would change
/// their meaning silently.
template<class T>
concept StreamInteger = std::same_as<T, int8_t> || std::same_as<T, uint8_t> || std::same_as<T, int16_t> ||
    std::same_as<T, uint16_t> || std::same_as<T, int32_t> || std::same_as<T, uint32_t> ||
    (std::integral<T> && sizeof(T) == 8 && !std::same_as<T, bool>);

namespace detail
{

template<class T>
inline constexpr bool isSysTime = false;
template<class Duration>
inline constexpr bool isSysTime<std::chrono::sys_time<Duration>> = true;

template<StreamInteger T>
constexpr uint16_t integerType()
{
  constexpr std::array<uint16_t, 4> types{TAV_TYPE_UINT8, TAV_TYPE_UINT16, TAV_TYPE_UINT32, TAV_TYPE_UINT64};
  constexpr size_t place = sizeof(T) == 1 ? 0 : sizeof(T) == 2 ? 1
                                            : sizeof(T) == 4   ? 2
                                                               : 3;
  return static_cast<uint16_t>(types[place] + (std::is_signed_v<T> ? 1 : 0));
}

/// The integer of a type code; void for others.
template<uint16_t Type>
using IntegerOf = std::conditional_t<
    Type == TAV_TYPE_UINT8 || Type == TAV_TYPE_BYTE, uint8_t,
    std::conditional_t<
        Type == TAV_TYPE_SINT8, int8_t,
        std::conditional_t<
            Type == TAV_TYPE_UINT16, uint16_t,
            std::conditional_t<
                Type == TAV_TYPE_SINT16, int16_t,
                std::conditional_t<
                    Type == TAV_TYPE_UINT32, uint32_t,
                    std::conditional_t<Type == TAV_TYPE_SINT32, int32_t,
                                       std::conditional_t<Type == TAV_TYPE_UINT64, uint64_t,
                                                          std::conditional_t<Type == TAV_TYPE_SINT64, int64_t, void>>>>>>>>;

template<class T>
concept Text = std::convertible_to<const T&, std::string_view>;
template<class T>
concept Utf8View = std::convertible_to<const T&, std::u8string_view>;
template<class T>
concept BytesView = std::convertible_to<const T&, std::span<const std::byte>>;
template<class T>
concept WordsView = std::convertible_to<const T&, std::span<const uint64_t>>;

/// What Writer::add takes.
template<class T>
concept Addable = StreamInteger<T> || std::same_as<T, std::byte> || std::same_as<T, Utf8> ||
    std::same_as<T, Utf8Text> || std::same_as<T, Uint128> || std::same_as<T, Sint128> ||
    std::same_as<T, TAVTimeStamp> || isSysTime<T> || Text<T> || Utf8View<T> || BytesView<T> ||
    WordsView<T>;

template<class Value>
const uint8_t* bytesOf(const Value* value)
{
  return reinterpret_cast<const uint8_t*>(value);
}

/// The 16 bytes of a value of two halves, in this machine's order.
inline std::array<uint64_t, 2> joinHalves(uint64_t high, uint64_t low)
{
  return std::endian::native == std::endian::little ? std::array<uint64_t, 2>{low, high}
                                                    : std::array<uint64_t, 2>{high, low};
}

inline std::pair<uint64_t, uint64_t> splitHalves(const uint8_t* bytes)
{
  std::array<uint64_t, 2> words;
  std::memcpy(words.data(), bytes, sizeof words);
  return std::endian::native == std::endian::little ? std::pair(words[1], words[0]) : std::pair(words[0], words[1]);
}

/// Fraction A holds the milliseconds, fraction B the microseconds of the millisecond.
template<class Duration>
TAVTimeStamp toTimeStamp(std::chrono::sys_time<Duration> time)
{
  using namespace std::chrono;
  const auto whole = floor<seconds>(time);
  const auto fraction = duration_cast<microseconds>(time - whole).count();
  return {static_cast<uint64_t>(whole.time_since_epoch().count()), static_cast<uint16_t>(fraction / 1000),
          static_cast<uint16_t>(fraction % 1000), 0, 0};
}

/// False for seconds that no system clock has.
template<class Duration>
bool fromTimeStamp(const TAVTimeStamp& stamp, std::chrono::sys_time<Duration>& time)
{
  using namespace std::chrono;
  constexpr uint64_t mostSeconds = static_cast<uint64_t>(INT64_MAX) / 1'000'000'000 - 100; // fractions may add a minute
  if (stamp.seconds > mostSeconds)
  {
    return false;
  }
  const sys_seconds whole{seconds(static_cast<int64_t>(stamp.seconds))};
  time = floor<Duration>(whole + milliseconds(stamp.fractionA) + microseconds(stamp.fractionB));
  return true;
}

/// The payload of UTF-8 text: code page and bytes.
inline std::vector<uint8_t> utf8Payload(std::string_view text, uint16_t codePage)
{
  std::vector<uint8_t> bytes(sizeof codePage + text.size());
  std::memcpy(bytes.data(), &codePage, sizeof codePage);
  std::memcpy(bytes.data() + sizeof codePage, text.data(), text.size());
  return bytes;
}

/// Calls `write(type, bytes, size)` with a value's payload in this machine's byte order.
template<Addable T, class Write>
uint32_t withPayload(const T& value, Write&& write)
{
  if constexpr (StreamInteger<T>)
  {
    return write(integerType<T>(), bytesOf(&value), sizeof value);
  }
  else if constexpr (std::same_as<T, std::byte>)
  {
    return write(TAV_TYPE_BYTE, bytesOf(&value), sizeof value);
  }
  else if constexpr (std::same_as<T, Uint128> || std::same_as<T, Sint128>)
  {
    const auto words = joinHalves(static_cast<uint64_t>(value.high), value.low);
    return write(std::same_as<T, Uint128> ? TAV_TYPE_UINT128 : TAV_TYPE_SINT128, bytesOf(words.data()), sizeof words);
  }
  else if constexpr (std::same_as<T, TAVTimeStamp>)
  {
    return write(TAV_TYPE_UTC_TIMESTAMP, bytesOf(&value), sizeof value);
  }
  else if constexpr (isSysTime<T>)
  {
    return withPayload(toTimeStamp(value), write);
  }
  else if constexpr (std::same_as<T, Utf8> || std::same_as<T, Utf8Text>)
  {
    const std::vector<uint8_t> bytes = utf8Payload(value.text, value.codePage);
    return write(TAV_TYPE_UTF8_STRING, bytes.data(), bytes.size());
  }
  else if constexpr (Text<T>)
  {
    const std::string_view text = value;
    return write(TAV_TYPE_ASCII_STRING, bytesOf(text.data()), text.size());
  }
  else if constexpr (Utf8View<T>)
  {
    const std::u8string_view text = value;
    return withPayload(Utf8{{reinterpret_cast<const char*>(text.data()), text.size()}}, write);
  }
  else if constexpr (BytesView<T>)
  {
    const std::span<const std::byte> bytes = value;
    return write(TAV_TYPE_BINARY, bytesOf(bytes.data()), bytes.size());
  }
  else
  {
    const std::span<const uint64_t> words = value;
    return write(TAV_TYPE_UINT64_ARRAY, bytesOf(words.data()), words.size_bytes());
  }
}

/// A payload as it stands in the stream.
struct RawValue
{
  uint16_t type;
  const uint8_t* bytes;
  uint64_t size;
  bool swap; ///< the stream is in the other byte order
};

/// Copies a fixed-size value into this machine's order. TAV_RC_NOT_SUPPORTED for another type, TAV_RC_OUTSIDE_PARENT
/// for another size.
template<size_t Size>
uint32_t fixedBytes(const RawValue& raw, uint16_t type, std::array<uint8_t, Size>& out)
{
  if (raw.type != type)
  {
    return TAV_RC_NOT_SUPPORTED;
  }
  if (raw.size != Size)
  {
    return TAV_RC_OUTSIDE_PARENT;
  }
  const layout::SwapRule rule = layout::typeInfo(type).swapRule;
  if (raw.swap && layout::swappedPrefix(rule, Size) == Size)
  {
    layout::swapPayload(rule, raw.bytes, out.data(), Size);
  }
  else
  {
    std::memcpy(out.data(), raw.bytes, Size);
  }
  return TAV_RC_OK;
}

template<class Value>
uint32_t fixedValue(const RawValue& raw, uint16_t type, Value& out)
{
  std::array<uint8_t, sizeof(Value)> bytes;
  const uint32_t rc = fixedBytes(raw, type, bytes);
  if (rc == TAV_RC_OK)
  {
    std::memcpy(&out, bytes.data(), sizeof out);
  }
  return rc;
}

inline uint32_t decode(const RawValue& raw, std::string_view& out)
{
  if (raw.type != TAV_TYPE_ASCII_STRING)
  {
    return TAV_RC_NOT_SUPPORTED;
  }
  out = {reinterpret_cast<const char*>(raw.bytes), static_cast<size_t>(raw.size)};
  return TAV_RC_OK;
}

inline uint32_t decode(const RawValue& raw, Utf8Text& out)
{
  if (raw.type != TAV_TYPE_UTF8_STRING)
  {
    return TAV_RC_NOT_SUPPORTED;
  }
  if (raw.size < sizeof out.codePage)
  {
    return TAV_RC_OUTSIDE_PARENT;
  }
  std::memcpy(&out.codePage, raw.bytes, sizeof out.codePage);
  out.codePage = raw.swap ? kor::byteswap16(out.codePage) : out.codePage;
  out.text.assign(reinterpret_cast<const char*>(raw.bytes) + sizeof out.codePage,
                  static_cast<size_t>(raw.size) - sizeof out.codePage);
  return TAV_RC_OK;
}

/// Text of either string type.
inline uint32_t decode(const RawValue& raw, std::string& out)
{
  if (raw.type == TAV_TYPE_UTF8_STRING)
  {
    Utf8Text text;
    const uint32_t rc = decode(raw, text);
    out = std::move(text.text);
    return rc;
  }
  std::string_view view;
  const uint32_t rc = decode(raw, view);
  out.assign(view);
  return rc;
}

inline uint32_t decode(const RawValue& raw, std::span<const std::byte>& out)
{
  if (raw.type != TAV_TYPE_BINARY)
  {
    return TAV_RC_NOT_SUPPORTED;
  }
  out = {reinterpret_cast<const std::byte*>(raw.bytes), static_cast<size_t>(raw.size)};
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
  out.resize(static_cast<size_t>(raw.size) / sizeof(uint64_t));
  auto* const to = reinterpret_cast<uint8_t*>(out.data());
  if (raw.swap)
  {
    layout::swapPayload(layout::SwapRule::all64, raw.bytes, to, raw.size);
  }
  else if (raw.size != 0)
  {
    std::memcpy(to, raw.bytes, static_cast<size_t>(raw.size));
  }
  return TAV_RC_OK;
}

inline uint32_t decode(const RawValue& raw, std::byte& out)
{
  return fixedValue(raw, TAV_TYPE_BYTE, out);
}

inline uint32_t decode(const RawValue& raw, TAVTimeStamp& out)
{
  return fixedValue(raw, TAV_TYPE_UTC_TIMESTAMP, out);
}

template<StreamInteger T>
uint32_t decode(const RawValue& raw, T& out)
{
  return fixedValue(raw, integerType<T>(), out);
}

template<class Half>
uint32_t decodeHalves(const RawValue& raw, uint16_t type, Half& out)
{
  std::array<uint8_t, 16> bytes;
  const uint32_t rc = fixedBytes(raw, type, bytes);
  if (rc == TAV_RC_OK)
  {
    const auto [high, low] = splitHalves(bytes.data());
    out = {static_cast<decltype(out.high)>(high), low};
  }
  return rc;
}

inline uint32_t decode(const RawValue& raw, Uint128& out)
{
  return decodeHalves(raw, TAV_TYPE_UINT128, out);
}

inline uint32_t decode(const RawValue& raw, Sint128& out)
{
  return decodeHalves(raw, TAV_TYPE_SINT128, out);
}

template<class Duration>
uint32_t decode(const RawValue& raw, std::chrono::sys_time<Duration>& out)
{
  TAVTimeStamp stamp{};
  const uint32_t rc = decode(raw, stamp);
  return rc == TAV_RC_OK && !fromTimeStamp(stamp, out) ? TAV_RC_OUTSIDE_PARENT : rc;
}

/// What Node::as gives.
template<class T>
concept Readable = requires(const RawValue& raw, T& out)
{
  {
    decode(raw, out)
    } -> std::same_as<uint32_t>;
};

/// The number in a node of any integer type, if `T` can hold it.
template<std::integral T>
uint32_t decodeNumber(const RawValue& raw, T& out)
{
  const auto narrow = [&out](auto number) {
    out = static_cast<T>(number);
    return std::in_range<T>(number) ? TAV_RC_OK : TAV_RC_OUTSIDE_PARENT;
  };
  const auto read = [&]<class From>(From number) {
    const uint32_t rc = decode(raw, number);
    return rc == TAV_RC_OK ? narrow(number) : rc;
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
  default:
    return TAV_RC_NOT_SUPPORTED;
  }
}

} // namespace detail

} // namespace tav
