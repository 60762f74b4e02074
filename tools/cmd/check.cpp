// tav check: every defect of a stream.
#include <array>

#include <nlohmann/json.hpp>

#include "tav/inspect/checker.hpp"
#include "tav/inspect/rules.hpp"
#include "tools/cmd/ruleTexts.h"
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

/// Which rules are looked for, and which of them count.
class Choice
{
public:
  explicit Choice(const Invocation& invocation)
  {
    const bool notes = invocation.has("--notes") || invocation.has("--strict");
    const std::vector<std::string> ids = invocation.all("--rule");
    for (const Rule& rule : rules())
    {
      at(wanted_, rule.rule) = ids.empty() && (!rule.note || notes);
      at(counts_, rule.rule) = ids.empty() && (!rule.note || invocation.has("--strict"));
    }
    for (const std::string& id : ids)
    {
      const Rule* const rule = findRule(id);
      if (rule == nullptr)
      {
        throw Failure("check: there is no rule '" + id + "'", "'tav check --rules' lists the rules");
      }
      at(wanted_, rule->rule) = at(counts_, rule->rule) = true;
    }
  }

  bool wants(RuleId rule) const { return wanted_[static_cast<size_t>(rule)]; }
  bool counts(RuleId rule) const { return counts_[static_cast<size_t>(rule)]; }

private:
  using Flags = std::array<bool, static_cast<size_t>(RuleId::count)>;
  static bool& at(Flags& flags, RuleId rule) { return flags[static_cast<size_t>(rule)]; }

  Flags wanted_{};
  Flags counts_{};
};

/// Prints findings as they come, as lines or as one JSON object.
class Findings
{
public:
  Findings(const Invocation& invocation, const Stream& stream, const Choice& choice)
      : stream_(stream), choice_(choice), json_(invocation.has("--json")), out_("-")
  {
    if (json_)
    {
      nlohmann::ordered_json form;
      form["byteOrder"] = orderText(stream.form());
      form["root"] = stream.form().root64 ? 64 : 32;
      form["aligned"] = stream.form().aligned;
      out_.write("{\"file\": " + json(stream.source->name()) + ",\n \"form\": " + form.dump() +
                 ",\n \"ambiguous\": " + (stream.recognition.ambiguous() ? "true" : "false") + ",\n \"findings\": [");
    }
  }

  void put(const Finding& finding)
  {
    const Rule& rule = ruleOf(finding.rule);
    const bool counts = choice_.counts(finding.rule);
    (counts ? defects_ : notes_) += 1;
    if (json_)
    {
      putJson(finding, rule, counts);
      return;
    }
    Problem problem{stream_.source->name(), finding.offset, finding.path};
    problem.sentence = (counts ? "" : "note: ") + sentenceOf(finding) + " [" + std::string(rule.id) + "]";
    problem.code = rule.code;
    out_.write(problemText(problem) + "\n");
  }

  Status finish(uint64_t nodes, uint64_t endElements)
  {
    const bool stream = stream_.isStream();
    if (json_)
    {
      out_.write(std::string(defects_ + notes_ == 0 ? "" : "\n ") + "],\n \"stream\": " + (stream ? "true" : "false") +
                 (stream_.kind ? ", \"kind\": " + json(std::string(stream_.kind->name)) : "") +
                 ", \"nodes\": " + std::to_string(nodes) + ", \"endElements\": " + std::to_string(endElements) +
                 ", \"bytes\": " + std::to_string(stream_.source->size()) +
                 ", \"defects\": " + std::to_string(defects_) + ", \"notes\": " + std::to_string(notes_) + "}\n");
    }
    else
    {
      const std::string result = !stream         ? noStream(stream_).sentence
                                 : defects_ == 0 ? "no defects"
                                                 : counted(defects_, "defect");
      out_.write("tav: " + shown(stream_.source->name()) + ": " + result +
                 (notes_ == 0 ? "" : ", " + counted(notes_, "note")) + (stream ? " in " + counted(nodes, "node") : "") +
                 (stream && endElements != 0 ? " and " + counted(endElements, "end element") : "") + "\n");
    }
    out_.commit();
    return !stream ? kTooDamaged : defects_ == 0 ? kFine
                                                 : kFindings;
  }

private:
  static std::string json(const std::string& text)
  {
    return nlohmann::json(text).dump(-1, ' ', false, nlohmann::json::error_handler_t::replace);
  }

