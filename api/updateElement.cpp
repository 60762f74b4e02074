/// Overwriting a data element's payload in place.
#include "api/rawWrite.h"
#include "format/layout.h"
#include "tav/probes.h"
#include "trace/traceFrame.h"

using namespace tav;
using namespace tav::inside;

namespace
{

/// A header form that no node has is never the one that was read.
bool isSameNode(const TAVHeader& a, const TAVHeader& b)
{
  return a.hdrType == b.hdrType && sizeOf(a) == sizeOf(b) && typeOf(a) == typeOf(b) && elmOf(a) == elmOf(b);
}

uint32_t overwrite(TAVHandle& handle, uint64_t& position, const TAVHeaderData& node)
{
  const uint64_t size = sizeOf(node.header);
  const bool given = node.pDataBuf != nullptr || size == 0;
  return given ? writePayload(handle, position, typeOf(node.header), node.pDataBuf, size) : TAV_RC_BAD_PARAM;
}

} // namespace

uint32_t tavUpdateElement(uint64_t options, TAVHandle* handle, TAVHeaderData* headerData)
{
  TraceFrame frame(probe::updateElement);
  frame.dump(0, options, handle, "tav element data", trace::record(headerData));
  if (!frame.require(10, handle != nullptr, TAV_RC_BAD_PARAM) ||
      !frame.require(20, headerData != nullptr, TAV_RC_BAD_PARAM) ||
      !frame.require(30, !isReadOnly(*handle), TAV_RC_WRONG_MODE) ||
      !frame.require(40, options == 0, TAV_RC_BAD_OPTIONS) ||
      !frame.require(50, !isGroup(headerData->header), TAV_RC_BAD_PARAM))
  {
    return frame.code();
  }
  const TAVHeader& header = headerData->header;
  TAVHeaderData stored{};
  uint64_t position = header.nodeOffset + headerLength(header.hdrType);
  if (frame.step(60, tavReadNodeInt(0, handle, header.nodeOffset, is64(header), &stored)) &&
      frame.require(70, isSameNode(header, stored.header), TAV_RC_BAD_PARAM) &&
      frame.step(80, overwrite(*handle, position, *headerData)))
  {
    frame.dump(100, position);
  }
  return frame.code();
}
