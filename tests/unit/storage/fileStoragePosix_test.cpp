/// The file storage where it takes another process, a limit or a device to see what it does.
#include <array>
#include <csignal>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <unistd.h>

#include "kor/childPosix.h"
#include "storage/fileFixture.h"

namespace
{

using namespace test;
using testing::ElementsAre;

TEST_F(FileStorage, OfAReadOnlyFileOpensForReadingAlone)
{
  const std::string path = fileOf(10);
  ASSERT_EQ(chmod(path.c_str(), 0444), 0);
  ASSERT_EQ(chmod(folder_.path().c_str(), 0755), 0);
  const uint32_t code = inChild([&] {
    if (geteuid() == 0 && setuid(65534) != 0)
    {
      return uint32_t{1}; // the superuser may write anything
    }
    const OpenFile reading(path, KOR_FILE_READ);
    const OpenFile writing(path, KOR_FILE_UPDATE);
    return reading.rc == TAV_RC_OK ? writing.rc : 2;
  });
  EXPECT_EQ(code, KOR_RC_NO_PERMISSION);
}

// Elsewhere a system says only that there is no such file.
TEST_F(FileStorage, TellsAFileThatStandsWhereAFolderIsWanted)
{
  EXPECT_EQ(OpenFile(fileOf(10) + "/x", KOR_FILE_READ).rc, KOR_RC_NOT_A_FOLDER);
}

TEST_F(FileStorage, TellsThatTheDeviceIsFull)
{
  OpenFile file("/dev/full", KOR_FILE_WRITE);
  ASSERT_EQ(file.rc, TAV_RC_OK);
  uint64_t written = 99;
  TraceLog trace;
  EXPECT_EQ(file->write("xy", 2, &written), KOR_RC_NO_SPACE);
  EXPECT_EQ(written, 0U);
  EXPECT_EQ(file->position, 0U);
  EXPECT_THAT(trace.failures(), ElementsAre(at(tav::probe::ssFileWrite, 40, KOR_RC_NO_SPACE)));
}

TEST_F(FileStorage, WritesUpToTheSizeThatIsAllowed)
{
  const std::string path = folder_ / "limited.tav";
  uint64_t written = 0;
  const uint32_t code = inChild([&] {
    std::signal(SIGXFSZ, SIG_IGN);
    const rlimit limit{8192, 8192};
    if (setrlimit(RLIMIT_FSIZE, &limit) != 0)
    {
      return uint32_t{1};
    }
    OpenFile file(path, kCreate);
    const std::vector<uint8_t> bytes = pattern(0, 10000);
    const uint32_t rc = file->write(bytes.data(), bytes.size(), &written);
    return written == 8192 && file->position == 8192 ? rc : 2;
  });
  EXPECT_EQ(code, KOR_RC_FILE_TOO_LARGE);
  EXPECT_EQ(contentOf(path), pattern(0, 8192));
}

TEST_F(FileStorage, HasNoSizeWhereTheSystemMakesUpTheBytes)
{
  OpenFile file("/proc/self/status", KOR_FILE_READ);
  ASSERT_EQ(file.rc, TAV_RC_OK);
  uint64_t size = 99;
  EXPECT_EQ(file->getTotalSize(&size), TAV_RC_OK);
  EXPECT_EQ(size, 0U);
  EXPECT_EQ(read(file, 5).bytes.size(), 5U);
}

TEST_F(FileStorage, OverAPipeHasNoSizeAndCannotSeek)
{
  std::array<int, 2> ends{};
  ASSERT_EQ(pipe(ends.data()), 0);
  OpenFile file("/dev/fd/" + std::to_string(ends[0]), KOR_FILE_READ);
  ASSERT_EQ(file.rc, TAV_RC_OK);
  uint64_t size = 99;
  EXPECT_EQ(file->getTotalSize(&size), KOR_RC_NOT_SEEKABLE);
  EXPECT_EQ(file->seek(0, 1), KOR_RC_NOT_SEEKABLE);
  ::close(ends[0]);
  ::close(ends[1]);
}

TEST_F(FileStorage, SharesTheFilesPositionWithAChild)
{
  OpenFile file(fileOf(64), KOR_FILE_READ);
  ASSERT_EQ(read(file, 4), (Got{TAV_RC_OK, pattern(0, 4)}));
  ASSERT_EQ(inChild([&] { return read(file, 4).code; }), TAV_RC_OK);
  EXPECT_EQ(read(file, 4), (Got{TAV_RC_OK, pattern(8, 4)})) << "what the child read is missing";
}

TEST_F(FileStorage, IsRefusedWhileAnotherProcessHoldsTheLock)
{
  const std::string path = fileOf(10);
  std::array<int, 2> ready{};
  std::array<int, 2> done{};
  ASSERT_EQ(pipe(ready.data()), 0);
  ASSERT_EQ(pipe(done.data()), 0);
  Child child([&] {
    ::close(done[1]); // else the child would wait for itself
    OpenFile file(path, KOR_FILE_UPDATE);
    const uint32_t rc = file->lock(0);
    char byte = 'r';
    if (::write(ready[1], &byte, 1) != 1 || ::read(done[0], &byte, 1) < 0)
    {
      return uint32_t{1};
    }
    return rc;
  });
  char byte = 0;
  ASSERT_EQ(::read(ready[0], &byte, 1), 1);
  OpenFile file(path, KOR_FILE_UPDATE);
  TraceLog trace;
  EXPECT_EQ(file->lock(7), KOR_RC_LOCKED) << "whatever the mode";
  EXPECT_THAT(trace.failures(), ElementsAre(at(tav::probe::ssFileLock, 20, KOR_RC_LOCKED)));
  EXPECT_THAT(trace.dump(tav::probe::ssFileLock, 0).items, ElementsAre(bytesOf(uint32_t{7})));
  ::close(done[1]);
  EXPECT_EQ(child.result(), TAV_RC_OK);
  EXPECT_EQ(file->lock(7), TAV_RC_OK) << "free when the other process has gone";
  ::close(ready[0]);
  ::close(ready[1]);
  ::close(done[0]);
}

TEST_F(FileStorage, IsUnlockedForOthers)
{
  const std::string path = fileOf(10);
  OpenFile file(path, KOR_FILE_UPDATE);
  ASSERT_EQ(file->lock(0), TAV_RC_OK);
  ASSERT_EQ(file->unlock(), TAV_RC_OK);
  EXPECT_EQ(inChild([&] { return OpenFile(path, KOR_FILE_UPDATE)->lock(0); }), TAV_RC_OK);
  TraceLog trace;
  EXPECT_EQ(file->unlock(), KOR_RC_NOT_LOCKED);
  EXPECT_THAT(trace.failures(), ElementsAre(at(tav::probe::ssFileUnlock, 20, KOR_RC_NOT_LOCKED)));
}

TEST_F(FileStorage, TellsWhenAStreamMeetsAFullDevice)
{
  OpenFile file("/dev/full", KOR_FILE_UPDATE);
  Handle handle(*file, TAV_OPT_WRITE, {.ringBytes = 0x200000});
  Element root = group64(1);
  TAVHeaderData data = root.data();
  ASSERT_EQ(tavAddElement(0, handle.get(), &data), TAV_RC_OK) << "still in the ring";
  EXPECT_EQ(handle->pCircularBuf->reset(), KOR_RC_NO_SPACE);
}

} // namespace
