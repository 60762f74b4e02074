// The help texts that are made from the table of options.
#include <algorithm>

#include "tools/shell/options.h"

namespace tav::tool
{

namespace
{

constexpr size_t kColumn = 28;
constexpr size_t kWidth = 96;
constexpr int kAboutTheProgram = 200; ///< the place of commands that have to do with no stream

/// "  left    right", the right part wrapped and indented.
std::string entry(const std::string& left, const std::string& right, size_t column)
{
  std::string text = "  " + left;
  size_t at = text.size();
  if (at + 2 > column && !right.empty())
  {
    text += "\n";
    at = 0;
  }
  text.append(column > at ? column - at : 0, ' ');
  size_t used = column;
  for (size_t start = 0; start < right.size();)
  {
    const size_t end = std::min(right.find(' ', start), right.size());
    if (used + (end - start) > kWidth && used > column)
    {
      text += "\n" + std::string(column, ' ');
      used = column;
    }
    text += (used > column ? " " : "") + right.substr(start, end - start);
    used += end - start + 1;
    start = end + 1;
  }
  return text + "\n";
}

std::string optionText(const OptionSpec& option)
{
  std::string left = option.names;
  const size_t comma = left.find(',');
  comma == std::string::npos ? left.insert(0, "    ") : left.insert(comma + 1, " ");
  left += option.value.empty() ? "" : " " + option.value;
  std::string right = option.help;
  for (size_t i = 0; i < option.choices.size(); ++i)
  {
    right += (i == 0 ? ": " : ", ") + option.choices[i];
  }
  return entry(left, right, kColumn);
}

} // namespace

std::string helpText()
{
  std::string text = "usage: tav COMMAND [options] FILE ...   or   tav --version\n"
                     "Looks into tav streams, whole or damaged. - is standard input or output.\n\n";
  for (const Command* command : commands())
  {
    if (command->place < kAboutTheProgram)
    {
      text += entry(command->name, command->summary, 14);
    }
  }
  // A terminal has 24 lines: what is about the program itself is in one, and none is empty before it.
  text += "'tav help COMMAND' tells more, with examples; 'tav completion SHELL' is for bash, zsh and fish.\n"
          "Exit status: 0 fine; 1 findings or no match; 2 wrong usage or trouble; 3 too damaged to go on.\n";
  return text;
}

std::string helpText(const Command& command)
{
  std::string text = "usage: tav " + command.name + " [options] " + argumentsOf(command) + "\n\n";
  text += command.description.empty() ? command.summary + "\n" : command.description + "\n";
  if (!command.options.empty())
  {
    text += "\nOptions\n";
  }
  for (const OptionSpec& option : command.options)
  {
    text += optionText(option);
  }
  text += "\nCommon options\n";
  for (const OptionSpec& option : commonOptions(command))
  {
    text += optionText(option);
  }
  if (!command.examples.empty())
  {
    text += "\nExamples\n";
  }
  for (const Example& example : command.examples)
  {
    text += "  " + example.line + "\n" + entry("", example.text, 6);
  }
  return text;
}

} // namespace tav::tool
