#include <vector>

#include "cpp/layer.h"

using namespace test;

namespace
{

Bytes sample(tav::StreamOptions options = {})
{
  tav::Writer writer(options);
  {
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
    root.add(TAV_ELM_CMN_CPU_ONLINE, uint32_t{0x01020304});
    root.add(TAV_ELM_CMN_HOST_NAME, "ada");
    root.add(TAV_ELM_CMN_MACHINE_ID, tav::Utf8{"x"});
  }
  writer.finish();
  return bytesOf(writer.bytes());
}

} // namespace

class LayerUpdate : public ::testing::TestWithParam<tav::ByteOrder>
{
protected:
  tav::StreamOptions options{.byteOrder = GetParam()};
};

TEST_P(LayerUpdate, ChangesTheValueInPlaceAndNothingElse)
{
  Bytes stream = sample(options);
  const tav::Reader reader(spanOf(stream), options);
  tav::Updater updater(std::as_writable_bytes(std::span(stream)), options);
  Bytes expected = stream;
  const Bytes value = GetParam() == kHighFirst ? hex("0A 0B 0C 0D") : hex("0D 0C 0B 0A");
  std::copy(value.begin(), value.end(), expected.begin() + 32);

  updater.update(*reader.path("system/cpuOnline"), uint32_t{0x0A0B0C0D});
  EXPECT_EQ(toHex(stream), toHex(expected));
  EXPECT_EQ(reader.path("system/cpuOnline")->as<uint32_t>(), 0x0A0B0C0DU);
}

TEST_P(LayerUpdate, WorksThroughARing)
{
  VectorStorage storage(0x1000, sample(options));
  const tav::Reader before(storage, options);
  const tav::Node node = *before.path("system/hostName");
  tav::Updater updater(storage, options);
  updater.update(node, "bob");
  updater.finish();
  const tav::Reader after(storage, options);
  EXPECT_EQ(after.path("system/hostName")->as<std::string>(), "bob");
  EXPECT_EQ(after.path("system/cpuOnline")->as<uint32_t>(), 0x01020304U);
}

TEST_P(LayerUpdate, WriterChangesWhatItHasWritten)
{
  tav::Writer writer(options);
  tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
  const tav::HeaderView total = root.add(TAV_ELM_CMN_CPU_ONLINE, uint64_t{0});
  root.add(TAV_ELM_CMN_HOST_NAME, "ada");
  writer.update(total, uint64_t{42});
  root.add(TAV_ELM_CMN_HOST_NAME, "bob");
  root.close();
  writer.finish();
  const tav::Reader reader(writer.bytes(), options);
  EXPECT_EQ(reader.path("system/cpuOnline")->as<uint64_t>(), 42U);
  EXPECT_EQ(reader.all("system/hostName").size(), 2U);
}

INSTANTIATE_TEST_SUITE_P(ByteOrders, LayerUpdate, ::testing::Values(tav::ByteOrder::native, tav::ByteOrder::swapped),
                         [](const auto& row) { return row.param == tav::ByteOrder::native ? "Native" : "Swapped"; });

TEST(LayerUpdateFile, ChangesTheFile)
{
  const TemporaryPath file;
  {
    tav::Writer writer(file.path);
    {
      tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
      root.add(TAV_ELM_CMN_HOST_NAME, "ada");
    }
    writer.finish();
  }
  const auto sizeBefore = std::filesystem::file_size(file.path);
  {
    const tav::Reader reader(file.path);
    tav::Updater updater(file.path);
    updater.update(*reader.path("system/hostName"), "bob");
    updater.finish();
  }
  const tav::Reader reader(file.path);
  EXPECT_EQ(reader.path("system/hostName")->as<std::string>(), "bob");
  EXPECT_EQ(std::filesystem::file_size(file.path), sizeBefore);
}

