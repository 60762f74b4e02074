// The manual page that is made from the table of options.
#include "tools/options.h"

namespace tav::tool
{

namespace
{

/// Text for roff: nothing in it is taken for a command or a special character.
std::string roff(const std::string& text)
{
  std::string out;
  for (const char c : text)
  {
    if (c == '\\')
    {
      out += "\\e";
    }
    else if (c == '-')
    {
      out += "\\-";
    }
    else if (c == '\'')
    {
      out += "\\(aq";
    }
    else if (c == '"')
    {
      out += "\\(dq"; // a plain one would hold the arguments of a macro together, and vanish
    }
    else if (c == '.' && (out.empty() || out.back() == '\n'))
    {
      out += "\\&.";
    }
    else
    {
      out += c;
    }
  }
  return out;
}

/// Paragraphs: lines are joined by the formatter, an empty line begins a new one.
std::string paragraphs(const std::string& text)
{
  std::string out = roff(text);
  for (size_t at = out.find("\n\n"); at != std::string::npos; at = out.find("\n\n", at))
  {
    out.replace(at, 2, "\n.PP\n");
  }
  return out + "\n";
}

std::string optionsText(const std::vector<OptionSpec>& options)
{
  std::string text;
  for (const OptionSpec& option : options)
  {
    text += ".TP\n\\fB" + roff(option.names) + "\\fR";
    text += option.value.empty() ? "\n" : " \\fI" + roff(option.value) + "\\fR\n";
    std::string help = option.help;
    for (size_t i = 0; i < option.choices.size(); ++i)
    {
      help += (i == 0 ? ": " : ", ") + option.choices[i];
    }
    text += roff(help) + "\n";
  }
  return text;
}

/// Which of the common options a command takes.
std::string commonNames(const Command& command)
{
  std::string text;
  for (const OptionSpec& option : commonOptions(command))
  {
    text += (text.empty() ? "" : ", ") + longName(option);
  }
  return ".PP\nCommon options: " + roff(text) + ".\n";
}

} // namespace

std::string manualPage()
{
  std::string text =
      ".TH TAV 1\n.SH NAME\ntav \\- look into tav streams, whole or damaged\n"
      ".SH SYNOPSIS\n.B tav\n.I command\n[options] \\fIFILE\\fR ...\n"
      ".SH DESCRIPTION\nA stream is a tree of nodes in binary form. Nothing in it says how to read it: byte order,\n"
      "header width and padding are recognised, and options override what is recognised.\n"
      "\\- is standard input or output everywhere.\n.SH COMMANDS\n";
  for (const Command* command : commands())
  {
    text += ".SS tav " + roff(command->name) + " " + roff(argumentsOf(*command)) + "\n";
    text += paragraphs(command->description.empty() ? command->summary + "." : command->description);
    text += optionsText(command->options);
    text += commonNames(*command);
  }
  text += ".SH COMMON OPTIONS\nEach command tells above which of them it takes.\n" + optionsText(globalOptions());
  text +=
      ".SH PATHS\n"
      "A path leads to nodes: \\fB/system/host[2]/hostName\\fR. A step is an element's tag, its enum name, its\n"
      "constant, or \\fB#\\fIid\\fR; \\fB*\\fR is any one node, \\fB**\\fR any number of levels. \\fB[2]\\fR is the\n"
      "second of those that the step finds in a group, \\fB[@0x1a40]\\fR the one at this offset. Every path that a\n"
      "command prints is understood by every command.\n"
      ".SH EXIT STATUS\n"
      ".TP\n0\nfine\n.TP\n1\nfindings, differences, or no match\n.TP\n2\nwrong usage, or the system refused something\n"
      ".TP\n3\nthe stream is too damaged to go on\n"
      ".SH ENVIRONMENT\n.TP\nNO_COLOR\nno colours, also on a terminal\n"
      ".TP\nTERM\nno colours when it is dumb\n"
      ".TP\nTMPDIR\nwhere standard input and pipes are copied to, so that everything works on them; see "
      "\\-\\-spool\\-limit\n"
      ".SH FILES\n.TP\nshare/doc/tav\\-tools/tav.md\nwhen to use which command\n"
      ".TP\nshare/doc/tav\\-tools/json.md\nthe keys of the JSON form\n"
      ".TP\nshare/doc/tav\\-tools/check\\-rules.md\nwhat check looks for\n"
      ".TP\nshare/doc/tav\\-tools/trace.md\nhow to read a trace\n"
      ".SH EXAMPLES\n";
  for (const Command* command : commands())
  {
    for (const Example& example : command->examples)
    {
      text += ".TP\n.B " + roff(example.line) + "\n" + roff(example.text) + "\n";
    }
  }
  return text;
}

} // namespace tav::tool
