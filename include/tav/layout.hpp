/// @file layout.hpp
/// The byte layout of streams: headers, types, byte order, paddings and eye/size pairs. The one definition that the
/// library and the tools read and write by; everything here is a pure function of its arguments.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <cstring>

#include "tav/byteOrder.h"
#include "tav/tav.h"

namespace tav::layout
{

/// @name Arithmetic on sizes and offsets that a stream gives: it never wraps
/// @{

/// Adds into `sum`; false when the result passes 64 bits.
constexpr bool addFits(uint64_t a, uint64_t b, uint64_t& sum)
{
  uint64_t result = 0;
  const bool passes = __builtin_add_overflow(a, b, &result);
  sum = result;
  return !passes;
}

/// Adds to `sum`; false, with `sum` at its maximum, when the result would pass 64 bits.
constexpr bool addChecked(uint64_t& sum, uint64_t amount)
{
  const bool fits = addFits(sum, amount, sum);
  sum = fits ? sum : ~uint64_t{0};
  return fits;
}

/// Takes off `room`; false when it has not so much.
constexpr bool takeRoom(uint64_t& room, uint64_t amount)
{
  return !__builtin_sub_overflow(room, amount, &room);
}

/// The sum, or the largest offset when it would pass 64 bits.
constexpr uint64_t addSaturated(uint64_t a, uint64_t b)
{
  addChecked(a, b);
  return a;
}

/// Rounds up to a multiple of 8; false, with the value at its maximum, when that would pass 64 bits.
constexpr bool roundUp8Checked(uint64_t& value)
{
  if (!addChecked(value, 7))
  {
    return false;
  }
  value &= ~uint64_t{7};
  return true;
}

/// How many units of `unit` bytes hold `size` bytes. Never wraps, unlike size + unit - 1.
constexpr uint64_t unitsFor(uint64_t size, uint64_t unit)
{
  return size / unit + (size % unit != 0 ? 1 : 0);
}

/// @}

/// @name Headers
/// @{

inline constexpr uint64_t kHeaderSize32 = sizeof(TAVHeader32);
inline constexpr uint64_t kHeaderSize64 = sizeof(TAVHeader64);
inline constexpr uint32_t kSizeUnknown32 = ~uint32_t{0};

constexpr bool isGroupType(uint16_t type)
{
  return type == TAV_TYPE_HEADER32 || type == TAV_TYPE_HEADER64;
}

/// What a header says, whichever form it has. One of no known form counts as a 32-bit header.
inline bool is64(const TAVHeader& header)
{
  return header.hdrType == TAV_HDR_64;
}

inline uint16_t typeOf(const TAVHeader& header)
{
  return is64(header) ? header.hdr64.type : header.hdr32.type;
}

inline uint64_t sizeOf(const TAVHeader& header)
{
  return is64(header) ? header.hdr64.size : header.hdr32.size;
}

inline uint16_t elmOf(const TAVHeader& header)
{
  return is64(header) ? header.hdr64.elm : header.hdr32.elm;
}

/// The flag bits; a 32-bit header has none.
inline uint32_t infoOf(const TAVHeader& header)
{
  return is64(header) ? header.hdr64.info : 0;
}

inline bool isGroup(const TAVHeader& header)
{
  return isGroupType(typeOf(header));
}

/// Whether the group was opened with an unknown size and never closed.
inline bool isSizeUnknown(const TAVHeader& header)
{
  return is64(header) ? header.hdr64.size == TAV_SIZE_UNKNOWN : header.hdr32.size == kSizeUnknown32;
}

constexpr bool isKnownHdrType(uint16_t hdrType)
{
  return hdrType == TAV_HDR_32 || hdrType == TAV_HDR_64;
}

constexpr uint64_t headerLength(uint16_t hdrType)
{
  return hdrType == TAV_HDR_64 ? kHeaderSize64 : kHeaderSize32;
}

/// Whether the children of a group have 64-bit headers.
inline bool hasChildren64(const TAVHeader& group)
{
  return is64(group) && group.hdr64.type != TAV_TYPE_HEADER32;
}

inline bool hasEyeSize(const TAVHeader& header)
{
  return (infoOf(header) & TAV_INFO_EYE_SIZE) != 0;
}

/// Ids that end a group's children.
constexpr bool isEndElement(uint16_t elm)
{
  return elm == TAV_ELM_CMN_END_HDR_MARKER || elm == TAV_ELM_CMN_END_HDR_EYE_SIZE;
}

/// Reverses every field by its own width.
inline void swapFields(TAVHeader32& header)
{
  header.size = kor::byteswap32(header.size);
  header.type = kor::byteswap16(header.type);
  header.elm = kor::byteswap16(header.elm);
}

inline void swapFields(TAVHeader64& header)
{
  header.size = kor::byteswap64(header.size);
  header.info = kor::byteswap32(header.info);
  header.type = kor::byteswap16(header.type);
  header.elm = kor::byteswap16(header.elm);
}

/// What a header says, whichever form it has; a 32-bit header has no flag bits.
struct HeaderFields
{
  uint64_t size;
  uint32_t info;
  uint16_t type;
  uint16_t elm;
};

inline HeaderFields fieldsOf(const TAVHeader& header)
{
  return {sizeOf(header), infoOf(header), typeOf(header), elmOf(header)};
}

/// Reads the fields of a header's stream form.
inline HeaderFields decodeFields(const uint8_t* bytes, bool wide, bool swap)
{
  if (wide)
  {
    TAVHeader64 header;
    std::memcpy(&header, bytes, sizeof header);
    if (swap)
    {
      swapFields(header);
    }
    return {header.size, header.info, header.type, header.elm};
  }
  TAVHeader32 header;
  std::memcpy(&header, bytes, sizeof header);
  if (swap)
  {
    swapFields(header);
  }
  return {header.size, 0, header.type, header.elm};
}

/// Sets a header's form and its fields, nothing else.
inline void setHeader(const HeaderFields& fields, bool wide, TAVHeader& header)
{
  if (wide)
  {
    header.hdrType = TAV_HDR_64;
    header.hdr64 = {fields.size, fields.info, fields.type, fields.elm};
    return;
  }
  header.hdrType = TAV_HDR_32;
  header.hdr32 = {static_cast<uint32_t>(fields.size), fields.type, fields.elm};
}

/// Reads the header's stream form: sets the form and its fields, nothing else.
inline void decodeHeader(const uint8_t* bytes, bool wide, bool swap, TAVHeader& header)
{
  if (wide)
  {
    header.hdrType = TAV_HDR_64;
    std::memcpy(&header.hdr64, bytes, sizeof header.hdr64);
    if (swap)
    {
      swapFields(header.hdr64);
    }
    return;
  }
  header.hdrType = TAV_HDR_32;
  std::memcpy(&header.hdr32, bytes, sizeof header.hdr32);
  if (swap)
  {
    swapFields(header.hdr32);
  }
}

/// Writes a header's stream form to `out` and returns its length.
inline uint64_t encodeFields(const HeaderFields& fields, bool wide, bool swap, uint8_t* out)
{
  if (wide)
  {
    TAVHeader64 header{fields.size, fields.info, fields.type, fields.elm};
    if (swap)
    {
      swapFields(header);
    }
    std::memcpy(out, &header, sizeof header);
    return sizeof header;
  }
  TAVHeader32 header{static_cast<uint32_t>(fields.size), fields.type, fields.elm};
  if (swap)
  {
    swapFields(header);
  }
  std::memcpy(out, &header, sizeof header);
  return sizeof header;
}

/// Writes the header's stream form to `out` and returns its length.
inline uint64_t encodeHeader(const TAVHeader& header, bool swap, uint8_t* out)
{
  return encodeFields(fieldsOf(header), is64(header), swap, out);
}

/// @}

/// @name Types
/// @{

/// How a payload is reversed between byte orders.
enum class SwapRule : uint8_t
{
  none,
  one16,     ///< one 16-bit value
  one32,     ///< one 32-bit value
  one64,     ///< one 64-bit value
  one128,    ///< 16 bytes as one value
  timestamp, ///< one 64-bit value, then four 16-bit values
  codePage,  ///< a 16-bit code page, then bytes as they are
  all64      ///< every 64-bit unit
};

/// What is known of one type code.
struct TypeInfo
{
  const char* printName; ///< null when the type has none
  SwapRule swapRule;
  uint8_t valueSize; ///< bytes of the one value; 0: any number
  bool known;        ///< a data type of the format
};

inline constexpr size_t kTypeCount = 110;

constexpr std::array<TypeInfo, kTypeCount> makeTypes()
{
  std::array<TypeInfo, kTypeCount> table{};
  table[0].printName = "Invalid header type";
  table[TAV_TYPE_HEADER32].printName = "TAV_TYPE_HEADER32";
  table[TAV_TYPE_HEADER64].printName = "TAV_TYPE_HEADER64";
  table[TAV_TYPE_ASCII_STRING] = {"ASCII String", SwapRule::none, 0, true};
  table[TAV_TYPE_UINT8] = {"Uint8", SwapRule::none, 1, true};
  table[TAV_TYPE_SINT8] = {"Sint8", SwapRule::none, 1, true};
  table[TAV_TYPE_UINT16] = {"Uint16", SwapRule::one16, 2, true};
  table[TAV_TYPE_SINT16] = {"Sint16", SwapRule::one16, 2, true};
  table[TAV_TYPE_UINT32] = {"Uint32", SwapRule::one32, 4, true};
  table[TAV_TYPE_SINT32] = {"Sint32", SwapRule::one32, 4, true};
  table[TAV_TYPE_UINT64] = {"Uint64", SwapRule::one64, 8, true};
  table[TAV_TYPE_SINT64] = {"Sint64", SwapRule::one64, 8, true};
  table[TAV_TYPE_UTC_TIMESTAMP] = {"UTC Timestamp", SwapRule::timestamp, 16, true};
  table[TAV_TYPE_BINARY] = {"Binary", SwapRule::none, 0, true};
  table[TAV_TYPE_UTF8_STRING] = {"UTF8 String", SwapRule::codePage, 0, true};
  table[TAV_TYPE_UINT128] = {"Uint128", SwapRule::one128, 0, true};
  table[TAV_TYPE_SINT128] = {"Sint128", SwapRule::one128, 0, true};
  table[TAV_TYPE_BYTE] = {nullptr, SwapRule::none, 1, true};
  table[TAV_TYPE_UINT64_ARRAY] = {nullptr, SwapRule::all64, 0, true};
  return table;
}

inline constexpr std::array<TypeInfo, kTypeCount> kTypes = makeTypes();

/// The entry of a type code; codes without one share an entry that is not known.
constexpr const TypeInfo& typeInfo(uint16_t type)
{
  return kTypes[type < kTypeCount ? type : 0];
}

/// The name that the printer shows, "Invalid header type" when there is none.
constexpr const char* typePrintName(uint16_t type)
{
  const char* const name = typeInfo(type).printName;
  return name != nullptr ? name : kTypes[0].printName;
}

/// @}

/// @name Byte order of payloads
/// @{

/// The bytes that a rule needs before it applies: 0 for rules that reverse nothing or whole units only.
constexpr uint64_t swapUnitLength(SwapRule rule)
{
  switch (rule)
  {
  case SwapRule::one16:
  case SwapRule::codePage:
    return 2;
  case SwapRule::one32:
    return 4;
  case SwapRule::one64:
    return 8;
  case SwapRule::one128:
  case SwapRule::timestamp:
    return 16;
  default:
    return 0;
  }
}

/// How many leading bytes of a payload are reversed; the rest stays as it is. A payload shorter than the type's
/// value is not reversed at all.
constexpr uint64_t swappedPrefix(SwapRule rule, uint64_t size)
{
  if (rule == SwapRule::all64)
  {
    return size & ~uint64_t{7};
  }
  const uint64_t unit = swapUnitLength(rule);
  return size >= unit ? unit : 0;
}

/// Reverses each of the units that `length` bytes consist of.
inline void reverseUnits(const uint8_t* from, uint8_t* to, uint64_t length, uint64_t unit)
{
  for (uint64_t at = 0; at < length; at += unit)
  {
    for (uint64_t i = 0; i < unit; ++i)
    {
      to[at + i] = from[at + unit - 1 - i];
    }
  }
}

/// Reverses `prefix` bytes (what swappedPrefix gave, or any multiple of 8 of them for SwapRule::all64).
/// The two ranges must not overlap.
inline void swapPayload(SwapRule rule, const uint8_t* from, uint8_t* to, uint64_t prefix)
{
  if (prefix == 0)
  {
    return;
  }
  if (rule == SwapRule::timestamp)
  {
    constexpr uint64_t seconds = 8;
    reverseUnits(from, to, seconds, seconds);
    reverseUnits(from + seconds, to + seconds, prefix - seconds, 2);
    return;
  }
  reverseUnits(from, to, prefix, rule == SwapRule::all64 ? 8 : prefix);
}

/// @}

/// @name Eye/size pairs: the eye catcher and the distance back to the node that the pair ends
/// @{

inline constexpr uint64_t kEyeLength = 8;
inline constexpr uint64_t kEyeSizeLength = 16;

/// The pair as stored in the stream.
using EyeSizeBytes = std::array<uint8_t, kEyeSizeLength>;

struct EyeSize
{
  uint64_t eye;
  uint64_t distance;
};

inline EyeSizeBytes encodeEyeSize(uint64_t distance, bool swap)
{
  const std::array<uint64_t, 2> words{swap ? kor::byteswap64(TAV_EYE_CATCHER) : TAV_EYE_CATCHER,
                                      swap ? kor::byteswap64(distance) : distance};
  return kor::bitCast<EyeSizeBytes>(words);
}

inline EyeSize decodeEyeSize(const EyeSizeBytes& bytes, bool swap)
{
  const auto words = kor::bitCast<std::array<uint64_t, 2>>(bytes);
  return {swap ? kor::byteswap64(words[0]) : words[0], swap ? kor::byteswap64(words[1]) : words[1]};
}

/// Distance of the bare pair behind a data element: its header and its payload, padding not counted.
constexpr uint64_t dataDistance(uint64_t size)
{
  return size + kHeaderSize64;
}

/// Distance of a group's end element. It counts 16 bytes of headers for a 32-bit element although the group's own
/// header has 16 and the element's 8: 8 less than the way back, as it has always been.
constexpr uint64_t groupDistance(uint64_t payloadBefore, bool wideElement)
{
  return payloadBefore + (wideElement ? 2 * kHeaderSize64 : 2 * kHeaderSize32);
}

/// Length of a group's end element, header and pair.
constexpr uint64_t endElementLength(bool wideElement)
{
  return (wideElement ? kHeaderSize64 : kHeaderSize32) + kEyeSizeLength;
}

/// The header of a group's end element; the pair behind it is its data, and as long as it would be padded to.
/// `aligned`: the stream's payloads are padded, which the flag of a wide header says.
inline TAVHeader endElement(bool wide, bool aligned)
{
  const uint32_t info = aligned ? TAV_INFO_ALIGNED8 : 0;
  TAVHeader header{};
  setHeader({kEyeSizeLength, info, TAV_TYPE_BINARY, TAV_ELM_CMN_END_HDR_EYE_SIZE}, wide, header);
  return header;
}

/// Where the node begins that a pair at `eyeOffset` ends; false when that lies before the stream's first byte.
constexpr bool nodeBefore(uint64_t eyeOffset, uint64_t distance, uint64_t& offset)
{
  offset = eyeOffset - distance;
  return distance <= eyeOffset;
}

/// @}

} // namespace tav::layout
