/// A piece of the cached range that is released at once.
#pragma once

#include <cstdint>

#include "tav/tav.h"

/// Bytes of one ring page at an end of the cached range.
struct TAVCircularBuf::Piece
{
  uint64_t index;  ///< ring index of the first byte
  uint64_t offset; ///< stream offset of the first byte
  uint64_t length;
  bool last; ///< nothing is cached besides
};
