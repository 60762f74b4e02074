#include "api/printBlock.h"

#include <algorithm>

#include "api/printer.h"
#include "dictionary/dictionary.h"

namespace tav::inside::print
{
namespace
{

template<size_t size>
char* append(char* to, const char (&text)[size])
{
  return std::copy_n(text, size - 1, to);
}

} // namespace

bool ReadyTags::make(ReadyTag& tag, uint16_t elm, int64_t depth)
{
  const std::string_view name = elementTagName(elm);
  const size_t blanks = static_cast<size_t>(depth) * kBlanksPerLevel;
  if (blanks + name.size() + 2 > ReadyTag::kLongestOpening || name.size() + 4 > ReadyTag::kLongestClosing)
  {
    return false;
  }
  tag = {};
  tag.key = keyOf(elm, depth);
  char* end = std::fill_n(tag.opening.data(), blanks, ' ');
  end = append(std::copy(name.begin(), name.end(), append(end, "<")), ">");
  tag.openingLength = static_cast<uint32_t>(end - tag.opening.data());
  end = append(tag.closing.data(), "</");
  end = append(std::copy(name.begin(), name.end(), end), ">\n");
  tag.closingLength = static_cast<uint32_t>(end - tag.closing.data());
  return true;
}

void OutputBlock::handOver()
{
  if (used_ == 0)
  {
    return;
  }
  const size_t taken = stopped_ ? 0 : std::fwrite(text_.data(), 1, used_, stream_);
  if (taken == used_)
  {
    taken_ = nodeStart_ != 0 ? used_ - nodeStart_ : taken_ + used_;
  }
  else
  {
    total_ -= used_ - settle(taken);
  }
  used_ = 0;
  endCount_ = 0;
  nodeStart_ = 0;
}

/// What counts of a block of which the stream took only the first bytes. The piece that it stopped in is refused; those
/// behind it are tried one by one.
uint64_t OutputBlock::settle(size_t taken)
{
  uint64_t counted = 0;
  size_t start = 0;
  for (size_t at = 0; at < endCount_ && !stopped_; ++at)
  {
    const size_t end = ends_[at] & ~kNodeEnd;
    const size_t length = end - start;
    if (end <= taken || (start > taken && std::fwrite(text_.data() + start, 1, length, stream_) == length))
    {
      counted += length;
      taken_ += length;
    }
    if ((ends_[at] & kNodeEnd) != 0)
    {
      stopped_ = taken_ == 0;
      taken_ = 0;
    }
    start = end;
  }
  return counted;
}

uint64_t OutputBlock::addLong(size_t blanks, std::string_view text)
{
  handOver();
  if (stopped_)
  {
    return 0;
  }
  const uint64_t length = putInStream(stream_, blanks, text);
  taken_ += length;
  total_ += length;
  return length;
}

} // namespace tav::inside::print