TEST(LayerUpdateFile, FileThatIsNotThereIsNotMade)
{
  const TemporaryPath file;
  EXPECT_EQ(thrownBy([&] { tav::Updater updater(file.path); }), KOR_RC_NO_SUCH_FILE);
  EXPECT_FALSE(std::filesystem::exists(file.path));
}

class LayerUpdateRefusal : public ::testing::Test
{
protected:
  Bytes stream = sample();
  const Bytes before = stream;
  tav::Reader reader{spanOf(stream)};
  tav::Updater updater{std::as_writable_bytes(std::span(stream))};

  template<class T>
  uint32_t refusal(const char* path, const T& value)
  {
    const tav::Node node = *reader.path(path);
    const uint32_t thrown = thrownBy([&] { updater.update(node, value); });
    EXPECT_EQ(givenBy([&](std::error_code& ec) { updater.update(node, value, ec); }), thrown);
    EXPECT_TRUE(stream == before);
    return thrown;
  }
};

TEST_F(LayerUpdateRefusal, AnotherType)
{
  EXPECT_EQ(refusal("system/cpuOnline", int32_t{1}), TAV_RC_NOT_SUPPORTED);
}

TEST_F(LayerUpdateRefusal, AnotherSize)
{
  EXPECT_EQ(refusal("system/hostName", "adam"), TAV_RC_OUTSIDE_PARENT);
  EXPECT_EQ(refusal("system/hostName", "ad"), TAV_RC_OUTSIDE_PARENT);
}

TEST_F(LayerUpdateRefusal, Group)
{
  EXPECT_EQ(refusal("system", uint8_t{1}), TAV_RC_NOT_SUPPORTED);
}

TEST_F(LayerUpdateRefusal, NodeThatTheStreamDoesNotHave)
{
  TAVHeader header = reader.path("system/cpuOnline")->header();
  header.hdr64.elm = TAV_ELM_CMN_HOST_NAME;
  EXPECT_EQ(thrownBy([&] { updater.update(tav::HeaderView(header), uint32_t{1}); }), TAV_RC_BAD_PARAM);
  header.nodeOffset = 1U << 20U;
  EXPECT_EQ(thrownBy([&] { updater.update(tav::HeaderView(header), uint32_t{1}); }), TAV_RC_NO_MEMORY);
  EXPECT_TRUE(stream == before);
}

TEST_F(LayerUpdateRefusal, MovedFromUpdater)
{
  tav::Updater moved = std::move(updater);
  const tav::Node node = *reader.path("system/cpuOnline");
  EXPECT_EQ(thrownBy([&] { updater.update(node, uint32_t{1}); }), TAV_RC_BAD_PARAM); // NOLINT(bugprone-use-after-move)
  EXPECT_EQ(thrownBy([&] { updater.finish(); }), TAV_RC_BAD_PARAM);
  moved.update(node, uint32_t{1});
  EXPECT_EQ(node.as<uint32_t>(), 1U);
}

TEST(LayerUpdateBlock, EmptyBlockIsRefused)
{
  EXPECT_EQ(thrownBy([] { tav::Updater updater{std::span<std::byte>()}; }), TAV_RC_BAD_PARAM);
}

TEST(LayerReaderOverAWritableStorage, WritesNothingBack)
{
  VectorStorage storage(0x40, sample());
  {
    const tav::Reader reader(storage);
    const tav::Node node = *reader.path("system/cpuOnline");
    tav::Updater updater(storage);
    updater.update(node, uint32_t{7});
    updater.finish();
    const uint64_t writes = storage.writes;
    EXPECT_EQ(reader.path("system/hostName")->as<std::string>(), "ada");
    EXPECT_EQ(node.as<uint32_t>(), 0x01020304U) << "which the reader's ring has had before";
    EXPECT_EQ(storage.writes, writes);
  }
  const tav::Reader after(storage);
  EXPECT_EQ(after.path("system/cpuOnline")->as<uint32_t>(), 7U) << "the reader's end takes nothing back";
}
