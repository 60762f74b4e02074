// tav recover: a sound stream of what is whole in a damaged one.
#include <utility>
#include <vector>

#include <nlohmann/json.hpp>

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

constexpr size_t kMostListed = 1000; ///< losses that are listed, and doubts; the totals have all

nlohmann::ordered_json formJson(const Form& form)
{
  return {{"byteOrder", orderText(form)}, {"root", form.root64 ? 64 : 32}, {"aligned", form.aligned}};
}

std::string asJson(const std::string& name, const Outcome& outcome)
{
  const Account& account = outcome.taken;
  const RecoveryTotals& totals = account.totals;
  nlohmann::ordered_json object;
  object["file"] = name;
  object["form"] = formJson(account.form);
  if (outcome.other)
  {
    object["otherForm"] = formJson(outcome.other->form);
    object["otherForm"]["nodes"] = outcome.other->totals.nodes;
    object["otherForm"]["kept"] = outcome.other->totals.kept;
  }
  object["bytes"] = account.bytes;
  object["kept"] = totals.kept;
  object["lost"] = totals.lost;
  object["unread"] = totals.unread;
  object["zerosKept"] = totals.zeros;
  object["written"] = account.written;
  object["nodes"] = totals.nodes;
  object["endElements"] = totals.ends;
  object["groupsClosed"] = totals.closed;
  object["groupsMade"] = totals.made;
  object["pairsMade"] = totals.pairs;
  object["losses"] = totals.losses;
  object["list"] = nlohmann::ordered_json::array();
  for (const Loss& loss : account.losses)
  {
    object["list"].push_back({{"offset", loss.offset}, {"length", loss.length}, {"reason", loss.reason}});
  }
  object["doubts"] = totals.doubts;
  object["doubtful"] = nlohmann::ordered_json::array();
  for (const Doubt& doubt : account.doubts)
  {
    object["doubtful"].push_back({{"offset", doubt.offset}, {"length", doubt.length}, {"reason", doubt.reason}});
  }
  return object.dump(1, ' ', false, nlohmann::json::error_handler_t::replace) + "\n";
}

/// What was guessed, where something spoke for another way.
std::string doubtText(const std::string& name, const Outcome& outcome)
{
  std::string text;
  if (outcome.other)
  {
    const Account& other = *outcome.other;
    text = "tav: " + name + ": the form is a guess: read as " + formText(other.form) + ", " +
           counted(other.totals.nodes, "node") + " and " + counted(other.totals.kept, "byte") + " would be kept\n";
  }
  for (const Form& form : outcome.alternatives)
  {
    if (form != outcome.taken.form && !(outcome.other && form == outcome.other->form))
    {
      text += "tav: " + name + ": the form is a guess: " + formText(form) + " is about as likely\n";
    }
  }
  return text;
}

std::string asText(const std::string& name, const Outcome& outcome)
{
  const Account& account = outcome.taken;
  const RecoveryTotals& totals = account.totals;
  std::string text = "tav: " + name + ": " + formText(account.form) + "\n" + doubtText(name, outcome);
  for (const Loss& loss : account.losses)
  {
    text += "tav: " + name + ": " + hexOffset(loss.offset) + ": " + counted(loss.length, "byte") +
            " lost: " + loss.reason + "\n";
  }
  if (totals.losses > account.losses.size())
  {
    text += "tav: " + name + ": and " + std::to_string(totals.losses - account.losses.size()) + " more losses\n";
  }
  for (const Doubt& doubt : account.doubts)
  {
    text += "tav: " + name + ": " + hexOffset(doubt.offset) + ": the node of " + counted(doubt.length, "byte") +
            " is doubtful: it " + doubt.reason + "\n";
  }
  if (totals.doubts > account.doubts.size())
  {
    text +=
        "tav: " + name + ": and " + std::to_string(totals.doubts - account.doubts.size()) + " more doubtful nodes\n";
  }
  text += "nodes            " + std::to_string(totals.nodes) + ", " + std::to_string(totals.doubts) +
          " of them doubtful\n" + "end elements     " + std::to_string(totals.ends) + "\n" + "groups closed    " +
          std::to_string(totals.closed) + ", of open groups and such with a wrong size\n" + "groups made      " +
          std::to_string(totals.made) + ", for nodes that have lost their own\n" + "pairs made       " +
          std::to_string(totals.pairs) + "\n" + "bytes            " + std::to_string(account.bytes) + " = " +
          std::to_string(totals.kept) + " kept + " + std::to_string(totals.lost) + " lost + " +
          std::to_string(totals.unread) + " unread\n" + "written          " + std::to_string(account.written) + "\n";
  return text;
}

