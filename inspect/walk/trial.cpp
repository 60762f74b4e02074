#include "inspect/walk/trial.h"

#include <algorithm>
#include <bit>

#include "tav/inspect/form.hpp"
#include "tav/inspect/walker.hpp"

namespace tav::inspect
{

using namespace tav::layout;

namespace
{

constexpr uint64_t kMaxNodes = 2000;
constexpr uint64_t kMaxRead = uint64_t{512} * 1024; ///< bytes fetched from the file for one way of reading

// In the measure of kDamage.
constexpr uint64_t kRootNoGroup = 30;             ///< data outside of all groups
constexpr uint64_t kOverrunGroup = 20;            ///< the outermost group that claims more than there is
constexpr uint64_t kOtherRoot = 10;               ///< a root with other headers than the first should have
constexpr uint64_t kStrangeInfo = 12;             ///< bits in a root's header that writers leave clear
constexpr uint64_t kOpenGroup = 2;                ///< a group that nothing ended
constexpr uint64_t kHugeSize = uint64_t{1} << 40; ///< that of no file
constexpr uint32_t kUsualInfo = TAV_INFO_EYE_SIZE | TAV_INFO_ALIGNED8;

void mix(uint64_t& hash, uint64_t value)
{
  hash = (hash ^ value) * 1099511628211u;
}

void countEye(ByteSource& source, uint64_t offset, Trial& trial)
{
  EyeSizeBytes bytes{};
  if (source.read(offset, bytes) == bytes.size())
  {
    trial.eyes += decodeEyeSize(bytes, trial.form.swapped).eye == TAV_EYE_CATCHER ? 1 : 0;
    trial.otherEyes += decodeEyeSize(bytes, !trial.form.swapped).eye == TAV_EYE_CATCHER ? 1 : 0;
  }
}

bool suitsType(const Node& node)
{
  const TypeInfo& info = typeInfo(node.type());
  return node.isGroup() || (info.known && (info.valueSize == 0 || info.valueSize == node.size()));
}

/// Where a file is cut, all groups around the place claim too much, each one within the claim of the one around it.
uint64_t costOfOverrun(const Node& node, Trial& trial)
{
  const uint64_t end = addSaturated(node.payloadOffset(), node.size());
  const bool within = trial.overrunLimit == node.limit && end <= trial.overrunEnd;
  trial.overrunEnd = end;
  trial.overrunLimit = node.limit;
  const uint64_t times = node.size() / (node.limit - node.payloadOffset() + 1);
  return within ? 0 : kOverrunGroup + static_cast<uint64_t>(std::bit_width(times));
}

/// What speaks against a group by its header alone.
uint64_t costOfGroup(const Node& node, Trial& trial)
{
  uint64_t cost = node.has(kOverrun) ? costOfOverrun(node, trial) : 0;
  cost += node.has(kOpen) ? kOpenGroup : 0;
  cost += node.has(kBadGroupType) ? kDamage + node.headerLength() : 0;
  if (node.depth == 0 && (node.info() & ~kUsualInfo) != 0)
  {
    // Two 32-bit headers are taken for one such header: its size and its bits are both strange.
    cost += node.has(kOverrun) && node.size() >= kHugeSize ? kDamage + node.headerLength() : kStrangeInfo;
  }
  return cost;
}

/// What speaks against a node outside of all groups. Where the root is lost there can be many: a few say it all.
uint64_t costOfRoot(const Node& node, Trial& trial)
{
  constexpr uint64_t most = 3;
  uint64_t cost = 0;
  if (!node.isGroup() && trial.dataRoots < most)
  {
    trial.dataRoots += 1;
    cost += kRootNoGroup;
  }
  if (node.is64() != trial.form.root64 && trial.otherRoots < most)
  {
    trial.otherRoots += 1;
    cost += kOtherRoot;
  }
  return cost;
}

void countNode(ByteSource& source, const Node& node, Trial& trial)
{
  const bool named = Prober::isNamed(node.elm());
  trial.first = trial.nodes++ == 0 ? node : trial.first;
  trial.groups += node.isGroup() ? 1 : 0;
  trial.named += named && suitsType(node) ? 1 : 0;
  mix(trial.signature, node.offset());
  mix(trial.signature, node.size() ^ (uint64_t{node.elm()} << 48) ^ (uint64_t{node.type()} << 32));
  trial.cost += (named ? 0 : 2) + (suitsType(node) ? 0 : 8) + (node.isGroup() ? costOfGroup(node, trial) : 0) +
                (node.has(kNoPair) || node.has(kBadPair) ? 10 : 0) + (node.depth == 0 ? costOfRoot(node, trial) : 0);
  if (node.depth == 0 && node.isGroup() && node.is64() != trial.form.root64 && trial.damages == 0 && trial.otherAt == 0)
  {
    trial.otherAt = node.offset();
    trial.otherForm = {trial.form.swapped, node.is64(), trial.form.aligned};
  }
  if (node.is64())
  {
    const bool announced = (node.info() & TAV_INFO_ALIGNED8) != 0;
    trial.wide += 1;
    trial.alignBits += announced ? 1 : 0;
    trial.cost += announced != trial.form.aligned ? 4 : 0;
  }
  if (node.elm() == TAV_ELM_CMN_END_HDR_EYE_SIZE && node.size() == kEyeSizeLength)
  {
    countEye(source, node.payloadOffset(), trial);
  }
}

void countEvent(ByteSource& source, const Event& event, Trial& trial)
{
  trial.extent = event.offset + event.length;
  switch (event.what)
  {
  case What::nodeBegin: countNode(source, event.node, trial); break;
  case What::padding: trial.paddings += 1; break;
  case What::pair: countEye(source, event.offset, trial); break;
  case What::damaged:
    trial.damages += 1;
    trial.cost += kDamage + event.length;
    if (const auto other = otherStreamAt(source, trial.form, event.offset); other && trial.otherAt == 0)
    {
      trial.otherAt = event.offset;
      trial.otherForm = *other;
    }
    mix(trial.signature, event.offset);
    mix(trial.signature, ~event.length);
    break;
  default: break;
  }
}

/// What was searched for nodes in vain; zeros behind the stream are no damage.
void countUnread(ByteSource& source, uint64_t offset, uint64_t searched, Trial& trial)
{
  EyeSizeBytes bytes{};
  source.read(offset, bytes);
  if (std::any_of(bytes.begin(), bytes.end(), [](uint8_t byte) { return byte != 0; }))
  {
    const uint64_t length = std::min(searched, source.size() - offset);
    trial.damages += 1;
    trial.cost += kDamage + length;
    trial.extent = offset + length;
  }
}

/// Whether a way has lost against a better one whatever comes: even when nothing else speaks against it up to the end
/// of the file. One that has passed over damage does not find the same as one without.
bool isBehindForGood(const Trial& trial, const TrialLimits& limits, uint64_t size)
{
  if (limits.better == nullptr || trial.damages == 0)
  {
    return false;
  }
  const double least = static_cast<double>(trial.cost) / static_cast<double>(std::max(size, trial.extent));
  return (least - limits.better->rate()) * static_cast<double>(limits.better->extent) > limits.far + 1;
}

} // namespace

Trial tryForm(ByteSource& source, const Form& form, const TrialLimits& limits)
{
  Trial trial;
  trial.form = form;
  const uint64_t readBefore = source.bytesRead();
  Walker walker(source, form, {.budget = limits.search});
  Event event;
  while (trial.nodes < kMaxNodes && walker.next(event))
  {
    if (event.what == What::unread)
    {
      countUnread(source, event.offset, limits.search, trial);
      break;
    }
    countEvent(source, event, trial);
    if (isBehindForGood(trial, limits, source.size()))
    {
      trial.givenUpFor = limits.better->form;
      trial.signature = ~limits.better->signature;
      break;
    }
    if (source.bytesRead() - readBefore > kMaxRead && trial.nodes > 16)
    {
      break;
    }
  }
  trial.extras = walker.stringsWithExtra();
  trial.plainStrings = walker.stringsWithoutExtra();
  return trial;
}

bool isUsualRoot(const TAVHeader& root)
{
  return Prober::isNamed(elmOf(root)) && (infoOf(root) & ~kUsualInfo) == 0 &&
         (isSizeUnknown(root) || sizeOf(root) < kHugeSize);
}

bool readRoot(const Prober& prober, uint64_t offset, bool wide, uint64_t limit, TAVHeader& root)
{
  return prober.header(offset, wide, limit, root) && isGroup(root) &&
         (is64(root) || typeOf(root) == TAV_TYPE_HEADER32);
}

RootBelief judgeRoot(ByteSource& source, const Form& form)
{
  const Prober prober(source, form, 0);
  TAVHeader root{};
  if (!readRoot(prober, 0, form.root64, source.size(), root))
  {
    return RootBelief::none;
  }
  const bool usual = isUsualRoot(root);
  const uint64_t end = addSaturated(headerLength(root.hdrType), sizeOf(root));
  const uint64_t off = std::max(end, source.size()) - std::min(end, source.size());
  const bool exact = sizeOf(root) != 0 && off <= 16 + source.size() / 16;
  return !usual ? RootBelief::fits : exact ? RootBelief::exact
                                           : RootBelief::usual;
}

} // namespace tav::inspect
