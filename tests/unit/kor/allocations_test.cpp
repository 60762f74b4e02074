#include "support/failingNew.h"

#include <gtest/gtest.h>
#include <new>

namespace
{
TEST(Allocations, AreCounted)
{
  const int64_t before = allocations::live();
  void* const block = ::operator new(10);
  EXPECT_EQ(allocations::live(), before + 1);
  ::operator delete(block);
  EXPECT_EQ(allocations::live(), before);
}

TEST(Allocations, FailWhenTold)
{
  void* block = nullptr;
  {
    const allocations::AllFail fail;
    block = ::operator new(10, std::nothrow);
  }
  EXPECT_EQ(block, nullptr);
  ::operator delete(block, std::nothrow);
}

TEST(Allocations, FailOnceAtTheChosenOne)
{
  const allocations::FailNth fail(2);
  void* const first = ::operator new(10, std::nothrow);
  void* const second = ::operator new(10, std::nothrow);
  void* const third = ::operator new(10, std::nothrow);
  EXPECT_NE(first, nullptr);
  EXPECT_EQ(second, nullptr);
  EXPECT_NE(third, nullptr);
  EXPECT_TRUE(fail.happened());
  ::operator delete(first, std::nothrow);
  ::operator delete(third, std::nothrow);
}
} // namespace
