/// @file copySmall.hpp
/// Copying of payloads, which are mostly as long as one value.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <cstring>

namespace tav::core
{

/// The leading and the last bytes of a run of `Size` to 2 * `Size` bytes, which overlap in the middle.
/// By the compiler's own memcpy: the checked one of a hardened build has nothing to check here, where both sizes are
/// one constant, but makes g++ 12 call for every copy: 15 instructions more for each element that is written.
template<size_t Size>
void copyEnds(uint8_t* to, const uint8_t* from, uint64_t length)
{
  std::array<uint8_t, Size> first;
  std::array<uint8_t, Size> last;
  __builtin_memcpy(first.data(), from, Size);
  __builtin_memcpy(last.data(), from + length - Size, Size);
  __builtin_memcpy(to, first.data(), Size);
  __builtin_memcpy(to + length - Size, last.data(), Size);
}

/// The longest run that copySmall copies itself.
inline constexpr uint64_t kLongestSmall = 32;

/// Copies like memmove: everything is loaded before anything is stored. Few branches, as lengths alternate.
[[gnu::always_inline]] inline void copySmall(uint8_t* to, const void* bytes, uint64_t length)
{
  const auto* const from = static_cast<const uint8_t*>(bytes);
  if (length > kLongestSmall)
  {
    std::memmove(to, from, static_cast<size_t>(length));
  }
  else if (length > 16)
  {
    copyEnds<16>(to, from, length);
  }
  else if (length >= 8)
  {
    copyEnds<8>(to, from, length);
  }
  else if (length >= 4)
  {
    copyEnds<4>(to, from, length);
  }
  else if (length != 0)
  {
    const uint8_t first = from[0];
    const uint8_t middle = from[length / 2];
    const uint8_t last = from[length - 1];
    to[0] = first;
    to[length / 2] = middle;
    to[length - 1] = last;
  }
}

} // namespace tav::core
