/// The sibling of a group that was never closed.
#include "api/stepPastOpenGroup.h"

#include <algorithm>
#include <array>

#include "api/fetchBytes.h"
#include "api/findNodeFromIndex.h"
#include "api/ownedHandle.h"
#include "api/peekNode.h"
#include "api/rawWrite.h"
#include "core/fastWay.h"

namespace tav::inside
{
namespace
{

/// A pair, and the node that it leads to.
struct Pair
{
  uint64_t eyeOffset;
  TAVHeaderData node;
};

bool isSameOpenGroup(const TAVHeader& node, const TAVHeader& reference)
{
  return isGroup(node) && sizeOf(node) == sizeOf(reference) && node.nodeOffset == reference.nodeOffset;
}

/// Fetches bytes without moving the ring.
bool lookAt(TAVHandle& handle, uint64_t offset, uint8_t* to, uint64_t length)
{
  if (!isDirect(handle))
  {
    return handle.pCircularBuf != nullptr && peekBytes(*handle.pCircularBuf, offset, to, length) == TAV_RC_OK;
  }
  uint64_t relative = 0;
  if (handle.pDirectData == nullptr || !isInDirectData(handle, offset, relative) ||
      handle.directDataSize - relative < length)
  {
    return false;
  }
  std::copy_n(handle.pDirectData + relative, length, to);
  return true;
}

/// Whether the size of an open group is at an offset: bytes that no eye catcher has.
bool hasOpenSize(TAVHandle& handle, uint64_t offset)
{
  uint64_t size = 0;
  std::array<uint8_t, sizeof size> bytes;
  if (!lookAt(handle, offset, bytes.data(), bytes.size()))
  {
    return false;
  }
  size = kor::bitCast<uint64_t>(bytes);
  return size == TAV_SIZE_UNKNOWN;
}

/// Whether a pair still leads to a group, as far as that can be seen without moving the ring.
bool leadsTo(TAVHandle& handle, uint64_t eyeOffset, uint64_t group)
{
  EyeSizeBytes bytes;
  if (!lookAt(handle, eyeOffset, bytes.data(), bytes.size()))
  {
    return !isDirect(handle);
  }
  const EyeSize native = decodeEyeSize(bytes, false);
  const EyeSize pair = native.eye == TAV_EYE_CATCHER ? native : decodeEyeSize(bytes, true);
  return pair.eye == TAV_EYE_CATCHER && eyeOffset - pair.distance == group;
}

/// One scan for the pair of an open group, from pair to pair.
class Scan
{
public:
  Scan(TAVHandle& handle, const TAVHeader& parent, const TAVHeader& reference)
      : handle_(handle), parentSize_(sizeOf(parent)), reference_(reference), position_(reference.nodeOffset)
  {
    remember();
  }

  uint32_t run(uint64_t& eyeOffset)
  {
    const uint32_t rc = follow(eyeOffset);
    if (pairs_ != nullptr)
    {
      pairs_->cover(reference_.nodeOffset, coveredEnd_);
    }
    return rc;
  }

private:
  /// What is known is of use to a group whose size is that of an open group with a 64-bit header.
  void remember()
  {
    coveredEnd_ = position_;
    if (!is64(reference_))
    {
      return;
    }
    pairs_ = pairsOf(handle_);
    uint64_t eyeOffset = 0;
    if (pairs_ == nullptr || (!pairs_->findPair(position_, eyeOffset) && !hasOpenSize(handle_, position_)))
    {
      pairs_ = nullptr;
      return;
    }
    pairs_->makeRoom();
    isSkipping_ = true;
    isKeeping_ = true;
  }

  uint32_t follow(uint64_t& eyeOffset)
  {
    while (true)
    {
      uint32_t rc = TAV_RC_OK;
      if (isSkipping_ && (findKnown(eyeOffset) || (!isLimited() && pairs_->findEnd(position_, rc))))
      {
        return rc;
      }
      TAVHeaderData node{};
      rc = nextPair(eyeOffset, node);
      if (rc == core::kNotHere)
      {
        continue;
      }
      if (rc != TAV_RC_OK)
      {
        endInVain(rc);
        return rc;
      }
      keep(node.header, eyeOffset);
      advance(eyeOffset + kEyeSizeLength);
      if (isSameOpenGroup(node.header, reference_))
      {
        return TAV_RC_OK;
      }
    }
  }

