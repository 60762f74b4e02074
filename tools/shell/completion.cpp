// The completions for shells that are made from the table of options.
#include "tools/shell/options.h"
#include "tools/shell/pathCompletion.h"

namespace tav::tool
{

namespace
{

std::string joined(const std::vector<std::string>& words, const std::string& between)
{
  std::string text;
  for (const std::string& word : words)
  {
    text += (text.empty() ? "" : between) + word;
  }
  return text;
}

std::string commandNames()
{
  std::vector<std::string> names;
  for (const Command* command : commands())
  {
    names.push_back(command->name);
  }
  return joined(names, " ");
}

/// Single quotes for a shell.
std::string inQuotes(const std::string& text)
{
  std::string out = "'";
  for (const char c : text)
  {
    out += c == '\'' ? std::string("'\\''") : std::string(1, c);
  }
  return out + "'";
}

std::string bashChoices(const Command& command)
{
  std::string text;
  for (const OptionSpec& option : allOptions(command))
  {
    if (option.kind == ValueKind::choice)
    {
      text += "    " + command.name + ":" + joined(namesOf(option), "|" + command.name + ":") +
              ") COMPREPLY=($(compgen -W '" + joined(option.choices, " ") + "' -- \"$word\")); return ;;\n";
    }
  }
  return text;
}

std::string bash()
{
  std::string text = "# bash completion for tav\n_tav()\n{\n  local word=${COMP_WORDS[COMP_CWORD]} "
                     "before=${COMP_WORDS[COMP_CWORD-1]}\n"
                     "  local command=${COMP_WORDS[1]}\n  COMPREPLY=()\n"
                     "  if [[ $word == '=' ]]; then word=; elif [[ $before == '=' ]]; then "
                     "before=${COMP_WORDS[COMP_CWORD-2]}; fi\n  if ((COMP_CWORD == 1)); then\n"
                     "    COMPREPLY=($(compgen -W '" +
                     commandNames() +
                     " --help --version' -- \"$word\"))\n    return\n  fi\n  case $command:$before in\n";
  for (const Command* command : commands())
  {
    text += bashChoices(*command);
  }
  text += "  esac\n  if [[ $word == -* ]]; then\n    case $command in\n";
  for (const Command* command : commands())
  {
    std::vector<std::string> names;
    for (const OptionSpec& option : allOptions(*command))
    {
      names.push_back(joined(namesOf(option), " "));
    }
    text += "      " + command->name + ") COMPREPLY=($(compgen -W '" + joined(names, " ") + "' -- \"$word\")) ;;\n";
  }
  return text +
         "    esac\n    return\n  fi\n"
         "  local found step\n"
         "  if found=$(\"${COMP_WORDS[0]}\" complete-words bash \"${COMP_WORDS[@]:1:COMP_CWORD}\" 2>/dev/null); then\n"
         "    compopt -o nospace +o filenames 2>/dev/null\n"
         "    while IFS= read -r step; do [[ -z $step ]] || COMPREPLY+=(\"$step\"); done <<<\"$found\"\n"
         "    return\n  fi\n"
         "  COMPREPLY=($(compgen -f -- \"$word\"))\n}\ncomplete -o filenames -F _tav tav\n";
}

bool isFile(const OptionSpec& option)
{
  return option.kind == ValueKind::file || option.kind == ValueKind::input;
}

std::string zshOption(const OptionSpec& option)
{
  std::string text;
  std::string help;
  for (const char c : option.help)
  {
    help += c == '[' || c == ']' || c == ':' ? std::string("\\") + c : std::string(1, c);
  }
  for (const std::string& name : namesOf(option))
  {
    std::string spec = option.many ? "*" : "";
    spec.append(name).append("[").append(help).append("]");
    if (option.kind != ValueKind::flag)
    {
      spec += ":" + option.value + ":";
      spec += isFile(option)                     ? "_files"
              : option.kind == ValueKind::choice ? "(" + joined(option.choices, " ") + ")"
              : isPathValue(option.value)        ? "_tav_path"
                                                 : "";
    }
    text += " \\\n        " + inQuotes(spec);
  }
  return text;
}

std::string zsh()
{
  std::string text = "#compdef tav\n"
                     "_tav_path()\n{\n  local found\n"
                     "  if found=$($tav complete-words zsh \"${(@Q)words[1,CURRENT]}\" 2>/dev/null); then\n"
                     "    [[ -z $found ]] || compadd -S '' -- \"${(@f)found}\"\n"
                     "  else\n    _files\n  fi\n}\n"
                     "_tav()\n{\n  local tav=$words[1]\n  local -a commands\n  commands=(\n";
  for (const Command* command : commands())
  {
    text += "    " + inQuotes(command->name + ":" + command->summary) + "\n";
  }
  text += "  )\n  if ((CURRENT == 2)); then\n    _describe command commands\n    return\n  fi\n  case $words[2] in\n";
  for (const Command* command : commands())
  {
    text += "    " + command->name + ")\n      shift words; ((CURRENT--))\n      _arguments";
    for (const OptionSpec& option : allOptions(*command))
    {
      text += zshOption(option);
    }
    text += " \\\n        '*:file:_tav_path'\n      ;;\n";
  }
  return text + "  esac\n}\n_tav \"$@\"\n";
}

std::string fishOption(const std::string& condition, const OptionSpec& option)
{
  std::string text = "complete -c tav -n " + inQuotes(condition);
  for (const std::string& name : namesOf(option))
  {
    text += name.starts_with("--") ? " -l " + name.substr(2) : " -s " + name.substr(1);
  }
  if (option.kind != ValueKind::flag)
  {
    text += isFile(option) ? " -r -F" : " -x";
    text += option.kind == ValueKind::choice ? " -a " + inQuotes(joined(option.choices, " ")) : "";
    text += isPathValue(option.value) ? " -a '(__tav_path)'" : "";
  }
  return text + " -d " + inQuotes(option.help) + "\n";
}

std::string fish()
{
  std::string text = "# fish completion for tav\n"
                     "function __tav_path\n"
                     "  set -l words (commandline -opc) (commandline -ct)\n"
                     "  $words[1] complete-words fish $words[2..-1] 2>/dev/null\nend\n";
  for (const Command* command : commands())
  {
    text += "complete -c tav -n __fish_use_subcommand -a " + command->name + " -d " + inQuotes(command->summary) + "\n";
    if (command->arguments.find("PATH") != std::string::npos)
    {
      text += "complete -c tav -n '__fish_seen_subcommand_from " + command->name +
              "; and __tav_path >/dev/null' -f -a '(__tav_path)'\n";
    }
    for (const OptionSpec& option : allOptions(*command))
    {
      text += fishOption("__fish_seen_subcommand_from " + command->name, option);
    }
  }
  return text;
}

} // namespace

std::string completion(std::string_view shell)
{
  return shell == "bash" ? bash() : shell == "zsh" ? zsh()
                                : shell == "fish"  ? fish()
                                                   : std::string();
}

} // namespace tav::tool
