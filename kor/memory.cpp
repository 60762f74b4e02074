#include <array>
#include <cstddef>
#include <cstdint>
#include <mutex>
#include <new>

#include "kor/lock.h"
#include "tav/kor.h"

namespace
{
using tav::kor::Lock;

/// Stands in front of every reserved block's KOR_MEM_RESERVE bytes.
struct alignas(std::max_align_t) Reserved
{
  Reserved* owner = nullptr;          ///< whose companion this block is
  Reserved* firstCompanion = nullptr; ///< released together with this block
  Reserved* nextCompanion = nullptr;  ///< of the same owner
  Reserved* previousCompanion = nullptr;
  uintptr_t nextInBucket = 0; ///< in disguise, see `disguise`

  void* bytes() { return this + 1; }
};

constexpr std::size_t kReservedSize = sizeof(Reserved) + KOR_MEM_RESERVE;

/// The live reserved blocks by address. Constant-initialised and never torn down, so that handles of static
/// objects can be opened and closed at any time, and free of allocations, so that nothing here can fail.
struct Registry
{
  Lock lock;
  std::array<uintptr_t, 4096> buckets{};
};

constinit Registry registry;

/// Leak checkers follow every pointer they find; the registry must not make a lost block look used.
uintptr_t disguise(Reserved* block)
{
  return block == nullptr ? 0 : ~reinterpret_cast<uintptr_t>(block);
}

Reserved* undisguise(uintptr_t disguised)
{
  return disguised == 0 ? nullptr : reinterpret_cast<Reserved*>(~disguised);
}

uintptr_t& bucketOf(const void* bytes)
{
  const uint64_t mixed = static_cast<uint64_t>(reinterpret_cast<uintptr_t>(bytes)) * 0x9E3779B97F4A7C15u;
  return registry.buckets[mixed >> 52];
}

/// The live reserved block whose bytes start at `bytes`, or null. Compares addresses only: `bytes` may be garbage.
Reserved* find(const void* bytes)
{
  Reserved* block = undisguise(bucketOf(bytes));
  while (block != nullptr && block->bytes() != bytes) block = undisguise(block->nextInBucket);
  return block;
}

void enter(Reserved* block)
{
  uintptr_t& bucket = bucketOf(block->bytes());
  block->nextInBucket = bucket;
  bucket = disguise(block);
}

void leave(Reserved* block)
{
  uintptr_t* link = &bucketOf(block->bytes());
  while (*link != disguise(block)) link = &undisguise(*link)->nextInBucket;
  *link = block->nextInBucket;
}

void join(Reserved* companion, Reserved* owner)
{
  companion->owner = owner;
  companion->nextCompanion = owner->firstCompanion;
  if (owner->firstCompanion != nullptr)
  {
    owner->firstCompanion->previousCompanion = companion;
  }
  owner->firstCompanion = companion;
}

void part(Reserved* companion)
{
  if (companion->owner == nullptr)
  {
    return;
  }
  if (companion->previousCompanion != nullptr)
    companion->previousCompanion->nextCompanion = companion->nextCompanion;
  else
    companion->owner->firstCompanion = companion->nextCompanion;
  if (companion->nextCompanion != nullptr)
    companion->nextCompanion->previousCompanion = companion->previousCompanion;
}

/// Releases a block with its companions and theirs. A loop, since companions of companions may nest deeply.
void releaseTree(Reserved* root)
{
  Reserved* block = root;
  while (block != nullptr)
  {
    if (block->firstCompanion != nullptr)
    {
      block = block->firstCompanion;
      continue;
    }
    Reserved* const next = block == root ? nullptr : block->owner;
    part(block);
    leave(block);
    ::operator delete(block);
    block = next;
  }
}

void* allocatePlain(uint64_t size)
{
  // No object is larger than this; checking tools abort on such requests instead of refusing them.
  if (size > static_cast<uint64_t>(PTRDIFF_MAX))
  {
    return nullptr;
  }
  return ::operator new(static_cast<std::size_t>(size), std::nothrow);
}

void* allocateReserved(uint64_t size, const void* ownerBytes)
{
  if (size > KOR_MEM_RESERVE)
  {
    return nullptr;
  }
  void* const room = ::operator new(kReservedSize, std::nothrow);
  if (room == nullptr)
  {
    return nullptr;
  }

  // cppcheck-suppress legacyUninitvar ; its members have initial values
  Reserved* const block = ::new (room) Reserved;
  const std::lock_guard<Lock> guard(registry.lock);
  Reserved* const owner = find(ownerBytes);
  if (owner != nullptr)
  {
    join(block, owner);
  }
  enter(block);
  return block->bytes();
}
} // namespace

uint32_t _korMemAlloc(void** pp, uint64_t flags, uint64_t size, uint32_t mode, const char* /*pFile*/, uint32_t /*line*/)
{
  if (pp == nullptr)
  {
    return TAV_RC_BAD_PARAM;
  }
  const void* const ownerBytes = *pp;
  *pp = nullptr;
  if (flags != 0)
  {
    return TAV_RC_BAD_PARAM;
  }
  if (mode != KOR_MEM_PLAIN && mode != KOR_MEM_RESERVED)
  {
    return TAV_RC_BAD_PARAM;
  }

  *pp = mode == KOR_MEM_PLAIN ? allocatePlain(size) : allocateReserved(size, ownerBytes);
  return *pp == nullptr ? TAV_RC_NO_MEMORY : TAV_RC_OK;
}

uint32_t _korMemFree(void** pp, uint64_t /*flags*/, uint64_t /*reserved*/, const char* /*pFile*/, uint32_t /*line*/)
{
  if (pp == nullptr)
  {
    return TAV_RC_BAD_PARAM;
  }
  void* const bytes = *pp;
  *pp = nullptr;
  if (bytes == nullptr)
  {
    return TAV_RC_OK;
  }

  {
    const std::lock_guard<Lock> guard(registry.lock);
    Reserved* const block = find(bytes);
    if (block != nullptr)
    {
      releaseTree(block);
      return TAV_RC_OK;
    }
  }
  ::operator delete(bytes);
  return TAV_RC_OK;
}
