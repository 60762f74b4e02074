#include "tools/shell/options.h"

#include <algorithm>
#include <charconv>
#include <stdexcept>

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

const std::vector<OptionSpec>& globalOptions()
{
  static const std::vector<OptionSpec> options = {
      {.names = "--byte-order",
       .kind = ValueKind::choice,
       .value = "ORDER",
       .help = "read FILE in this byte order instead of the recognised one",
       .choices = {"native", "swapped", "little", "big"}},
      {.names = "--root",
       .kind = ValueKind::choice,
       .value = "BITS",
       .help = "width of the first node's header",
       .choices = {"32", "64"}},
      {.names = "--align", .help = "payloads are padded to multiples of 8"},
      {.names = "--no-align", .help = "payloads are not padded unless their header says so"},
      {.names = "--ring",
       .kind = ValueKind::number,
       .value = "BYTES",
       .help = "memory for the file's bytes, 10M unless given"},
      {.names = "--trace",
       .kind = ValueKind::file,
       .value = "FILE",
       .help = "write the library's trace to FILE as text"},
      {.names = "--trace-probe",
       .kind = ValueKind::text,
       .value = "PROBE",
       .help = "only records of this function, by name or id",
       .many = true},
      {.names = "--force", .help = "replace existing files"},
      {.names = "--stats", .help = "tell on standard error how much was read"},
      {.names = "-h,--help", .help = "show help and exit"},
  };
  return options;
}

std::string longName(const OptionSpec& option)
{
  const size_t dashes = option.names.find("--");
  return option.names.substr(dashes == std::string::npos ? 0 : dashes);
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
