#include "crash/loggedFile.h"

#include <cerrno>
#include <dlfcn.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

using crash::Kind;
using crash::Operation;

namespace
{

std::vector<Operation> operations;
std::string watchedPath;
bool isToFail = false;

template<class Function>
Function next(const char* name)
{
  return reinterpret_cast<Function>(dlsym(RTLD_NEXT, name));
}

bool isAt(int file, const std::string& path)
{
  struct stat open = {};
  struct stat there = {};
  return !path.empty() && ::fstat(file, &open) == 0 && ::stat(path.c_str(), &there) == 0 &&
         open.st_dev == there.st_dev && open.st_ino == there.st_ino;
}

std::string folderOf(const std::string& path)
{
  return path.substr(0, path.find_last_of('/') + 1);
}

bool fails(int file)
{
  if (!isToFail || !isAt(file, watchedPath))
  {
    return false;
  }
  isToFail = false;
  errno = EIO;
  return true;
}

void noteSync(int file)
{
  if (isAt(file, watchedPath))
  {
    operations.push_back({Kind::sync, 0, {}});
  }
  else if (!watchedPath.empty() && isAt(file, folderOf(watchedPath)))
  {
    operations.push_back({Kind::syncFolder, 0, {}});
  }
}

} // namespace

namespace crash
{

void watch(const std::string& path)
{
  operations.clear();
  watchedPath = path;
}

void failNextSync()
{
  isToFail = true;
}

const std::vector<Operation>& log()
{
  return operations;
}

} // namespace crash

extern "C" {

ssize_t write(int file, const void* bytes, size_t length)
{
  static const auto real = next<ssize_t (*)(int, const void*, size_t)>("write");
  const bool isWatched = isAt(file, watchedPath);
  const off_t offset = isWatched ? ::lseek(file, 0, SEEK_CUR) : 0;
  const ssize_t done = real(file, bytes, length);
  if (isWatched && done > 0)
  {
    const auto* const first = static_cast<const uint8_t*>(bytes);
    operations.push_back({Kind::write, static_cast<uint64_t>(offset), {first, first + done}});
  }
  return done;
}

int ftruncate(int file, off_t size) noexcept
{
  static const auto real = next<int (*)(int, off_t)>("ftruncate");
  const int result = real(file, size);
  if (result == 0 && isAt(file, watchedPath))
  {
    operations.push_back({Kind::resize, static_cast<uint64_t>(size), {}});
  }
  return result;
}

int fsync(int file)
{
  static const auto real = next<int (*)(int)>("fsync");
  const int result = fails(file) ? -1 : real(file);
  if (result == 0)
  {
    noteSync(file);
  }
  return result;
}

int fdatasync(int file)
{
  static const auto real = next<int (*)(int)>("fdatasync");
  const int result = fails(file) ? -1 : real(file);
  if (result == 0)
  {
    noteSync(file);
  }
  return result;
}
}
