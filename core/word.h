/// Words of a header and of a handle as a processor likes them. This file alone reads several members at once, or keeps
/// the compiler from joining accesses to memory or from parting them; each function says what that is for.
///
/// The figures are those of bench/ on an AMD EPYC of family 26 with g++ 12, in instructions and time a node: W1 is
/// tavAddElement (108 instructions), W2 is tavGetNextChild (111). A change to one of them needs both measured again.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>

#include "format/layout.h"
#include "tav/byteOrder.h"
#include "tav/tav.h"

namespace tav::core
{
using namespace inside;

/// Loads a word from any place. std::memcpy would do, but where a build checks the sizes of copies the compiler knows
/// too late that this is a load: it joins other branches meanwhile, and W1 and W2 take 4 and 5 instructions more.
template<class Word>
[[gnu::always_inline]] inline Word load(const void* from)
{
  Word word = 0;
#if defined(__GNUC__)
  __builtin_memcpy(&word, from, sizeof word);
#else
  std::memcpy(&word, from, sizeof word);
#endif
  return word;
}

/// Stores one, likewise.
template<class Word>
[[gnu::always_inline]] inline void store(void* to, Word word)
{
#if defined(__GNUC__)
  __builtin_memcpy(to, &word, sizeof word);
#else
  std::memcpy(to, &word, sizeof word);
#endif
}

/// Whether the stream is in host order and unpadded, and the options, which stand before both flags, hold no bit but
/// `option` and the first 16. Options above the known ones are not told apart on every machine.
///
/// One load instead of three: W1 and W2 with three take 5 % more instructions, and 4 % and 9 % more time.
[[gnu::always_inline]] inline bool isHostWith(const TAVHandle& handle, uint64_t option)
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
[[gnu::always_inline]] inline void copyHeader(TAVHeader& to, const uint8_t* from)
{
  store(&to.hdr64, load<uint64_t>(from));
  if constexpr (Wide)
  {
    store(&to.hdr64.info, load<uint64_t>(from + sizeof(uint64_t)));
  }
}

/// The fields of a header, loaded one by one, which `volatile` sees to: who fills a header stores them one by one, and
/// a wide load straight afterwards, to which the compiler joins these, waits until those stores have left the store
/// buffer. Joined, W1 takes 6 % fewer instructions and 13 % more time.
template<bool Wide>
[[gnu::always_inline]] inline HeaderFields loadFields(const TAVHeader& header)
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

/// A header's stream form in registers. What is made of several members is stored as one word.
template<bool Wide>
class HeaderWords
{
public:
  [[gnu::always_inline]] HeaderWords(const HeaderFields& fields, bool swap)
  {
    const HeaderFields turned = swap ? turn(fields) : fields;
    const auto type = static_cast<uint64_t>(turned.type);
    const auto elm = static_cast<uint64_t>(turned.elm);
    if constexpr (Wide)
    {
      first_ = turned.size;
      last_ =
          kor::isLittleEndian ? turned.info | type << 32 | elm << 48 : uint64_t{turned.info} << 32 | type << 16 | elm;
    }
    else
    {
      last_ = kor::isLittleEndian ? turned.size | type << 32 | elm << 48 : turned.size << 32 | type << 16 | elm;
    }
  }

  [[gnu::always_inline]] void store(uint8_t* to) const
  {
    if constexpr (Wide)
    {
      core::store(to, first_);
#if defined(__GNUC__)
      // Both words as one store would take longer to join: W1 takes 4 % more instructions then, in the same time.
      __asm__("" ::
                  : "memory");
#endif
    }
    core::store(to + lengthOf() - sizeof last_, last_);
  }

private:
  static constexpr uint64_t lengthOf()
  {
    return Wide ? kHeaderSize64 : kHeaderSize32;
  }

  static HeaderFields turn(const HeaderFields& fields)
  {
    const uint64_t size = Wide ? kor::byteswap64(fields.size) : kor::byteswap32(static_cast<uint32_t>(fields.size));
    return {size, kor::byteswap32(fields.info), kor::byteswap16(fields.type), kor::byteswap16(fields.elm)};
  }

  uint64_t first_ = 0;
  uint64_t last_;
};

} // namespace tav::core
