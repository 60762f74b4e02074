#include "tools/form.h"

#include <algorithm>

#include "tools/path.h"
#include "tools/report.h"
#include "tools/value.h"
#include "tools/walker.h"

namespace tav::tool
{

using namespace tav::layout;

namespace
{

constexpr uint64_t kMaxNodes = 2000;
constexpr uint64_t kMaxRead = uint64_t{512} * 1024;   ///< bytes fetched from the file for one way of reading
constexpr uint64_t kMaxSearch = uint64_t{128} * 1024; ///< bytes looked through for nodes where the first one is whole
constexpr uint64_t kMaxSearchDamaged = uint64_t{4} * 1024 * 1024;

/// What one way of reading the bytes finds in them.
struct Trial
{
  Form form{};
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
  Node first{};

  double rate() const { return static_cast<double>(cost) / static_cast<double>(extent); }
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

void countNode(ByteSource& source, const Node& node, Trial& trial)
{
  const bool named = Prober::isNamed(node.elm());
  trial.first = trial.nodes++ == 0 ? node : trial.first;
  trial.groups += node.isGroup() ? 1 : 0;
  trial.named += named && suitsType(node) ? 1 : 0;
  mix(trial.signature, node.offset());
  mix(trial.signature, node.size() ^ (uint64_t{node.elm()} << 48) ^ (uint64_t{node.type()} << 32));
  trial.cost += (named ? 0 : 2) + (suitsType(node) ? 0 : 8) + (node.has(kOverrun) ? 20 : 0) +
                (node.has(kNoPair) || node.has(kBadPair) ? 10 : 0) + (node.depth == 0 && !node.isGroup() ? 30 : 0);
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
    trial.cost += 50 + event.length;
    mix(trial.signature, event.offset);
    mix(trial.signature, ~event.length);
    break;
  default: break;
  }
}

Trial tryForm(ByteSource& source, const Form& form, uint64_t search)
{
  Trial trial;
  trial.form = form;
  const uint64_t readBefore = source.bytesRead();
  Walker walker(source, form, {.budget = search});
  Event event;
  while (trial.nodes < kMaxNodes && walker.next(event) && event.what != What::unread)
  {
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

/// Whether the file's first bytes can be a root's header.
bool rootFits(ByteSource& source, const Form& form)
{
  Prober prober(source, form, 0);
  TAVHeader root{};
  return prober.header(0, form.root64, source.size(), root) && isGroup(root) &&
         (is64(root) || typeOf(root) == TAV_TYPE_HEADER32);
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

std::vector<Trial> tryAll(ByteSource& source, const FormChoice& choice)
{
  std::vector<Trial> trials;
  for (const Form& form : candidates(choice))
  {
    if (rootFits(source, form))
    {
      trials.push_back(tryForm(source, form, kMaxSearch));
    }
  }
  if (std::none_of(trials.begin(), trials.end(), [](const Trial& t) { return t.nodes > 0; }))
  {
    trials.clear();
    for (const Form& form : candidates(choice))
    {
      trials.push_back(tryForm(source, form, kMaxSearchDamaged));
    }
  }
  // The first of equals stays first: without padding before with padding.
  std::stable_sort(trials.begin(), trials.end(), [](const Trial& a, const Trial& b) {
    return (a.nodes != 0) != (b.nodes != 0) ? a.nodes != 0 : a.rate() < b.rate();
  });
  return trials;
}

void explainPadding(const std::vector<Trial>& trials, std::vector<std::string>& because)
{
  const Trial& best = trials.front();
  if (best.alignBits != 0)
  {
    because.push_back(std::to_string(best.alignBits) + " of " + counted(best.wide, "64-bit header") +
                      " announce padding to 8");
    return;
  }
  if (best.wide != 0 && !best.form.aligned)
  {
    because.emplace_back("no 64-bit header announces padding");
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
  because.emplace_back(same                ? "with and without padding to 8 the same nodes are found"
                       : best.form.aligned ? "nodes are found on the way only when payloads are padded to 8"
                                           : "nodes are found on the way only when payloads are not padded");
}

std::vector<std::string> explain(const std::vector<Trial>& trials, const Recognition& result)
{
  const Trial& best = trials.front();
  std::vector<std::string> because;
  if (result.damagedStart)
  {
    because.push_back("the first node is damaged; the first whole one is at " + hexOffset(best.first.offset()));
  }
  else
  {
    because.push_back("the first header, read as " + std::string(best.form.root64 ? "64" : "32") + "-bit " +
                      orderText(best.form) + ", is that of a group, " + elementText(best.first.elm()));
  }
  because.push_back(std::to_string(best.named) + " of the first " + counted(best.nodes, "node") +
                    " have an element of the dictionary and a size that suits the type");
  if (best.damages != 0)
  {
    because.push_back(counted(best.damages, "place") + " among them cannot be read in any way");
  }
  if (best.eyes + best.otherEyes != 0)
  {
    because.push_back(counted(best.eyes, "eye catcher") + " in this byte order, " + std::to_string(best.otherEyes) +
                      " in the other");
  }
  explainPadding(trials, because);
  if (best.extras + best.plainStrings != 0)
  {
    because.push_back(std::to_string(best.extras) + " of " + counted(best.extras + best.plainStrings, "UTF-8 string") +
                      " have two uncounted bytes behind them");
  }
  return because;
}

} // namespace

Recognition recognise(ByteSource& source, const FormChoice& choice)
{
  Recognition result;
  const std::vector<Trial> trials = tryAll(source, choice);
  if (trials.empty() || trials.front().nodes == 0)
  {
    result.form.swapped = choice.swapped.value_or(false);
    result.form.root64 = choice.root64.value_or(true);
    result.form.aligned = choice.aligned.value_or(false);
    result.because.emplace_back(source.size() == 0 ? "the file is empty"
                                                   : "no node is found, whichever way it is read");
    return result;
  }
  const Trial& best = trials.front();
  result.isStream = true;
  result.form = best.form;
  result.form.extra = best.extras > best.plainStrings;
  result.damagedStart = best.first.offset() != 0;
  result.looked = best.extent;
  for (const Trial& other : trials)
  {
    const bool asGood = other.nodes != 0 && other.rate() <= best.rate() * 1.02;
    if (asGood && other.signature != best.signature)
    {
      result.alternatives.push_back(other.form);
    }
  }
  result.because = explain(trials, result);
  return result;
}

std::string orderText(const Form& form)
{
  return form.swapped != kor::isLittleEndian ? "little-endian" : "big-endian";
}

std::string formText(const Form& form)
{
  return orderText(form) + ", " + (form.root64 ? "64" : "32") + "-bit root header, " +
         (form.aligned ? "padded to 8" : "not padded");
}

} // namespace tav::tool
