// tav cat: several streams as one.
#include <algorithm>

#include "tav/inspect.hpp"
#include "tools/shell/options.h"
#include "tools/shell/output.h"
#include "tools/shell/progress.h"
#include "tools/shell/report.h"
#include "tools/shell/session.h"
#include "tools/shell/streamOutput.h"

namespace tav::tool
{

namespace
{

int run(const Invocation& invocation)
{
  const std::string output = requireStreamOutput(invocation);
  const std::vector<std::string>& names = invocation.arguments();
  if (std::count(names.begin(), names.end(), "-") > 1)
  {
    throw Failure("cat: only one of the files can be standard input");
  }
  Output out(output, invocation.has("--force"));
  StreamOutput file(out);
  Collector collector(file.bytes(), {.form = formChoice(invocation)});
  Status status = kFine;
  for (const std::string& name : names)
  {
    Stream stream = openStream(invocation, name, invocation.number("--from").value_or(0), FormChoice{});
    DamageNotices notices(stream);
    {
      Progress progress("cat " + stream.source->name(), stream.bytes());
      collector.add(stream.bytes(), stream.form(), [&](const Walker& walker, const Event& event) {
        progress.at(event.offset);
        notices.see(walker, event);
      });
    }
    tellStatistics(invocation, stream.bytes());
    status = std::max(status, notices.tell());
  }
  collector.finish();
  file.finish();
  return status;
}

const Registration registration{{
    .place = 86,
    .name = "cat",
    .arguments = "FILE...",
    .inputs = ~size_t{0},
    .summary = "several streams as one, of one form",
    .description =
        "Writes the roots of all FILEs, one behind the other, as one stream in the form of the first one, unless\n"
        "--byte-order, --root, --align or --no-align ask for another. The forms of the FILEs are recognised.\n"
        "Values and nodes stay as they are ('tav diff' finds no difference); padding and pairs are made anew, and\n"
        "zeros between the streams and behind them are dropped. Where a FILE has damaged bytes, they are left out,\n"
        "which is told on standard error with exit status 1. A FILE that is no stream ends it with 3; then nothing is\n"
        "written, and an OUT that is there stays as it was.",
    .options = {{.names = "-o,--output",
                 .kind = ValueKind::file,
                 .value = "OUT",
                 .help = "where the new stream goes; - is standard output",
                 .required = true},
                {.names = "--byte-order",
                 .kind = ValueKind::choice,
                 .value = "ORDER",
                 .help = "write OUT in this byte order",
                 .choices = {"native", "swapped", "little", "big"}},
                {.names = "--root",
                 .kind = ValueKind::choice,
                 .value = "BITS",
                 .help = "width of the headers of OUT's roots; those below a root follow where that changes it",
                 .choices = {"32", "64"}},
                {.names = "--align", .help = "pad the payloads of OUT to multiples of 8"},
                {.names = "--no-align", .help = "do not pad the payloads of OUT"}},
    .concerns = kInput | kCalls | kNames,
    .examples = {{"tav cat monday.tav tuesday.tav -o both.tav", "one file of two"},
                 {"tav cat x.tav --byte-order big --align -o y.tav", "the same stream in another form"}},
    .run = run,
}};

} // namespace

} // namespace tav::tool
