/// Streams put together row by row from the byte layout, without the library's writer.
#pragma once

#include <cstdint>
#include <cstring>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "support/elements.h"
#include "support/hex.h"
#include "support/streams.h"

namespace test
{

/// The eye catcher as this machine stores it, and the same from a machine of the other order.
inline Bytes eyeBytes(bool swap)
{
  return swap != kBigEndianHost ? hex("C0 DE D5 EE DD EC 0D ED") : hex("ED 0D EC DD EE D5 DE C0");
}

/// A stream being laid out by hand, in this machine's byte order or in the other one.
class ByteRows
{
public:
  explicit ByteRows(bool swap = false)
      : swap_(swap) {}

  ByteRows& number(uint64_t value, unsigned width)
  {
    for (unsigned i = 0; i < width; ++i)
    {
      const unsigned place = swap_ != kBigEndianHost ? width - 1 - i : i;
      bytes.push_back(static_cast<uint8_t>(value >> (8 * place)));
    }
    return *this;
  }
  ByteRows& h32(uint64_t size, uint16_t type, uint16_t elm)
  {
    return number(size, 4).number(type, 2).number(elm, 2);
  }
  ByteRows& h64(uint64_t size, uint32_t info, uint16_t type, uint16_t elm)
  {
    return number(size, 8).number(info, 4).number(type, 2).number(elm, 2);
  }
  ByteRows& data(const Bytes& more)
  {
    bytes.insert(bytes.end(), more.begin(), more.end());
    return *this;
  }
  ByteRows& fill(uint64_t count, uint8_t value = 0)
  {
    bytes.insert(bytes.end(), count, value);
    return *this;
  }
  /// An eye/size pair.
  ByteRows& pair(uint64_t distance)
  {
    return data(eyeBytes(swap_)).number(distance, 8);
  }
  /// A group's end element with a 64-bit header.
  ByteRows& end64(uint64_t distance)
  {
    return h64(16, 0, TAV_TYPE_BINARY, TAV_ELM_CMN_END_HDR_EYE_SIZE).pair(distance);
  }
  [[nodiscard]] uint64_t at() const
  {
    return bytes.size();
  }

  Bytes bytes;

private:
  bool swap_;
};

/// A descriptor in which every field holds what no read gives.
inline TAVHeaderData untouched()
{
  TAVHeaderData data;
  std::memset(&data, 0xA5, sizeof data);
  return data;
}

template<class Record>
bool sameBytes(const Record& a, const Record& b)
{
  return std::memcmp(&a, &b, sizeof a) == 0;
}

/// Bytes that a descriptor leads to.
inline Bytes payloadOf(const TAVHeaderData& node, uint64_t size)
{
  return {node.pDataBuf, node.pDataBuf + size};
}

inline uint16_t elmOfNode(const TAVHeaderData& node)
{
  return node.header.hdrType == TAV_HDR_64 ? node.header.hdr64.elm : node.header.hdr32.elm;
}

/// Direct and buffered, each in both byte orders.
inline std::vector<Form> accessAndOrder()
{
  std::vector<Form> forms;
  for (const bool buffered : {false, true})
  {
    for (const bool swap : {false, true})
    {
      Form form;
      form.buffered = buffered;
      form.swap = swap;
      forms.push_back(form);
    }
  }
  return forms;
}

} // namespace test
