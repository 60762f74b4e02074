// Finds out which command is meant, and runs it.
#include <algorithm>
#include <cstdio>
#include <new>
#include <optional>

#include "tools/host/host.h"
#include "tools/shell/hints.h"
#include "tools/shell/options.h"
#include "tools/shell/output.h"
#include "tools/shell/pathCompletion.h"
#include "tools/shell/report.h"
#include "tools/shell/trace.h"

#ifndef TAV_VERSION
#define TAV_VERSION "unknown"
#endif

namespace tav::tool
{

namespace
{

int runCommand(const Command& command, const std::vector<std::string>& words)
{
  std::optional<Invocation> invocation;
  try
  {
    invocation = readCommandLine(command, words);
  }
  catch (const Failure&)
  {
    // Who asks for help beside something that is wrong gets it.
    const auto end = std::find(words.begin(), words.end(), "--");
    if (std::find(words.begin(), end, "--help") == end && std::find(words.begin(), end, "-h") == end)
    {
      throw;
    }
  }
  if (!invocation || invocation->has("--help"))
  {
    return printText(helpText(command));
  }
  checkOutputs(*invocation);
  const TraceFile trace(*invocation);
  return command.run(*invocation);
}

/// The common option that a word begins with: "--name" or "--name=value"; null for others.
const OptionSpec* findCommonOption(const std::string& word)
{
  const auto& options = globalOptions();
  const std::string name = word.substr(0, word.find('='));
  const auto found =
      std::find_if(options.begin(), options.end(), [&](const OptionSpec& option) { return longName(option) == name; });
  return found == options.end() ? nullptr : &*found;
}

bool isUnknownOption(const std::string& word)
{
  return word.starts_with("--") && word != "--" && findCommonOption(word) == nullptr;
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
    return printText("tav " TAV_VERSION "\n");
  }
  if (first == "complete-words")
  {
    return completeWords({words.begin() + 1, words.end()});
  }
  if (first == "-h" || first == "--help")
  {
    return printText(helpText());
  }
  // Options that all commands take may stand before the command's name.
  size_t at = 0;
  while (at < words.size() && words[at].starts_with("-") && words[at] != "-")
  {
    const OptionSpec* const option = findCommonOption(words[at]);
    at += option != nullptr && option->kind != ValueKind::flag && words[at].find('=') == std::string::npos ? 2 : 1;
  }
  const Command* const command = at < words.size() ? findCommand(words[at]) : nullptr;
  if (command == nullptr)
  {
    failUnknownCommand(at < words.size() && !isUnknownOption(first) ? words[at] : first);
  }
  std::vector<std::string> rest = words;
  rest.erase(rest.begin() + static_cast<ptrdiff_t>(at));
  return runCommand(*command, rest);
}

} // namespace

int runProgram(int argc, char** argv)
{
  host::prepareStandardStreams();
  try
  {
    return dispatch(host::commandLine(argc, argv));
  }
  catch (const Failure& failure)
  {
    report(failure.problem);
    return failure.status;
  }
  catch (const Error& error)
  {
    report(withHint(error.problem()));
    return statusOf(error);
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