void putReport(const Invocation& invocation, const std::string& output, const std::string& text)
{
  if (invocation.has("--report"))
  {
    Output out(invocation.text("--report"), invocation.has("--force"));
    out.write(text);
    out.commit();
    return;
  }
  if (isStandardOutput(output))
  {
    std::fputs(text.c_str(), stderr);
    return;
  }
  printText(text);
}

int run(const Invocation& invocation)
{
  const std::string output = invocation.text("--output");
  if (output.empty())
  {
    throw Failure("recover: -o OUT is missing", "- is standard output");
  }
  Stream stream = openStream(invocation, true);
  Outcome outcome;
  {
    Output out(output, invocation.has("--force"));
    StreamOutput file(out);
    Progress progress("recover", stream.bytes().size());
    outcome = recoverBest(stream.bytes(), stream.recognition, file.bytes(),
                          {.search = invocation.number("--search").value_or(kNoOffset),
                           .listed = kMostListed,
                           .makeFile = Temporary::make,
                           .progress = [&](uint64_t offset) { progress.at(offset); },
                           .threads = jobsOf(invocation)});
    // In a file of a kind that many programs know, a few bytes that look like nodes are none.
    const bool chance = stream.kind && outcome.taken.totals.kept < stream.bytes().size() / 2;
    if (outcome.taken.totals.nodes == 0 || chance)
    {
      Problem problem{stream.source->name()};
      problem.sentence = "nothing in it is whole";
      problem.hint = "'tav info' tells what was tried; --byte-order, --root and --align say how to read it";
      throw Failure(kTooDamaged, stream.isStream() ? problem : noStream(stream));
    }
    file.finish();
  }
  const std::string& name = stream.source->name();
  const std::string seen = invocation.has("--report") ? name : shown(name, isStandardOutput(output) ? stderr : stdout);
  putReport(invocation, output, invocation.has("--json") ? asJson(name, outcome) : asText(seen, outcome));
  tellStatistics(invocation, stream.bytes());
  const RecoveryTotals& totals = outcome.taken.totals;
  return totals.lost + totals.unread + totals.closed + totals.made + totals.pairs == 0 ? kFine : kFindings;
}

const Registration registration{{
    .place = 100,
    .name = "recover",
    .arguments = "FILE",
    .summary = "what can be saved of a damaged or unfinished stream",
    .description =
        "Writes a sound stream of all nodes that are whole: groups are closed, sizes, paddings and eye/size pairs\n"
        "made anew. A group whose header is lost comes back by its end element, under the name docRoot; so do nodes "
        "that\n"
        "have lost all groups around them. The report accounts for every byte: kept + lost + unread is the file's "
        "size.\n"
        "Where the start is damaged and something is lost, every form that nothing refutes is tried; the one that\n"
        "keeps most is taken, and the report names the runner-up. --byte-order, --root and --align tell the form.\n"
        "Nodes beside lost bytes that may be none are marked as doubtful.\n"
        "Exit status 1: something was lost or repaired; 3: nothing is whole, and no file is written.",
    .options = {{.names = "-o,--output",
                 .kind = ValueKind::file,
                 .value = "OUT",
                 .help = "where the sound stream goes; - is standard output",
                 .required = true},
                {.names = "--json", .help = "the report as JSON"},
                {.names = "--report", .kind = ValueKind::file, .value = "FILE", .help = "write the report to FILE"},
                jobsOption(),
                {.names = "--search",
                 .kind = ValueKind::number,
                 .value = "BYTES",
                 .help = "give up searching for nodes after so many bytes; the rest is unread"}},
    .examples = {{"tav recover damaged.tav -o x.tav", "save what is whole"},
                 {"tav recover damaged.tav -o x.tav --json --report lost.json", "with an account of every byte"}},
    .run = run,
}};

} // namespace

} // namespace tav::tool
