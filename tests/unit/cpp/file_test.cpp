/// Writers and updaters of files: locks, and what is at the path meanwhile.
#include <fstream>
#include <iterator>
#include <vector>

#include <gmock/gmock.h>

#include "cpp/layer.h"

using namespace test;
using ::testing::HasSubstr;

namespace
{

/// A folder of its own, for nothing else may appear in it.
class LayerFile : public ::testing::Test
{
protected:
  void SetUp() override
  {
    std::filesystem::create_directory(folder_.path);
  }
  void TearDown() override
  {
    std::error_code ignored;
    std::filesystem::remove_all(folder_.path, ignored);
  }

  static void put(tav::Writer& writer, uint32_t value)
  {
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
    root.add(TAV_ELM_CMN_CPU_ONLINE, value);
  }

  void writeFile(uint32_t value, const tav::FileOptions& options = {}) const
  {
    tav::Writer writer(path, options);
    put(writer, value);
    writer.finish();
  }

  [[nodiscard]] uint32_t valueAt(const std::filesystem::path& file) const
  {
    const tav::Reader reader(file);
    return reader.path("/system/cpuOnline").value().as<uint32_t>();
  }
  [[nodiscard]] uint32_t value() const
  {
    return valueAt(path);
  }

  [[nodiscard]] size_t files() const
  {
    using Iterator = std::filesystem::directory_iterator;
    return static_cast<size_t>(std::distance(Iterator(folder_.path), Iterator()));
  }

  template<class Call>
  static std::string messageOf(const Call& call)
  {
    try
    {
      call();
    }
    catch (const std::system_error& error)
    {
      return error.what();
    }
    return {};
  }

private:
  const TemporaryPath folder_;

protected:
  const std::filesystem::path path = folder_.path / "x.tav";
};

constexpr tav::FileOptions kOverwrite{.overwrite = true};
constexpr tav::FileOptions kInPlace{.overwrite = true, .inPlace = true};
constexpr tav::FileOptions kInPlaceUnlocked{.overwrite = true, .inPlace = true, .lock = false};

} // namespace

TEST_F(LayerFile, IsRefusedToASecondWriterUntilTheFirstIsFinished)
{
  tav::Writer first(path);
  for (const tav::FileOptions& options : {kOverwrite, kInPlace})
  {
    EXPECT_EQ(thrownBy([&] { tav::Writer second(path, options); }), KOR_RC_LOCKED);
    EXPECT_EQ(givenBy([&](std::error_code& ec) { tav::Writer second(path, options, {}, ec); }), KOR_RC_LOCKED);
  }
  EXPECT_EQ(messageOf([&] { tav::Writer second(path, kOverwrite); }),
            "opening for writing " + path.string() + ": KOR_RC_LOCKED: another writer has the file");
  EXPECT_EQ(thrownBy([&] { tav::Updater updater(path); }), KOR_RC_LOCKED);
  put(first, 1);
  first.finish();
  EXPECT_EQ(value(), 1U);
  writeFile(2, kOverwrite);
  EXPECT_EQ(value(), 2U);
  EXPECT_EQ(files(), 1U);
}

TEST_F(LayerFile, IsRefusedWhileAnyoneHasItsLockAndNothingInItChanges)
{
  writeFile(1);
  KORFileOpenParam param;
  const std::string name = path.string();
  param.pPath = name.c_str();
  param.options = KOR_FILE_UPDATE;
  uint32_t rc = TAV_RC_OK;
  {
    TAVSSFile other(&param, &rc);
    ASSERT_EQ(rc, TAV_RC_OK);
    ASSERT_EQ(other.lock(0), TAV_RC_OK);
    EXPECT_EQ(thrownBy([&] { tav::Writer writer(path, kOverwrite); }), KOR_RC_LOCKED);
    EXPECT_EQ(thrownBy([&] { tav::Writer writer(path, kInPlace); }), KOR_RC_LOCKED);
    EXPECT_EQ(thrownBy([&] { tav::Updater updater(path); }), KOR_RC_LOCKED);
    other.unlock();
    EXPECT_EQ(value(), 1U);
    EXPECT_EQ(files(), 1U);
    ASSERT_EQ(other.lock(0), TAV_RC_OK);
    EXPECT_EQ(thrownBy([&] { tav::Updater updater(path, {}, {.lock = false}); }), TAV_RC_OK);
    EXPECT_EQ(thrownBy([&] { tav::Writer writer(path, kInPlaceUnlocked); }), TAV_RC_OK) << "the option turns that off";
  }
  EXPECT_EQ(std::filesystem::file_size(path), 0U);
}

