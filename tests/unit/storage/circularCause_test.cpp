/// Why a small write through the ring was refused.
#include <gtest/gtest.h>

#include "storage/ringFixture.h"

namespace
{

using namespace test;

class RefusedWrite : public testing::Test
{
protected:
  /// Fills the ring, so that the next page needs room.
  void SetUp() override
  {
    ASSERT_EQ(rc, TAV_RC_OK);
    const std::vector<uint8_t> bytes = pattern(0, 1);
    for (uint64_t offset = 0; offset < 4 * kPage; ++offset)
    {
      ASSERT_EQ(ring.write(offset, bytes.data(), 1, false), TAV_RC_OK);
    }
    ASSERT_EQ(ring.takeWriteFailure(), TAV_RC_OK);
  }

  uint32_t writeOne()
  {
    const uint8_t byte = 1;
    return ring.write(4 * kPage, &byte, 1, false);
  }

  static constexpr uint64_t kPage = 64;
  VectorStorage storage{kPage};
  uint32_t rc = 77;
  TAVCircularBuf ring{&storage, 4 * kPage, &rc};
};

TEST_F(RefusedWrite, KeepsTheCodeOfThePageThatCouldNotMakeRoom)
{
  storage.failAt(1, KOR_RC_NO_SPACE);
  EXPECT_EQ(writeOne(), TAV_RC_BAD_PARAM);
  EXPECT_EQ(ring.takeWriteFailure(), KOR_RC_NO_SPACE);
  EXPECT_EQ(ring.takeWriteFailure(), TAV_RC_OK) << "asking forgets it";
}

TEST_F(RefusedWrite, KeepsTheCodeOfThePageThatCouldNotBeRead)
{
  // One of the calls by which a page goes and the next one comes is the read.
  uint32_t told = TAV_RC_OK;
  for (uint64_t nth = 1; nth <= 4 && told == TAV_RC_OK; ++nth)
  {
    const uint64_t reads = storage.reads;
    storage.failAt(nth, KOR_RC_IO_ERROR);
    const uint32_t code = writeOne();
    const uint32_t cause = ring.takeWriteFailure();
    EXPECT_EQ(code, cause == TAV_RC_OK ? TAV_RC_OK : TAV_RC_BAD_PARAM);
    told = storage.reads != reads ? cause : TAV_RC_OK;
  }
  EXPECT_EQ(told, KOR_RC_IO_ERROR);
}

TEST_F(RefusedWrite, ForgetsTheCodeWhenTheNextOneWorks)
{
  storage.failAt(1, KOR_RC_NO_SPACE);
  EXPECT_EQ(writeOne(), TAV_RC_BAD_PARAM);
  EXPECT_EQ(writeOne(), TAV_RC_OK);
  EXPECT_EQ(ring.takeWriteFailure(), TAV_RC_OK);
}

TEST_F(RefusedWrite, HasNothingToTellOfMisuse)
{
  EXPECT_EQ(ring.write(0, nullptr, 1, false), TAV_RC_BAD_PARAM);
  EXPECT_EQ(ring.takeWriteFailure(), TAV_RC_OK);
}

} // namespace
