// tav info: what a file is, and why it is taken for that.
#include <algorithm>
#include <cstdio>
#include <functional>
#include <map>
#include <optional>

#include <nlohmann/json.hpp>

#include "tav/inspect.hpp"
#include "tools/shell/hints.h"
#include "tools/shell/options.h"
#include "tools/shell/output.h"
#include "tools/shell/progress.h"
#include "tools/shell/report.h"
#include "tools/shell/session.h"

namespace tav::tool
{

namespace
{

// What is counted without --full. Large files are answered at once, with the part that was counted.
constexpr uint64_t kNodes = 100'000;
constexpr uint64_t kRead = uint64_t{8} * 1024 * 1024;
constexpr uint64_t kSearch = uint64_t{4} * 1024 * 1024;

struct Tally
{
  uint64_t nodes = 0;
  uint64_t bytes = 0; ///< of payloads, and of groups their headers alone
};

struct Counts
{
  uint64_t nodes = 0; ///< but for end elements
  uint64_t ends = 0;
  uint64_t groups = 0;
  uint64_t wide = 0;
  uint64_t open = 0;     ///< groups of unknown size that an end element ended
  uint64_t unclosed = 0; ///< groups that nothing ended
  uint64_t begun = 0;    ///< groups of unknown size that were come across, whether or not their end was
  bool openRoot = false; ///< one of them is a root
  uint64_t cut = 0;      ///< groups that claim more than there is
  uint64_t pairs = 0;
  uint64_t extras = 0;
  uint64_t depth = 0;
  uint64_t roots = 0;
  uint64_t damages = 0;
  uint64_t damagedBytes = 0;
  uint64_t zeros = 0;        ///< at the end of the file
  uint64_t zerosBetween = 0; ///< between its streams
  uint64_t end = 0;          ///< where counting ended
  bool complete = true;
  std::map<uint16_t, Tally> types{};
  std::map<uint16_t, Tally> elements{};
};

void countNode(const Node& node, Counts& counts)
{
  const bool end = isEndNode(node);
  counts.pairs += node.elm() == TAV_ELM_CMN_END_HDR_EYE_SIZE ? 1 : 0;
  (end ? counts.ends : counts.nodes) += 1;
  if (end)
  {
    return;
  }
  counts.groups += node.isGroup() ? 1 : 0;
  counts.wide += node.is64() ? 1 : 0;
  counts.roots += node.depth == 0 ? 1 : 0;
  counts.begun += node.has(kOpen) ? 1 : 0;
  counts.openRoot = counts.openRoot || (node.has(kOpen) && node.depth == 0);
  counts.cut += node.has(kOverrun) ? 1 : 0;
  counts.extras += node.has(kExtra) ? 1 : 0;
  counts.depth = std::max(counts.depth, node.depth + 1);
  const uint64_t bytes = node.headerLength() + (node.isGroup() ? 0 : node.size());
  for (Tally* const tally : {&counts.types[node.type()], &counts.elements[node.elm()]})
  {
    tally->nodes += 1;
    tally->bytes += bytes;
  }
}

void countEvent(const Event& event, uint64_t fileBytes, Counts& counts)
{
  counts.end = event.offset + event.length;
  switch (event.what)
  {
  case What::nodeBegin: countNode(event.node, counts); break;
  case What::pair: counts.pairs += 1; break;
  case What::nodeEnd:
    if (event.node.isGroup() && event.node.has(kOpen))
    {
      (event.end == End::byEndElement ? counts.open : counts.unclosed) += 1;
    }
    break;
  case What::damaged:
    counts.damages += 1;
    counts.damagedBytes += event.length;
    break;
  case What::zeros: (counts.end < fileBytes ? counts.zerosBetween : counts.zeros) += event.length; break;
  case What::unread:
    counts.complete = false;
    counts.end = event.offset;
    break;
  default: break;
  }
}

Counts countAll(Stream& stream, bool full, DamageNotices& notices)
{
  Counts counts;
  ByteSource& source = stream.bytes();
  Walker walker(source, stream.form(), {.budget = full ? kNoBudget : kSearch});
  Progress progress("info", source.size());
  const uint64_t readBefore = source.bytesRead();
  Event event;
  while (walker.next(event))
  {
    progress.at(event.offset);
    notices.see(walker, event);
    countEvent(event, source.size(), counts);
    const bool enough = counts.nodes >= kNodes || source.bytesRead() - readBefore > kRead;
    if (!full && enough && counts.end < source.size())
    {
      counts.complete = false;
      break;
    }
  }
  return counts;
}

class Printer
{
public:
  explicit Printer(Output& out)
      : out_(out) {}

  void line(std::string name, const std::string& text)
  {
    name.resize(std::max<size_t>(name.size() + 1, 18), ' ');
    out_.write(name + text + "\n");
  }

