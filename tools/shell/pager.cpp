#include "tools/shell/pager.h"

#include <cstdlib>

#include "tools/host/host.h"

namespace tav::tool
{

std::string pagerCommand()
{
  const char* const terminal = std::getenv("TERM");
  const char* const wanted = std::getenv("PAGER");
  if (!host::isTerminal(stdout) || terminal == nullptr || std::string(terminal) == "dumb")
  {
    return {};
  }
  const std::string usual = host::findProgram("less").empty() ? "" : "less";
  const std::string command = wanted != nullptr ? wanted : usual;
  return command == "cat" ? std::string() : command;
}

} // namespace tav::tool