TEST_F(LayerFile, IsRefusedToASecondUpdater)
{
  writeFile(1);
  tav::Updater first(path);
  EXPECT_EQ(thrownBy([&] { tav::Updater second(path); }), KOR_RC_LOCKED);
  EXPECT_EQ(givenBy([&](std::error_code& ec) { tav::Updater second(path, {}, ec); }), KOR_RC_LOCKED);
}

TEST_F(LayerFile, ThatIsOverwrittenStaysAsItIsUntilFinish)
{
  writeFile(1);
  tav::Writer writer(path, kOverwrite, {.ringBytes = 1U << 20U});
  put(writer, 2);
  EXPECT_EQ(value(), 1U);
  EXPECT_EQ(files(), 2U) << "the new one stands beside it";
  writer.finish();
  EXPECT_EQ(value(), 2U);
  EXPECT_EQ(files(), 1U);
  writer.finish();
  EXPECT_EQ(value(), 2U);
}

TEST_F(LayerFile, ThatIsOverwrittenStaysAsItIsWithoutFinish)
{
  writeFile(1);
  {
    tav::Writer writer(path, kOverwrite);
    put(writer, 2);
  }
  EXPECT_EQ(value(), 1U);
  EXPECT_EQ(files(), 1U) << "nothing is left behind";
  writeFile(3, kOverwrite);
  EXPECT_EQ(value(), 3U) << "and no lock";
}

TEST_F(LayerFile, ThatIsOverwrittenAndNotThereComesWithFinish)
{
  {
    tav::Writer dropped(path, kOverwrite);
    put(dropped, 1);
    EXPECT_FALSE(std::filesystem::exists(path));
  }
  EXPECT_EQ(files(), 0U);
  writeFile(2, kOverwrite);
  EXPECT_EQ(value(), 2U);
}

TEST_F(LayerFile, ThatCameMeanwhileAndIsBeingWrittenIsNotReplaced)
{
  tav::Writer early(path, kOverwrite);
  put(early, 1);
  {
    tav::Writer late(path);
    EXPECT_EQ(thrownBy([&] { early.finish(); }), KOR_RC_LOCKED);
    put(late, 2);
    late.finish();
  }
  EXPECT_EQ(value(), 2U);
  early.finish();
  EXPECT_EQ(value(), 1U) << "it is nobody's now, and may be overwritten";
}

TEST_F(LayerFile, IsWrittenInPlaceWhereThatIsAskedFor)
{
  writeFile(1);
  std::filesystem::create_hard_link(path, path.parent_path() / "other name");
  tav::Writer writer(path, kInPlace);
  EXPECT_EQ(std::filesystem::file_size(path), 0U);
  EXPECT_EQ(files(), 2U);
  put(writer, 2);
  writer.finish();
  EXPECT_EQ(valueAt(path.parent_path() / "other name"), 2U);
}

TEST_F(LayerFile, BehindASymbolicLinkIsReplacedThere)
{
  const std::filesystem::path link = path.parent_path() / "link";
  std::error_code ec;
  std::filesystem::create_symlink("x.tav", link, ec);
  if (ec)
  {
    GTEST_SKIP() << "no symbolic links here";
  }
  for (const uint32_t number : {1U, 2U}) // first the link leads to nothing
  {
    tav::Writer writer(link, kOverwrite);
    put(writer, number);
    writer.finish();
    EXPECT_TRUE(std::filesystem::is_symlink(link));
    EXPECT_EQ(value(), number);
  }
  EXPECT_EQ(files(), 2U);
}

TEST_F(LayerFile, MayHaveAsLongANameAsTheSystemTakes)
{
  const std::filesystem::path longest = path.parent_path() / std::string(250, 'n');
  for (const uint32_t number : {1U, 2U})
  {
    tav::Writer writer(longest, kOverwrite);
    put(writer, number);
    writer.finish();
    EXPECT_EQ(valueAt(longest), number);
  }
}

TEST_F(LayerFile, IsNotMadeWhereItsFolderIsMissing)
{
  const std::filesystem::path nowhere = path.parent_path() / "missing" / "x.tav";
  EXPECT_EQ(thrownBy([&] { tav::Writer writer(nowhere, kOverwrite); }), KOR_RC_NO_SUCH_FILE);
  EXPECT_EQ(thrownBy([&] { tav::Writer writer(path.parent_path(), kOverwrite); }), KOR_RC_IS_FOLDER);
  EXPECT_EQ(files(), 0U);
}
