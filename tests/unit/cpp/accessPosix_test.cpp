/// Mapped files on systems where a mapping is pages of the file: what is cut off is gone, and addresses can run short.
#include <algorithm>
#include <csignal>
#include <fcntl.h>
#include <filesystem>
#include <sys/mman.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include "cpp/layer.h"

using namespace test;

namespace
{

/// A group with an element that is longer than a page, and one behind it.
Bytes longStream()
{
  tav::Writer writer;
  {
    tav::Group system = writer.group(TAV_ELM_CMN_SYSTEM);
    system.add(TAV_ELM_CMN_HOST_NAME, std::string(1U << 20U, 'x'));
    system.add(TAV_ELM_CMN_CPU_ONLINE, uint32_t{7});
  }
  writer.finish();
  return bytesOf(writer.bytes());
}

/// How a process ends that runs `work`: the signal, or 0 and its own value negated.
template<class Work>
int endOf(Work&& work)
{
  std::fflush(nullptr);
  const pid_t process = ::fork();
  if (process == 0)
  {
    for (const int one : {SIGBUS, SIGSEGV, SIGABRT})
    {
      std::signal(one, SIG_DFL); // sanitizers have handlers
    }
    ::_exit(work());
  }
  int status = 0;
  ::waitpid(process, &status, 0);
  return WIFSIGNALED(status) ? WTERMSIG(status) : -WEXITSTATUS(status);
}

/// What reading the element at the file's end comes to, when the file is cut after it was opened.
int readAfterCut(tav::Access access)
{
  const StreamFile file(longStream());
  return endOf([&] {
    std::error_code ec;
    const tav::Reader reader(file.path(), {.access = access}, ec);
    if (ec || ::truncate(file.path().c_str(), 100) != 0)
    {
      return 3;
    }
    static_cast<void>(reader.path("system/cpuOnline", ec));
    return ec ? 1 : 2;
  });
}

uint64_t pagesInMemory(const tav::Reader& reader)
{
  const TAVHandle& handle = *reader.handle();
  const auto page = static_cast<uint64_t>(::sysconf(_SC_PAGESIZE));
  std::vector<unsigned char> pages((handle.directDataSize + page - 1) / page);
  EXPECT_EQ(::mincore(handle.pDirectData, handle.directDataSize, pages.data()), 0);
  uint64_t count = 0;
  for (const unsigned char one : pages)
  {
    count += one & 1U;
  }
  return count;
}

/// A file as this test maps it itself, for what the machine is like: an emulator has fewer addresses, and takes no
/// advice.
class PlainMapping
{
public:
  explicit PlainMapping(const std::filesystem::path& path)
      : size_(std::filesystem::file_size(path))
  {
    const int opened = ::open(path.c_str(), O_RDONLY);
    bytes_ = ::mmap(nullptr, size_, PROT_READ, MAP_SHARED, opened, 0);
    ::close(opened);
  }
  ~PlainMapping()
  {
    if (isMapped())
    {
      ::munmap(bytes_, size_);
    }
  }
  PlainMapping(const PlainMapping&) = delete;
  PlainMapping& operator=(const PlainMapping&) = delete;

  [[nodiscard]] bool isMapped() const { return bytes_ != MAP_FAILED; }

  /// Whether more comes into memory than the one page that is read where nothing else is asked for.
  [[nodiscard]] bool readsAhead() const
  {
    ::madvise(bytes_, size_, MADV_RANDOM);
    const auto page = static_cast<size_t>(::sysconf(_SC_PAGESIZE));
    static_cast<void>(*static_cast<const volatile unsigned char*>(bytes_));
    std::vector<unsigned char> pages((size_ + page - 1) / page);
    ::mincore(bytes_, size_, pages.data());
    return std::count_if(pages.begin(), pages.end(), [](unsigned char one) { return (one & 1U) != 0; }) > 1;
  }

private:
  size_t size_;
  void* bytes_ = MAP_FAILED;
};

void dropFromMemory(const std::filesystem::path& path)
{
  const int opened = ::open(path.c_str(), O_RDONLY);
  ::fsync(opened);
  ::posix_fadvise(opened, 0, 0, POSIX_FADV_DONTNEED);
  ::close(opened);
}

} // namespace

TEST(LayerAccessPosix, AFileThatIsCutEndsTheProgramWhenMappedAndGivesACodeThroughARing)
{
  EXPECT_EQ(readAfterCut(tav::Access::mapped), SIGBUS);
  EXPECT_EQ(readAfterCut(tav::Access::automatic), SIGBUS);
  EXPECT_EQ(readAfterCut(tav::Access::ring), -1);
}

