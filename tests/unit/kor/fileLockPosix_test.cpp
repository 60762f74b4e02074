#include "kor/childPosix.h"
#include "kor/testFiles.h"
#include "tav/kor.h"

#include <gtest/gtest.h>
#include <string>

namespace
{
class FileLock : public testing::Test
{
protected:
  void SetUp() override { ASSERT_EQ(openFile(file_, path_, KOR_FILE_UPDATE | KOR_FILE_CREATE), TAV_RC_OK); }

  /// What another process gets that opens the file and asks for the lock.
  uint32_t lockElsewhere(uint32_t word1) const
  {
    return inChild([&] {
      KORHFile file;
      const uint32_t code = openFile(file, path_, KOR_FILE_UPDATE);
      return code == TAV_RC_OK ? lockFile(file, word1, kDoNotWait) : code;
    });
  }

  TestFolder folder_;
  std::string path_ = folder_ / "locked";
  KORHFile file_;
};

TEST_F(FileLock, KeepsAnotherProcessOutUnlessBothAreShared)
{
  for (const auto& [held, asked, code] : kLocksBeside)
  {
    ASSERT_EQ(lockFile(file_, held, kDoNotWait), TAV_RC_OK);
    EXPECT_EQ(lockElsewhere(asked), code) << held << " " << asked;
    ASSERT_EQ(file_.unlock(), TAV_RC_OK);
  }
}

TEST_F(FileLock, IsNotLostWhenTheProcessClosesAnotherFileOfTheSameName)
{
  ASSERT_EQ(lockFile(file_, kExclusive, kDoNotWait), TAV_RC_OK);
  {
    KORHFile other;
    ASSERT_EQ(openFile(other, path_, KOR_FILE_READ), TAV_RC_OK);
  }
  EXPECT_EQ(lockElsewhere(kExclusive), KOR_RC_LOCKED);
}

TEST_F(FileLock, UnlockLetsAnotherProcessIn)
{
  ASSERT_EQ(lockFile(file_, kExclusive, kDoNotWait), TAV_RC_OK);
  ASSERT_EQ(file_.unlock(), TAV_RC_OK);
  EXPECT_EQ(lockElsewhere(kExclusive), TAV_RC_OK);
}

TEST_F(FileLock, CloseLetsAnotherProcessIn)
{
  ASSERT_EQ(lockFile(file_, kExclusive, kDoNotWait), TAV_RC_OK);
  ASSERT_EQ(file_.close(), TAV_RC_OK);
  EXPECT_EQ(lockElsewhere(kExclusive), TAV_RC_OK);
}

TEST_F(FileLock, IsReleasedByCloseAlsoWhenAForkedProcessHasTheFile)
{
  ASSERT_EQ(lockFile(file_, kExclusive, kDoNotWait), TAV_RC_OK);
  std::array<int, 2> stay{};
  ASSERT_EQ(pipe(stay.data()), 0);
  Child heir([&stay] {
    ::close(stay[1]);
    char byte = 0;
    return ::read(stay[0], &byte, 1) == 0 ? 0u : 1u; // until the parent closes its end
  });
  ::close(stay[0]);
  EXPECT_EQ(file_.close(), TAV_RC_OK);
  KORHFile other;
  EXPECT_EQ(openFile(other, path_, KOR_FILE_UPDATE), TAV_RC_OK);
  EXPECT_EQ(lockFile(other, kExclusive, kDoNotWait), TAV_RC_OK);
  ::close(stay[1]);
  EXPECT_EQ(heir.result(), 0u);
}

TEST_F(FileLock, OfAProcessThatEndsIsFree)
{
  const uint32_t code = inChild([this] {
    KORHFile file;
    const uint32_t opened = openFile(file, path_, KOR_FILE_UPDATE);
    return opened == TAV_RC_OK ? lockFile(file, kExclusive, kDoNotWait) : opened;
  });
  ASSERT_EQ(code, TAV_RC_OK);
  EXPECT_EQ(lockFile(file_, kExclusive, kDoNotWait), TAV_RC_OK);
}

TEST_F(FileLock, TheSecondLockReplacesTheFirst)
{
  ASSERT_EQ(lockFile(file_, kExclusive, kDoNotWait), TAV_RC_OK);
  EXPECT_EQ(lockFile(file_, kShared, kDoNotWait), TAV_RC_OK);
  EXPECT_EQ(lockElsewhere(kShared), TAV_RC_OK);
  EXPECT_EQ(file_.unlock(), TAV_RC_OK);
  EXPECT_EQ(file_.unlock(), KOR_RC_NOT_LOCKED);
}

TEST_F(FileLock, AWaitingLockComesWhenTheOtherIsGone)
{
  std::array<int, 2> locked{};
  ASSERT_EQ(pipe(locked.data()), 0);
  Child holder([&] {
    KORHFile file;
    uint32_t code = openFile(file, path_, KOR_FILE_UPDATE);
    if (code == TAV_RC_OK)
    {
      code = lockFile(file, kExclusive, kDoNotWait);
    }
    if (::write(locked[1], "x", 1) != 1)
    {
      code = UINT32_MAX;
    }
    usleep(50000);
    if (writeFile(file, "after the wait").code != TAV_RC_OK)
    {
      code = UINT32_MAX;
    }
    return code;
  });
  char byte = 0;
  ASSERT_EQ(::read(locked[0], &byte, 1), 1);
  EXPECT_EQ(lockFile(file_, kExclusive, kWait), TAV_RC_OK);
  EXPECT_EQ(readText(file_, 14), "after the wait");
  EXPECT_EQ(holder.result(), TAV_RC_OK);
  ::close(locked[0]);
  ::close(locked[1]);
}
} // namespace
