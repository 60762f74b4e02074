#include "kor/testFiles.h"
#include "tav/kor.h"
#include "tools/host/host.h"

#include <array>
#include <filesystem>
#include <functional>
#include <gtest/gtest.h>
#include <string>
#include <vector>

namespace
{
constexpr uint64_t kNewFile = KOR_FILE_UPDATE | KOR_FILE_CREATE | KOR_FILE_EXCLUSIVE;

class File : public testing::Test
{
protected:
  /// A file with that content, by the system's own means.
  std::string given(const std::string& name, const std::string& content)
  {
    std::FILE* const stream = std::fopen((folder_ / name).c_str(), "wb");
    std::fwrite(content.data(), 1, content.size(), stream);
    std::fclose(stream);
    return folder_ / name;
  }

  std::string path(const std::string& name) const { return folder_ / name; }

  TestFolder folder_;
};

TEST_F(File, WhatIsWrittenIsReadBack)
{
  KORHFile file;
  ASSERT_EQ(openFile(file, path("a"), kNewFile), TAV_RC_OK);
  EXPECT_EQ(writeFile(file, "content"), (Transfer{TAV_RC_OK, 7}));
  EXPECT_EQ(seekFile(file, 0), TAV_RC_OK);
  EXPECT_EQ(readText(file, 7), "content");
  EXPECT_EQ(file.close(), TAV_RC_OK);
}

TEST_F(File, ContentOutlivesTheClose)
{
  {
    KORHFile file;
    ASSERT_EQ(openFile(file, path("a"), KOR_FILE_WRITE | KOR_FILE_CREATE), TAV_RC_OK);
    ASSERT_EQ(writeFile(file, "content"), (Transfer{TAV_RC_OK, 7}));
    ASSERT_EQ(file.close(), TAV_RC_OK);
  }
  KORHFile file;
  ASSERT_EQ(openFile(file, path("a"), KOR_FILE_READ), TAV_RC_OK);
  EXPECT_EQ(readText(file, 7), "content");
}

TEST_F(File, APathMayHoldAnyUtf8)
{
  KORHFile file;
  ASSERT_EQ(openFile(file, path("gr\xC3\xBC\xC3\x9F \xE6\x96\x87"), kNewFile), TAV_RC_OK);
  EXPECT_EQ(file.close(), TAV_RC_OK);
  EXPECT_TRUE(std::filesystem::exists(tav::host::pathOf(path("gr\xC3\xBC\xC3\x9F \xE6\x96\x87"))));
}

TEST_F(File, TransfersMoveThePosition)
{
  KORHFile file;
  ASSERT_EQ(openFile(file, given("a", "abcdef"), KOR_FILE_UPDATE), TAV_RC_OK);
  EXPECT_EQ(readText(file, 2), "ab");
  EXPECT_EQ(writeFile(file, "XY"), (Transfer{TAV_RC_OK, 2}));
  EXPECT_EQ(readText(file, 2), "ef");
  seekFile(file, 0);
  EXPECT_EQ(readText(file, 6), "abXYef");
}

TEST_F(File, SeekTellsTheNewPosition)
{
  KORHFile file;
  uint64_t position = UINT64_MAX;
  ASSERT_EQ(openFile(file, given("a", "abcdef"), KOR_FILE_READ), TAV_RC_OK);
  EXPECT_EQ(seekFile(file, 4, &position), TAV_RC_OK);
  EXPECT_EQ(position, 4u);
  EXPECT_EQ(readText(file, 1), "e");
}

TEST_F(File, AReadUpToTheLastByteIsWhole)
{
  KORHFile file;
  std::array<char, 6> buffer{};
  ASSERT_EQ(openFile(file, given("a", "abcdef"), KOR_FILE_READ), TAV_RC_OK);
  EXPECT_EQ(readFile(file, buffer.data(), 6), (Transfer{TAV_RC_OK, 6}));
}

TEST_F(File, AReadPastTheEndTellsTheBytesSoFar)
{
  KORHFile file;
  std::array<char, 100> buffer{};
  ASSERT_EQ(openFile(file, given("a", "abcdef"), KOR_FILE_READ), TAV_RC_OK);
  EXPECT_EQ(readFile(file, buffer.data(), 100), (Transfer{0x90000021, 6}));
  EXPECT_EQ(std::string(buffer.data()), "abcdef");
}

TEST_F(File, AReadAtTheEndTellsNoBytes)
{
  KORHFile file;
  char byte = 'x';
  ASSERT_EQ(openFile(file, given("a", "abcdef"), KOR_FILE_READ), TAV_RC_OK);
  ASSERT_EQ(seekFile(file, 6), TAV_RC_OK);
  EXPECT_EQ(readFile(file, &byte, 1), (Transfer{0x90000021, 0}));
  EXPECT_EQ(byte, 'x');
}

TEST_F(File, TransfersOfNoBytesNeedNoBuffer)
{
  KORHFile file;
  ASSERT_EQ(openFile(file, path("a"), kNewFile), TAV_RC_OK);
  EXPECT_EQ(readFile(file, nullptr, 0), (Transfer{TAV_RC_OK, 0}));
  EXPECT_EQ(writeFile(file, nullptr, 0), (Transfer{TAV_RC_OK, 0}));
}

TEST_F(File, SizeIsTheNumberOfBytes)
{
  KORHFile file;
  uint64_t size = UINT64_MAX;
  ASSERT_EQ(openFile(file, given("a", "abcdef"), KOR_FILE_UPDATE), TAV_RC_OK);
  EXPECT_EQ(file.getSize(&size), TAV_RC_OK);
  EXPECT_EQ(size, 6u);
  seekFile(file, 6);
  writeFile(file, "gh");
  EXPECT_EQ(file.getSize(&size), TAV_RC_OK);
  EXPECT_EQ(size, 8u);
}

TEST_F(File, SizeLeavesThePositionAlone)
{
  KORHFile file;
  uint64_t size = 0;
  ASSERT_EQ(openFile(file, given("a", "abcdef"), KOR_FILE_READ), TAV_RC_OK);
  seekFile(file, 3);
  EXPECT_EQ(file.getSize(&size), TAV_RC_OK);
  EXPECT_EQ(readText(file, 1), "d");
}

TEST_F(File, BeyondFourGiBAFileWorksLikeBelow)
{
  constexpr uint64_t kFiveGiB = 5ull << 30;
  KORHFile file;
  uint64_t position = 0;
  uint64_t size = 0;
  ASSERT_EQ(openFile(file, path("sparse"), kNewFile), TAV_RC_OK);
  EXPECT_EQ(seekFile(file, kFiveGiB, &position), TAV_RC_OK);
  EXPECT_EQ(position, kFiveGiB);
  EXPECT_EQ(writeFile(file, "far away"), (Transfer{TAV_RC_OK, 8}));
  EXPECT_EQ(file.getSize(&size), TAV_RC_OK);
  EXPECT_EQ(size, kFiveGiB + 8);
  EXPECT_EQ(seekFile(file, kFiveGiB - 1), TAV_RC_OK);
  EXPECT_EQ(readText(file, 100), std::string(1, '\0') + "far away");
}

TEST_F(File, WithoutCreateAMissingFileIsNotMade)
{
  KORHFile file;
  EXPECT_EQ(openFile(file, path("missing"), KOR_FILE_WRITE), KOR_RC_NO_SUCH_FILE);
  EXPECT_FALSE(std::filesystem::exists(path("missing")));
}

TEST_F(File, CreateKeepsWhatAnExistingFileHolds)
{
  KORHFile file;
  ASSERT_EQ(openFile(file, given("a", "abcdef"), KOR_FILE_UPDATE | KOR_FILE_CREATE), TAV_RC_OK);
  EXPECT_EQ(readText(file, 6), "abcdef");
}

TEST_F(File, CreateMakesAFileForReadingToo)
{
  KORHFile file;
  char byte = 0;
  ASSERT_EQ(openFile(file, path("a"), KOR_FILE_READ | KOR_FILE_CREATE), TAV_RC_OK);
  EXPECT_EQ(readFile(file, &byte, 1), (Transfer{TAV_RC_END_OF_STORAGE, 0}));
}

TEST_F(File, TruncateEmptiesAnExistingFile)
{
  KORHFile file;
  uint64_t size = UINT64_MAX;
  ASSERT_EQ(openFile(file, given("a", "abcdef"), KOR_FILE_WRITE | KOR_FILE_TRUNCATE), TAV_RC_OK);
  EXPECT_EQ(file.getSize(&size), TAV_RC_OK);
  EXPECT_EQ(size, 0u);
}

TEST_F(File, ExclusiveRefusesAnExistingFileAndLeavesIt)
{
  KORHFile file;
  const std::string existing = given("a", "abcdef");
  EXPECT_EQ(openFile(file, existing, kNewFile | KOR_FILE_TRUNCATE), KOR_RC_FILE_EXISTS);
  EXPECT_EQ(std::filesystem::file_size(existing), 6u);
}

TEST_F(File, AFailedOpenLeavesTheObjectClosed)
{
  KORHFile file;
  ASSERT_EQ(openFile(file, path("missing"), KOR_FILE_READ), KOR_RC_NO_SUCH_FILE);
  EXPECT_EQ(file.close(), KOR_RC_NOT_OPEN);
}

TEST_F(File, TheSecondOpenIsRefusedAndTheFirstFileStays)
{
  KORHFile file;
  ASSERT_EQ(openFile(file, given("a", "first"), KOR_FILE_READ), TAV_RC_OK);
  EXPECT_EQ(openFile(file, given("b", "second"), KOR_FILE_READ), KOR_RC_BUSY);
  EXPECT_EQ(readText(file, 10), "first");
}

TEST_F(File, OpensAgainAfterAClose)
{
  KORHFile file;
  ASSERT_EQ(openFile(file, given("a", "first"), KOR_FILE_READ), TAV_RC_OK);
  ASSERT_EQ(file.close(), TAV_RC_OK);
  ASSERT_EQ(openFile(file, given("b", "second"), KOR_FILE_READ), TAV_RC_OK);
  EXPECT_EQ(readText(file, 10), "second");
}

TEST_F(File, TheSecondCloseIsRefused)
{
  KORHFile file;
  ASSERT_EQ(openFile(file, path("a"), kNewFile), TAV_RC_OK);
  EXPECT_EQ(file.close(), TAV_RC_OK);
  EXPECT_EQ(file.close(), KOR_RC_NOT_OPEN);
}

/// How a file is opened, and what may be done with it then.
struct Access
{
  const char* name;
  uint64_t options;
  uint32_t readCode;
  uint32_t writeCode;
};

class FileAccess : public File, public testing::WithParamInterface<Access>
{
protected:
  void SetUp() override { ASSERT_EQ(openFile(file_, given("a", "abcdef"), GetParam().options), TAV_RC_OK); }

