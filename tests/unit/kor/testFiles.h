/// @file testFiles.h
/// Folders and files for the tests of files.
#pragma once

#include <cstdint>
#include <cstdio>
#include <filesystem>
#include <string>

#include <gtest/gtest.h>

#include "support/platform.h"
#include "tav/kor.h"

/// A folder of its own that goes with all it holds.
class TestFolder
{
public:
  TestFolder()
      : path_(test::makeFolder("kor-test-")) {}
  ~TestFolder()
  {
    std::error_code ignored;
    std::filesystem::remove_all(path_, ignored);
  }
  TestFolder(const TestFolder&) = delete;
  TestFolder& operator=(const TestFolder&) = delete;

  std::string operator/(const std::string& name) const { return path_ + "/" + name; }
  const std::string& path() const { return path_; }

private:
  std::string path_;
};

/// Makes a folder the working one for as long as it lives.
class WorkingFolder
{
public:
  explicit WorkingFolder(const std::filesystem::path& folder)
      : before_(std::filesystem::current_path())
  {
    std::filesystem::current_path(folder);
  }
  ~WorkingFolder()
  {
    std::error_code ignored;
    std::filesystem::current_path(before_, ignored);
  }
  WorkingFolder(const WorkingFolder&) = delete;
  WorkingFolder& operator=(const WorkingFolder&) = delete;

private:
  std::filesystem::path before_;
};

inline uint32_t openFile(KORHFile& file, const std::string& path, uint64_t options, uint32_t permissions = 0666)
{
  KORFileOpenParam param;
  param.pPath = path.c_str();
  param.options = options;
  param.permissions = permissions;
  return file.open(&param);
}

/// What a transfer came to.
struct Transfer
{
  uint32_t code = UINT32_MAX;
  uint64_t done = UINT64_MAX;

  bool operator==(const Transfer&) const = default;
};

inline Transfer writeFile(KORHFile& file, const void* data, uint64_t length)
{
  KORFileWriteParam param;
  param.pData = data;
  param.length = length;
  Transfer transfer;
  transfer.code = file.write(&param, &transfer.done);
  return transfer;
}

inline Transfer writeFile(KORHFile& file, const std::string& text)
{
  return writeFile(file, text.data(), text.size());
}

inline Transfer readFile(KORHFile& file, void* buffer, uint64_t length)
{
  KORFileReadParam param;
  param.length = length;
  Transfer transfer;
  transfer.code = file.read(&param, buffer, &transfer.done);
  return transfer;
}

/// The text read by one request for `length` bytes; a failure other than the end gives its name.
inline std::string readText(KORHFile& file, uint64_t length)
{
  std::string text(length, '?');
  const Transfer transfer = readFile(file, text.data(), length);
  if (transfer.code != TAV_RC_OK && transfer.code != TAV_RC_END_OF_STORAGE)
  {
    return korCodeName(transfer.code);
  }
  text.resize(transfer.done);
  return text;
}

inline uint32_t seekFile(KORHFile& file, uint64_t offset, uint64_t* pPosition = nullptr)
{
  KORFileSeekParam param;
  param.offset = offset;
  return file.seek(&param, pPosition);
}

inline uint32_t lockFile(KORHFile& file, uint32_t word1, uint32_t word2)
{
  KORFileLockParam param;
  param.word1 = word1;
  param.word2 = word2;
  return file.lock(&param);
}

// Words of a lock.
inline constexpr uint32_t kShared = 0;
inline constexpr uint32_t kExclusive = 1;
inline constexpr uint32_t kWait = 0;
inline constexpr uint32_t kDoNotWait = 2;

/// A lock that is held, and what becomes of another one that is asked for beside it.
struct LockBeside
{
  uint32_t held;
  uint32_t asked;
  uint32_t code;
};
inline constexpr LockBeside kLocksBeside[] = {{kExclusive, kExclusive, KOR_RC_LOCKED},
                                              {kExclusive, kShared, KOR_RC_LOCKED},
                                              {kShared, kShared, TAV_RC_OK},
                                              {kShared, kExclusive, KOR_RC_LOCKED}};

/// Two open files of one path. What is locked belongs to the open file, in this process and in others.
class TwoOpenFiles : public testing::Test
{
protected:
  void SetUp() override
  {
    ASSERT_EQ(openFile(file_, path_, KOR_FILE_UPDATE | KOR_FILE_CREATE), TAV_RC_OK);
    ASSERT_EQ(openFile(other_, path_, KOR_FILE_UPDATE), TAV_RC_OK);
  }

  TestFolder folder_;
  std::string path_ = folder_ / "locked";
  KORHFile file_;
  KORHFile other_;
};
