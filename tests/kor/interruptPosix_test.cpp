#include <csignal>
#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <string>

#include "kor/host.h"
#include "kor/testFiles.h"

namespace
{
using namespace tav::kor;

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
} // namespace
