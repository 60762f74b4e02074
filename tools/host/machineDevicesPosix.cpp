#include <set>
#include <sys/statvfs.h>
#include <unistd.h>

#include "tools/host/machineParts.h"
#include "tools/host/procFilePosix.h"

namespace tav::host
{
namespace
{
constexpr uint64_t kSector = 512; ///< of the counters, whatever the disk's own is

/// A disk, and no part of one: only disks have a folder there.
bool isDisk(const std::string& name)
{
  return ::access(("/sys/block/" + name).c_str(), F_OK) == 0;
}

/// "\040" of a blank in a name.
std::string unescaped(std::string_view word)
{
  std::string text;
  for (size_t i = 0; i < word.size(); ++i)
  {
    unsigned octal = 0;
    const bool isEscape =
        word[i] == '\\' && i + 3 < word.size() &&
        std::from_chars(word.data() + i + 1, word.data() + i + 4, octal, 8).ptr == word.data() + i + 4;
    text += isEscape ? static_cast<char>(octal) : word[i];
    i += isEscape ? 3 : 0;
  }
  return text;
}
} // namespace

std::vector<DiskFacts> lookAtDisks()
{
  std::vector<DiskFacts> disks;
  const std::string text = contentOf("/proc/diskstats");
  Words lines(text);
  for (Words line{{}}; disks.size() < kMostDevices && lines.nextLine(line);)
  {
    line.skip(2);
    DiskFacts disk{.name = std::string(line.next())};
    disk.reads = line.number();
    line.skip(1);
    disk.readBytes = times(line.number(), kSector);
    line.skip(1);
    disk.writes = line.number();
    line.skip(1);
    disk.writtenBytes = times(line.number(), kSector);
    line.skip(2);
    disk.busyTime = line.number();
    // What has never been used, a loop device for instance, is none that anybody asks for.
    if (disk.reads.value_or(0) + disk.writes.value_or(0) != 0 && isDisk(disk.name))
    {
      disks.push_back(std::move(disk));
    }
  }
  return disks;
}

std::vector<FileSystemFacts> lookAtFileSystems()
{
  std::vector<FileSystemFacts> all;
  std::set<std::string> seen;
  const std::string text = contentOf("/proc/self/mounts");
  Words lines(text);
  for (Words line{{}}; all.size() < kMostDevices && lines.nextLine(line);)
  {
    FileSystemFacts one{.device = unescaped(line.next())};
    one.folder = unescaped(line.next());
    one.kind = line.next();
    // Those on devices of this machine, each once: what is elsewhere may not answer.
    struct statvfs told = {};
    if (!one.device.starts_with("/") || !seen.insert(one.device).second || ::statvfs(one.folder.c_str(), &told) != 0)
      continue;
    one.id = static_cast<uint64_t>(told.f_fsid);
    one.total = uint64_t{told.f_blocks} * told.f_frsize;
    one.used = uint64_t{told.f_blocks - told.f_bfree} * told.f_frsize;
    one.available = uint64_t{told.f_bavail} * told.f_frsize;
    all.push_back(std::move(one));
  }
  return all;
}

std::vector<NetworkFacts> lookAtNetworks()
{
  std::vector<NetworkFacts> networks;
  const std::string text = contentOf("/proc/net/dev");
  Words lines(text);
  for (Words line{{}}; networks.size() < kMostDevices && lines.nextLine(line);)
  {
    const std::string_view word = line.next();
    if (!word.ends_with(":")) // above the table
    {
      continue;
    }
    NetworkFacts network{.name = std::string(word.substr(0, word.size() - 1))};
    const auto take = [&line](TransferFacts& way) {
      for (Fact* const fact : {&way.bytes, &way.packets, &way.errors, &way.drops}) *fact = line.number();
      line.skip(4);
    };
    take(network.received);
    take(network.sent);
    networks.push_back(std::move(network));
  }
  return networks;
}
} // namespace tav::host
