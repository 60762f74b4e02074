#include "kor/childPosix.h"
#include "kor/testFiles.h"
#include "tav/kor.h"

#include <array>
#include <atomic>
#include <csignal>
#include <cstring>
#include <fcntl.h>
#include <filesystem>
#include <functional>
#include <gtest/gtest.h>
#include <new>
#include <string>
#include <sys/mman.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/time.h>
#include <unistd.h>
#include <vector>

namespace
{
void touch(const std::string& path, mode_t mode = 0644)
{
  ::close(::open(path.c_str(), O_CREAT | O_WRONLY | O_CLOEXEC, 0644));
  ::chmod(path.c_str(), mode);
}

/// The descriptor under which this process has `path` open, or -1.
int descriptorOf(const std::string& path)
{
  for (const auto& entry : std::filesystem::directory_iterator("/proc/self/fd"))
  {
    std::error_code failed;
    const auto target = std::filesystem::read_symlink(entry.path(), failed);
    if (!failed && target == path)
    {
      return std::stoi(entry.path().filename());
    }
  }
  return -1;
}

/// An attempt to open that the system refuses.
struct Refusal
{
  const char* name;
  std::function<std::string(const TestFolder&)> prepare; ///< gives the path
  uint64_t options;
  uint32_t code;
};

class RefusedOpen : public testing::TestWithParam<Refusal>
{
};

TEST_P(RefusedOpen, HasItsOwnCode)
{
  const TestFolder folder;
  const std::string path = GetParam().prepare(folder);
  KORHFile file;
  EXPECT_EQ(openFile(file, path, GetParam().options), GetParam().code) << path;
}

std::string pathBelowAFile(const TestFolder& folder)
{
  touch(folder / "file");
  return folder / "file/below";
}

std::string linkToItself(const TestFolder& folder)
{
  std::filesystem::create_symlink(folder / "link", folder / "link");
  return folder / "link";
}

std::string linkToNothing(const TestFolder& folder)
{
  std::filesystem::create_symlink(folder / "missing", folder / "link");
  return folder / "link";
}

std::string emptyPath(const TestFolder&)
{
  return "";
}

std::string theFolder(const TestFolder& folder)
{
  return folder.path();
}

std::function<std::string(const TestFolder&)> named(const std::string& name)
{
  return [name](const TestFolder& folder) { return folder / name; };
}

std::vector<Refusal> refusals()
{
  const std::string longName(300, 'n');
  return {
      {"missingFile", named("missing"), KOR_FILE_READ, KOR_RC_NO_SUCH_FILE},
      {"missingFolder", named("missing/file"), KOR_FILE_WRITE | KOR_FILE_CREATE, KOR_RC_NO_SUCH_FILE},
      {"linkToNothing", linkToNothing, KOR_FILE_READ, KOR_RC_NO_SUCH_FILE},
      {"emptyPath", emptyPath, KOR_FILE_READ, KOR_RC_NO_SUCH_FILE},
      {"folderForReading", theFolder, KOR_FILE_READ, KOR_RC_IS_FOLDER},
      {"folderForWriting", theFolder, KOR_FILE_WRITE, KOR_RC_IS_FOLDER},
      {"folderToCreate", theFolder, KOR_FILE_UPDATE | KOR_FILE_CREATE, KOR_RC_IS_FOLDER},
      {"pathBelowAFile", pathBelowAFile, KOR_FILE_READ, KOR_RC_NOT_A_FOLDER},
      {"nameTooLong", named(longName), KOR_FILE_READ, KOR_RC_BAD_NAME},
      {"linkToItself", linkToItself, KOR_FILE_READ, KOR_RC_BAD_NAME},
  };
}

INSTANTIATE_TEST_SUITE_P(Reasons, RefusedOpen, testing::ValuesIn(refusals()),
                         [](const testing::TestParamInfo<Refusal>& row) { return std::string(row.param.name); });

TEST(FilePosix, ARefusedFolderIsNotLeftOpen)
{
  const TestFolder folder;
  KORHFile file;
  EXPECT_EQ(openFile(file, folder.path(), KOR_FILE_READ), KOR_RC_IS_FOLDER);
  EXPECT_EQ(descriptorOf(folder.path()), -1);
}

/// Opens a file as a user without rights to it: root may open everything.
uint32_t openAsNobody(const std::string& path, uint64_t options)
{
  return inChild([&] {
    constexpr uid_t kNobody = 65534;
    if (geteuid() == 0 && setresuid(kNobody, kNobody, kNobody) != 0)
    {
      return UINT32_MAX;
    }
    KORHFile file;
    return openFile(file, path, options);
  });
}

TEST(FilePosix, AFileWithoutReadPermissionIsRefused)
{
  const TestFolder folder;
  ::chmod(folder.path().c_str(), 0755);
  touch(folder / "a", 0000);
  EXPECT_EQ(openAsNobody(folder / "a", KOR_FILE_READ), KOR_RC_NO_PERMISSION);
}

TEST(FilePosix, AFileWithoutWritePermissionIsRefusedForWritingOnly)
{
  const TestFolder folder;
  ::chmod(folder.path().c_str(), 0755);
  touch(folder / "a", 0444);
  EXPECT_EQ(openAsNobody(folder / "a", KOR_FILE_READ), TAV_RC_OK);
  EXPECT_EQ(openAsNobody(folder / "a", KOR_FILE_UPDATE), KOR_RC_NO_PERMISSION);
}

TEST(FilePosix, ANewFileHasThePermissionsAskedLessTheMask)
{
  const TestFolder folder;
  const mode_t mask = ::umask(0027);
  KORHFile file;
  const uint32_t code = openFile(file, folder / "a", KOR_FILE_WRITE | KOR_FILE_CREATE, 0666);
  ::umask(mask);
  ASSERT_EQ(code, TAV_RC_OK);
  struct stat status = {};
  ASSERT_EQ(::stat((folder / "a").c_str(), &status), 0);
  EXPECT_EQ(status.st_mode & 07777, 0640u);
}

TEST(FilePosix, AnOpenFileIsNotPassedToOtherPrograms)
{
  const TestFolder folder;
  KORHFile file;
  ASSERT_EQ(openFile(file, folder / "a", KOR_FILE_WRITE | KOR_FILE_CREATE), TAV_RC_OK);
  const int descriptor = descriptorOf(folder / "a");
  ASSERT_GE(descriptor, 0);
  EXPECT_EQ(::fcntl(descriptor, F_GETFD) & FD_CLOEXEC, FD_CLOEXEC);
}

TEST(FilePosix, TheEndOfTheObjectClosesTheFile)
{
  const TestFolder folder;
  {
    KORHFile file;
    ASSERT_EQ(openFile(file, folder / "a", KOR_FILE_WRITE | KOR_FILE_CREATE), TAV_RC_OK);
    ASSERT_GE(descriptorOf(folder / "a"), 0);
  }
  EXPECT_EQ(descriptorOf(folder / "a"), -1);
}

TEST(FilePosix, AFailingCloseIsReportedAndTheFileIsClosed)
{
  const TestFolder folder;
  KORHFile file;
  ASSERT_EQ(openFile(file, folder / "a", KOR_FILE_WRITE | KOR_FILE_CREATE), TAV_RC_OK);
  const int descriptor = descriptorOf(folder / "a");
  ASSERT_GE(descriptor, 0);
  ::close(descriptor); // behind its back
  uint64_t size = 0;
  EXPECT_EQ(file.close(), KOR_RC_NOT_OPEN);
  EXPECT_EQ(file.getSize(&size), KOR_RC_NOT_OPEN);
  EXPECT_EQ(openFile(file, folder / "a", KOR_FILE_READ), TAV_RC_OK);
}

TEST(FilePosix, ThatWasClosedBehindItsBackFailsWithItsCode)
{
  const TestFolder folder;
  touch(folder / "b");
  KORHFile other;
  ASSERT_EQ(openFile(other, folder / "b", KOR_FILE_WRITE), TAV_RC_OK);
  KORHFile file;
  ASSERT_EQ(openFile(file, folder / "a", KOR_FILE_WRITE | KOR_FILE_CREATE | KOR_FILE_READ), TAV_RC_OK);
  const int descriptor = descriptorOf(folder / "a");
  ASSERT_GE(descriptor, 0);
  ::close(descriptor);
  uint64_t found = 0;
  EXPECT_EQ(other.copyRights(file), KOR_RC_NOT_OPEN);
  EXPECT_EQ(file.findData(7, &found), TAV_RC_OK); // the system does not tell
  EXPECT_EQ(found, 7U);
  EXPECT_FALSE(file.isAt((folder / "a").c_str()));
  KORFileMapping mapping;
  EXPECT_EQ(mapping.map(file), KOR_RC_NOT_OPEN);
  EXPECT_EQ(file.close(), KOR_RC_NOT_OPEN);
}

TEST(FilePosix, IsNotFoundFromAFolderThatIsGone)
{
  const TestFolder folder;
  std::filesystem::create_directory(folder / "gone");
  const WorkingFolder working(folder / "gone");
  std::filesystem::remove(folder / "gone");
  std::array<char, 4096> target{};
  uint64_t nameAt = 0;
  EXPECT_EQ(korFollowLinks("a", target.data(), target.size(), &nameAt), KOR_RC_NO_SUCH_FILE);
}

TEST(FilePosix, MoreOpenFilesThanAllowedAreRefused)
{
  const TestFolder folder;
  touch(folder / "a");
  const uint32_t code = inChild([&] {
    const rlimit none = {0, 0};
    if (setrlimit(RLIMIT_NOFILE, &none) != 0)
    {
      return UINT32_MAX;
    }
    KORHFile file;
    return openFile(file, folder / "a", KOR_FILE_READ);
  });
  EXPECT_EQ(code, KOR_RC_TOO_MANY_FILES);
}

TEST(FilePosix, AFullDeviceIsReported)
{
  KORHFile file;
  ASSERT_EQ(openFile(file, "/dev/full", KOR_FILE_WRITE), TAV_RC_OK);
  EXPECT_EQ(writeFile(file, "content"), (Transfer{KOR_RC_NO_SPACE, 0}));
}

TEST(FilePosix, AFileBeyondItsLimitTellsTheBytesThatGotThere)
{
  const TestFolder folder;
  const uint32_t code = inChild([&] {
    std::signal(SIGXFSZ, SIG_IGN);
    const rlimit limit = {4096, 4096};
    KORHFile file;
    if (openFile(file, folder / "a", KOR_FILE_WRITE | KOR_FILE_CREATE) != TAV_RC_OK)
    {
      return UINT32_MAX;
    }
    if (setrlimit(RLIMIT_FSIZE, &limit) != 0)
    {
      return UINT32_MAX;
    }
    const Transfer transfer = writeFile(file, std::string(10000, 'x'));
    return transfer.done == 4096 ? transfer.code : UINT32_MAX;
  });
  EXPECT_EQ(code, KOR_RC_FILE_TOO_LARGE);
}

TEST(FilePosix, AnInputErrorIsReported)
{
  // No process has its first page mapped; reading it through the file of the process's memory fails as a disk does.
  KORHFile file;
  char byte = 0;
  ASSERT_EQ(openFile(file, "/proc/self/mem", KOR_FILE_READ), TAV_RC_OK);
  EXPECT_EQ(readFile(file, &byte, 1), (Transfer{KOR_RC_IO_ERROR, 0}));
}

/// More address space than one transfer can take, of which no byte is ever touched.
class LargeBuffer
{
public:
  static constexpr uint64_t kSize = 3ull << 30;

