#include "fuzz/commands.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <stdexcept>

#include "fuzz/input.h"
#include "tools/shell/options.h"
#include "tools/shell/report.h"

namespace fuzz
{

namespace
{

namespace fs = std::filesystem;

fs::path place()
{
  const fs::path inMemory = "/dev/shm";
  std::error_code ec;
  return fs::is_directory(inMemory, ec) ? inMemory : fs::temp_directory_path();
}

const tav::tool::Command& commandOf(std::string_view name)
{
  for (const tav::tool::Command* command : tav::tool::commands())
  {
    if (command->name == name)
    {
      return *command;
    }
  }
  throw std::logic_error("no command " + std::string(name));
}

} // namespace

std::vector<Option> formOptions(uint8_t flags)
{
  std::vector<Option> options;
  if ((flags & 0x80U) == 0)
  {
    return options; // recognised from the bytes
  }
  options.push_back({"--byte-order", (flags & 1U) != 0 ? "swapped" : "native"});
  options.push_back({(flags & 2U) != 0 ? "--align" : "--no-align"});
  options.push_back({"--root", (flags & 4U) != 0 ? "32" : "64"});
  return options;
}

std::vector<Option> with(std::vector<Option> options, std::initializer_list<Option> more)
{
  options.insert(options.end(), more);
  return options;
}

Folder::Folder()
{
  std::string pattern = (place() / "tav-fuzz-XXXXXX").string();
  if (mkdtemp(pattern.data()) == nullptr)
  {
    throw std::runtime_error("no folder " + pattern);
  }
  path_ = pattern;
}

Folder::~Folder()
{
  std::error_code ignored;
  fs::remove_all(path_, ignored);
}

std::string Folder::path(std::string_view name) const
{
  return path_ + "/" + std::string(name);
}

std::string Folder::put(std::string_view name, std::span<const uint8_t> bytes) const
{
  std::string file = path(name);
  std::ofstream out(file, std::ios::binary | std::ios::trunc);
  out.write(reinterpret_cast<const char*>(bytes.data()), static_cast<std::streamsize>(bytes.size()));
  out.close();
  if (!out)
  {
    throw std::runtime_error("cannot write " + file);
  }
  return file;
}

test::Bytes Folder::get(std::string_view name) const
{
  std::ifstream file(path(name), std::ios::binary);
  if (!file)
  {
    throw std::runtime_error("missing: " + std::string(name));
  }
  return {std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>()};
}

void Folder::expectOnly(const std::vector<std::string>& names) const
{
  for (const auto& entry : fs::directory_iterator(path_))
  {
    const std::string name = entry.path().filename().string();
    demand(std::find(names.begin(), names.end(), name) != names.end(), "left behind: " + name);
  }
}

int runCommand(std::string_view name, const std::vector<Option>& options, const std::vector<std::string>& arguments)
{
  const tav::tool::Command& command = commandOf(name);
  tav::tool::Invocation invocation(command);
  for (const Option& option : options)
  {
    invocation.give(option.name, option.value.empty() ? std::vector<std::string>() : std::vector{option.value});
  }
  invocation.giveArguments(arguments);
  try
  {
    return command.run(invocation);
  }
  catch (const tav::tool::Failure& failure)
  {
    demand(!tav::tool::problemText(failure.problem).empty(), "a failure without a word");
    return failure.status;
  }
  catch (const tav::inspect::Error& error)
  {
    demand(!tav::tool::problemText(error.problem()).empty(), "a failure without a word");
    return error.trouble() == tav::inspect::Trouble::notFound ? tav::tool::kFindings : tav::tool::kTrouble;
  }
}

} // namespace fuzz
