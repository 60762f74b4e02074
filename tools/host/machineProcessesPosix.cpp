#include <algorithm>
#include <dirent.h>
#include <unistd.h>

#include "tools/host/machineParts.h"
#include "tools/host/procFilePosix.h"

namespace tav::host
{
namespace
{
/// What /proc/…/stat says: "12 (a name (of any kind)) S 1 2 …".
std::optional<ProcessFacts> processOf(const std::string& text, uint64_t id, uint64_t millisecondsOfTick)
{
  const size_t begin = text.find('(');
  const size_t end = text.rfind(')');
  if (begin == std::string::npos || end == std::string::npos || end < begin)
  {
    return std::nullopt;
  }
  ProcessFacts process{.id = id, .name = text.substr(begin + 1, end - begin - 1)};
  Words words(std::string_view(text).substr(end + 1));
  words.skip(11);
  const Fact user = words.number();
  const Fact system = words.number();
  words.skip(4);
  const Fact threads = words.number();
  words.skip(3);
  const Fact pages = words.number();
  static const auto page = static_cast<uint64_t>(std::max(1L, ::sysconf(_SC_PAGESIZE)));
  process.time = (user.value_or(0) + system.value_or(0)) * millisecondsOfTick;
  process.threads = threads.value_or(0);
  process.memory = pages.value_or(0) * page;
  return pages ? std::optional<ProcessFacts>(std::move(process)) : std::nullopt;
}

bool isBusier(const ProcessFacts& a, const ProcessFacts& b)
{
  return a.recent != b.recent ? a.recent > b.recent : a.time != b.time ? a.time > b.time
                                                                       : a.id < b.id;
}
} // namespace

std::vector<ProcessFacts> lookAtProcesses(std::map<uint64_t, uint64_t>& times)
{
  std::vector<ProcessFacts> busiest;
  DIR* const folder = ::opendir("/proc");
  if (folder == nullptr)
  {
    return busiest;
  }
  const uint64_t tick = 1000 / static_cast<uint64_t>(std::max(1L, ::sysconf(_SC_CLK_TCK)));
  std::map<uint64_t, uint64_t> now;
  while (const dirent* const entry = ::readdir(folder))
  {
    const std::string name = entry->d_name;
    const Fact id = Words(name).number();
    if (!id)
    {
      continue;
    }
    auto process = processOf(contentOf((name + "/stat").c_str(), ::dirfd(folder)), *id, tick);
    if (!process) // it has ended meanwhile
    {
      continue;
    }
    const auto before = times.find(*id);
    // A number can come again: a process that has had less time is another one.
    const uint64_t counted = before == times.end() || before->second > process->time ? 0 : before->second;
    process->recent = process->time - counted;
    now.emplace(*id, process->time);
    busiest.insert(std::upper_bound(busiest.begin(), busiest.end(), *process, isBusier), std::move(*process));
    if (busiest.size() > kMostProcesses)
    {
      busiest.pop_back();
    }
  }
  ::closedir(folder);
  times = std::move(now);
  return busiest;
}
} // namespace tav::host
