/// Recognising eye catchers in a run of bytes.
#pragma once

#include <cstddef>
#include <cstdint>

#include "format/layout.h"

namespace tav::inside
{

/// Follows eye catchers of both byte orders through a run of bytes that may come in pieces. A byte that breaks a
/// match is not tried again as the first of another, so ED ED 0D … is not a match.
class EyeMatcher
{
public:
  /// Looks at the bytes until a match is complete; returns where it stopped: behind the match, or at `end`.
  const uint8_t* scan(const uint8_t* at, const uint8_t* end);

  [[nodiscard]] bool found() const
  {
    return native_ == kEyeLength || reversed_ == kEyeLength;
  }

  /// Whether the match found is in the other byte order.
  [[nodiscard]] bool isReversed() const
  {
    return native_ != kEyeLength;
  }

private:
  /// As `scan`, byte by byte.
  const uint8_t* follow(const uint8_t* at, const uint8_t* end);

  size_t native_ = 0; // bytes matched so far
  size_t reversed_ = 0;
};

} // namespace tav::inside
