/// Words of a header as the processor likes them. This file alone may keep the compiler from joining or parting
/// accesses to memory; each of its functions says what it is for.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>

#include "tav/byteOrder.h"
#include "tav/layout.hpp"
#include "tav/tav.h"

namespace tav::core
{

/// Whether the stream is in host order and unpadded, and the options, which stand before both flags, hold no bit but
/// `option` and the first 16, in one look. What is not told apart here is no option that is known.
[[gnu::always_inline]] inline bool isHostWith(const TAVHandle& handle, uint64_t option)
{
  static_assert(offsetof(TAVHandle, alignMode) == offsetof(TAVHandle, options) + sizeof handle.options &&
                offsetof(TAVHandle, swapBytes) == offsetof(TAVHandle, alignMode) + 1);
  constexpr size_t mode = 2; // bytes of the options that tell how the handle was opened
  constexpr uint64_t looked = kor::isLittleEndian ? ~uint64_t{0} : ~(uint64_t{0xFFFF} << (8 * mode));
  const uint64_t asked = kor::isLittleEndian ? option >> (8 * mode) : option << (8 * mode);
  uint64_t word = 0;
  std::memcpy(&word, reinterpret_cast<const uint8_t*>(&handle) + offsetof(TAVHandle, options) + mode, sizeof word);
  return (word & looked) == asked;
}

/// Copies a header word by word, which the compiler would do at once. Its fields are read straight afterwards, one by
/// one, by the caller and by the next step, and come late from behind a wider store.
template<bool Wide>
[[gnu::always_inline]] inline void copyHeader(TAVHeader& to, const uint8_t* from)
{
  uint64_t word = 0;
  std::memcpy(&word, from, sizeof word);
  std::memcpy(&to, &word, sizeof word);
  if constexpr (Wide)
  {
    std::memcpy(&word, from + sizeof word, sizeof word);
#if defined(__GNUC__)
    __asm__(""
            : "+r"(word));
#endif
    std::memcpy(&to.hdr64.info, &word, sizeof word);
  }
}

} // namespace tav::core
