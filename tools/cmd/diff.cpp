// tav diff: what two streams have not in common.
#include <cstdlib>
#include <optional>

#include "tav/inspect.hpp"
#include "tools/shell/dictionary.h"
#include "tools/shell/options.h"
#include "tools/shell/output.h"
#include "tools/shell/progress.h"
#include "tools/shell/report.h"
#include "tools/shell/session.h"
#include "tools/shell/temporary.h"

namespace tav::tool
{

namespace
{

/// How far apart two numbers may be: "10", "0.5%".
Tolerance parseTolerance(std::string text)
{
  Tolerance tolerance;
  tolerance.percent = text.ends_with('%');
  text.resize(text.size() - (tolerance.percent ? 1 : 0));
  // Not every standard library has from_chars for this type; strtod takes blanks, hexadecimal digits and words too.
  const bool plain = !text.empty() && text.find_first_not_of("0123456789.e-") == std::string::npos;
  char* end = nullptr;
  tolerance.amount = std::strtod(text.c_str(), &end);
  if (!plain || end != text.c_str() + text.size() || !(tolerance.amount >= 0))
  {
    throw Failure("diff: --tolerance: '" + text + "' is no number", "10 is, and 0.5%");
  }
  return tolerance;
}

/// "- /system/host[2]  group of 3 nodes"
std::string lineOf(const Difference& difference, bool colour)
{
  const char sign = difference.change == Change::removed ? '-' : difference.change == Change::added ? '+'
                                                                                                    : '~';
  const std::string path = difference.before ? difference.before->path : difference.after->path;
  const std::string other = difference.before && difference.after ? difference.after->path : path;
  const char* const start = !colour ? "" : sign == '-' ? "\033[31m"
                                       : sign == '+'   ? "\033[32m"
                                                       : "\033[33m";
  return std::string(start) + sign + " " + path + (other != path ? " (" + other + ")" : "") +
         (colour ? "\033[0m" : "") + "  " + difference.sentence + "\n";
}

void appendSide(std::string& text, const DiffSide& side, const std::string& suffix)
{
  const auto put = [&](const std::string& name, const std::string& value) {
    text += ", \"" + name + suffix + "\": ";
    appendJsonString(text, value);
  };
  put("path", side.path);
  text += ", \"offset" + suffix + "\": " + std::to_string(side.offset);
  put("type", side.type);
  if (side.value)
  {
    put("value", *side.value);
  }
  if (side.info != 0)
  {
    text += ", \"info" + suffix + "\": " + std::to_string(side.info);
  }
}

std::string jsonOf(const Difference& difference)
{
  static constexpr const char* changes[] = {"removed", "added", "changed"};
  std::string text = std::string("{\"change\": \"") + changes[static_cast<size_t>(difference.change)] + "\"";
  if (difference.before)
  {
    appendSide(text, *difference.before, "");
  }
  if (difference.after)
  {
    appendSide(text, *difference.after, difference.before ? "Now" : "");
  }
  return text + "}\n";
}

std::vector<Path> ignoredPaths(const Invocation& invocation, const Dictionary& dictionary)
{
  std::vector<Path> ignored;
  for (const std::string& path : invocation.all("--ignore"))
  {
    if (path == "/")
    {
      throw Failure("diff: --ignore / leaves nothing to compare");
    }
    ignored.push_back(pathOf(path, dictionary));
  }
  return ignored;
}

std::vector<uint16_t> keysOf(const Invocation& invocation, const Dictionary& dictionary)
{
  std::vector<uint16_t> keys;
  for (const std::string& name : invocation.all("--key"))
  {
    const std::vector<uint16_t> ids = requireIds("--key", name, dictionary);
    keys.insert(keys.end(), ids.begin(), ids.end());
  }
  return keys;
}

/// The subtrees to compare: a path that is given for one side alone is that of the other, too.
struct Subtrees
{
  Subtrees(const Invocation& invocation, const Dictionary& dictionaryA, const Dictionary& dictionaryB)
  {
    const std::string pathA = invocation.text("--path-a", invocation.text("--path-b"));
    if (!pathA.empty())
    {
      a.emplace(pathOf(pathA, dictionaryA));
      b.emplace(pathOf(invocation.text("--path-b", pathA), dictionaryB));
    }
  }

