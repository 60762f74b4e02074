#include "tav/kor.h"

#include <gtest/gtest.h>
#include <thread>

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
} // namespace
