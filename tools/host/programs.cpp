#include <filesystem>
#include <system_error>

#include "tools/host/host.h"

namespace tav::host
{
std::string findProgram(const std::string& name)
{
  for (const std::string& folder : pathList("PATH"))
  {
    const std::filesystem::path path = pathOf(folder) / pathOf(name);
    std::error_code error;
    if (std::filesystem::is_regular_file(path, error))
    {
      return textOf(path);
    }
  }
  return {};
}
} // namespace tav::host
