#include <fcntl.h>
#include <unistd.h>

#include "tools/host/procFilePosix.h"

namespace tav::host
{
std::string contentOf(const char* path)
{
  return contentOf(path, AT_FDCWD);
}

std::string contentOf(const char* path, int folder)
{
  std::string text;
  const int file = ::openat(folder, path, O_RDONLY | O_CLOEXEC);
  if (file < 0)
  {
    return text;
  }
  char piece[4096];
  for (ssize_t count = 0; (count = ::read(file, piece, sizeof piece)) > 0;)
    text.append(piece, static_cast<size_t>(count));
  ::close(file);
  return text;
}
} // namespace tav::host
