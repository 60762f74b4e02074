#include "tav/inspect/streamWalk.hpp"

#include <utility>

#include "tav/inspect/form.hpp"

namespace tav::inspect
{

StreamWalk::StreamWalk(ByteSource& source, const Form& form, DamageWatch::Sink told, const WalkStart& start)
    : source_(source), told_(std::move(told))
{
  begin(form, start);
}

StreamWalk::StreamWalk(ByteSource& source, const Form& form, DamageWatch::Sink told, const Walker::State& state,
                       uint64_t streamOffset, bool everyForm, uint64_t budget)
    : source_(source), told_(std::move(told)), start_(streamOffset), everyForm_(everyForm), budget_(budget)
{
  watch(form);
  walker_.emplace(Walker::from(source_, form, state, budget));
}

void StreamWalk::watch(const Form& form)
{
  if (told_)
  {
    watch_.emplace(source_, form, told_);
  }
}

void StreamWalk::begin(const Form& form, const WalkStart& start)
{
  start_ = start.offset;
  watch(form);
  walker_.emplace(source_, form, start);
}

bool StreamWalk::next(Event& event)
{
  while (walker_->next(event))
  {
    if (!goOnInOtherForm(event))
    {
      see(event);
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
  const auto other = streamFormAt(source_, walker_->form(), event.offset);
  if (other)
  {
    begin(*other, {.offset = event.offset, .wide = other->root64, .budget = budget_});
  }
  return other.has_value();
}

} // namespace tav::inspect
