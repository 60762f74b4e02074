/// The random bytes of W6, in which the marker is missing.
#pragma once

#include <cstddef>
#include <cstdint>

namespace search
{

inline constexpr size_t kMemoryBytes = size_t{256} << 20; ///< come from memory
inline constexpr size_t kCacheBytes = size_t{512} << 10;  ///< stay in the second-level cache
inline constexpr unsigned char kMarker[9] = "\xC0\xDE\xD5\xEE\xDD\xEC\x0D\xED";
inline constexpr unsigned char kReversed[9] = "\xED\x0D\xEC\xDD\xEE\xD5\xDE\xC0";
inline constexpr size_t kCheckOffset = 100003; ///< where a check puts a marker, and takes it away again

unsigned char* haystack();

} // namespace search
