#include "tav/kor.h"

#include <gtest/gtest.h>
#include <unistd.h>

namespace
{
TEST(ThreadId, IsTheNumberOfTheOperatingSystem)
{
  // The first thread of a process carries the process's number; tests run in it.
  EXPECT_EQ(korThreadID(), static_cast<uint64_t>(getpid()));
}
} // namespace
