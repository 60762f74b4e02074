/// Appending a node of any kind: the fast way of tavAddElement.
#pragma once

#include <cstdint>

#include "core/bytes.h"
#include "core/fastWay.h"
#include "core/word.h"
#include "tav/core/append.hpp"

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
  HeaderWords<Wide>(fields, bytes.form.swap).template store<LibraryWay>(to);
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
  const HeaderFields fields = LibraryWay::loadFields<Wide>(node.header);
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
