#include <chrono>

#include "tav/kor.h"

int64_t korSteadyTime(void)
{
  using std::chrono::steady_clock;
  return std::chrono::duration_cast<std::chrono::nanoseconds>(steady_clock::now().time_since_epoch()).count();
}
