/// Words of a header and of a handle as a processor likes them. This file alone reads several members at once, or keeps
/// the compiler from joining accesses to memory or from parting them; each function says what that is for.
///
/// The figures are those of bench/ on an AMD EPYC of family 26 with g++ 12, in instructions and time a node: W1 is
/// tavAddElement (108 instructions), W2 is tavGetNextChild (111). A change to one of them needs both measured again.
#pragma once

#include <cstddef>
#include <cstdint>

#include "format/layout.h"
#include "storage/cachedRun.h"
#include "tav/byteOrder.h"
#include "tav/core/words.hpp"
#include "tav/tav.h"

namespace tav::core
{
using namespace inside;

/// How the library compiles a step: behind a call, for callers that fill and read their descriptors in memory.
struct LibraryWay
{
  /// An append with a long payload ends in a jump to what copies it, so that others save no registers.
  static constexpr bool endsInJump = true;

  /// Whether the stream is in host order and unpadded, and the options, which stand before both flags, hold no bit but
  /// `option` and the first 16. Options above the known ones are not told apart on every machine.
  ///
  /// One load instead of three: W1 and W2 with three take 5 % more instructions, and 4 % and 9 % more time.
  [[gnu::always_inline]] static bool isHostWith(const TAVHandle& handle, uint64_t option)
  {
    static_assert(offsetof(TAVHandle, alignMode) == offsetof(TAVHandle, options) + sizeof handle.options &&
                  offsetof(TAVHandle, swapBytes) == offsetof(TAVHandle, alignMode) + 1);
    constexpr size_t mode = 2; // bytes of the options that tell how the handle was opened
    constexpr uint64_t looked = kor::isLittleEndian ? ~uint64_t{0} : ~(uint64_t{0xFFFF} << (8 * mode));
    const uint64_t asked = kor::isLittleEndian ? option >> (8 * mode) : option << (8 * mode);
    const auto* const from = reinterpret_cast<const uint8_t*>(&handle) + offsetof(TAVHandle, options) + mode;
    return (load<uint64_t>(from) & looked) == asked;
  }

  /// Copies a header word by word. Its fields are read straight afterwards, one by one, by the caller and by the next
  /// step, and come late from behind one store of 16 bytes: W2 with that takes 23 % more time.
  template<bool Wide>
  [[gnu::always_inline]] static void copyHeader(TAVHeader& to, const uint8_t* from)
  {
    store(&to.hdr64, load<uint64_t>(from));
    if constexpr (Wide)
    {
      store(&to.hdr64.info, load<uint64_t>(from + sizeof(uint64_t)));
    }
  }

  /// The fields of a header, loaded one by one, which `volatile` sees to: who fills a header stores them one by one,
  /// and a wide load straight afterwards, to which the compiler joins these, waits until those stores have left the
  /// store buffer. Joined, W1 takes 6 % fewer instructions and 13 % more time.
  template<bool Wide>
  [[gnu::always_inline]] static HeaderFields loadFields(const TAVHeader& header)
  {
    if constexpr (Wide)
    {
      const volatile TAVHeader64& from = header.hdr64;
      return {from.size, from.info, from.type, from.elm};
    }
    else
    {
      const volatile TAVHeader32& from = header.hdr32;
      return {from.size, 0, from.type, from.elm};
    }
  }

  /// Both words of a header as one store would take longer to join: W1 takes 4 % more instructions then, in the same
  /// time.
  [[gnu::always_inline]] static void keepApart()
  {
#if defined(__GNUC__)
    __asm__("" ::
                : "memory");
#endif
  }

  /// Where bytes can be written that may lie in several pages.
  static uint8_t* takeRun(TAVCircularBuf& ring, uint64_t position, uint64_t length)
  {
    return takeCachedRun(ring, position, length);
  }
};

} // namespace tav::core
