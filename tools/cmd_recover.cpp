// tav recover: a sound stream of what is whole in a damaged one.
#include <deque>

#include <nlohmann/json.hpp>

#include "tools/options.h"
#include "tools/output.h"
#include "tools/progress.h"
#include "tools/recovery.h"
#include "tools/report.h"
#include "tools/session.h"

namespace tav::tool
{

namespace
{

constexpr size_t kMostListed = 1000; ///< losses that are listed; the totals have all

struct Account
{
  RecoveryTotals totals{};
  std::deque<Loss> losses{};
  uint64_t bytes = 0;
  uint64_t written = 0;
};

std::string asJson(const std::string& name, const Stream& stream, const Account& account)
{
  const RecoveryTotals& totals = account.totals;
  nlohmann::ordered_json object;
  object["file"] = name;
  object["form"] = {{"byteOrder", orderText(stream.form())},
                    {"root", stream.form().root64 ? 64 : 32},
                    {"aligned", stream.form().aligned}};
  object["bytes"] = account.bytes;
  object["kept"] = totals.kept;
  object["lost"] = totals.lost;
  object["unread"] = totals.unread;
  object["zerosKept"] = totals.zeros;
  object["written"] = account.written;
  object["nodes"] = totals.nodes;
  object["groupsClosed"] = totals.closed;
  object["groupsMade"] = totals.made;
  object["pairsMade"] = totals.pairs;
  object["losses"] = totals.losses;
  object["list"] = nlohmann::ordered_json::array();
  for (const Loss& loss : account.losses)
  {
    object["list"].push_back({{"offset", loss.offset}, {"length", loss.length}, {"reason", loss.reason}});
  }
  return object.dump(1, ' ', false, nlohmann::json::error_handler_t::replace) + "\n";
}

std::string asText(const std::string& name, const Stream& stream, const Account& account)
{
  const RecoveryTotals& totals = account.totals;
  std::string text = "tav: " + name + ": " + formText(stream.form()) + "\n";
  for (const Loss& loss : account.losses)
  {
    text += "tav: " + name + ": " + hexOffset(loss.offset) + ": " + counted(loss.length, "byte") +
            " lost: " + loss.reason + "\n";
  }
  if (totals.losses > account.losses.size())
  {
    text += "tav: " + name + ": and " + std::to_string(totals.losses - account.losses.size()) + " more losses\n";
  }
  text += "nodes            " + std::to_string(totals.nodes) + "\n" +
          "groups closed    " + std::to_string(totals.closed) + ", of open groups and such with a wrong size\n" +
          "groups made      " + std::to_string(totals.made) + ", for nodes that have lost their own\n" +
          "pairs made       " + std::to_string(totals.pairs) + "\n" +
          "bytes            " + std::to_string(account.bytes) + " = " + std::to_string(totals.kept) + " kept + " +
          std::to_string(totals.lost) + " lost + " + std::to_string(totals.unread) + " unread\n" +
          "written          " + std::to_string(account.written) + "\n";
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
  if (output == "-")
  {
    std::fputs(text.c_str(), stderr);
    return;
  }
  Output out("-");
  out.write(text);
  out.commit();
}

void recoverInto(const Invocation& invocation, Stream& stream, PatchFile& file, Account& account)
{
  Progress progress("recover", stream.bytes().size());
  Rebuilder rebuilder(stream.bytes(), stream.form(), file, [&](uint64_t offset) { progress.at(offset); });
  Recovery recovery(stream.bytes(), stream.form(), rebuilder, invocation.number("--search").value_or(kNoOffset),
                    [&](const Loss& loss) {
                      if (account.losses.size() < kMostListed)
                      {
                        account.losses.push_back(loss);
                      }
                    });
  while (recovery.step())
  {
    progress.at(recovery.position());
  }
  account.totals = recovery.totals();
  account.bytes = stream.bytes().size();
  account.written = file.length();
}

int run(const Invocation& invocation)
{
  const std::string output = invocation.text("--output");
  if (output.empty())
  {
    throw Failure("recover: -o OUT is missing", "- is standard output");
  }
  checkWritable(output, invocation.has("--force"));
  if (invocation.has("--report"))
  {
    checkWritable(invocation.text("--report"), invocation.has("--force"));
  }
  Stream stream = openStream(invocation, invocation.arguments().front(), true);
  Account account;
  {
    Output out(output, invocation.has("--force"));
    PatchFile file(out);
    recoverInto(invocation, stream, file, account);
    if (account.totals.nodes == 0)
    {
      Problem problem{stream.source->name()};
      problem.sentence = "nothing in it is whole";
      problem.hint = "'tav info' tells what was tried; --byte-order, --root and --align say how to read it";
      throw Failure(kTooDamaged, problem);
    }
    file.finish();
  }
  const std::string& name = stream.source->name();
  putReport(invocation, output,
            invocation.has("--json") ? asJson(name, stream, account) : asText(name, stream, account));
  tellStatistics(invocation, stream.bytes());
  const RecoveryTotals& totals = account.totals;
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
        "Exit status 1: something was lost or repaired; 3: nothing is whole, and no file is written.",
    .options = {{.names = "-o,--output",
                 .kind = ValueKind::file,
                 .value = "OUT",
                 .help = "where the sound stream goes; - is standard output"},
                {.names = "--force", .help = "replace existing files"},
                {.names = "--json", .help = "the report as JSON"},
                {.names = "--report", .kind = ValueKind::file, .value = "FILE", .help = "write the report to FILE"},
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
