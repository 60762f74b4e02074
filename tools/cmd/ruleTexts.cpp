#include "tools/cmd/ruleTexts.h"

#include <nlohmann/json.hpp>

#include "tav/inspect.hpp"
#include "tools/shell/hints.h"
#include "tools/shell/names.h"

namespace tav::tool
{

namespace
{

std::string spaced(std::string_view bytes)
{
  std::string text;
  size_t column = 0;
  for (const char c : bytes)
  {
    const bool wrap = c == ' ' && column > 60;
    text += wrap ? '\n' : c;
    column = wrap ? 0 : column + 1;
  }
  return text;
}

/// What a rule means to a reader, with the command that mends what broke it.
std::string whyOf(const Rule& rule)
{
  std::string why(rule.why);
  if (rule.rule == RuleId::groupOpen)
  {
    why.back() = ';';
    why += " tav recover closes it.";
  }
  return why;
}

} // namespace

std::string rulesMarkdown()
{
  std::string text =
      "# What `tav check` looks for\n\n"
      "Made by `tav check --rules`. A rule is a defect unless it is called a note; notes are told with `--notes`, "
      "count with\n"
      "`--strict`, and are told and count when `--rule` asks for them. Every rule has the smallest file that breaks "
      "it, in\n"
      "hexadecimal (`00*9` is nine zeros, `(...)*9` a run nine times), and the offset of the finding in it.\n\n"
      "| rule | | code | what |\n| --- | --- | --- | --- |\n";
  for (const Rule& rule : rules())
  {
    text.append("| [").append(rule.id).append("](#").append(rule.id).append(") | ");
    text.append(rule.note ? "note" : "defect").append(" | `").append(korCodeName(rule.code)).append("` | ");
    text.append(rule.what).append(" |\n");
  }
  for (const Rule& rule : rules())
  {
    text += "\n## " + std::string(rule.id) + "\n\n" + std::string(rule.what) + " " + whyOf(rule) +
            "\n\n```text\n" + spaced(rule.bytes) + "\n```\n\n`tav check --rule " + std::string(rule.id) + " " +
            formOptions(rule.form) + " x.tav` finds it at " + hexOffset(rule.offset) + ".\n";
  }
  return text;
}

std::string rulesJson()
{
  nlohmann::ordered_json list = nlohmann::ordered_json::array();
  for (const Rule& rule : rules())
  {
    nlohmann::ordered_json object;
    object["rule"] = rule.id;
    object["note"] = rule.note;
    object["code"] = korCodeName(rule.code);
    object["what"] = rule.what;
    object["why"] = whyOf(rule);
    object["form"] = formOptions(rule.form);
    object["bytes"] = rule.bytes;
    object["offset"] = rule.offset;
    list.push_back(std::move(object));
  }
  return list.dump(1) + "\n";
}

} // namespace tav::tool
