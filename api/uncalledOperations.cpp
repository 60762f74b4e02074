#include "api/uncalledOperations.h"

#include <algorithm>

#include "api/fetchBytes.h"
#include "api/rawWrite.h"
#include "format/layout.h"
#include "tav/probes.h"
#include "trace/traceFrame.h"

using namespace tav;
using namespace tav::inside;

namespace
{

uint32_t nextDirect(const TAVHandle& handle, uint64_t position, uint64_t remaining, TAVHeaderData& node)
{
  uint64_t relative = 0;
  if (handle.pDirectData == nullptr || !isInDirectData(handle, node.header.nodeOffset, relative) ||
      !isInDirectData(handle, position, relative))
  {
    return TAV_RC_NO_MEMORY;
  }
  node.pDataBuf = handle.pDirectData + relative;
  node.dataBufSize = std::min(remaining, handle.directDataSize - relative);
  return TAV_RC_OK;
}

uint32_t nextBuffered(TAVHandle& handle, uint64_t position, uint64_t remaining, TAVHeaderData& node)
{
  if (handle.pCircularBuf == nullptr)
  {
    return TAV_RC_NO_CIRCULAR_BUF;
  }
  TAVCBUserArea area = areaOf(handle);
  const uint32_t rc = handle.pCircularBuf->getChunk(position, remaining, &area, false, false);
  setArea(handle, area);
  node.pDataBuf = area.pChunk;
  node.dataBufSize = std::min(area.chunkLength, remaining);
  return rc;
}

uint32_t nextPart(TAVHandle& handle, TAVHeaderData& node)
{
  const uint64_t position = addSaturated(node.header.nodeOffset, node.dataBufOffset);
  const uint64_t remaining = sizeOf(node.header) - node.dataBufOffset - node.dataBufSize;
  node.dataBufOffset += node.dataBufSize;
  const uint32_t rc = isDirect(handle) ? nextDirect(handle, position, remaining, node)
                                       : nextBuffered(handle, position, remaining, node);
  const bool tooLarge = rc == TAV_RC_OK && node.pDataBuf != nullptr && remaining < node.dataBufSize;
  return tooLarge ? TAV_RC_DATA_TOO_LARGE : rc;
}

} // namespace

uint32_t tavGetNextDataBuffer(uint64_t options, TAVHandle* handle, TAVHeaderData* node)
{
  TraceFrame frame(probe::getNextDataBuffer);
  frame.dump(0, options, handle, "Input/Output header", trace::record(node));
  if (frame.require(10, handle != nullptr, TAV_RC_BAD_PARAM) && frame.require(20, node != nullptr, TAV_RC_BAD_PARAM) &&
      frame.require(30, options == 0, TAV_RC_BAD_PARAM) &&
      frame.require(40, sizeOf(node->header) > addSaturated(node->dataBufOffset, node->dataBufSize),
                    TAV_RC_NO_MORE_DATA) &&
      frame.step(50, nextPart(*handle, *node)))
  {
    frame.dump(100, trace::record(node));
  }
  return frame.code();
}

uint32_t tavPlaceholderOp(uint64_t options, TAVHandle* handle, void* first, void* second)
{
  TraceFrame frame(probe::placeholderOp);
  frame.dump(0, options, handle, first, second);
  frame.keep(TAV_RC_NOT_SUPPORTED);
  return frame.code();
}
