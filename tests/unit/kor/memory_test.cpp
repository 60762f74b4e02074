#include "tav/kor.h"

#include "support/failingNew.h"

#include <algorithm>
#include <array>
#include <atomic>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <gtest/gtest.h>
#include <thread>
#include <vector>

namespace
{
constexpr uint64_t kEntry = 32; ///< bytes of a header stack's entry

uint32_t allocate(void** pp, uint64_t size, uint32_t mode)
{
  return _korMemAlloc(pp, 0, size, mode, "memory_test", __LINE__);
}

uint32_t release(void** pp)
{
  return _korMemFree(pp, 0, 0, "memory_test", __LINE__);
}

void* reserved(void* owner = nullptr)
{
  void* block = owner;
  EXPECT_EQ(allocate(&block, 200 * kEntry, KOR_MEM_RESERVED), TAV_RC_OK);
  EXPECT_NE(block, nullptr);
  return block;
}

/// Writes every byte of a block and reports whether all of them hold.
bool isUsable(void* block, uint64_t size)
{
  auto* const bytes = static_cast<uint8_t*>(block);
  std::fill(bytes, bytes + size, uint8_t{0xA5});
  return std::all_of(bytes, bytes + size, [](uint8_t byte) { return byte == 0xA5; });
}

class PlainBlock : public testing::TestWithParam<uint64_t>
{
};

TEST_P(PlainBlock, IsUsableOverItsWholeSize)
{
  void* block = nullptr;
  ASSERT_EQ(allocate(&block, GetParam(), KOR_MEM_PLAIN), TAV_RC_OK);
  ASSERT_NE(block, nullptr);
  EXPECT_TRUE(isUsable(block, GetParam()));
  EXPECT_EQ(release(&block), TAV_RC_OK);
}

INSTANTIATE_TEST_SUITE_P(Sizes, PlainBlock, testing::Values(0, 1, 32, 4096, 128001, 3 * 1024 * 1024));

class MemoryMode : public testing::TestWithParam<uint32_t>
{
};

TEST_P(MemoryMode, BlocksAreAlignedForAnyObject)
{
  void* block = nullptr;
  ASSERT_EQ(allocate(&block, 1, GetParam()), TAV_RC_OK);
  EXPECT_EQ(reinterpret_cast<uintptr_t>(block) % alignof(std::max_align_t), 0u);
  release(&block);
}

TEST_P(MemoryMode, FreeingSetsThePointerToNull)
{
  void* block = nullptr;
  ASSERT_EQ(allocate(&block, 1, GetParam()), TAV_RC_OK);
  EXPECT_EQ(release(&block), TAV_RC_OK);
  EXPECT_EQ(block, nullptr);
}

TEST_P(MemoryMode, FreeingGivesTheMemoryBack)
{
  const int64_t before = allocations::live();
  void* block = nullptr;
  ASSERT_EQ(allocate(&block, 1, GetParam()), TAV_RC_OK);
  EXPECT_GT(allocations::live(), before);
  release(&block);
  EXPECT_EQ(allocations::live(), before);
}

TEST_P(MemoryMode, AnExhaustedHeapIsReportedAndLeavesNull)
{
  std::array<uint8_t, 16> other{};
  void* block = other.data();
  const allocations::AllFail fail;
  EXPECT_EQ(allocate(&block, 64, GetParam()), TAV_RC_NO_MEMORY);
  EXPECT_EQ(block, nullptr);
}

TEST_P(MemoryMode, MoreThanCanExistIsRefused)
{
  void* block = nullptr;
  EXPECT_EQ(allocate(&block, UINT64_MAX, GetParam()), TAV_RC_NO_MEMORY);
  EXPECT_EQ(block, nullptr);
}

TEST_P(MemoryMode, FlagsAreRefused)
{
  std::array<uint8_t, 16> other{};
  void* block = other.data();
  EXPECT_EQ(_korMemAlloc(&block, 1, 64, GetParam(), nullptr, 0), TAV_RC_BAD_PARAM);
  EXPECT_EQ(block, nullptr);
}

TEST_P(MemoryMode, ANullPlaceForTheBlockIsRefused)
{
  EXPECT_EQ(allocate(nullptr, 64, GetParam()), TAV_RC_BAD_PARAM);
}

TEST_P(MemoryMode, TheSourceOfARequestMayBeUnknown)
{
  void* block = nullptr;
  EXPECT_EQ(_korMemAlloc(&block, 0, 64, GetParam(), nullptr, 0), TAV_RC_OK);
  EXPECT_EQ(_korMemFree(&block, 0, 0, nullptr, 0), TAV_RC_OK);
}

TEST_P(MemoryMode, WhatStandsInThePointerOnEntryIsNotFollowed)
{
  std::array<uint64_t, 8> local{};
  const std::array<uintptr_t, 4> garbage = {1, UINTPTR_MAX, static_cast<uintptr_t>(0xDEADBEEFDEADBEEFu),
                                            reinterpret_cast<uintptr_t>(&local[4])};
  for (const uintptr_t value : garbage)
  {
    void* block = reinterpret_cast<void*>(value);
    EXPECT_EQ(allocate(&block, 64, GetParam()), TAV_RC_OK);
    EXPECT_TRUE(isUsable(block, 64));
    release(&block);
  }
}

INSTANTIATE_TEST_SUITE_P(Modes, MemoryMode, testing::Values(KOR_MEM_PLAIN, KOR_MEM_RESERVED));

TEST(Memory, AnUnknownModeIsRefused)
{
  void* block = nullptr;
  EXPECT_EQ(allocate(&block, 64, 2), TAV_RC_BAD_PARAM);
  EXPECT_EQ(block, nullptr);
}

TEST(Memory, FreeingNullIsAccepted)
{
  void* block = nullptr;
  EXPECT_EQ(release(&block), TAV_RC_OK);
}

TEST(Memory, FreeingThroughANullPlaceIsRefused)
{
  EXPECT_EQ(release(nullptr), TAV_RC_BAD_PARAM);
}

TEST(Memory, ThePlainNamesAreTheSameOperations)
{
  void* block = nullptr;
  ASSERT_EQ(korMemAlloc(&block, 0, 64, KOR_MEM_PLAIN, nullptr, 0), TAV_RC_OK);
  EXPECT_TRUE(isUsable(block, 64));
  EXPECT_EQ(korMemFree(&block, 0, 0, nullptr, 0), TAV_RC_OK);
  EXPECT_EQ(block, nullptr);
}

class ReservedBlock : public testing::TestWithParam<uint64_t>
{
};

TEST_P(ReservedBlock, HasRoomForFourThousandEntriesWhateverWasAsked)
{
  void* block = nullptr;
  ASSERT_EQ(allocate(&block, GetParam(), KOR_MEM_RESERVED), TAV_RC_OK);
  EXPECT_TRUE(isUsable(block, 4000 * kEntry));
  EXPECT_EQ(release(&block), TAV_RC_OK);
}

INSTANTIATE_TEST_SUITE_P(Sizes, ReservedBlock, testing::Values(0, 1, 1000 * kEntry, 127999, KOR_MEM_RESERVE));

TEST(Memory, AReservedBlockBeyondTheReserveIsRefused)
{
  void* block = nullptr;
  EXPECT_EQ(allocate(&block, KOR_MEM_RESERVE + 1, KOR_MEM_RESERVED), TAV_RC_NO_MEMORY);
  EXPECT_EQ(block, nullptr);
}

TEST(Memory, AReservedBlockIsNotTouchedBeforeItIsUsed)
{
  const allocations::Painted painted;
  void* block = reserved();
  const auto* const bytes = static_cast<const uint8_t*>(block);
  EXPECT_TRUE(std::all_of(bytes, bytes + KOR_MEM_RESERVE, [](uint8_t byte) { return byte == allocations::kPaint; }));
  release(&block);
}

TEST(Companions, AreReleasedWithTheirOwner)
{
  const int64_t before = allocations::live();
  void* owner = reserved();
  for (int i = 0; i < 15; ++i) reserved(owner);
  EXPECT_EQ(allocations::live(), before + 16);
  release(&owner);
  EXPECT_EQ(allocations::live(), before);
}

TEST(Companions, AreBlocksOfTheirOwnWithFullRoom)
{
  void* owner = reserved();
  void* const companion = reserved(owner);
  std::memset(owner, 0x11, KOR_MEM_RESERVE);
  std::memset(companion, 0x22, KOR_MEM_RESERVE);
  const auto* const bytes = static_cast<const uint8_t*>(owner);
  EXPECT_TRUE(std::all_of(bytes, bytes + KOR_MEM_RESERVE, [](uint8_t byte) { return byte == 0x11; }));
  release(&owner);
}

/// Which of an owner's three companions is freed on its own, first to last.
class CompanionOfThree : public testing::TestWithParam<std::size_t>
{
};

TEST_P(CompanionOfThree, MayBeFreedAloneBeforeItsOwner)
{
  const int64_t before = allocations::live();
  void* owner = reserved();
  std::array<void*, 3> companions = {reserved(owner), reserved(owner), reserved(owner)};
  EXPECT_EQ(release(&companions[GetParam()]), TAV_RC_OK);
  EXPECT_EQ(allocations::live(), before + 3);
  release(&owner);
  EXPECT_EQ(allocations::live(), before);
}

INSTANTIATE_TEST_SUITE_P(Places, CompanionOfThree, testing::Values(0, 1, 2));

TEST(Companions, MayAllBeFreedAloneInAnyOrder)
{
  const int64_t before = allocations::live();
  void* owner = reserved();
  std::array<void*, 3> companions = {reserved(owner), reserved(owner), reserved(owner)};
  for (const std::size_t i : {std::size_t{1}, std::size_t{0}, std::size_t{2}}) release(&companions[i]);
  EXPECT_EQ(allocations::live(), before + 1);
  release(&owner);
  EXPECT_EQ(allocations::live(), before);
}

TEST(Companions, OfCompanionsGoWithThemToo)
{
  const int64_t before = allocations::live();
  void* owner = reserved();
  void* last = owner;
  for (int i = 0; i < 1000; ++i) last = reserved(last);
  release(&owner);
  EXPECT_EQ(allocations::live(), before);
}

TEST(Companions, FreeingACompanionTakesOnlyItsOwn)
{
  const int64_t before = allocations::live();
  void* owner = reserved();
  void* companion = reserved(owner);
  reserved(companion);
  reserved(owner);
  release(&companion);
  EXPECT_EQ(allocations::live(), before + 2);
  release(&owner);
  EXPECT_EQ(allocations::live(), before);
}

TEST(Companions, AreMadeOfReservedBlocksOnly)
{
  void* plain = nullptr;
  ASSERT_EQ(allocate(&plain, 64, KOR_MEM_PLAIN), TAV_RC_OK);
  void* block = reserved(plain);
  release(&plain);
  EXPECT_TRUE(isUsable(block, KOR_MEM_RESERVE));
  release(&block);
}

TEST(Companions, APlainBlockNeverBecomesOne)
{
  void* owner = reserved();
  void* plain = owner;
  ASSERT_EQ(allocate(&plain, 64, KOR_MEM_PLAIN), TAV_RC_OK);
  release(&owner);
  EXPECT_TRUE(isUsable(plain, 64));
  release(&plain);
}

TEST(Companions, ABlockThatWasFreedOwnsNothing)
{
  const int64_t before = allocations::live();
  void* owner = reserved();
  void* const stale = owner;
  release(&owner);
  void* block = reserved(stale);
  EXPECT_EQ(allocations::live(), before + 1);
  release(&block);
  EXPECT_EQ(allocations::live(), before);
}

TEST(Memory, ThreadsAllocateAndFreeAtATime)
{
  const int64_t before = allocations::live();
  std::atomic<int> unusable{0};
  {
    std::vector<std::thread> threads;
    threads.reserve(8);
    for (int t = 0; t < 4; ++t)
    {
      threads.emplace_back([&unusable] {
        for (int i = 0; i < 200; ++i)
        {
          void* owner = reserved();
          void* alone = reserved(owner);
          reserved(owner);
          if (!isUsable(alone, kEntry))
          {
            ++unusable;
          }
          if (i % 2 == 0)
          {
            release(&alone);
          }
          release(&owner);
        }
      });
    }
    for (std::thread& thread : threads) thread.join();
  }
  EXPECT_EQ(unusable.load(), 0);
  EXPECT_EQ(allocations::live(), before);
}
} // namespace
