/// Appending nodes: elements and groups, and the step that encodes one node.
#include <array>
#include <cstring>

#include "api/addElement.h"
#include "api/rawWrite.h"
#include "format/layout.h"
#include "tav/probes.h"
#include "trace/traceFrame.h"

using namespace tav;
using namespace tav::inside;

namespace
{

/// A data element comes with its whole payload, or with none at all when the caller writes it afterwards.
bool isPayloadComplete(const TAVHeader& header, const uint8_t* payload, uint64_t length)
{
  const bool none = payload == nullptr && length == 0;
  return isGroup(header) || none || (payload != nullptr && length >= sizeOf(header));
}

/// Refuses a node for which the stream has no place, before any byte is written.
uint32_t checkNodeRoom(const TAVHandle& handle, const TAVHeader& header, uint64_t position)
{
  if (!isDirect(handle))
  {
    return handle.pCircularBuf != nullptr ? TAV_RC_OK : TAV_RC_NO_CIRCULAR_BUF;
  }
  if (handle.pDirectData == nullptr)
  {
    return TAV_RC_NO_MEMORY;
  }
  // A header of no known form, which is refused next, is taken for the longer one.
  const uint64_t length = header.hdrType == TAV_HDR_32 ? kHeaderSize32 : kHeaderSize64;
  const bool fits = hasRoom(handle, position, length, isGroup(header) ? 0 : sizeOf(header));
  return fits ? TAV_RC_OK : TAV_RC_END_OF_STORAGE;
}

uint32_t writeHeader(TAVHandle& handle, const TAVHeader& header, uint64_t& position)
{
  std::array<uint8_t, kHeaderSize64> bytes;
  const uint64_t length = encodeHeader(header, handle.swapBytes != 0, bytes.data());
  return rawWrite(handle, position, bytes.data(), length);
}

/// Payload, padding and eye/size pair of a data element.
uint32_t writeBody(TAVHandle& handle, const TAVHeader& header, uint64_t& position, const uint8_t* payload)
{
  const uint64_t size = sizeOf(header);
  const uint64_t start = position;
  uint32_t rc = writePayload(handle, position, typeOf(header), payload, size);
  if (rc != TAV_RC_OK)
  {
    return rc;
  }
  if (handle.alignMode == 1)
  {
    uint64_t padded = size; // the payload's size is rounded up, wherever the node is
    roundUp8Checked(padded);
    position = addSaturated(start, padded);
  }
  if (hasEyeSize(header))
  {
    const EyeSizeBytes pair = encodeEyeSize(dataDistance(size), handle.swapBytes != 0);
    rc = rawWrite(handle, position, pair.data(), pair.size());
  }
  return rc;
}

uint32_t writeNode(TAVHandle& handle, const TAVHeader& header, uint64_t& position, const uint8_t* payload)
{
  const uint32_t rc = writeHeader(handle, header, position);
  if (rc != TAV_RC_OK || isGroup(header) || payload == nullptr)
  {
    return rc;
  }
  return writeBody(handle, header, position, payload);
}

uint32_t pushGroup(TAVHandle& handle, const TAVHeader& group)
{
  return handle.pHdrStack != nullptr ? handle.pHdrStack->push(&group) : TAV_RC_NO_HDR_STACK;
}

} // namespace

uint32_t tavWriteNodeInt(uint64_t options, TAVHandle* handle, TAVHeader* header, uint64_t* position, uint8_t* payload,
                         uint64_t payloadLength)
{
  TraceFrame frame(probe::writeNode);
  frame.dump(0, options, handle, "Node to be written", trace::record(header), position, payload, payloadLength);
  if (!frame.require(10, handle != nullptr, TAV_RC_BAD_PARAM) ||
      !frame.require(20, header != nullptr, TAV_RC_BAD_PARAM) ||
      !frame.require(30, position != nullptr, TAV_RC_BAD_PARAM) ||
      !frame.require(40, isPayloadComplete(*header, payload, payloadLength), TAV_RC_BAD_PAYLOAD))
  {
    return frame.code();
  }
  // NOLINTNEXTLINE(clang-analyzer-core.NullDereference): the analyser does not follow the frame's checks so deep
  if (handle->alignMode == 1 && is64(*header))
  {
    header->hdr64.info |= TAV_INFO_ALIGNED8;
  }
  // NOLINTNEXTLINE(clang-analyzer-core.NullDereference): likewise
  if (frame.step(50, checkNodeRoom(*handle, *header, *position)) &&
      frame.require(60, isKnownHdrType(header->hdrType), TAV_RC_BAD_HDR_TYPE) &&
      frame.step(70, writeNode(*handle, *header, *position, payload)))
  {
    frame.dump(100, *position);
  }
  return frame.code();
}

namespace
{

[[gnu::noinline]] uint32_t addTraced(uint64_t options, TAVHandle* handle, TAVHeaderData* headerData)
{
  TraceFrame frame(probe::addElement);
  frame.dump(0, options, handle, "Element to be appended", trace::record(headerData));
  if (!frame.require(10, handle != nullptr, TAV_RC_BAD_PARAM) ||
      !frame.require(20, headerData != nullptr, TAV_RC_BAD_PARAM) ||
      // NOLINTNEXTLINE(clang-analyzer-core.NonNullParamChecker): likewise
      !frame.require(30, !isReadOnly(*handle), TAV_RC_WRONG_MODE) ||
      !frame.require(40, options == 0, TAV_RC_BAD_OPTIONS))
  {
    return frame.code();
  }
  TAVHeader& header = headerData->header;
  uint64_t position = handle->streamBytes;
  const uint64_t length = headerData->dataBufSize != 0 ? headerData->dataBufSize : sizeOf(header);
  if (frame.step(50, validateChild(*handle, header)) &&
      frame.require(60, isGroup(header) || headerData->pDataBuf != nullptr, TAV_RC_BAD_PARAM) &&
      frame.step(70, tavWriteNodeInt(0, handle, &header, &position, headerData->pDataBuf, length)))
  {
    header.nodeOffset = handle->streamBytes;
    if (isGroup(header))
    {
      static_cast<void>(frame.step(80, pushGroup(*handle, header)));
    }
    handle->streamBytes = position;
    frame.dump(100, header.nodeOffset, position);
  }
  return frame.code();
}

/// The fast way over bytes of any kind.
template<class Bytes>
uint32_t addFast(TAVHandle& handle, TAVHeaderData& node)
{
  if (!Bytes::canWrite(handle))
  {
    return core::kNotHere;
  }
  switch (node.header.hdrType)
  {
  case TAV_HDR_64:
    return core::append<true>(Bytes(handle), handle, node);
  case TAV_HDR_32:
    return core::append<false>(Bytes(handle), handle, node);
  default:
    return core::kNotHere;
  }
}

} // namespace

uint32_t tav::inside::addElsewhere(uint64_t options, TAVHandle* handle, TAVHeaderData* headerData)
{
  uint32_t rc = core::kNotHere;
  if (core::isFastCall(options) && handle != nullptr && headerData != nullptr)
  {
    rc = core::isDirect(*handle) ? addFast<core::BlockBytes<core::AnyForm>>(*handle, *headerData)
                                 : addFast<core::RingBytes<core::AnyForm>>(*handle, *headerData);
  }
  return rc != core::kNotHere ? rc : addTraced(options, handle, headerData);
}
