#include <csignal>
#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <string>
#include <sys/resource.h>
#include <vector>

#include "kor/testFiles.h"
#include "tools/host/host.h"

namespace
{
using namespace tav::host;

void makeFileWhileInterrupted(const std::string& path)
{
  prepareStandardStreams();
  const HeldInterrupts held;
  std::ofstream(path) << "half";
  std::raise(SIGTERM);
  removeOnInterrupt(path);
}

TEST(HeldInterruptsDeathTest, EndTheProgramWhenTheFileIsKnownAndRemoveIt)
{
  const TestFolder folder;
  const std::string path = folder / "temporary";
  EXPECT_EXIT(makeFileWhileInterrupted(path), testing::KilledBySignal(SIGTERM), "");
  EXPECT_FALSE(std::filesystem::exists(path));
}

void endWithFiles(const std::string& kept, const std::vector<std::string>& others, int number)
{
  const rlimit nothing{};
  setrlimit(RLIMIT_CORE, &nothing); // SIGQUIT asks for a picture of the memory
  prepareStandardStreams();
  for (const std::string& path : others) removeOnInterrupt(path);
  removeOnInterrupt(kept);
  keepOnInterrupt(kept);
  removeOnInterrupt({});
  std::raise(number);
}

TEST(RemoveOnInterruptDeathTest, RemovesEveryFileThatIsNotToStay)
{
  for (const int number : {SIGINT, SIGTERM, SIGHUP, SIGQUIT})
  {
    const TestFolder folder;
    const std::string kept = folder / "kept";
    const std::vector<std::string> others = {folder / "one", folder / "two", folder / "three"};
    for (const std::string& path : others) std::ofstream(path) << "half";
    std::ofstream(kept) << "whole";
    EXPECT_EXIT(endWithFiles(kept, others, number), testing::KilledBySignal(number), "");
    EXPECT_TRUE(std::filesystem::exists(kept));
    for (const std::string& path : others) EXPECT_FALSE(std::filesystem::exists(path)) << number;
  }
}
} // namespace
