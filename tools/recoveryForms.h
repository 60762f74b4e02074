/// @file recoveryForms.h
/// Recovers a file in the form that brings back most of it.
#pragma once

#include <cstdint>
#include <deque>
#include <functional>
#include <memory>
#include <optional>
#include <vector>

#include "tools/build_file.h"
#include "tools/form.h"
#include "tools/recovery.h"
#include "tools/source.h"

namespace tav::tool
{

/// What came of one way of reading.
struct Account
{
  Form form{};
  RecoveryTotals totals{};
  std::deque<Loss> losses{};  ///< the first of them; the totals count all
  std::deque<Doubt> doubts{}; ///< likewise
  uint64_t bytes = 0;
  uint64_t written = 0;

  bool lostNothing() const { return totals.lost + totals.unread == 0; }
  /// Of ways that differ in the padding alone, the one with more nodes and fewer gaps: with padding, damaged bytes are
  /// taken for some. Of others the one with more nodes and more bytes: the wrong width finds many headers without
  /// payloads, a wrong size many bytes in a few nodes; of equals the one with fewer made groups.
  bool keepsMoreThan(const Account& other) const;
  /// Whether another way found the same.
  bool isLike(const Account& other) const;
};

/// The way that was taken, and the best of the others that were tried where it was in doubt.
struct Outcome
{
  Account taken{};
  std::optional<Account> other{};
  std::vector<Form> alternatives{}; ///< that were about as likely at the first look
};

/// Where the start of a file is damaged, nothing but the outcome tells the form: all that are not refuted are tried,
/// and the one that keeps most is taken; of equals the likelier one. Behind a sound start, the next likely one is tried
/// where it is not far off.
class FormRecovery
{
public:
  /// `search`: bytes that may be searched for nodes in each form. `listed`: losses that are kept, and doubts. `reading`
  /// is told where the file is read.
  FormRecovery(ByteSource& source, uint64_t search, size_t listed, std::function<void(uint64_t)> reading)
      : source_(source), search_(search), listed_(listed), reading_(std::move(reading))
  {
  }

  /// Writes what came back into `file`.
  Outcome run(const Recognition& found, PatchFile& file);

private:
  Account recoverAs(const Form& form, PatchFile& file);
  void tryForm(const Form& form);
  void chooseOther();

  ByteSource& source_;
  uint64_t search_;
  size_t listed_;
  std::function<void(uint64_t)> reading_;
  Outcome outcome_{};
  std::vector<Account> others_{};     ///< of the ways that were not taken
  std::unique_ptr<PatchFile> best_{}; ///< what the way that was taken so far has saved
};

} // namespace tav::tool
