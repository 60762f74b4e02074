/// What flush() and sync() answer. What they are worth when a machine stops is tested in tests/crash.
#include <gmock/gmock.h>

#include "cpp/layer.h"

using namespace test;

namespace
{

class LayerDurable : public testing::Test
{
protected:
  /// What another process would see: names below the root, which need not be closed.
  [[nodiscard]] size_t seen() const
  {
    const tav::Reader reader(file_.path);
    std::error_code ec;
    size_t count = 0;
    for (const tav::Node& node : reader.root().children(ec))
    {
      count += node.elm() == TAV_ELM_CMN_HOST_NAME ? 1 : 0;
    }
    return count;
  }

  const TemporaryPath file_;
};

} // namespace

TEST_F(LayerDurable, FlushHandsAllNodesToTheSystemAlsoOfOpenGroups)
{
  tav::Writer writer(file_.path);
  tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
  for (size_t i = 1; i <= 3; ++i)
  {
    root.add(TAV_ELM_CMN_HOST_NAME, "ada");
    writer.flush();
    EXPECT_EQ(seen(), i);
  }
  std::error_code ec;
  writer.flush(ec);
  EXPECT_FALSE(ec);
  root.close();
  writer.finish();
  EXPECT_EQ(seen(), 3U);
}

TEST_F(LayerDurable, SyncDoesSoAndLeavesTheStreamAsItIs)
{
  tav::Writer alone;
  tav::Writer writer(file_.path, {.append = true});
  for (tav::Writer* const each : {&alone, &writer})
  {
    tav::Group root = each->group(TAV_ELM_CMN_SYSTEM, {.eyeSize = true});
    for (size_t i = 1; i <= 3; ++i)
    {
      tav::Group host = root.group(TAV_ELM_CMN_HOST, {.eyeSize = true});
      host.add(TAV_ELM_CMN_HOST_NAME, "ada");
      if (each == &writer)
      {
        writer.sync();
        std::error_code ec;
        writer.sync(ec);
        EXPECT_FALSE(ec);
      }
    }
    root.abandon();
    each->group(TAV_ELM_CMN_SYSTEM).close();
  }
  writer.finish();
  KORHFile file;
  const std::string name = file_.path.string();
  KORFileOpenParam param;
  param.pPath = name.c_str();
  param.options = KOR_FILE_READ;
  ASSERT_EQ(file.open(&param), TAV_RC_OK);
  Bytes bytes(alone.bytes().size());
  KORFileReadParam read;
  read.length = bytes.size();
  uint64_t done = 0;
  ASSERT_EQ(file.read(&read, bytes.data(), &done), TAV_RC_OK);
  EXPECT_EQ(bytes, bytesOf(alone.bytes()));
  EXPECT_EQ(std::filesystem::file_size(file_.path), bytes.size());
}

TEST(LayerSync, IsNotOfferedWhereThereIsNoFile)
{
  tav::Writer memory;
  EXPECT_EQ(thrownBy([&] { memory.flush(); }), TAV_RC_OK);
  EXPECT_EQ(thrownBy([&] { memory.sync(); }), TAV_RC_NOT_SUPPORTED);
  VectorStorage storage;
  tav::Writer other(storage);
  EXPECT_EQ(thrownBy([&] { other.flush(); }), TAV_RC_OK);
  EXPECT_EQ(givenBy([&](std::error_code& ec) { other.sync(ec); }), TAV_RC_NOT_SUPPORTED);
}

TEST(LayerSync, IsRefusedAfterTheEndAndByAMovedWriter)
{
  const TemporaryPath file;
  tav::Writer writer(file.path);
  writer.group(TAV_ELM_CMN_SYSTEM).close();
  tav::Writer taken(std::move(writer));
  EXPECT_EQ(givenBy([&](std::error_code& ec) { writer.sync(ec); }),
            TAV_RC_BAD_PARAM); // NOLINT(bugprone-use-after-move)
  EXPECT_EQ(givenBy([&](std::error_code& ec) { writer.flush(ec); }),
            TAV_RC_BAD_PARAM); // NOLINT(bugprone-use-after-move)
  taken.finish();
  EXPECT_EQ(thrownBy([&] { taken.sync(); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(thrownBy([&] { taken.flush(); }), TAV_RC_BAD_PARAM);
}

TEST(LayerSync, ToldOfAFullDiskSaysSo)
{
  if (!std::filesystem::exists("/dev/full"))
  {
    GTEST_SKIP() << "no device that is always full";
  }
  tav::Writer writer("/dev/full", {.overwrite = true});
  tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
  EXPECT_EQ(thrownBy([&] { writer.flush(); }), KOR_RC_NO_SPACE);
  EXPECT_EQ(thrownBy([&] { writer.sync(); }), KOR_RC_NO_SPACE);
  std::error_code ec;
  root.close(ec);
}
