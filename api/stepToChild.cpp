/// The exported step to the next child.
#include "api/stepToChild.h"

using namespace tav;
using namespace tav::inside;

[[gnu::noinline]] uint32_t tav::inside::nextChildFirst(uint64_t options, TAVHandle* handle, TAVHeader* parent,
                                                       TAVHeader* refChild, TAVHeaderData* out)
{
  const uint32_t rc = nextChildIn<true, core::BlockBytes<core::HostForm>>(handle, parent, refChild, out);
  return rc != core::kNotHere ? rc : nextChildElsewhere(options, handle, parent, refChild, out);
}

[[gnu::noinline]] uint32_t tav::inside::nextChildInRing(uint64_t options, TAVHandle* handle, TAVHeader* parent,
                                                        TAVHeader* refChild, TAVHeaderData* out)
{
  const uint32_t rc = nextChildIn<false, core::RingBytes<core::HostForm>>(handle, parent, refChild, out);
  return rc != core::kNotHere ? rc : nextChildElsewhere(options, handle, parent, refChild, out);
}

/// Most walks are over a block of memory in host order with 64-bit headers. All other ways out end in one call with the
/// same arguments, so that the step saves and moves no register.
uint32_t tavGetNextChild(uint64_t options, TAVHandle* handle, TAVHeader* parent, TAVHeader* refChild,
                         TAVHeaderData* out)
{
  if (!core::isFastCallAtOnce(options)) [[unlikely]]
  {
    return nextChildElsewhere(options, handle, parent, refChild, out);
  }
  if (refChild == nullptr) [[unlikely]]
  {
    return nextChildFirst(0, handle, parent, refChild, out);
  }
  const uint32_t rc = nextChildIn<false, core::BlockBytes<core::HostForm>>(handle, parent, refChild, out);
  return rc != core::kNotHere ? rc : nextChildInRing(0, handle, parent, refChild, out);
}
