/// The file storage over real files: writing, locks, whole streams.
#include <array>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <tuple>

#include "storage/fileFixture.h"

namespace
{

using namespace test;
using testing::ElementsAre;

// --- writing ---

TEST_F(FileStorage, WritesAtItsCursor)
{
  const std::string path = folder_ / "new.tav";
  OpenFile file(path, kCreate);
  const std::vector<uint8_t> bytes = pattern(0, 10);
  uint64_t written = 0;
  TraceLog trace;
  EXPECT_EQ(file->write(bytes.data(), 10, &written), TAV_RC_OK);
  EXPECT_EQ(written, 10U);
  EXPECT_EQ(file->position, 10U);
  EXPECT_EQ(contentOf(path), bytes);
  EXPECT_THAT(trace.dump(tav::probe::ssFileWrite, 100).items,
              ElementsAre(bytesOf(uint64_t{10}), bytesOf(uint64_t{10})));
}

TEST_F(FileStorage, NeedsDataAndAPlaceForTheCount)
{
  OpenFile file(fileOf(10), KOR_FILE_READ); // not writable either: the arguments come first
  uint64_t written = 99;
  TraceLog trace;
  EXPECT_EQ(file->write(nullptr, 2, &written), TAV_RC_BAD_PARAM);
  EXPECT_EQ(file->write("xy", 2, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(written, 99U);
  EXPECT_THAT(trace.failures(), ElementsAre(at(tav::probe::ssFileWrite, 10, TAV_RC_BAD_PARAM),
                                            at(tav::probe::ssFileWrite, 10, TAV_RC_BAD_PARAM)));
}

TEST_F(FileStorage, RefusesToWriteAFileOpenedForReading)
{
  OpenFile file(fileOf(10), KOR_FILE_READ);
  uint64_t written = 99;
  TraceLog trace;
  EXPECT_EQ(file->write("xy", 2, &written), TAV_RC_NOT_SUPPORTED);
  EXPECT_THAT(trace.failures(), ElementsAre(at(tav::probe::ssFileWrite, 160, TAV_RC_NOT_SUPPORTED)));
}

// --- locks ---

// --- streams in files ---

TEST_F(FileStorage, ReadsAndWritesAboveFourGigabytes)
{
  const std::string path = folder_ / "sparse.tav";
  constexpr uint64_t far = 0x180000003; // 6 GiB and 3 bytes
  OpenFile file(path, kCreate);
  ASSERT_EQ(file->seek(far, 1), TAV_RC_OK);
  const std::vector<uint8_t> bytes = pattern(0, 100);
  uint64_t written = 0;
  ASSERT_EQ(file->write(bytes.data(), 100, &written), TAV_RC_OK);
  EXPECT_EQ(file->position, far + 100);
  uint64_t size = 0;
  ASSERT_EQ(file->getTotalSize(&size), TAV_RC_OK);
  EXPECT_EQ(size, far + 100);
  EXPECT_EQ(read(file, 10, 10, true), (Got{TAV_RC_OK, pattern(90, 10)}));
  ASSERT_EQ(file->seek(far - 2, 1), TAV_RC_OK);
  EXPECT_EQ(read(file, 4), (Got{TAV_RC_OK, {0, 0, byteAt(0), byteAt(1)}}));
}

class StreamInAFile : public FileStorage, public testing::WithParamInterface<std::tuple<bool, bool>>
{};

TEST_P(StreamInAFile, IsTheStreamInMemory)
{
  const auto [swap, align] = GetParam();
  const Form form{.buffered = false, .swap = swap, .align = align, .ringBytes = 0x200000};
  const std::string path = folder_ / "stream.tav";
  StreamWriter memory(form, 0x600000);
  uint64_t length = 0;
  {
    OpenFile file(path, kCreate);
    Handle handle(*file, TAV_OPT_WRITE, form);
    const auto add = [&](Element node) {
      memory.add(node);
      TAVHeaderData data = node.data();
      ASSERT_EQ(tavAddElement(0, handle.get(), &data), TAV_RC_OK);
    };
    add(group64(1));
    for (uint64_t i = 0; i < 4000; ++i)
    {
      add(binary(2, pattern(i, 997), true, TAV_INFO_EYE_SIZE));
    }
    add(binary(3, pattern(1, 0x100000)));
    memory.close();
    ASSERT_EQ(tavCloseHeader(0, handle.get()), TAV_RC_OK);
    length = handle->streamBytes;
  }
  std::vector<uint8_t> content = contentOf(path);
  ASSERT_GE(content.size(), length);
  EXPECT_LE(content.size(), length + 0x200000) << "zeros, two pages at the most";
  content.resize(length);
  EXPECT_TRUE(content == memory.bytes());

  OpenFile file(path, KOR_FILE_READ);
  Handle reader(*file, TAV_OPT_READ, form);
  TAVHeaderData root{};
  TAVHeaderData node{};
  ASSERT_EQ(tavGetNextChild(0, reader.get(), nullptr, nullptr, &root), TAV_RC_OK);
  uint64_t children = 0;
  uint32_t rc = tavGetNextChild(0, reader.get(), &root.header, nullptr, &node);
  for (; rc == TAV_RC_OK; ++children)
  {
    const TAVHeader previous = node.header;
    rc = tavGetNextChild(0, reader.get(), &root.header, const_cast<TAVHeader*>(&previous), &node);
  }
  EXPECT_EQ(rc, TAV_RC_NO_MORE_CHILDREN);
  EXPECT_EQ(children, 4001U);
}

INSTANTIATE_TEST_SUITE_P(Forms, StreamInAFile, testing::Combine(testing::Bool(), testing::Bool()));

TEST_F(FileStorage, OpenedForWritingAloneRefusesSmallWrites)
{
  OpenFile file(fileOf(10), KOR_FILE_WRITE);
  Handle handle(*file, TAV_OPT_WRITE, {.ringBytes = 0x400000});
  Element root = group64(1);
  TAVHeaderData data = root.data();
  EXPECT_EQ(tavAddElement(0, handle.get(), &data), TAV_RC_BAD_PARAM);
}

TEST_F(FileStorage, KeepsTheBytesOfALongerFileBehindANewStream)
{
  const std::string path = fileOf(2000);
  uint64_t written = 0;
  {
    OpenFile file(path, KOR_FILE_UPDATE);
    file->ioUnit = 64;
    TAVInitParam param(&*file, TAV_OPT_WRITE, 640, 0, 0, 0);
    TAVHandle* handle = nullptr;
    ASSERT_EQ(tavInitHandle(&handle, &param), TAV_RC_OK);
    TAVHeaderData root{};
    root.header.hdrType = TAV_HDR_64;
    root.header.hdr64 = {0, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM};
    ASSERT_EQ(tavAddElement(0, handle, &root), TAV_RC_OK);
    ASSERT_EQ(tavCloseHeader(0, handle), TAV_RC_OK);
    written = handle->streamBytes;
    ASSERT_EQ(tavTermHandle(&handle), TAV_RC_OK);
  }
  const std::vector<uint8_t> content = contentOf(path);
  ASSERT_EQ(content.size(), 2000U);
  EXPECT_EQ(std::vector<uint8_t>(content.begin() + static_cast<ptrdiff_t>(written), content.end()),
            pattern(written, 2000 - written));
}

} // namespace
