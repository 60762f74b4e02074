#include "tav/inspect/damageWatch.hpp"

#include "tav/inspect/phrases.hpp"

namespace tav::inspect
{

void DamageWatch::see(const Walker& walker, const Event& event)
{
  switch (event.what)
  {
  case What::nodeBegin:
    paddingCut_ = 0;
    if (event.node.has(kOverrun) && (cuts_.empty() || cuts_.back().limit != event.node.limit))
    {
      cuts_.push_back({event.node.offset(), event.node.limit, walker.path(event, PathStyle::brief)});
    }
    return;
  case What::nodeEnd: seeEnd(event); return;
  case What::damaged: seeDamage(walker, event); return;
  default: return;
  }
}

void DamageWatch::seeDamage(const Walker& walker, const Event& event)
{
  PassedOver passed{.offset = event.offset, .length = event.length, .path = walker.path(event, PathStyle::brief)};
  passed.reason = event.reason;
  passed.sentence = "passed over " + counted(event.length, "byte") + ": " + event.reason;
  passed.code = event.code;
  passed.rule = event.code == TAV_RC_NO_MEMORY ? RuleId::headerCut : RuleId::damaged;
  passed.otherStream = event.depth == 0 && otherStreamAt(source_, form_, event.offset).has_value();
  sink_(std::move(passed));
}

void DamageWatch::seeEnd(const Event& event)
{
  const Node& node = event.node;
  if (!node.isGroup())
  {
    paddingCut_ = event.offset == source_.size() ? missingPadding(event, form_) : 0;
    return;
  }
  if (cuts_.empty() || cuts_.back().offset != node.offset())
  {
    return;
  }
  Cut cut = std::move(cuts_.back());
  cuts_.pop_back();
  const uint64_t missing = layout::addSaturated(node.payloadOffset(), node.size()) - cut.limit;
  const bool file = cut.limit == source_.size();
  if (event.end != End::byEndElement && !(file && missing == paddingCut_))
  {
    const std::string reason =
        "ends " + counted(missing, "byte") + " past " + (file ? "the end of the file" : "its parent");
    sink_({.offset = cut.offset,
           .path = std::move(cut.path),
           .reason = reason,
           .sentence = reason + ": what it lacks was passed over",
           .code = file ? uint32_t{TAV_RC_DATA_TOO_LARGE} : uint32_t{TAV_RC_OUTSIDE_PARENT},
           .rule = file ? RuleId::pastFile : RuleId::pastParent});
  }
}

} // namespace tav::inspect
