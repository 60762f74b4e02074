/// Closing and abandoning groups.
#include <array>
#include <cstring>

#include "api/rawWrite.h"
#include "core/close.h"
#include "format/layout.h"
#include "tav/probes.h"
#include "trace/traceFrame.h"

using namespace tav;
using namespace tav::inside;

namespace
{

constexpr uint64_t kAbandon = 1;

/// Writes the size of a group over the one in the stream.
uint32_t patchSize(TAVHandle& handle, const TAVHeader& group)
{
  uint64_t position = group.nodeOffset;
  std::array<uint8_t, sizeof(uint64_t)> bytes;
  const uint64_t length = core::encodeGroupSize(sizeOf(group), is64(group), handle.swapBytes != 0, bytes.data());
  return rawWrite(handle, position, bytes.data(), length);
}

bool abandonGroup(TraceFrame& frame, TAVHandle& handle, const TAVHeader& group)
{
  if (!frame.step(50, patchSize(handle, group)))
  {
    return false;
  }
  handle.streamBytes = group.nodeOffset;
  return true;
}

/// Appends the element that ends a group and leads back to it.
uint32_t appendEndElement(TAVHandle& handle, uint64_t payloadBefore, bool wide)
{
  EyeSizeBytes pair = encodeEyeSize(groupDistance(payloadBefore, wide), handle.swapBytes != 0);
  TAVHeaderData element{};
  element.header = endElement(wide, handle.alignMode == 1);
  element.pDataBuf = pair.data();
  element.dataBufSize = pair.size();
  return tavAddElement(0, &handle, &element);
}

bool closeGroup32(TraceFrame& frame, TAVHandle& handle, TAVHeader& group)
{
  setSize(group, handle.streamBytes - group.nodeOffset - kHeaderSize32);
  return frame.step(50, patchSize(handle, group));
}

/// A group that was pushed with an unknown size is given an end that a reader can find when its size cannot be written.
/// The close succeeds then, and the failure is told by its record alone. Any other size stands for what is below the
/// group, so that failing to write it fails the close.
bool closeGroup64(TraceFrame& frame, TAVHandle& handle, TAVHeader& group)
{
  const bool wasUnknown = isSizeUnknown(group);
  const bool wide = hasChildren64(group);
  const uint64_t payload = handle.streamBytes - group.nodeOffset - kHeaderSize64;
  setSize(group, payload + (hasEyeSize(group) ? endElementLength(wide) : 0));
  const uint32_t rc = patchSize(handle, group);
  if (rc == TAV_RC_OK && !hasEyeSize(group))
  {
    return true;
  }
  if (rc != TAV_RC_OK)
  {
    if (!wasUnknown)
    {
      return frame.fail(50, rc);
    }
    frame.report(50, rc);
  }
  return frame.step(60, appendEndElement(handle, payload, wide));
}

bool endGroup(uint64_t options, TraceFrame& frame, TAVHandle& handle, TAVHeader& group)
{
  if (options == kAbandon)
  {
    return abandonGroup(frame, handle, group);
  }
  return is64(group) ? closeGroup64(frame, handle, group) : closeGroup32(frame, handle, group);
}

[[gnu::noinline]] uint32_t closeTraced(uint64_t options, TAVHandle* handle)
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
      frame.require(50, isKnownHdrType(group->hdrType), TAV_RC_BAD_HDR_TYPE) &&
      endGroup(options, frame, *handle, *group) &&
      frame.step(70, handle->pHdrStack->pop()))
  {
    frame.dump(100, handle->streamBytes);
  }
  return frame.code();
}

} // namespace

uint32_t tavCloseHeader(uint64_t options, TAVHandle* handle)
{
  uint32_t rc = core::kNotHere;
  if (core::isFastCall(options) && handle != nullptr)
  {
    rc = core::isDirect(*handle) ? core::closeGroup<core::BlockBytes<core::AnyForm>>(*handle)
                                 : core::closeGroup<core::RingBytes<core::AnyForm>>(*handle);
  }
  return rc != core::kNotHere ? rc : closeTraced(options, handle);
}
