/// @file jsonText.hpp
/// The words and numbers of the JSON form: how types, values and bytes are spelt, and how they are read back.
/// docs/json.md describes the form.
#pragma once

#include <array>
#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <string_view>

#include "tav/inspect/api.hpp"
#include "tav/tav.h"

namespace tav::inspect
{

inline constexpr uint64_t kJsonVersion = 1;
inline constexpr uint16_t kUsualCodePage = 1208; ///< UTF-8; a string of another code page names it

/// Appends text in quotation marks. The text must be UTF-8.
TAV_INSPECT_API void appendJsonString(std::string& out, std::string_view text);

/// "group32", "group64", "Uint32", "ASCII String"; nothing for a type that has no name.
TAV_INSPECT_API std::optional<std::string> jsonTypeName(uint16_t type);

/// Appends it; false, and nothing, for a type that has no name.
TAV_INSPECT_API bool appendJsonTypeName(std::string& out, uint16_t type);

/// The type of a name, in any case and with or without blanks; also "TAV_TYPE_UINT32".
TAV_INSPECT_API std::optional<uint16_t> jsonTypeOf(std::string_view name);

/// The bytes of hexadecimal text, appended; false when it is none.
TAV_INSPECT_API bool appendHexBytes(std::string& out, std::string_view text);

/// A date as `dateText` writes it; the fraction and the zone may be left out, Z stands for +00:00. The fraction becomes
/// whole milliseconds in A and the microseconds of the millisecond in B. Nothing when the text is no date, or when a
/// timestamp cannot hold it.
TAV_INSPECT_API std::optional<TAVTimeStamp> parseDate(std::string_view text);

/// Whether a text, which `dateText` made of a moment, tells all of it.
TAV_INSPECT_API bool isWholeDate(const TAVTimeStamp& stamp, std::string_view text);

/// The 16 bytes, in host order, of a decimal number; nothing when it is none or does not fit.
TAV_INSPECT_API std::optional<std::array<uint8_t, 16>> parseInt128(std::string_view text, bool isSigned);

/// Where a piece of text that ends at `most` at the latest is to be cut so that no character is divided.
TAV_INSPECT_API size_t cutAtCharacter(std::string_view text, size_t most);

} // namespace tav::inspect
