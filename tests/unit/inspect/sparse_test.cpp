/// What the system says of zeros is not read: the holes of sparse files. And how little of a file a path reads.
#include <filesystem>
#include <memory>
#include <string>
#include <utility>

#include <gmock/gmock.h>

#include "cpp/layer.h"
#include "inspect/streams.h"
#include "tav/inspect/document.hpp"

using namespace tav::inspect;
using test::Bytes;

namespace
{

constexpr uint64_t kFar = uint64_t{4} << 30;

Bytes stream(uint32_t groups, size_t length)
{
  tav::Writer writer;
  {
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
    for (uint32_t i = 0; i < groups; ++i)
    {
      root.group(TAV_ELM_CMN_HOST).add(TAV_ELM_CMN_HOST_NAME, std::string(length, 'x'));
    }
    root.add(TAV_ELM_CMN_CPU_ONLINE, uint32_t{7});
  }
  writer.finish();
  return test::bytesOf(writer.bytes());
}

/// A stream, a hole of gigabytes, and perhaps another stream.
class SparseFile : public testing::Test
{
protected:
  void SetUp() override
  {
    std::filesystem::resize_file(file_.path(), kFar);
    if (open()->zerosUntil(kFar / 2) != kFar)
    {
      GTEST_SKIP() << "this file system has no holes";
    }
  }

  [[nodiscard]] std::unique_ptr<ByteSource> open() const
  {
    return ByteSource::open(tav::host::textOf(file_.path()));
  }

  const Bytes content_ = stream(3, 10);
  const test::StreamFile file_{content_};
};

size_t rootsOf(const Document& document)
{
  size_t count = 0;
  for (const tav::Node& root : document.roots())
  {
    count += root.isGroup() ? 1 : 0;
  }
  return count;
}

} // namespace

TEST_F(SparseFile, SaysHowFarTheZerosReach)
{
  const auto source = open();
  EXPECT_EQ(source->zerosUntil(0), 0U);
  EXPECT_EQ(source->zerosUntil(kFar - 1), kFar);
  EXPECT_EQ(source->zerosUntil(kFar), kFar);
  EXPECT_EQ(source->zerosUntil(kFar + 1), kFar);
  EXPECT_EQ(source->zerosBefore(0, 0), 0U);
  const uint64_t start = source->zerosBefore(kFar, 0);
  EXPECT_GE(start, content_.size());
  EXPECT_LE(start, uint64_t{1} << 20U);
  EXPECT_EQ(source->zerosBefore(kFar, kFar / 2), kFar / 2);
  EXPECT_EQ(source->zerosBefore(1, 0), 1U) << "the stream's first byte";
  EXPECT_EQ(source->bytesRead(), 0U);
}

TEST_F(SparseFile, IsSearchedOnBehindTheHole)
{
  const auto source = open();
  const Bytes zeros(100);
  EXPECT_EQ(source->pastHole(kFar / 2, zeros), kFar);
  EXPECT_EQ(source->pastHole(kFar / 2, zeros, 16), kFar - 16);
  EXPECT_EQ(source->pastHole(kFar - 10, zeros, 16), kFar - 10);
  EXPECT_EQ(source->pastHole(kFar / 2, Bytes{0, 1}), kFar / 2) << "the hole is elsewhere";
}

TEST_F(SparseFile, AWindowOnItKnowsItsHoles)
{
  const auto source = open();
  EXPECT_EQ(source->window(1000000)->zerosUntil(kFar / 2), kFar - 1000000);
  const auto behind = ByteSource::open(tav::host::textOf(file_.path()), kDefaultRing, 1000000);
  EXPECT_EQ(behind->zerosUntil(kFar / 2), kFar - 1000000);
  EXPECT_EQ(behind->window(1000000)->zerosUntil(kFar / 2), kFar - 2000000);
}

TEST_F(SparseFile, IsReadWithoutItsHole)
{
  const Document document(file_.path());
  EXPECT_EQ(rootsOf(document), 1U);
  EXPECT_LE(document.source().bytesRead(), uint64_t{2} << 20U);
}

TEST_F(SparseFile, TheStreamBehindTheHoleIsFound)
{
  file_.append(content_);
  const Document document(file_.path());
  EXPECT_EQ(rootsOf(document), 2U);
  EXPECT_LE(document.source().bytesRead(), uint64_t{2} << 20U);
  const tav::Reader reader(file_.path());
  size_t count = 0;
  for (const tav::Node& root : reader.roots())
  {
    EXPECT_EQ(root.offset(), count * kFar);
    ++count;
  }
  EXPECT_EQ(count, 2U);
}

TEST(DocumentPath, ReadsLittleOfTheGroupsThatItPasses)
{
  auto storage = std::make_unique<test::VectorStorage>(0x1000, stream(75, 500 * 1000));
  const test::VectorStorage& counting = *storage;
  const uint64_t size = counting.bytes.size();
  const Document document(std::make_unique<ByteSource>("x", std::move(storage)));
  const uint64_t before = counting.bytesRead;
  auto found = document.find("/system/cpuOnline");
  const auto first = found.begin();
  ASSERT_NE(first, std::default_sentinel);
  EXPECT_EQ((*first).as<uint32_t>(), 7U);
  EXPECT_LE(counting.bytesRead - before, size / 10);
}
