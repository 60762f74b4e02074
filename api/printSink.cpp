#include <algorithm>
#include <cstdarg>
#include <memory>
#include <new>

#include "api/printer.h"
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
  constexpr size_t most = 512;
  std::array<char, most> some;
  some.fill(' ');
  while (blanks != 0)
  {
    const size_t length = std::min(blanks, most);
    if (std::fwrite(some.data(), 1, length, stream) != length)
    {
      return false;
    }
    blanks -= length;
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

} // namespace

uint64_t tavPrintf(TAVPrintCtx* ctx, const char* format, ...)
{
  std::array<char, kLongestLine> line;
  std::unique_ptr<char[]> longer;
  char* text = line.data();
  va_list arguments;
  va_start(arguments, format);
  const int length = vsnprintf(text, line.size(), format, arguments);
  va_end(arguments);
  if (length >= static_cast<int>(line.size()))
  {
    longer.reset(new (std::nothrow) char[static_cast<size_t>(length) + 1]);
    text = longer.get();
    if (text != nullptr)
    {
      va_start(arguments, format);
      vsnprintf(text, static_cast<size_t>(length) + 1, format, arguments);
      va_end(arguments);
    }
  }
  return text != nullptr && length >= 0 ? put(*ctx, 0, {text, static_cast<size_t>(length)}) : 0;
}

namespace tav::inside::print
{

FILE* streamOf(const TAVPrintCtx& ctx)
{
  return ctx.pStream != nullptr ? ctx.pStream : stdout;
}

uint64_t putInStream(FILE* stream, size_t blanks, std::string_view text)
{
  return writeBlanks(stream, blanks) && writeWhole(stream, text) ? blanks + text.size() : 0;
}

uint64_t put(TAVPrintCtx& ctx, size_t blanks, std::string_view text)
{
  if (ctx.pBlock != nullptr)
  {
    return ctx.pBlock->add(blanks, text);
  }
  const bool toBuffer = ctx.pStream == nullptr && ctx.pBuffer != nullptr;
  const uint64_t count = toBuffer ? putInBuffer(ctx, blanks, text) : putInStream(streamOf(ctx), blanks, text);
  ctx.bytesWritten += count;
  return count;
}

void line(TAVPrintCtx& ctx, std::initializer_list<std::string_view> parts)
{
  if (!has(ctx, TAV_PRINT_XML)) // the depth stands before it, a piece of its own
  {
    constexpr size_t width = 4;
    std::array<char, digits::kLongest> depth;
    char* end = digits::writeDecimal(depth.data(), static_cast<uint64_t>(ctx.depth));
    *end++ = '|';
    const auto length = static_cast<size_t>(end - depth.data());
    put(ctx, width - std::min(length, width), {depth.data(), length});
  }
  std::array<char, kLongestLine> text;
  char* end = text.data();
  for (const std::string_view part : parts)
  {
    const auto room = static_cast<size_t>(text.data() + text.size() - 1 - end);
    end = std::copy_n(part.data(), std::min(part.size(), room), end);
  }
  put(ctx, static_cast<size_t>(ctx.depth * kBlanksPerLevel), {text.data(), static_cast<size_t>(end - text.data())});
}

} // namespace tav::inside::print
