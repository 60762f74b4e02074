#include "tav/kor.h"

#include <gtest/gtest.h>
#include <thread>
#include <unistd.h>

namespace
{
TEST(ThreadId, StaysTheSameInOneThread)
{
  EXPECT_EQ(korThreadID(), korThreadID());
}

TEST(ThreadId, DiffersBetweenThreadsThatLiveAtATime)
{
  uint64_t other = 0;
  std::thread thread([&other] { other = korThreadID(); });
  const uint64_t own = korThreadID();
  thread.join();
  EXPECT_NE(own, other);
}

TEST(ThreadId, IsTheNumberOfTheOperatingSystem)
{
  // The first thread of a process carries the process's number; tests run in it.
  EXPECT_EQ(korThreadID(), static_cast<uint64_t>(getpid()));
}
} // namespace
