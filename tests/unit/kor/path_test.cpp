/// What is at a path, where links lead, and removal.
#include "kor/testFiles.h"
#include "support/platform.h"
#include "tav/kor.h"

#include <array>
#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <string>

namespace
{
namespace fs = std::filesystem;

void touch(const std::string& path)
{
  std::ofstream(path) << 'x';
}

/// Where a path leads, or the name of the code.
std::string target(const std::string& path)
{
  std::array<char, 4096> text{};
  uint64_t nameAt = 0;
  const uint32_t rc = korFollowLinks(path.c_str(), text.data(), text.size(), &nameAt);
  return rc == TAV_RC_OK ? text.data() : korCodeName(rc);
}

/// Makes a link; false where there are none.
bool link(const std::string& to, const std::string& from)
{
  std::error_code error;
  fs::create_symlink(to, from, error);
  return !error;
}
} // namespace

TEST(FilePath, IsADeviceOnlyWhenItLeadsToOne)
{
  const TestFolder folder;
  touch(folder / "file");
  EXPECT_TRUE(korIsDevice(test::nullDevice()));
  EXPECT_FALSE(korIsDevice((folder / "file").c_str()));
  EXPECT_FALSE(korIsDevice(folder.path().c_str()));
  EXPECT_FALSE(korIsDevice((folder / "missing").c_str()));
  EXPECT_FALSE(korIsDevice(nullptr));
}

TEST(FilePath, IsADeviceThroughALink)
{
  const TestFolder folder;
  if (!fs::exists("/dev/null") || !link("/dev/null", folder / "link"))
  {
    GTEST_SKIP() << "no links to devices here";
  }
  EXPECT_TRUE(korIsDevice((folder / "link").c_str()));
}

TEST(FilePath, WithoutLinksIsMadeAbsolute)
{
  const std::string here = fs::current_path().string();
  EXPECT_EQ(fs::path(target("no such file")), fs::path(here) / "no such file");
  EXPECT_EQ(fs::path(target(here)), fs::path(here));
}

TEST(FilePath, LeadsThroughLinksToWhatIsThereOrIsNot)
{
  const TestFolder folder;
  const std::string missing = folder / "missing";
  if (!link("missing", folder / "second") || !link(folder / "second", folder / "first"))
    GTEST_SKIP() << "no links here";
  EXPECT_EQ(target(folder / "second"), missing);
  EXPECT_EQ(target(folder / "first"), missing);
  touch(missing);
  EXPECT_EQ(target(folder / "first"), missing);
}

TEST(FilePath, ThatLeadsInACircleComesToAnEnd)
{
  const TestFolder folder;
  if (!link("two", folder / "one") || !link("one", folder / "two"))
  {
    GTEST_SKIP() << "no links here";
  }
  EXPECT_EQ(target(folder / "one"), folder / "one");
}

TEST(FilePath, IsNotFollowedOutOfTheSystemsOwnFolders)
{
  if (!fs::is_symlink("/dev/stdout"))
  {
    GTEST_SKIP() << "no /dev/stdout here";
  }
  EXPECT_EQ(target("/dev/stdout"), "TAV_RC_NOT_SUPPORTED");
  EXPECT_EQ(target("/proc/self/exe"), "TAV_RC_NOT_SUPPORTED");
}

TEST(FilePath, TellsWhereItsNameStarts)
{
  const TestFolder folder;
  const std::string path = folder / "name";
  std::string text(path.size() + 1, '?');
  uint64_t nameAt = 0;
  ASSERT_EQ(korFollowLinks(path.c_str(), text.data(), text.size(), &nameAt), TAV_RC_OK);
  EXPECT_EQ(std::string(text.c_str() + nameAt), "name");
}

TEST(FilePath, ThatDoesNotFitIsRefusedAndNothingIsTouched)
{
  const TestFolder folder;
  const std::string path = folder / "name";
  std::string text(path.size(), '?'); // no place for the NUL
  uint64_t nameAt = 7;
  EXPECT_EQ(korFollowLinks(path.c_str(), text.data(), text.size(), &nameAt), TAV_RC_NO_MEMORY);
  EXPECT_EQ(text, std::string(path.size(), '?'));
  EXPECT_EQ(nameAt, 7U);
}

TEST(FilePath, NeedsItsArguments)
{
  std::array<char, 16> text{};
  uint64_t nameAt = 0;
  EXPECT_EQ(korFollowLinks(nullptr, text.data(), text.size(), &nameAt), TAV_RC_BAD_PARAM);
  EXPECT_EQ(korFollowLinks("x", nullptr, text.size(), &nameAt), TAV_RC_BAD_PARAM);
  EXPECT_EQ(korFollowLinks("x", text.data(), text.size(), nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(korRemoveFile(nullptr), TAV_RC_BAD_PARAM);
  const auto visit = [](const char*, void*) {};
  EXPECT_EQ(korListFolder(nullptr, visit, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(korListFolder(".", nullptr, nullptr), TAV_RC_BAD_PARAM);
}

TEST(FilePath, IsRemovedWithItsFile)
{
  const TestFolder folder;
  const std::string path = folder / "\xC3\xA4"; // a letter beyond ASCII
  KORHFile file;
  ASSERT_EQ(openFile(file, path, KOR_FILE_WRITE | KOR_FILE_CREATE), TAV_RC_OK);
  ASSERT_EQ(file.close(), TAV_RC_OK);
  EXPECT_EQ(korRemoveFile(path.c_str()), TAV_RC_OK);
  EXPECT_EQ(openFile(file, path, KOR_FILE_READ), KOR_RC_NO_SUCH_FILE);
  EXPECT_EQ(korRemoveFile(path.c_str()), KOR_RC_NO_SUCH_FILE);
}

TEST(FilePath, OfALinkIsRemovedAndNotWhatIsBehindIt)
{
  const TestFolder folder;
  touch(folder / "file");
  if (!link("file", folder / "link"))
  {
    GTEST_SKIP() << "no links here";
  }
  EXPECT_EQ(korRemoveFile((folder / "link").c_str()), TAV_RC_OK);
  EXPECT_TRUE(fs::exists(folder / "file"));
  EXPECT_FALSE(fs::exists(fs::symlink_status(folder / "link")));
}
