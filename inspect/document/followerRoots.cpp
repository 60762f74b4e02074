/// Where the streams of a file begin that is followed, and in which form they are.
#include <optional>
#include <utility>

#include "inspect/document/follower.h"
#include "tav/inspect/fileKind.hpp"
#include "tav/inspect/form.hpp"
#include "tav/inspect/streamWalk.hpp"

namespace tav::inspect
{

/// A file that takes another one's place is in the same form more often than not, and at first it is short.
bool Follower::findForm()
{
  if (now_->size() == 0)
  {
    return false;
  }
  if (former_)
  {
    const Recognition again =
        recognise(*now_, {.swapped = former_->swapped, .root64 = former_->root64, .aligned = former_->aligned});
    if (again.isStream && !again.damagedStart)
    {
      form_ = again.form;
      return true;
    }
  }
  const Recognition found = recognise(*now_, choiceNow());
  if (found.isStream && !found.ambiguous() && !otherKindOf(*now_, found))
  {
    form_ = found.form;
  }
  return form_.has_value();
}

/// Of a few nodes, the last one cut, more than one padding can make sense: there the root's header says.
FormChoice Follower::choiceNow()
{
  constexpr uint64_t fewBytes = 4096;
  FormChoice choice = options_.form;
  const Form first = recognise(*now_, choice).form;
  TAVHeader root{};
  root.hdrType = TAV_HDR_64;
  if (!choice.aligned && first.root64 && now_->size() < fewBytes && readHeader(root, first.swapped, root))
  {
    choice.aligned = (layout::infoOf(root) & TAV_INFO_ALIGNED8) != 0;
  }
  return choice;
}

/// The root behind the present one, as the file is now.
std::optional<Follower::FoundRoot> Follower::findRoot()
{
  if (root_.hdrType == 0)
  {
    return searchRoot(*form_, {}, true);
  }
  Form form = *form_;
  form.root64 = layout::is64(root_);
  if (layout::sizeOf(root_) != 0)
  {
    return searchRoot(form, {.offset = root_.nodeOffset, .wide = form.root64}, false);
  }
  // An empty root looks to a walk as if what follows were in it.
  const uint64_t behind = behindHeader(root_);
  const auto other = otherStreamAt(*now_, form, behind);
  std::optional<FoundRoot> found = searchRoot(form, {.offset = behind, .wide = form.root64}, true);
  const bool isThere = found && found->header.nodeOffset == behind;
  return other && !isThere ? searchRoot(*other, {.offset = behind, .wide = other->root64}, true) : std::move(found);
}

/// By a walk in a form from a place on, which is behind the present root, or at it.
std::optional<Follower::FoundRoot> Follower::searchRoot(const Form& form, const WalkStart& start, bool isBehind)
{
  FoundRoot found;
  StreamWalk walk(
      *now_, form, [&found](const PassedOver& place) { found.passed.push_back(place); }, start);
  Event event;
  for (bool isPast = isBehind; walk.next(event);)
  {
    found.isBehindGap = found.isBehindGap || event.what == What::zeros || event.what == What::damaged;
    if (event.what != What::nodeBegin || event.depth != 0)
    {
      continue;
    }
    if (isPast && event.node.offset() < reached_)
    {
      return std::nullopt; // in the present one, of which less was there when its bytes were read than was told since
    }
    if (isPast)
    {
      found.form = walk.form();
      found.header = event.node.header;
      return found;
    }
    isPast = true;
    walk.skip();
  }
  return std::nullopt;
}

/// What is at the end may be a part of what is being written, and passed over tells nothing before something follows.
bool Follower::nextRoot()
{
  std::optional<FoundRoot> found = findRoot();
  if (found && found->isBehindGap)
  {
    // What is before it may have been read before it was written, and this one, from the middle of a stream, after:
    // a writer writes forward, so that a second look sees the whole of what was written then.
    readAgain();
    const std::optional<FoundRoot> again = findRoot();
    found = again && again->header.nodeOffset == found->header.nodeOffset ? again : std::nullopt;
  }
  if (!found || behindHeader(found->header) > followed_->end())
  {
    return false;
  }
  tellBetween(found->passed);
  const bool isOther = !(found->form == *form_);
  formBefore_ = std::exchange(form_, found->form);
  reader_ = isOther ? nullptr : std::move(reader_);
  rootBefore_ = std::exchange(root_, found->header);
  arrive(root_, {});
  return true;
}

/// Tells what was passed over between the last root and the next; what is in the root was told when it was read.
void Follower::tellBetween(const std::vector<PassedOver>& passed)
{
  const uint64_t end = root_.hdrType == 0 ? 0 : layout::addSaturated(behindHeader(root_), layout::sizeOf(root_));
  for (const PassedOver& place : passed)
  {
    if (told_.damage && !quiet_ && place.offset >= end)
    {
      told_.damage(place);
    }
  }
}

} // namespace tav::inspect
