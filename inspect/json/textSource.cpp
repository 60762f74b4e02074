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
}

TextSource::~TextSource() = default;

bool TextSource::fetchMore()
{
  base_ += end_;
  lines_ += static_cast<uint64_t>(std::count(buffer_.data(), buffer_.data() + end_, '\n'));
  at_ = 0;
  end_ = 0; // nothing is at hand where fetching fails
  end_ = fetch(buffer_);
  return end_ != 0;
}

uint64_t TextSource::line() const
{
  return 1 + lines_ + static_cast<uint64_t>(std::count(buffer_.data(), buffer_.data() + at_, '\n'));
}

bool TextSource::skipBlanks()
{
  const auto isBlank = [](char c) { return c == ' ' || c == '\t' || c == '\r' || c == '\n'; };
  while (peek() != kEnd)
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
