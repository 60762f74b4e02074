// tav elements: the dictionary.
#include <algorithm>
#include <initializer_list>
#include <string>
#include <string_view>

#include <nlohmann/json.hpp>

#include "tav/dictionary.hpp"
#include "tav/inspect/path.hpp"
#include "tav/inspect/value.hpp"
#include "tools/shell/dictionary.h"
#include "tools/shell/options.h"
#include "tools/shell/output.h"
#include "tools/shell/report.h"

namespace tav::tool
{

namespace
{

char lower(char c)
{
  return c >= 'A' && c <= 'Z' ? static_cast<char>(c + ('a' - 'A')) : c;
}

/// Whether a text matches a pattern with * and ?; without any of them, whether it holds the pattern. Letter case does
/// not count.
bool matchesPattern(std::string_view text, std::string_view pattern)
{
  size_t at = 0;
  size_t in = 0;
  size_t star = std::string_view::npos;
  size_t mark = 0;
  while (at < text.size())
  {
    if (in < pattern.size() && (pattern[in] == '?' || lower(pattern[in]) == lower(text[at])))
    {
      ++at;
      ++in;
    }
    else if (in < pattern.size() && pattern[in] == '*')
    {
      star = in++;
      mark = at;
    }
    else if (star != std::string_view::npos)
    {
      in = star + 1;
      at = ++mark;
    }
    else
    {
      return false;
    }
  }
  return pattern.find_first_not_of('*', in) == std::string_view::npos;
}

/// Whether one of an element's names matches a pattern, or its id is the number that the pattern is.
bool isWanted(uint16_t id, std::initializer_list<std::string_view> names, const std::string& pattern)
{
  const std::string_view digits = std::string_view(pattern).substr(pattern.starts_with('#') ? 1 : 0);
  if (!digits.empty() && digits.find_first_not_of("0123456789") == std::string_view::npos)
  {
    return digits == std::to_string(id);
  }
  return std::any_of(names.begin(), names.end(), [&](std::string_view name) { return matchesPattern(name, pattern); });
}

/// What is known of the values: "gauge, ms: how long jobs wait".
std::string meaningOf(const OwnElement& own)
{
  std::string text(kindText(own.kind));
  text += (text.empty() || own.unit.empty() ? "" : ", ") + own.unit;
  text += (text.empty() || own.text.empty() ? "" : ": ") + own.text;
  return forTerminal(text);
}

std::string lineOf(uint16_t id, std::string_view name, std::string_view tag, const std::string& meaning)
{
  std::string line = std::to_string(id);
  line.insert(0, 5 - line.size(), ' ');
  line += "  " + std::string(name);
  line.resize(std::max<size_t>(line.size(), 5 + 2 + 44), ' ');
  return line + "  " + std::string(tag) + (meaning.empty() ? "" : "  " + meaning) + "\n";
}

/// The lines of the elements that a pattern names.
class Lister
{
public:
  Lister(Output& out, const Invocation& invocation, const std::string& pattern)
      : out_(out), pattern_(pattern), json_(invocation.has("--json")), unused_(invocation.has("--unused")) {}

  void add(const dictionary::Entry& entry)
  {
    if ((entry.constant == "INVALID_ELEMENT" && !unused_) ||
        !isWanted(entry.id, {entry.tag, entry.name, entry.constant}, pattern_))
    {
      return;
    }
    put(json_ ? Json{{"id", entry.id}, {"tag", entry.tag}, {"name", entry.name}, {"constant", entry.constant}}.dump() +
                    "\n"
              : lineOf(entry.id, entry.name, entry.tag, ""));
  }

  void add(const OwnElement& own)
  {
    if (!isWanted(own.id, {own.tag}, pattern_))
    {
      return;
    }
    if (!json_)
    {
      put(lineOf(own.id, "-", own.tag, meaningOf(own)));
      return;
    }
    Json object{{"id", own.id}, {"tag", own.tag}};
    const auto give = [&](const char* key, std::string_view text) { text.empty() ? void() : void(object[key] = text); };
    give("kind", kindText(own.kind));
    give("unit", own.unit);
    give("text", own.text);
    give("from", own.place);
    put(object.dump() + "\n");
  }

  bool isEmpty() const { return !any_; }

private:
  using Json = nlohmann::ordered_json;

  void put(const std::string& line)
  {
    any_ = true;
    out_.write(line);
  }

  Output& out_;
  const std::string& pattern_;
  bool json_;
  bool unused_;
  bool any_ = false;
};

int run(const Invocation& invocation)
{
  std::string pattern = invocation.arguments().empty() ? "*" : invocation.arguments().front();
  if (pattern.find_first_of("*?") == std::string::npos && pattern.find_first_not_of("#0123456789") != std::string::npos)
  {
    pattern.insert(0, 1, '*');
    pattern += '*';
  }
  const Dictionary own = givenDictionary(invocation);
  Output out("-");
  Lister lister(out, invocation, pattern);
  for (const dictionary::Entry& entry : dictionary::entries())
  {
    lister.add(entry);
  }
  for (const OwnElement& element : own.elements())
  {
    lister.add(element);
  }
  out.commit();
  if (lister.isEmpty())
  {
    const std::string similar = similarNames(invocation.arguments().front(), own);
    report(Problem{.file = {},
                   .sentence = "no element matches '" + invocation.arguments().front() + "'",
                   .hint = similar.empty() ? "" : "did you mean " + similar + "?"});
    return kFindings;
  }
  return kFine;
}

const Registration registration{{
    .place = 130,
    .name = "elements",
    .arguments = "[PATTERN]",
    .inputs = 0,
    .summary = "the dictionary: id, name, tag",
    .description =
        "Lists the elements whose tag, enum name or constant holds PATTERN, or matches it when it has * or ?;\n"
        "letter case does not count. A number is an id. Own elements, of --dictionary and of the files that\n"
        "TAV_DICTIONARY lists, come behind the others, with kind, unit and meaning. Exit status 1: none.",
    .options = {{.names = "--unused", .help = "the unused ids inside the ranges, too"},
                {.names = "--json", .help = "one JSON object an element, with all that is known of it"}},
    .concerns = kNames,
    .examples = {{"tav elements host", "every element with 'host' in one of its names"},
                 {"tav elements 60103", "the element with this id"},
                 {"tav elements --dictionary names.json queue", "own elements, too"}},
    .run = run,
}};

} // namespace

} // namespace tav::tool
