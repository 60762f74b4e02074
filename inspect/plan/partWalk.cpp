// Walks through parts of files.
#include <utility>

#include "inspect/plan/partState.h"
#include "tav/inspect/plan.hpp"

namespace tav::inspect
{

std::vector<Event> groupsAround(const Walker::State& state)
{
  std::vector<Event> around;
  for (size_t i = 1; i < state.frames.size(); ++i)
  {
    Event& event = around.emplace_back();
    event.what = What::nodeBegin;
    event.node = state.frames[i].node;
    event.offset = event.node.offset();
    event.length = event.node.headerLength();
    event.depth = event.node.depth;
  }
  return around;
}

PartEnd endOf(const StreamWalk& walk)
{
  const Walker& walker = walk.walker();
  const size_t shared = walker.inherited();
  return {.behind = partAt(walker.state(), walker.form(), walk.streamOffset()),
          .leans = walker.leansOnDamage(),
          .shared = shared == 0 ? 0 : shared - 1};
}

PartWalk::PartWalk(ByteSource& source, const Part& part, DamageWatch::Sink passed, Streams streams)
    : end_(part.end())
{
  const Walker::State state = stateOf(source, part);
  if (!passed)
  {
    passed = [](const PassedOver&) {};
  }
  walk_ = std::make_unique<StreamWalk>(source, part.form, std::move(passed), state, part.streamOffset,
                                       streams == Streams::everyForm);
  around_ = groupsAround(state);
  for (const Event& event : around_)
  {
    walk_->see(event);
  }
}

PartWalk::~PartWalk() = default;

PartWalk::PartWalk(PartWalk&&) noexcept = default;

bool PartWalk::next(Event& event)
{
  const Walker& walk = walk_->walker();
  const bool ended = walk.place() >= end_ && end_ < walk.source().size() && walk.isBetween();
  return !ended && walk_->next(event);
}

bool PartWalk::skip()
{
  return walk_->skip();
}

const Walker& PartWalk::walker() const
{
  return walk_->walker();
}

const Form& PartWalk::form() const
{
  return walk_->form();
}

PartEnd PartWalk::end() const
{
  return endOf(*walk_);
}

PartEnd walkPart(ByteSource& source, const Part& part, const std::function<void(const Walker&, const Event&)>& seen,
                 Streams streams)
{
  PartWalk walk(source, part, {}, streams);
  for (Event event; walk.next(event);)
  {
    seen(walk.walker(), event);
  }
  return walk.end();
}

} // namespace tav::inspect
