// Loaded into the program before the system's library: a time of day that somebody sets at every look, by the seconds
// that TAV_CLOCK_JUMP says, forth, back behind where it was, and right again. Other clocks are as they are.
#include <cstdlib>
#include <ctime>
#include <sys/syscall.h>
#include <unistd.h>

extern "C" __attribute__((visibility("default"))) int clock_gettime(clockid_t clock, timespec* time) noexcept
{
  const long result = syscall(SYS_clock_gettime, clock, time);
  const char* const jump = std::getenv("TAV_CLOCK_JUMP");
  if (result == 0 && clock == CLOCK_REALTIME && jump != nullptr)
  {
    static long looks = 0;
    constexpr long ways[] = {1, -1, 0};
    time->tv_sec += ways[looks++ % 3] * std::strtol(jump, nullptr, 10);
  }
  return static_cast<int>(result);
}
