/// @file byteOrder.h
/// The processor's byte order and the reversal of bytes. Everything else asks here.
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
} // namespace tav::kor
