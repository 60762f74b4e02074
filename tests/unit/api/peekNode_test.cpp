/// Judging nodes past the ring.
#include "api/peekNode.h"

#include <algorithm>
#include <cstdint>
#include <gtest/gtest.h>

#include "core/fastWay.h"
#include "storage/cachedRun.h"
#include "support/byteRows.h"
#include "support/reading.h"
#include "support/streams.h"

namespace
{

using namespace test;

/// A storage that does not tell its size.
class Unsized : public VectorStorage
{
public:
  using VectorStorage::VectorStorage;
  uint32_t getTotalSize(uint64_t*) override { return TAV_RC_NOT_SUPPORTED; }
};

/// A storage that has bytes up to the last offset that there is.
class Endless : public VectorStorage
{
public:
  using VectorStorage::VectorStorage;
  uint32_t read(uint64_t wanted, void** ppData, uint64_t bufSize, uint64_t* pRead, bool, bool) override
  {
    *pRead = std::min({wanted, bufSize, uint64_t{0} - position});
    std::fill_n(static_cast<uint8_t*>(*ppData), *pRead, uint8_t{0x11});
    position += *pRead;
    return TAV_RC_OK;
  }
};

/// A ring of two pages of 64 bytes over 1,024 bytes, which caches those from 512 on: at 0 an element of 32 bytes, at 48
/// one that the ring cannot hold, at 64 one that ends behind the stream, at 80 an open group, and at the very end a
/// header without its data.
class Peek : public testing::Test
{
protected:
  Peek()
  {
    ByteRows rows;
    rows.h64(32, 0, TAV_TYPE_BINARY, 7).fill(32, 0x11);
    rows.h64(500, 0, TAV_TYPE_BINARY, 7);
    rows.h64(1000, 0, TAV_TYPE_BINARY, 7);
    rows.h64(TAV_SIZE_UNKNOWN, 0, TAV_TYPE_HEADER64, 9);
    rows.h64(0, 0, TAV_TYPE_BINARY, 7);
    while (rows.at() < kLast) rows.number(rows.at(), 8);
    rows.h64(1, 0, TAV_TYPE_BINARY, 7);
    bytes = rows.bytes;
    form.buffered = true;
    form.ringBytes = 2 * form.pageBytes;
  }

  void fill(TAVHandle* handle)
  {
    TAVCBUserArea area{};
    check(handle->pCircularBuf->getChunk(512, 64, &area, false, false), "fill");
  }

  /// Expects the code that reading gives, and the ring where it was.
  void expectAsRead(uint64_t offset, uint32_t rc)
  {
    StreamReader plain(bytes, form);
    TAVHeaderData read{};
    EXPECT_EQ(tavReadNodeInt(0, plain.handle(), offset, true, &read), rc) << offset;
    StreamReader reader(bytes, form);
    fill(reader.handle());
    const uint64_t headOffset = reader.handle()->pCircularBuf->headOffset;
    TAVHeaderData node{};
    EXPECT_EQ(tav::inside::peekNode(*reader.handle(), offset, node), rc) << offset;
    EXPECT_EQ(reader.handle()->pCircularBuf->headOffset, headOffset) << offset;
    EXPECT_EQ(node.header.hdr64.size, read.header.hdr64.size);
    EXPECT_EQ(node.header.nodeOffset, offset);
  }

  static constexpr uint64_t kLast = 1008;

