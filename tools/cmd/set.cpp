// tav set: other values for nodes.
#include <filesystem>

#include "tav/inspect.hpp"
#include "tools/host/host.h"
#include "tools/shell/dictionary.h"
#include "tools/shell/options.h"
#include "tools/shell/output.h"
#include "tools/shell/progress.h"
#include "tools/shell/report.h"
#include "tools/shell/session.h"
#include "tools/shell/streamOutput.h"
#include "tools/shell/temporary.h"

namespace tav::tool
{

namespace
{

std::vector<Assignment> assignmentsOf(const Invocation& invocation)
{
  const std::vector<std::string>& words = invocation.arguments();
  if (words.size() % 2 == 0)
  {
    throw Failure("set: the path '" + words.back() + "' has no value behind it", "paths and values come in pairs");
  }
  const Dictionary dictionary = dictionaryFor(invocation, words.at(0));
  std::vector<Assignment> assignments;
  for (size_t i = 1; i < words.size(); i += 2)
  {
    assignments.push_back({pathOf(words[i], dictionary), words[i + 1]});
  }
  return assignments;
}

std::optional<uint16_t> typeOf(const Invocation& invocation)
{
  const std::string name = invocation.text("--type");
  if (!invocation.has("--type"))
  {
    return std::nullopt;
  }
  const auto type = jsonTypeOf(name);
  if (!type || layout::isGroupType(*type))
  {
    throw Failure("set: --type: '" + name + "' is no type of a value", "Uint32 is, and 'UTF8 String'");
  }
  return type;
}

void requirePlace(const std::string& path)
{
  std::error_code error;
  if (path == "-" || !std::filesystem::is_regular_file(host::pathOf(path), error))
  {
    throw Failure("set: only a file can be changed where it is", "-o OUT writes a new one");
  }
}

void tellTotals(const std::string& name, const Editor& editor, bool toStandardOutput)
{
  std::FILE* const where = toStandardOutput ? stderr : stdout;
  const std::string same =
      editor.unchanged() == 0 ? "" : ", " + std::to_string(editor.unchanged()) + " had the value already";
  const std::string text =
      "tav: " + shown(name, where) + ": " + counted(editor.changed(), "node") + " changed" + same + "\n";
  if (toStandardOutput)
  {
    std::fputs(text.c_str(), stderr);
    return;
  }
  Output out("-");
  out.write(text);
  out.commit();
}

int run(const Invocation& invocation)
{
  const std::string& name = invocation.arguments().at(0);
  const bool inPlace = !invocation.has("--output");
  const std::string output = inPlace ? std::string() : requireStreamOutput(invocation);
  const std::vector<Assignment> assignments = assignmentsOf(invocation);
  if (inPlace)
  {
    requirePlace(name);
  }
  Stream stream = openStream(invocation);
  DamageNotices notices(stream);
  EditOptions options{.type = typeOf(invocation), .makeFile = Temporary::make};
  std::optional<Progress> progress(std::in_place, "set", stream.bytes());
  options.seen = [&](const Walker& walker, const Event& event) {
    progress->at(event.offset);
    notices.see(walker, event);
  };
  Editor editor(stream.bytes(), stream.form(), assignments, options);
  progress.reset();
  if (inPlace)
  {
    editor.writeInPlace(name);
  }
  else
  {
    Output out(output, invocation.has("--force"));
    StreamOutput file(out);
    progress.emplace("set", stream.bytes());
    editor.writeNew(file.bytes(), [&](uint64_t offset) { progress->at(offset); });
    progress.reset();
    file.finish();
  }
  tellTotals(stream.source->name(), editor, !inPlace && isStandardOutput(output));
  tellStatistics(invocation, stream.bytes());
  return notices.tell();
}

const Registration registration{{
    .place = 88,
    .name = "set",
    .arguments = "FILE PATH VALUE...",
    .summary = "other values for nodes",
    .description =
        "Gives every node that PATH leads to the VALUE; any number of pairs of PATH and VALUE, all or nothing. A\n"
        "value is written as 'tav get' prints it; the node keeps its type unless --type names another. Where all\n"
        "payloads keep their sizes FILE itself is changed, after everything was found and verified; else, or when\n"
        "it is given, -o OUT takes a new file, in which groups and pairs around a changed size are right and every\n"
        "other byte is as it was. It says how many nodes changed.\n\n"
        "Exit status 1: a path leads nowhere, and nothing was changed; or damaged bytes were passed over, which is\n"
        "told on standard error. Exit status 2: a value is none of its node's type, or does not fit without -o.",
    .options = {{.names = "-o,--output",
                 .kind = ValueKind::file,
                 .value = "OUT",
                 .help = "write a new file, and leave FILE as it is; - is standard output"},
                {.names = "--type",
                 .kind = ValueKind::text,
                 .value = "TYPE",
                 .help = "the type that the nodes get, as 'tav json' names it"}},
    .examples = {{"tav set x.tav /system/host/cpu/cpuOnline 16", "a number, in place"},
                 {"tav set x.tav '**/hostName' grace '**/osName' other -o y.tav",
                  "texts of other lengths, anonymised"}},
    .run = run,
}};

} // namespace

} // namespace tav::tool