  std::string sentenceOf(const Finding& finding) const
  {
    return finding.sentence + (finding.otherStream ? readsFrom(*stream_.source, finding.offset) : "");
  }

  void putJson(const Finding& finding, const Rule& rule, bool counts)
  {
    nlohmann::ordered_json object;
    object["rule"] = rule.id;
    object["severity"] = counts ? "defect" : "note";
    object["offset"] = finding.offset;
    if (finding.length != 0)
    {
      object["length"] = finding.length;
    }
    object["path"] = finding.path;
    object["code"] = korCodeName(rule.code);
    object["sentence"] = sentenceOf(finding);
    out_.write((defects_ + notes_ == 1 ? "\n  " : ",\n  ") +
               object.dump(-1, ' ', false, nlohmann::json::error_handler_t::replace));
  }

  const Stream& stream_;
  const Choice& choice_;
  bool json_;
  Output out_;
  uint64_t defects_ = 0;
  uint64_t notes_ = 0;
};

int run(const Invocation& invocation)
{
  if (invocation.has("--rules"))
  {
    return printText(invocation.has("--json") ? rulesJson() : rulesMarkdown());
  }
  if (invocation.arguments().empty())
  {
    throw Failure("check: an argument is missing: tav check FILE",
                  "'tav check --help' tells more; - is standard input");
  }
  const Choice choice(invocation);
  Stream stream = openStream(invocation, true);
  Findings findings(invocation, stream, choice);
  CheckTotals totals;
  if (stream.isStream())
  {
    const unsigned jobs = jobsOf(invocation);
    Progress progress("check", stream.bytes());
    totals = check(stream.bytes(), stream.form(),
                   {.wanted = [&](RuleId rule) { return choice.wants(rule); },
                    .sink = [&](const Finding& finding) { findings.put(finding); },
                    .style = invocation.has("--json") ? PathStyle::whole : PathStyle::brief,
                    .progress = [&](uint64_t offset) { jobs > 1 ? progress.reach(offset) : progress.at(offset); },
                    .threads = jobs});
  }
  const Status status = findings.finish(totals.nodes, totals.endElements);
  tellStatistics(invocation, stream.bytes());
  return status;
}

const Registration registration{{
    .place = 90,
    .name = "check",
    .arguments = "[FILE]",
    .summary = "every defect, with its offset, path and rule",
    .description =
        "Walks the whole stream and tells everything that is wrong with it, in the order in which it is certain.\n"
        "Notes are remarkable things that are no defects. The distances and byte orders of eye/size pairs that\n"
        "writers really give count as right. Exit status 1: defects; 3: too damaged to be read as a stream.",
    .options = {{.names = "--json", .help = "one JSON object; with --rules, the table of rules"},
                {.names = "--rule",
                 .kind = ValueKind::text,
                 .value = "ID",
                 .help = "only this rule, also when it is a note",
                 .many = true},
                {.names = "--notes", .help = "tell notes, too"},
                jobsOption(),
                {.names = "--strict", .help = "tell notes, and let them count as defects"},
                {.names = "--rules", .help = "print what is looked for, as Markdown, and no more"}},
    .examples = {{"tav check x.tav", "what is wrong with x.tav"},
                 {"tav check x.tav --rule past-parent --json", "only nodes that end past their parents, for a script"}},
    .run = run,
}};

} // namespace

} // namespace tav::tool
