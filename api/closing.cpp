/// Closing and abandoning groups.
#include "api/rawWrite.h"
#include "format/layout.h"
#include "kor/traceFrame.h"
#include "tav/probes.h"

using namespace tav;

namespace
{

constexpr uint64_t kAbandon = 1;

/// Writes the size of a group's header, the header's first field, over the one in the stream.
uint32_t patchSize(TAVHandle& handle, const TAVHeader& group)
{
  uint64_t position = group.nodeOffset;
  const bool swap = handle.swapBytes != 0;
  if (is64(group))
  {
    const uint64_t size = swap ? kor::byteswap64(group.hdr64.size) : group.hdr64.size;
    return rawWrite(handle, position, &size, sizeof size);
  }
  const uint32_t size = swap ? kor::byteswap32(group.hdr32.size) : group.hdr32.size;
  return rawWrite(handle, position, &size, sizeof size);
}

uint32_t abandonGroup(TAVHandle& handle, const TAVHeader& group)
{
  if (!isKnownHdrType(group.hdrType))
  {
    return TAV_RC_BAD_HDR_TYPE;
  }
  const uint32_t rc = patchSize(handle, group);
  if (rc == TAV_RC_OK)
  {
    handle.streamBytes = group.nodeOffset;
  }
  return rc;
}

uint32_t closeGroup32(TAVHandle& handle, TAVHeader& group)
{
  group.hdr32.size = static_cast<uint32_t>(handle.streamBytes - group.nodeOffset - kHeaderSize32);
  return patchSize(handle, group);
}

/// Appends the element that ends a group and leads back to it.
uint32_t appendEndElement(TAVHandle& handle, uint64_t payloadBefore, bool wide)
{
  EyeSizeBytes pair = encodeEyeSize(groupDistance(payloadBefore, wide), handle.swapBytes != 0);
  TAVHeaderData element{};
  if (wide)
  {
    element.header.hdr64 = {kEyeSizeLength, 0, TAV_TYPE_BINARY, TAV_ELM_CMN_END_HDR_EYE_SIZE};
    element.header.hdrType = TAV_HDR_64;
  }
  else
  {
    element.header.hdr32 = {static_cast<uint32_t>(kEyeSizeLength), TAV_TYPE_BINARY, TAV_ELM_CMN_END_HDR_EYE_SIZE};
    element.header.hdrType = TAV_HDR_32;
  }
  element.pDataBuf = pair.data();
  element.dataBufSize = pair.size();
  return tavAddElement(0, &handle, &element);
}

uint32_t closeGroup64(TAVHandle& handle, TAVHeader& group)
{
  const bool wasUnknown = isSizeUnknown(group);
  const bool wide = hasChildren64(group);
  const uint64_t payload = handle.streamBytes - group.nodeOffset - kHeaderSize64;
  group.hdr64.size = payload + (hasEyeSize(group) ? endElementLength(wide) : 0);
  const uint32_t rc = patchSize(handle, group);
  // A group of unknown size whose size could not be written is still given an end that a reader can find.
  const bool needsEnd = hasEyeSize(group) || (rc != TAV_RC_OK && wasUnknown);
  return needsEnd ? appendEndElement(handle, payload, wide) : rc;
}

uint32_t closeGroup(TAVHandle& handle, TAVHeader& group)
{
  switch (group.hdrType)
  {
  case TAV_HDR_32:
    return closeGroup32(handle, group);
  case TAV_HDR_64:
    return closeGroup64(handle, group);
  default:
    return TAV_RC_BAD_HDR_TYPE;
  }
}

} // namespace

uint32_t tavCloseHeader(uint64_t options, TAVHandle* handle)
{
  TraceFrame frame(probe::closeHeader);
  frame.dump(0, options, handle);
  if (!frame.require(10, handle != nullptr, TAV_RC_BAD_PARAM) ||
      !frame.require(20, !isReadOnly(*handle), TAV_RC_WRONG_MODE) ||
      !frame.require(30, options <= kAbandon, TAV_RC_BAD_OPTIONS))
  {
    return frame.code();
  }
  TAVHeader* const group = openGroup(*handle);
  if (frame.require(40, group != nullptr, TAV_RC_NOT_FOUND) &&
      frame.step(50, options == kAbandon ? abandonGroup(*handle, *group) : closeGroup(*handle, *group)) &&
      frame.step(60, handle->pHdrStack->pop()))
  {
    frame.dump(100, handle->streamBytes);
  }
  return frame.code();
}
