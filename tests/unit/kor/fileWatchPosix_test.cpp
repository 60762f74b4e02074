#include <chrono>
#include <filesystem>
#include <fstream>
#include <string>
#include <thread>

#include <gtest/gtest.h>

#include "kor/fileWatch.h"

using namespace std::chrono_literals;

namespace
{

using Clock = std::chrono::steady_clock;

class FileWatch : public testing::Test
{
protected:
  FileWatch()
  {
    std::filesystem::create_directory(folder_);
  }
  ~FileWatch() override
  {
    std::filesystem::remove_all(folder_);
  }

  void append(const std::string& name) const
  {
    std::ofstream(folder_ / name, std::ios::app) << 'x' << std::flush;
  }

  /// How long a wait of up to ten seconds takes.
  static Clock::duration waited(tav::kor::FileWatch& watch)
  {
    const auto start = Clock::now();
    watch.wait(10000);
    return Clock::now() - start;
  }

  const std::filesystem::path folder_ = std::filesystem::temp_directory_path() /
                                        ("tav-watch-" + std::to_string(Clock::now().time_since_epoch().count()));
  const std::string path_ = (folder_ / "watched").string();
};

} // namespace

TEST_F(FileWatch, EndsWhenTheFileGrows)
{
  append("watched");
  tav::kor::FileWatch watch(path_);
  append("watched");
  EXPECT_LT(waited(watch), 5s);
}

TEST_F(FileWatch, EndsWhenAFileComesAndWatchesIt)
{
  tav::kor::FileWatch watch(path_);
  append("watched");
  EXPECT_LT(waited(watch), 5s);
  append("watched");
  EXPECT_LT(waited(watch), 5s);
}

TEST_F(FileWatch, EndsWhenAnotherFileTakesThePlaceAndWatchesThat)
{
  append("watched");
  append("other");
  tav::kor::FileWatch watch(path_);
  std::filesystem::rename(folder_ / "other", path_);
  EXPECT_LT(waited(watch), 5s);
  append("watched");
  EXPECT_LT(waited(watch), 5s);
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
