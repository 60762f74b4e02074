// tav build: a stream from JSON.
#include <cstdio>

#include "tav/inspect.hpp"
#include "tools/host/host.h"
#include "tools/shell/dictionary.h"
#include "tools/shell/input.h"
#include "tools/shell/options.h"
#include "tools/shell/output.h"
#include "tools/shell/report.h"
#include "tools/shell/session.h"
#include "tools/shell/streamOutput.h"

namespace tav::tool
{

namespace
{

Conversion conversionOf(const Invocation& invocation)
{
  const FormChoice choice = formChoice(invocation);
  const std::string input = invocation.arguments().empty() ? "-" : invocation.arguments().front();
  return {choice.swapped, choice.root64, choice.aligned, invocation.has("--eye-size"),
          dictionaryFor(invocation, input)};
}

int run(const Invocation& invocation)
{
  const std::string input = invocation.arguments().empty() ? "-" : invocation.arguments().front();
  const std::string output = invocation.text("--output", "-");
  if (isStandardOutput(output) && host::isTerminal(stdout))
  {
    throw Failure("build: a stream is no text for a terminal", "-o FILE writes it to a file");
  }
  const Conversion conversion = conversionOf(invocation);
  const std::unique_ptr<TextSource> text = openText(input);
  Output out(output, invocation.has("--force"));
  StreamOutput file(out);
  const LeftOut leftOut = fromJson(*text, file.bytes(), conversion);
  file.finish();
  if (leftOut.places != 0)
  {
    report(Problem{.file = text->name(),
                   .sentence = counted(leftOut.places, "damaged place") + " of " + byteText(leftOut.bytes) +
                               " left out: what is no node cannot be converted",
                   .hint = "without --byte-order, --root, --align and --eye-size they are kept as they are"});
    return kFindings;
  }
  return kFine;
}

const Registration registration{{
    .place = 80,
    .name = "build",
    .arguments = "[JSON]",
    .summary = "a stream from JSON",
    .description =
        "Makes the stream that a document of 'tav json' describes, byte for byte; standard input unless JSON is\n"
        "given. Documents can be written by hand: names of elements with their values suffice, as in\n"
        "{\"system\": {\"host\": {\"hostName\": \"ada\", \"cpuOnline\": 8}}}; an array stands for several elements\n"
        "of the name; types are chosen from the values; keys with $ are properties ($type, $eyeSize).\n"
        "share/doc/tav-tools/json.md describes every key.\n\n"
        "--byte-order, --root, --align, --no-align and --eye-size convert: then sizes, pairs and paddings are\n"
        "made anew, and what is no node is left out, with exit status 1.",
    .options = {{.names = "-o,--output",
                 .kind = ValueKind::file,
                 .value = "FILE",
                 .help = "where to; standard output unless given"},
                {.names = "--eye-size", .help = "end every node with an eye/size pair"}},
    .concerns = kForm | kNames,
    .examples = {{"tav json x.tav | tav build -o y.tav", "the same bytes again"},
                 {"tav json x.tav | tav build --byte-order big --align -o y.tav", "convert a stream"},
                 {"echo '{\"system\": {\"host\": {\"hostName\": \"ada\"}}}' | tav build -o x.tav", "a stream by hand"}},
    .run = run,
}};

} // namespace

} // namespace tav::tool
