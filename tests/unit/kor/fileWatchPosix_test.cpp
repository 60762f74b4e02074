#include <chrono>
#include <filesystem>
#include <fstream>
#include <memory>
#include <string>
#include <sys/resource.h>
#include <thread>

#include <gtest/gtest.h>

#include "kor/fileWatch.h"
#include "kor/testFiles.h"

using namespace std::chrono_literals;

namespace
{

using Clock = std::chrono::steady_clock;

/// Lets the process open nothing for as long as it lives.
class NoDescriptors
{
public:
  NoDescriptors()
  {
    EXPECT_EQ(getrlimit(RLIMIT_NOFILE, &before_), 0);
    const rlimit none = {0, before_.rlim_max};
    EXPECT_EQ(setrlimit(RLIMIT_NOFILE, &none), 0);
  }
  ~NoDescriptors() { EXPECT_EQ(setrlimit(RLIMIT_NOFILE, &before_), 0); }
  NoDescriptors(const NoDescriptors&) = delete;
  NoDescriptors& operator=(const NoDescriptors&) = delete;

private:
  rlimit before_{};
};

class FileWatch : public testing::Test
{
protected:
  void append(const std::string& name) const
  {
    std::ofstream(folder_ / name, std::ios::app) << 'x' << std::flush;
  }

  /// Whether a wait ends before its time, which is so long that only what hangs takes it.
  static bool endsEarly(tav::kor::FileWatch& watch)
  {
    constexpr auto longest = 10min;
    const auto start = Clock::now();
    watch.wait(std::chrono::milliseconds(longest).count());
    return Clock::now() - start < longest;
  }

  const TestFolder temporary_;
  const std::filesystem::path folder_ = temporary_.path();
  const std::string path_ = (folder_ / "watched").string();
};

} // namespace

TEST_F(FileWatch, EndsWhenTheFileGrows)
{
  append("watched");
  tav::kor::FileWatch watch(path_);
  append("watched");
  EXPECT_TRUE(endsEarly(watch));
}

TEST_F(FileWatch, EndsWhenAFileComesAndWatchesIt)
{
  tav::kor::FileWatch watch(path_);
  append("watched");
  EXPECT_TRUE(endsEarly(watch));
  append("watched");
  EXPECT_TRUE(endsEarly(watch));
}

TEST_F(FileWatch, EndsWhenAnotherFileTakesThePlaceAndWatchesThat)
{
  append("watched");
  append("other");
  tav::kor::FileWatch watch(path_);
  std::filesystem::rename(folder_ / "other", path_);
  EXPECT_TRUE(endsEarly(watch));
  append("watched");
  EXPECT_TRUE(endsEarly(watch));
}

TEST_F(FileWatch, EndsAfterItsTimeWhenNothingHappensToTheFile)
{
  append("watched");
  tav::kor::FileWatch watch(path_);
  std::thread other([this] {
    for (int i = 0; i < 20; ++i)
    {
      append("other");
      std::this_thread::sleep_for(1ms);
    }
  });
  const auto start = Clock::now();
  watch.wait(100);
  EXPECT_GE(Clock::now() - start, 100ms);
  other.join();
}

TEST_F(FileWatch, NeedsNoFolder)
{
  tav::kor::FileWatch watch((folder_ / "none" / "watched").string());
  const auto start = Clock::now();
  watch.wait(20);
  EXPECT_GE(Clock::now() - start, 20ms);
}

TEST_F(FileWatch, TakesANameAloneForAFileOfTheWorkingFolder)
{
  const WorkingFolder working(folder_);
  tav::kor::FileWatch watch("watched");
  append("watched");
  EXPECT_TRUE(endsEarly(watch));
}

TEST_F(FileWatch, WaitsItsTimeForAFileOfTheTopFolderThatDoesNotCome)
{
  tav::kor::FileWatch watch("/no such file");
  append("no such file");
  const auto start = Clock::now();
  watch.wait(20);
  EXPECT_GE(Clock::now() - start, 20ms);
}

TEST_F(FileWatch, SleepsForItsTimeWhereTheSystemHasNoWatchLeft)
{
  append("watched");
  const auto watch = [&] {
    const NoDescriptors none;
    return std::make_unique<tav::kor::FileWatch>(path_);
  }();
  append("watched");
  const auto start = Clock::now();
  watch->wait(20);
  EXPECT_GE(Clock::now() - start, 20ms);
}
