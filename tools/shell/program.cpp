// Reads the command line with the table of options, and runs a command.
#include <algorithm>
#include <cstdio>
#include <map>
#include <new>

#include <CLI/CLI.hpp>

#include "kor/host.h"
#include "tools/shell/options.h"
#include "tools/shell/output.h"
#include "tools/shell/report.h"
#include "tools/shell/trace.h"

#ifndef TAV_VERSION
#define TAV_VERSION "unknown"
#endif

namespace tav::tool
{

namespace
{

/// Where the parser puts what it found: one entry an option.
using Values = std::map<std::string, std::vector<std::string>>;

void addOption(CLI::App& app, const OptionSpec& spec, Values& values)
{
  const std::string name = longName(spec);
  if (name == "--help")
  {
    return;
  }
  if (spec.kind == ValueKind::flag)
  {
    app.add_flag_callback(
        spec.names, [&values, name] { values[name]; }, spec.help);
    return;
  }
  CLI::Option* const option = app.add_option(spec.names, values[name + "="], spec.help);
  option->type_name(spec.value)
      ->expected(1)
      ->allow_extra_args(false)
      ->multi_option_policy(spec.many ? CLI::MultiOptionPolicy::TakeAll : CLI::MultiOptionPolicy::TakeLast);
  option->each([&values, name](const std::string& value) { values[name].push_back(value); });
  if (spec.kind == ValueKind::choice)
  {
    option->check(CLI::IsMember(spec.choices));
  }
  if (spec.kind == ValueKind::number)
  {
    option->check([](const std::string& text) {
      return parseNumber(text) ? std::string() : "'" + text + "' is no number; 10, 0x1a40, 64K and 10M are";
    });
  }
}

struct Arity
{
  size_t least = 0;
  size_t most = 0;
};

/// How many arguments "FILE [PATH...]" stands for.
Arity arityOf(const std::string& arguments)
{
  Arity arity;
  for (size_t at = 0; at < arguments.size();)
  {
    const size_t end = std::min(arguments.find(' ', at), arguments.size());
    const std::string word = arguments.substr(at, end - at);
    const bool optional = word.starts_with('[');
    const bool many = word.find("...") != std::string::npos;
    arity.least += optional ? 0 : 1;
    arity.most = many ? 1'000'000 : arity.most + 1;
    at = end + 1;
  }
  return arity;
}

const Command* findCommand(std::string_view name)
{
  for (const Command* command : commands())
  {
    if (command->name == name)
    {
      return command;
    }
  }
  return nullptr;
}

void checkArguments(const Command& command, const std::vector<std::string>& arguments)
{
  const Arity arity = arityOf(command.arguments);
  if (arguments.size() < arity.least)
  {
    throw Failure(command.name + ": an argument is missing: tav " + command.name + " " + argumentsOf(command),
                  "'tav " + command.name + " --help' tells more" +
                      (command.inputs == 0 ? "" : "; - is standard input"));
  }
  if (arguments.size() > arity.most)
  {
    throw Failure(command.name + ": '" + arguments[arity.most] + "' is one argument too many");
  }
}

int runCommand(const Command& command, std::vector<std::string> words)
{
  CLI::App app;
  app.set_help_flag();
  app.allow_windows_style_options(false);
  Values values;
  std::vector<std::string> arguments;
  for (const auto* list : {&command.options, &globalOptions()})
  {
    for (const OptionSpec& spec : *list)
    {
      addOption(app, spec, values);
    }
  }
  app.add_option("arguments", arguments);
  std::reverse(words.begin(), words.end());
  try
  {
    app.parse(words);
  }
  catch (const CLI::ParseError& error)
  {
    throw Failure(command.name + ": " + error.what(), "'tav " + command.name + " --help' lists the options");
  }
  Invocation invocation(command);
  for (auto& [name, list] : values)
  {
    if (!name.ends_with('='))
    {
      invocation.give(name, std::move(list));
    }
  }
  checkArguments(command, arguments);
  invocation.giveArguments(std::move(arguments));
  checkOutputs(invocation);
  const TraceFile trace(invocation);
  return command.run(invocation);
}

int print(const std::string& text)
{
  Output out("-");
  out.write(text);
  out.commit();
  return kFine;
}

int dispatch(const std::vector<std::string>& words)
{
  if (words.empty())
  {
    std::fputs(helpText().c_str(), stderr);
    return kTrouble;
  }
  const std::string& first = words.front();
  if (first == "--version")
  {
    return print("tav " TAV_VERSION "\n");
  }
  if (first == "-h" || first == "--help")
  {
    return print(helpText());
  }
  // Options that all commands take may stand before the command's name.
  size_t at = 0;
  while (at < words.size() && words[at].starts_with("-") && words[at] != "-")
  {
    const auto& options = globalOptions();
    const auto spec =
        std::find_if(options.begin(), options.end(), [&](const OptionSpec& s) { return longName(s) == words[at]; });
    at += spec != options.end() && spec->kind != ValueKind::flag ? 2 : 1;
  }
  const std::string name = at < words.size() ? words[at] : first;
  const Command* const command = findCommand(name);
  if (command == nullptr)
  {
    throw Failure("there is no command '" + name + "'", "'tav --help' lists the commands");
  }
  std::vector<std::string> rest = words;
  rest.erase(rest.begin() + static_cast<ptrdiff_t>(at));
  const auto end = std::find(rest.begin(), rest.end(), "--");
  if (std::find(rest.begin(), end, "--help") != end || std::find(rest.begin(), end, "-h") != end)
  {
    return print(helpText(*command));
  }
  return runCommand(*command, rest);
}

} // namespace

int runProgram(int argc, char** argv)
{
  kor::prepareStandardStreams();
  try
  {
    return dispatch(kor::commandLine(argc, argv));
  }
  catch (const Failure& failure)
  {
    report(failure.problem);
    return failure.status;
  }
  catch (const Error& error)
  {
    report(error.problem());
    return error.trouble() == Trouble::notFound ? kFindings : kTrouble;
  }
  catch (const ClosedPipe&)
  {
    return kFine;
  }
  catch (const std::bad_alloc&)
  {
    report("not enough memory");
    return kTrouble;
  }
}

} // namespace tav::tool
