/// @file forms.h
/// Recovers a file in the form that brings back most of it.
#pragma once

#include <cstdint>
#include <deque>
#include <functional>
#include <memory>
#include <optional>
#include <vector>

#include "inspect/recover/recovery.h"
#include "tav/inspect/form.hpp"
#include "tav/inspect/patchFile.hpp"
#include "tav/inspect/recover.hpp"
#include "tav/inspect/scratch.hpp"
#include "tav/inspect/source.hpp"

namespace tav::inspect
{

/// Where the start of a file is damaged, nothing but the outcome shows the form: all that are not refuted are tried,
/// and the one that keeps most is taken; of equals the likelier one. Behind a sound start, the next likely one is tried
/// where it is not far off.
class FormRecovery
{
public:
  /// `search`: bytes that may be searched for nodes in each form. `listed`: losses that are kept, and doubts.
  /// `makeFile` makes a file for each form that is tried. `reading` is told where the file is read.
  FormRecovery(ByteSource& source, uint64_t search, size_t listed, ScratchMaker makeFile,
               std::function<void(uint64_t)> reading, unsigned threads)
      : source_(source), search_(search), listed_(listed), makeFile_(std::move(makeFile)), reading_(std::move(reading)),
        threads_(threads)
  {
  }

  /// Writes what came back into `file`.
  Outcome run(const Recognition& found, PatchFile& file);

private:
  /// What a way has saved, in a file of its own.
  struct Draft
  {
    explicit Draft(std::unique_ptr<Scratch> made)
        : scratch(std::move(made)), file(scratch->file()) {}

    std::unique_ptr<Scratch> scratch;
    PatchFile file;
  };

  Account recoverAs(const Form& form, PatchFile& file);
  void tryForm(const Form& form);
  void chooseOther();

  ByteSource& source_;
  uint64_t search_;
  size_t listed_;
  ScratchMaker makeFile_;
  std::function<void(uint64_t)> reading_;
  unsigned threads_; ///< that search for eye catchers
  Outcome outcome_{};
  std::vector<Account> others_{}; ///< of the ways that were not taken
  std::unique_ptr<Draft> best_{}; ///< what the way that was taken so far has saved
};

} // namespace tav::inspect
