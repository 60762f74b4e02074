#include "support/failingNew.h"

#include <array>
#include <atomic>
#include <cstdlib>
#include <cstring>
#include <new>

namespace
{

std::atomic<int64_t> liveBlocks{0};
thread_local bool failing = false;
thread_local bool painting = false;
thread_local uint64_t countdown = 0;
thread_local bool failedOnce = false;

struct Sizes
{
  bool watched;
  uint64_t smallest;
  uint64_t largest;
  std::array<uint64_t, 64> asked;
  std::size_t count;
};
thread_local Sizes sizes{};

bool isRefused(uint64_t size)
{
  if (!sizes.watched)
  {
    return false;
  }
  if (sizes.count < sizes.asked.size())
  {
    sizes.asked[sizes.count++] = size;
  }
  return size < sizes.smallest || size > sizes.largest;
}

void* allocate(std::size_t size) noexcept
{
  if (failing)
  {
    return nullptr;
  }
  void* const block = std::malloc(size == 0 ? 1 : size);
  if (block == nullptr)
  {
    return nullptr;
  }
  liveBlocks.fetch_add(1);
  if (painting)
  {
    std::memset(block, allocations::kPaint, size);
  }
  return block;
}

void* allocateOrThrow(std::size_t size)
{
  void* const block = allocate(size);
  if (block == nullptr)
  {
    throw std::bad_alloc();
  }
  return block;
}

void* allocateUnlessItsTurn(std::size_t size) noexcept
{
  if (countdown != 0 && --countdown == 0)
  {
    failedOnce = true;
    return nullptr;
  }
  return isRefused(size) ? nullptr : allocate(size);
}

void release(void* block) noexcept
{
  if (block != nullptr)
  {
    liveBlocks.fetch_sub(1);
  }
  std::free(block);
}

} // namespace

int64_t allocations::live()
{
  return liveBlocks.load();
}

allocations::Painted::Painted()
{
  painting = true;
}

allocations::Painted::~Painted()
{
  painting = false;
}

allocations::AllFail::AllFail()
{
  failing = true;
}

allocations::AllFail::~AllFail()
{
  failing = false;
}

allocations::FailNth::FailNth(uint64_t nth)
{
  countdown = nth;
  failedOnce = false;
}

allocations::FailNth::~FailNth()
{
  countdown = 0;
}

bool allocations::FailNth::happened()
{
  return failedOnce;
}

allocations::OnlySizes::OnlySizes(uint64_t smallest, uint64_t largest)
{
  sizes = {true, smallest, largest, {}, 0};
}

allocations::OnlySizes::~OnlySizes()
{
  sizes.watched = false;
}

std::vector<uint64_t> allocations::OnlySizes::asked()
{
  return {sizes.asked.begin(), sizes.asked.begin() + static_cast<std::ptrdiff_t>(sizes.count)};
}

void* operator new(std::size_t size)
{
  return allocateOrThrow(size);
}

void* operator new[](std::size_t size)
{
  return allocateOrThrow(size);
}

void* operator new(std::size_t size, const std::nothrow_t&) noexcept
{
  return allocateUnlessItsTurn(size);
}

void* operator new[](std::size_t size, const std::nothrow_t&) noexcept
{
  return allocateUnlessItsTurn(size);
}

void operator delete(void* block) noexcept
{
  release(block);
}

void operator delete[](void* block) noexcept
{
  release(block);
}

void operator delete(void* block, std::size_t) noexcept
{
  release(block);
}

void operator delete[](void* block, std::size_t) noexcept
{
  release(block);
}

void operator delete(void* block, const std::nothrow_t&) noexcept
{
  release(block);
}

void operator delete[](void* block, const std::nothrow_t&) noexcept
{
  release(block);
}
