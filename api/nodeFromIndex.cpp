/// Finding a node from an arbitrary offset.
#include "api/rawWrite.h"
#include "format/layout.h"
#include "kor/traceFrame.h"
#include "tav/probes.h"

using namespace tav;
using namespace tav::inside;

namespace
{

constexpr uint64_t kHere64 = 0x1;
constexpr uint64_t kHere32 = 0x2;
constexpr uint64_t kAfter = 0x4;

bool areIndexOptions(uint64_t options)
{
  return options <= (kHere64 | kHere32 | kAfter) && (options & (kHere64 | kHere32)) != (kHere64 | kHere32);
}

/// The node that holds the pair, read as a 64-bit one: only its id and size matter.
uint32_t readTrailer(TAVHandle& handle, uint64_t eyeOffset, TAVHeaderData& trailer)
{
  uint64_t offset = 0;
  return nodeBefore(eyeOffset, kHeaderSize64, offset) ? tavReadNodeInt(0, &handle, offset, true, &trailer)
                                                      : TAV_RC_NO_MEMORY;
}

/// Whether an eye catcher that leads to a group is that group's own.
bool isPairOfGroup(const TraceFrame& frame, TAVHandle& handle, const TAVHeader& group, uint64_t eyeOffset,
                   uint64_t distance)
{
  TAVHeaderData trailer{};
  const bool read = readTrailer(handle, eyeOffset, trailer) == TAV_RC_OK;
  if (read && trailer.header.hdr64.size != kEyeSizeLength)
  {
    frame.dump(200, eyeOffset, distance);
    return false;
  }
  switch (trailer.header.hdr64.elm)
  {
  case TAV_ELM_CMN_EYE_SIZE:
    if (group.hdr64.size >= distance)
    {
      return true;
    }
    frame.dump(220, eyeOffset, distance);
    return false;
  case TAV_ELM_CMN_END_HDR_EYE_SIZE:
    if (group.hdr64.size == distance || isSizeUnknown(group))
    {
      return true;
    }
    frame.dump(230, eyeOffset, distance);
    return false;
  default:
    frame.dump(240, eyeOffset, distance);
    return true;
  }
}

/// The node that ends at an eye catcher. A data element is taken as it is, whether or not its size fits the pair.
uint32_t readNodeOfPair(const TraceFrame& frame, TAVHandle& handle, uint64_t eyeOffset, uint64_t distance,
                        TAVHeaderData& out, bool& accepted)
{
  uint64_t offset = 0;
  if (!nodeBefore(eyeOffset, distance, offset) || tavReadNodeInt(0, &handle, offset, true, &out) != TAV_RC_OK)
  {
    return TAV_RC_NOT_FOUND;
  }
  accepted = !isGroup(out.header) || isPairOfGroup(frame, handle, out.header, eyeOffset, distance);
  return TAV_RC_OK;
}

uint32_t scanForNode(const TraceFrame& frame, TAVHandle& handle, bool after, uint64_t position, uint64_t end,
                     TAVHeaderData& out)
{
  while (position < end)
  {
    uint64_t eyeOffset = 0;
    uint64_t distance = 0;
    bool swapped = false;
    uint32_t rc = tavFindEyeSizeComboInt(&handle, position, end - position, true, &eyeOffset, &distance, &swapped);
    if (rc != TAV_RC_OK)
    {
      frame.report(70, rc);
      return TAV_RC_NOT_FOUND;
    }
    position = eyeOffset + kEyeLength;
    bool accepted = false;
    if (after)
    {
      accepted = tavReadNodeInt(0, &handle, eyeOffset + kEyeSizeLength, true, &out) == TAV_RC_OK;
    }
    else
    {
      rc = readNodeOfPair(frame, handle, eyeOffset, distance, out, accepted);
    }
    if (rc != TAV_RC_OK || accepted)
    {
      return rc;
    }
  }
  return TAV_RC_NOT_FOUND;
}

} // namespace

uint32_t tavFindNodeFromIndex(uint64_t options, TAVHandle* handle, uint64_t index, uint64_t length, TAVHeaderData* out)
{
  TraceFrame frame(probe::findNodeFromIndex);
  frame.dump(0, options, handle, index, length, out);
  if (!frame.require(10, handle != nullptr, TAV_RC_BAD_PARAM) ||
      !frame.require(20, out != nullptr, TAV_RC_BAD_PARAM) ||
      !frame.require(30, areIndexOptions(options), TAV_RC_BAD_OPTIONS) ||
      !frame.require(40, isReadOnly(*handle), TAV_RC_WRONG_MODE))
  {
    return frame.code();
  }
  const uint64_t end = length != 0 ? addSaturated(index, length) : ~uint64_t{0};
  const bool found = (options & (kHere64 | kHere32)) != 0
                         ? frame.step(50, tavReadNodeInt(0, handle, index, (options & kHere64) != 0, out))
                         : frame.step(60, scanForNode(frame, *handle, (options & kAfter) != 0, index, end, *out));
  if (found)
  {
    frame.dump(100, trace::record(out));
  }
  return frame.code();
}
