#include <array>
#include <cstdint>
#include <fstream>
#include <iterator>
#include <vector>

#include "cpp/layer.h"
#include "support/failingNew.h"

using namespace test;

namespace
{

void describe(tav::Writer& writer)
{
  {
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM, {.eyeSize = true});
    for (uint32_t i = 0; i < 300; ++i)
    {
      tav::Group host = root.group(TAV_ELM_CMN_HOST, {.eyeSize = i % 2 == 0});
      host.add(TAV_ELM_CMN_CPU_ONLINE, i);
      host.add(TAV_ELM_CMN_HOST_NAME, std::string(i, 'h'), {.eyeSize = true});
    }
  }
  writer.finish();
}

Bytes inBuffer(const tav::StreamOptions& options)
{
  tav::Writer writer(options);
  describe(writer);
  return bytesOf(writer.bytes());
}

Bytes contentOf(const std::filesystem::path& path)
{
  std::ifstream file(path, std::ios::binary);
  return {std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>()};
}

/// What lies behind the stream's end in a file or a storage is zero.
void expectBegins(Bytes held, const Bytes& stream)
{
  ASSERT_GE(held.size(), stream.size());
  const Bytes rest(held.begin() + static_cast<ptrdiff_t>(stream.size()), held.end());
  EXPECT_EQ(rest, Bytes(rest.size()));
  held.resize(stream.size());
  EXPECT_TRUE(held == stream);
}

} // namespace

class LayerWriter : public ::testing::TestWithParam<tav::StreamOptions>
{
};

TEST_P(LayerWriter, PutsTheSameBytesIntoABlock)
{
  std::vector<std::byte> block(1U << 20U);
  tav::Writer writer(block, GetParam());
  describe(writer);
  EXPECT_TRUE(bytesOf(writer.bytes()) == inBuffer(GetParam()));
  EXPECT_EQ(writer.bytes().data(), block.data());
}

TEST_P(LayerWriter, PutsTheSameBytesIntoAFile)
{
  const TemporaryPath file;
  tav::Writer writer(file.path, {}, GetParam());
  describe(writer);
  expectBegins(contentOf(file.path), inBuffer(GetParam()));
  EXPECT_EQ(writer.size(), inBuffer(GetParam()).size());
  EXPECT_TRUE(writer.bytes().empty());
}

TEST_P(LayerWriter, PutsTheSameBytesIntoAStorageThroughASmallRing)
{
  VectorStorage storage(0x1000);
  tav::StreamOptions options = GetParam();
  options.ringBytes = 0x3000;
  tav::Writer writer(storage, options);
  describe(writer);
  expectBegins(storage.bytes, inBuffer(GetParam()));
}

TEST_P(LayerWriter, BlockOfOneByteMoreThanTheStreamIsEnough)
{
  const Bytes stream = inBuffer(GetParam());
  std::vector<std::byte> block(stream.size() + 1);
  tav::Writer fits(block, GetParam());
  EXPECT_NO_THROW(describe(fits));
  block.pop_back();
  tav::Writer doesNot(block, GetParam());
  EXPECT_EQ(thrownBy([&] { describe(doesNot); }), TAV_RC_END_OF_STORAGE);
}

INSTANTIATE_TEST_SUITE_P(Forms, LayerWriter,
                         ::testing::Values(tav::StreamOptions{},
                                           tav::StreamOptions{.byteOrder = tav::ByteOrder::swapped},
                                           tav::StreamOptions{.align8 = true},
                                           tav::StreamOptions{.byteOrder = tav::ByteOrder::swapped, .align8 = true},
                                           tav::StreamOptions{.root = tav::Width::bits32}),
                         [](const auto& row) {
                           return std::string(row.param.byteOrder == tav::ByteOrder::swapped ? "Swapped" : "Native") +
                                  (row.param.align8 ? "Aligned" : "Packed") +
                                  (row.param.root == tav::Width::bits32 ? "Root32" : "Root64");
                         });

TEST(LayerWriterBuffer, GrowsWithAnElementLargerThanItself)
{
  tav::Writer writer;
  tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
  const std::string large(1U << 20U, 'x');
  root.add(TAV_ELM_CMN_HOST_NAME, "small");
  root.add(TAV_ELM_CMN_HOST_NAME, large);
  root.close();
  writer.finish();
  const tav::Reader reader(writer.bytes());
  EXPECT_EQ(reader.path("system/hostName[2]")->as<std::string_view>(), large);
}

TEST(LayerWriterBuffer, ReportsThatItCannotGrowAndGoesOn)
{
  constexpr size_t kBeyondMemory = sizeof(size_t) == 8 ? SIZE_MAX / 16 : SIZE_MAX / 2;
  tav::Writer writer;
  tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
  const std::string large(1U << 20U, 'x');
  const std::span<const std::byte> beyond(std::as_bytes(std::span(large)).data(), kBeyondMemory); // never read
  EXPECT_EQ(thrownBy([&] { root.add(TAV_ELM_CMN_HOST_NAME, beyond); }), TAV_RC_NO_MEMORY);
  EXPECT_EQ(writer.size(), 16U);
  root.add(TAV_ELM_CMN_HOST_NAME, large);
  root.close();
  writer.finish();
  EXPECT_EQ(writer.size(), 32U + large.size());
}

