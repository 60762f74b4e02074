/// @file append.hpp
/// Appending a data element where the bytes have a place for it.
#pragma once

#include <cstdint>
#include <cstring>

#include "tav/core/bytes.hpp"
#include "tav/core/copySmall.hpp"
#include "tav/core/fastWay.hpp"
#include "tav/core/words.hpp"
#include "tav/layout.hpp"

namespace tav::core
{

/// Whether a payload is apart from the place that its node is encoded to.
inline bool isApart(const uint8_t* payload, uint64_t size, const uint8_t* to, uint64_t length)
{
  const auto from = reinterpret_cast<uintptr_t>(payload);
  const auto start = reinterpret_cast<uintptr_t>(to);
  return from + size <= start || start + length <= from;
}

/// Encodes a payload at its place, in the other byte order if `swap`.
inline void encodePayload(uint16_t type, bool swap, const uint8_t* payload, uint64_t size, uint8_t* to)
{
  uint64_t prefix = 0;
  if (swap) [[unlikely]]
  {
    const SwapRule rule = typeInfo(type).swapRule;
    prefix = swappedPrefix(rule, size);
    swapPayload(rule, payload, to, prefix);
  }
  copySmall(to + prefix, payload + prefix, size - prefix);
}

/// Ends an append: the node is where the write offset was. The payload was read before, as it may be one of these
/// numbers.
[[gnu::always_inline]] inline void moveBehind(TAVHandle& handle, TAVHeaderData& node, uint64_t position,
                                              uint64_t length)
{
  node.header.nodeOffset = position;
  handle.streamBytes = position + length;
}

/// The end of an append with a payload that copySmall would call for: apart, for an append that ends in a jump to
/// it, so that others save no registers.
[[gnu::noinline]] inline uint32_t putLong(uint8_t* to, TAVHandle& handle, TAVHeaderData& node, const uint8_t* payload,
                                          uint64_t size, uint64_t length)
{
  const uint64_t position = handle.streamBytes;
  std::memmove(to, payload, static_cast<size_t>(size));
  moveBehind(handle, node, position, length);
  return TAV_RC_OK;
}

/// Puts a payload in host order behind its header. Most are one 32-bit or 64-bit value.
template<class Way>
[[gnu::always_inline]] inline uint32_t putPayload(TAVHandle& handle, TAVHeaderData& node, const uint8_t* payload,
                                                  uint64_t size, uint8_t* to, uint64_t position, uint64_t length)
{
  if (size == sizeof(uint32_t))
  {
    store(to, load<uint32_t>(payload));
  }
  else if (size == sizeof(uint64_t))
  {
    store(to, load<uint64_t>(payload));
  }
  else if (Way::endsInJump && size > kLongestSmall)
  {
    return isHere(putLong(to, handle, node, payload, size, length));
  }
  else
  {
    copySmall(to, payload, size);
  }
  moveBehind(handle, node, position, length);
  return TAV_RC_OK;
}

/// Appends a data element with its whole payload. Padding is counted, but written only where a pair follows it.
template<bool Wide, class Bytes>
[[gnu::always_inline]] inline uint32_t appendElement(const Bytes& bytes, TAVHandle& handle, TAVHeaderData& node,
                                                     HeaderFields fields)
{
  constexpr uint64_t headerSize = lengthOfHeader(Wide);
  const uint64_t size = fields.size;
  const bool pair = !Bytes::bare && (fields.info & TAV_INFO_EYE_SIZE) != 0;
  const bool swap = bytes.form.swap;
  uint64_t padded = size;
  if (bytes.form.alignAll)
  {
    roundUp8Checked(padded);
    fields.info |= TAV_INFO_ALIGNED8;
  }
  const HeaderWords<Wide> words(fields, swap);
  const uint64_t position = handle.streamBytes;
  const uint8_t* const payload = node.pDataBuf;
  const uint64_t behind = pair ? padded + kEyeSizeLength : size;
  uint8_t* const to = bytes.placeFor(position, headerSize, behind);
  if (to == nullptr || (swap && !isApart(payload, size, to, headerSize + behind))) [[unlikely]]
  {
    return kNotHere;
  }
  if (Wide && bytes.form.alignAll)
  {
    node.header.hdr64.info = fields.info;
  }
  words.template store<typename Bytes::Way>(to);
  if constexpr (Bytes::bare)
  {
    return putPayload<typename Bytes::Way>(handle, node, payload, size, to + headerSize, position, headerSize + size);
  }
  else
  {
    encodePayload(fields.type, swap, payload, size, to + headerSize);
    if (pair)
    {
      const EyeSizeBytes eyeSize = encodeEyeSize(dataDistance(size), swap);
      std::memcpy(to + headerSize + padded, eyeSize.data(), eyeSize.size());
    }
    moveBehind(handle, node, position, headerSize + padded + (pair ? kEyeSizeLength : 0));
    return TAV_RC_OK;
  }
}

} // namespace tav::core
