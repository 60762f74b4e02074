/// Appending a node where the bytes have a place for it: the fast way of tavAddElement.
#pragma once

#include <cstdint>
#include <cstring>

#include "core/bytes.h"
#include "core/fastWay.h"
#include "core/word.h"
#include "format/copySmall.h"
#include "format/layout.h"

namespace tav::core
{

/// Whether a child of this form may stand under the open group. A stream's first node is not here.
template<bool Wide>
[[gnu::always_inline]] inline bool takesChild(const TAVHandle& handle)
{
  const TAVHdrStack* const stack = handle.pHdrStack;
  if (isReadOnly(handle) || stack == nullptr) [[unlikely]]
  {
    return false;
  }
  const uint64_t open = stack->count;
  if (open == 0) [[unlikely]]
  {
    return false;
  }
  const TAVHeader& parent = stack->pEntries[open - 1];
  return Wide ? hasChildren64(parent) : typeOf(parent) == TAV_TYPE_HEADER32;
}

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

/// The end of an append with a payload that copySmall would call for: apart, and the append ends in a jump to it, so
/// that others save no registers.
[[gnu::noinline]] inline uint32_t putLong(uint8_t* to, TAVHandle& handle, TAVHeaderData& node, const uint8_t* payload,
                                          uint64_t size, uint64_t length)
{
  const uint64_t position = handle.streamBytes;
  std::memmove(to, payload, size);
  moveBehind(handle, node, position, length);
  return TAV_RC_OK;
}

/// Puts a payload in host order behind its header. Most are one 32-bit or 64-bit value.
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
  else if (size > kLongestSmall)
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
  words.store(to);
  if constexpr (Bytes::bare)
  {
    return putPayload(handle, node, payload, size, to + headerSize, position, headerSize + size);
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

/// Opens a group.
template<bool Wide, class Bytes>
inline uint32_t openGroup(const Bytes& bytes, TAVHandle& handle, TAVHeader& header, HeaderFields fields)
{
  constexpr uint64_t length = lengthOfHeader(Wide);
  TAVHdrStack& stack = *handle.pHdrStack;
  const uint64_t position = handle.streamBytes;
  uint8_t* const to = stack.count < stack.capacity ? bytes.placeFor(position, length, 0) : nullptr;
  if (to == nullptr) [[unlikely]]
  {
    return kNotHere;
  }
  if (Wide && bytes.form.alignAll)
  {
    fields.info |= TAV_INFO_ALIGNED8;
    header.hdr64.info = fields.info;
  }
  HeaderWords<Wide>(fields, bytes.form.swap).store(to);
  header.nodeOffset = position;
  handle.streamBytes = position + length;
  stack.pEntries[stack.count++] = header;
  return TAV_RC_OK;
}

/// Whether the payload is all there. Most callers leave its size to the header.
[[gnu::always_inline]] inline bool isComplete(uint64_t dataBufSize, uint64_t size)
{
  return dataBufSize >= size || dataBufSize == 0;
}

/// The fast way of appending a node with a 64-bit header if `Wide`.
template<bool Wide, class Bytes>
[[gnu::always_inline]] inline uint32_t append(const Bytes& bytes, TAVHandle& handle, TAVHeaderData& node)
{
  if (!takesChild<Wide>(handle)) [[unlikely]]
  {
    return kNotHere;
  }
  const HeaderFields fields = loadFields<Wide>(node.header);
  if constexpr (Bytes::bare)
  {
    const bool element = fields.type > TAV_TYPE_HEADER64 && isComplete(node.dataBufSize, fields.size) &&
                         (fields.info & TAV_INFO_EYE_SIZE) == 0 && node.pDataBuf != nullptr;
    return element ? appendElement<Wide>(bytes, handle, node, fields) : kNotHere;
  }
  if (isGroupType(fields.type))
  {
    return openGroup<Wide>(bytes, handle, node.header, fields);
  }
  return isComplete(node.dataBufSize, fields.size) && node.pDataBuf != nullptr && fields.size <= kFarSize
             ? appendElement<Wide>(bytes, handle, node, fields)
             : kNotHere;
}

} // namespace tav::core
