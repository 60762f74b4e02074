/// What a handle keeps behind the fields that its users see.
#pragma once

#include <memory>
#include <new>
#include <type_traits>

#include "api/pairMemory.h"
#include "tav/tav.h"

namespace tav::inside
{

/// Every handle is the first member of one of these, made by tavInitHandle. An operation that its user takes step by
/// step, as a walk by tavGetNextChild, has no other place for what a step has found out for the next ones.
struct OwnedHandle
{
  TAVHandle handle;
  PairMemory* pPairs; ///< owned; null until a scan has something to keep
  bool isWalking;     ///< an operation that walks by itself is under way
};

static_assert(std::is_standard_layout_v<OwnedHandle>, "the handle's address is that of what it lies in");

inline OwnedHandle& ownedOf(TAVHandle& handle)
{
  return reinterpret_cast<OwnedHandle&>(handle);
}

/// What scans through the handle have shown; null when there is no memory to keep it.
inline PairMemory* pairsOf(TAVHandle& handle)
{
  OwnedHandle& owned = ownedOf(handle);
  if (owned.pPairs == nullptr)
  {
    owned.pPairs = new (std::nothrow) PairMemory;
    if (owned.pPairs != nullptr)
    {
      owned.pPairs->keepsEnds = owned.isWalking;
    }
  }
  return owned.pPairs;
}

/// Forgets what scans have shown: the stream may have changed since.
inline void forgetPairs(TAVHandle& handle)
{
  delete ownedOf(handle).pPairs;
  ownedOf(handle).pPairs = nullptr;
}

/// Around an operation that walks by itself: it knows nothing from before, and leaves nothing behind.
class OwnPairs
{
public:
  explicit OwnPairs(TAVHandle& handle)
      : handle_(handle)
  {
    forgetPairs(handle_);
    ownedOf(handle_).isWalking = true;
  }
  ~OwnPairs()
  {
    forgetPairs(handle_);
    ownedOf(handle_).isWalking = false;
  }
  OwnPairs(const OwnPairs&) = delete;
  OwnPairs& operator=(const OwnPairs&) = delete;

  /// Bytes that scans have gone through, and where the farthest ended.
  [[nodiscard]] uint64_t scanned() const
  {
    const PairMemory* const pairs = ownedOf(handle_).pPairs;
    return pairs != nullptr ? pairs->scanned : 0;
  }
  [[nodiscard]] uint64_t farthest() const
  {
    const PairMemory* const pairs = ownedOf(handle_).pPairs;
    return pairs != nullptr ? pairs->farthest : 0;
  }

private:
  TAVHandle& handle_;
};

} // namespace tav::inside
