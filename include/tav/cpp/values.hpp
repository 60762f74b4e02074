/// @file values.hpp
/// Values of the stream as C++ types.
#pragma once

#include <compare>
#include <concepts>
#include <cstddef>
#include <cstdint>
#include <span>
#include <string>
#include <string_view>
#include <type_traits>

#include "tav/cpp/time.hpp"
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

/// An element's id as it is given where a node is written. One beyond 65,535 is refused with TAV_RC_BAD_PARAM: it does
/// not become another.
class ElementId
{
public:
  template<class Number>
  requires(std::integral<Number> || (std::is_enum_v<Number> && std::is_convertible_v<Number, uint64_t>))
      // NOLINTNEXTLINE(google-explicit-constructor): ids are given as numbers
      constexpr ElementId(Number id) noexcept
      : number_(static_cast<uint64_t>(id))
  {
  }

  [[nodiscard]] constexpr bool isValid() const noexcept
  {
    return number_ <= UINT16_MAX;
  }
  /// The id, when it is valid.
  [[nodiscard]] constexpr uint16_t id() const noexcept
  {
    return static_cast<uint16_t>(number_);
  }
  /// What was given; a negative number is at the other end.
  [[nodiscard]] constexpr uint64_t number() const noexcept
  {
    return number_;
  }

private:
  uint64_t number_;
};

inline constexpr uint16_t kCodePageUtf8 = 1208;

/// UTF-8 text that is somewhere else: to be written, as an ordinary element that a walk passes correctly, or as a view
/// of what was read.
struct Utf8
{
  std::string_view text;
  uint16_t codePage = kCodePageUtf8;
  bool operator==(const Utf8&) const = default;
};

/// UTF-8 text of its own.
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

#if defined(__SIZEOF_INT128__)
/// The compiler's own 128-bit integers, where it has them.
__extension__ typedef unsigned __int128 BuiltinUint128; // NOLINT(modernize-use-using): __extension__ takes no alias
__extension__ typedef __int128 BuiltinSint128;          // NOLINT(modernize-use-using): as above
#else
using BuiltinUint128 = void;
using BuiltinSint128 = void;
#endif

namespace detail
{

template<class T>
concept Character = std::same_as<T, char> || std::same_as<T, wchar_t> || std::same_as<T, char8_t> ||
    std::same_as<T, char16_t> || std::same_as<T, char32_t>;

template<class T>
concept BuiltinInteger128 = std::same_as<T, BuiltinUint128> || std::same_as<T, BuiltinSint128>;

template<class T>
concept Integer128 = std::same_as<T, Uint128> || std::same_as<T, Sint128> || BuiltinInteger128<T>;

} // namespace detail

/// The integers of 8 to 64 bits. bool and the character types are not among them: they would change their meaning
/// silently.
template<class T>
concept StreamInteger = std::integral<T> && !std::same_as<T, bool> && !detail::Character<T> && sizeof(T) <= 8;

namespace detail
{

// A null pointer constant converts to every view.
template<class T>
concept Text = std::convertible_to<const T&, std::string_view> && !std::same_as<T, std::nullptr_t>;
template<class T>
concept Utf8View = std::convertible_to<const T&, std::u8string_view> && !std::same_as<T, std::nullptr_t>;
template<class T>
concept BytesView = std::convertible_to<const T&, std::span<const std::byte>>;
template<class T>
concept WordsView = std::convertible_to<const T&, std::span<const uint64_t>>;

/// What can be added.
template<class T>
concept Addable = StreamInteger<T> || std::same_as<T, std::byte> || std::same_as<T, Utf8> ||
    std::same_as<T, Utf8Text> || Integer128<T> || std::same_as<T, TAVTimeStamp> || SysTime<T> || Text<T> ||
    Utf8View<T> || BytesView<T> || WordsView<T>;

/// Whether a value leads into memory that is not its own.
template<class T>
inline constexpr bool isView = std::same_as<T, std::string_view> || std::same_as<T, std::u8string_view> ||
                               std::same_as<T, Utf8> || std::same_as<T, std::span<const std::byte>>;

template<class Value>
const uint8_t* bytesOf(const Value* value) noexcept
{
  return reinterpret_cast<const uint8_t*>(value);
}

template<StreamInteger T>
constexpr uint16_t integerType() noexcept
{
  constexpr bool isSigned = std::is_signed_v<T>;
  switch (sizeof(T))
  {
  case 1:
    return isSigned ? TAV_TYPE_SINT8 : TAV_TYPE_UINT8;
  case 2:
    return isSigned ? TAV_TYPE_SINT16 : TAV_TYPE_UINT16;
  case 4:
    return isSigned ? TAV_TYPE_SINT32 : TAV_TYPE_UINT32;
  default:
    return isSigned ? TAV_TYPE_SINT64 : TAV_TYPE_UINT64;
  }
}

} // namespace detail

} // namespace tav