TEST(LayerAccessPosix, FilesWithoutASizeAreReadThroughARing)
{
  for (const char* const path : {"/proc/self/status", "/dev/zero"})
  {
    EXPECT_EQ(thrownBy([&] { tav::Reader(path, {.access = tav::Access::mapped}); }), TAV_RC_NOT_SUPPORTED) << path;
    EXPECT_EQ(thrownBy([&] { tav::Reader(path, {.access = tav::Access::automatic}); }),
              thrownBy([&] { tav::Reader(path, {.access = tav::Access::ring}); }))
        << path;
  }
}

TEST(LayerAccessPosix, APipeIsRefusedAsEver)
{
  const TemporaryPath pipe;
  ASSERT_EQ(::mkfifo(pipe.path.c_str(), 0600), 0);
  const int held = ::open(pipe.path.c_str(), O_RDWR); // or opening it for reading waits for a writer
  const auto codeFor = [&](tav::Access access) {
    return thrownBy([&] {
      const tav::Reader reader(pipe.path, {.access = access});
      static_cast<void>(reader.root());
    });
  };
  EXPECT_EQ(codeFor(tav::Access::mapped), TAV_RC_NOT_SUPPORTED);
  EXPECT_EQ(codeFor(tav::Access::automatic), codeFor(tav::Access::ring));
  EXPECT_NE(codeFor(tav::Access::ring), TAV_RC_OK);
  ::close(held);
}

#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__)
constexpr bool kSanitized = true;
#elif defined(__has_feature)
constexpr bool kSanitized = __has_feature(address_sanitizer) || __has_feature(thread_sanitizer);
#else
constexpr bool kSanitized = false;
#endif

TEST(LayerAccessPosix, AFileForWhichThereAreNoAddressesIsReadThroughARing)
{
  if (kSanitized)
  {
    GTEST_SKIP() << "the sanitizer needs the addresses itself";
  }
  const Bytes stream = longStream();
  const StreamFile file(stream);
  std::filesystem::resize_file(file.path(), uint64_t{1} << 42U);
  const auto openedAs = [&](tav::Access access) {
    return endOf([&] {
      rlimit most{};
      ::getrlimit(RLIMIT_AS, &most);
      most.rlim_cur = rlim_t{2} << 30U;
      std::error_code ec;
      if (::setrlimit(RLIMIT_AS, &most) != 0)
      {
        return 9;
      }
      const tav::Reader reader(file.path(), {.access = access}, ec);
      if (ec)
      {
        return tav::codeOf(ec) == TAV_RC_NO_MEMORY ? 1 : 2;
      }
      return reader.path("system/hostName") && reader.handle()->pCircularBuf != nullptr ? 3 : 4;
    });
  };
  const int mapped = openedAs(tav::Access::mapped);
  if (mapped == -4)
  {
    GTEST_SKIP() << "an emulator does not hold the limit";
  }
  EXPECT_EQ(mapped, -1);
  EXPECT_EQ(openedAs(tav::Access::automatic), -3);
}

TEST(LayerAccessPosix, AFileLargerThanMemoryIsMapped)
{
  const Bytes stream = longStream();
  const StreamFile file(stream);
  std::filesystem::resize_file(file.path(), uint64_t{1} << 40U);
  if (!PlainMapping(file.path()).isMapped())
  {
    GTEST_SKIP() << "an emulator has no so many addresses";
  }
  const tav::Reader reader(file.path(), {.access = tav::Access::mapped});
  EXPECT_EQ(reader.path("system/cpuOnline")->as<uint32_t>(), 7U);
}

TEST(LayerAccessPosix, APathReadsThePagesOfTheHeadersThatItPasses)
{
  constexpr uint64_t groups = 75;
  tav::Writer writer;
  {
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
    for (uint64_t i = 0; i < groups; ++i)
    {
      tav::Group host = root.group(TAV_ELM_CMN_HOST);
      host.add(TAV_ELM_CMN_HOST_NAME, std::string(660 * 1000, 'x'));
    }
    root.add(TAV_ELM_CMN_CPU_ONLINE, uint32_t{7});
  }
  writer.finish();
  const StreamFile file(bytesOf(writer.bytes()));
  dropFromMemory(file.path());
  if (PlainMapping(file.path()).readsAhead())
  {
    GTEST_SKIP() << "an emulator takes no advice of how a file is read";
  }
  dropFromMemory(file.path());

  const tav::Reader cold(file.path(), {.access = tav::Access::mapped});
  const tav::Reader counting(file.path(), {.access = tav::Access::mapped});
  if (pagesInMemory(counting) != 0)
  {
    GTEST_SKIP() << "this file system keeps its files in memory";
  }
  EXPECT_EQ(cold.path("system/cpuOnline")->as<uint32_t>(), 7U);
  // A header lies across two pages at the most.
  EXPECT_LE(pagesInMemory(counting), 2 * (groups + 2));
  EXPECT_TRUE(cold.path("system/host[60]"));
  EXPECT_LE(pagesInMemory(counting), 2 * (groups + 2));
}