  LargeBuffer()
      : start_(::mmap(nullptr, kSize, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS | MAP_NORESERVE, -1, 0))
  {
  }
  ~LargeBuffer()
  {
    if (start_ != MAP_FAILED)
    {
      ::munmap(start_, kSize);
    }
  }
  LargeBuffer(const LargeBuffer&) = delete;
  LargeBuffer& operator=(const LargeBuffer&) = delete;

  void* data() const { return start_ != MAP_FAILED ? start_ : nullptr; }

private:
  void* start_;
};

#if defined(__SANITIZE_THREAD__)
#define NOTES_EVERY_BYTE 1
#elif defined(__has_feature)
#if __has_feature(thread_sanitizer)
#define NOTES_EVERY_BYTE 1
#endif
#endif

TEST(FilePosix, AWriteOfMoreThanTwoGiBGoesThroughWhole)
{
#if defined(NOTES_EVERY_BYTE)
  GTEST_SKIP() << "the thread sanitizer takes minutes and gigabytes to note every byte of the buffer";
#endif
  const LargeBuffer buffer;
  ASSERT_NE(buffer.data(), nullptr);
  KORHFile file;
  ASSERT_EQ(openFile(file, "/dev/null", KOR_FILE_WRITE), TAV_RC_OK);
  EXPECT_EQ(writeFile(file, buffer.data(), LargeBuffer::kSize), (Transfer{TAV_RC_OK, LargeBuffer::kSize}));
}

TEST(FilePosix, AReadOfMoreThanTwoGiBEndsWithTheFile)
{
  const LargeBuffer buffer;
  ASSERT_NE(buffer.data(), nullptr);
  const TestFolder folder;
  KORHFile file;
  ASSERT_EQ(openFile(file, folder / "a", KOR_FILE_UPDATE | KOR_FILE_CREATE), TAV_RC_OK);
  ASSERT_EQ(writeFile(file, std::string(5000, 'x')).code, TAV_RC_OK);
  ASSERT_EQ(seekFile(file, 0), TAV_RC_OK);
  EXPECT_EQ(readFile(file, buffer.data(), LargeBuffer::kSize), (Transfer{TAV_RC_END_OF_STORAGE, 5000}));
}

/// How often this process was interrupted; a child sees it, too.
std::atomic<int>& alarms()
{
  static auto* const shared = [] {
    void* const page =
        ::mmap(nullptr, sizeof(std::atomic<int>), PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0);
    return page == MAP_FAILED ? throw std::bad_alloc() : new (page) std::atomic<int>(0);
  }();
  return *shared;
}

/// Interrupts the system calls of this process every millisecond for as long as it lives.
class Interruptions
{
public:
  Interruptions()
  {
    struct sigaction action = {};
    action.sa_handler = [](int) { alarms().fetch_add(1); };
    ::sigaction(SIGALRM, &action, &before_); // without SA_RESTART
    setTimer(1000);
  }
  ~Interruptions()
  {
    setTimer(0);
    ::sigaction(SIGALRM, &before_, nullptr);
  }
  Interruptions(const Interruptions&) = delete;
  Interruptions& operator=(const Interruptions&) = delete;

private:
  static void setTimer(suseconds_t microseconds)
  {
    const itimerval timer = {{0, microseconds}, {0, microseconds}};
    ::setitimer(ITIMER_REAL, &timer, nullptr);
  }

