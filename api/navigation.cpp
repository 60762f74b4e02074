/// Walking forward: first children and siblings.
#include "api/nodeStep.h"
#include "api/openGroup.h"
#include "api/ownedHandle.h"

using namespace tav;
using namespace tav::inside;

namespace
{

/// The stream's first node. Whether the storage tells its size is not asked: the bound decides.
Level levelOfRoot(const TAVHandle& handle)
{
  uint64_t end = 0;
  static_cast<void>(handle.pSideStorage->getTotalSize(&end));
  return {0, end, (handle.options & TAV_OPT_ROOT32) == 0, true};
}

[[gnu::noinline]] uint32_t nextChildTraced(uint64_t options, TAVHandle* handle, TAVHeader* parent, TAVHeader* refChild,
                                           TAVHeaderData* out)
{
  TraceFrame frame(probe::getNextChild);
  frame.dump(0, options, handle, "Parent and reference child headers", trace::record(parent), trace::record(refChild),
             out);
  if (!frame.require(10, handle != nullptr, TAV_RC_BAD_PARAM) || !frame.require(20, out != nullptr, TAV_RC_BAD_PARAM) ||
      !frame.require(30, options == 0, TAV_RC_BAD_OPTIONS) ||
      // NOLINTNEXTLINE(clang-analyzer-core.NonNullParamChecker): it does not follow the checks of the frame so deep
      !frame.require(40, isReadOnly(*handle), TAV_RC_WRONG_MODE))
  {
    return frame.code();
  }
  const bool sibling = parent != nullptr && refChild != nullptr;
  const bool inAnswer = parent == &out->header || refChild == &out->header;
  // NOLINTNEXTLINE(clang-analyzer-core.NonNullParamChecker): likewise
  const TAVHeader before = out->header;
  bool found = false;
  if (sibling && isSizeUnknown(*refChild))
  {
    found = frame.require(50, isGroup(*refChild), TAV_RC_NOT_SUPPORTED) &&
            // NOLINTNEXTLINE(clang-analyzer-core.NonNullParamChecker): likewise
            frame.step(60, readAfterOpenGroup(*handle, *parent, *refChild, *out));
  }
  else
  {
    if (parent == nullptr)
    {
      forgetPairs(*handle); // a walk begins anew, perhaps over other bytes
    }
    const Level level = parent != nullptr ? levelBelow(nodeOf(*parent)) : levelOfRoot(*handle);
    uint64_t start = 0;
    found = findPlace(frame, handle->alignMode == 1, level, !sibling, sibling ? nodeOf(*refChild) : Node{}, start) &&
            frame.step(130, tavReadNodeInt(0, handle, start, level.wide, out));
  }
  if (found)
  {
    frame.dump(100, trace::record(out));
  }
  else if (inAnswer)
  {
    out->header = before; // reading may have put parts of the child there
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

/// Everything but the plain steps.
[[gnu::noinline]] uint32_t nextChildNotPlain(uint64_t options, TAVHandle* handle, TAVHeader* parent,
                                             TAVHeader* refChild, TAVHeaderData* out)
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

/// A node with a 64-bit header in host order, as its two words, and its place in the block.
struct PlainNode
{
  uint64_t offset;
  uint64_t size;
  uint64_t rest; ///< the header's other fields
  uint8_t* data;
  uint64_t room; ///< bytes of the block from there on
};

[[gnu::always_inline]] inline void handOutPlain(const PlainNode& node, TAVHeaderData& out)
{
  std::memcpy(&out.header.hdr64, &node.size, sizeof node.size);
  std::memcpy(&out.header.hdr64.info, &node.rest, sizeof node.rest);
  out.header.hdrType = TAV_HDR_64;
  out.header.nodeOffset = node.offset;
  out.pDataBuf = node.data;
  out.dataBufSize = node.room;
  out.dataBufOffset = 0;
}

/// Where a node with a 64-bit header ends, neither padded nor with a pair; false where that passes 64 bits.
[[gnu::always_inline]] inline bool findEnd(const TAVHeader& node, uint64_t& end)
{
  return addFits(node.hdr64.size, kHeaderSize64, end) && addFits(end, node.nodeOffset, end);
}

/// Whether a sibling in host order may stand right behind a node's payload: no padding, no pair, not an end element.
[[gnu::always_inline]] inline bool endsPlainly(const TAVHeader& before)
{
  return is64(before) && (before.hdr64.info & (TAV_INFO_ALIGNED8 | TAV_INFO_EYE_SIZE)) == 0 &&
         before.hdr64.elm < TAV_ELM_CMN_END_HDR_MARKER;
}

/// The step to a plain sibling that a ring caches next to each other. Every other way out is nextChildNotPlain.
[[gnu::noinline, gnu::used]] uint32_t nextChildCached(uint64_t options, TAVHandle* handle, TAVHeader* parent,
                                                      TAVHeader* refChild, TAVHeaderData* out)
{
  uint64_t end = 0;
  uint64_t start = 0;
  if (handle == nullptr || parent == nullptr || refChild == nullptr || out == nullptr || !isPlainRing(*handle) ||
      !isReadOnly(*handle) || !hasChildren64(*parent) || !endsPlainly(*refChild) || !findEnd(*parent, end) ||
      !findEnd(*refChild, start) || start >= end) [[unlikely]]
  {
    return nextChildNotPlain(options, handle, parent, refChild, out);
  }
  const TAVCircularBuf& ring = *handle->pCircularBuf;
  auto [index, room] = runAt(ring, start);
  uint8_t* const header = ring.pRing + index;
  if (!takeRoom(room, kHeaderSize64) || typeAt(header) <= TAV_TYPE_HEADER64 || loadWord(header) - 1 >= room)
      [[unlikely]]
  {
    return nextChildNotPlain(options, handle, parent, refChild, out);
  }
  const PlainNode node{start, loadWord(header), loadWord(header + offsetof(TAVHeader64, info)), header + kHeaderSize64,
                       loadWord(header)};
  setArea(*handle, {start + kHeaderSize64, node.data, node.size});
  handOutPlain(node, *out);
  return okAnew();
}

/// Finds the place behind a node, or the first one below it. False if the block, which has to be the whole stream, has
/// no header there, or the node is padded or has a pair. Otherwise no sum passes 64 bits: what it tells lies in the
/// block.
template<bool First>
[[gnu::always_inline]] inline bool findPlainPlace(const TAVHandle& handle, const TAVHeader& before, PlainNode& node)
{
  const uint64_t size = First ? 0 : before.hdr64.size;
  node.offset = before.nodeOffset + size + kHeaderSize64;
  node.room = handle.directDataSize;
  // Two checks in one: branches limit this, too.
  const uint64_t flags = First ? 0 : before.hdr64.info & (TAV_INFO_ALIGNED8 | TAV_INFO_EYE_SIZE);
  return (flags | handle.curOffset) == 0 &&
         (First || (is64(before) && before.hdr64.elm < TAV_ELM_CMN_END_HDR_MARKER)) &&
         takeRoom(node.room, before.nodeOffset) && takeRoom(node.room, size) && takeRoom(node.room, 2 * kHeaderSize64);
}

/// The end of the plain step where the child seems to be a group: apart, or the compiler would join it with the end for
/// elements. `used` keeps its arguments where they are.
[[gnu::noinline, gnu::used]] uint32_t nextGroup(uint64_t options, TAVHandle* handle, TAVHeader* parent,
                                                TAVHeader* refChild, TAVHeaderData* out, uint64_t offset)
{
  const uint8_t* const header = handle->pDirectData + offset;
  if (!isGroupType(typeAt(header))) [[unlikely]]
  {
    return nextChildNotPlain(options, handle, parent, refChild, out); // of a type that is none
  }
  handOutPlain({offset, loadWord(header), loadWord(header + offsetof(TAVHeader64, info)), nullptr, 0}, *out);
  return TAV_RC_OK;
}

/// The step over closed groups of 64-bit headers in a block of memory, which most walks are over. Every other way out
/// ends in one call with the same arguments, so that the step saves and moves no register.
template<bool First>
[[gnu::always_inline]] inline uint32_t nextChildPlain(TAVHandle* handle, TAVHeader* parent, TAVHeader* refChild,
                                                      TAVHeaderData* out)
{
  PlainNode node{};
  uint64_t end = 0;
  if (handle == nullptr || !isPlainBlock(*handle) || !isReadOnly(*handle) || handle->pDirectData == nullptr ||
      parent == nullptr || !hasChildren64(*parent) || out == nullptr ||
      !findPlainPlace<First>(*handle, First ? *parent : *refChild, node) || !findEnd(*parent, end)) [[unlikely]]
  {
    return nextChildCached(0, handle, parent, refChild, out);
  }
  if (node.offset >= end) [[unlikely]]
  {
    return node.offset == end ? TAV_RC_NO_MORE_CHILDREN : nextChildNotPlain(0, handle, parent, refChild, out);
  }
  node.data = handle->pDirectData + node.offset + kHeaderSize64;
  node.size = loadWord(node.data - kHeaderSize64);
  node.rest = loadWord(node.data - kHeaderSize64 + offsetof(TAVHeader64, info));
  if (typeAt(node.data - kHeaderSize64) <= TAV_TYPE_HEADER64) [[unlikely]]
  {
    return nextGroup(0, handle, parent, refChild, out, node.offset);
  }
  if (node.size > node.room) [[unlikely]]
  {
    return nextChildNotPlain(0, handle, parent, refChild, out);
  }
  handOutPlain(node, *out);
  return okAnew();
}

/// `used` as for nextGroup.
[[gnu::noinline, gnu::used]] uint32_t nextChildFirst(uint64_t /*options*/, TAVHandle* handle, TAVHeader* parent,
                                                     TAVHeader* refChild, TAVHeaderData* out)
{
  return nextChildPlain<true>(handle, parent, refChild, out);
}

/// The same where tracing was on once, and every step with options or with records.
[[gnu::noinline]] uint32_t nextChildOnceTraced(uint64_t options, TAVHandle* handle, TAVHeader* parent,
                                               TAVHeader* refChild, TAVHeaderData* out)
{
  if (!isSilentCall(options))
  {
    return nextChildNotPlain(options, handle, parent, refChild, out);
  }
  return refChild != nullptr ? nextChildPlain<false>(handle, parent, refChild, out)
                             : nextChildFirst(0, handle, parent, refChild, out);
}

} // namespace

uint32_t tavGetNextChild(uint64_t options, TAVHandle* handle, TAVHeader* parent, TAVHeader* refChild,
                         TAVHeaderData* out)
{
  if (!isUsualCall(options)) [[unlikely]]
  {
    return nextChildOnceTraced(options, handle, parent, refChild, out);
  }
  return refChild != nullptr ? nextChildPlain<false>(handle, parent, refChild, out)
                             : nextChildFirst(0, handle, parent, refChild, out);
}
