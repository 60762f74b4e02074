/// Where pieces go: the caller's buffer, a stream, or a block on its way to one.
#include <algorithm>
#include <array>
#include <cstdarg>
#include <cstring>
#include <memory>
#include <new>

#include "api/digits.h"
#include "api/printer.h"
#include "dictionary/dictionary.h"
#include "kor/lineBuffered.h"

using namespace tav::inside::print;

namespace
{

constexpr size_t kLongestLine = 512; // the longest names of the dictionary stay well below

/// Puts what fits of a piece at the buffer's first byte, and a NUL behind it.
uint64_t putInBuffer(TAVPrintCtx& ctx, size_t blanks, std::string_view text)
{
  if (ctx.bufferSize == 0)
  {
    return 0;
  }
  const uint64_t count = std::min<uint64_t>(blanks + text.size(), ctx.bufferSize - 1);
  const uint64_t before = std::min<uint64_t>(blanks, count);
  std::fill_n(ctx.pBuffer, before, ' ');
  std::copy_n(text.data(), count - before, ctx.pBuffer + before);
  ctx.pBuffer[count] = '\0';
  return count;
}

/// A stream that pads by itself takes blanks a few at a time.
bool writeBlanks(FILE* stream, size_t blanks)
{
  std::array<char, 512> some;
  some.fill(' ');
  size_t length = 0;
  for (; blanks != 0; blanks -= length)
  {
    length = std::min(blanks, some.size());
    if (std::fwrite(some.data(), 1, length, stream) != length)
    {
      return false;
    }
  }
  return true;
}

/// Whether a stream takes a piece. Of one that ends a line fwrite counts all also when the line is refused, and such a
/// piece has no NUL.
bool writeWhole(FILE* stream, std::string_view text)
{
  return text.ends_with('\n') && tav::kor::isLineBuffered(stream)
             ? std::fprintf(stream, "%.*s", static_cast<int>(text.size()), text.data()) >= 0
             : std::fwrite(text.data(), 1, text.size(), stream) == text.size();
}

/// Gives a stream a piece, of which none counts when it refuses any.
uint64_t putInStream(FILE* stream, size_t blanks, std::string_view text)
{
  return writeBlanks(stream, blanks) && writeWhole(stream, text) ? blanks + text.size() : 0;
}

} // namespace

uint64_t tavPrintf(TAVPrintCtx* ctx, const char* format, ...)
{
  std::array<char, kLongestLine> line;
  va_list arguments;
  va_list again;
  va_start(arguments, format);
  va_copy(again, arguments);
  const int length = vsnprintf(line.data(), line.size(), format, arguments);
  const size_t room = length < 0 ? 0 : static_cast<size_t>(length) + 1;
  const std::unique_ptr<char[]> longer(room > line.size() ? new (std::nothrow) char[room] : nullptr);
  if (longer != nullptr)
  {
    vsnprintf(longer.get(), room, format, again);
  }
  va_end(again);
  va_end(arguments);
  const char* const text = room > line.size() ? longer.get() : line.data();
  return text != nullptr && room != 0 ? put(*ctx, 0, {text, room - 1}) : 0;
}

namespace tav::inside::print
{

uint64_t put(TAVPrintCtx& ctx, size_t blanks, std::string_view text)
{
  if (ctx.pBlock != nullptr)
  {
    return ctx.pBlock->add(blanks, text);
  }
  const uint64_t count = isToBuffer(ctx) ? putInBuffer(ctx, blanks, text) : putInStream(streamOf(ctx), blanks, text);
  ctx.bytesWritten += count;
  return count;
}

void piece(TAVPrintCtx& ctx, Parts parts, size_t blanks)
{
  if (parts.size() == 1)
  {
    put(ctx, blanks, *parts.begin());
    return;
  }
  std::array<char, kLongestLine> text;
  char* end = text.data();
  for (const std::string_view part : parts)
  {
    const auto room = static_cast<size_t>(text.data() + text.size() - end);
    end = std::copy_n(part.data(), std::min(part.size(), room), end);
  }
  put(ctx, blanks, {text.data(), static_cast<size_t>(end - text.data())});
}

void line(TAVPrintCtx& ctx, Parts parts)
{
  if (!has(ctx, TAV_PRINT_XML)) // the depth is before it, a piece of its own
  {
    constexpr size_t width = 4;
    std::array<char, digits::kLongest> depth;
    char* const end = digits::writeDecimal(depth.data(), static_cast<uint64_t>(ctx.depth));
    *end = '|';
    const auto length = static_cast<size_t>(end + 1 - depth.data());
    put(ctx, width - std::min(length, width), {depth.data(), length});
  }
  piece(ctx, parts, static_cast<size_t>(ctx.depth * kBlanksPerLevel));
}

bool makeTag(ReadyTag& tag, uint32_t key, uint16_t elm, int64_t depth)
{
  const std::string_view name = elementTagName(elm);
  const size_t blanks = static_cast<size_t>(depth) * kBlanksPerLevel;
  const size_t opening = blanks + name.size() + 2;
  const size_t closing = name.size() + 4;
  if (opening > ReadyTag::kLongestOpening || closing > ReadyTag::kLongestClosing)
  {
    return false;
  }
  tag.key = key;
  tag.openingLength = static_cast<uint32_t>(opening);
  tag.closingLength = static_cast<uint32_t>(closing);
  char* end = std::fill_n(tag.text.data(), blanks, ' ');
  for (const std::string_view part :
       {std::string_view("<"), name, std::string_view("></"), name, std::string_view(">\n")})
  {
    end = std::copy(part.begin(), part.end(), end);
  }
  return true;
}

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
