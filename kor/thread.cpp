#include "tav/kor.h"

#if defined(_WIN32)
#define WIN32_LEAN_AND_MEAN
#include <windows.h>
#else
#include <unistd.h>
#endif

uint64_t korThreadID(void)
{
#if defined(_WIN32)
  return GetCurrentThreadId();
#else
  // Not cached: the child of a fork would go on with its parent's id.
  return static_cast<uint64_t>(gettid());
#endif
}
