#include "api/printBlock.h"

#include <cstring>

namespace tav::inside::print
{

uint64_t OutputBlock::add(size_t blanks, std::string_view text)
{
  const size_t length = blanks + text.size();
  if (length > kSize) [[unlikely]]
  {
    handOver();
    const uint64_t taken = stopped_ ? 0 : putInStream(stream_, blanks, text);
    taken_ += taken;
    total_ += taken;
    return taken;
  }
  if (length != 0)
  {
    char* const place = reserve(length);
    std::memset(place, ' ', blanks);
    std::memcpy(place + blanks, text.data(), text.size());
    endPieces({length});
  }
  return length;
}

void OutputBlock::handOver()
{
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

} // namespace tav::inside::print
