#include <algorithm>
#include <cstdarg>

#include "api/printer.h"
#include "kor/lineBuffered.h"

namespace
{

constexpr size_t kLongestLine = 512; // the longest names of the dictionary stay well below

/// What fits of a piece of `length` characters, which stands in the buffer so far; the NUL is set.
uint64_t endInBuffer(TAVPrintCtx& ctx, uint64_t length)
{
  const uint64_t count = std::min(length, ctx.bufferSize - 1);
  ctx.pBuffer[count] = '\0';
  return count;
}

uint64_t formatToBuffer(TAVPrintCtx& ctx, const char* format, va_list arguments)
{
  const int length = vsnprintf(ctx.pBuffer, ctx.bufferSize, format, arguments);
  return endInBuffer(ctx, length < 0 ? ctx.bufferSize : static_cast<uint64_t>(length));
}

bool isToBuffer(const TAVPrintCtx& ctx)
{
  return ctx.pStream == nullptr && ctx.pBuffer != nullptr;
}

uint64_t formatAlone(TAVPrintCtx& ctx, const char* format, va_list arguments)
{
  if (isToBuffer(ctx))
  {
    return ctx.bufferSize != 0 ? formatToBuffer(ctx, format, arguments) : 0;
  }
  FILE* const stream = tav::inside::print::streamOf(ctx);
  const bool sound = std::ferror(stream) == 0;
  const int length = vfprintf(stream, format, arguments);
  // Not every C library counts nothing when the stream refuses.
  const bool refused = length < 0 || (sound && std::ferror(stream) != 0);
  return refused ? 0 : static_cast<uint64_t>(length);
}

/// Whether a stream takes a piece. Of one that ends a line fwrite counts all also when the line is refused, and such a
/// piece has no NUL.
bool writeWhole(FILE* stream, std::string_view text)
{
  return text.ends_with('\n') && tav::kor::isLineBuffered(stream)
             ? std::fprintf(stream, "%.*s", static_cast<int>(text.size()), text.data()) >= 0
             : std::fwrite(text.data(), 1, text.size(), stream) == text.size();
}

/// Formats a piece of at most a line's length, cutting what is longer.
std::string_view formatLine(std::array<char, kLongestLine>& text, const char* format, va_list arguments)
{
  const int length = vsnprintf(text.data(), text.size(), format, arguments);
  return {text.data(), length < 0 ? 0 : std::min(static_cast<size_t>(length), text.size() - 1)};
}

/// What stands before a line of the text form, a piece of its own.
void depthPrefix(TAVPrintCtx& ctx)
{
  if (ctx.pBlock == nullptr)
  {
    tavPrintf(&ctx, "%3d|", static_cast<int>(ctx.depth));
    return;
  }
  constexpr size_t width = 3;
  std::array<char, tav::inside::digits::kLongest> text;
  char* end = tav::inside::digits::writeDecimal(text.data(), static_cast<uint64_t>(ctx.depth));
  *end++ = '|';
  const auto length = static_cast<size_t>(end - text.data());
  ctx.pBlock->add(width + 1 - std::min(length, width + 1), {text.data(), length});
}

/// A line whose text has a NUL behind it.
void indented(TAVPrintCtx& ctx, std::string_view text)
{
  if (ctx.pBlock != nullptr)
  {
    ctx.pBlock->add(static_cast<size_t>(ctx.depth * tav::inside::print::kBlanksPerLevel), text);
    return;
  }
  tavPrintf(&ctx, ctx.indentFormat.data(), "", text.data());
}

} // namespace

uint64_t tavPrintf(TAVPrintCtx* ctx, const char* format, ...)
{
  va_list arguments;
  va_start(arguments, format);
  uint64_t count = 0;
  if (ctx->pBlock != nullptr)
  {
    std::array<char, kLongestLine> text;
    count = ctx->pBlock->add(0, formatLine(text, format, arguments));
  }
  else
  {
    count = formatAlone(*ctx, format, arguments);
    ctx->bytesWritten += count;
  }
  va_end(arguments);
  return count;
}

namespace tav::inside::print
{

FILE* streamOf(const TAVPrintCtx& ctx)
{
  return ctx.pStream != nullptr ? ctx.pStream : stdout;
}

uint64_t pieceAlone(TAVPrintCtx& ctx, std::string_view text)
{
  uint64_t count = 0;
  if (!isToBuffer(ctx))
  {
    count = writeWhole(streamOf(ctx), text) ? text.size() : 0;
  }
  else if (ctx.bufferSize != 0)
  {
    std::copy_n(text.data(), std::min<uint64_t>(text.size(), ctx.bufferSize - 1), ctx.pBuffer);
    count = endInBuffer(ctx, text.size());
  }
  ctx.bytesWritten += count;
  return count;
}

void setDepth(TAVPrintCtx& ctx, int64_t depth)
{
  ctx.depth = depth;
  if (ctx.pBlock != nullptr)
  {
    return; // which is told the blanks themselves
  }
  if (depth == 0)
  {
    ctx.indentFormat = kNoIndent; // a width of 0 would read as a flag
    return;
  }
  korSnprintf(ctx.indentFormat.data(), ctx.indentFormat.size(), "%s%ds%ss", "%",
              static_cast<int>(depth * kBlanksPerLevel), "%");
}

void line(TAVPrintCtx& ctx, const char* format, ...)
{
  std::array<char, kLongestLine> text;
  va_list arguments;
  va_start(arguments, format);
  const std::string_view formatted = formatLine(text, format, arguments);
  va_end(arguments);
  lineOf(ctx, {formatted});
}

void lineOf(TAVPrintCtx& ctx, std::initializer_list<std::string_view> parts)
{
  std::array<char, kLongestLine> text;
  char* end = text.data();
  for (const std::string_view part : parts)
  {
    const auto room = static_cast<size_t>(text.data() + text.size() - 1 - end);
    end = std::copy_n(part.data(), std::min(part.size(), room), end);
  }
  *end = '\0';
  if (!tav::inside::print::has(ctx, TAV_PRINT_XML))
  {
    depthPrefix(ctx);
  }
  indented(ctx, {text.data(), static_cast<size_t>(end - text.data())});
}

} // namespace tav::inside::print
