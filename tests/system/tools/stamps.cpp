// tav_stamps: writes moments with the C++ layer, so that a test can see how the program shows them.
//
//   tav_stamps FILE MICROSECONDS...        since 1970
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <exception>

#include "tav/tav.hpp"

int main(int argc, char** argv)
{
  constexpr uint16_t timestamp = 1005;
  try
  {
    tav::Writer writer(argv[1]);
    {
      tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
      for (int i = 2; i < argc; ++i)
      {
        const std::chrono::microseconds time(std::strtoll(argv[i], nullptr, 10));
        root.add(timestamp, std::chrono::sys_time<std::chrono::microseconds>(time));
      }
    }
    writer.finish();
  }
  catch (const std::exception& error)
  {
    std::fprintf(stderr, "tav_stamps: %s\n", error.what());
    return 2;
  }
  return 0;
}
