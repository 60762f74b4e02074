/// Searching a run of bytes for whole eye catchers.
#pragma once

#include <array>
#include <cstdint>

#include "format/layout.h"
#include "tav/byteOrder.h"

namespace tav::inside
{

using EyeBytes = std::array<uint8_t, kEyeLength>;

inline constexpr auto kNativeEye = kor::bitCast<EyeBytes>(TAV_EYE_CATCHER);
inline constexpr auto kReversedEye = kor::bitCast<EyeBytes>(kor::byteswap64(TAV_EYE_CATCHER));

/// Finds the first eye catcher, of either byte order, that lies whole in [at, end).
///
/// @return its first byte; `end` when there is none
/// Any alignment will do; nothing outside the run is read. Cost: about what reading the bytes costs.
const uint8_t* findEye(const uint8_t* at, const uint8_t* end);

/// As `findEye`, with no more than what every processor of the kind that the library is built for can do.
const uint8_t* findEyeOnAnyProcessor(const uint8_t* at, const uint8_t* end);

} // namespace tav::inside
