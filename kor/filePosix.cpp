#include <cerrno>
#include <cstdio>
#include <cstring>
#include <dirent.h>
#include <fcntl.h>
#include <memory>
#include <new>
#include <string_view>
#include <sys/file.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <unistd.h>

#include "kor/port.h"

namespace tav::kor
{
namespace
{
static_assert(sizeof(off_t) == 8, "file offsets are 64-bit");

#if defined(__EMSCRIPTEN__)
constexpr bool kMappingCopies = true; ///< all of the file: no mapping is better, as rings need less memory
#else
constexpr bool kMappingCopies = false;
#endif

/// The code of a failed transfer or lock: the descriptor is our own, so it is the direction that does not fit.
uint32_t transferCodeOf(int error)
{
  return error == EBADF ? KOR_RC_WRONG_ACCESS : codeOfSystemError(error);
}

/// Repeats a system call for as long as signals interrupt it.
template<class Call>
auto uninterrupted(Call call)
{
  auto result = call();
  while (result < 0 && errno == EINTR) result = call();
  return result;
}

int descriptor(intptr_t file)
{
  return static_cast<int>(file);
}

int accessOf(const OpenMode& mode)
{
  if (mode.read && mode.write)
  {
    return O_RDWR;
  }
  return mode.write ? O_WRONLY : O_RDONLY;
}

int flagsOf(const OpenMode& mode)
{
  int flags = accessOf(mode) | O_CLOEXEC | O_NOCTTY;
  if (mode.create)
  {
    flags |= O_CREAT;
  }
  if (mode.truncate)
  {
    flags |= O_TRUNC;
  }
  if (mode.exclusive)
  {
    flags |= O_EXCL;
  }
  return flags;
}
} // namespace

uint32_t openNative(const char* pPath, const OpenMode& mode, intptr_t& file)
{
  const auto permissions = static_cast<mode_t>(mode.permissions & 07777);
  const int opened = uninterrupted([&] { return ::open(pPath, flagsOf(mode), permissions); });
  if (opened < 0)
  {
    return codeOfSystemError(errno);
  }

  // A folder can be opened for reading; only its reads would fail.
  struct stat status = {};
  uint32_t code = ::fstat(opened, &status) == 0 ? TAV_RC_OK : codeOfSystemError(errno);
  if (code == TAV_RC_OK && S_ISDIR(status.st_mode))
  {
    code = KOR_RC_IS_FOLDER;
  }
  if (code == TAV_RC_OK)
    file = opened;
  else
    ::close(opened);
  return code;
}

uint32_t closeNative(intptr_t file)
{
  // Never repeated: the descriptor is free after a failure, and may be another file's by then.
  return ::close(descriptor(file)) == 0 ? TAV_RC_OK : codeOfSystemError(errno);
}

uint32_t readSome(intptr_t file, void* bytes, std::size_t length, std::size_t& done)
{
  const ssize_t count = uninterrupted([&] { return ::read(descriptor(file), bytes, length); });
  if (count < 0)
  {
    return transferCodeOf(errno);
  }
  done = static_cast<std::size_t>(count);
  return TAV_RC_OK;
}

uint32_t writeSome(intptr_t file, const void* bytes, std::size_t length, std::size_t& done)
{
  const ssize_t count = uninterrupted([&] { return ::write(descriptor(file), bytes, length); });
  if (count < 0)
  {
    return transferCodeOf(errno);
  }
  done = static_cast<std::size_t>(count);
  return count == 0 ? KOR_RC_IO_ERROR : TAV_RC_OK;
}

uint32_t seekNative(intptr_t file, int64_t offset, uint64_t& position)
{
  const off_t landed = ::lseek(descriptor(file), offset, SEEK_SET);
  if (landed < 0)
  {
    return codeOfSystemError(errno);
  }
  position = static_cast<uint64_t>(landed);
  return TAV_RC_OK;
}

bool moveBack(intptr_t file, int64_t distance)
{
  return ::lseek(descriptor(file), -distance, SEEK_CUR) >= 0;
}

uint32_t lockNative(intptr_t file, bool exclusive, bool wait, bool /*held*/)
{
  // flock belongs to the open file: it holds against other opens of this process too, and it is not lost
  // when the process closes another descriptor of the same file.
  const int operation = (exclusive ? LOCK_EX : LOCK_SH) | (wait ? 0 : LOCK_NB);
  const int result = uninterrupted([&] { return ::flock(descriptor(file), operation); });
  return result == 0 ? TAV_RC_OK : transferCodeOf(errno);
}

uint32_t unlockNative(intptr_t file)
{
  const int result = uninterrupted([&] { return ::flock(descriptor(file), LOCK_UN); });
  return result == 0 ? TAV_RC_OK : codeOfSystemError(errno);
}

uint32_t sizeNative(intptr_t file, uint64_t& size)
{
  struct stat status = {};
  if (::fstat(descriptor(file), &status) != 0)
  {
    return codeOfSystemError(errno);
  }
  if (S_ISREG(status.st_mode))
  {
    size = static_cast<uint64_t>(status.st_size);
    return TAV_RC_OK;
  }

  // Devices tell their size by their end only.
  const off_t here = ::lseek(descriptor(file), 0, SEEK_CUR);
  if (here < 0)
  {
    return codeOfSystemError(errno);
  }
  const off_t end = ::lseek(descriptor(file), 0, SEEK_END);
  if (end < 0 || ::lseek(descriptor(file), here, SEEK_SET) != here)
  {
    return codeOfSystemError(errno);
  }
  size = static_cast<uint64_t>(end);
  return TAV_RC_OK;
}

uint32_t setSizeNative(intptr_t file, int64_t size)
{
  return uninterrupted([&] { return ::ftruncate(descriptor(file), size); }) == 0 ? TAV_RC_OK : codeOfSystemError(errno);
}

uint32_t syncNative(intptr_t file)
{
#if defined(F_FULLFSYNC)
  // There fsync leaves the bytes in the device's cache. Not every file system knows the other one.
  if (uninterrupted([&] { return ::fcntl(descriptor(file), F_FULLFSYNC); }) == 0)
  {
    return TAV_RC_OK;
  }
#endif
  return uninterrupted([&] { return ::fsync(descriptor(file)); }) == 0 ? TAV_RC_OK : codeOfSystemError(errno);
}

uint32_t syncDataNative(intptr_t file)
{
#if defined(F_FULLFSYNC)
  return syncNative(file);
#else
  return uninterrupted([&] { return ::fdatasync(descriptor(file)); }) == 0 ? TAV_RC_OK : codeOfSystemError(errno);
#endif
}

uint32_t syncFolderNative(const char* pPath)
{
  const char* const slash = std::strrchr(pPath, '/');
  const std::size_t length = slash != nullptr ? static_cast<std::size_t>(slash - pPath) + 1 : 0;
  const std::unique_ptr<char[]> folder(new (std::nothrow) char[length + 2]);
  if (folder == nullptr)
  {
    return TAV_RC_NO_MEMORY;
  }
  std::memcpy(folder.get(), pPath, length);
  std::memcpy(folder.get() + length, length == 0 ? "." : "\0", 2);
  const int opened = uninterrupted([&] { return ::open(folder.get(), O_RDONLY | O_DIRECTORY | O_CLOEXEC); });
  if (opened < 0)
  {
    return codeOfSystemError(errno);
  }
  const int error = syncNative(opened) == TAV_RC_OK ? 0 : errno;
  ::close(opened);
  const bool cannot = error == EINVAL || error == EROFS || error == ENOSYS || error == EOPNOTSUPP;
  return error == 0 || cannot ? TAV_RC_OK : codeOfSystemError(error);
}

uint32_t copyRightsNative(intptr_t from, intptr_t to)
{
  struct stat status = {};
  if (::fstat(descriptor(from), &status) != 0)
  {
    return codeOfSystemError(errno);
  }
  // The owner first: giving a file away takes the set-id bits from it.
  const bool owned = ::fchown(descriptor(to), status.st_uid, status.st_gid) == 0;
  if (!owned)
  {
    static_cast<void>(::fchown(descriptor(to), static_cast<uid_t>(-1), status.st_gid) == 0);
  }
  const mode_t mode = status.st_mode & (owned ? 07777U : 0777U);
  return ::fchmod(descriptor(to), mode) == 0 ? TAV_RC_OK : codeOfSystemError(errno);
}

bool isAtNative(intptr_t file, const char* pPath)
{
  struct stat open = {};
  struct stat there = {};
  return ::fstat(descriptor(file), &open) == 0 && ::stat(pPath, &there) == 0 && open.st_dev == there.st_dev &&
         open.st_ino == there.st_ino;
}

uint32_t findDataNative(intptr_t file, uint64_t offset, uint64_t& found)
{
  found = offset;
#if defined(SEEK_DATA)
  const off_t here = ::lseek(descriptor(file), 0, SEEK_CUR);
  if (here < 0) // it has no places
  {
    return TAV_RC_OK;
  }
  const off_t data = ::lseek(descriptor(file), static_cast<off_t>(offset), SEEK_DATA);
  const int error = data < 0 ? errno : 0;
  if (::lseek(descriptor(file), here, SEEK_SET) != here)
  {
    return codeOfSystemError(errno);
  }
  if (data >= 0)
  {
    found = static_cast<uint64_t>(data);
  }
  if (error != ENXIO)
  {
    return TAV_RC_OK;
  }
  // Nothing is behind it, or it is behind the end itself.
  struct stat status = {};
  if (::fstat(descriptor(file), &status) != 0)
  {
    return codeOfSystemError(errno);
  }
  const auto size = static_cast<uint64_t>(status.st_size);
  if (S_ISREG(status.st_mode) && size > offset)
  {
    found = size;
  }
#else
  static_cast<void>(file);
#endif
  return TAV_RC_OK;
}

uint32_t mapNative(intptr_t file, void*& bytes, uint64_t& size)
{
  struct stat status = {};
  if (::fstat(descriptor(file), &status) != 0)
  {
    return codeOfSystemError(errno);
  }
  if (kMappingCopies || !S_ISREG(status.st_mode) || status.st_size <= 0)
  {
    return TAV_RC_NOT_SUPPORTED;
  }
  const auto length = static_cast<uint64_t>(status.st_size);
  if (length > SIZE_MAX)
  {
    return TAV_RC_NO_MEMORY;
  }
  void* const mapped =
      ::mmap(nullptr, static_cast<std::size_t>(length), PROT_READ, MAP_SHARED, descriptor(file), 0);
  if (mapped == MAP_FAILED)
  {
    // File systems without mappings answer so.
    return errno == ENODEV || errno == EINVAL ? TAV_RC_NOT_SUPPORTED : transferCodeOf(errno);
  }
  // A system that does not know the advice reads ahead, which costs time alone.
  static_cast<void>(::posix_madvise(mapped, static_cast<std::size_t>(length), POSIX_MADV_RANDOM));
  bytes = mapped;
  size = length;
  return TAV_RC_OK;
}

void unmapNative(void* bytes, uint64_t size)
{
  ::munmap(bytes, static_cast<std::size_t>(size));
}

void readAheadNative(void* bytes, uint64_t size)
{
  static_cast<void>(::posix_madvise(bytes, static_cast<std::size_t>(size), POSIX_MADV_NORMAL));
}

bool isDeviceNative(const char* pPath)
{
  struct stat there = {};
  return ::stat(pPath, &there) == 0 && !S_ISREG(there.st_mode) && !S_ISDIR(there.st_mode);
}

// Not by std::filesystem, of which one implementation ends the program when there is no memory for a name.
uint32_t listFolderNative(const char* pPath, KORFileNameVisit visit, void* context)
{
  struct Close
  {
    void operator()(DIR* folder) const { ::closedir(folder); }
  };
  const std::unique_ptr<DIR, Close> folder(::opendir(pPath));
  if (folder == nullptr)
  {
    return codeOfSystemError(errno);
  }
  errno = 0; // which an end does not change
  while (const dirent* const entry = ::readdir(folder.get()))
  {
    const std::string_view name(entry->d_name);
    if (name != "." && name != "..")
    {
      visit(entry->d_name, context);
    }
    errno = 0;
  }
  return errno == 0 ? TAV_RC_OK : codeOfSystemError(errno);
}

const bool kOpenFileHoldsName = false;

uint32_t renameNative(const char* pFrom, const char* pTo)
{
  return std::rename(pFrom, pTo) == 0 ? TAV_RC_OK : codeOfSystemError(errno);
}
} // namespace tav::kor
