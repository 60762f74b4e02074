/// @file payload.h
/// From the text of a value to the bytes of a payload.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

namespace tav::inspect
{

/// The payload, in the stream's byte order, of a value as `plainText` writes it. Throws BuildError when the text is no
/// value of the type.
std::string payloadOfText(std::string_view text, uint16_t type, uint16_t codePage, bool swapped);

} // namespace tav::inspect
