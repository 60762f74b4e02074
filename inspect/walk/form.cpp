#include "tav/inspect/form.hpp"

#include <algorithm>
#include <limits>
#include <list>

#include "inspect/walk/order.h"
#include "inspect/walk/prober.h"
#include "inspect/walk/reasons.h"
#include "inspect/walk/trial.h"

namespace tav::inspect
{

using namespace tav::layout;

namespace
{

constexpr uint64_t kMaxSearch = uint64_t{128} * 1024; ///< bytes looked through for nodes where the first one is whole
constexpr uint64_t kMaxSearchDamaged = uint64_t{4} * 1024 * 1024;

constexpr uint64_t kNoRoot = 100; ///< no root's header at the start, where another way has a usual one
constexpr double kDoubt = 8;      ///< ways that differ by no more are about as good
constexpr double kNear = 100;     ///< and worth a second look when they differ by no more

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
  putFewInOrder(trials, [](const Trial& a, const Trial& b) {
    return (a.nodes != 0) != (b.nodes != 0) ? a.nodes != 0
           : a.sureness() != b.sureness()   ? a.sureness() > b.sureness()
                                            : a.rate() < b.rate();
  });
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

/// How much of the trials is made.
enum class Effort : uint8_t
{
  needed, ///< what can change what is told of the file
  whole
};

/// The ways in the order in which they are tried: first those with the padding that the root's header announces.
std::vector<Form> likelyFirst(ByteSource& source, const std::vector<Form>& forms)
{
  std::vector<Form> ordered;
  std::vector<Form> others;
  for (const Form& form : forms)
  {
    TAVHeader root{};
    const Prober prober(source, form, 0);
    const bool likely = readRoot(prober, 0, form.root64, source.size(), root) &&
                        form.aligned == ((infoOf(root) & TAV_INFO_ALIGNED8) != 0);
    (likely ? ordered : others).push_back(form);
  }
  for (const Form& form : others)
  {
    ordered.push_back(form);
  }
  return ordered;
}

/// Whether other ways may be given up for one: nothing is damaged on it, and its start is sound. Of the others, it then
/// counts only whether they find the same, and how far they are behind.
bool canRefute(ByteSource& source, const Trial& trial)
{
  return trial.nodes != 0 && trial.damages == 0 && isStartSound(source, trial);
}

/// Tries ways, and counts against them that they find no root at the start where there is a good one. With
/// Effort::needed, a way is given up once one that was tried before is certain to be better by far.
void tryForms(ByteSource& source, const std::vector<Form>& forms, uint64_t search, RootBelief best, Effort effort,
              std::vector<Trial>& trials)
{
  std::list<Trial> tried; // whose members stay where they are
  const Trial* better = nullptr;
  if (!trials.empty() && effort == Effort::needed && canRefute(source, trials.front()))
  {
    better = &trials.front();
  }
  for (const Form& form : likelyFirst(source, forms))
  {
    const RootBelief root = judgeRoot(source, form);
    const bool behind = better != nullptr && surenessOf(root) <= better->sureness();
    tried.push_back(tryForm(source, form, {.search = search, .better = behind ? better : nullptr, .far = kNear}));
    Trial& trial = tried.back();
    trial.root = root;
    trial.cost += best >= RootBelief::usual && root < RootBelief::usual ? kNoRoot : 0;
    if (effort == Effort::needed && better == nullptr && canRefute(source, trial))
    {
      better = &trial;
    }
  }
  for (const Form& form : forms)
  {
    const auto found = std::find_if(tried.begin(), tried.end(), [&](const Trial& one) { return one.form == form; });
    trials.push_back(*found);
  }
  sortTrials(trials);
}

/// Ways in which the first bytes are a root's header come first. The others are tried where none of these goes without
/// damage; beside a root that ends where the file does, they count for nothing.
std::vector<Trial> tryAll(ByteSource& source, const FormChoice& choice, Effort effort)
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
  tryForms(source, fitting, kMaxSearch, best, effort, trials);
  if (trials.empty() || trials.front().nodes == 0)
  {
    trials.clear();
    tryForms(source, candidates(choice), kMaxSearchDamaged, best, effort, trials);
  }
  else if (trials.front().cost >= kDamage && (effort == Effort::whole || !trials.front().isExact()))
  {
    tryForms(source, others, kMaxSearch, best, effort, trials);
  }
  return trials;
}

/// As tryAll(), with no more effort than changes nothing: a way that was given up has to be behind the one that turns
/// out to be the best.
std::vector<Trial> tryNeeded(ByteSource& source, const FormChoice& choice)
{
  std::vector<Trial> trials = tryAll(source, choice, Effort::needed);
  const bool isSound = std::all_of(trials.begin(), trials.end(), [&](const Trial& trial) {
    return !trial.givenUpFor || *trial.givenUpFor == trials.front().form;
  });
  return isSound ? trials : tryAll(source, choice, Effort::whole);
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
    if (offset != 0 && readRoot(prober, offset, other.root64, source.size(), root) && isUsualRoot(root) &&
        prober.judge(offset, other.root64, source.size()) == Belief::followed)
    {
      return other;
    }
  }
  return std::nullopt;
}

namespace
{

Recognition judgeTrials(ByteSource& source, const FormChoice& choice, const std::vector<Trial>& trials)
{
  Recognition result;
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
  result.because = explainForm(trials, result, source.dictionary());
  return result;
}

} // namespace

Recognition recognise(ByteSource& source, const FormChoice& choice)
{
  return judgeTrials(source, choice, tryNeeded(source, choice));
}

Recognition recogniseByAll(ByteSource& source, const FormChoice& choice)
{
  return judgeTrials(source, choice, tryAll(source, choice, Effort::whole));
}

std::optional<Form> streamFormAt(ByteSource& source, const Form& form, uint64_t offset)
{
  constexpr uint64_t ringBytes = uint64_t{1} << 20U;
  const std::optional<Form> seen = otherStreamAt(source, form, offset);
  if (!seen)
  {
    return std::nullopt;
  }
  const auto behind = source.window(offset, ringBytes);
  const Recognition found = recognise(*behind, {.swapped = seen->swapped, .root64 = seen->root64});
  return found.isStream && !found.damagedStart && !found.ambiguous() ? found.form : *seen;
}

} // namespace tav::inspect
