/// The exported step that appends a node.
#include "api/addElement.h"

using namespace tav;
using namespace tav::inside;

[[gnu::noinline]] uint32_t tav::inside::addToRing(uint64_t options, TAVHandle* handle, TAVHeaderData* headerData)
{
  const uint32_t rc = addTo<core::RingBytes<core::HostForm>>(handle, headerData);
  return rc != core::kNotHere ? rc : addElsewhere(options, handle, headerData);
}

/// Most streams are written to a block of memory in host order with 64-bit headers, and most nodes are data elements.
/// Accesses to memory are what limits this: no field is loaded twice, no register saved.
uint32_t tavAddElement(uint64_t options, TAVHandle* handle, TAVHeaderData* headerData)
{
  if (!core::isFastCallAtOnce(options)) [[unlikely]]
  {
    return addElsewhere(options, handle, headerData);
  }
  const uint32_t rc = addTo<core::BlockBytes<core::HostForm>>(handle, headerData);
  return rc != core::kNotHere ? rc : addToRing(0, handle, headerData);
}
