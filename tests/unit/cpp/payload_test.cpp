#include <optional>
#include <stdexcept>

#include "cpp/layer.h"

using namespace test;

namespace
{

Bytes sample()
{
  tav::Writer writer;
  {
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
    root.add(TAV_ELM_CMN_HOST_NAME, "ada");
    root.add(TAV_ELM_CMN_HOST_NAME, "grace");
  }
  writer.finish();
  return bytesOf(writer.bytes());
}

} // namespace

class LayerPayload : public ::testing::Test
{
protected:
  const Bytes stream = sample();
  VectorStorage storage{0x1000, stream, VectorStorage::kReadOnly};
};

TEST_F(LayerPayload, LeadsIntoTheStream)
{
  const tav::Reader reader(spanOf(stream));
  const tav::PayloadView payload = reader.path("system/hostName")->payload();
  EXPECT_EQ(payload.data(), spanOf(stream).data() + 32);
  EXPECT_EQ(payload.size(), 3U);
  EXPECT_EQ(payload[1], std::byte{'d'});
  const std::span<const std::byte> span = payload;
  EXPECT_EQ(bytesOf(span), hex("61 64 61"));
  EXPECT_EQ(payload.end() - payload.begin(), 3);
}

TEST_F(LayerPayload, LivesAsLongAsTheMemory)
{
  const tav::Reader reader(spanOf(stream));
  const tav::PayloadView payload = reader.path("system/hostName")->payload();
  static_cast<void>(reader.path("system/hostName[2]"));
  EXPECT_NO_THROW(static_cast<void>(payload.data()));
}

TEST_F(LayerPayload, OverAStorageItsUseAfterAnotherFetchIsFoundOut)
{
  const tav::Reader reader(storage);
  const tav::PayloadView payload = reader.path("system/hostName")->payload();
  EXPECT_EQ(bytesOf(payload), hex("61 64 61"));
  static_cast<void>(reader.root());
  EXPECT_THROW(static_cast<void>(payload.data()), std::logic_error);
  EXPECT_THROW(static_cast<void>(payload.begin()), std::logic_error);
  EXPECT_THROW(static_cast<void>(payload[0]), std::logic_error);
  EXPECT_THROW(static_cast<void>(std::span<const std::byte>(payload)), std::logic_error);
  EXPECT_EQ(payload.size(), 3U);
}

TEST_F(LayerPayload, EveryWayToReadOnIsAFetch)
{
  const tav::Reader reader(storage);
  const tav::Node node = *reader.path("system/hostName");
  const auto outlives = [&](auto&& act) {
    const tav::PayloadView payload = node.payload();
    act();
    try
    {
      static_cast<void>(payload.data());
      return true;
    }
    catch (const std::logic_error&)
    {
      return false;
    }
  };
  EXPECT_TRUE(outlives([] {}));
  EXPECT_FALSE(outlives([&] { static_cast<void>(reader.root()); }));
  EXPECT_FALSE(outlives([&] { static_cast<void>(reader.at(0)); }));
  EXPECT_FALSE(outlives([&] { static_cast<void>(reader.endingAfter(0)); }));
  EXPECT_FALSE(outlives([&] { static_cast<void>(node.next()); }));
  EXPECT_FALSE(outlives([&] { static_cast<void>(node.previous()); }));
  EXPECT_FALSE(outlives([&] { reader.validate(); }));
  EXPECT_FALSE(outlives([&] { static_cast<void>(reader.handle()); }));
}

TEST_F(LayerPayload, NodeReadsItAgainWhenItIsGone)
{
  const tav::Reader reader(storage, {.ringBytes = 0x1000});
  const tav::Node first = *reader.path("system/hostName");
  const tav::Node second = *reader.path("system/hostName[2]");
  EXPECT_EQ(bytesOf(first.payload()), hex("61 64 61"));
  EXPECT_EQ(bytesOf(second.payload()), hex("67 72 61 63 65"));
  EXPECT_EQ(bytesOf(first.payload()), hex("61 64 61"));
}

TEST_F(LayerPayload, StorageThatFailsMeanwhileIsReported)
{
  const tav::Reader reader(storage, {.ringBytes = 0x1000});
  const tav::Node node = *reader.path("system/hostName");
  EXPECT_EQ(reader.handle()->pCircularBuf->reset(), TAV_RC_OK);
  storage.failAt(1, KOR_RC_IO_ERROR);
  EXPECT_EQ(givenBy([&](std::error_code& ec) { EXPECT_TRUE(node.payload(ec).empty()); }), KOR_RC_IO_ERROR);
  EXPECT_EQ(node.as<std::string>(), "ada");
}

TEST_F(LayerPayload, StorageThatChangedMeanwhileIsReported)
{
  const tav::Reader reader(storage, {.ringBytes = 0x1000});
  const tav::Node node = *reader.path("system/hostName");
  EXPECT_EQ(reader.handle()->pCircularBuf->reset(), TAV_RC_OK);
  storage.bytes[kBigEndianHost ? 23 : 16] = 1; // the element is shorter now
  EXPECT_EQ(thrownBy([&] { static_cast<void>(node.payload()); }), TAV_RC_OUTSIDE_PARENT);
  EXPECT_EQ(thrownBy([&] { static_cast<void>(node.as<std::string>()); }), TAV_RC_OUTSIDE_PARENT);
}

TEST_F(LayerPayload, ElementLargerThanTheRingIsRefused)
{
  VectorStorage large(0x1000);
  {
    tav::Writer writer(large, {.ringBytes = 0x2000});
    {
      tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
      root.add(TAV_ELM_CMN_HOST_NAME, std::string(0x5000, 'x'));
    }
    writer.finish();
  }
  const tav::Reader tooSmall(large, {.ringBytes = 0x2000});
  EXPECT_EQ(thrownBy([&] { static_cast<void>(tooSmall.path("system/hostName")); }), TAV_RC_DATA_TOO_LARGE);
  const tav::Reader enough(large, {.ringBytes = 0x8000});
  EXPECT_EQ(enough.path("system/hostName")->as<std::string>().size(), 0x5000U);
}
