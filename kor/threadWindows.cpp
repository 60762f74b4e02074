#include "kor/windows.h"
#include "tav/kor.h"

uint64_t korThreadID(void)
{
  return GetCurrentThreadId();
}
