/// Operations of the reader that are neither exported nor called by the library. They belong to its inner interface and
/// stay; their tests call them.
#pragma once

#include <cstdint>

#include "tav/tav.h"

/// Moves a descriptor on to the next part of a data element's data. The next part is sought at `dataBufOffset` bytes
/// from the node's start: header and present part are not added.
/// @retval TAV_RC_NO_MORE_DATA  all of it was handed out
uint32_t tavGetNextDataBuffer(uint64_t options, TAVHandle* handle, TAVHeaderData* node);

/// Does nothing. @retval TAV_RC_NOT_SUPPORTED  always
uint32_t tavPlaceholderOp(uint64_t options, TAVHandle* handle, void* first, void* second);
