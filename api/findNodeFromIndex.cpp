/// Finding a node from an arbitrary offset.
#include "api/findNodeFromIndex.h"

#include "api/ownedHandle.h"
#include "api/peekNode.h"
#include "api/rawWrite.h"
#include "format/layout.h"
#include "tav/probes.h"
#include "trace/traceFrame.h"

using namespace tav;
using namespace tav::inside;

namespace
{

constexpr uint64_t kHere64 = 0x1;
constexpr uint64_t kHere32 = 0x2;
constexpr uint64_t kAfter = 0x4;

bool areIndexOptions(uint64_t options)
{
  return options <= (kHere64 | kHere32 | kAfter) && (options & (kHere64 | kHere32)) != (kHere64 | kHere32);
}

/// The node that holds the pair, read as a 64-bit one: only its id and size matter.
uint32_t readTrailer(TAVHandle& handle, uint64_t eyeOffset, TAVHeaderData& trailer)
{
  uint64_t offset = 0;
  return nodeBefore(eyeOffset, kHeaderSize64, offset) ? peekNode(handle, offset, trailer)
                                                      : TAV_RC_NO_MEMORY;
}

/// Whether an eye catcher that leads to a group is that group's own.
bool isPairOfGroup(const TraceFrame& frame, TAVHandle& handle, const TAVHeader& group, uint64_t eyeOffset,
                   uint64_t distance)
{
  TAVHeaderData trailer{};
  const bool read = readTrailer(handle, eyeOffset, trailer) == TAV_RC_OK;
  if (read && trailer.header.hdr64.size != kEyeSizeLength)
  {
    frame.dump(200, eyeOffset, distance);
    return false;
  }
  switch (trailer.header.hdr64.elm)
  {
  case TAV_ELM_CMN_EYE_SIZE:
    if (group.hdr64.size >= distance)
    {
      return true;
    }
    frame.dump(220, eyeOffset, distance);
    return false;
  case TAV_ELM_CMN_END_HDR_EYE_SIZE:
    if (group.hdr64.size == distance || isSizeUnknown(group))
    {
      return true;
    }
    frame.dump(230, eyeOffset, distance);
    return false;
  default:
    frame.dump(240, eyeOffset, distance);
    return true;
  }
}

/// The node that ends at an eye catcher. A data element is taken as it is, whether or not its size fits the pair. The
/// first is read at once, since mostly it is taken; those behind one that was not are looked at first.
uint32_t readNodeOfPair(const TraceFrame& frame, TAVHandle& handle, uint64_t eyeOffset, uint64_t distance, bool first,
                        TAVHeaderData& out, bool& accepted)
{
  uint64_t offset = 0;
  if (!nodeBefore(eyeOffset, distance, offset))
  {
    return TAV_RC_NOT_FOUND;
  }
  const uint32_t rc =
      first ? tavReadNodeInt(0, &handle, offset, true, &out) : readIfWhole(handle, offset, out);
  if (rc != TAV_RC_OK)
  {
    return TAV_RC_NOT_FOUND;
  }
  accepted = !isGroup(out.header) || isPairOfGroup(frame, handle, out.header, eyeOffset, distance);
  return TAV_RC_OK;
}

/// The eye catchers of a scan behind which no node can be read. The next scan from one of them goes straight to where
/// this one has come to.
class Misses
{
public:
  explicit Misses(PairMemory* pairs)
      : pairs_(pairs)
  {
  }

  /// Comes to an eye catcher.
  void arrive(uint64_t eyeOffset)
  {
    if (pairs_ != nullptr && any_)
    {
      pairs_->keepSuccessor(last_, eyeOffset);
    }
    first_ = any_ ? first_ : eyeOffset;
    last_ = eyeOffset;
    any_ = true;
  }

  [[nodiscard]] bool isKnown(uint64_t eyeOffset, uint64_t& next) const
  {
    return pairs_ != nullptr && pairs_->findSuccessor(eyeOffset, next);
  }

