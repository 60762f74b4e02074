/// What tavGetNextChild goes on with where its first fast way does not lead. In a file of its own, so that every
/// compiler leaves the arguments where they are and ends the step in a jump.
#pragma once

#include <cstdint>

#include "api/rawWrite.h"
#include "core/step.h"

namespace tav::inside
{

/// The fast way over the bytes of one kind, of a stream in host order whose children have 64-bit headers.
template<bool First, class Bytes>
[[gnu::always_inline]] inline uint32_t nextChildIn(TAVHandle* handle, const TAVHeader* parent,
                                                   const TAVHeader* refChild, TAVHeaderData* out)
{
  const bool fast = handle != nullptr && Bytes::canRead(*handle) && isReadOnly(*handle) && parent != nullptr &&
                    hasChildren64(*parent) && out != nullptr;
  return fast ? core::nextChild<true, First>(Bytes(*handle), *handle, *parent, refChild, *out) : core::kNotHere;
}

/// To the first child, while nothing is traced.
uint32_t nextChildFirst(uint64_t options, TAVHandle* handle, TAVHeader* parent, TAVHeader* refChild,
                        TAVHeaderData* out);

/// To a sibling through a ring, while nothing is traced.
uint32_t nextChildInRing(uint64_t options, TAVHandle* handle, TAVHeader* parent, TAVHeader* refChild,
                         TAVHeaderData* out);

/// Every other step: over other bytes, or with records.
uint32_t nextChildElsewhere(uint64_t options, TAVHandle* handle, TAVHeader* parent, TAVHeader* refChild,
                            TAVHeaderData* out);

} // namespace tav::inside
