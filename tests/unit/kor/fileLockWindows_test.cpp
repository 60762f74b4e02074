#include "kor/testFiles.h"
#include "kor/windows.h"
#include "tav/kor.h"

#include <chrono>
#include <cstdlib>
#include <future>
#include <gtest/gtest.h>
#include <process.h>
#include <string>

namespace
{
using FileLock = TwoOpenFiles;

TEST_F(FileLock, LetsOthersReadAndTheOwnerWrite)
{
  ASSERT_EQ(lockFile(file_, kExclusive, kDoNotWait), TAV_RC_OK);
  EXPECT_EQ(writeFile(file_, "content"), (Transfer{TAV_RC_OK, 7}));
  EXPECT_EQ(readText(other_, 7), "content");
}

TEST_F(FileLock, AWaitingLockComesWhenTheOtherIsGone)
{
  ASSERT_EQ(lockFile(other_, kExclusive, kDoNotWait), TAV_RC_OK);
  auto waiting = std::async(std::launch::async, [this] { return lockFile(file_, kExclusive, kWait); });
  EXPECT_EQ(waiting.wait_for(std::chrono::milliseconds(50)), std::future_status::timeout);
  ASSERT_EQ(other_.unlock(), TAV_RC_OK);
  EXPECT_EQ(waiting.get(), TAV_RC_OK);
}

constexpr const char* kPathVariable = "TAV_TEST_LOCKED_FILE";

/// Not a test of its own: what the other process of KeepsAnotherProcessOut does.
TEST(FileLockOfTheOtherProcess, DISABLED_IsTried)
{
  const char* const path = std::getenv(kPathVariable);
  ASSERT_NE(path, nullptr);
  KORHFile file;
  ASSERT_EQ(openFile(file, path, KOR_FILE_UPDATE), TAV_RC_OK);
  std::exit(static_cast<int>(lockFile(file, kExclusive, kDoNotWait) & 0xFF));
}

int tryInAnotherProcess(const std::string& path)
{
  _putenv_s(kPathVariable, path.c_str());
  _putenv_s("GTEST_TOTAL_SHARDS", "1"); // the other process runs its one test, whatever part of them this one runs
  _putenv_s("GTEST_SHARD_INDEX", "0");
  wchar_t program[MAX_PATH];
  GetModuleFileNameW(nullptr, program, MAX_PATH);
  return static_cast<int>(_wspawnl(_P_WAIT, program, L"kor_tests", L"--gtest_also_run_disabled_tests",
                                   L"--gtest_filter=FileLockOfTheOtherProcess.DISABLED_IsTried", nullptr));
}

TEST_F(FileLock, KeepsAnotherProcessOut)
{
  other_.close();
  ASSERT_EQ(lockFile(file_, kExclusive, kDoNotWait), TAV_RC_OK);
  EXPECT_EQ(tryInAnotherProcess(path_), static_cast<int>(KOR_RC_LOCKED & 0xFF));
  ASSERT_EQ(file_.unlock(), TAV_RC_OK);
  EXPECT_EQ(tryInAnotherProcess(path_), 0);
}
} // namespace
