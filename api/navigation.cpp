/// Walking forward: first children and siblings.
#include "api/rawWrite.h"
#include "format/layout.h"
#include "kor/traceFrame.h"
#include "tav/probes.h"

using namespace tav;

namespace
{

/// Where a child would start, and where its parent's content ends.
struct Place
{
  uint64_t start = 0;
  uint64_t end = 0;
  bool wide = true; ///< the child has a 64-bit header
  bool fits = true; ///< neither offset passes 64 bits
};

/// The stream's first node. Whether the storage tells its size is not asked: the bound decides.
Place placeOfRoot(const TAVHandle& handle)
{
  Place place;
  place.wide = (handle.options & TAV_OPT_ROOT32) == 0;
  static_cast<void>(handle.pSideStorage->getTotalSize(&place.end));
  return place;
}

/// A group's content. An open group with a 32-bit header ends at 4 GiB, one with a 64-bit header nowhere.
Place placeOfFirstChild(const TAVHeader& parent)
{
  Place place;
  place.wide = hasChildren64(parent);
  place.start = parent.nodeOffset;
  place.fits = addChecked(place.start, headerLength(parent.hdrType));
  if (isSizeUnknown(parent))
  {
    place.end = sizeOf(parent);
    return place;
  }
  place.end = place.start;
  place.fits = addChecked(place.end, sizeOf(parent)) && place.fits;
  return place;
}

/// The bytes from a node's start to its sibling's.
bool lengthOf(const TAVHandle& handle, const TAVHeader& node, uint64_t& length)
{
  const bool element = !isGroup(node);
  length = sizeOf(node);
  bool fits = true;
  if (element && (handle.alignMode == 1 || (infoOf(node) & TAV_INFO_ALIGNED8) != 0))
  {
    fits = roundUp8Checked(length);
  }
  fits = addChecked(length, headerLength(node.hdrType)) && fits;
  if (element && hasEyeSize(node))
  {
    fits = addChecked(length, kEyeSizeLength) && fits;
  }
  return fits;
}

bool findSibling(TraceFrame& frame, const TAVHandle& handle, const TAVHeader& reference, Place& place)
{
  if (!frame.require(70, is64(reference) == place.wide, TAV_RC_BAD_PARAM) ||
      !frame.require(80, place.end > reference.nodeOffset, TAV_RC_BAD_PARAM) ||
      !frame.require(90, !isEndElement(elmOf(reference)), TAV_RC_NO_MORE_CHILDREN))
  {
    return false;
  }
  uint64_t length = 0;
  place.fits = lengthOf(handle, reference, length) && place.fits;
  place.start = reference.nodeOffset;
  place.fits = addChecked(place.start, length) && place.fits;
  return true;
}

bool isSameOpenGroup(const TAVHeader& node, const TAVHeader& reference)
{
  return isGroup(node) && sizeOf(node) == sizeOf(reference) && node.nodeOffset == reference.nodeOffset;
}

/// The sibling after a group that was never closed: the node behind the eye catcher that leads back to the group.
uint32_t readAfterOpenGroup(TAVHandle& handle, const TAVHeader& parent, const TAVHeader& reference, TAVHeaderData& out)
{
  for (uint64_t position = reference.nodeOffset;;)
  {
    uint64_t eyeOffset = 0;
    uint64_t distance = 0;
    bool swapped = false;
    // The limit is the parent's size less an offset, not a distance: modulo 2^64, mostly no limit at all.
    uint32_t rc = tavFindEyeSizeComboInt(&handle, position, sizeOf(parent) - position, true, &eyeOffset, &distance,
                                         &swapped);
    uint64_t offset = 0;
    if (rc == TAV_RC_OK && !nodeBefore(eyeOffset, distance, offset))
    {
      rc = TAV_RC_NO_MEMORY;
    }
    TAVHeaderData node{};
    if (rc == TAV_RC_OK)
    {
      rc = tavReadNodeInt(0, &handle, offset, true, &node);
    }
    if (rc != TAV_RC_OK)
    {
      return rc;
    }
    if (isSameOpenGroup(node.header, reference))
    {
      constexpr uint64_t afterPair = 0x4;
      return tavFindNodeFromIndex(afterPair, &handle, eyeOffset, 0, &out);
    }
    position = eyeOffset + kEyeSizeLength;
  }
}

bool findPlace(TraceFrame& frame, const TAVHandle& handle, const TAVHeader* parent, const TAVHeader* reference,
               Place& place)
{
  place = parent != nullptr ? placeOfFirstChild(*parent) : placeOfRoot(handle);
  if (parent != nullptr && reference != nullptr && !findSibling(frame, handle, *reference, place))
  {
    return false;
  }
  return frame.require(110, place.fits && place.start <= place.end, TAV_RC_OUTSIDE_PARENT) &&
         frame.require(120, place.start != place.end, TAV_RC_NO_MORE_CHILDREN);
}

} // namespace

uint32_t tavGetNextChild(uint64_t options, TAVHandle* handle, TAVHeader* parent, TAVHeader* refChild,
                         TAVHeaderData* out)
{
  TraceFrame frame(probe::getNextChild);
  frame.dump(0, options, handle, "Parent and reference child headers", trace::record(parent), trace::record(refChild),
             out);
  if (!frame.require(10, handle != nullptr, TAV_RC_BAD_PARAM) || !frame.require(20, out != nullptr, TAV_RC_BAD_PARAM) ||
      !frame.require(30, options == 0, TAV_RC_BAD_OPTIONS) ||
      !frame.require(40, isReadOnly(*handle), TAV_RC_WRONG_MODE))
  {
    return frame.code();
  }
  Place place;
  const bool afterOpen = parent != nullptr && refChild != nullptr && isSizeUnknown(*refChild);
  const bool found = afterOpen ? frame.require(50, isGroup(*refChild), TAV_RC_NOT_SUPPORTED) &&
                                     frame.step(60, readAfterOpenGroup(*handle, *parent, *refChild, *out))
                               : findPlace(frame, *handle, parent, refChild, place) &&
                                     frame.step(130, tavReadNodeInt(0, handle, place.start, place.wide, out));
  if (found)
  {
    frame.dump(100, trace::record(out));
  }
  return frame.code();
}
