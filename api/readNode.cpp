/// Reading the node at an offset.
#include <algorithm>
#include <array>

#include "api/fetchBytes.h"
#include "core/step.h"
#include "tav/probes.h"
#include "trace/traceFrame.h"

using namespace tav;
using namespace tav::inside;

namespace
{

uint32_t readBuffered(TAVHandle& handle, uint64_t offset, bool wide, TAVHeaderData& out)
{
  out.header.hdrType = wide ? TAV_HDR_64 : TAV_HDR_32;
  const uint64_t length = headerLength(out.header.hdrType);
  std::array<uint8_t, kHeaderSize64> bytes;
  uint32_t rc = fetchBytes(*handle.pCircularBuf, offset, bytes.data(), length);
  if (rc != TAV_RC_OK)
  {
    return rc;
  }
  decodeHeader(bytes.data(), wide, handle.swapBytes != 0, out.header);
  if (isGroup(out.header))
  {
    return TAV_RC_OK;
  }
  const uint64_t size = sizeOf(out.header);
  TAVCBUserArea area = areaOf(handle);
  rc = fetchData(*handle.pCircularBuf, offset + length, size, area);
  setArea(handle, area);
  out.pDataBuf = area.pChunk;
  out.dataBufSize = std::min(area.chunkLength, size);
  out.dataBufOffset = 0;
  return rc;
}

/// The room is what the block holds beyond the absolute offset, also when it begins elsewhere in the stream: it has
/// always been so over direct memory.
template<bool Wide>
uint32_t readDirect(const TAVHandle& handle, uint64_t offset, TAVHeaderData& out)
{
  constexpr uint64_t length = core::lengthOfHeader(Wide);
  uint64_t relative = 0;
  if (!isInDirectData(handle, offset, relative))
  {
    return TAV_RC_NO_MEMORY;
  }
  out.header.hdrType = Wide ? TAV_HDR_64 : TAV_HDR_32;
  if (offset > handle.directDataSize || handle.directDataSize - offset < length)
  {
    return TAV_RC_NO_MEMORY;
  }
  uint8_t* const header = handle.pDirectData + relative;
  const bool swap = handle.swapBytes != 0;
  const bool hasData = core::BlockBytes<core::AnyForm>::hasData<Wide>(core::NodeIn<Wide>{header, swap}.type());
  core::describe<Wide, core::LibraryWay>(header, swap, offset, hasData ? header + length : nullptr,
                                         hasData ? handle.directDataSize - relative - length : 0, out);
  return TAV_RC_OK;
}

bool isDataWhole(const TAVHeaderData& node)
{
  return node.pDataBuf == nullptr || isGroup(node.header) || sizeOf(node.header) <= node.dataBufSize;
}

[[gnu::noinline]] uint32_t readTraced(uint64_t options, TAVHandle* handle, uint64_t offset, bool wide,
                                      TAVHeaderData* out)
{
  TraceFrame frame(probe::readNode);
  frame.dump(0, options, handle, offset, wide, out);
  if (!frame.require(10, handle != nullptr, TAV_RC_BAD_PARAM) || !frame.require(20, out != nullptr, TAV_RC_BAD_PARAM))
  {
    return frame.code();
  }
  out->pDataBuf = nullptr;
  out->dataBufSize = 0;
  out->dataBufOffset = 0;
  out->header.nodeOffset = offset;
  const bool read = core::isDirect(*handle)
                        ? frame.require(50, handle->pDirectData != nullptr, TAV_RC_NO_MEMORY) &&
                              frame.step(60, wide ? readDirect<true>(*handle, offset, *out)
                                                  : readDirect<false>(*handle, offset, *out))
                        : frame.require(30, handle->pCircularBuf != nullptr, TAV_RC_NO_CIRCULAR_BUF) &&
                              frame.step(40, readBuffered(*handle, offset, wide, *out));
  if (read && frame.require(70, isDataWhole(*out), TAV_RC_DATA_TOO_LARGE))
  {
    frame.dump(100, trace::record(out));
  }
  return frame.code();
}

} // namespace

namespace
{

template<class Bytes>
uint32_t readFast(TAVHandle& handle, uint64_t offset, bool wide, TAVHeaderData& out)
{
  if (!Bytes::canRead(handle))
  {
    return core::kNotHere;
  }
  const Bytes bytes(handle);
  return wide ? core::readNode<true>(bytes, handle, offset, out) : core::readNode<false>(bytes, handle, offset, out);
}

} // namespace

uint32_t tavReadNodeInt(uint64_t options, TAVHandle* handle, uint64_t offset, bool is64, TAVHeaderData* out)
{
  uint32_t rc = core::kNotHere;
  if (core::isFastCall(0) && handle != nullptr && out != nullptr) [[likely]] // whatever the options are
  {
    rc = core::isDirect(*handle) ? readFast<core::BlockBytes<core::AnyForm>>(*handle, offset, is64, *out)
                                 : readFast<core::RingBytes<core::AnyForm>>(*handle, offset, is64, *out);
  }
  return rc != core::kNotHere ? rc : readTraced(options, handle, offset, is64, out);
}
