// Reads the words of a command line with the table of options. Words are taken as they are, so that every name of a
// file and every text can be given: no brackets, quotes, blanks or percent signs mean anything here.
#include <algorithm>

#include "tav/inspect/similar.hpp"
#include "tools/shell/options.h"
#include "tools/shell/report.h"

namespace tav::tool
{

namespace
{

class CommandLine
{
public:
  CommandLine(const Command& command, const std::vector<std::string>& words)
      : command_(command), options_(allOptions(command)), words_(words), invocation_(command) {}

  Invocation read()
  {
    while (at_ < words_.size())
    {
      const std::string& word = words_[at_++];
      if (word == "--")
      {
        arguments_.insert(arguments_.end(), words_.begin() + static_cast<ptrdiff_t>(at_), words_.end());
        break;
      }
      if (word.starts_with("--"))
      {
        readLong(word);
      }
      else if (word.starts_with('-') && word != "-")
      {
        readShort(word);
      }
      else
      {
        arguments_.push_back(word);
      }
    }
    for (auto& [name, values] : values_)
    {
      invocation_.give(name, std::move(values));
    }
    invocation_.giveArguments(std::move(arguments_));
    return std::move(invocation_);
  }

private:
  /// "--name", "--name=value", "--name value".
  void readLong(const std::string& word)
  {
    const size_t sign = word.find('=');
    const OptionSpec& option = find(word.substr(0, sign));
    const std::string name = longName(option);
    if (option.kind != ValueKind::flag)
    {
      give(option, sign == std::string::npos ? next(option) : word.substr(sign + 1));
      return;
    }
    if (sign != std::string::npos)
    {
      fail(name + " takes no value");
    }
    values_[name];
  }

  /// "-f", "-fg" for two flags, "-o value", "-ovalue".
  void readShort(const std::string& word)
  {
    for (size_t i = 1; i < word.size(); ++i)
    {
      const OptionSpec& option = find({'-', word[i]});
      if (option.kind != ValueKind::flag)
      {
        give(option, i + 1 == word.size() ? next(option) : word.substr(i + 1));
        return;
      }
      values_[longName(option)];
    }
  }

  const OptionSpec& find(const std::string& name) const
  {
    const auto hasName = [&](const OptionSpec& option) {
      const std::vector<std::string> names = namesOf(option);
      return std::find(names.begin(), names.end(), name) != names.end();
    };
    const auto found = std::find_if(options_.begin(), options_.end(), hasName);
    if (found == options_.end())
    {
      failUnknown(name);
    }
    return *found;
  }

  const std::string& next(const OptionSpec& option)
  {
    if (at_ == words_.size())
    {
      fail(longName(option) + " needs a value: " + longName(option) + " " + option.value);
    }
    return words_[at_++];
  }

  void give(const OptionSpec& option, const std::string& value)
  {
    const std::string name = longName(option);
    if (option.kind == ValueKind::choice &&
        std::find(option.choices.begin(), option.choices.end(), value) == option.choices.end())
    {
      std::string list;
      for (const std::string& choice : option.choices)
      {
        list += (list.empty() ? "" : ", ") + choice;
      }
      fail(name + ": '" + value + "' is none of " + list);
    }
    if (option.kind == ValueKind::number && !parseNumber(value))
    {
      fail(name + ": '" + value + "' is no number; 10, 0x1a40, 64K and 10M are");
    }
    if ((option.kind == ValueKind::file || option.kind == ValueKind::input) && value.empty())
    {
      fail(name + ": a file has a name");
    }
    values_[name].push_back(value);
  }

  [[noreturn]] void fail(const std::string& sentence, const std::string& hint = {}) const
  {
    throw Failure(command_.name + ": " + sentence,
                  hint + "'tav " + command_.name + " --help' lists the options");
  }

  [[noreturn]] void failUnknown(const std::string& name) const
  {
    std::vector<std::string> known;
    for (const OptionSpec& option : options_)
    {
      known.push_back(longName(option));
    }
    const std::string near = name.starts_with("--") ? nearest(name, known) : std::string();
    fail("there is no option '" + name + "'", near.empty() ? "" : "did you mean " + near + "? ");
  }

  const Command& command_;
  std::vector<OptionSpec> options_;
  const std::vector<std::string>& words_;
  size_t at_ = 0;
  std::map<std::string, std::vector<std::string>> values_{};
  std::vector<std::string> arguments_{};
  Invocation invocation_;
};

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

} // namespace

Invocation readCommandLine(const Command& command, const std::vector<std::string>& words)
{
  Invocation invocation = CommandLine(command, words).read();
  if (!invocation.has("--help"))
  {
    checkArguments(command, invocation.arguments());
  }
  return invocation;
}

} // namespace tav::tool