  Bytes bytes;
  Form form;
};

TEST_F(Peek, GivesTheCodesOfReadingAndLeavesTheRingAlone)
{
  expectAsRead(0, TAV_RC_OK);
  expectAsRead(48, TAV_RC_DATA_TOO_LARGE);
  expectAsRead(64, TAV_RC_DATA_TOO_LARGE);
  expectAsRead(80, TAV_RC_OK);
  expectAsRead(96, TAV_RC_OK);
  expectAsRead(kLast, TAV_RC_END_OF_STORAGE);
}

TEST_F(Peek, WhatTheStorageDoesNotHaveIsLeftToReading)
{
  StreamReader reader(bytes, form);
  fill(reader.handle());
  TAVHeaderData node{};
  EXPECT_EQ(tav::inside::peekNode(*reader.handle(), kLast + 8, node), TAV_RC_END_OF_STORAGE);
  EXPECT_EQ(tav::inside::peekNode(*reader.handle(), ~uint64_t{0} - 7, node), TAV_RC_END_OF_STORAGE);
}

TEST_F(Peek, TheNextReadThroughTheRingIsNotMisled)
{
  StreamReader reader(bytes, form);
  fill(reader.handle());
  TAVHeaderData node{};
  ASSERT_EQ(tav::inside::peekNode(*reader.handle(), 0, node), TAV_RC_OK);
  TAVCBUserArea area{};
  ASSERT_EQ(reader.handle()->pCircularBuf->getChunk(704, 8, &area, false, false), TAV_RC_OK);
  EXPECT_TRUE(std::equal(area.pChunk, area.pChunk + 8, bytes.begin() + 704));
}

TEST_F(Peek, BytesAroundTheBeginningAndTheEndOfWhatIsCachedAreThoseOfTheStream)
{
  StreamReader reader(bytes, form);
  fill(reader.handle());
  const TAVCircularBuf& ring = *reader.handle()->pCircularBuf;
  const uint64_t end = ring.headOffset + tav::inside::cachedBytes(ring);
  for (const uint64_t offset : {ring.headOffset - 5, ring.headOffset, end - 5, end, end + 3, uint64_t{100}})
  {
    Bytes got(12);
    ASSERT_EQ(tav::inside::peekBytes(*reader.handle()->pCircularBuf, offset, got.data(), got.size()), TAV_RC_OK)
        << offset;
    EXPECT_TRUE(std::equal(got.begin(), got.end(), bytes.begin() + static_cast<ptrdiff_t>(offset))) << offset;
  }
}

TEST_F(Peek, ShortTransfersAreContinued)
{
  form.longestTransfer = 3;
  StreamReader reader(bytes, form);
  Bytes got(16);
  ASSERT_EQ(tav::inside::peekBytes(*reader.handle()->pCircularBuf, 200, got.data(), got.size()), TAV_RC_OK);
  EXPECT_TRUE(std::equal(got.begin(), got.end(), bytes.begin() + 200));
}

TEST_F(Peek, AFailedReadComesUp)
{
  StreamReader reader(bytes, form);
  fill(reader.handle());
  reader.vectorStorage().failAt(2, KOR_RC_IO_ERROR);
  TAVHeaderData node{};
  EXPECT_EQ(tav::inside::peekNode(*reader.handle(), 0, node), KOR_RC_IO_ERROR);
}

TEST_F(Peek, WhereTheStorageDoesNotSeekTheRingIsAsked)
{
  StreamReader reader(bytes, form);
  fill(reader.handle());
  reader.vectorStorage().attributes &= ~TAV_ATTR_SEEK;
  TAVHeaderData node{};
  EXPECT_EQ(tav::inside::peekNode(*reader.handle(), 0, node), TAV_RC_OK);
  EXPECT_TRUE(reader.handle()->pCircularBuf->isCached(0));
}

TEST_F(Peek, WhereASeekLandsElsewhereTheRingIsAsked)
{
  StreamReader reader(bytes, form);
  fill(reader.handle());
  reader.vectorStorage().seekError = 1;
  Bytes got(16);
  EXPECT_EQ(tav::inside::peekBytes(*reader.handle()->pCircularBuf, 0, got.data(), got.size()), tav::core::kNotHere);
}

TEST_F(Peek, WhereTheStorageDoesNotTellItsSizeTheRingIsAsked)
{
  Unsized storage(form.pageBytes, bytes, VectorStorage::kReadOnly);
  Handle handle(storage, TAV_OPT_READ, form);
  fill(handle.get());
  TAVHeaderData node{};
  EXPECT_EQ(tav::inside::peekNode(*handle.get(), 0, node), TAV_RC_OK);
  EXPECT_TRUE(handle->pCircularBuf->isCached(16));
}

TEST_F(Peek, BytesBehindTheLastOffsetAreNotThoseOfTheFirst)
{
  Endless storage(form.pageBytes, bytes, VectorStorage::kReadOnly);
  Handle handle(storage, TAV_OPT_READ, form);
  TAVCBUserArea area{};
  ASSERT_EQ(handle->pCircularBuf->getChunk(~uint64_t{0} - 63, 64, &area, false, false), TAV_RC_OK);
  Bytes got(16);
  EXPECT_EQ(tav::inside::peekBytes(*handle->pCircularBuf, ~uint64_t{0} - 7, got.data(), got.size()),
            tav::core::kNotHere);
}

TEST_F(Peek, ANodeThatIsReadIfItIsWholeComesWithItsData)
{
  StreamReader reader(bytes, form);
  fill(reader.handle());
  TAVHeaderData node{};
  ASSERT_EQ(tav::inside::readIfWhole(*reader.handle(), 0, node), TAV_RC_OK);
  EXPECT_EQ(payloadOf(node, 32), Bytes(32, 0x11));
  fill(reader.handle());
  const uint64_t headOffset = reader.handle()->pCircularBuf->headOffset;
  EXPECT_EQ(tav::inside::readIfWhole(*reader.handle(), 48, node), TAV_RC_DATA_TOO_LARGE);
  EXPECT_EQ(tav::inside::readIfWhole(*reader.handle(), 80, node), TAV_RC_OK);
  EXPECT_EQ(node.pDataBuf, nullptr);
  EXPECT_EQ(reader.handle()->pCircularBuf->headOffset, headOffset);
}

} // namespace
