/// @file value.hpp
/// A node's value: its bytes in host order, and as text for people.
#pragma once

#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "tav/inspect/api.hpp"
#include "tav/inspect/node.hpp"
#include "tav/inspect/source.hpp"

namespace tav::inspect
{

/// The first bytes of a node's payload, `most` at the most, in host order where the type has an order and the bytes
/// hold the whole value.
TAV_INSPECT_API std::vector<uint8_t> payloadBytes(ByteSource& source, const Form& form, const Node& node,
                                                  uint64_t most);

/// The value as one line of text without line breaks: numbers in decimal, 128-bit ones too; strings in quotation marks
/// with escapes; calendar dates; bytes in hexadecimal. A value of the wrong size is shown as its bytes. At most `most`
/// bytes of the payload are read, or 16 where that is less; " ..." shows that there are more. A group has no value:
/// empty.
TAV_INSPECT_API std::string valueText(ByteSource& source, const Form& form, const Node& node, uint64_t most);

/// Appends it.
TAV_INSPECT_API void appendValueText(std::string& out, ByteSource& source, const Form& form, const Node& node,
                                     uint64_t most);

/// The value as plain text: a string is its characters as they are, the rest as in valueText. Only for values that fit
/// in memory; nothing for a value of more than `most` bytes, which is to be copied piece by piece.
TAV_INSPECT_API std::optional<std::string> plainText(ByteSource& source, const Form& form, const Node& node,
                                                     uint64_t most);

/// Appends it; false, and nothing, for a value of more than `most` bytes.
TAV_INSPECT_API bool appendPlainText(std::string& out, ByteSource& source, const Form& form, const Node& node,
                                     uint64_t most);

/// The name of a type for people: "Uint32"; "group" for both kinds of groups; "type 12345".
TAV_INSPECT_API std::string typeText(uint16_t type);

/// Text in quotation marks: what steers a terminal and what is no UTF-8 is written as escapes, as in C.
TAV_INSPECT_API std::string quoted(std::string_view text);

/// Text for a terminal, without quotation marks: as `quoted`, but quotation marks and backslashes stay as they are.
TAV_INSPECT_API std::string forTerminal(std::string_view text);

/// Whether bytes are well-formed UTF-8.
TAV_INSPECT_API bool isUtf8(std::string_view text);

/// The distance that the eye/size pair at `offset` gives; nothing where no eye catcher is.
TAV_INSPECT_API std::optional<uint64_t> pairDistanceAt(ByteSource& source, const Form& form, uint64_t offset);

/// "0011aaff"
TAV_INSPECT_API std::string hexText(std::span<const uint8_t> bytes);

/// `2024-02-29T10:30:00.000000+01:00`, from the right calendar; "12345678901234567 s" when the year has more than four
/// digits. Fraction A counts milliseconds, fraction B microseconds, and both are added to the seconds.
TAV_INSPECT_API std::string dateText(const TAVTimeStamp& stamp);

/// A 128-bit number in host order, in decimal.
TAV_INSPECT_API std::string int128Text(std::span<const uint8_t> bytes, bool isSigned);

/// Cuts a text to a number of terminal columns, counting UTF-8 characters as one each; "..." shows the cut.
TAV_INSPECT_API std::string cutToWidth(std::string_view text, size_t columns);

} // namespace tav::inspect
