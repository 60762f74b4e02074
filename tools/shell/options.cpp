#include "tools/shell/options.h"

#include <algorithm>
#include <charconv>
#include <stdexcept>

#include "tav/inspect/similar.hpp"
#include "tools/shell/report.h"

namespace tav::tool
{

namespace
{

std::vector<Command>& table()
{
  static std::vector<Command> commands;
  return commands;
}

} // namespace

Registration::Registration(Command command)
{
  table().push_back(std::move(command));
}

std::vector<const Command*> commands()
{
  std::vector<const Command*> list;
  for (const Command& command : table())
  {
    list.push_back(&command);
  }
  std::sort(list.begin(), list.end(), [](const Command* a, const Command* b) { return a->place < b->place; });
  return list;
}

const Command* findCommand(std::string_view name)
{
  const auto found =
      std::find_if(table().begin(), table().end(), [&](const Command& command) { return command.name == name; });
  return found == table().end() ? nullptr : &*found;
}

void failUnknownCommand(std::string_view name)
{
  const bool option = name.starts_with('-');
  name = option ? name.substr(0, name.find('=')) : name;
  std::vector<std::string> known;
  for (const Command* command : commands())
  {
    known.push_back(command->name);
  }
  for (const OptionSpec& common : globalOptions())
  {
    known.push_back(longName(common));
  }
  known.emplace_back("--version");
  const std::string near = nearest(name, known);
  throw Failure("there is no " + std::string(option ? "option" : "command") + " '" + std::string(name) + "'",
                (near.empty() ? "" : "did you mean " + near + "? ") + std::string("'tav --help' lists the commands"));
}

const std::vector<OptionSpec>& globalOptions()
{
  static const std::vector<OptionSpec> options = {
      {.names = "--byte-order",
       .kind = ValueKind::choice,
       .value = "ORDER",
       .help = "read FILE in this byte order instead of the recognised one",
       .choices = {"native", "swapped", "little", "big"},
       .concern = kForm},
      {.names = "--root",
       .kind = ValueKind::choice,
       .value = "BITS",
       .help = "width of the first node's header",
       .choices = {"32", "64"},
       .concern = kForm},
      {.names = "--align", .help = "payloads are padded to multiples of 8", .concern = kForm},
      {.names = "--no-align", .help = "payloads are not padded unless their header says so", .concern = kForm},
      {.names = "--from",
       .kind = ValueKind::number,
       .value = "OFFSET",
       .help = "read FILE as if it began at OFFSET; all offsets then count from there",
       .concern = kInput},
      {.names = "--dictionary",
       .kind = ValueKind::input,
       .value = "FILE",
       .help = "names of own elements; before those of TAV_DICTIONARY",
       .many = true,
       .concern = kNames},
      {.names = "--ring",
       .kind = ValueKind::number,
       .value = "BYTES",
       .help = "memory for the file's bytes, 10M unless given",
       .concern = kInput},
      {.names = "--spool-limit",
       .kind = ValueKind::number,
       .value = "BYTES",
       .help = "the most that is copied from a pipe, 16G unless given; 0 for no limit",
       .concern = kInput},
      {.names = "--trace",
       .kind = ValueKind::file,
       .value = "FILE",
       .help = "write the library's trace to FILE as text",
       .concern = kCalls},
      {.names = "--trace-probe",
       .kind = ValueKind::text,
       .value = "PROBE",
       .help = "only records of this function, by name or id",
       .many = true,
       .concern = kCalls},
      {.names = "--force", .help = "replace existing files", .concern = kFiles},
      {.names = "--stats", .help = "tell on standard error how much was read", .concern = kInput},
      {.names = "-h,--help", .help = "show help and exit"},
  };
  return options;
}

std::vector<OptionSpec> commonOptions(const Command& command)
{
  unsigned concerns = command.concerns;
  const auto writes = [](const OptionSpec& option) { return option.kind == ValueKind::file; };
  if ((concerns & kCalls) != 0 || std::any_of(command.options.begin(), command.options.end(), writes))
  {
    concerns |= kFiles; // a trace is a file, too
  }
  std::vector<OptionSpec> options;
  for (const OptionSpec& option : globalOptions())
  {
    if (option.concern == kNoConcern || (option.concern & concerns) != 0)
    {
      options.push_back(option);
    }
  }
  return options;
}

std::vector<OptionSpec> allOptions(const Command& command)
{
  std::vector<OptionSpec> options = command.options;
  const std::vector<OptionSpec> common = commonOptions(command);
  options.insert(options.end(), common.begin(), common.end());
  return options;
}

std::vector<std::string> namesOf(const OptionSpec& option)
{
  const size_t comma = option.names.find(',');
  if (comma == std::string::npos)
  {
    return {option.names};
  }
  return {option.names.substr(0, comma), option.names.substr(comma + 1)};
}

std::string longName(const OptionSpec& option)
{
  return namesOf(option).back();
}

std::string argumentsOf(const Command& command)
{
  std::string text = command.arguments;
  for (const OptionSpec& option : command.options)
  {
    if (option.required)
    {
      text += (text.empty() ? "" : " ") + option.names.substr(0, option.names.find(',')) + " " + option.value;
    }
  }
  return text;
}

std::optional<uint64_t> parseNumber(std::string_view text)
{
  uint64_t factor = 1;
  if (!text.empty() && !text.starts_with("0x"))
  {
    static constexpr std::string_view units = "KMGT";
    const size_t unit = units.find(text.back());
    if (unit != std::string_view::npos)
    {
      factor = uint64_t{1} << (10 * (unit + 1));
      text.remove_suffix(1);
    }
  }
  const bool hexadecimal = text.starts_with("0x") || text.starts_with("0X");
  text.remove_prefix(hexadecimal ? 2 : 0);
  uint64_t value = 0;
  const char* const end = text.data() + text.size();
  const auto result = std::from_chars(text.data(), end, value, hexadecimal ? 16 : 10);
  if (result.ec != std::errc() || result.ptr != end || value > ~uint64_t{0} / factor)
  {
    return std::nullopt;
  }
  return value * factor;
}

const std::vector<std::string>* Invocation::find(std::string_view option) const
{
  const auto known = [&](const OptionSpec& spec) { return longName(spec) == option; };
  const auto& own = command_->options;
  const auto& global = globalOptions();
  if (std::none_of(own.begin(), own.end(), known) && std::none_of(global.begin(), global.end(), known))
  {
    throw std::logic_error("the command asks for " + std::string(option) + ", which is not in its table");
  }
  const auto found = values_.find(option);
  return found == values_.end() ? nullptr : &found->second;
}

bool Invocation::has(std::string_view option) const
{
  return find(option) != nullptr;
}

std::string Invocation::text(std::string_view option, std::string_view otherwise) const
{
  const auto* values = find(option);
  return values == nullptr || values->empty() ? std::string(otherwise) : values->back();
}

std::vector<std::string> Invocation::all(std::string_view option) const
{
  const auto* values = find(option);
  return values == nullptr ? std::vector<std::string>() : *values;
}

std::optional<uint64_t> Invocation::number(std::string_view option) const
{
  const auto* values = find(option);
  return values == nullptr || values->empty() ? std::nullopt : parseNumber(values->back());
}

} // namespace tav::tool