  struct sigaction before_ = {};
};

class InterruptedFifo : public testing::Test
{
protected:
  static constexpr std::size_t kLength = 400000; ///< several times what a pipe holds
  static constexpr std::size_t kPiece = 50000;

  void SetUp() override
  {
    alarms() = 0; // before a child sees it
    ASSERT_EQ(::mkfifo(path_.c_str(), 0600), 0);
  }

  /// Opens the other side and moves all of the bytes piece by piece, so slowly that this one has to wait.
  template<class Move>
  uint32_t inPieces(uint64_t options, Move&& move) const
  {
    KORHFile file;
    uint32_t code = openFile(file, path_, options);
    for (std::size_t at = 0; at < kLength && code == TAV_RC_OK; at += kPiece)
    {
      usleep(5000);
      code = move(file, at);
    }
    return code;
  }

  static std::string pattern()
  {
    std::string bytes(kLength, '\0');
    for (std::size_t i = 0; i < bytes.size(); ++i) bytes[i] = static_cast<char>(i * 7 + i / 251);
    return bytes;
  }

  TestFolder folder_;
  std::string path_ = folder_ / "fifo";
  KORHFile file_;
};

TEST_F(InterruptedFifo, IsReadWhole)
{
  Child writer([this] {
    while (alarms().load() < 5) usleep(1000); // until the open has waited, however busy the machine is
    const std::string bytes = pattern();
    return inPieces(KOR_FILE_WRITE,
                    [&](KORHFile& file, std::size_t at) { return writeFile(file, bytes.data() + at, kPiece).code; });
  });
  const Interruptions interruptions;
  ASSERT_EQ(openFile(file_, path_, KOR_FILE_READ), TAV_RC_OK);
  EXPECT_GT(alarms().load(), 0) << "the open was not interrupted";
  const int alarmsBefore = alarms().load();
  std::string bytes(kLength, '\0');
  EXPECT_EQ(readFile(file_, bytes.data(), kLength), (Transfer{TAV_RC_OK, kLength}));
  EXPECT_TRUE(bytes == pattern());
  EXPECT_GT(alarms().load(), alarmsBefore) << "the read was not interrupted";
  file_.close(); // lets a writer go that has bytes left
  EXPECT_EQ(writer.result(), TAV_RC_OK);
}

TEST_F(InterruptedFifo, IsWrittenWhole)
{
  Child reader([this] {
    std::string bytes(kLength, '\0');
    const uint32_t code = inPieces(
        KOR_FILE_READ, [&](KORHFile& file, std::size_t at) { return readFile(file, bytes.data() + at, kPiece).code; });
    return bytes == pattern() ? code : UINT32_MAX;
  });
  ASSERT_EQ(openFile(file_, path_, KOR_FILE_WRITE), TAV_RC_OK);
  const std::string bytes = pattern();
  {
    const Interruptions interruptions;
    EXPECT_EQ(writeFile(file_, bytes), (Transfer{TAV_RC_OK, kLength}));
    EXPECT_GT(alarms().load(), 0) << "the write was not interrupted";
  }
  file_.close(); // lets a reader go that waits for more
  EXPECT_EQ(reader.result(), TAV_RC_OK);
}

TEST_F(InterruptedFifo, EndsWithItsLastWriter)
{
  Child writer([this] {
    KORHFile file;
    if (openFile(file, path_, KOR_FILE_WRITE) != TAV_RC_OK)
    {
      return UINT32_MAX;
    }
    return writeFile(file, "short").code;
  });
  ASSERT_EQ(openFile(file_, path_, KOR_FILE_READ), TAV_RC_OK);
  std::array<char, 100> buffer{};
  EXPECT_EQ(readFile(file_, buffer.data(), buffer.size()), (Transfer{TAV_RC_END_OF_STORAGE, 5}));
  EXPECT_EQ(writer.result(), TAV_RC_OK);
}

TEST_F(InterruptedFifo, HasNeitherPositionsNorASize)
{
  Child writer([this] {
    KORHFile file;
    return openFile(file, path_, KOR_FILE_WRITE);
  });
  ASSERT_EQ(openFile(file_, path_, KOR_FILE_READ), TAV_RC_OK);
  uint64_t size = UINT64_MAX;
  EXPECT_EQ(seekFile(file_, 0), KOR_RC_NOT_SEEKABLE);
  EXPECT_EQ(file_.getSize(&size), KOR_RC_NOT_SEEKABLE);
  EXPECT_EQ(size, 0u);
  EXPECT_EQ(writer.result(), TAV_RC_OK);
}

TEST(FilePosix, AWriteWithoutAReaderIsAnOutputError)
{
  const TestFolder folder;
  ASSERT_EQ(::mkfifo((folder / "fifo").c_str(), 0600), 0);
  const uint32_t code = inChild([&] {
    std::signal(SIGPIPE, SIG_IGN);
    KORHFile file;
    const int reader = ::open((folder / "fifo").c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC);
    if (openFile(file, folder / "fifo", KOR_FILE_WRITE) != TAV_RC_OK)
    {
      return UINT32_MAX;
    }
    ::close(reader);
    return writeFile(file, "x").code;
  });
  EXPECT_EQ(code, KOR_RC_IO_ERROR);
}

TEST(FilePosix, ADeviceTellsItsSizeByItsEnd)
{
  KORHFile file;
  uint64_t size = UINT64_MAX;
  ASSERT_EQ(openFile(file, "/dev/null", KOR_FILE_READ), TAV_RC_OK);
  EXPECT_EQ(file.getSize(&size), TAV_RC_OK);
  EXPECT_EQ(size, 0u);
}
/// Mode, owner and group of a file.
struct Rights
{
  mode_t mode;
  uid_t owner;
  gid_t group;
  bool operator==(const Rights&) const = default;
};

Rights rightsOf(const std::string& path)
{
  struct stat status = {};
  ::stat(path.c_str(), &status);
  return {static_cast<mode_t>(status.st_mode & 07777U), status.st_uid, status.st_gid};
}

TEST(FileRights, AreTakenFromAnotherFile)
{
  const TestFolder folder;
  touch(folder / "old", 0640);
  const bool mayGive = ::geteuid() == 0 && ::chown((folder / "old").c_str(), 12, 34) == 0;
  ::chmod((folder / "old").c_str(), 04751);
  KORHFile from;
  KORHFile to;
  ASSERT_EQ(openFile(from, folder / "old", KOR_FILE_READ), TAV_RC_OK);
  ASSERT_EQ(openFile(to, folder / "new", KOR_FILE_UPDATE | KOR_FILE_CREATE, 0600), TAV_RC_OK);
  EXPECT_EQ(rightsOf(folder / "new").mode, 0600U);
  EXPECT_EQ(to.copyRights(from), TAV_RC_OK);
  EXPECT_EQ(rightsOf(folder / "new"), rightsOf(folder / "old"));
  EXPECT_EQ(rightsOf(folder / "new").owner, mayGive ? 12U : ::geteuid());
}

TEST(FileRights, WithoutTheOwnerDoNotLetAProgramRunAsHim)
{
  if (::geteuid() != 0)
  {
    GTEST_SKIP() << "only root has files of others";
  }
  const TestFolder folder;
  touch(folder / "old");
  ASSERT_EQ(::chown((folder / "old").c_str(), 12, 34), 0);
  ::chmod((folder / "old").c_str(), 06755);
  ::chmod(folder.path().c_str(), 0777);
  KORHFile from;
  KORHFile to;
  ASSERT_EQ(openFile(from, folder / "old", KOR_FILE_READ), TAV_RC_OK);
  ASSERT_EQ(::seteuid(65534), 0);
  const uint32_t opened = openFile(to, folder / "new", KOR_FILE_UPDATE | KOR_FILE_CREATE, 0600);
  const uint32_t copied = to.copyRights(from);
  ASSERT_EQ(::seteuid(0), 0);
  EXPECT_EQ(opened, TAV_RC_OK);
  EXPECT_EQ(copied, TAV_RC_OK);
  EXPECT_EQ(rightsOf(folder / "new").mode, 0755U);
  EXPECT_EQ(rightsOf(folder / "new").owner, 65534U);
}

} // namespace