  void tallies(const std::string& title, const std::map<uint16_t, Tally>& tallies,
               const std::function<std::string(uint16_t)>& nameOf, size_t most)
  {
    std::vector<std::pair<uint16_t, Tally>> sorted(tallies.begin(), tallies.end());
    std::stable_sort(sorted.begin(), sorted.end(),
                     [](const auto& a, const auto& b) { return a.second.bytes > b.second.bytes; });
    char text[160];
    std::snprintf(text, sizeof text, "\n%-44s %12s %16s\n", title.c_str(), "nodes", "bytes");
    out_.write(text);
    for (size_t i = 0; i < std::min(most, sorted.size()); ++i)
    {
      std::snprintf(text, sizeof text, "  %-42s %12llu %16llu\n", nameOf(sorted[i].first).c_str(),
                    static_cast<unsigned long long>(sorted[i].second.nodes),
                    static_cast<unsigned long long>(sorted[i].second.bytes));
      out_.write(text);
    }
    if (sorted.size() > most)
    {
      out_.write("  and " + std::to_string(sorted.size() - most) + " more; --full lists all\n");
    }
  }

private:
  Output& out_;
};

std::string typeName(uint16_t type)
{
  const std::string width = type == TAV_TYPE_HEADER32 ? " of 32-bit headers" : " of 64-bit headers";
  return typeText(type) + (layout::isGroupType(type) ? width : "");
}

void printForm(Printer& print, const Stream& stream)
{
  const Recognition& found = stream.recognition;
  const auto differs = [&](auto field) {
    return std::any_of(found.alternatives.begin(), found.alternatives.end(),
                       [&](const Form& form) { return form.*field != found.form.*field; });
  };
  const std::string doubt = "ambiguous: ";
  print.line("byte order", (differs(&Form::swapped) ? doubt : "") + orderText(found.form) +
                               (found.form.swapped ? ", not this machine's" : ", this machine's"));
  print.line("root header", (differs(&Form::root64) ? doubt : "") + (found.form.root64 ? "64-bit" : "32-bit"));
  print.line("alignment", (differs(&Form::aligned) ? doubt : "") + (found.form.aligned ? "padded to 8" : "none"));
}

std::string openText(const Counts& counts)
{
  if (!counts.complete)
  {
    // What ends a group may lie behind the part that was counted, and so may most of the groups.
    return counts.begun == 0 ? "not counted; --full counts them"
                             : "at least " + std::to_string(counts.begun) +
                                   (counts.openRoot ? ", the root among them" : "") + "; --full counts them";
  }
  return counts.open + counts.unclosed == 0 ? "none"
                                            : std::to_string(counts.open + counts.unclosed) + ", of them " +
                                                  std::to_string(counts.unclosed) + " without an end element";
}

void printCounts(Printer& print, const Counts& counts, uint64_t fileBytes)
{
  const uint64_t narrow = counts.nodes - counts.wide;
  const std::string mixed = std::to_string(counts.wide) + " 64-bit, " + std::to_string(narrow) + " 32-bit";
  print.line("headers", counts.wide == 0 ? "32-bit" : narrow == 0 ? "64-bit"
                                                                  : mixed);
  print.line("eye/size pairs", counts.pairs == 0 ? "none" : std::to_string(counts.pairs));
  if (counts.extras != 0)
  {
    print.line("UTF-8 strings", std::to_string(counts.extras) + " with two uncounted bytes behind them");
  }
  print.line("nodes", std::to_string(counts.nodes) + ", of them " + counted(counts.groups, "group"));
  print.line("end elements", counts.ends == 0 ? "none" : std::to_string(counts.ends));
  print.line("roots", std::to_string(counts.roots));
  print.line("depth", std::to_string(counts.depth));
  print.line("open groups", openText(counts));
  if (counts.cut != 0)
  {
    print.line("cut groups", std::to_string(counts.cut) + " that claim more bytes than there are");
  }
  print.line("damaged", counts.damages == 0
                            ? "none found"
                            : counted(counts.damagedBytes, "byte") + " in " + counted(counts.damages, "place"));
  if (counts.zerosBetween != 0)
  {
    print.line("zeros between", byteText(counts.zerosBetween));
  }
  if (counts.zeros != 0)
  {
    print.line("zeros at the end", byteText(counts.zeros));
  }
  print.line("counted", counts.complete ? "the whole file"
                                        : "the first " + byteText(counts.end) + " of " + byteText(fileBytes) +
                                              "; --full counts everything");
}

using Json = nlohmann::ordered_json;

Json formJson(const Form& form)
{
  return {{"byteOrder", form.swapped != kor::isLittleEndian ? "little" : "big"},
          {"root", form.root64 ? 64 : 32},
          {"aligned", form.aligned}};
}

Json countsJson(const Counts& counts)
{
  return {{"complete", counts.complete},
          {"bytes", counts.end},
          {"nodes", counts.nodes},
          {"groups", counts.groups},
          {"roots", counts.roots},
          {"depth", counts.depth},
          {"headers64", counts.wide},
          {"headers32", counts.nodes - counts.wide},
          {"eyeSizePairs", counts.pairs},
          {"extraStrings", counts.extras},
          {"openGroups", counts.complete ? counts.open + counts.unclosed : counts.begun},
          {"unclosedGroups", counts.unclosed},
          {"cutGroups", counts.cut},
          {"damagedPlaces", counts.damages},
          {"damagedBytes", counts.damagedBytes},
          {"zerosBetween", counts.zerosBetween},
          {"zerosAtEnd", counts.zeros}};
}

Json infoJson(const Stream& stream, const Counts* counts)
{
  const Recognition& found = stream.recognition;
  Json object = {{"file", stream.source->name()}, {"bytes", stream.source->size()}, {"stream", stream.isStream()}};
  if (stream.kind)
  {
    object["kind"] = stream.kind->name;
  }
  if (counts != nullptr)
  {
    object["damagedStart"] = found.damagedStart;
    object["ambiguous"] = found.ambiguous();
    object["form"] = formJson(found.form);
    object["alternatives"] = Json::array();
    for (const Form& form : found.alternatives)
    {
      object["alternatives"].push_back(formJson(form));
    }
    object["counted"] = countsJson(*counts);
    object["types"] = Json::array();
    for (const auto& [type, tally] : counts->types)
    {
      object["types"].push_back({{"type", jsonTypeName(type).value_or(std::to_string(type))},
                                 {"nodes", tally.nodes},
                                 {"bytes", tally.bytes}});
    }
    object["elements"] = Json::array();
    for (const auto& [elm, tally] : counts->elements)
    {
      object["elements"].push_back({{"element", elementText(elm, stream.source->dictionary())},
                                    {"id", elm},
                                    {"nodes", tally.nodes},
                                    {"bytes", tally.bytes}});
    }
  }
  object["because"] =
      stream.isStream() ? reasonTexts(*stream.source, found) : std::vector<std::string>{noStream(stream).sentence};
  return object;
}

void printText(const Stream& stream, const Counts* counts, bool full, Output& out)
{
  const Recognition& found = stream.recognition;
  Printer print(out);
  print.line("file", shown(stream.source->name()) + ", " + byteText(stream.source->size()));
  if (counts == nullptr)
  {
    print.line("stream", "no");
    print.line("because", noStream(stream).sentence);
    return;
  }
  print.line("stream", found.damagedStart ? "yes, with a damaged start" : counts->damages != 0 ? "yes, damaged"
                                                                                               : "yes");
  printForm(print, stream);
  printCounts(print, *counts, stream.source->size());
  print.tallies("type", counts->types, typeName, full ? ~size_t{0} : 20);
  const auto elementName = [&](uint16_t elm) { return elementText(elm, stream.source->dictionary()); };
  print.tallies("element", counts->elements, elementName, full ? ~size_t{0} : 12);
  out.write("\n");
  for (const std::string& reason : reasonTexts(*stream.source, found))
  {
    print.line("because", reason);
  }
  for (const Form& form : found.alternatives)
  {
    print.line("or", formText(form));
  }
}

int run(const Invocation& invocation)
{
  Stream stream = openStream(invocation, true);
  const bool full = invocation.has("--full");
  DamageNotices notices(stream);
  const std::optional<Counts> counts =
      stream.isStream() ? std::optional(countAll(stream, full, notices)) : std::nullopt;
  Output out("-");
  if (invocation.has("--json"))
  {
    out.write(infoJson(stream, counts ? &*counts : nullptr).dump(1, ' ', false, Json::error_handler_t::replace) + "\n");
  }
  else
  {
    printText(stream, counts ? &*counts : nullptr, full, out);
  }
  out.commit();
  tellStatistics(invocation, stream.bytes());
  const bool found = notices.tell() != kFine || stream.recognition.ambiguous();
  return !counts ? kTooDamaged : found ? kFindings
                                       : kFine;
}

const Registration registration{{
    .place = 20,
    .name = "info",
    .arguments = "FILE",
    .summary = "what the file is: byte order, headers, alignment, contents",
    .description =
        "Nothing in a stream says how to read it: the ways are tried and compared, and the reasons are told.\n"
        "\"ambiguous\" means that two ways explain the bytes equally well and find different nodes. Large\n"
        "files are counted in part unless --full is given. Exit status 1: damaged, each place with a line on\n"
        "standard error, or ambiguous; 3: no stream.",
    .options = {{.names = "--full", .help = "count the whole file, and list all types and elements"},
                {.names = "--json", .help = "one JSON object, with all types and elements that were counted"}},
    .examples = {{"tav info x.tav", "what x.tav is"},
                 {"tav info --byte-order big x.tav", "what it would be if it were big-endian"}},
    .run = run,
}};

} // namespace

} // namespace tav::tool
