/// Locks between two open files of a process, which are as strange to each other as two processes.
#include "kor/testFiles.h"
#include "tav/kor.h"

#include <gtest/gtest.h>
#include <string>

namespace
{
using LockOfTwoFiles = TwoOpenFiles;

TEST_F(LockOfTwoFiles, KeepsAnotherOpenFileOutUnlessBothAreShared)
{
  for (const auto& [held, asked, code] : kLocksBeside)
  {
    ASSERT_EQ(lockFile(file_, held, kDoNotWait), TAV_RC_OK);
    EXPECT_EQ(lockFile(other_, asked, kDoNotWait), code) << held << " " << asked;
    ASSERT_EQ(file_.unlock(), TAV_RC_OK);
    EXPECT_EQ(other_.unlock(), code == TAV_RC_OK ? TAV_RC_OK : KOR_RC_NOT_LOCKED);
  }
}

TEST_F(LockOfTwoFiles, UnlockLetsAnotherOpenFileIn)
{
  ASSERT_EQ(lockFile(file_, kExclusive, kDoNotWait), TAV_RC_OK);
  ASSERT_EQ(file_.unlock(), TAV_RC_OK);
  EXPECT_EQ(lockFile(other_, kExclusive, kDoNotWait), TAV_RC_OK);
}

TEST_F(LockOfTwoFiles, CloseLetsAnotherOpenFileIn)
{
  ASSERT_EQ(lockFile(file_, kExclusive, kDoNotWait), TAV_RC_OK);
  ASSERT_EQ(file_.close(), TAV_RC_OK);
  EXPECT_EQ(lockFile(other_, kExclusive, kDoNotWait), TAV_RC_OK);
}

TEST_F(LockOfTwoFiles, TheSecondLockReplacesTheFirst)
{
  ASSERT_EQ(lockFile(file_, kExclusive, kDoNotWait), TAV_RC_OK);
  EXPECT_EQ(lockFile(file_, kShared, kDoNotWait), TAV_RC_OK);
  EXPECT_EQ(lockFile(other_, kShared, kDoNotWait), TAV_RC_OK);
  EXPECT_EQ(file_.unlock(), TAV_RC_OK);
  EXPECT_EQ(file_.unlock(), KOR_RC_NOT_LOCKED);
}

TEST_F(LockOfTwoFiles, ARefusedReplacementLeavesNone)
{
  ASSERT_EQ(lockFile(other_, kShared, kDoNotWait), TAV_RC_OK);
  ASSERT_EQ(lockFile(file_, kShared, kDoNotWait), TAV_RC_OK);
  EXPECT_EQ(lockFile(file_, kExclusive, kDoNotWait), KOR_RC_LOCKED);
  EXPECT_EQ(file_.unlock(), KOR_RC_NOT_LOCKED);
  EXPECT_EQ(lockFile(other_, kExclusive, kDoNotWait), TAV_RC_OK);
}

TEST_F(LockOfTwoFiles, UnlockWithoutALockIsRefused)
{
  EXPECT_EQ(file_.unlock(), KOR_RC_NOT_LOCKED);
}

TEST_F(LockOfTwoFiles, ARefusedLockNeedsNoUnlock)
{
  ASSERT_EQ(lockFile(other_, kExclusive, kDoNotWait), TAV_RC_OK);
  ASSERT_EQ(lockFile(file_, kExclusive, kDoNotWait), KOR_RC_LOCKED);
  EXPECT_EQ(file_.unlock(), KOR_RC_NOT_LOCKED);
}
} // namespace
