#include "tav/inspect/form.hpp"

#include <algorithm>
#include <bit>
#include <limits>

#include "inspect/walk/prober.h"
#include "tav/inspect/path.hpp"
#include "tav/inspect/phrases.hpp"
#include "tav/inspect/value.hpp"
#include "tav/inspect/walker.hpp"

namespace tav::inspect
{

using namespace tav::layout;

namespace
{

constexpr uint64_t kMaxNodes = 2000;
constexpr uint64_t kMaxRead = uint64_t{512} * 1024;   ///< bytes fetched from the file for one way of reading
constexpr uint64_t kMaxSearch = uint64_t{128} * 1024; ///< bytes looked through for nodes where the first one is whole
constexpr uint64_t kMaxSearchDamaged = uint64_t{4} * 1024 * 1024;

// What speaks against a way of reading, in about the bits that chance needs to make it.
constexpr uint64_t kDamage = 50;                  ///< a place that is no node, or a header that no writer makes
constexpr uint64_t kRootNoGroup = 30;             ///< data outside of all groups
constexpr uint64_t kOverrunGroup = 20;            ///< the outermost group that claims more than there is
constexpr uint64_t kOtherRoot = 10;               ///< a root with other headers than the first should have
constexpr uint64_t kStrangeInfo = 12;             ///< bits in a root's header that writers leave clear
constexpr uint64_t kNoRoot = 100;                 ///< no root's header at the start, where another way has a usual one
constexpr uint64_t kOpenGroup = 2;                ///< a group that nothing ended
constexpr uint64_t kHugeSize = uint64_t{1} << 40; ///< that of no file
constexpr uint32_t kUsualInfo = TAV_INFO_EYE_SIZE | TAV_INFO_ALIGNED8;
constexpr double kDoubt = 8;  ///< ways that differ by no more are about as good
constexpr double kNear = 100; ///< and worth a second look when they differ by no more

enum class RootBelief : uint8_t
{
  none,
  fits,  ///< the file's first bytes can be a root's header
  usual, ///< and are as writers make it
  exact  ///< and say about how long the file is, which chance hardly does
};

/// What one way of reading the bytes finds in them.
struct Trial
{
  Form form{};
  RootBelief root = RootBelief::none;
  uint64_t nodes = 0;
  uint64_t named = 0; ///< nodes whose element is in the dictionary and whose size suits the type
  uint64_t groups = 0;
  uint64_t wide = 0;      ///< nodes with 64-bit headers
  uint64_t alignBits = 0; ///< of them, those that announce padding
  uint64_t paddings = 0;
  uint64_t eyes = 0;      ///< eye catchers in this byte order
  uint64_t otherEyes = 0; ///< and in the other one
  uint64_t extras = 0;
  uint64_t plainStrings = 0;
  uint64_t damages = 0;
  uint64_t extent = 1; ///< where the trial stopped
  uint64_t cost = 0;   ///< how much speaks against it
  uint64_t signature = 14695981039346656037u;
  uint64_t dataRoots = 0;    ///< nodes outside of all groups that were counted: data,
  uint64_t otherRoots = 0;   ///< and such with other headers than a root should have
  uint64_t overrunEnd = 0;   ///< where the last group that claimed too much said that it ends
  uint64_t overrunLimit = 0; ///< and where it had to end
  uint64_t otherAt = 0;      ///< where a stream in another form seems to begin; 0: nowhere
  Form otherForm{};
  Node first{};

