/// @file textScan.h
#pragma once

#include <cstdint>
#include <span>

namespace tav::inspect
{

/// Looks through a text that comes in pieces for what is unusual in it; remembers the first place of each kind.
class TextScan
{
public:
  static constexpr uint64_t kNowhere = ~uint64_t{0};

  explicit TextScan(uint64_t offset)
      : position_(offset) {}

  void take(std::span<const uint8_t> bytes)
  {
    bool plain = missing_ == 0;
    for (const uint8_t byte : bytes)
    {
      plain &= byte != 0 && byte < 0x80;
    }
    if (plain) // as nearly all are: there is nothing to remember
    {
      position_ += bytes.size();
      return;
    }
    for (const uint8_t byte : bytes)
    {
      takeByte(byte);
      ++position_;
    }
  }

  /// The text is complete: a character that is not is invalid.
  void finish()
  {
    if (missing_ != 0)
    {
      setOnce(invalid_, start_);
    }
  }

  uint64_t position() const { return position_; }
  uint64_t invalid() const { return invalid_; } ///< start of the first bytes that are no UTF-8
  uint64_t nul() const { return nul_; }
  uint64_t high() const { return high_; } ///< first byte beyond 127

private:
  static void setOnce(uint64_t& place, uint64_t offset)
  {
    if (place == kNowhere)
    {
      place = offset;
    }
  }

  void takeByte(uint8_t byte)
  {
    if (byte == 0)
    {
      setOnce(nul_, position_);
    }
    if (byte > 0x7F)
    {
      setOnce(high_, position_);
    }
    if (missing_ != 0)
    {
      if (byte >= low_ && byte <= top_)
      {
        --missing_;
        low_ = 0x80;
        top_ = 0xBF;
        return;
      }
      setOnce(invalid_, start_);
      missing_ = 0;
    }
    begin(byte);
  }

  void begin(uint8_t byte)
  {
    if (byte < 0x80)
    {
      return;
    }
    start_ = position_;
    missing_ = byte >= 0xF0 ? 3 : byte >= 0xE0 ? 2
                                               : 1;
    // Overlong forms, surrogates and what lies beyond U+10FFFF are told by the second byte.
    low_ = byte == 0xE0 ? 0xA0 : byte == 0xF0 ? 0x90
                                              : 0x80;
    top_ = byte == 0xED ? 0x9F : byte == 0xF4 ? 0x8F
                                              : 0xBF;
    if (byte < 0xC2 || byte > 0xF4)
    {
      setOnce(invalid_, start_);
      missing_ = 0;
    }
  }

  uint64_t position_;
  uint64_t start_ = 0;
  uint32_t missing_ = 0;
  uint8_t low_ = 0x80;
  uint8_t top_ = 0xBF;
  uint64_t invalid_ = kNowhere;
  uint64_t nul_ = kNowhere;
  uint64_t high_ = kNowhere;
};

} // namespace tav::inspect
