/// Stands in front of the system's calls. Built as a library of its own and preloaded, so that what is tested is the
/// library as it is shipped, with no switch in it.
#include "failingCalls.h"

#include <atomic>
#include <cerrno>
#include <cstdarg>
#include <cstddef>
#include <cstdio>
#include <dlfcn.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

using faults::Calls;
using faults::Kind;

namespace
{

thread_local Calls calls{};
std::atomic<int64_t> liveBlocks{0};

/// Counts a call; true when it is the one that fails, once.
bool isTurn(Kind kind)
{
  if (!calls.watching)
  {
    return false;
  }
  const uint64_t count = ++calls.counts[static_cast<unsigned>(kind)];
  if (calls.nth == 0 || calls.kind != kind || calls.nth != count)
  {
    return false;
  }
  calls.happened = true;
  return true;
}

/// Whether the call fails now; sets errno. A short transfer is no failure.
bool fails(Kind kind)
{
  if (!isTurn(kind) || calls.error == faults::kShort)
  {
    return false;
  }
  errno = calls.error;
  return true;
}

template<class Function>
Function next(const char* name)
{
  return reinterpret_cast<Function>(dlsym(RTLD_NEXT, name));
}

size_t lengthOf(Kind kind, size_t length, bool& failed)
{
  const bool turn = isTurn(kind);
  failed = turn && calls.error >= 0;
  if (failed)
  {
    errno = calls.error;
  }
  if (turn && calls.error == faults::kHalfway)
  {
    ++calls.nth;
    calls.error = EIO;
    calls.happened = false; // not before the next one
  }
  return turn && !failed && length > 1 ? 1 : length;
}

} // namespace

#define EXPORTED extern "C" __attribute__((visibility("default")))

EXPORTED Calls* failingCalls()
{
  return &calls;
}

EXPORTED int64_t failingCallsLiveBlocks()
{
  return liveBlocks.load();
}

#if !defined(FAULTS_WITHOUT_MALLOC)
// The C library's own names: a look-up of the next ones would allocate.
extern "C" {
void* __libc_malloc(size_t size);
void* __libc_calloc(size_t count, size_t size);
void* __libc_realloc(void* block, size_t size);
void __libc_free(void* block);
}

EXPORTED void* malloc(size_t size) noexcept
{
  if (fails(Kind::malloc))
  {
    return nullptr;
  }
  void* const block = __libc_malloc(size);
  liveBlocks += block != nullptr ? 1 : 0;
  return block;
}

EXPORTED void* calloc(size_t count, size_t size) noexcept
{
  if (fails(Kind::malloc))
  {
    return nullptr;
  }
  void* const block = __libc_calloc(count, size);
  liveBlocks += block != nullptr ? 1 : 0;
  return block;
}

EXPORTED void* realloc(void* block, size_t size) noexcept
{
  if (fails(Kind::malloc))
  {
    return nullptr;
  }
  void* const moved = __libc_realloc(block, size);
  liveBlocks += block == nullptr && moved != nullptr ? 1 : 0;
  return moved;
}

EXPORTED void free(void* block) noexcept
{
  liveBlocks -= block != nullptr ? 1 : 0;
  __libc_free(block);
}
#endif

EXPORTED int open(const char* path, int flags, ...)
{
  mode_t mode = 0;
  if ((flags & O_CREAT) != 0)
  {
    va_list more;
    va_start(more, flags);
    mode = static_cast<mode_t>(va_arg(more, unsigned));
    va_end(more);
  }
  if (fails(Kind::open))
  {
    return -1;
  }
  static const auto real = next<int (*)(const char*, int, ...)>("open");
  return real(path, flags, mode);
}

EXPORTED int close(int file)
{
  static const auto real = next<int (*)(int)>("close");
  // As the system does: the descriptor is gone, whatever the answer.
  const bool failed = fails(Kind::close);
  const int error = errno;
  const int result = real(file);
  if (failed)
  {
    errno = error;
  }
  return failed ? -1 : result;
}

EXPORTED ssize_t read(int file, void* bytes, size_t length)
{
  static const auto real = next<ssize_t (*)(int, void*, size_t)>("read");
  bool failed = false;
  const size_t allowed = lengthOf(Kind::read, length, failed);
  return failed ? -1 : real(file, bytes, allowed);
}

EXPORTED ssize_t write(int file, const void* bytes, size_t length)
{
  static const auto real = next<ssize_t (*)(int, const void*, size_t)>("write");
  bool failed = false;
  const size_t allowed = lengthOf(Kind::write, length, failed);
  return failed ? -1 : real(file, bytes, allowed);
}

EXPORTED off_t lseek(int file, off_t offset, int whence) noexcept
{
  static const auto real = next<off_t (*)(int, off_t, int)>("lseek");
  return fails(Kind::seek) ? -1 : real(file, offset, whence);
}

EXPORTED int fstat(int file, struct stat* status) noexcept
{
  static const auto real = next<int (*)(int, struct stat*)>("fstat");
  return fails(Kind::stat) ? -1 : real(file, status);
}

// By its name in the library: in the language, flock is a structure, too.
EXPORTED int lockFile(int file, int operation) noexcept __asm__("flock");
int lockFile(int file, int operation) noexcept
{
  static const auto real = next<int (*)(int, int)>("flock");
  return fails(Kind::lock) ? -1 : real(file, operation);
}

EXPORTED int fsync(int file)
{
  static const auto real = next<int (*)(int)>("fsync");
  return fails(Kind::sync) ? -1 : real(file);
}

EXPORTED int fdatasync(int file)
{
  static const auto real = next<int (*)(int)>("fdatasync");
  return fails(Kind::sync) ? -1 : real(file);
}

EXPORTED int ftruncate(int file, off_t size) noexcept
{
  static const auto real = next<int (*)(int, off_t)>("ftruncate");
  return fails(Kind::resize) ? -1 : real(file, size);
}

EXPORTED int remove(const char* path) noexcept
{
  static const auto real = next<int (*)(const char*)>("remove");
  return fails(Kind::remove) ? -1 : real(path);
}
