/// Streams far larger than memory, through the default ring of 10 MiB. The storage keeps no pages: every byte it is
/// given is compared with what belongs there, and made anew when it is read. TAV_TEST_HUGE=1 adds a stream of 20 GiB,
/// TAV_TEST_HUGE_FOLDER=<folder> one in a real file there.
#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <gtest/gtest.h>
#include <string>
#include <vector>

#include "support/elements.h"
#include "support/platform.h"
#include "support/vectorStorage.h"
#include "tav/tav.h"

namespace
{

using namespace test;

constexpr uint64_t kMiB = 0x100000;
constexpr uint64_t kPayload = kMiB + 8;
constexpr uint64_t kElement = 16 + kPayload + 16; ///< header, payload, pair
constexpr uint64_t kHeader = 16;
constexpr uint64_t kHuge = 20 * 1024 * kMiB;

/// One group of equal elements, each payload full of a word that gives its number, made from the offset alone.
class MadeStream
{
public:
  explicit MadeStream(uint64_t elements)
      : elements_(elements), payload_(kPayload)
  {
    root_.hdr64 = {TAV_SIZE_UNKNOWN, 0, TAV_TYPE_HEADER64, 1};
  }

  [[nodiscard]] uint64_t length() const { return kHeader + elements_ * kElement; }
  void close() { root_.hdr64.size = elements_ * kElement; }

  const std::vector<uint8_t>& payload(uint64_t number)
  {
    if (number != held_)
    {
      const uint64_t word = (number + 1) * 0x9E3779B97F4A7C15;
      for (uint64_t at = 0; at < kPayload; at += 8)
      {
        std::memcpy(payload_.data() + at, &word, 8);
      }
      held_ = number;
    }
    return payload_;
  }

  /// The bytes of a range; zeros behind the stream.
  void make(uint64_t offset, uint8_t* to, uint64_t count)
  {
    while (count != 0)
    {
      const uint64_t done = piece(offset, to, count);
      offset += done;
      to += done;
      count -= done;
    }
  }

private:
  static uint64_t part(const void* from, uint64_t size, uint64_t at, uint8_t* to, uint64_t count)
  {
    const uint64_t length = std::min(count, size - at);
    std::memcpy(to, static_cast<const uint8_t*>(from) + at, length);
    return length;
  }

  uint64_t piece(uint64_t offset, uint8_t* to, uint64_t count)
  {
    if (offset < kHeader)
    {
      return part(&root_.hdr64, kHeader, offset, to, count);
    }
    if (offset >= length())
    {
      std::memset(to, 0, count);
      return count;
    }
    const uint64_t number = (offset - kHeader) / kElement;
    const uint64_t at = (offset - kHeader) % kElement;
    if (at < kHeader)
    {
      const TAVHeader64 header{kPayload, TAV_INFO_EYE_SIZE, TAV_TYPE_BINARY, 2};
      return part(&header, kHeader, at, to, count);
    }
    if (at < kHeader + kPayload)
    {
      return part(payload(number).data(), kPayload, at - kHeader, to, count);
    }
    const uint64_t pair[] = {TAV_EYE_CATCHER, kHeader + kPayload};
    return part(pair, sizeof pair, at - kHeader - kPayload, to, count);
  }

  uint64_t elements_;
  TAVHeader root_{};
  std::vector<uint8_t> payload_;
  uint64_t held_ = ~uint64_t{0};
};

/// Stands for a file: keeps its size and its cursor alone.
class VerifyingStorage : public VectorStorage
{
public:
  explicit VerifyingStorage(MadeStream& stream)
      : VectorStorage(kMiB), stream_(stream), page_(kMiB)
  {
  }
  uint32_t getTotalSize(uint64_t* pSize) override
  {
    *pSize = size_;
    return TAV_RC_OK;
  }
  uint32_t read(uint64_t wanted, void** ppData, uint64_t bufSize, uint64_t* pRead, bool, bool) override
  {
    *pRead = std::min({wanted, bufSize, position < size_ ? size_ - position : 0});
    stream_.make(position, static_cast<uint8_t*>(*ppData), *pRead);
    position += *pRead;
    bytesRead += *pRead;
    return *pRead < wanted ? TAV_RC_END_OF_STORAGE : TAV_RC_OK;
  }
  uint32_t write(const void* pData, uint64_t size, uint64_t* pWritten) override
  {
    const auto* const given = static_cast<const uint8_t*>(pData);
    gap = gap || position > size_;
    for (uint64_t done = 0; done < size;)
    {
      const uint64_t length = std::min<uint64_t>(size - done, page_.size());
      stream_.make(position + done, page_.data(), length);
      wrong += std::memcmp(page_.data(), given + done, length) != 0 ? 1 : 0;
      done += length;
    }
    position += size;
    size_ = std::max(size_, position);
    *pWritten = size;
    return TAV_RC_OK;
  }