  /// Finds the next pair and the node that it leads to. `kNotHere` where there is none before bytes that were looked at
  /// already: no eye catcher reaches into those, which begin with a group's size.
  uint32_t nextPair(uint64_t& eyeOffset, TAVHeaderData& node)
  {
    // The limit is the parent's size less an offset, not a distance: modulo 2^64, mostly no limit at all.
    const uint64_t limit = parentSize_ - position_;
    uint64_t border = 0;
    const bool isAhead = isSkipping_ && pairs_->findCovered(position_, border);
    const bool meetsBorder = isAhead && border - position_ - 1 < limit - 1; // no limit is 0
    const uint64_t length = meetsBorder ? border - position_ : limit;
    uint64_t distance = 0;
    bool swapped = false;
    const uint32_t rc = tavFindEyeSizeComboInt(&handle_, position_, length, true, &eyeOffset, &distance, &swapped);
    if (rc == TAV_RC_NOT_FOUND && meetsBorder)
    {
      advance(border);
      return core::kNotHere;
    }
    uint64_t offset = 0;
    if (rc != TAV_RC_OK)
    {
      return rc;
    }
    return nodeBefore(eyeOffset, distance, offset) ? peekNode(handle_, offset, node) : TAV_RC_NO_MEMORY;
  }

  /// Whether the group's pair is known. If it is not, what is covered here is left out.
  bool findKnown(uint64_t& eyeOffset)
  {
    uint64_t end = 0;
    if (!pairs_->isCovered(position_, end))
    {
      return false;
    }
    const bool isKnown = pairs_->findPair(reference_.nodeOffset, eyeOffset) && eyeOffset < end;
    // What reaches beyond a limit is not part of this scan, but where the last pair before ends behind it.
    const uint64_t last = isKnown ? eyeOffset + kEyeLength : end;
    if (isLimited() && last > parentSize_)
    {
      isSkipping_ = false;
      return false;
    }
    if (isKnown && !leadsTo(handle_, eyeOffset, reference_.nodeOffset))
    {
      pairs_->clear(); // the stream has changed
      position_ = reference_.nodeOffset;
      coveredEnd_ = position_;
      return false;
    }
    skipTo(isKnown ? position_ : end);
    return isKnown;
  }

  void keep(const TAVHeader& node, uint64_t eyeOffset)
  {
    if (isKeeping_ && isGroup(node) && isSizeUnknown(node))
    {
      isKeeping_ = pairs_->keepPair(node.nodeOffset, eyeOffset);
    }
  }

  void advance(uint64_t position)
  {
    count(position - position_);
    skipTo(position);
  }

  void skipTo(uint64_t position)
  {
    position_ = position;
    coveredEnd_ = isKeeping_ ? position : coveredEnd_;
  }

  [[nodiscard]] bool isLimited() const { return parentSize_ != TAV_SIZE_UNKNOWN && position_ < parentSize_; }

  void count(uint64_t bytes)
  {
    if (pairs_ != nullptr)
    {
      pairs_->scanned = addSaturated(pairs_->scanned, bytes);
      pairs_->farthest = std::max(pairs_->farthest, position_ + bytes);
    }
  }

  /// The scan has gone to the end of what there is, or of what is cached. What reading would never change is kept.
  void endInVain(uint32_t rc)
  {
    const TAVCircularBuf* const ring = handle_.pCircularBuf;
    const uint64_t end = isDirect(handle_) ? addSaturated(handle_.curOffset, handle_.directDataSize)
                         : ring != nullptr ? ring->headOffset + cachedBytes(*ring)
                                           : 0;
    count(end > position_ ? end - position_ : 0);
    const bool isLasting = (rc == TAV_RC_NOT_FOUND && !isLimited()) || rc == TAV_RC_NO_MEMORY ||
                           rc == TAV_RC_END_OF_STORAGE || rc == TAV_RC_DATA_TOO_LARGE;
    if (isSkipping_ && isLasting)
    {
      pairs_->keepEnd(position_, rc);
    }
  }

  TAVHandle& handle_;
  uint64_t parentSize_;
  const TAVHeader reference_; // a copy: the caller's may be what is written to
  uint64_t position_;
  uint64_t coveredEnd_ = 0;     ///< up to where all pairs were looked at and kept
  PairMemory* pairs_ = nullptr; ///< null where nothing is remembered
  bool isSkipping_ = false;     ///< leaves out what others have covered
  bool isKeeping_ = false;
};

} // namespace

uint32_t readAfterOpenGroup(TAVHandle& handle, const TAVHeader& parent, const TAVHeader& reference, TAVHeaderData& out)
{
  uint64_t eyeOffset = 0;
  const uint32_t rc = Scan(handle, parent, reference).run(eyeOffset);
  return rc == TAV_RC_OK ? readBehindPair(handle, eyeOffset, out) : rc;
}

} // namespace tav::inside
