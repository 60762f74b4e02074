#include "tools/shell/pathCompletion.h"

#include <algorithm>
#include <chrono>
#include <cstdint>
#include <exception>
#include <filesystem>
#include <map>
#include <optional>
#include <set>
#include <span>
#include <string_view>
#include <system_error>
#include <utility>

#include "tav/inspect.hpp"
#include "tools/host/host.h"
#include "tools/shell/dictionary.h"
#include "tools/shell/options.h"
#include "tools/shell/output.h"
#include "tools/shell/session.h"

namespace tav::tool
{

namespace
{

constexpr size_t kMostBytes = size_t{4} * 1024 * 1024; ///< of a file that are looked at
constexpr std::chrono::milliseconds kMostTime(300);
constexpr size_t kMostOffers = 1000;

/// A word as the shell will hand it over, from how it is typed: bash hands out what is typed.
std::string unquoted(std::string_view typed)
{
  std::string word;
  char quote = '\0';
  for (size_t i = 0; i < typed.size(); ++i)
  {
    const char c = typed[i];
    if (c == quote)
    {
      quote = '\0';
    }
    else if (quote == '\0' && (c == '\'' || c == '"'))
    {
      quote = c;
    }
    else if (c == '\\' && quote != '\'' && i + 1 < typed.size())
    {
      word += typed[++i];
    }
    else
    {
      word += c;
    }
  }
  const std::vector<std::string> home = host::pathList("HOME");
  return word.starts_with("~/") && !home.empty() ? home.front() + word.substr(1) : word;
}

/// Words as they were typed: bash makes three of those that have a sign of equality outside of quotation marks. The
/// value of an option is a word of its own.
std::vector<std::string> putTogether(const std::vector<std::string>& parts)
{
  std::vector<std::string> words;
  for (size_t i = 0; i < parts.size(); ++i)
  {
    if (parts[i] != "=" || words.empty())
    {
      words.push_back(parts[i]);
      continue;
    }
    const std::string value = i + 1 < parts.size() ? parts[++i] : std::string();
    words.back().starts_with("--") ? words.push_back(value) : void(words.back() += "=" + value);
  }
  return words;
}

/// How help calls the argument at a place; the last ones repeat, alone or as a pair.
std::string argumentAt(const Command& command, size_t place)
{
  std::vector<std::string> names = host::separated(command.arguments, ' ');
  const bool repeats = !names.empty() && names.back().find("...") != std::string::npos;
  for (std::string& name : names)
  {
    std::erase_if(name, [](char c) { return c == '[' || c == ']' || c == '.'; });
  }
  const size_t count = names.size();
  if (place >= count && repeats)
  {
    const bool isPair = count > 1 && names[count - 2] == "PATH";
    place = isPair ? count - 2 + (place - count) % 2 : count - 1;
  }
  return place < count ? names[place] : "";
}

/// A command line as far as it is typed.
struct Typed
{
  std::string name{};    ///< as help calls what is typed: "PATH", "FILE"
  std::string option{};  ///< that it is the value of; empty: of none
  Invocation invocation; ///< all before it
};

Typed readTyped(const Command& command, const std::vector<std::string>& words)
{
  const std::vector<OptionSpec> options = allOptions(command);
  std::map<std::string, std::vector<std::string>> values;
  std::vector<std::string> arguments;
  const OptionSpec* waiting = nullptr; ///< for its value
  bool onlyArguments = false;
  for (size_t i = 0; i + 1 < words.size(); ++i)
  {
    const std::string& word = words[i];
    if (waiting != nullptr)
    {
      values[longName(*std::exchange(waiting, nullptr))].push_back(word);
      continue;
    }
    if (onlyArguments || !word.starts_with('-') || word == "-")
    {
      arguments.push_back(word);
      continue;
    }
    onlyArguments = word == "--";
    const size_t sign = word.starts_with("--") ? word.find('=') : std::string::npos;
    const auto isIt = [&](const OptionSpec& option) {
      const std::vector<std::string> names = namesOf(option);
      return std::find(names.begin(), names.end(), word.substr(0, sign)) != names.end();
    };
    const auto option = std::find_if(options.begin(), options.end(), isIt);
    if (option != options.end() && option->kind != ValueKind::flag)
    {
      sign == std::string::npos ? void(waiting = &*option) : values[longName(*option)].push_back(word.substr(sign + 1));
    }
  }
  Typed typed{.invocation = Invocation(command)};
  typed.name = waiting != nullptr ? waiting->value : argumentAt(command, arguments.size());
  typed.option = waiting != nullptr ? longName(*waiting) : "";
  for (auto& [name, given] : values)
  {
    typed.invocation.give(name, std::move(given));
  }
  typed.invocation.giveArguments(std::move(arguments));
  return typed;
}

/// What is typed of a path: what stays, the steps that are complete, and the begin of the next one.
struct Begun
{
  std::string kept{};
  std::string steps{};
  std::string next{};
};

/// Nothing within brackets or quotation marks, where no step is typed.
std::optional<Begun> readBegun(const std::string& word)
{
  size_t depth = 0;
  char quote = '\0';
  size_t begin = 0;
  size_t slash = std::string::npos;
  for (size_t i = 0; i < word.size(); ++i)
  {
    const char c = word[i];
    if (quote != '\0' || c == '\'' || c == '"')
    {
      quote = quote == '\0' ? c : c == quote ? '\0'
                                             : quote;
      continue;
    }
    depth += c == '[' ? 1 : 0;
    depth -= c == ']' && depth != 0 ? 1 : 0;
    if (depth == 0 && (c == '|' || (c == ' ' && begin == i)))
    {
      begin = i + 1;
      slash = std::string::npos;
    }
    slash = depth == 0 && c == '/' ? i : slash;
  }
  if (depth != 0 || quote != '\0')
  {
    return std::nullopt;
  }
  const size_t next = slash == std::string::npos ? begin : slash + 1;
  return Begun{word.substr(0, begin), word.substr(begin, next - begin), word.substr(next)};
}

/// The begin of a regular file. What is read of others would be gone.
std::vector<uint8_t> beginOf(const std::string& path)
{
  std::error_code error;
  if (!std::filesystem::is_regular_file(host::pathOf(path), error))
  {
    return {};
  }
  const auto source = ByteSource::open(path);
  std::vector<uint8_t> bytes(static_cast<size_t>(std::min<uint64_t>(source->size(), kMostBytes)));
  bytes.resize(source->read(0, bytes));
  return bytes;
}

/// The names that the last step of a path leads to, in the order of the stream.
std::vector<std::string> namesAt(ByteSource& source, const Form& form, const Path& path, const std::string& begun)
{
  const auto end = std::chrono::steady_clock::now() + kMostTime;
  std::vector<std::string> names;
  std::set<uint16_t> seen;
  Walker walker(source, form);
  PathMatcher matcher(path);
  for (Event event; walker.next(event) && names.size() < kMostOffers && std::chrono::steady_clock::now() < end;)
  {
    if (event.what != What::nodeBegin)
    {
      continue;
    }
    if (matcher.matches(walker, event) && seen.insert(event.node.elm()).second)
    {
      const std::string name = elementText(event.node.elm(), source.dictionary());
      name.starts_with(begun) ? names.push_back(name) : void();
    }
    if (event.node.isGroup() && !matcher.reachesBelow())
    {
      walker.skip();
    }
  }
  return names;
}

/// The file that a path is of.
std::string fileOf(const Typed& typed)
{
  const std::vector<std::string>& arguments = typed.invocation.arguments();
  const bool second = typed.option == "--path-b" && arguments.size() > 1;
  return arguments.empty() ? std::string() : arguments[second ? 1 : 0];
}

/// `part`: the shell puts what is offered in the place of what stands behind a column's name alone.
void offer(const Typed& typed, const std::string& word, bool part)
{
  const size_t sign = typed.name.starts_with("[NAME=]") ? word.find('=') : std::string::npos;
  const std::string label = sign == std::string::npos ? "" : word.substr(0, sign + 1);
  const auto begun = readBegun(word.substr(label.size()));
  const std::vector<uint8_t> bytes = begun ? beginOf(fileOf(typed)) : std::vector<uint8_t>();
  if (bytes.empty())
  {
    return;
  }
  ByteSource source(fileOf(typed), std::span<const uint8_t>(bytes));
  source.setDictionary(dictionaryFor(typed.invocation, fileOf(typed)));
  const Recognition found = recognise(source, formChoice(typed.invocation));
  if (!found.isStream)
  {
    return;
  }
  const bool isRelative = typed.option == "--col"; // to the rows that --each names
  const std::string rows = isRelative && !begun->steps.starts_with('/') ? typed.invocation.text("--each") + "/" : "";
  const Path path = pathOf(rows + begun->steps + "*", source.dictionary());
  const std::string slash = begun->steps.empty() && begun->next.empty() && !isRelative ? "/" : "";
  const std::string typedSteps = (part ? "" : label) + begun->kept + slash + begun->steps;
  Output out("-");
  for (const std::string& name : namesAt(source, found.form, path, begun->next))
  {
    out.write(typedSteps);
    out.write(name);
    out.write("\n");
  }
  out.commit();
}

} // namespace

bool isPathValue(const std::string& value)
{
  return value == "PATH" || value == "[NAME=]PATH";
}

int completeWords(const std::vector<std::string>& words)
{
  if (words.size() < 3)
  {
    return kFindings;
  }
  std::vector<std::string> line(words.begin() + 1, words.end());
  bool part = false;
  if (words.front() == "bash")
  {
    std::transform(line.begin(), line.end(), line.begin(), unquoted);
    const std::string last = line.back() == "=" ? "" : line.back();
    line = putTogether(line);
    part = line.back() != last;
  }
  const Command* const command = findCommand(line.front());
  if (command == nullptr)
  {
    return kFindings;
  }
  line.erase(line.begin());
  const Typed typed = readTyped(*command, line);
  if (!isPathValue(typed.name))
  {
    return kFindings;
  }
  try
  {
    offer(typed, line.back(), part);
  }
  catch (const std::exception&) // of a line that is being typed, nothing is told
  {
  }
  return kFine;
}

} // namespace tav::tool
