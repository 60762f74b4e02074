/// Closing the innermost group where the bytes are at hand: the fast way of tavCloseHeader. And what the operation
/// shares with it.
#pragma once

#include <cstdint>
#include <cstring>

#include "core/bytes.h"
#include "core/fastWay.h"
#include "format/layout.h"

namespace tav::core
{

/// Encodes the size of a group's header, the header's first field, and returns its length.
inline uint64_t encodeGroupSize(uint64_t size, bool wide, bool swap, uint8_t* to)
{
  if (wide)
  {
    const uint64_t word = swap ? kor::byteswap64(size) : size;
    std::memcpy(to, &word, sizeof word);
    return sizeof word;
  }
  const auto narrow = static_cast<uint32_t>(size);
  const uint32_t word = swap ? kor::byteswap32(narrow) : narrow;
  std::memcpy(to, &word, sizeof word);
  return sizeof word;
}

/// The bytes between a group's header and the write offset.
inline uint64_t payloadOf(const TAVHandle& handle, const TAVHeader& group)
{
  return handle.streamBytes - group.nodeOffset - headerLength(group.hdrType);
}

/// Closes the innermost group. One that gets an end element is not here.
template<class Bytes>
inline uint32_t closeGroup(TAVHandle& handle)
{
  TAVHdrStack* const stack = handle.pHdrStack;
  if (!Bytes::canWrite(handle) || stack == nullptr || stack->count == 0 || isReadOnly(handle)) [[unlikely]]
  {
    return kNotHere;
  }
  TAVHeader& group = stack->pEntries[stack->count - 1];
  if (!isKnownHdrType(group.hdrType) || hasEyeSize(group)) [[unlikely]]
  {
    return kNotHere;
  }
  const Bytes bytes(handle);
  const bool wide = is64(group);
  uint8_t* const to = bytes.placeFor(group.nodeOffset, wide ? sizeof(uint64_t) : sizeof(uint32_t), 0);
  if (to == nullptr) [[unlikely]]
  {
    return kNotHere;
  }
  const uint64_t payload = payloadOf(handle, group);
  setSize(group, payload);
  encodeGroupSize(payload, wide, bytes.form.swap, to);
  --stack->count;
  return TAV_RC_OK;
}

} // namespace tav::core
