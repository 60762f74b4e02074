#include "kor/testFiles.h"
#include "tav/kor.h"

#include <cstring>
#include <gtest/gtest.h>
#include <string>

namespace
{
class FileMapping : public testing::Test
{
protected:
  void given(const std::string& content)
  {
    ASSERT_EQ(openFile(file_, path_, KOR_FILE_UPDATE | KOR_FILE_CREATE), TAV_RC_OK);
    ASSERT_EQ(writeFile(file_, content).code, TAV_RC_OK);
  }
  std::string seen() const { return {static_cast<const char*>(mapping_.bytes()), mapping_.size()}; }

  TestFolder folder_;
  std::string path_ = folder_ / "mapped";
  KORHFile file_;
  KORFileMapping mapping_;
};

TEST_F(FileMapping, ShowsAllOfTheFile)
{
  const std::string content(100'001, 'x');
  given(content);
  ASSERT_EQ(mapping_.map(file_), TAV_RC_OK);
  EXPECT_EQ(seen(), content);
  mapping_.readAhead();
  EXPECT_EQ(seen(), content);
}

TEST_F(FileMapping, OutlivesTheOpenFile)
{
  given("content");
  ASSERT_EQ(mapping_.map(file_), TAV_RC_OK);
  ASSERT_EQ(file_.close(), TAV_RC_OK);
  EXPECT_EQ(seen(), "content");
}

TEST_F(FileMapping, ShowsWhatIsWrittenIntoTheFile)
{
  given("content");
  ASSERT_EQ(mapping_.map(file_), TAV_RC_OK);
  ASSERT_EQ(seekFile(file_, 0), TAV_RC_OK);
  ASSERT_EQ(writeFile(file_, "CON").code, TAV_RC_OK);
  EXPECT_EQ(seen(), "CONtent");
}

TEST_F(FileMapping, KeepsItsSizeWhenTheFileGrows)
{
  given("content");
  ASSERT_EQ(mapping_.map(file_), TAV_RC_OK);
  ASSERT_EQ(writeFile(file_, " and more").code, TAV_RC_OK);
  EXPECT_EQ(seen(), "content");
}

TEST_F(FileMapping, LeavesThePositionAlone)
{
  given("content");
  ASSERT_EQ(seekFile(file_, 3), TAV_RC_OK);
  ASSERT_EQ(mapping_.map(file_), TAV_RC_OK);
  EXPECT_EQ(readText(file_, 4), "tent");
}

TEST_F(FileMapping, TakesOneFileAtATime)
{
  given("content");
  ASSERT_EQ(mapping_.map(file_), TAV_RC_OK);
  EXPECT_EQ(mapping_.map(file_), KOR_RC_BUSY);
  EXPECT_EQ(seen(), "content");
  mapping_.unmap();
  EXPECT_EQ(mapping_.bytes(), nullptr);
  EXPECT_EQ(mapping_.size(), 0u);
  EXPECT_EQ(mapping_.map(file_), TAV_RC_OK);
}

TEST_F(FileMapping, EmptyFileHasNothingToMap)
{
  given("");
  EXPECT_EQ(mapping_.map(file_), TAV_RC_NOT_SUPPORTED);
  EXPECT_EQ(mapping_.bytes(), nullptr);
  mapping_.readAhead();
  mapping_.unmap();
}

TEST_F(FileMapping, ClosedFileIsRefused)
{
  EXPECT_EQ(mapping_.map(file_), KOR_RC_NOT_OPEN);
}

TEST_F(FileMapping, FileOpenForWritingAloneIsRefused)
{
  given("content");
  KORHFile writing;
  ASSERT_EQ(openFile(writing, path_, KOR_FILE_WRITE), TAV_RC_OK);
  EXPECT_NE(mapping_.map(writing), TAV_RC_OK);
  EXPECT_EQ(mapping_.bytes(), nullptr);
}

class FileHoles : public testing::Test
{
protected:
  uint64_t dataFrom(uint64_t offset)
  {
    uint64_t found = UINT64_MAX;
    EXPECT_EQ(file_.findData(offset, &found), TAV_RC_OK);
    return found;
  }

  TestFolder folder_;
  std::string path_ = folder_ / "sparse";
  KORHFile file_;
};

TEST_F(FileHoles, PlacesWithBytesAreFoundWhereTheyAre)
{
  ASSERT_EQ(openFile(file_, path_, KOR_FILE_UPDATE | KOR_FILE_CREATE), TAV_RC_OK);
  ASSERT_EQ(writeFile(file_, "content").code, TAV_RC_OK);
  EXPECT_EQ(dataFrom(0), 0u);
  EXPECT_EQ(dataFrom(6), 6u);
  EXPECT_EQ(dataFrom(7), 7u) << "the end";
  EXPECT_EQ(dataFrom(100), 100u) << "behind it";
}

TEST_F(FileHoles, NoByteButZeroIsEverPassed)
{
  constexpr uint64_t kFar = 64u << 20;
  ASSERT_EQ(openFile(file_, path_, KOR_FILE_UPDATE | KOR_FILE_CREATE), TAV_RC_OK);
  ASSERT_EQ(writeFile(file_, "near").code, TAV_RC_OK);
  ASSERT_EQ(seekFile(file_, kFar), TAV_RC_OK);
  ASSERT_EQ(writeFile(file_, "far").code, TAV_RC_OK);
  ASSERT_EQ(file_.setSize(2 * kFar), TAV_RC_OK);
  ASSERT_EQ(seekFile(file_, 4), TAV_RC_OK);
  const uint64_t behindNear = dataFrom(1 << 20);
  EXPECT_GE(behindNear, uint64_t{1} << 20);
  EXPECT_LE(behindNear, kFar);
  EXPECT_EQ(dataFrom(kFar + 1), kFar + 1);
  EXPECT_LE(dataFrom(kFar + (8u << 20)), 2 * kFar);
  EXPECT_EQ(readText(file_, 1), std::string(1, '\0')) << "the position stays";
}

TEST_F(FileHoles, MisuseIsRefused)
{
  uint64_t found = 0;
  EXPECT_EQ(file_.findData(0, &found), KOR_RC_NOT_OPEN);
  EXPECT_EQ(file_.findData(0, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(file_.findData(UINT64_MAX, &found), TAV_RC_BAD_PARAM);
}
} // namespace
