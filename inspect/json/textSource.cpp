#include "tav/inspect/textSource.hpp"

#include <algorithm>

namespace tav::inspect
{

namespace
{

constexpr size_t kBuffer = size_t{64} * 1024;

} // namespace

TextSource::TextSource(std::string name)
    : name_(std::move(name)), buffer_(kBuffer)
{
  setg(buffer_.data(), buffer_.data(), buffer_.data());
}

TextSource::~TextSource() = default;

TextSource::int_type TextSource::underflow()
{
  if (gptr() < egptr())
  {
    return traits_type::to_int_type(*gptr());
  }
  base_ += static_cast<uint64_t>(egptr() - eback());
  lines_ += static_cast<uint64_t>(std::count(eback(), egptr(), '\n'));
  const size_t count = fetch(buffer_);
  setg(buffer_.data(), buffer_.data(), buffer_.data() + count);
  return count == 0 ? traits_type::eof() : traits_type::to_int_type(*gptr());
}

uint64_t TextSource::line() const
{
  return 1 + lines_ + static_cast<uint64_t>(std::count(eback(), gptr(), '\n'));
}

bool TextSource::skipBlanks()
{
  const auto isBlank = [](char c) { return c == ' ' || c == '\t' || c == '\r' || c == '\n'; };
  while (sgetc() != traits_type::eof())
  {
    const std::string_view bytes = atHand();
    const std::string_view::iterator end = std::find_if_not(bytes.begin(), bytes.end(), isBlank);
    skip(static_cast<size_t>(end - bytes.begin()));
    if (end != bytes.end())
    {
      return true;
    }
  }
  return false;
}

size_t MemoryText::fetch(std::span<char> to)
{
  const size_t count = std::min(to.size(), rest_.size());
  std::copy_n(rest_.begin(), count, to.begin());
  rest_.remove_prefix(count);
  return count;
}

} // namespace tav::inspect