  KORHFile file_;
};

TEST_P(FileAccess, DecidesWhetherReadsAreAllowed)
{
  char byte = 0;
  EXPECT_EQ(readFile(file_, &byte, 1).code, GetParam().readCode);
}

TEST_P(FileAccess, DecidesWhetherWritesAreAllowed)
{
  EXPECT_EQ(writeFile(file_, "x").code, GetParam().writeCode);
}

constexpr Access kAccesses[] = {
    {"read", KOR_FILE_READ, TAV_RC_OK, KOR_RC_WRONG_ACCESS},
    {"write", KOR_FILE_WRITE, KOR_RC_WRONG_ACCESS, TAV_RC_OK},
    {"update", KOR_FILE_UPDATE, TAV_RC_OK, TAV_RC_OK},
    {"readAndWrite", KOR_FILE_READ | KOR_FILE_WRITE, TAV_RC_OK, TAV_RC_OK},
    {"readAndUpdate", KOR_FILE_READ | KOR_FILE_UPDATE, TAV_RC_OK, TAV_RC_OK},
    {"writeAndUpdate", KOR_FILE_WRITE | KOR_FILE_UPDATE, TAV_RC_OK, TAV_RC_OK},
    {"all", KOR_FILE_READ | KOR_FILE_WRITE | KOR_FILE_UPDATE, TAV_RC_OK, TAV_RC_OK},
};

INSTANTIATE_TEST_SUITE_P(Modes, FileAccess, testing::ValuesIn(kAccesses),
                         [](const testing::TestParamInfo<Access>& row) { return std::string(row.param.name); });

class OptionsWithoutAMeaning : public File, public testing::WithParamInterface<uint64_t>
{
};

TEST_P(OptionsWithoutAMeaning, AreRefusedBeforeAnythingHappens)
{
  KORHFile file;
  EXPECT_EQ(openFile(file, path("a"), GetParam()), TAV_RC_BAD_PARAM);
  EXPECT_FALSE(std::filesystem::exists(path("a")));
}

INSTANTIATE_TEST_SUITE_P(Words, OptionsWithoutAMeaning,
                         testing::Values(0, KOR_FILE_CREATE, KOR_FILE_CREATE | KOR_FILE_TRUNCATE,
                                         KOR_FILE_READ | KOR_FILE_CREATE | KOR_FILE_TRUNCATE,
                                         KOR_FILE_WRITE | KOR_FILE_EXCLUSIVE, KOR_FILE_WRITE | KOR_FILE_CREATE | 0x8,
                                         KOR_FILE_WRITE | KOR_FILE_CREATE | 0x100000000));

/// One operation of a file, on valid arguments of its own.
struct Operation
{
  const char* name;
  std::function<uint32_t(KORHFile&)> call;
};

class ClosedFile : public testing::TestWithParam<Operation>
{
};

TEST_P(ClosedFile, RefusesEveryOperation)
{
  KORHFile file;
  EXPECT_EQ(GetParam().call(file), KOR_RC_NOT_OPEN);
}

std::vector<Operation> operations()
{
  static char byte = 0;
  static uint64_t size = 0;
  return {
      {"close", [](KORHFile& file) { return file.close(); }},
      {"read", [](KORHFile& file) { return readFile(file, &byte, 1).code; }},
      {"readNothing", [](KORHFile& file) { return readFile(file, nullptr, 0).code; }},
      {"write", [](KORHFile& file) { return writeFile(file, "x").code; }},
      {"writeNothing", [](KORHFile& file) { return writeFile(file, nullptr, 0).code; }},
      {"seek", [](KORHFile& file) { return seekFile(file, 0); }},
      {"lock", [](KORHFile& file) { return lockFile(file, 1, 2); }},
      {"unlock", [](KORHFile& file) { return file.unlock(); }},
      {"getSize", [](KORHFile& file) { return file.getSize(&size); }},
  };
}

INSTANTIATE_TEST_SUITE_P(Operations, ClosedFile, testing::ValuesIn(operations()),
                         [](const testing::TestParamInfo<Operation>& row) { return std::string(row.param.name); });

/// Calls with an argument that is null or wrong, on an open file.
class WrongArgument : public File, public testing::WithParamInterface<Operation>
{
};

TEST_P(WrongArgument, IsRefused)
{
  KORHFile file;
  ASSERT_EQ(openFile(file, given("a", "abcdef"), KOR_FILE_UPDATE), TAV_RC_OK);
  EXPECT_EQ(GetParam().call(file), TAV_RC_BAD_PARAM);
}

template<class Param>
Param otherVersion()
{
  Param param;
  param.version = KOR_PARAM_VERSION + 1;
  return param;
}

std::vector<Operation> wrongArguments()
{
  static char byte = 0;
  static uint64_t done = 0;
  return {
      {"readNull", [](KORHFile& file) { return file.read(nullptr, &byte, &done); }},
      {"readVersion",
       [](KORHFile& file) {
         const auto param = otherVersion<KORFileReadParam>();
         return file.read(&param, &byte, &done);
       }},
      {"readNullBuffer", [](KORHFile& file) { return readFile(file, nullptr, 1).code; }},
      {"readNullDone",
       [](KORHFile& file) {
         const KORFileReadParam param;
         return file.read(&param, &byte, nullptr);
       }},
      {"writeNull", [](KORHFile& file) { return file.write(nullptr, &done); }},
      {"writeVersion",
       [](KORHFile& file) {
         const auto param = otherVersion<KORFileWriteParam>();
         return file.write(&param, &done);
       }},
      {"writeNullBuffer", [](KORHFile& file) { return writeFile(file, nullptr, 1).code; }},
      {"writeNullDone",
       [](KORHFile& file) {
         const KORFileWriteParam param;
         return file.write(&param, nullptr);
       }},
      {"seekNull", [](KORHFile& file) { return file.seek(nullptr, &done); }},
      {"seekVersion",
       [](KORHFile& file) {
         const auto param = otherVersion<KORFileSeekParam>();
         return file.seek(&param, &done);
       }},
      {"seekBeyondTheSystemsOffsets", [](KORHFile& file) { return seekFile(file, uint64_t{1} << 63); }},
      {"lockNull", [](KORHFile& file) { return file.lock(nullptr); }},
      {"lockVersion",
       [](KORHFile& file) {
         const auto param = otherVersion<KORFileLockParam>();
         return file.lock(&param);
       }},
      {"lockWord1", [](KORHFile& file) { return lockFile(file, 2, 2); }},
      {"lockWord2", [](KORHFile& file) { return lockFile(file, 1, 1); }},
      {"getSizeNull", [](KORHFile& file) { return file.getSize(nullptr); }},
  };
}

INSTANTIATE_TEST_SUITE_P(Calls, WrongArgument, testing::ValuesIn(wrongArguments()),
                         [](const testing::TestParamInfo<Operation>& row) { return std::string(row.param.name); });

TEST_F(File, OpenNeedsItsParameterAndAPath)
{
  KORHFile file;
  KORFileOpenParam param;
  param.options = KOR_FILE_READ;
  EXPECT_EQ(file.open(nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(file.open(&param), TAV_RC_BAD_PARAM);
}

TEST_F(File, OpenRefusesAnotherVersion)
{
  KORHFile file;
  const std::string existing = given("a", "");
  auto param = otherVersion<KORFileOpenParam>();
  param.pPath = existing.c_str();
  param.options = KOR_FILE_READ;
  EXPECT_EQ(file.open(&param), TAV_RC_BAD_PARAM);
}

TEST_F(File, ARefusedTransferTellsNoBytes)
{
  KORHFile file;
  ASSERT_EQ(openFile(file, given("a", "abcdef"), KOR_FILE_READ), TAV_RC_OK);
  EXPECT_EQ(readFile(file, nullptr, 1), (Transfer{TAV_RC_BAD_PARAM, 0}));
  EXPECT_EQ(writeFile(file, nullptr, 1), (Transfer{TAV_RC_BAD_PARAM, 0}));
  EXPECT_EQ(writeFile(file, "x"), (Transfer{KOR_RC_WRONG_ACCESS, 0}));
}

TEST(FileParameters, CarryTheVersionWord)
{
  EXPECT_EQ(KORFileOpenParam().version, 0x09070000u);
  EXPECT_EQ(KORFileReadParam().version, 0x09070000u);
  EXPECT_EQ(KORFileWriteParam().version, 0x09070000u);
  EXPECT_EQ(KORFileSeekParam().version, 0x09070000u);
  EXPECT_EQ(KORFileLockParam().version, 0x09070000u);
}
TEST_F(File, IsCutAndFilledUpToASizeAndKeepsItsPosition)
{
  KORHFile file;
  ASSERT_EQ(openFile(file, given("a", "content"), KOR_FILE_UPDATE), TAV_RC_OK);
  ASSERT_EQ(seekFile(file, 3), TAV_RC_OK);
  EXPECT_EQ(file.setSize(5), TAV_RC_OK);
  EXPECT_EQ(readText(file, 9), "te");
  EXPECT_EQ(file.setSize(7), TAV_RC_OK);
  EXPECT_EQ(readText(file, 9), std::string(2, '\0'));
  EXPECT_EQ(file.setSize(uint64_t{1} << 63U), TAV_RC_BAD_PARAM);
  EXPECT_EQ(file.sync(), TAV_RC_OK);
  EXPECT_EQ(file.syncData(), TAV_RC_OK);
}

TEST_F(File, ItsFolderIsSyncedByItsPath)
{
  EXPECT_EQ(korSyncFolderOf(path("a").c_str()), TAV_RC_OK) << "whether the file is there or not";
  EXPECT_EQ(korSyncFolderOf("name"), TAV_RC_OK) << "in the folder that the process is in";
  EXPECT_EQ(korSyncFolderOf(nullptr), TAV_RC_BAD_PARAM);
}

TEST_F(File, IsAtItsPathUntilAnotherTakesThat)
{
  KORHFile file;
  const std::string name = given("a", "old");
  ASSERT_EQ(openFile(file, name, KOR_FILE_UPDATE), TAV_RC_OK);
  EXPECT_TRUE(file.isAt(name.c_str()));
  EXPECT_FALSE(file.isAt(given("b", "old").c_str()));
  EXPECT_FALSE(file.isAt(path("missing").c_str()));
  EXPECT_FALSE(file.isAt(nullptr));
  EXPECT_EQ(file.replaceBy(path("b").c_str(), name.c_str()), TAV_RC_OK);
  EXPECT_FALSE(file.isAt(name.c_str())) << "it is closed";
  EXPECT_FALSE(std::filesystem::exists(path("b")));
}

TEST_F(File, IsReplacedByAnother)
{
  const std::string old = given("a", "old");
  const std::string fresh = given("b", "new");
  KORHFile file;
  ASSERT_EQ(openFile(file, old, KOR_FILE_UPDATE), TAV_RC_OK);
  EXPECT_EQ(file.replaceBy(path("missing").c_str(), old.c_str()), KOR_RC_NO_SUCH_FILE);
  EXPECT_EQ(file.replaceBy(nullptr, old.c_str()), TAV_RC_BAD_PARAM);
  EXPECT_EQ(file.replaceBy(fresh.c_str(), nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(file.replaceBy(fresh.c_str(), old.c_str()), TAV_RC_OK);
  KORHFile again;
  ASSERT_EQ(openFile(again, old, KOR_FILE_READ), TAV_RC_OK);
  EXPECT_EQ(readText(again, 9), "new");
}

TEST_F(File, ThatIsNotOpenHasNoSizeToSetAndNoRights)
{
  KORHFile closed;
  KORHFile open;
  ASSERT_EQ(openFile(open, path("a"), kNewFile), TAV_RC_OK);
  EXPECT_EQ(closed.setSize(0), KOR_RC_NOT_OPEN);
  EXPECT_EQ(closed.sync(), KOR_RC_NOT_OPEN);
  EXPECT_EQ(closed.syncData(), KOR_RC_NOT_OPEN);
  EXPECT_EQ(closed.copyRights(open), KOR_RC_NOT_OPEN);
  EXPECT_EQ(open.copyRights(closed), KOR_RC_NOT_OPEN);
  EXPECT_FALSE(closed.isAt(path("a").c_str()));
}

} // namespace