  std::optional<Path> a{};
  std::optional<Path> b{};
};

int run(const Invocation& invocation)
{
  const std::string& nameA = invocation.arguments().front();
  const std::string& nameB = invocation.arguments().back();
  const Dictionary dictionaryB = dictionaryFor(invocation, nameB);
  const Dictionary dictionary = dictionaryFor(invocation, nameA).over(dictionaryB);
  const Subtrees subtrees(invocation, dictionary, dictionaryB.over(dictionary));
  if (invocation.arguments().size() == 1 && !subtrees.a && !(invocation.has("--from-a") || invocation.has("--from-b")))
  {
    throw Failure("diff: an argument is missing: tav diff A B",
                  "of one file, --path-a PATH and --path-b PATH name what to compare");
  }
  if (nameA == "-" && nameB == "-")
  {
    throw Failure("diff: only one of the two can be standard input");
  }
  const bool json = invocation.has("--json");
  DiffOptions options;
  options.ignored = ignoredPaths(invocation, dictionary);
  options.keys = keysOf(invocation, dictionary);
  options.contents = invocation.has("--contents");
  options.tolerance = parseTolerance(invocation.text("--tolerance", "0"));
  options.mostValue = json ? options.mostValue : 0;
  options.makeFile = Temporary::make;
  const auto from = [&](const char* own) {
    return invocation.has(own) ? invocation.number(own) : invocation.number("--from");
  };
  Stream a = openStream(invocation, nameA, from("--from-a").value_or(0));
  Stream b = openStream(invocation, nameB, from("--from-b").value_or(0));
  DamageNotices noticesA(a);
  DamageNotices noticesB(b);
  std::optional<Progress> progress;
  const ByteSource* shown = nullptr;
  options.seen = [&](ByteSource& source, const Walker& walker, const Event& event) {
    if (shown != &source)
    {
      progress.emplace("diff " + source.name(), source);
      shown = &source;
    }
    progress->at(event.offset);
    (&source == a.source.get() ? noticesA : noticesB).see(walker, event);
  };
  Output out("-");
  const bool colour = !json && wantsColour(invocation);
  const bool different = diff({a.bytes(), a.form(), subtrees.a}, {b.bytes(), b.form(), subtrees.b}, options,
                              [&](const Difference& difference) {
                                progress.reset();
                                out.write(json ? jsonOf(difference) : lineOf(difference, colour));
                              });
  out.commit();
  tellStatistics(invocation, a.bytes());
  tellStatistics(invocation, b.bytes());
  const bool damagedA = noticesA.tell() != kFine;
  const bool damagedB = noticesB.tell() != kFine;
  return different || damagedA || damagedB ? kFindings : kFine;
}

const Registration registration{{
    .place = 120,
    .name = "diff",
    .arguments = "A [B]",
    .inputs = 2,
    .summary = "what two streams do not have in common, by path",
    .description =
        "Lists what B lacks (-), has in addition (+) or has with another value (~). Byte order, header widths,\n"
        "padding, pairs and end elements are no difference; types, values, info bits and damaged bytes are.\n"
        "Groups of one name are matched by their keys (node_number, db_name, hostName; --key) where they have\n"
        "some; other elements of one name by what is equal in their order, and else one after the other.\n"
        "The order of elements with different names is no difference. Exit status 1: there are some,\n"
        "or damage was passed over, which is told on standard error; also where a path leads nowhere.\n\n"
        "With --path-a and --path-b two subtrees are compared, of one file, too; B is then A unless given. The two\n"
        "nodes stand for each other whatever their names.\n\n"
        "Nodes are listed in a temporary file; in memory are only the children of the groups on the way\n"
        "to the place that is compared. Of a group with more than 200,000 children, 200,000 at a time\n"
        "are compared, so that what moved farther is told as removed and added.",
    .options = {{.names = "--ignore",
                 .kind = ValueKind::text,
                 .value = "PATH",
                 .help = "leave out the nodes that PATH leads to and all below them",
                 .many = true},
                {.names = "--tolerance",
                 .kind = ValueKind::text,
                 .value = "N",
                 .help = "numbers may differ by N, or by N% of the larger one"},
                {.names = "--path-a",
                 .kind = ValueKind::text,
                 .value = "PATH",
                 .help = "of A, compare the first node that PATH leads to, with all below it"},
                {.names = "--path-b",
                 .kind = ValueKind::text,
                 .value = "PATH",
                 .help = "the same for B; the path of the other side unless given"},
                {.names = "--key",
                 .kind = ValueKind::text,
                 .value = "NAME",
                 .help = "match groups of one name by the value of this element, instead of the usual ones",
                 .many = true},
                {.names = "--contents", .help = "tell each node of a group that only one of them has"},
                {.names = "--from-a",
                 .kind = ValueKind::number,
                 .value = "OFFSET",
                 .help = "read A as if it began at OFFSET; --from is for both"},
                {.names = "--from-b", .kind = ValueKind::number, .value = "OFFSET", .help = "the same for B"},
                {.names = "--json", .help = "one JSON object a difference"},
                {.names = "--color",
                 .kind = ValueKind::choice,
                 .value = "WHEN",
                 .help = "colour the output",
                 .choices = {"auto", "always", "never"}}},
    .examples = {{"tav diff yesterday.tav today.tav", "what changed"},
                 {"tav diff week.tav --path-a '/system[1]' --path-b '/system[2]'", "two snapshots of one file"},
                 {"tav diff a.tav b.tav --ignore '**/memory' --tolerance 1%", "without what always changes"}},
    .run = run,
}};

} // namespace

} // namespace tav::tool
