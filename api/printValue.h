/// A value in host order, and its characters where they are one short piece.
#pragma once

#include <cstdint>
#include <cstring>
#include <type_traits>
#include <utility>

#include "api/digits.h"
#include "format/layout.h"
#include "tav/tav.h"

namespace tav::inside::print
{

inline constexpr size_t kLongestShort = 64; ///< room for a value of a type that has one size

/// A value of one size, or a unit of an array, from the bytes of a stream; `swap`: they are in the other order.
template<class Value>
[[gnu::always_inline]] inline Value valueAt(const uint8_t* bytes, bool swap)
{
  constexpr SwapRule rule = std::is_same_v<Value, TAVTimeStamp> ? SwapRule::timestamp : SwapRule::one64;
  Value value;
  if (swap)
  {
    swapPayload(rule, bytes, reinterpret_cast<uint8_t*>(&value), sizeof value);
  }
  else
  {
    std::memcpy(&value, bytes, sizeof value);
  }
  return value;
}

/// The characters before a NUL, all when there is none.
inline size_t lengthOfText(const char* text, size_t size)
{
  const void* const nul = std::memchr(text, '\0', size);
  return nul != nullptr ? static_cast<size_t>(static_cast<const char*>(nul) - text) : size;
}

[[gnu::noinline]] inline char* writeTimestamp(char* to, const TAVTimeStamp& timestamp)
{
  TAVDate date{};
  tavTimeStampToDateInt(timestamp, &date);
  to = digits::writePadded(to, date.year, 4);
  const std::pair<char, uint16_t> parts[] = {
      {'-', date.month}, {'-', date.day}, {'-', date.hour}, {'.', date.minute}, {'.', date.second}};
  for (const auto& [mark, number] : parts)
  {
    *to = mark;
    to = digits::writeTwo(to + 1, number);
  }
  *to = '.';
  to = digits::writePadded(to + 1, date.fractionA / 1000 + date.fractionB, 6);
  return digits::writePadded(to, timestamp.offsetMinutes, 4);
}

/// Writes a value of a type that has one size from its bytes; returns its end. What is overwritten behind it
/// is still within kLongestShort.
[[gnu::always_inline]] inline char* writeShort(char* to, uint16_t type, const uint8_t* bytes, bool swap)
{
  switch (type)
  {
  case TAV_TYPE_UINT8:
    return digits::writeHex(to, *bytes);
  case TAV_TYPE_SINT8:
  case TAV_TYPE_BYTE:
    *to = static_cast<char>(*bytes); // whatever it is: a NUL too
    return to + 1;
  case TAV_TYPE_UINT16:
    return digits::writeDecimal(to, valueAt<uint16_t>(bytes, swap));
  case TAV_TYPE_SINT16:
    return digits::writeSigned(to, valueAt<int16_t>(bytes, swap));
  case TAV_TYPE_UINT32:
    return digits::writeDecimal(to, valueAt<uint32_t>(bytes, swap));
  case TAV_TYPE_SINT32:
    return digits::writeSigned(to, valueAt<int32_t>(bytes, swap));
  case TAV_TYPE_UINT64:
    return digits::writeDecimal(to, valueAt<uint64_t>(bytes, swap));
  case TAV_TYPE_SINT64:
    return digits::writeSigned(to, valueAt<int64_t>(bytes, swap));
  default:
    return writeTimestamp(to, valueAt<TAVTimeStamp>(bytes, swap));
  }
}

} // namespace tav::inside::print
