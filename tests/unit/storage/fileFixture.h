/// File storages over files of a folder that goes with the test.
#pragma once

#include <algorithm>
#include <cstdint>
#include <fstream>
#include <gtest/gtest.h>
#include <iterator>
#include <memory>
#include <string>
#include <vector>

#include "kor/testFiles.h"
#include "storage/ringFixture.h"
#include "support/streams.h"

namespace test
{

inline constexpr uint64_t kCreate = KOR_FILE_UPDATE | KOR_FILE_CREATE;

/// A file storage with its open parameter.
class OpenFile
{
public:
  OpenFile(const std::string& path, uint64_t options)
      : path_(path)
  {
    param_.pPath = path_.c_str();
    param_.options = options;
    storage_ = std::make_unique<TAVSSFile>(&param_, &rc);
  }
  TAVSSFile* operator->() { return storage_.get(); }
  TAVSSFile& operator*() { return *storage_; }

  uint32_t rc = 77;

private:
  std::string path_;
  KORFileOpenParam param_;
  std::unique_ptr<TAVSSFile> storage_;
};

class FileStorage : public testing::Test
{
protected:
  /// The name of a file of `count` bytes of the pattern.
  std::string fileOf(uint64_t count)
  {
    const std::string path = folder_ / "stream.tav";
    const std::vector<uint8_t> bytes = pattern(0, count);
    std::ofstream(path, std::ios::binary)
        .write(reinterpret_cast<const char*>(bytes.data()), static_cast<std::streamsize>(count));
    return path;
  }
  static std::vector<uint8_t> contentOf(const std::string& path)
  {
    std::ifstream file(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(file), {}};
  }
  struct Got
  {
    uint32_t code;
    std::vector<uint8_t> bytes;
    bool operator==(const Got&) const = default;
  };
  static Got read(OpenFile& file, uint64_t wanted, uint64_t bufSize = 64, bool backward = false)
  {
    std::vector<uint8_t> buffer(std::max<uint64_t>(bufSize, 1));
    void* pData = buffer.data();
    uint64_t got = 99;
    const uint32_t code = file->read(wanted, &pData, bufSize, &got, false, backward);
    EXPECT_LE(got, bufSize);
    const auto first = backward ? buffer.begin() + static_cast<ptrdiff_t>(bufSize - got) : buffer.begin();
    return {code, {first, first + static_cast<ptrdiff_t>(got)}};
  }
  static Failure at(uint32_t probe, uint32_t point, uint32_t code) { return {probe, point, code}; }

  TestFolder folder_;
};

} // namespace test