  double rate() const { return static_cast<double>(cost) / static_cast<double>(extent); }
  bool isExact() const { return root == RootBelief::exact; }
  /// What the root alone says of the way: a header is hardly usual by chance, and damage far behind says nothing of it.
  RootBelief sureness() const { return root >= RootBelief::usual ? root : RootBelief::none; }
};

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

Trial tryForm(ByteSource& source, const Form& form, uint64_t search)
{
  Trial trial;
  trial.form = form;
  const uint64_t readBefore = source.bytesRead();
  Walker walker(source, form, {.budget = search});
  Event event;
  while (trial.nodes < kMaxNodes && walker.next(event))
  {
    if (event.what == What::unread)
    {
      countUnread(source, event.offset, search, trial);
      break;
    }
    countEvent(source, event, trial);
    if (source.bytesRead() - readBefore > kMaxRead && trial.nodes > 16)
    {
      break;
    }
  }
  trial.extras = walker.stringsWithExtra();
  trial.plainStrings = walker.stringsWithoutExtra();
  return trial;
}

/// Whether a root's header is as writers make it.
bool isUsual(const TAVHeader& root)
{
  return Prober::isNamed(elmOf(root)) && (infoOf(root) & ~kUsualInfo) == 0 &&
         (isSizeUnknown(root) || sizeOf(root) < kHugeSize);
}

bool readRoot(Prober& prober, uint64_t offset, bool wide, uint64_t limit, TAVHeader& root)
{
  return prober.header(offset, wide, limit, root) && isGroup(root) &&
         (is64(root) || typeOf(root) == TAV_TYPE_HEADER32);
}

RootBelief judgeRoot(ByteSource& source, const Form& form)
{
  Prober prober(source, form, 0);
  TAVHeader root{};
  if (!readRoot(prober, 0, form.root64, source.size(), root))
  {
    return RootBelief::none;
  }
  const bool usual = isUsual(root);
  const uint64_t end = addSaturated(headerLength(root.hdrType), sizeOf(root));
  const uint64_t off = std::max(end, source.size()) - std::min(end, source.size());
  const bool exact = sizeOf(root) != 0 && off <= 16 + source.size() / 16;
  return !usual ? RootBelief::fits : exact ? RootBelief::exact
                                           : RootBelief::usual;
}

std::vector<Form> candidates(const FormChoice& choice)
{
  std::vector<Form> forms;
  for (const bool swapped : {false, true})
  {
    for (const bool root64 : {true, false})
    {
      for (const bool aligned : {false, true})
      {
        if (choice.swapped.value_or(swapped) == swapped && choice.root64.value_or(root64) == root64 &&
            choice.aligned.value_or(aligned) == aligned)
        {
          forms.push_back({swapped, root64, aligned, false});
        }
      }
    }
  }
  return forms;
}

/// The likelier way first. The first of equals stays first: without padding before with padding.
void sortTrials(std::vector<Trial>& trials)
{
  std::stable_sort(trials.begin(), trials.end(), [](const Trial& a, const Trial& b) {
    return (a.nodes != 0) != (b.nodes != 0) ? a.nodes != 0
           : a.sureness() != b.sureness()   ? a.sureness() > b.sureness()
                                            : a.rate() < b.rate();
  });
}

/// Tries ways, and counts against them that they find no root at the start where there is a good one.
void tryForms(ByteSource& source, const std::vector<Form>& forms, uint64_t search, RootBelief best,
              std::vector<Trial>& trials)
{
  for (const Form& form : forms)
  {
    trials.push_back(tryForm(source, form, search));
    trials.back().root = judgeRoot(source, form);
    trials.back().cost += best >= RootBelief::usual && trials.back().root < RootBelief::usual ? kNoRoot : 0;
  }
  sortTrials(trials);
}

/// Ways in which the first bytes are a root's header come first. The others are tried where none of these goes without
/// damage.
std::vector<Trial> tryAll(ByteSource& source, const FormChoice& choice)
{
  std::vector<Form> fitting;
  std::vector<Form> others;
  RootBelief best = RootBelief::none;
  for (const Form& form : candidates(choice))
  {
    const RootBelief belief = judgeRoot(source, form);
    (belief != RootBelief::none ? fitting : others).push_back(form);
    best = std::max(best, belief);
  }
  std::vector<Trial> trials;
  tryForms(source, fitting, kMaxSearch, best, trials);
  if (trials.empty() || trials.front().nodes == 0)
  {
    trials.clear();
    tryForms(source, candidates(choice), kMaxSearchDamaged, best, trials);
  }
  else if (trials.front().cost >= kDamage)
  {
    tryForms(source, others, kMaxSearch, best, trials);
  }
  return trials;
}

/// By how much more speaks against another way than against the best one, over the bytes that both have looked at.
double margin(const Trial& best, const Trial& other)
{
  if (best.isExact() && !other.isExact())
  {
    return std::numeric_limits<double>::infinity();
  }
  return (other.rate() - best.rate()) * static_cast<double>(std::min(best.extent, other.extent));
}

/// Whether the first bytes say how to read the file: a usual root, and what is in it follows. The last 8 bytes of a
/// 64-bit header look like an empty 32-bit root.
bool isStartSound(ByteSource& source, const Trial& best)
{
  Prober prober(source, best.form, 0);
  return best.isExact() ||
         (best.first.offset() == 0 && best.root == RootBelief::usual && (best.form.root64 || best.first.size() != 0) &&
          (best.first.has(kOverrun) || prober.judge(0, best.form.root64, source.size()) == Belief::followed));
}

/// Whether eye catchers tell that the other byte order is the right one.
bool isOrderRefuted(const std::vector<Trial>& trials, bool swapped)
{
  constexpr uint64_t enough = 4;
  bool refuted = false;
  for (const Trial& trial : trials)
  {
    if (trial.form.swapped == swapped && trial.eyes != 0)
    {
      return false;
    }
    refuted = refuted || (trial.form.swapped != swapped && trial.eyes >= enough && trial.otherEyes == 0);
  }
  return refuted;
}

/// Whether the headers tell that payloads are padded, or that they are not. A few are found by chance.
bool isPaddingRefuted(const std::vector<Trial>& trials, const Form& form)
{
  constexpr uint64_t enough = 16;
  return std::any_of(trials.begin(), trials.end(), [&](const Trial& trial) {
    return trial.form.swapped == form.swapped && trial.form.root64 == form.root64 && trial.wide >= enough &&
           trial.wide > trial.nodes / 2 && trial.alignBits == (form.aligned ? 0 : trial.wide);
  });
}

Form formOf(const Trial& trial)
{
  Form form = trial.form;
  form.extra = trial.extras > trial.plainStrings;
  return form;
}

/// The ways that may be the right one where the start is damaged, the likeliest first, those together that differ in
/// the padding alone. One that finds no node in all of the file is refuted where another one finds some.
std::vector<Form> notRefuted(const ByteSource& source, const std::vector<Trial>& trials)
{
  std::vector<Form> forms;
  const bool found = !trials.empty() && trials.front().nodes != 0;
  for (const Trial& first : trials)
  {
    for (const Trial& trial : trials)
    {
      const Form form = formOf(trial);
      const bool together = form.swapped == first.form.swapped && form.root64 == first.form.root64;
      if (together && (trial.nodes != 0 || !found || trial.extent < source.size()) &&
          !isOrderRefuted(trials, form.swapped) && !isPaddingRefuted(trials, form) &&
          std::find(forms.begin(), forms.end(), form) == forms.end())
      {
        forms.push_back(form);
      }
    }
  }
  return forms;
}

void explainPadding(const std::vector<Trial>& trials, std::vector<Reason>& because)
{
  const Trial& best = trials.front();
  if (best.alignBits != 0)
  {
    because.push_back({std::to_string(best.alignBits) + " of " + counted(best.wide, "64-bit header") +
                       " announce padding to 8"});
    return;
  }
  if (best.wide != 0 && !best.form.aligned)
  {
    because.push_back({"no 64-bit header announces padding"});
    return;
  }
  const auto other = std::find_if(trials.begin(), trials.end(), [&](const Trial& t) {
    return t.form.swapped == best.form.swapped && t.form.root64 == best.form.root64 &&
           t.form.aligned != best.form.aligned;
  });
  if (other == trials.end())
  {
    return;
  }
  const bool same = other->signature == best.signature;
  because.push_back({same                ? "with and without padding to 8 the same nodes are found"
                     : best.form.aligned ? "nodes are found on the way only when payloads are padded to 8"
                                         : "nodes are found on the way only when payloads are not padded"});
}

std::vector<Reason> explain(const std::vector<Trial>& trials, const Recognition& result)
{
  const Trial& best = trials.front();
  std::vector<Reason> because;
  if (result.damagedStart)
  {
    because.push_back({"the first node is damaged; the first whole one is at " + hexOffset(best.first.offset())});
  }
  else
  {
    because.push_back({"the first header, read as " + std::string(best.form.root64 ? "64" : "32") + "-bit " +
                       orderText(best.form) + ", is that of a group, " + elementText(best.first.elm())});
  }
  because.push_back({std::to_string(best.named) + " of the first " + counted(best.nodes, "node") +
                     " have an element of the dictionary and a size that suits the type"});
  if (best.damages != 0)
  {
    because.push_back({counted(best.damages, "place") + " among them cannot be read in any way"});
  }
  if (best.eyes + best.otherEyes != 0)
  {
    because.push_back({counted(best.eyes, "eye catcher") + " in this byte order, " + std::to_string(best.otherEyes) +
                       " in the other"});
  }
  if (best.otherAt != 0)
  {
    because.push_back({"at " + hexOffset(best.otherAt) + " " + otherStreamText(best.otherForm), best.otherAt});
  }
  explainPadding(trials, because);
  if (best.extras + best.plainStrings != 0)
  {
    because.push_back({std::to_string(best.extras) + " of " + counted(best.extras + best.plainStrings, "UTF-8 string") +
                       " have two uncounted bytes behind them"});
  }
  return because;
}

} // namespace

std::optional<Form> otherStreamAt(ByteSource& source, const Form& form, uint64_t offset)
{
  // In this byte order, nodes with 32-bit headers stand below a 64-bit root as well.
  std::vector<Form> others = {{!form.swapped, true, form.aligned}, {!form.swapped, false, form.aligned}};
  if (!form.root64)
  {
    others.push_back({form.swapped, true, form.aligned});
  }
  for (const Form& other : others)
  {
    Prober prober(source, other, 0);
    TAVHeader root{};
    if (offset != 0 && readRoot(prober, offset, other.root64, source.size(), root) && isUsual(root) &&
        prober.judge(offset, other.root64, source.size()) == Belief::followed)
    {
      return other;
    }
  }
  return std::nullopt;
}

Recognition recognise(ByteSource& source, const FormChoice& choice)
{
  Recognition result;
  const std::vector<Trial> trials = tryAll(source, choice);
  if (trials.empty() || trials.front().nodes == 0)
  {
    result.possible = notRefuted(source, trials);
    result.form.swapped = choice.swapped.value_or(false);
    result.form.root64 = choice.root64.value_or(true);
    result.form.aligned = choice.aligned.value_or(false);
    result.because.push_back({source.size() == 0 ? "the file is empty"
                                                 : "no node is found, whichever way it is read"});
    return result;
  }
  const Trial& best = trials.front();
  result.isStream = true;
  result.form = formOf(best);
  result.damagedStart = best.first.offset() != 0;
  result.looked = best.extent;
  const bool soundStart = isStartSound(source, best);
  if (!soundStart)
  {
    result.possible = notRefuted(source, trials);
  }
  for (const Trial& other : trials)
  {
    if (other.nodes == 0 || other.signature == best.signature)
    {
      continue;
    }
    if (margin(best, other) <= kDoubt)
    {
      result.alternatives.push_back(other.form);
    }
    if (soundStart && best.cost >= kDamage && margin(best, other) <= kNear && result.possible.empty())
    {
      result.possible.push_back(formOf(other));
    }
  }
  result.because = explain(trials, result);
  return result;
}

} // namespace tav::inspect
