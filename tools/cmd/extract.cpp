// tav extract: subtrees as a stream of their own.
#include "tav/inspect.hpp"
#include "tools/shell/dictionary.h"
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
  const Path path = pathOf(invocation.arguments().at(1), dictionaryFor(invocation, invocation.arguments().at(0)));
  Stream stream = openStream(invocation);
  DamageNotices notices(stream);
  try
  {
    Output out(output, invocation.has("--force"));
    StreamOutput file(out);
    Progress progress("extract", stream.bytes());
    Collector collector(file.bytes(), {.ownWidths = true});
    collector.addFound(stream.bytes(), stream.form(), path, [&](const Walker& walker, const Event& event) {
      progress.at(event.offset);
      notices.see(walker, event);
    });
    collector.finish();
    file.finish();
  }
  catch (const Error&)
  {
    notices.tell(); // which may be why nothing was found
    throw;
  }
  tellStatistics(invocation, stream.bytes());
  return notices.tell();
}

const Registration registration{{
    .place = 84,
    .name = "extract",
    .arguments = "FILE PATH",
    .summary = "subtrees as a stream of their own",
    .description =
        "Writes the groups that PATH leads to as the roots of a new stream, one behind the other, in the byte order\n"
        "and with the padding of FILE. Of groups inside one another the outermost is taken. A group with a 32-bit\n"
        "header becomes a root with one. Values and nodes stay as they are; zeros and damaged bytes are left out,\n"
        "which is told on standard error with exit status 1. Exit status 1 also: PATH leads nowhere; 2: it leads to\n"
        "a node that is no group. Then no file is written, and one that is there stays as it was.",
    .options = {{.names = "-o,--output",
                 .kind = ValueKind::file,
                 .value = "OUT",
                 .help = "where the new stream goes; - is standard output",
                 .required = true}},
    .examples = {{"tav extract x.tav /system/host -o host.tav", "every host, each a root"},
                 {"tav extract week.tav '/system[3]' -o wednesday.tav", "one snapshot of many"}},
    .run = run,
}};

} // namespace

} // namespace tav::tool
