/// Short reads, and the end of the storage under a ring.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "storage/ringFixture.h"
#include "support/rows.h"

namespace
{

using namespace test;
using testing::Contains;
using testing::Each;
using testing::ElementsAre;

constexpr uint64_t kMax = ~uint64_t{0};

TEST(FillAtTheEnd, CompletesAPageThatCameInPieces)
{
  SmallRing small(100);
  small.storage.longestTransfer = 3;
  ASSERT_EQ(small.chunk(0, 1), TAV_RC_OK);
  ASSERT_EQ(small.count(), 3U);
  small.storage.longestTransfer = kMax;
  small.storage.takeLog();
  ASSERT_EQ(small.chunk(3, 1), TAV_RC_OK);
  EXPECT_THAT(small.storage.takeLog(), ElementsAre("read 3+5", "read 8+8")) << "never across a page's end";
}

TEST(FillAtTheEnd, CompletesTheLastPageOfAFullRing)
{
  SmallRing small(100, 1, VectorStorage::kReadOnly);
  small.storage.longestTransfer = 3;
  ASSERT_EQ(small.chunk(0, 1), TAV_RC_OK);
  ASSERT_EQ(small.chunk(3, 1), TAV_RC_OK);
  EXPECT_EQ(small.ring.headOffset, 0U) << "there was room: nothing had to go";
  EXPECT_EQ(small.count(), 6U);
}

TEST(FillAtTheEnd, NeverReadsAcrossTheEndOfTheRing)
{
  SmallRing small(100, 3, VectorStorage::kReadOnly);
  small.cache(8, 0, 16);
  small.storage.position = 16;
  ASSERT_EQ(small.chunk(16, 16), TAV_RC_OK);
  EXPECT_THAT(small.storage.takeLog(), ElementsAre("read 16+8", "read 24+8", "read 32+8"));
}

struct EndCode : Row
{
  uint32_t code;
};

class StoragesEnd : public testing::TestWithParam<EndCode>
{};

TEST_P(StoragesEnd, LeavesAPageThatIsReadShort)
{
  SmallRing small(5);
  small.storage.endCode = GetParam().code;
  ASSERT_EQ(small.chunk(0, 24), TAV_RC_OK);
  EXPECT_EQ(small.bytes(), pattern(0, 5));
  EXPECT_EQ(small.storage.reads, 1U) << "the page that could not be filled is the last";
  EXPECT_THAT(small.flags(), Each(0));
  EXPECT_EQ(small.ring.reset(), TAV_RC_OK);
  EXPECT_EQ(small.storage.bytes, pattern(0, 5)) << "reading makes nothing";
}

TEST_P(StoragesEnd, IsTheAnswerWhereNoByteCame)
{
  SmallRing small(8);
  small.storage.endCode = GetParam().code;
  EXPECT_EQ(small.chunk(8, 1), TAV_RC_END_OF_STORAGE);
  EXPECT_EQ(small.ring.empty, 1);
}

TEST_P(StoragesEnd, EndsALookBehindTheCachedRange)
{
  SmallRing small(20, 3, VectorStorage::kReadOnly);
  small.storage.endCode = GetParam().code;
  ASSERT_EQ(small.chunk(16, 1), TAV_RC_OK);
  EXPECT_EQ(small.chunk(20, kMax), TAV_RC_END_OF_STORAGE);
  EXPECT_EQ(small.chunk(kMax, kMax), TAV_RC_END_OF_STORAGE);
}

TEST_P(StoragesEnd, IsExtendedByAWrite)
{
  SmallRing small(5);
  small.storage.endCode = GetParam().code;
  ASSERT_EQ(small.write(5, {0xAA}), TAV_RC_OK);
  EXPECT_EQ(small.count(), 8U) << "a page from the offset on, counted in full";
  EXPECT_THAT(small.flags(), ElementsAre(1, 0, 0));
  EXPECT_EQ(small.ring.reset(), TAV_RC_OK);
  std::vector<uint8_t> expected = pattern(0, 5);
  expected.insert(expected.end(), {0xAA, 0, 0, 0, 0, 0, 0, 0});
  EXPECT_EQ(small.storage.bytes, expected) << "zeros up to the page's end";
}

INSTANTIATE_TEST_SUITE_P(Codes, StoragesEnd,
                         testing::Values(EndCode{"EndOfStorage", TAV_RC_END_OF_STORAGE},
                                         EndCode{"EndOfData", TAV_RC_END_OF_DATA},
                                         EndCode{"SuccessWithoutBytes", TAV_RC_OK}),
                         kRowName);

TEST(FillAtTheEnd, ZeroesWhatAWriteFindsMissingOfItsPage)
{
  SmallRing small(5);
  std::fill_n(small.ring.pRing, 24, uint8_t{0xEE});
  ASSERT_EQ(small.write(3, {0xAA, 0xBB}), TAV_RC_OK);
  EXPECT_EQ(small.ring.reset(), TAV_RC_OK);
  EXPECT_EQ(small.storage.bytes, (std::vector<uint8_t>{byteAt(0), byteAt(1), byteAt(2), 0xAA, 0xBB, 0, 0, 0, 0, 0, 0}));
}

TEST(FillAtTheEnd, MakesNoPageForAWriteWhoseOffsetIsCached)
{
  SmallRing small(8);
  ASSERT_EQ(small.write(0, {0xAA}), TAV_RC_OK);
  EXPECT_EQ(small.count(), 8U);
  EXPECT_EQ(small.ring.reset(), TAV_RC_OK);
  EXPECT_EQ(small.storage.bytes.size(), 8U);
}

TEST(FillAtTheEnd, DoesNotLengthenTheStorageForAWriteWhoseOffsetIsCached)
{
  SmallRing small(13);
  const std::vector<uint8_t> bytes(4, 'x');
  ASSERT_EQ(small.ring.write(2, bytes.data(), bytes.size(), false), TAV_RC_OK); // 2 pages from 2 on: 10 and 3 bytes
  ASSERT_EQ(small.ring.reset(), TAV_RC_OK);
  EXPECT_EQ(small.storage.bytes.size(), 13U) << "the page that the storage ends in stays short";
}

TEST(FillAtTheEnd, MakesPagesUpToAWriteFartherBehind)
{
  SmallRing small(8);
  ASSERT_EQ(small.write(0, {0xAA}), TAV_RC_OK);
  ASSERT_EQ(small.write(19, {0xBB}), TAV_RC_OK);
  EXPECT_EQ(small.ring.reset(), TAV_RC_OK);
  ASSERT_EQ(small.storage.bytes.size(), 24U);
  EXPECT_EQ(small.storage.bytes[19], 0xBB);
  EXPECT_THAT(std::vector<uint8_t>(small.storage.bytes.begin() + 8, small.storage.bytes.begin() + 19), Each(0));
}

TEST(FillAtTheEnd, ForAWriteOfAnElementEndsWithThePageThatTheStorageCouldNotFill)
{
  SmallRing small(0, 10);
  ASSERT_EQ(small.write(0, pattern(0, 30)), TAV_RC_OK);
  EXPECT_LE(small.storage.bytes.size(), 30U + 16U);
  EXPECT_EQ(small.ring.reset(), TAV_RC_OK);
  EXPECT_EQ(std::vector<uint8_t>(small.storage.bytes.begin(), small.storage.bytes.begin() + 30), pattern(0, 30));
}

TEST(FillAtTheEnd, MakesNoPagesOverAStorageThatFails)
{
  SmallRing small(0, 3);
  small.storage.failAt(1, KOR_RC_IO_ERROR);
  EXPECT_EQ(small.write(0, {0xAA}), TAV_RC_BAD_PARAM);
  EXPECT_EQ(small.ring.empty, 1);
}

TEST(FillAtTheEnd, BackwardZeroesWhatAWritableStorageLost)
{
  SmallRing small(100);
  ASSERT_EQ(small.chunk(43, 1), TAV_RC_OK);
  small.storage.bytes.resize(38);
  ASSERT_EQ(small.chunk(42, 1, true), TAV_RC_OK);
  EXPECT_THAT(small.bytes(), ElementsAre(0));
  EXPECT_THAT(small.flags(), Contains(1));
  EXPECT_EQ(small.ring.headOffset, 35U) << "the page that could not be filled is the last";
  ASSERT_EQ(small.chunk(35, 8), TAV_RC_OK);
  EXPECT_EQ(small.bytes(), (std::vector<uint8_t>{byteAt(35), byteAt(36), byteAt(37), 0, 0, 0, 0, 0}));
}

TEST(FillAtTheEnd, BackwardGivesTheEndWhereAReadOnlyStorageLostBytes)
{
  SmallRing small(100, 3, VectorStorage::kReadOnly);
  ASSERT_EQ(small.chunk(43, 1), TAV_RC_OK);
  small.storage.bytes.resize(38);
  EXPECT_EQ(small.chunk(42, 1, true), TAV_RC_END_OF_STORAGE);
  EXPECT_EQ(small.ring.headOffset, 43U);
  EXPECT_EQ(small.count(), 16U);
}

TEST(FillAtTheEnd, BackwardReadsAPageThatComesInPieces)
{
  SmallRing small(100, 3, VectorStorage::kReadOnly);
  ASSERT_EQ(small.chunk(43, 1), TAV_RC_OK);
  small.storage.longestTransfer = 3;
  ASSERT_EQ(small.chunk(42, 8, true), TAV_RC_OK);
  EXPECT_EQ(small.bytes(), pattern(35, 8));
}

TEST(FillAtTheEnd, KeepsWhatWasCachedWhenABackwardReadFails)
{
  SmallRing small(100, 3, VectorStorage::kReadOnly);
  ASSERT_EQ(small.chunk(43, 1), TAV_RC_OK);
  small.storage.failAt(2, KOR_RC_IO_ERROR);
  EXPECT_EQ(small.chunk(42, 1, true), KOR_RC_IO_ERROR);
  EXPECT_EQ(small.ring.headOffset, 43U);
  ASSERT_EQ(small.chunk(43, 16), TAV_RC_OK);
  EXPECT_EQ(small.bytes(), pattern(43, 16));
}

TEST(FillAtTheEnd, CountsNothingWhereTheStorageTellsNoNumber)
{
  class Mute : public VectorStorage
  {
  public:
    using VectorStorage::VectorStorage;
    uint32_t read(uint64_t, void**, uint64_t, uint64_t*, bool, bool) override { return TAV_RC_END_OF_STORAGE; }
  };
  Mute storage(8, {}, VectorStorage::kReadOnly);
  TAVCircularBuf ring(&storage, 16, nullptr);
  TAVCBUserArea area{};
  EXPECT_EQ(ring.getChunk(0, 1, &area, false, false), TAV_RC_END_OF_STORAGE);
  EXPECT_EQ(ring.empty, 1);
}

/// As memory storage does: a place behind the last byte is none.
class EndRefused : public VectorStorage
{
public:
  explicit EndRefused(uint64_t count, uint64_t attributeBits = kReadOnly)
      : VectorStorage(8, pattern(0, count), attributeBits) {}
  uint32_t seek(uint64_t offset, uint64_t hint) override
  {
    return offset >= bytes.size() ? TAV_RC_BAD_PARAM : VectorStorage::seek(offset, hint);
  }
};

TEST(FillAtTheEnd, ServesWhatIsCachedOverAStorageThatRefusesToSeekToItsEnd)
{
  EndRefused storage(32);
  TAVCircularBuf ring(&storage, 16, nullptr);
  for (const uint64_t offset : {uint64_t{0}, uint64_t{27}, uint64_t{24}, uint64_t{31}})
  {
    TAVCBUserArea area{};
    ASSERT_EQ(ring.getChunk(offset, 16, &area, false, false), TAV_RC_OK) << offset;
    EXPECT_EQ(*area.pChunk, byteAt(offset));
  }
}

TEST(FillAtTheEnd, IsTheAnswerWhereTheStorageRefusesToSeek)
{
  EndRefused storage(32);
  TAVCircularBuf ring(&storage, 16, nullptr);
  TAVCBUserArea area{};
  for (const uint64_t offset : {uint64_t{32}, uint64_t{1000}, kMax - 100})
  {
    EXPECT_EQ(ring.getChunk(offset, 1, &area, false, false), TAV_RC_END_OF_STORAGE) << offset;
  }
}

TEST(FillAtTheEnd, KeepsTheCodeOfASeekThatFailsBeforeTheEnd)
{
  EndRefused storage(32);
  TAVCircularBuf ring(&storage, 16, nullptr);
  storage.failAt(1, KOR_RC_IO_ERROR);
  TAVCBUserArea area{};
  EXPECT_EQ(ring.getChunk(20, 1, &area, false, false), KOR_RC_IO_ERROR);
}

TEST(FillAtTheEnd, MakesNoPageForAWriteWhereTheStorageRefusesToSeek)
{
  EndRefused storage(32, VectorStorage::kReadWrite);
  TAVCircularBuf ring(&storage, 32, nullptr);
  EXPECT_EQ(ring.write(40, "x", 1, false), TAV_RC_BAD_PARAM);
  EXPECT_EQ(ring.reset(), TAV_RC_OK);
  EXPECT_EQ(storage.bytes, pattern(0, 32));
}

TEST(FillAtTheEnd, DoesNotTrustAStorageThatTellsMoreThanWasAsked)
{
  class Boaster : public VectorStorage
  {
  public:
    using VectorStorage::VectorStorage;
    uint32_t read(uint64_t wanted, void** ppData, uint64_t bufSize, uint64_t* pRead, bool zeroCopy,
                  bool backward) override
    {
      const uint32_t rc = VectorStorage::read(wanted, ppData, bufSize, pRead, zeroCopy, backward);
      *pRead += 1000;
      return rc;
    }
  };
  Boaster storage(8, pattern(0, 100));
  TAVCircularBuf ring(&storage, 24, nullptr);
  TAVCBUserArea area{};
  EXPECT_EQ(ring.getChunk(0, 99, &area, false, false), TAV_RC_OK);
  EXPECT_EQ(area.chunkLength, 24U);
}

} // namespace
