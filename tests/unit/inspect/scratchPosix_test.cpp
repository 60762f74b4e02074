// Temporary files where there is no folder for them, and where their names are taken.
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <optional>
#include <string>

#include <gmock/gmock.h>

#include "cpp/layer.h"
#include "tav/inspect.hpp"

using namespace tav::inspect;

namespace
{

/// TMPDIR for as long as it lives.
class TemporaryFolder
{
public:
  explicit TemporaryFolder(const std::string& path)
  {
    if (const char* const old = std::getenv("TMPDIR"))
    {
      old_ = old;
    }
    ::setenv("TMPDIR", path.c_str(), 1);
  }
  ~TemporaryFolder() { old_ ? ::setenv("TMPDIR", old_->c_str(), 1) : ::unsetenv("TMPDIR"); }
  TemporaryFolder(const TemporaryFolder&) = delete;
  TemporaryFolder& operator=(const TemporaryFolder&) = delete;

private:
  std::optional<std::string> old_{};
};

Problem refusal(KORHFile& file)
{
  try
  {
    openTemporary(file, 7);
  }
  catch (const Error& error)
  {
    return error.problem();
  }
  return {};
}

} // namespace

TEST(ScratchFiles, NeedAFolder)
{
  const TemporaryFolder folder("/no/such/folder");
  KORHFile file;
  const Problem problem = refusal(file);
  EXPECT_EQ(problem.sentence, "there is no folder for temporary files");
  EXPECT_EQ(problem.hint, "set TMPDIR to a folder that can be written");
}

TEST(ScratchFiles, GetAnotherNameWhereOneIsTaken)
{
  const test::TemporaryPath place;
  std::filesystem::create_directory(place.path);
  {
    const TemporaryFolder folder(place.path.string());
    KORHFile first;
    KORHFile second;
    EXPECT_EQ(openTemporary(first, 7), (place.path / "tav-7-0").string());
    EXPECT_EQ(openTemporary(second, 7), (place.path / "tav-7-1").string());
    for (int i = 2; i <= 1000; ++i)
    {
      std::ofstream(place.path / ("tav-7-" + std::to_string(i)));
    }
    KORHFile none;
    const Problem problem = refusal(none);
    EXPECT_EQ(problem.code, KOR_RC_FILE_EXISTS);
    EXPECT_EQ(problem.hint, "a temporary file is needed; set TMPDIR to a folder that can be written");
    first.close();
    second.close();
  }
  std::filesystem::remove_all(place.path);
}

TEST(ScratchFiles, LeaveNothingBehind)
{
  const test::TemporaryPath place;
  std::filesystem::create_directory(place.path);
  {
    const TemporaryFolder folder(place.path.string());
    const auto scratch = makeScratch();
    PatchFile file(scratch->file());
    file.append(std::string_view("abc"));
    EXPECT_EQ(file.length(), 3U);
  }
  EXPECT_TRUE(std::filesystem::is_empty(place.path));
  std::filesystem::remove_all(place.path);
}
