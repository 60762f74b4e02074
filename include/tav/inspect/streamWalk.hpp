/// @file streamWalk.hpp
/// A walk over a file of several streams.
#pragma once

#include <cstdint>
#include <optional>

#include "tav/inspect/api.hpp"
#include "tav/inspect/damageWatch.hpp"
#include "tav/inspect/walker.hpp"

namespace tav::inspect
{

/// As Walker, but where a stream in another form begins behind one, it is read in its own. What is passed over is told
/// as DamageWatch does; nobody is told by an empty sink.
class StreamWalk
{
public:
  /// `source` outlives the walk.
  TAV_INSPECT_API StreamWalk(ByteSource& source, const Form& form, DamageWatch::Sink told = {},
                             const WalkStart& start = {});
  /// A walk that goes on where another one stands, whose walk in this form began at `streamOffset`. `everyForm` false:
  /// streams in other forms are damage. Damage is told of in the groups around the place, too.
  TAV_INSPECT_API StreamWalk(ByteSource& source, const Form& form, DamageWatch::Sink told, const Walker::State& state,
                             uint64_t streamOffset, bool everyForm, uint64_t budget = kNoBudget);

  /// The next event; false at the file's end.
  TAV_INSPECT_API bool next(Event& event);
  /// As Walker::skip.
  bool skip() { return walker_->skip(); }
  /// Takes in a group around the place where it began.
  void see(const Event& event)
  {
    if (watch_)
    {
      watch_->see(*walker_, event);
    }
  }

  const Walker& walker() const { return *walker_; }
  /// Of the stream that the last event belongs to.
  const Form& form() const { return walker_->form(); }
  /// Where the walk in this form began.
  uint64_t streamOffset() const { return start_; }

private:
  void watch(const Form& form);
  void begin(const Form& form, const WalkStart& start);
  bool goOnInOtherForm(const Event& event);

  ByteSource& source_;
  DamageWatch::Sink told_;
  uint64_t start_ = 0;
  bool everyForm_ = true;
  uint64_t budget_ = kNoBudget;
  std::optional<Walker> walker_{};
  std::optional<DamageWatch> watch_{};
};

} // namespace tav::inspect
