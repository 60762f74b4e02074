/// What the tests of the C++ layer share.
#pragma once

#define TAV_CHECK_PAYLOADS 1 // also where NDEBUG is defined

#include <cstdio>
#include <filesystem>
#include <span>
#include <string>
#include <system_error>

#include <gtest/gtest.h>

#include "support/byteRows.h"
#include "support/platform.h"
#include "support/vectorStorage.h"
#include "tav/tav.hpp"
#include "tools/host/host.h"

namespace test
{

/// The byte orders of streams that are written down in tests, whatever this machine's own is.
constexpr tav::ByteOrder kLowFirst = kBigEndianHost ? tav::ByteOrder::swapped : tav::ByteOrder::native;
constexpr tav::ByteOrder kHighFirst = kBigEndianHost ? tav::ByteOrder::native : tav::ByteOrder::swapped;

/// The code that a throwing form gives, TAV_RC_OK when it does not throw.
template<class Call>
uint32_t thrownBy(Call&& call)
{
  try
  {
    call();
  }
  catch (const std::system_error& error)
  {
    return tav::codeOf(error.code());
  }
  return TAV_RC_OK;
}

/// How many a range gives, where the standard library has no ranges, too.
template<class Range>
size_t countOf(Range&& range)
{
  size_t count = 0;
  for ([[maybe_unused]] const auto& one : range)
  {
    ++count;
  }
  return count;
}

/// The message of the error that a call throws; empty without one.
template<class Call>
std::string messageOf(const Call& call)
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

/// The code that a form with an error code gives. The error code held another error before.
template<class Call>
uint32_t givenBy(Call&& call)
{
  std::error_code ec = std::make_error_code(std::errc::interrupted);
  call(ec);
  EXPECT_TRUE(!ec || ec.category() == tav::category());
  return tav::codeOf(ec);
}

inline Bytes bytesOf(std::span<const std::byte> bytes)
{
  const auto* const first = reinterpret_cast<const uint8_t*>(bytes.data());
  return {first, first + bytes.size()};
}

inline std::span<const std::byte> spanOf(const Bytes& bytes)
{
  return std::as_bytes(std::span(bytes));
}

/// A path that names nothing yet; what it names later is removed.
class TemporaryPath
{
public:
  TemporaryPath()
      : path(unused())
  {
  }
  ~TemporaryPath()
  {
    std::error_code ignored;
    std::filesystem::remove(path, ignored);
  }
  TemporaryPath(const TemporaryPath&) = delete;
  TemporaryPath& operator=(const TemporaryPath&) = delete;

  const std::filesystem::path path;

private:
  static std::filesystem::path unused()
  {
    static int count = 0;
    const std::string name = "tav-layer-" + std::to_string(tav::host::processId()) + "-";
    std::filesystem::path found;
    do // a process of this number may have been killed, and left something
    {
      found = std::filesystem::temp_directory_path() / (name + std::to_string(++count));
    } while (std::filesystem::exists(std::filesystem::symlink_status(found)));
    return found;
  }
};

/// A file with bytes in it.
class StreamFile
{
public:
  explicit StreamFile(std::span<const uint8_t> bytes)
  {
    write(bytes, "wb");
  }

  /// Adds bytes at its end, as somebody else would.
  void append(std::span<const uint8_t> bytes) const
  {
    write(bytes, "ab");
  }

  [[nodiscard]] const std::filesystem::path& path() const
  {
    return file_.path;
  }

private:
  void write(std::span<const uint8_t> bytes, const char* mode) const
  {
    std::FILE* const stream = std::fopen(tav::host::textOf(file_.path).c_str(), mode);
    ASSERT_NE(stream, nullptr);
    EXPECT_TRUE(bytes.empty() || std::fwrite(bytes.data(), 1, bytes.size(), stream) == bytes.size());
    EXPECT_EQ(std::fclose(stream), 0);
  }

  TemporaryPath file_;
};

} // namespace test
