/// @file options.h
/// The table of commands and options. The command line, --help, the manual page and the completions all come from it.
///
/// A command lives in a file cmd_NAME.cpp, which ends in one registration:
///
///   const Registration registration{{
///     .place = 30, .name = "tree", .arguments = "FILE", .summary = "one line a node", ...
///     .run = run }};
#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace tav::tool
{

/// What a value is, for completion and checking.
enum class ValueKind : uint8_t
{
  flag, ///< the option has no value
  text,
  number, ///< 10, 0x1a40, 64K, 10M
  file,   ///< a file that is written
  input,  ///< a file that is read
  choice  ///< one of `choices`
};

/// What a command has to do with. It decides which of the common options the command takes.
enum Concern : unsigned
{
  kNoConcern = 0,
  kForm = 1,  ///< how a stream is laid out
  kInput = 2, ///< streams that are read
  kCalls = 4, ///< the library's calls
  kNames = 8, ///< names of elements
  kAllConcerns = 15,
  kFiles = 16 ///< files that are written; the command's options tell
};

struct OptionSpec
{
  std::string names; ///< "-o,--output"; the long one is what commands ask for
  ValueKind kind = ValueKind::flag;
  std::string value{}; ///< how the value is called in help: "FILE"
  std::string help{};
  std::vector<std::string> choices{};
  bool many = false;            ///< may be given several times
  bool required = false;        ///< shown in the command's usage; the command itself reports it missing
  Concern concern = kNoConcern; ///< of a common option: what a command must have to do with; else it takes it always
};

struct Example
{
  std::string line; ///< "tav get x.tav /system/host/hostName"
  std::string text; ///< what it does
};

class Invocation;

struct Command
{
  int place = 0; ///< order in lists
  std::string name;
  std::string arguments{};   ///< "FILE PATH..."; "[X]" is not required, "..." takes all that are left
  size_t inputs = 1;         ///< how many of the first arguments are files that are read
  std::string summary{};     ///< one line, lower case, no full stop
  std::string description{}; ///< paragraphs, separated by an empty line
  std::vector<OptionSpec> options{};
  unsigned concerns = kAllConcerns; ///< decide which common options there are, too
  std::vector<Example> examples{};
  int (*run)(const Invocation&) = nullptr; ///< returns the exit status
};

/// All commands in order.
std::vector<const Command*> commands();

/// The options that commands have in common.
const std::vector<OptionSpec>& globalOptions();

/// Those of the common options that a command takes.
std::vector<OptionSpec> commonOptions(const Command& command);

/// All that a command takes: its own options and the common ones.
std::vector<OptionSpec> allOptions(const Command& command);

/// "tree", or null.
const Command* findCommand(std::string_view name);

/// Throws Failure for a name that no command has, with the nearest one.
[[noreturn]] void failUnknownCommand(std::string_view name);

/// Puts a command into the table.
struct Registration
{
  explicit Registration(Command command);
};

/// What was given on the command line. Options are asked for by their long name, "--depth", and must be in the table.
class Invocation
{
public:
  explicit Invocation(const Command& command)
      : command_(&command) {}

  const Command& command() const { return *command_; }
  bool has(std::string_view option) const;
  std::string text(std::string_view option, std::string_view otherwise = {}) const;
  std::vector<std::string> all(std::string_view option) const;
  std::optional<uint64_t> number(std::string_view option) const;
  /// The arguments that are no options.
  const std::vector<std::string>& arguments() const { return arguments_; }

  void give(const std::string& option, std::vector<std::string> values) { values_[option] = std::move(values); }
  void giveArguments(std::vector<std::string> arguments) { arguments_ = std::move(arguments); }

private:
  const std::vector<std::string>* find(std::string_view option) const;

  const Command* command_;
  std::map<std::string, std::vector<std::string>, std::less<>> values_{};
  std::vector<std::string> arguments_{};
};

/// "10", "0x1a40", "64K", "10M", "2G"; nothing when the text is no number.
std::optional<uint64_t> parseNumber(std::string_view text);

/// The long name of an option: "--output" of "-o,--output".
std::string longName(const OptionSpec& option);

/// All names of an option: "-o", "--output".
std::vector<std::string> namesOf(const OptionSpec& option);

/// "FILE -o OUT": the arguments of a command and what else must be given.
std::string argumentsOf(const Command& command);

/// Reads the words of a command line, the command's name left out. They are taken as they are: nothing in them but the
/// dashes of options has a meaning here. Throws Failure for what the command does not take.
Invocation readCommandLine(const Command& command, const std::vector<std::string>& words);

/// Runs the program: reads the command line, runs the command, and returns the exit status.
int runProgram(int argc, char** argv);

/// The texts that are made from the table.
std::string manualPage();
std::string completion(std::string_view shell); ///< bash, zsh, fish; empty for others
std::string helpText();                         ///< of the program
std::string helpText(const Command& command);

} // namespace tav::tool
