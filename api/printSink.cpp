#include <cstdarg>

#include "api/printer.h"

namespace
{

constexpr int64_t kBlanksPerLevel = 3;
constexpr size_t kLongestLine = 512; // the longest names of the dictionary stay well below

uint64_t printToBuffer(char* buffer, uint64_t size, const char* format, va_list arguments)
{
  if (size == 0)
  {
    return 0;
  }
  const int length = vsnprintf(buffer, size, format, arguments);
  const uint64_t count = length < 0 || static_cast<uint64_t>(length) >= size ? size - 1 : static_cast<uint64_t>(length);
  buffer[count] = '\0';
  return count;
}

} // namespace

uint64_t tavPrintf(TAVPrintCtx* ctx, const char* format, ...)
{
  va_list arguments;
  va_start(arguments, format);
  uint64_t count = 0;
  if (ctx->pStream == nullptr && ctx->pBuffer != nullptr)
  {
    count = printToBuffer(ctx->pBuffer, ctx->bufferSize, format, arguments);
  }
  else
  {
    const int length = vfprintf(ctx->pStream != nullptr ? ctx->pStream : stdout, format, arguments);
    count = length < 0 ? 0 : static_cast<uint64_t>(length);
  }
  va_end(arguments);
  ctx->bytesWritten += count;
  return count;
}

namespace tav::print
{

void setDepth(TAVPrintCtx& ctx, int64_t depth)
{
  ctx.depth = depth;
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
  vsnprintf(text.data(), text.size(), format, arguments);
  va_end(arguments);
  if (!has(ctx, TAV_PRINT_XML))
  {
    tavPrintf(&ctx, "%3d|", static_cast<int>(ctx.depth));
  }
  tavPrintf(&ctx, ctx.indentFormat.data(), "", text.data());
}

} // namespace tav::print
