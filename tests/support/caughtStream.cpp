#include <array>
#include <stdexcept>

#include "support/platform.h"

namespace test
{

CaughtStream::CaughtStream()
    : stream_(temporaryStream())
{
  if (stream_ == nullptr)
  {
    throw std::runtime_error("no temporary stream");
  }
}

CaughtStream::~CaughtStream()
{
  std::fclose(stream_);
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
