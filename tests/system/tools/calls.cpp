// Loaded into the program before the system's library: writes down the calls that decide what a power loss leaves, and
// what others may read meanwhile. Lines go to the file that TAV_CALLS names: "open 0600 PATH", "sync PATH", "mode 0644
// PATH", "owner 1:2 PATH", "rename FROM TO", "link FROM TO", "unlink PATH".
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <dlfcn.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

namespace
{
template<class Function>
Function* next(const char* name)
{
  return reinterpret_cast<Function*>(dlsym(RTLD_NEXT, name));
}

__attribute__((format(printf, 1, 2))) void tell(const char* format, ...)
{
  const char* const path = std::getenv("TAV_CALLS");
  if (path == nullptr)
  {
    return;
  }
  char line[9000];
  std::va_list values;
  va_start(values, format);
  const int length = std::vsnprintf(line, sizeof line, format, values);
  va_end(values);
  const int file = next<int(const char*, int, ...)>("open")(path, O_WRONLY | O_APPEND | O_CREAT | O_CLOEXEC, 0600);
  if (::write(file, line, static_cast<size_t>(length)) != length)
  {
    std::abort();
  }
  ::close(file);
}

struct Path
{
  explicit Path(int file)
  {
    char name[64];
    std::snprintf(name, sizeof name, "/proc/self/fd/%d", file);
    const ssize_t length = ::readlink(name, text, sizeof text - 1);
    text[length < 0 ? 0 : length] = '\0';
  }
  char text[4096];
};

int opened(const char* function, const char* path, int flags, mode_t mode)
{
  if ((flags & O_CREAT) != 0)
  {
    tell("open %04o %s\n", static_cast<unsigned>(mode), path);
  }
  return next<int(const char*, int, ...)>(function)(path, flags, mode);
}

mode_t modeOf(int flags, std::va_list values)
{
  return (flags & O_CREAT) != 0 ? static_cast<mode_t>(va_arg(values, unsigned)) : 0;
}
} // namespace

extern "C" {
int open(const char* path, int flags, ...)
{
  std::va_list values;
  va_start(values, flags);
  const mode_t mode = modeOf(flags, values);
  va_end(values);
  return opened("open", path, flags, mode);
}

int open64(const char* path, int flags, ...)
{
  std::va_list values;
  va_start(values, flags);
  const mode_t mode = modeOf(flags, values);
  va_end(values);
  return opened("open64", path, flags, mode);
}

int fsync(int file)
{
  tell("sync %s\n", Path(file).text);
  return next<int(int)>("fsync")(file);
}

int fchmod(int file, mode_t mode) noexcept
{
  tell("mode %04o %s\n", static_cast<unsigned>(mode), Path(file).text);
  return next<int(int, mode_t)>("fchmod")(file, mode);
}

int fchown(int file, uid_t user, gid_t group) noexcept
{
  tell("owner %d:%d %s\n", static_cast<int>(user), static_cast<int>(group), Path(file).text);
  return next<int(int, uid_t, gid_t)>("fchown")(file, user, group);
}

int rename(const char* from, const char* to) noexcept
{
  tell("rename %s %s\n", from, to);
  return next<int(const char*, const char*)>("rename")(from, to);
}

int link(const char* from, const char* to) noexcept
{
  tell("link %s %s\n", from, to);
  return next<int(const char*, const char*)>("link")(from, to);
}

int unlink(const char* path) noexcept
{
  tell("unlink %s\n", path);
  return next<int(const char*)>("unlink")(path);
}
}
