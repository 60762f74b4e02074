/// Cached bytes for writing, across the borders of pages. Within a page: tav/core/cachedRun.hpp, which is installed.
#pragma once

#include <cstdint>

#include "tav/core/cachedRun.hpp"

namespace tav::inside
{
using core::cachedBytes;
using core::CachedRun;
using core::pageOfIndex;
using core::runAt;

/// Marks a page and those behind it, around the ring's end, up to another as pending.
void markPending(TAVCircularBuf& ring, uint64_t page, uint64_t last);

/// The place of `length` bytes, at least one, that are cached next to each other, for writing: marks their pages and
/// the one of the byte behind them, as a write and a mark through the ring's operations would. Null when they are not
/// so cached.
uint8_t* takeCachedRun(TAVCircularBuf& ring, uint64_t offset, uint64_t length);

} // namespace tav::inside
