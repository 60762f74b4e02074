/// Nodes to be written: headers with their payloads, made in one line.
#pragma once

#include <bit>
#include <cstdint>
#include <cstring>
#include <string_view>
#include <vector>

#include "tav/tav.h"

namespace test
{

using Bytes = std::vector<uint8_t>;

constexpr bool kBigEndianHost = std::endian::native == std::endian::big;

/// A node and the bytes that its descriptor points to.
struct Element
{
  TAVHeader header{};
  Bytes payload;

  /// A descriptor of this node; valid while the element lives and stays where it is.
  TAVHeaderData data()
  {
    return {header, payload.data(), payload.size(), 0};
  }

  [[nodiscard]] uint64_t size() const
  {
    return header.hdrType == TAV_HDR_64 ? header.hdr64.size : header.hdr32.size;
  }
  [[nodiscard]] uint16_t type() const
  {
    return header.hdrType == TAV_HDR_64 ? header.hdr64.type : header.hdr32.type;
  }
  [[nodiscard]] uint16_t elm() const
  {
    return header.hdrType == TAV_HDR_64 ? header.hdr64.elm : header.hdr32.elm;
  }
};

/// Bytes of a type's value; 0 where values of several sizes have it.
constexpr uint64_t valueSizeOf(uint16_t type)
{
  switch (type)
  {
  case 51:
  case 52:
  case 105: return 1;
  case 53:
  case 54: return 2;
  case 55:
  case 56: return 4;
  case 57:
  case 58: return 8;
  case 100:
  case 103:
  case 104: return 16;
  default: return 0;
  }
}

inline TAVHeader header32(uint32_t size, uint16_t type, uint16_t elm, uint64_t offset = 0)
{
  TAVHeader header{};
  header.hdr32 = {size, type, elm};
  header.hdrType = TAV_HDR_32;
  header.nodeOffset = offset;
  return header;
}

inline TAVHeader header64(uint64_t size, uint16_t type, uint16_t elm, uint32_t info = 0, uint64_t offset = 0)
{
  TAVHeader header{};
  header.hdr64 = {size, info, type, elm};
  header.hdrType = TAV_HDR_64;
  header.nodeOffset = offset;
  return header;
}

/// A data element with either header form.
inline Element element(bool wide, uint16_t type, uint16_t elm, Bytes payload, uint32_t info = 0)
{
  const uint64_t size = payload.size();
  return {wide ? header64(size, type, elm, info) : header32(static_cast<uint32_t>(size), type, elm),
          std::move(payload)};
}

template<class Value>
Bytes bytesOfValue(const Value& value)
{
  Bytes bytes(sizeof value);
  std::memcpy(bytes.data(), &value, sizeof value);
  return bytes;
}

inline Bytes bytesOfText(std::string_view text)
{
  return {text.begin(), text.end()};
}

inline Element u16(uint16_t elm, uint16_t value, bool wide = true, uint32_t info = 0)
{
  return element(wide, TAV_TYPE_UINT16, elm, bytesOfValue(value), info);
}

inline Element u32(uint16_t elm, uint32_t value, bool wide = true, uint32_t info = 0)
{
  return element(wide, TAV_TYPE_UINT32, elm, bytesOfValue(value), info);
}

inline Element u64(uint16_t elm, uint64_t value, bool wide = true, uint32_t info = 0)
{
  return element(wide, TAV_TYPE_UINT64, elm, bytesOfValue(value), info);
}

inline Element ascii(uint16_t elm, std::string_view text, bool wide = true, uint32_t info = 0)
{
  return element(wide, TAV_TYPE_ASCII_STRING, elm, bytesOfText(text), info);
}

inline Element binary(uint16_t elm, Bytes bytes, bool wide = true, uint32_t info = 0)
{
  return element(wide, TAV_TYPE_BINARY, elm, std::move(bytes), info);
}

/// A group with a 64-bit header; `type` says which headers its children have.
inline Element group64(uint16_t elm, uint16_t type = TAV_TYPE_HEADER64, uint32_t info = 0,
                       uint64_t size = TAV_SIZE_UNKNOWN)
{
  return {header64(size, type, elm, info), {}};
}

inline Element group32(uint16_t elm, uint32_t size = 0)
{
  return {header32(size, TAV_TYPE_HEADER32, elm), {}};
}

/// A group with a header of this width, and so its children.
inline Element groupOf(bool wide, uint16_t elm)
{
  return wide ? group64(elm) : group32(elm);
}

} // namespace test
