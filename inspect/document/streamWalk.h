/// A walk over a file of several streams.
#pragma once

#include <functional>
#include <optional>

#include "tav/inspect/damageWatch.hpp"
#include "tav/inspect/walker.hpp"

namespace tav::inspect
{

/// As Walker, but where a stream in another form begins behind one, it is read in its own. What is passed over is told
/// as DamageWatch does.
class StreamWalk
{
public:
  StreamWalk(ByteSource& source, const Form& form, DamageWatch::Sink told, const WalkStart& start = {});

  bool next(Event& event);
  bool skip() { return walker_->skip(); }

  const Walker& walker() const { return *walker_; }
  /// Of the stream that the last event belongs to.
  const Form& form() const { return walker_->form(); }

private:
  void begin(const Form& form, const WalkStart& start);
  bool goOnInOtherForm(const Event& event);

  ByteSource& source_;
  DamageWatch::Sink told_;
  uint64_t start_ = 0;
  std::optional<Walker> walker_{};
  std::optional<DamageWatch> watch_{};
};

} // namespace tav::inspect
