/// @file phrases.hpp
/// Numbers, offsets and codes as people read them.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

#include "tav/inspect/api.hpp"

namespace tav::inspect
{

/// The sentence of a library code, as codes.h has it.
TAV_INSPECT_API std::string_view codeSentence(uint32_t code);

/// "0x1a40"
TAV_INSPECT_API std::string hexOffset(uint64_t offset);

/// "1 byte", "12 nodes"
TAV_INSPECT_API std::string counted(uint64_t count, std::string_view singular);

/// "1.5 MiB", "312 bytes"
TAV_INSPECT_API std::string byteText(uint64_t bytes);

} // namespace tav::inspect
