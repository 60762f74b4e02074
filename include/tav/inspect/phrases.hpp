/// @file phrases.hpp
/// Numbers, offsets and codes as people read them.
#pragma once

#include <array>
#include <charconv>
#include <concepts>
#include <cstdint>
#include <string>
#include <string_view>

#include "tav/inspect/api.hpp"

namespace tav::inspect
{

/// The sentence of a library code, as codes.h has it.
TAV_INSPECT_API std::string_view codeSentence(uint32_t code);

/// Appends a number in decimal, or in another base.
template<std::integral Number>
void appendNumber(std::string& out, Number number, int base = 10)
{
  std::array<char, 24> digits;
  const std::to_chars_result end = std::to_chars(digits.data(), digits.data() + digits.size(), number, base);
  out.append(digits.data(), end.ptr);
}

/// Appends "0x1a40".
inline void appendHexOffset(std::string& out, uint64_t offset)
{
  out += "0x";
  appendNumber(out, offset, 16);
}

/// "0x1a40"
TAV_INSPECT_API std::string hexOffset(uint64_t offset);

/// "1 byte", "12 nodes"
TAV_INSPECT_API std::string counted(uint64_t count, std::string_view singular);

/// "1.5 MiB", "312 bytes"
TAV_INSPECT_API std::string byteText(uint64_t bytes);

} // namespace tav::inspect
