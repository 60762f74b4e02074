/// Following a path of groups.
#include "api/findElement.h"
#include "api/ownedHandle.h"
#include "api/rawWrite.h"
#include "api/walkGuard.h"
#include "format/layout.h"
#include "tav/probes.h"
#include "trace/traceFrame.h"

using namespace tav;
using namespace tav::inside;

namespace
{

/// The place of a path search: the groups matched so far, and where the present level goes on.
class PathSearch
{
public:
  PathSearch(TAVHandle& handle, TAVHeader& parent, const TAVFindLogicalGroupParam& param)
      : handle_(handle), parent_(parent), param_(param), guard_(parent), levels_(parent.nodeOffset, param.pathCount),
        pairs_(handle)
  {
  }

  /// Follows the path. Without a match for its first entry the first level is searched again and again: such a call
  /// has never returned, and its callers count on a group being there.
  uint32_t run(const TraceFrame& frame, TAVHeaderData& found)
  {
    uint32_t rc = TAV_RC_NOT_FOUND;
    while (level_ < param_.pathCount)
    {
      const TAVPathEntry& entry = param_.pPath[level_];
      frame.dump(100, level_, entry.infoKey, entry.elm);
      rc = findAtLevel(entry, found);
      if (rc == TAV_RC_OK)
      {
        rc = isGroup(found.header) ? descend(found.header) : skip(found.header);
      }
      else if (rc == TAV_RC_OUTSIDE_PARENT)
      {
        return rc;
      }
      else if (level_ != 0 || anyGroup_)
      {
        rc = goBack();
      }
      else if (place_.count != 0)
      {
        rc = TAV_RC_NOT_FOUND; // every round puts the parent on its stack, and a full stack ends no miss either
      }
      if (rc != TAV_RC_OK && rc != TAV_RC_NOT_FOUND)
      {
        return rc;
      }
    }
    return rc;
  }

private:
  uint32_t findAtLevel(const TAVPathEntry& entry, TAVHeaderData& found)
  {
    TAVHeader* const parent = level_ == 0 ? &parent_ : chain_.top();
    const uint64_t from = resuming_ ? resume_.nodeOffset : parent->nodeOffset;
    const uint64_t scannedBefore = pairs_.scanned();
    uint64_t reached = from;
    const uint32_t rc = findElement(&handle_, parent, {0, 0, entry.infoKey, entry.elm}, resuming_ ? &resume_ : nullptr,
                                    &place_, &found, reached);
    const bool mayGoOn = levels_.pass(from, reached) &&
                         levels_.pass(pairs_.farthest() - (pairs_.scanned() - scannedBefore), pairs_.farthest());
    return mayGoOn ? rc : TAV_RC_OUTSIDE_PARENT;
  }

  /// Goes on among the siblings: a path leads through groups only.
  uint32_t skip(const TAVHeader& element)
  {
    resume_ = element;
    resuming_ = true;
    return TAV_RC_OK;
  }

  uint32_t descend(const TAVHeader& group)
  {
    if (!guard_.visit(group.nodeOffset))
    {
      return TAV_RC_OUTSIDE_PARENT;
    }
    ++level_;
    anyGroup_ = true;
    resuming_ = false;
    place_.count = 0;
    return chain_.push(&group);
  }

  /// The level is exhausted: on to the next match of the level above. At the first level nothing is above.
  uint32_t goBack()
  {
    const uint32_t rc = chain_.pop(&resume_);
    if (rc != TAV_RC_OK)
    {
      return rc;
    }
    --level_;
    resuming_ = true;
    place_.count = 0;
    return place_.push(level_ == 0 ? &parent_ : chain_.top());
  }

  TAVHandle& handle_;
  TAVHeader& parent_;
  const TAVFindLogicalGroupParam& param_;
  TAVHdrStack chain_; ///< the groups matched, one a level
  WalkGuard guard_;   ///< of the groups entered
  LevelGuard levels_; ///< of the levels searched, and of the scans for the ends of groups among them
  const OwnPairs pairs_;
  TAVHdrStack place_; ///< of the present level's search: its parent
  TAVHeader resume_{};
  uint32_t level_ = 0;
  bool resuming_ = false;
  bool anyGroup_ = false; ///< the first entry has matched a group
};

} // namespace

uint32_t tavFindLogicalGroup(uint64_t options, TAVHandle* handle, TAVHeader* parent, TAVFindLogicalGroupParam* param,
                             TAVHeaderData* out)
{
  TraceFrame frame(probe::findLogicalGroup);
  frame.dump(0, options, handle, "Parent header and logical group search information", trace::record(parent),
             trace::record(param), out);
  if (!frame.require(10, handle != nullptr, TAV_RC_BAD_PARAM) ||
      !frame.require(20, parent != nullptr, TAV_RC_BAD_PARAM) ||
      !frame.require(30, param != nullptr, TAV_RC_BAD_PARAM) || !frame.require(40, out != nullptr, TAV_RC_BAD_PARAM) ||
      !frame.require(50, options == 0, TAV_RC_BAD_OPTIONS) ||
      !frame.require(60, isReadOnly(*handle), TAV_RC_WRONG_MODE) ||
      !frame.require(70, param->pPath != nullptr || param->pathCount == 0, TAV_RC_BAD_PARAM))
  {
    return frame.code();
  }
  TAVHeaderData found{};
  uint32_t rc = PathSearch(*handle, *parent, *param).run(frame, found);
  if (param->pSecond != nullptr && param->secondCount != 0)
  {
    rc = TAV_RC_NOT_SUPPORTED;
  }
  if (frame.step(80, rc))
  {
    *out = found;
    frame.dump(200, trace::record(out));
  }
  return frame.code();
}
