#include "tav/kor.h"

#include <atomic>
#include <gtest/gtest.h>
#include <thread>
#include <vector>

namespace
{
TEST(OneTimeStart, Succeeds)
{
  EXPECT_EQ(korOneTimeOnly(), TAV_RC_OK);
}

TEST(OneTimeStart, IsHarmlessAfterTheFirstCall)
{
  void* block = nullptr;
  ASSERT_EQ(korOneTimeOnly(), TAV_RC_OK);
  ASSERT_EQ(korMemAlloc(&block, 0, 8, KOR_MEM_RESERVED, nullptr, 0), TAV_RC_OK);
  *static_cast<uint64_t*>(block) = 7;
  EXPECT_EQ(korOneTimeOnly(), TAV_RC_OK);
  EXPECT_EQ(*static_cast<uint64_t*>(block), 7u);
  EXPECT_EQ(korMemFree(&block, 0, 0, nullptr, 0), TAV_RC_OK);
}

TEST(OneTimeStart, LeavesARunningTraceAlone)
{
  int records = 0;
  const auto count = [](void* context, const KORTraceRecord*) { ++*static_cast<int*>(context); };
  ASSERT_EQ(korTraceStart(count, &records), TAV_RC_OK);
  EXPECT_EQ(korOneTimeOnly(), TAV_RC_OK);
  _wtraceEntry(1, 2, 0, 0);
  EXPECT_EQ(korTraceStop(), TAV_RC_OK);
  EXPECT_EQ(records, 1);
}

TEST(OneTimeStart, SucceedsInManyThreadsAtATime)
{
  std::atomic<int> failures{0};
  std::vector<std::thread> threads;
  threads.reserve(8);
  for (int t = 0; t < 8; ++t)
  {
    threads.emplace_back([&failures] {
      for (int i = 0; i < 1000; ++i)
      {
        if (korOneTimeOnly() != TAV_RC_OK)
        {
          ++failures;
        }
      }
    });
  }
  for (std::thread& thread : threads) thread.join();
  EXPECT_EQ(failures.load(), 0);
}
} // namespace
