/// What tavAddElement goes on with where its first fast way does not lead. In a file of its own, so that every compiler
/// leaves the arguments where they are and ends the step in a jump.
#pragma once

#include <cstdint>

#include "core/append.h"

namespace tav::inside
{

/// The fast way into the bytes of one kind, of a stream in host order, for a data element with a 64-bit header.
template<class Bytes>
[[gnu::always_inline]] inline uint32_t addTo(TAVHandle* handle, TAVHeaderData* headerData)
{
  const bool fast = handle != nullptr && headerData != nullptr && Bytes::canWrite(*handle) && is64(headerData->header);
  return fast ? core::append<true>(Bytes(*handle), *handle, *headerData) : core::kNotHere;
}

/// Into a ring, while nothing is traced.
uint32_t addToRing(uint64_t options, TAVHandle* handle, TAVHeaderData* headerData);

/// Every other append: into other bytes, of other nodes, or with records.
uint32_t addElsewhere(uint64_t options, TAVHandle* handle, TAVHeaderData* headerData);

} // namespace tav::inside
