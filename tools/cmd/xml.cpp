// tav xml: the stream as well-formed XML.
#include <utility>

#include "tav/inspect.hpp"
#include "tools/shell/options.h"
#include "tools/shell/output.h"
#include "tools/shell/progress.h"
#include "tools/shell/report.h"
#include "tools/shell/session.h"

namespace tav::tool
{

namespace
{

int run(const Invocation& invocation)
{
  Output out(invocation.text("--output", "-"), invocation.has("--force"));
  Stream stream = openStream(invocation);
  Progress progress("xml", stream.bytes());
  DamageNotices notices(stream);
  toXml(stream.bytes(), stream.form(), out,
        {.ends = invocation.has("--ends"),
         .passedOver = [&](PassedOver passed) { notices.add(std::move(passed)); },
         .progress = [&](uint64_t offset) { progress.at(offset); }});
  out.commit();
  tellStatistics(invocation, stream.bytes());
  return notices.tell();
}

const Registration registration{{
    .place = 70,
    .name = "xml",
    .arguments = "FILE",
    .summary = "the stream as well-formed XML",
    .description =
        "One XML element a node, named by its tag; <element id=\"12345\"> where the tag is unknown or not unique.\n"
        "Texts are escaped; what XML cannot hold (control characters, bytes that are no UTF-8) and binary values\n"
        "are hexadecimal, with encoding=\"hex\". Damaged bytes stand in <damaged> with the reason; then the exit\n"
        "status is 1. Elements that only end a group are left out. Readers with limits may have to be told of deep\n"
        "streams, as in 'xmllint --huge'. 'tav json' is the form that keeps every byte.",
    .options = {{.names = "-o,--output",
                 .kind = ValueKind::file,
                 .value = "FILE",
                 .help = "where to; standard output unless given"},
                {.names = "--ends", .help = "also elements that only end a group"}},
    .examples = {{"tav xml x.tav -o x.xml", "write it to a file"},
                 {"tav xml x.tav | xmllint --xpath '//hostName/text()' -", "every host name"}},
    .run = run,
}};

} // namespace

} // namespace tav::tool
