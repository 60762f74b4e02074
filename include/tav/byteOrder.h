/// @file byteOrder.h
/// The processor's byte order, the reversal of bytes, and bytes taken for a value. Everything else asks here.
#pragma once

#include <bit>
#include <cstdint>

namespace tav::kor
{
static_assert(std::endian::native == std::endian::little || std::endian::native == std::endian::big,
              "mixed byte orders are not supported");

inline constexpr bool isLittleEndian = std::endian::native == std::endian::little;

/// The bytes of `value` in reverse order.
constexpr uint16_t byteswap16(uint16_t value) noexcept
{
#if defined(__GNUC__)
  return __builtin_bswap16(value);
#else
  return static_cast<uint16_t>((value << 8) | (value >> 8));
#endif
}

/// The bytes of `value` in reverse order.
constexpr uint32_t byteswap32(uint32_t value) noexcept
{
#if defined(__GNUC__)
  return __builtin_bswap32(value);
#else
  const uint32_t pairs = ((value & 0x00FF00FFu) << 8) | ((value >> 8) & 0x00FF00FFu);
  return (pairs << 16) | (pairs >> 16);
#endif
}

/// The bytes of `value` in reverse order.
constexpr uint64_t byteswap64(uint64_t value) noexcept
{
#if defined(__GNUC__)
  return __builtin_bswap64(value);
#else
  return (static_cast<uint64_t>(byteswap32(static_cast<uint32_t>(value))) << 32) |
         byteswap32(static_cast<uint32_t>(value >> 32));
#endif
}

/// The bytes of a value as those of another type: std::bit_cast, also where the standard library has none yet.
template<class To, class From>
constexpr To bitCast(const From& from) noexcept
{
#if defined(__cpp_lib_bit_cast)
  return std::bit_cast<To>(from);
#else
  return __builtin_bit_cast(To, from);
#endif
}
} // namespace tav::kor
