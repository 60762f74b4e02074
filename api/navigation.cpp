/// Walking forward: first children and siblings.
#include "api/nodeStep.h"

using namespace tav;

namespace
{

/// The stream's first node. Whether the storage tells its size is not asked: the bound decides.
Level levelOfRoot(const TAVHandle& handle)
{
  uint64_t end = 0;
  static_cast<void>(handle.pSideStorage->getTotalSize(&end));
  return {0, end, (handle.options & TAV_OPT_ROOT32) == 0, true};
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

[[gnu::noinline]] uint32_t nextChildTraced(uint64_t options, TAVHandle* handle, TAVHeader* parent, TAVHeader* refChild,
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
  const bool sibling = parent != nullptr && refChild != nullptr;
  bool found = false;
  if (sibling && isSizeUnknown(*refChild))
  {
    found = frame.require(50, isGroup(*refChild), TAV_RC_NOT_SUPPORTED) &&
            frame.step(60, readAfterOpenGroup(*handle, *parent, *refChild, *out));
  }
  else
  {
    const Level level = parent != nullptr ? levelBelow(nodeOf(*parent)) : levelOfRoot(*handle);
    uint64_t start = 0;
    found = findPlace(frame, handle->alignMode == 1, level, !sibling, sibling ? nodeOf(*refChild) : Node{}, start) &&
            frame.step(130, tavReadNodeInt(0, handle, start, level.wide, out));
  }
  if (found)
  {
    frame.dump(100, trace::record(out));
  }
  return frame.code();
}

/// The usual step, over closed groups; else `kUnusual`, with nothing done. Made for each form of the children,
/// with its lengths as constants.
template<bool Wide>
uint32_t nextChildSilently(TAVHandle& handle, const TAVHeader& parent, const TAVHeader* reference, TAVHeaderData& out)
{
  const Node group = nodeOf(parent);
  uint64_t start = group.offset;
  uint64_t end = 0;
  if (group.sizeUnknown() || !addFits(start, group.length(), start) || !addFits(start, group.fields.size, end))
      [[unlikely]]
  {
    return kUnusual;
  }
  if (reference != nullptr)
  {
    const Node before = nodeOf<Wide>(*reference);
    uint64_t length = 0;
    if (before.sizeUnknown() || end <= before.offset || !lengthOf(handle.alignMode == 1, before, length) ||
        !addFits(before.offset, length, start)) [[unlikely]]
    {
      return kUnusual;
    }
    if (isEndElement(before.fields.elm)) [[unlikely]]
    {
      return TAV_RC_NO_MORE_CHILDREN;
    }
  }
  if (start >= end) [[unlikely]]
  {
    return start == end ? TAV_RC_NO_MORE_CHILDREN : kUnusual;
  }
  Node node{start, {}, Wide};
  return readSilently(handle, node, out) ? TAV_RC_OK : kUnusual;
}

/// Everything but the plain step.
[[gnu::noinline]] uint32_t nextChildOther(uint64_t options, TAVHandle* handle, TAVHeader* parent, TAVHeader* refChild,
                                          TAVHeaderData* out)
{
  // Without a parent the storage is asked for its size: a call that leaves the library.
  const bool silent =
      !tracing() && handle != nullptr && parent != nullptr && out != nullptr && options == 0 && isReadOnly(*handle);
  uint32_t rc = kUnusual;
  if (silent && hasChildren64(*parent))
  {
    rc = refChild == nullptr || is64(*refChild) ? nextChildSilently<true>(*handle, *parent, refChild, *out) : kUnusual;
  }
  else if (silent)
  {
    rc =
        refChild == nullptr || !is64(*refChild) ? nextChildSilently<false>(*handle, *parent, refChild, *out) : kUnusual;
  }
  return rc != kUnusual ? rc : nextChildTraced(options, handle, parent, refChild, out);
}

/// The plain step's end through a circular buffer: the child is known to start at `offset`.
[[gnu::noinline]] uint32_t nextChildInRing(TAVHandle* handle, TAVHeader* parent, TAVHeader* refChild,
                                           TAVHeaderData* out, uint64_t offset)
{
  Node node{offset, {}, true};
  DataPlace data{};
  if (handle->pCircularBuf == nullptr || !readCachedHeader(*handle, node, data)) [[unlikely]]
  {
    return nextChildOther(0, handle, parent, refChild, out);
  }
  const bool hasData = !node.group();
  handOut(node, data, hasData, false, *out);
  if (hasData)
  {
    setArea(*handle, {offset + kHeaderSize64, data.start, data.room});
  }
  return TAV_RC_OK;
}

/// Where the sibling after a plain node starts; false for what is not plain.
[[gnu::always_inline]] inline bool findPlainSibling(const TAVHeader& reference, uint64_t end, uint64_t& start)
{
  const uint64_t left = end - reference.nodeOffset;
  const uint64_t size = reference.hdr64.size;
  start = reference.nodeOffset + size + kHeaderSize64;
  // A size below what is left passes no sum.
  return is64(reference) && reference.nodeOffset < end && size < left && !isEndElement(reference.hdr64.elm) &&
         (reference.hdr64.info & (TAV_INFO_ALIGNED8 | TAV_INFO_EYE_SIZE)) == 0;
}

} // namespace

uint32_t tavGetNextChild(uint64_t options, TAVHandle* handle, TAVHeader* parent, TAVHeader* refChild,
                         TAVHeaderData* out)
{
  // Closed groups of 64-bit headers are what most walks are over. Every other way out ends in one call.
  if (tracing() || handle == nullptr || parent == nullptr || out == nullptr || options != 0 ||
      !isReadOnly(*handle) || !isPlain(*handle) || !hasChildren64(*parent)) [[unlikely]]
  {
    return nextChildOther(options, handle, parent, refChild, out);
  }
  Node node{0, {}, true};
  uint64_t end = 0;
  if (!addFits(parent->nodeOffset, kHeaderSize64, node.offset) || !addFits(node.offset, parent->hdr64.size, end) ||
      (refChild != nullptr && !findPlainSibling(*refChild, end, node.offset))) [[unlikely]]
  {
    return nextChildOther(options, handle, parent, refChild, out);
  }
  if (node.offset >= end) [[unlikely]]
  {
    return node.offset == end ? TAV_RC_NO_MORE_CHILDREN : nextChildOther(options, handle, parent, refChild, out);
  }
  if (!isDirect(*handle))
  {
    return nextChildInRing(handle, parent, refChild, out, node.offset);
  }
  const Block block{handle->pDirectData, handle->directDataSize, false, false};
  DataPlace data{};
  if (handle->pDirectData == nullptr || handle->curOffset != 0 || !readHeader(block, node, data)) [[unlikely]]
  {
    return nextChildOther(options, handle, parent, refChild, out);
  }
  if (node.group()) [[unlikely]]
  {
    handOut(node, data, false, false, *out);
    return TAV_RC_OK;
  }
  if (node.fields.size > data.room) [[unlikely]]
  {
    return nextChildOther(options, handle, parent, refChild, out);
  }
  handOut(node, data, true, false, *out);
  return TAV_RC_OK;
}
