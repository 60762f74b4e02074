// tav help and tav completion: what the table of options says of the program.
#include "tools/shell/options.h"
#include "tools/shell/output.h"
#include "tools/shell/report.h"

namespace tav::tool
{

namespace
{

int help(const Invocation& invocation)
{
  if (invocation.has("--man"))
  {
    return printText(manualPage());
  }
  if (invocation.arguments().empty())
  {
    return printText(helpText());
  }
  const Command* const command = findCommand(invocation.arguments().front());
  if (command == nullptr)
  {
    failUnknownCommand(invocation.arguments().front());
  }
  return printText(helpText(*command));
}

int complete(const Invocation& invocation)
{
  const std::string text = completion(invocation.arguments().front());
  if (text.empty())
  {
    throw Failure("there is no completion for '" + invocation.arguments().front() + "'",
                  "the shells are bash, zsh and fish");
  }
  return printText(text);
}

const Registration helpRegistration{{
    .place = 200,
    .name = "help",
    .arguments = "[COMMAND]",
    .inputs = 0,
    .summary = "this list, or help on one command",
    .options = {{.names = "--man", .help = "the manual page, for man -l -"}},
    .concerns = kNoConcern,
    .run = help,
}};

const Registration completionRegistration{{
    .place = 210,
    .name = "completion",
    .arguments = "bash|zsh|fish",
    .inputs = 0,
    .summary = "completion for bash, zsh or fish",
    .concerns = kNoConcern,
    .examples = {{"source <(tav completion bash)", "complete commands and options in this shell"}},
    .run = complete,
}};

} // namespace

} // namespace tav::tool