TEST(LayerWriterBuffer, ReportsThatItCannotBeMade)
{
  for (uint64_t nth = 1;; ++nth)
  {
    bool happened = false;
    uint32_t rc = TAV_RC_OK;
    {
      const allocations::FailNth failing(nth);
      rc = thrownBy([] { tav::Writer writer; });
      happened = allocations::FailNth::happened();
    }
    if (!happened)
    {
      EXPECT_GT(nth, 2U);
      break;
    }
    EXPECT_TRUE(rc == TAV_RC_NO_MEMORY || rc == TAV_RC_NO_HDR_STACK || rc == TAV_RC_OK) << nth;
  }
}

TEST(LayerWriterUtf8, ReportsThatALongTextCouldNotBePutTogether)
{
  std::vector<std::byte> block(4096);
  tav::Writer writer(block);
  tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
  const std::string text(1000, 'x');
  {
    const allocations::FailNth failing(1);
    EXPECT_EQ(givenBy([&](std::error_code& ec) { root.add(1, tav::Utf8{text}, ec); }), TAV_RC_NO_MEMORY);
  }
  EXPECT_EQ(writer.size(), 16U);
}

TEST(LayerWriterFile, RefusesAnExistingFileUnlessItMayOverwrite)
{
  const TemporaryPath file;
  {
    tav::Writer first(file.path);
    describe(first);
  }
  const Bytes before = contentOf(file.path);
  EXPECT_EQ(thrownBy([&] { tav::Writer second(file.path); }), KOR_RC_FILE_EXISTS);
  EXPECT_EQ(givenBy([&](std::error_code& ec) { tav::Writer second(file.path, {}, {}, ec); }), KOR_RC_FILE_EXISTS);
  EXPECT_TRUE(contentOf(file.path) == before);
  tav::Writer third(file.path, {.overwrite = true}, {.byteOrder = kLowFirst});
  third.group(0x0102).close();
  third.finish();
  expectBegins(contentOf(file.path), hex("00 00 00 00 00 00 00 00 00 00 00 00 02 00 02 01"));
}

TEST(LayerWriterFile, WriterThatCouldNotOpenAnswersErrors)
{
  std::error_code ec;
  tav::Writer writer(std::filesystem::path("/nowhere/at/all"), {}, {}, ec);
  EXPECT_EQ(tav::codeOf(ec), KOR_RC_NO_SUCH_FILE);
  EXPECT_EQ(thrownBy([&] { tav::Group root = writer.group(1); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(thrownBy([&] { writer.finish(); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(thrownBy([&] { writer.update(tav::HeaderView(), uint8_t{1}); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(writer.size(), 0U);
  EXPECT_TRUE(writer.bytes().empty());
}

TEST(LayerWriterBlock, EmptyBlockIsRefused)
{
  EXPECT_EQ(thrownBy([] { tav::Writer writer{std::span<std::byte>()}; }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(givenBy([](std::error_code& ec) { tav::Writer writer(std::span<std::byte>(), {}, ec); }), TAV_RC_BAD_PARAM);
}

TEST(LayerWriterFinish, OpenGroupIsAnError)
{
  tav::Writer writer;
  tav::Group root = writer.group(1);
  EXPECT_EQ(thrownBy([&] { writer.finish(); }), TAV_RC_BAD_PARAM);
  root.close();
  EXPECT_EQ(givenBy([&](std::error_code& ec) { writer.finish(ec); }), TAV_RC_OK);
}

TEST(LayerWriterFinish, StreamStaysAndTakesNothingMore)
{
  tav::Writer writer;
  tav::Group root = writer.group(1);
  root.close();
  writer.finish();
  EXPECT_EQ(writer.size(), 16U);
  EXPECT_EQ(writer.bytes().size(), 16U);
  EXPECT_EQ(writer.handle(), nullptr);
  EXPECT_EQ(thrownBy([&] { tav::Group second = writer.group(1); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(thrownBy([&] { root.add(1, uint8_t{1}); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(thrownBy([&] { writer.finish(); }), TAV_RC_OK);
}

TEST(LayerWriterFinish, ReportsWhatTheStorageCouldNotTakeAndCanBeTriedAgain)
{
  VectorStorage storage;
  tav::Writer writer(storage);
  {
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
    root.add(TAV_ELM_CMN_HOST_NAME, "ada");
  }
  storage.failAt(1, KOR_RC_NO_SPACE);
  EXPECT_EQ(thrownBy([&] { writer.finish(); }), KOR_RC_NO_SPACE);
  EXPECT_TRUE(storage.bytes.empty());
  writer.finish();
  tav::Reader reader(storage);
  EXPECT_EQ(reader.path("system/hostName")->as<std::string>(), "ada");
}

TEST(LayerWriterFinish, UnfinishedWriterStillWritesItsPages)
{
  VectorStorage storage;
  {
    tav::Writer writer(storage);
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
  }
  tav::Reader reader(storage);
  EXPECT_EQ(reader.root().size(), 0U);
}

TEST(LayerWriterMove, AssignmentEndsWhatWasThere)
{
  VectorStorage first;
  tav::Writer writer(first);
  writer.group(TAV_ELM_CMN_SYSTEM).close();
  EXPECT_TRUE(first.bytes.empty());
  writer = tav::Writer();
  EXPECT_FALSE(first.bytes.empty());
  writer.group(TAV_ELM_CMN_SYSTEM).close();
  EXPECT_EQ(writer.bytes().size(), 16U);
}
