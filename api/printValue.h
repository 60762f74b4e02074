/// One value: its bytes in host order, and its characters where they are one short piece.
#pragma once

#include <array>
#include <cstdint>
#include <cstring>
#include <utility>

#include "api/digits.h"
#include "format/layout.h"
#include "tav/tav.h"

namespace tav::inside::print
{

inline constexpr size_t kLongestShort = 64; ///< room for a value of a type that has one size

/// A value in host order: its first bytes reversed where the stream is in the other order.
class Value
{
public:
  Value(uint16_t type, const uint8_t* bytes, uint64_t size, bool swap)
      : bytes_(bytes), size_(size), rule_(typeInfo(type).swapRule), swap_(swap)
  {
    if (swap && rule_ != SwapRule::all64 && fits())
    {
      reversed_ = swappedPrefix(rule_, size_);
      swapPayload(rule_, bytes_, first_.data(), reversed_);
    }
  }

  /// Whether the size holds what is reversed.
  [[nodiscard]] bool fits() const
  {
    return !swap_ || (rule_ == SwapRule::all64 ? size_ % 8 == 0 : size_ >= swapUnitLength(rule_));
  }

  [[nodiscard]] uint64_t size() const
  {
    return size_;
  }

  [[nodiscard]] uint8_t byteAt(uint64_t at) const
  {
    return at < reversed_ ? first_[at] : bytes_[at];
  }

  template<class Number>
  [[nodiscard]] Number as() const
  {
    Number number;
    std::memcpy(&number, reversed_ != 0 ? first_.data() : bytes_, sizeof number);
    return number;
  }

  /// A unit of an array.
  [[nodiscard]] uint64_t wordAt(uint64_t at) const
  {
    uint64_t word = 0;
    std::memcpy(&word, bytes_ + at, sizeof word);
    return swap_ ? kor::byteswap64(word) : word;
  }

private:
  const uint8_t* bytes_;
  uint64_t size_;
  SwapRule rule_;
  bool swap_;
  uint64_t reversed_ = 0;
  std::array<uint8_t, 16> first_{};
};

/// The characters before a NUL, all when there is none.
inline uint64_t lengthOfText(const char* text, uint64_t size)
{
  const void* const nul = std::memchr(text, '\0', size);
  return nul != nullptr ? static_cast<uint64_t>(static_cast<const char*>(nul) - text) : size;
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

/// Writes a value of a type that has one size, which is the value's too; returns its end. What is overwritten behind it
/// is still within kLongestShort.
[[gnu::always_inline]] inline char* writeShort(char* to, uint16_t type, const Value& value)
{
  switch (type)
  {
  case TAV_TYPE_UINT8:
    return digits::writeHex(to, value.byteAt(0));
  case TAV_TYPE_SINT8:
  case TAV_TYPE_BYTE:
    *to = static_cast<char>(value.byteAt(0)); // whatever it is: a NUL too
    return to + 1;
  case TAV_TYPE_UINT16:
    return digits::writeDecimal(to, value.as<uint16_t>());
  case TAV_TYPE_SINT16:
    return digits::writeSigned(to, value.as<int16_t>());
  case TAV_TYPE_UINT32:
    return digits::writeDecimal(to, value.as<uint32_t>());
  case TAV_TYPE_SINT32:
    return digits::writeSigned(to, value.as<int32_t>());
  case TAV_TYPE_UINT64:
    return digits::writeDecimal(to, value.as<uint64_t>());
  case TAV_TYPE_SINT64:
    return digits::writeSigned(to, value.as<int64_t>());
  default:
    return writeTimestamp(to, value.as<TAVTimeStamp>());
  }
}

} // namespace tav::inside::print
