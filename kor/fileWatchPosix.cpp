#include "kor/port.h"

#include <chrono>
#include <thread>

#if __has_include(<sys/inotify.h>) && !defined(__EMSCRIPTEN__) // whose library has the header alone
#include <array>
#include <cstring>
#include <poll.h>
#include <sys/inotify.h>
#include <unistd.h>
#define KOR_HAS_INOTIFY 1
#else
#define KOR_HAS_INOTIFY 0
#endif

namespace tav::kor
{

#if KOR_HAS_INOTIFY

namespace
{

constexpr uint32_t kFileEvents = IN_MODIFY | IN_ATTRIB | IN_CLOSE_WRITE;
constexpr uint32_t kFolderEvents = IN_CREATE | IN_MOVED_TO | IN_MOVED_FROM | IN_DELETE;

} // namespace

FileWatch::FileWatch(const std::string& path)
    : path_(path), descriptor_(inotify_init1(IN_NONBLOCK | IN_CLOEXEC))
{
  const size_t slash = path.rfind('/');
  name_ = slash == std::string::npos ? path : path.substr(slash + 1);
  const std::string folder = slash == std::string::npos ? "." : slash == 0 ? "/"
                                                                           : path.substr(0, slash);
  if (descriptor_ != -1)
  {
    folder_ = inotify_add_watch(static_cast<int>(descriptor_), folder.c_str(), kFolderEvents);
    watchFile();
  }
}

FileWatch::~FileWatch()
{
  if (descriptor_ != -1)
  {
    close(static_cast<int>(descriptor_));
  }
}

/// Another file at the path needs a watch of its own; one that is watched already keeps it.
void FileWatch::watchFile()
{
  static_cast<void>(inotify_add_watch(static_cast<int>(descriptor_), path_.c_str(), kFileEvents));
}

void FileWatch::wait(uint32_t milliseconds)
{
  if (descriptor_ == -1)
  {
    std::this_thread::sleep_for(std::chrono::milliseconds(milliseconds));
    return;
  }
  const auto end = std::chrono::steady_clock::now() + std::chrono::milliseconds(milliseconds);
  alignas(inotify_event) std::array<char, 4096> room;
  for (bool concerns = false; !concerns;)
  {
    const auto left = std::chrono::ceil<std::chrono::milliseconds>(end - std::chrono::steady_clock::now()).count();
    pollfd asked{static_cast<int>(descriptor_), POLLIN, 0};
    if (left <= 0 || poll(&asked, 1, static_cast<int>(left)) <= 0)
    {
      return;
    }
    ssize_t length = 0;
    while ((length = read(static_cast<int>(descriptor_), room.data(), room.size())) > 0)
    {
      for (ssize_t at = 0; at < length;)
      {
        inotify_event event;
        std::memcpy(&event, room.data() + at, sizeof event);
        const char* const name = room.data() + at + sizeof event;
        concerns = concerns || event.wd != folder_ || (event.len != 0 && name_ == name);
        at += static_cast<ssize_t>(sizeof event + event.len);
      }
    }
  }
  watchFile();
}

#else

FileWatch::FileWatch(const std::string& path)
    : path_(path)
{
}

FileWatch::~FileWatch() = default;

void FileWatch::watchFile() {}

void FileWatch::wait(uint32_t milliseconds)
{
  std::this_thread::sleep_for(std::chrono::milliseconds(milliseconds));
}

#endif

} // namespace tav::kor
