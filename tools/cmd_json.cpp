// tav json: the stream as JSON that loses nothing.
#include "tools/json_writer.h"
#include "tools/options.h"
#include "tools/output.h"
#include "tools/progress.h"
#include "tools/report.h"
#include "tools/session.h"

namespace tav::tool
{

namespace
{

JsonStyle styleOf(const Invocation& invocation)
{
  if (invocation.has("--lines") && invocation.has("--compact"))
  {
    throw Failure("json: --lines and --compact exclude each other");
  }
  return invocation.has("--lines") ? JsonStyle::lines : invocation.has("--compact") ? JsonStyle::compact
                                                                                    : JsonStyle::readable;
}

int run(const Invocation& invocation)
{
  const JsonStyle style = styleOf(invocation);
  Output out(invocation.text("--output", "-"), invocation.has("--force"));
  // Also what is no stream at all is handed out: as damaged bytes.
  Stream stream = openStream(invocation, true);
  Walker walker(stream.bytes(), stream.form());
  Progress progress("json", stream.bytes());
  JsonWriter writer(stream.bytes(), stream.form(), out, style, invocation.has("--safe"));
  writer.begin();
  Event event;
  if (!stream.isStream() && stream.bytes().size() != 0)
  {
    event.what = What::damaged;
    event.length = stream.bytes().size();
    event.reason = noStream(stream).sentence;
    writer.add(walker, event);
  }
  DamageNotices notices(stream);
  while (stream.isStream() && walker.next(event))
  {
    notices.see(walker, event);
    progress.at(event.offset);
    writer.add(walker, event);
  }
  writer.end();
  out.commit();
  tellStatistics(invocation, stream.bytes());
  if (!stream.isStream())
  {
    Problem problem = noStream(stream);
    problem.sentence += stream.bytes().size() == 0 ? "" : "; all bytes are given as they are";
    report(problem);
    return kTooDamaged;
  }
  return notices.tell();
}

const Registration registration{{
    .place = 60,
    .name = "json",
    .arguments = "FILE",
    .summary = "the stream as JSON that loses nothing",
    .description =
        "Every byte of the file can be made again from the JSON: 'tav json X | tav build -o Y' gives the bytes\n"
        "of X, damaged parts included. Numbers, texts and dates are values where that is exactly\n"
        "reversible; other bytes are hexadecimal. share/doc/tav-tools/json.md describes every key. Exit\n"
        "status 1: some bytes are no node; 3: nothing in the file is one.\n\n"
        "With --lines the first line is the form, and every node, or damaged part, is an object in a line\n"
        "of its own with path, offset and depth, for jq and grep; 'tav build' reads that, too.",
    .options = {{.names = "-o,--output",
                 .kind = ValueKind::file,
                 .value = "FILE",
                 .help = "where to; standard output unless given"},
                {.names = "--lines", .help = "one object a node, each in its own line"},
                {.names = "--compact", .help = "no blanks and line breaks"},
                {.names = "--safe", .help = "whole numbers beyond 2^53 as texts, for readers that keep doubles"}},
    .examples = {{"tav json x.tav | jq '.. | objects | select(.element == \"hostName\") | .value'", "every host name"},
                 {"tav json x.tav --lines | jq -r 'select(.value == 8) | .path'", "where an 8 stands"},
                 {"tav json x.tav | tav build -o y.tav", "the same bytes again"}},
    .run = run,
}};

} // namespace

} // namespace tav::tool
