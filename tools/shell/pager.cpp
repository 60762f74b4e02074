#include "tools/shell/pager.h"

#include <algorithm>
#include <cstdlib>
#include <filesystem>
#include <system_error>
#include <vector>

#include "tools/host/host.h"

namespace tav::tool
{

namespace
{

bool isInstalled(const std::string& program)
{
  const std::vector<std::string> folders = host::pathList("PATH");
  return std::any_of(folders.begin(), folders.end(), [&](const std::string& folder) {
    std::error_code error;
    return std::filesystem::exists(host::pathOf(folder) / program, error);
  });
}

} // namespace

std::string pagerCommand()
{
  const char* const terminal = std::getenv("TERM");
  const char* const wanted = std::getenv("PAGER");
  if (!host::isTerminal(stdout) || terminal == nullptr || std::string(terminal) == "dumb")
  {
    return {};
  }
  const std::string command = wanted != nullptr ? wanted : isInstalled("less") ? "less"
                                                                               : "";
  return command == "cat" ? std::string() : command;
}

} // namespace tav::tool
