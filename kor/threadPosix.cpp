#include <unistd.h>

#include "tav/kor.h"

uint64_t korThreadID(void)
{
  // Not cached: the child of a fork would go on with its parent's id.
  return static_cast<uint64_t>(gettid());
}
