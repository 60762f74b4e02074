/// @file damageWatch.hpp
/// What a walk passes over without being able to read it.
#pragma once

#include <cstdint>
#include <functional>
#include <string>
#include <vector>

#include "tav/inspect/api.hpp"
#include "tav/inspect/form.hpp"
#include "tav/inspect/rules.hpp"
#include "tav/inspect/walker.hpp"

namespace tav::inspect
{

/// Bytes that were passed over, or that a group announces and the file does not have.
struct PassedOver
{
  uint64_t offset = 0;
  uint64_t length = 0;    ///< of the bytes that are there; 0: none are
  std::string path{};     ///< of the group around them, or of the group that claims them; shortened
  std::string reason{};   ///< why it could not be read
  std::string sentence{}; ///< the same, and what became of it
  uint32_t code = TAV_RC_OK;
  RuleId rule = RuleId::damaged;
  bool otherStream = false; ///< a stream in another form seems to begin there
};

/// Follows a walk and says what it passes over: bytes that are no node, streams in another form, and groups that end
/// past what is around them. Of groups that the same end cuts, the outermost is told. Groups that were never closed are
/// read to their end, and what is behind a stream's zeros, or lacks its last padding, is sound.
class DamageWatch
{
public:
  using Sink = std::function<void(PassedOver)>;

  DamageWatch(ByteSource& source, const Form& form, Sink sink)
      : source_(source), form_(form), sink_(std::move(sink)) {}

  /// To be given every event of the walk, in their order.
  TAV_INSPECT_API void see(const Walker& walker, const Event& event);

private:
  struct Cut
  {
    uint64_t offset;
    uint64_t limit;
    std::string path;
  };

  void seeDamage(const Walker& walker, const Event& event);
  void seeEnd(const Event& event);

  ByteSource& source_;
  Form form_;
  Sink sink_;
  std::vector<Cut> cuts_{}; ///< groups around the place that end past their limits, each with another one
  uint64_t paddingCut_ = 0; ///< bytes of padding that the last data element lacks at the end of the file
};

} // namespace tav::inspect
