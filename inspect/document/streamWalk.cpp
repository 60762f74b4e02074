#include "inspect/document/streamWalk.h"

#include <utility>

#include "tav/inspect/form.hpp"

namespace tav::inspect
{

namespace
{

/// The form of the stream at an offset, of which byte order and root are known: its own bytes tell about the padding.
Form ownForm(ByteSource& source, const Form& seen, uint64_t offset)
{
  constexpr uint64_t ringBytes = uint64_t{1} << 20U;
  const auto behind = source.window(offset, ringBytes);
  const Recognition found = recognise(*behind, {.swapped = seen.swapped, .root64 = seen.root64});
  return found.isStream && !found.damagedStart && !found.ambiguous() ? found.form : seen;
}

} // namespace

StreamWalk::StreamWalk(ByteSource& source, const Form& form, DamageWatch::Sink told, const WalkStart& start)
    : source_(source), told_(std::move(told))
{
  begin(form, start);
}

StreamWalk::StreamWalk(ByteSource& source, const Form& form, DamageWatch::Sink told, const Walker::State& state,
                       uint64_t streamOffset, bool everyForm, uint64_t budget)
    : source_(source), told_(std::move(told)), start_(streamOffset), everyForm_(everyForm), budget_(budget)
{
  watch_.emplace(source_, form, told_);
  walker_.emplace(Walker::from(source_, form, state, budget));
}

void StreamWalk::begin(const Form& form, const WalkStart& start)
{
  start_ = start.offset;
  watch_.emplace(source_, form, told_);
  walker_.emplace(source_, form, start);
}

bool StreamWalk::next(Event& event)
{
  while (walker_->next(event))
  {
    if (!goOnInOtherForm(event))
    {
      watch_->see(*walker_, event);
      return true;
    }
  }
  return false;
}

bool StreamWalk::goOnInOtherForm(const Event& event)
{
  if (!everyForm_ || event.what != What::damaged || event.depth != 0 || event.offset <= start_)
  {
    return false;
  }
  const auto other = otherStreamAt(source_, walker_->form(), event.offset);
  if (other)
  {
    begin(ownForm(source_, *other, event.offset),
          {.offset = event.offset, .wide = other->root64, .budget = budget_});
  }
  return other.has_value();
}

} // namespace tav::inspect