  uint64_t wrong = 0; ///< writes of other bytes than belong there
  bool gap = false;   ///< a write left bytes out

private:
  MadeStream& stream_;
  std::vector<uint8_t> page_;
  uint64_t size_ = 0;
};

void writeStream(TAVSideStorage& storage, MadeStream& stream, uint64_t elements)
{
  TAVInitParam param(&storage, TAV_OPT_WRITE);
  TAVHandle* handle = nullptr;
  ASSERT_EQ(tavInitHandle(&handle, &param), TAV_RC_OK);
  EXPECT_EQ(handle->pCircularBuf->ringSize, 10 * kMiB);
  Element root = group64(1);
  TAVHeaderData data = root.data();
  ASSERT_EQ(tavAddElement(0, handle, &data), TAV_RC_OK);
  std::vector<uint8_t> payload;
  for (uint64_t i = 0; i < elements; ++i)
  {
    payload = stream.payload(i);
    data.header = header64(kPayload, TAV_TYPE_BINARY, 2, TAV_INFO_EYE_SIZE);
    data.pDataBuf = payload.data();
    data.dataBufSize = payload.size();
    ASSERT_EQ(tavAddElement(0, handle, &data), TAV_RC_OK) << "element " << i;
  }
  EXPECT_EQ(handle->streamBytes, stream.length());
  ASSERT_EQ(handle->pCircularBuf->reset(), TAV_RC_OK);
  stream.close(); // from here on the group's size belongs at the first byte
  ASSERT_EQ(tavCloseHeader(0, handle), TAV_RC_OK);
  ASSERT_EQ(handle->pCircularBuf->reset(), TAV_RC_OK);
  tavTermHandle(&handle);
}

void expectElement(MadeStream& stream, const TAVHeaderData& node, uint64_t number)
{
  ASSERT_EQ(node.header.nodeOffset, kHeader + number * kElement);
  ASSERT_EQ(node.dataBufSize, kPayload);
  ASSERT_EQ(std::memcmp(node.pDataBuf, stream.payload(number).data(), kPayload), 0) << "element " << number;
}

void readStream(TAVSideStorage& storage, MadeStream& stream, uint64_t elements)
{
  TAVInitParam param(&storage, TAV_OPT_READ);
  TAVHandle* handle = nullptr;
  ASSERT_EQ(tavInitHandle(&handle, &param), TAV_RC_OK);
  TAVHeaderData root{};
  ASSERT_EQ(tavGetNextChild(0, handle, nullptr, nullptr, &root), TAV_RC_OK);
  EXPECT_EQ(root.header.hdr64.size, elements * kElement);
  TAVHeaderData nodes[2]{};
  for (uint64_t i = 0; i < elements; ++i)
  {
    TAVHeader* const previous = i != 0 ? &nodes[(i + 1) % 2].header : nullptr;
    ASSERT_EQ(tavGetNextChild(0, handle, &root.header, previous, &nodes[i % 2]), TAV_RC_OK);
    expectElement(stream, nodes[i % 2], i);
  }
  TAVHeaderData& last = nodes[(elements + 1) % 2];
  TAVHeaderData none{};
  EXPECT_EQ(tavGetNextChild(0, handle, &root.header, &last.header, &none), TAV_RC_NO_MORE_CHILDREN);
  TAVHeaderData before{};
  for (uint64_t back = 2; back < 12; ++back)
  {
    ASSERT_EQ(tavGetPrevNode(0, handle, &last, &before), TAV_RC_OK);
    expectElement(stream, before, elements - back);
    last.header = before.header;
  }
  const uint64_t inside = kHeader + (elements / 2) * kElement + 100;
  ASSERT_EQ(tavFindNodeFromIndex(0, handle, inside, 0, &before), TAV_RC_OK);
  expectElement(stream, before, elements / 2);
  tavTermHandle(&handle);
}

void roundTrip(uint64_t bytes)
{
  const uint64_t elements = bytes / kElement + 1;
  MadeStream stream(elements);
  VerifyingStorage storage(stream);
  ASSERT_GT(stream.length(), bytes);
  writeStream(storage, stream, elements);
  EXPECT_EQ(storage.wrong, 0U);
  EXPECT_FALSE(storage.gap);
  storage.attributes &= ~TAV_ATTR_WRITABLE;
  const uint64_t readBefore = storage.bytesRead;
  readStream(storage, stream, elements);
  std::printf("stream of %llu bytes: %.3f bytes read for each byte on the way back, peak memory %llu KiB\n",
              static_cast<unsigned long long>(stream.length()),
              static_cast<double>(storage.bytesRead - readBefore) / static_cast<double>(stream.length()),
              static_cast<unsigned long long>(peakKibibytes()));
}

TEST(HugeStream, AboveFourGibibytesGoesThroughTheDefaultRing)
{
  roundTrip(0x100000000 + 64 * kMiB);
}

TEST(HugeStream, OfTwentyGibibytesGoesThroughTheDefaultRing)
{
  if (std::getenv("TAV_TEST_HUGE") == nullptr)
  {
    GTEST_SKIP() << "set TAV_TEST_HUGE=1";
  }
  roundTrip(kHuge);
}

TEST(HugeStream, OfTwentyGibibytesGoesThroughAFile)
{
  const char* const folder = std::getenv("TAV_TEST_HUGE_FOLDER");
  if (folder == nullptr)
  {
    GTEST_SKIP() << "set TAV_TEST_HUGE_FOLDER to a folder with room for 20 GiB";
  }
  const std::string path = std::string(folder) + "/hugeStream_test.tav";
  const uint64_t elements = kHuge / kElement + 1;
  MadeStream stream(elements);
  KORFileOpenParam param;
  param.pPath = path.c_str();
  param.options = KOR_FILE_UPDATE | KOR_FILE_CREATE | KOR_FILE_EXCLUSIVE;
  uint32_t rc = TAV_RC_OK;
  {
    TAVSSFile file(&param, &rc);
    ASSERT_EQ(rc, TAV_RC_OK) << path << ": " << korCodeName(rc);
    writeStream(file, stream, elements);
  }
  param.options = KOR_FILE_READ;
  TAVSSFile file(&param, &rc);
  EXPECT_EQ(rc, TAV_RC_OK);
  if (!HasFailure())
  {
    readStream(file, stream, elements);
  }
  std::remove(path.c_str());
  std::printf("peak memory %llu KiB\n", static_cast<unsigned long long>(peakKibibytes()));
}

} // namespace