  /// There is no further eye catcher.
  void end()
  {
    if (pairs_ != nullptr && pairs_->keepsEnds && any_)
    {
      pairs_->keepSuccessor(last_, kNowhere);
      last_ = kNowhere;
    }
    shorten();
  }

  /// Leads all of them to the last one.
  void shorten()
  {
    uint64_t next = 0;
    for (uint64_t at = first_; any_ && at != last_ && isKnown(at, next); at = next)
    {
      pairs_->keepSuccessor(at, last_);
    }
  }

private:
  static constexpr uint64_t kNowhere = ~uint64_t{0};

  PairMemory* pairs_;
  bool any_ = false;
  uint64_t first_ = 0;
  uint64_t last_ = 0;
};

/// What tavFindNodeFromIndex looks for.
struct Search
{
  bool after; ///< the node behind an eye catcher, not the one that it ends
  uint64_t position;
  uint64_t end;
  PairMemory* pairs; ///< may be null
};

uint32_t scanForNode(const TraceFrame& frame, TAVHandle& handle, Search search, TAVHeaderData& out)
{
  Misses misses(search.pairs);
  for (bool first = true; search.position < search.end; first = false)
  {
    uint64_t eyeOffset = 0;
    uint64_t distance = 0;
    bool swapped = false;
    uint32_t rc = tavFindEyeSizeComboInt(&handle, search.position, search.end - search.position, true, &eyeOffset,
                                         &distance, &swapped);
    if (rc != TAV_RC_OK)
    {
      frame.report(70, rc);
      if (rc == TAV_RC_NOT_FOUND || rc == TAV_RC_END_OF_STORAGE)
      {
        misses.end();
      }
      return TAV_RC_NOT_FOUND;
    }
    search.position = eyeOffset + kEyeLength;
    bool accepted = false;
    if (search.after)
    {
      misses.arrive(eyeOffset);
      accepted = !misses.isKnown(eyeOffset, search.position) &&
                 readIfWhole(handle, eyeOffset + kEyeSizeLength, out) == TAV_RC_OK;
    }
    else
    {
      rc = readNodeOfPair(frame, handle, eyeOffset, distance, first, out, accepted);
    }
    if (rc != TAV_RC_OK || accepted)
    {
      misses.shorten();
      return rc;
    }
  }
  misses.shorten();
  return TAV_RC_NOT_FOUND;
}

uint32_t findNode(uint64_t options, TAVHandle* handle, uint64_t index, uint64_t length, TAVHeaderData* out,
                  PairMemory* pairs)
{
  TraceFrame frame(probe::findNodeFromIndex);
  frame.dump(0, options, handle, index, length, out);
  if (!frame.require(10, handle != nullptr, TAV_RC_BAD_PARAM) ||
      !frame.require(20, out != nullptr, TAV_RC_BAD_PARAM) ||
      !frame.require(30, areIndexOptions(options), TAV_RC_BAD_OPTIONS) ||
      !frame.require(40, isReadOnly(*handle), TAV_RC_WRONG_MODE))
  {
    return frame.code();
  }
  const uint64_t end = length != 0 ? addSaturated(index, length) : ~uint64_t{0};
  const bool found = (options & (kHere64 | kHere32)) != 0
                         ? frame.step(50, tavReadNodeInt(0, handle, index, (options & kHere64) != 0, out))
                         : frame.step(60, scanForNode(frame, *handle, {(options & kAfter) != 0, index, end, pairs},
                                                      *out));
  if (found)
  {
    frame.dump(100, trace::record(out));
  }
  return frame.code();
}

} // namespace

uint32_t tav::inside::readBehindPair(TAVHandle& handle, uint64_t eyeOffset, TAVHeaderData& out)
{
  return findNode(kAfter, &handle, eyeOffset, 0, &out, pairsOf(handle));
}

uint32_t tavFindNodeFromIndex(uint64_t options, TAVHandle* handle, uint64_t index, uint64_t length, TAVHeaderData* out)
{
  return findNode(options, handle, index, length, out, nullptr);
}
