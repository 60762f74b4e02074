#include <array>
#include <memory>
#include <stdexcept>
#include <utility>

#include "support/platform.h"

namespace test
{

namespace
{

using Stream = std::unique_ptr<FILE, int (*)(FILE*)>;

/// The stream that was used last: a new file for each of thousands would cost more than the tests.
Stream& spare()
{
  thread_local Stream stream(nullptr, &std::fclose);
  return stream;
}

} // namespace

CaughtStream::CaughtStream()
    : stream_(spare() != nullptr ? spare().release() : temporaryStream())
{
  if (stream_ == nullptr)
  {
    throw std::runtime_error("no temporary stream");
  }
}

CaughtStream::~CaughtStream()
{
  Stream stream(stream_, &std::fclose);
  if (spare() == nullptr && emptyStream(stream_))
  {
    spare() = std::move(stream);
  }
}

std::string CaughtStream::text()
{
  std::rewind(stream_);
  std::string text;
  std::array<char, 4096> part{};
  while (const size_t count = std::fread(part.data(), 1, part.size(), stream_))
  {
    text.append(part.data(), count);
  }
  std::fseek(stream_, 0, SEEK_END);
  return text;
}

CaughtStdout::CaughtStdout()
    : before_(redirectOutput(stream_.get()))
{
}

CaughtStdout::~CaughtStdout()
{
  giveBack();
}

std::string CaughtStdout::text()
{
  giveBack();
  return stream_.text();
}

void CaughtStdout::giveBack()
{
  if (before_ >= 0)
  {
    restoreOutput(before_);
    before_ = -1;
  }
}

} // namespace test
