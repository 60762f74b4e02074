#include "tav/inspect/recover.hpp"

#include "inspect/recover/rebuild.h"
#include "inspect/recover/recovery.h"
#include "inspect/walk/progressSteps.h"

namespace tav::inspect
{

RecoveryTotals recover(ByteSource& source, const Form& form, PatchFile& out, const RecoverOptions& options)
{
  ProgressSteps progress(options.progress);
  const auto at = [&](uint64_t offset) { progress.at(offset); };
  Rebuilder rebuilder(source, form, out, at);
  const auto loss = [&](const Loss& lost) {
    if (options.lost)
    {
      options.lost(lost);
    }
  };
  const auto doubt = [&](const Doubt& doubted) {
    if (options.doubted)
    {
      options.doubted(doubted);
    }
  };
  Recovery recovery(source, form, rebuilder, options.search, {.loss = loss, .doubt = doubt},
                    options.threads);
  while (recovery.step())
  {
    at(recovery.position());
  }
  return recovery.totals();
}

} // namespace tav::inspect
