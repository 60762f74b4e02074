/// Walking forward: first children and siblings.
#include "api/ownedHandle.h"
#include "api/stepPastOpenGroup.h"
#include "api/stepToChild.h"
#include "tav/probes.h"
#include "trace/traceFrame.h"

using namespace tav;
using namespace tav::inside;

namespace
{

/// The stream's first node. Whether the storage gives its size is not asked: the bound decides.
core::Level levelOfRoot(const TAVHandle& handle)
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
    const core::Level level = parent != nullptr ? core::levelBelow(core::nodeOf(*parent)) : levelOfRoot(*handle);
    uint64_t start = 0;
    const core::Node reference = sibling ? core::nodeOf(*refChild) : core::Node{};
    found = core::findPlace(frame, handle->alignMode == 1, level, !sibling, reference, start) &&
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

/// The fast way over bytes of any kind.
template<bool Wide, class Bytes>
uint32_t nextChildFast(TAVHandle& handle, const TAVHeader& parent, const TAVHeader* refChild, TAVHeaderData& out)
{
  const Bytes bytes(handle);
  return refChild != nullptr ? core::nextChild<Wide, false>(bytes, handle, parent, refChild, out)
                             : core::nextChild<Wide, true>(bytes, handle, parent, nullptr, out);
}

template<class Bytes>
uint32_t nextChildFast(TAVHandle& handle, const TAVHeader& parent, const TAVHeader* refChild, TAVHeaderData& out)
{
  return hasChildren64(parent) ? nextChildFast<true, Bytes>(handle, parent, refChild, out)
                               : nextChildFast<false, Bytes>(handle, parent, refChild, out);
}

} // namespace

uint32_t tav::inside::nextChildElsewhere(uint64_t options, TAVHandle* handle, TAVHeader* parent, TAVHeader* refChild,
                                         TAVHeaderData* out)
{
  using Block = core::BlockBytes<core::AnyForm>;
  using Ring = core::RingBytes<core::AnyForm>;
  uint32_t rc = core::kNotHere;
  // Without a parent the storage is asked for its size: a call that leaves the library.
  if (core::isFastCall(options) && handle != nullptr && parent != nullptr && out != nullptr && isReadOnly(*handle))
  {
    rc = Block::canRead(*handle)  ? nextChildFast<Block>(*handle, *parent, refChild, *out)
         : Ring::canRead(*handle) ? nextChildFast<Ring>(*handle, *parent, refChild, *out)
                                  : core::kNotHere;
  }
  return rc != core::kNotHere ? rc : nextChildTraced(options, handle, parent, refChild, out);
}
