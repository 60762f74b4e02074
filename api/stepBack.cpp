/// Walking backward.
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

/// The bytes where the pair of the node before would stand.
uint32_t fetchPair(TAVHandle& handle, uint64_t nodeOffset, EyeSizeBytes& bytes)
{
  uint64_t offset = 0;
  const bool inStream = nodeBefore(nodeOffset, kEyeSizeLength, offset);
  if (!isDirect(handle))
  {
    if (handle.pCircularBuf == nullptr)
    {
      return TAV_RC_NO_CIRCULAR_BUF;
    }
    return inStream ? fetchBytes(*handle.pCircularBuf, offset, bytes.data(), bytes.size()) : TAV_RC_NO_MEMORY;
  }
  uint64_t relative = 0;
  uint64_t relativeEnd = 0;
  if (handle.pDirectData == nullptr || !inStream || !isInDirectData(handle, offset, relative) ||
      !isInDirectData(handle, nodeOffset, relativeEnd))
  {
    return TAV_RC_NO_MEMORY;
  }
  std::copy_n(handle.pDirectData + relative, bytes.size(), bytes.begin());
  return TAV_RC_OK;
}

uint32_t readPairBefore(TAVHandle& handle, uint64_t nodeOffset, EyeSize& pair)
{
  EyeSizeBytes bytes{};
  const uint32_t rc = fetchPair(handle, nodeOffset, bytes);
  pair = decodeEyeSize(bytes, handle.swapBytes != 0);
  return rc;
}

/// The reference may be in the descriptor that the answer goes to; a failure leaves it there.
uint32_t readNodeBefore(TAVHandle& handle, const TAVHeader& reference, const EyeSize& pair, TAVHeaderData& out)
{
  uint64_t offset = 0;
  if (!nodeBefore(reference.nodeOffset - kEyeSizeLength, pair.distance, offset))
  {
    return TAV_RC_NO_MEMORY;
  }
  const TAVHeader before = reference;
  const uint32_t rc = tavReadNodeInt(0, &handle, offset, is64(reference), &out);
  if (rc != TAV_RC_OK && &reference == &out.header)
  {
    out.header = before;
  }
  return rc;
}

} // namespace

uint32_t tavGetPrevNode(uint64_t options, TAVHandle* handle, TAVHeaderData* ref, TAVHeaderData* out)
{
  TraceFrame frame(probe::getPrevNode);
  frame.dump(0, options, handle, trace::record(ref), out);
  EyeSize pair{};
  const bool ok = frame.require(10, handle != nullptr, TAV_RC_BAD_PARAM) &&
                  frame.require(20, ref != nullptr, TAV_RC_BAD_PARAM) &&
                  frame.require(30, out != nullptr, TAV_RC_BAD_PARAM) &&
                  frame.require(40, options == 0, TAV_RC_BAD_OPTIONS) &&
                  frame.step(50, readPairBefore(*handle, ref->header.nodeOffset, pair)) &&
                  frame.require(60, pair.eye == TAV_EYE_CATCHER, TAV_RC_NOT_FOUND) &&
                  frame.step(70, readNodeBefore(*handle, ref->header, pair, *out));
  if (ok)
  {
    frame.dump(100, trace::record(out));
  }
  return frame.code();
}
