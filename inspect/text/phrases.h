/// @file phrases.h
/// Numbers, offsets and codes as people read them.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

namespace tav::inspect
{

/// The sentence of a library code, as codes.h has it.
std::string_view codeSentence(uint32_t code);

/// "0x1a40"
std::string hexOffset(uint64_t offset);

/// "1 byte", "12 nodes"
std::string counted(uint64_t count, std::string_view singular);

/// "1.5 MiB", "312 bytes"
std::string byteText(uint64_t bytes);

} // namespace tav::inspect
