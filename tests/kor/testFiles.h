/// @file testFiles.h
/// Folders, files and processes for the tests of files.
#pragma once

#include <array>
#include <cerrno>
#include <csignal>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <functional>
#include <stdexcept>
#include <string>
#include <sys/wait.h>
#include <unistd.h>

#include "tav/kor.h"

/// A folder of its own that goes with all it holds.
class TestFolder
{
public:
  TestFolder()
  {
    std::string pattern = (std::filesystem::temp_directory_path() / "kor-test-XXXXXX").string();
    if (mkdtemp(pattern.data()) == nullptr) throw std::runtime_error("no folder " + pattern);
    path_ = pattern;
  }
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
  if (transfer.code != TAV_RC_OK && transfer.code != TAV_RC_END_OF_STORAGE) return korCodeName(transfer.code);
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

/// A process that runs `work` and hands its code back. The work must not use the test framework.
class Child
{
public:
  explicit Child(const std::function<uint32_t()>& work)
  {
    if (pipe(pipe_.data()) != 0) throw std::runtime_error("no pipe");
    std::fflush(nullptr); // or the process inherits what is not printed yet
    process_ = fork();
    if (process_ < 0) throw std::runtime_error("no process");
    if (process_ > 0)
    {
      ::close(pipe_[1]);
      return;
    }
    ::close(pipe_[0]);
    const uint32_t code = work();
    const bool told = ::write(pipe_[1], &code, sizeof code) == sizeof code;
    _exit(told ? 0 : 1); // past the checks at exit, which are the parent's
  }
  ~Child()
  {
    if (process_ <= 0) return;
    ::kill(process_, SIGKILL); // nobody waits for it, so the test has failed, and it may wait for the test
    result();
  }
  Child(const Child&) = delete;
  Child& operator=(const Child&) = delete;

  /// Waits for the end; UINT32_MAX when the process died before.
  uint32_t result()
  {
    uint32_t code = UINT32_MAX;
    if (::read(pipe_[0], &code, sizeof code) != sizeof code) code = UINT32_MAX;
    ::close(pipe_[0]);
    while (waitpid(process_, nullptr, 0) < 0 && errno == EINTR)
    {}
    process_ = -1;
    return code;
  }

private:
  std::array<int, 2> pipe_ = {-1, -1};
  pid_t process_ = -1;
};

inline uint32_t inChild(const std::function<uint32_t()>& work)
{
  return Child(work).result();
}
