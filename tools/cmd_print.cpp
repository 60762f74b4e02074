// tav print: the library's own text or XML.
#include <cerrno>
#include <cstdio>
#include <memory>

#include "tools/locate.h"
#include "tools/options.h"
#include "tools/output.h"
#include "tools/path.h"
#include "tools/report.h"
#include "tools/session.h"
#include "tools/walker.h"

namespace tav::tool
{

namespace
{

struct CloseHandle
{
  void operator()(TAVHandle* handle) const { tavTermHandle(&handle); }
};
using Handle = std::unique_ptr<TAVHandle, CloseHandle>;

[[noreturn]] void fail(const Stream& stream, uint32_t code, const std::string& doing, std::string hint)
{
  Problem problem{stream.source->name()};
  problem.sentence = doing + ": " + std::string(codeSentence(code));
  problem.code = code;
  problem.hint = std::move(hint);
  throw Failure(kTooDamaged, problem);
}

Handle openHandle(const Invocation& invocation, Stream& stream)
{
  const Form& form = stream.form();
  const uint64_t options = TAV_OPT_READ | (form.root64 ? 0 : TAV_OPT_ROOT32);
  TAVInitParam param(&stream.bytes().storage(), options, ringBytes(invocation), 0,
                     form.swapped ? TAV_BYTE_ORDER_SWAPPED : uint8_t{0}, form.aligned ? uint8_t{1} : uint8_t{0});
  TAVHandle* handle = nullptr;
  if (const uint32_t code = tavInitHandle(&handle, &param); code != TAV_RC_OK)
  {
    fail(stream, code, "the library cannot open the stream", {});
  }
  return Handle(handle);
}

uint64_t printOptions(const Invocation& invocation)
{
  const auto bit = [&](const char* option, uint64_t value) { return invocation.has(option) ? value : 0; };
  return bit("--xml", TAV_PRINT_XML) | bit("--headers", TAV_PRINT_HEADERS) |
         bit("--descriptors", TAV_PRINT_DESCRIPTORS) | bit("--bare", TAV_PRINT_BARE) |
         bit("--attributes", TAV_PRINT_ATTRIBUTES | TAV_PRINT_XML) | TAV_PRINT_DATA;
}

/// Walks over what the library prints, for it may end at damage, or before a second stream, without a word. `event` is
/// the first of its events.
void seeRest(Walker& walker, Event& event, bool oneNode, DamageNotices& notices)
{
  const uint64_t base = event.depth;
  while (!(oneNode && event.what == What::nodeEnd && event.depth <= base) && walker.next(event))
  {
    notices.see(walker, event);
  }
}

/// Whether standard output took everything. Throws when not.
void checkOutput()
{
  errno = 0;
  const bool failed = std::fflush(stdout) != 0;
  const int error = errno;
  if (failed || std::ferror(stdout) != 0)
  {
    failAtStandardOutput(error);
  }
}

int run(const Invocation& invocation)
{
  Stream stream = openStream(invocation);
  TAVHeaderData start{};
  bool hasStart = false;
  bool group = true;
  Walker walker(stream.bytes(), stream.form());
  DamageNotices notices(stream);
  Event event;
  if (const auto at = invocation.number("--at"))
  {
    goToOffset(stream.bytes(), walker, event, *at, [&](const Event& seen) { notices.see(walker, seen); });
    start.header = event.node.header;
    group = event.node.isGroup();
    hasStart = true;
  }
  else
  {
    walker.next(event);
    notices.see(walker, event);
  }
  if (invocation.has("--bare") && event.node.isGroup())
  {
    throw Failure("print: " + walker.path(event, PathStyle::brief) +
                      " is a group, which has no value of its own for --bare",
                  "--at OFFSET leads to a node with a value: 'tav tree' lists offsets; 'tav get' finds it by path");
  }
  const Handle handle = openHandle(invocation, stream);
  if (hasStart)
  {
    const uint32_t code =
        tavReadNodeInt(0, handle.get(), start.header.nodeOffset, layout::is64(start.header), &start);
    if (code != TAV_RC_OK)
    {
      fail(stream, code, "the library cannot read the node",
           code == TAV_RC_DATA_TOO_LARGE ? "--ring 100M gives it more memory" : "");
    }
  }
  TAVPrintParam param{0, nullptr, 0, stdout};
  uint64_t printed = 0;
  const uint64_t options = printOptions(invocation) | (group ? TAV_PRINT_SUBTREE : 0);
  const uint32_t code = tavPrintSubtree(options, handle.get(), hasStart ? &start : nullptr, &param, &printed);
  if (!group)
  {
    std::fputc('\n', stdout); // a single value has no line end of its own
  }
  checkOutput();
  seeRest(walker, event, hasStart, notices);
  const Status status = notices.tell();
  if (code != TAV_RC_OK)
  {
    fail(
        stream, code, "the library's printer stopped after " + counted(printed, "character"),
        "it prints no UTF-8 strings, no Sint128, no unknown types and no damaged streams; 'tav tree' and 'tav xml' do");
  }
  tellStatistics(invocation, stream.bytes());
  return status;
}

const Registration registration{{
    .place = 40,
    .name = "print",
    .arguments = "FILE",
    .summary = "the library's own text or XML",
    .description =
        "What tavPrintSubtree makes of the stream, to the letter: its XML is not escaped, its dates are off by\n"
        "a day in some places, and it stops at the first node that it cannot print, with exit status 3.\n"
        "'tav tree', 'tav xml' and 'tav json' have none of these limits. Damage that it passes over, and streams\n"
        "behind the first in another form, are told on standard error; the exit status is then 1.",
    .options = {{.names = "--xml", .help = "XML instead of text"},
                {.names = "--headers", .help = "each node's header"},
                {.names = "--descriptors", .help = "the lines of the node descriptor"},
                {.names = "--bare", .help = "the value alone, of the node that --at names; not of a group"},
                {.names = "--attributes", .help = "XML with key elements as attributes"},
                {.names = "--at",
                 .kind = ValueKind::number,
                 .value = "OFFSET",
                 .help = "the node at OFFSET and all below it"}},
    .examples = {{"tav print x.tav", "the whole stream as text"},
                 {"tav print --xml --headers --at 0x20 x.tav", "one node as XML, with its header"}},
    .run = run,
}};

} // namespace

} // namespace tav::tool
