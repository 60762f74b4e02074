/// @file words.hpp
/// Words of a header as they stand in a stream, and how a step that is compiled into a program gets at them.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>

#include "tav/layout.hpp"

namespace tav::core
{
using namespace layout;

/// Loads a word from any place. std::memcpy would do, but where a build checks the sizes of copies the compiler knows
/// too late that this is a load, and joins other branches meanwhile: a step takes 4 and 5 instructions more.
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

  /// `Way::keepApart()` comes between the stores.
  template<class Way>
  [[gnu::always_inline]] void store(uint8_t* to) const
  {
    if constexpr (Wide)
    {
      core::store(to, first_);
      Way::keepApart();
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

/// How a step is compiled into the caller's code: without tricks, as the compiler keeps the caller's nodes in
/// registers. The library has a way of its own.
struct PlainWay
{
  static constexpr bool endsInJump = false;

  /// Whether the stream is in host order and unpadded, and the options hold no bit but `option` and the first 16.
  [[gnu::always_inline]] static bool isHostWith(const TAVHandle& handle, uint64_t option)
  {
    constexpr uint64_t mode = 0xFFFF; // how the handle was opened
    return handle.swapBytes == 0 && handle.alignMode == 0 && (handle.options & ~mode) == option;
  }

  template<bool Wide>
  [[gnu::always_inline]] static void copyHeader(TAVHeader& to, const uint8_t* from)
  {
    if constexpr (Wide)
    {
      to.hdr64 = {
          load<uint64_t>(from + offsetof(TAVHeader64, size)), load<uint32_t>(from + offsetof(TAVHeader64, info)),
          load<uint16_t>(from + offsetof(TAVHeader64, type)), load<uint16_t>(from + offsetof(TAVHeader64, elm))};
    }
    else
    {
      to.hdr32 = {load<uint32_t>(from + offsetof(TAVHeader32, size)),
                  load<uint16_t>(from + offsetof(TAVHeader32, type)),
                  load<uint16_t>(from + offsetof(TAVHeader32, elm))};
    }
  }

  [[gnu::always_inline]] static void keepApart() {}
};

} // namespace tav::core
