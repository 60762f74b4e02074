#include <climits>

#include "tav/kor.h"

// What the layer and its users take for granted on every platform.
static_assert(CHAR_BIT == 8, "a byte has 8 bits");
static_assert(sizeof(void*) <= sizeof(uint64_t), "sizes and addresses fit in 64 bits");

/// All state of the layer is constant-initialised, so that no call needs to come first: nothing is left to do here,
/// and nothing can go wrong when several threads do it at a time.
uint32_t korOneTimeOnly(void)
{
  return TAV_RC_OK;
}
