#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include "kor/systemError.h"
#include "tav/kor.h"
#include "tools/host/host.h"

namespace tav::host
{
using kor::codeOfSystemError;

namespace
{
namespace fs = std::filesystem;

constexpr int kMostLinks = 40; // as many as the system itself follows

/// Where a link of one step leads, and the folder that it lies in, itself without links.
struct Step
{
  fs::path folder;
  fs::path name;
  fs::path path() const { return folder / name; }
};

Step stepOf(const fs::path& path)
{
  std::error_code error;
  const fs::path parent = path.has_parent_path() ? path.parent_path() : fs::path(".");
  const fs::path folder = fs::weakly_canonical(parent, error);
  return {error ? parent : folder, path.filename()};
}

/// Whether a folder lists open files: /proc/1234/fd, /proc/1234/task/1235/fd, elsewhere /dev/fd.
bool listsOpenFiles(const fs::path& folder)
{
  return folder == "/dev/fd" || (folder.filename() == "fd" && folder.string().starts_with("/proc/"));
}

bool isOwn(const fs::path& folder)
{
  return folder == "/dev/fd" || folder.string().starts_with("/proc/" + std::to_string(::getpid()) + "/");
}

/// Follows links up to a name that is none, or that stands for an open file.
Step followed(const std::string& path)
{
  std::error_code error;
  Step step = stepOf(pathOf(path));
  for (int i = 0; i < kMostLinks && !listsOpenFiles(step.folder) && fs::is_symlink(step.path(), error); ++i)
  {
    step = stepOf(step.folder / fs::read_symlink(step.path(), error));
  }
  return step;
}

/// Closes a descriptor at the end of a block.
class Descriptor
{
public:
  explicit Descriptor(int number)
      : number_(number) {}
  ~Descriptor()
  {
    if (number_ >= 0)
    {
      ::close(number_);
    }
  }
  Descriptor(const Descriptor&) = delete;
  Descriptor& operator=(const Descriptor&) = delete;
  int number() const { return number_; }

private:
  int number_;
};

/// What mode a file has when it is made as files are made.
mode_t modeOfNewFiles()
{
  const mode_t mask = ::umask(077);
  ::umask(mask);
  return 0666 & ~mask;
}

/// Gives a file the owner of another one, and returns the mode that goes with what the system let.
mode_t takeOwner(int file, const struct stat& old)
{
  const mode_t mode = old.st_mode & 07777;
  struct stat now = {};
  if (::fstat(file, &now) == 0 && now.st_uid == old.st_uid && now.st_gid == old.st_gid)
  {
    return mode;
  }
  if (::fchown(file, old.st_uid, old.st_gid) == 0)
  {
    return mode;
  }
  const mode_t plain = mode & 0777;
  if (::fchown(file, static_cast<uid_t>(-1), old.st_gid) == 0)
  {
    return plain;
  }
  // Another group than before gets no more than everybody.
  return (plain & 0707) | ((plain & 07) << 3);
}

/// Not every file system can be told to put a folder, or anything, on the disk at once.
uint32_t synced(int file)
{
  if (::fsync(file) == 0 || errno == EINVAL || errno == EROFS || errno == ENOSYS || errno == EOPNOTSUPP)
    return TAV_RC_OK;
  return codeOfSystemError(errno);
}

/// Mode, owner and all bytes of a file that is about to take a place.
uint32_t finishFile(const std::string& from, const std::string& to, bool replace)
{
  const Descriptor file(::open(from.c_str(), O_WRONLY | O_NOFOLLOW | O_CLOEXEC));
  if (file.number() < 0)
  {
    return codeOfSystemError(errno);
  }
  struct stat old = {};
  const bool known = replace && ::lstat(to.c_str(), &old) == 0;
  if (known && !S_ISREG(old.st_mode))
  {
    return KOR_RC_FILE_EXISTS; // something else took the name just now
  }
  const mode_t mode = known ? takeOwner(file.number(), old) : modeOfNewFiles();
  if (::fchmod(file.number(), mode) != 0 && errno != EPERM && errno != EOPNOTSUPP)
  {
    return codeOfSystemError(errno);
  }
  return synced(file.number());
}

uint32_t giveName(const std::string& from, const std::string& to, bool replace)
{
  if (!replace)
  {
    // A link is refused when the name is taken, even by a file that came this very moment.
    if (::link(from.c_str(), to.c_str()) == 0)
    {
      ::unlink(from.c_str());
      return TAV_RC_OK;
    }
    std::error_code error;
    if (errno == EEXIST || fs::exists(to, error))
    {
      return KOR_RC_FILE_EXISTS;
    }
    // A file system without links: the name was free a moment ago.
  }
  return ::rename(from.c_str(), to.c_str()) == 0 ? TAV_RC_OK : codeOfSystemError(errno);
}

uint32_t syncFolderOf(const std::string& path)
{
  const uint32_t code = korSyncFolderOf(path.c_str());
  return code == KOR_RC_NO_PERMISSION ? TAV_RC_OK : code; // a folder may be open to writers alone
}
} // namespace

bool removeFile(const std::string& path)
{
  return ::unlink(path.c_str()) == 0;
}

std::optional<int> ownFile(const std::string& path)
{
  const Step step = followed(path);
  const std::string digits = step.name.string();
  const bool number = !digits.empty() && digits.size() < 10 && std::all_of(digits.begin(), digits.end(), [](char c) {
    return c >= '0' && c <= '9';
  });
  return number && listsOpenFiles(step.folder) && isOwn(step.folder) ? std::optional<int>(std::stoi(digits))
                                                                     : std::nullopt;
}

fs::path targetOf(const std::string& path)
{
  return followed(path).path();
}

FILE* openStream(const std::string& path, const char* mode, uint32_t& code)
{
  FILE* stream = nullptr;
  // What is read may as well be read once more from its start.
  if (const std::optional<int> own = *mode == 'w' ? ownFile(path) : std::nullopt)
  {
    const int copy = ::fcntl(*own, F_DUPFD_CLOEXEC, 3);
    stream = copy < 0 ? nullptr : ::fdopen(copy, mode);
    if (stream == nullptr && copy >= 0)
    {
      ::close(copy);
    }
  }
  else
  {
    stream = std::fopen(path.c_str(), mode);
  }
  code = stream != nullptr ? TAV_RC_OK : codeOfSystemError(errno);
  struct stat status = {};
  if (stream != nullptr && ::fstat(::fileno(stream), &status) == 0 && S_ISDIR(status.st_mode))
  {
    std::fclose(stream); // it could be opened, but not be read
    stream = nullptr;
    code = KOR_RC_IS_FOLDER;
  }
  return stream;
}

uint32_t moveIntoPlace(const std::string& from, const std::string& to, bool replace)
{
  uint32_t code = finishFile(from, to, replace);
  if (code == TAV_RC_OK)
  {
    code = giveName(from, to, replace);
  }
  return code == TAV_RC_OK ? syncFolderOf(to) : code;
}
} // namespace tav::host
