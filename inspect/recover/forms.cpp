#include "inspect/recover/forms.h"

#include <span>
#include <utility>

#include "inspect/recover/rebuild.h"
#include "inspect/walk/progressSteps.h"

namespace tav::inspect
{

namespace
{

void copy(PatchFile& from, PatchFile& to)
{
  std::vector<uint8_t> piece(size_t{64} * 1024);
  for (uint64_t at = 0; at < from.length();)
  {
    const size_t count = from.read(at, piece);
    to.append(std::span<const uint8_t>(piece).first(count));
    at += count;
  }
}

} // namespace

bool Account::keepsMoreThan(const Account& other) const
{
  const RecoveryTotals& theirs = other.totals;
  if (form.swapped == other.form.swapped && form.root64 == other.form.root64)
  {
    return totals.nodes + theirs.losses > theirs.nodes + totals.losses;
  }
  const auto weight = [](const RecoveryTotals& of) {
    return static_cast<double>(of.nodes) * static_cast<double>(of.kept);
  };
  return weight(totals) != weight(theirs) ? weight(totals) > weight(theirs) : totals.made < theirs.made;
}

bool Account::isLike(const Account& other) const
{
  return written == other.written && totals.nodes == other.totals.nodes && totals.kept == other.totals.kept &&
         totals.losses == other.totals.losses;
}

Account FormRecovery::recoverAs(const Form& form, PatchFile& file)
{
  Account account;
  account.form = form;
  Rebuilder rebuilder(source_, form, file, reading_);
  const auto keep = [&](auto& list, const auto& entry) {
    if (list.size() < listed_)
    {
      list.push_back(entry);
    }
  };
  Recovery recovery(source_, form, rebuilder, search_,
                    {.loss = [&](const Loss& loss) { keep(account.losses, loss); },
                     .doubt = [&](const Doubt& doubt) { keep(account.doubts, doubt); }},
                    threads_);
  while (recovery.step())
  {
    reading_(recovery.position());
  }
  account.totals = recovery.totals();
  account.bytes = source_.size();
  account.written = file.length();
  return account;
}

void FormRecovery::tryForm(const Form& form)
{
  auto file = std::make_unique<Draft>(makeFile_());
  Account account = recoverAs(form, file->file);
  if (best_ != nullptr && account.isLike(outcome_.taken))
  {
    return;
  }
  if (best_ == nullptr || account.keepsMoreThan(outcome_.taken))
  {
    std::swap(best_, file);
    std::swap(outcome_.taken, account);
  }
  if (file != nullptr)
  {
    others_.push_back(std::move(account));
  }
}

/// The best of those with another byte order or width; else of those with another padding.
void FormRecovery::chooseOther()
{
  const auto differs = [&](const Account& account) {
    return account.form.swapped != outcome_.taken.form.swapped || account.form.root64 != outcome_.taken.form.root64;
  };
  for (Account& account : others_)
  {
    const bool first = !outcome_.other || differs(account) > differs(*outcome_.other);
    if (first || (differs(account) == differs(*outcome_.other) && account.keepsMoreThan(*outcome_.other)))
    {
      outcome_.other = std::move(account);
    }
  }
}

Outcome FormRecovery::run(const Recognition& found, PatchFile& file)
{
  outcome_.alternatives = found.alternatives;
  std::vector<Form> forms = found.possible;
  if (found.isStream || forms.empty())
  {
    std::erase(forms, found.form);
    forms.insert(forms.begin(), found.form);
  }
  if (forms.size() == 1)
  {
    outcome_.taken = recoverAs(forms.front(), file);
    return std::move(outcome_);
  }
  for (const Form& form : forms)
  {
    if (best_ == nullptr || !outcome_.taken.lostNothing())
    {
      tryForm(form);
    }
  }
  chooseOther();
  copy(best_->file, file);
  best_.reset();
  return std::move(outcome_);
}

Outcome recoverBest(ByteSource& source, const Recognition& found, PatchFile& out, const RecoverBestOptions& options)
{
  ProgressSteps progress(options.progress);
  const auto reading = [&](uint64_t offset) { progress.at(offset); };
  return FormRecovery(source, options.search, options.listed, options.makeFile, reading, options.threads)
      .run(found, out);
}

} // namespace tav::inspect
