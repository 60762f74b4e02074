/// Appending runs of nodes that are encoded already.
#include "api/rawWrite.h"
#include "format/layout.h"
#include "tav/probes.h"
#include "trace/traceFrame.h"

using namespace tav;
using namespace tav::inside;

namespace
{

/// Whether the children of a group have headers of this kind. Below a 32-bit header there is no 64-bit one.
bool takesKind(const TAVHeader& group, uint32_t hdrKind)
{
  return typeOf(group) == hdrKind && (hdrKind == TAV_HDR_32 || is64(group));
}

} // namespace

uint32_t tavAddStream(uint64_t options, TAVHandle* handle, uint32_t hdrKind, uint8_t* bytes, uint64_t length)
{
  TraceFrame frame(probe::addStream);
  frame.dump(0, options, handle, hdrKind, bytes, length);
  if (!frame.require(10, handle != nullptr, TAV_RC_BAD_PARAM) ||
      !frame.require(20, bytes != nullptr, TAV_RC_BAD_PARAM) ||
      !frame.require(30, !isReadOnly(*handle), TAV_RC_WRONG_MODE) ||
      !frame.require(40, options == 0, TAV_RC_BAD_OPTIONS) ||
      !frame.require(50, hdrKind == TAV_HDR_32 || hdrKind == TAV_HDR_64, TAV_RC_BAD_PARAM))
  {
    return frame.code();
  }
  const TAVHeader* const group = openGroup(*handle);
  uint64_t position = handle->streamBytes;
  if (frame.require(60, group != nullptr && takesKind(*group, hdrKind), TAV_RC_BAD_CHILD_HDR) &&
      frame.step(70, rawWrite(*handle, position, bytes, length)))
  {
    handle->streamBytes = position;
    frame.dump(100, position);
  }
  return frame.code();
}
