/// Judging a node by its header, without moving the ring.
#pragma once

#include <cstdint>

#include "tav/tav.h"

namespace tav::inside
{

/// Copies bytes of the stream from where the ring caches them, else from the storage, past the ring. `kNotHere` where
/// the storage does not seek or does not have them: then the ring has to say what is there.
uint32_t peekBytes(TAVCircularBuf& ring, uint64_t offset, uint8_t* to, uint64_t length);

/// As tavReadNodeInt with a 64-bit header, with its codes and records, for who wants no data: through a ring neither
/// the data nor, where the storage seeks, the header is brought into it.
uint32_t peekNode(TAVHandle& handle, uint64_t offset, TAVHeaderData& node);

/// As tavReadNodeInt with a 64-bit header, for nodes of which many cannot be read: through a ring those are refused
/// without moving it.
uint32_t readIfWhole(TAVHandle& handle, uint64_t offset, TAVHeaderData& node);

} // namespace tav::inside
