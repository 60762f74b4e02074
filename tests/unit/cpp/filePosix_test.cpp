/// Modes of files that a writer replaces, and devices.
#include <cstdlib>
#include <sys/stat.h>
#include <unistd.h>

#include <gmock/gmock.h>

#include "cpp/layer.h"

using namespace test;

namespace
{

struct stat statusOf(const std::filesystem::path& path)
{
  struct stat status = {};
  ::stat(path.c_str(), &status);
  return status;
}

void write(const std::filesystem::path& path, const tav::FileOptions& options)
{
  tav::Writer writer(path, options);
  writer.group(TAV_ELM_CMN_SYSTEM).close();
  writer.finish();
}

} // namespace

TEST(LayerFileMode, OfAFileIsKeptWhenItIsOverwritten)
{
  const TemporaryPath folder;
  std::filesystem::create_directory(folder.path);
  const std::filesystem::path path = folder.path / "x";
  write(path, {});
  for (const mode_t mode : {0600U, 0644U, 0666U})
  {
    ASSERT_EQ(::chmod(path.c_str(), mode), 0);
    const ino_t before = statusOf(path).st_ino;
    tav::Writer writer(path, {.overwrite = true});
    for (const auto& entry : std::filesystem::directory_iterator(folder.path))
    {
      const mode_t seen = statusOf(entry.path()).st_mode & 0777U;
      EXPECT_EQ(seen, entry.path() == path ? mode : 0600U) << entry.path();
    }
    writer.finish();
    EXPECT_EQ(statusOf(path).st_mode & 0777U, mode);
    EXPECT_NE(statusOf(path).st_ino, before);
  }
  std::filesystem::remove_all(folder.path);
}

TEST(LayerFileMode, OfANewFileIsAsTheProcessWantsIt)
{
  const TemporaryPath file;
  const mode_t before = ::umask(027);
  write(file.path, {.overwrite = true});
  ::umask(before);
  EXPECT_EQ(statusOf(file.path).st_mode & 0777U, 0640U);
}

TEST(LayerFileDevice, IsNeverReplaced)
{
  EXPECT_NE(thrownBy([] { write("/dev/full", {.overwrite = true}); }), TAV_RC_OK) << "it takes nothing";
  EXPECT_TRUE(std::filesystem::is_character_file("/dev/full"));
}

TEST(LayerFileDevice, StandardOutputsLinkIsWrittenTo)
{
  const TemporaryPath file;
  const int out = ::dup(STDOUT_FILENO);
  std::FILE* const stream = std::fopen(file.path.c_str(), "wb");
  ::dup2(::fileno(stream), STDOUT_FILENO);
  const ino_t before = statusOf(file.path).st_ino;
  const uint32_t code = thrownBy([] { write("/dev/stdout", {.overwrite = true}); });
  ::dup2(out, STDOUT_FILENO);
  ::close(out);
  std::fclose(stream);
  EXPECT_EQ(code, TAV_RC_OK);
  EXPECT_EQ(statusOf(file.path).st_ino, before) << "the file is the same";
  EXPECT_GT(std::filesystem::file_size(file.path), 0U);
}
