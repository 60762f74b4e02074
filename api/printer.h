/// The printer: one sink with two verbs, a piece and a line, and what is printed through it.
#pragma once

#include <cstdint>
#include <initializer_list>
#include <string_view>

#include "api/printBlock.h"
#include "tav/tav.h"

/// One print call: where the output goes, how far it came, how deep it is.
struct TAVPrintCtx
{
  char* pBuffer;
  uint64_t bufferSize;
  FILE* pStream;
  uint64_t bytesWritten;
  int64_t depth;
  uint8_t swapBytes;
  uint64_t options;
  uint8_t attributeForm; ///< the node in hand is printed as an opening tag with attributes
  uint8_t further;       ///< not used

  tav::inside::print::OutputBlock* pBlock = nullptr; ///< collects for a stream; null: every piece goes out at once
};

/// Formats one piece of output and returns its characters that count.
uint64_t tavPrintf(TAVPrintCtx* ctx, const char* format, ...) KOR_PRINTF_FORMAT(2, 3);

/// Prints a node's data. @retval TAV_RC_OUTSIDE_PARENT a size that does not fit the type
/// @retval TAV_RC_NOT_SUPPORTED a type without a printed form
uint32_t tavPrintValue(TAVPrintCtx* ctx, TAVHeaderData* node);

/// Prints the opening, the body and the closing of a node, as asked; `*count` receives the characters produced.
uint32_t tavPrintNode(TAVPrintCtx* ctx, TAVHeaderData* node, uint8_t open, uint8_t body, uint8_t close,
                      uint64_t* count);

namespace tav::inside::print
{

/// Texts that stand side by side in one piece. They are names, numbers and marks: short together.
using Parts = std::initializer_list<std::string_view>;

inline bool has(const TAVPrintCtx& ctx, uint64_t option)
{
  return (ctx.options & option) != 0;
}

/// Whether the output goes to the caller's buffer. Every piece begins at its first byte, so that the last one remains.
inline bool isToBuffer(const TAVPrintCtx& ctx)
{
  return ctx.pStream == nullptr && ctx.pBuffer != nullptr;
}

/// The stream that a context prints to otherwise.
inline FILE* streamOf(const TAVPrintCtx& ctx)
{
  return ctx.pStream != nullptr ? ctx.pStream : stdout;
}

/// Puts a piece, blanks and then a text, to where the context's output goes: the block, the buffer or the stream.
/// Returns the characters that count, of a stream none when it refuses any.
uint64_t put(TAVPrintCtx& ctx, size_t blanks, std::string_view text);

/// A piece of parts.
void piece(TAVPrintCtx& ctx, Parts parts, size_t blanks = 0);

/// A line of parts, indented by the depth; in the text form behind it.
void line(TAVPrintCtx& ctx, Parts parts);

/// The lines that show a header.
void header(TAVPrintCtx& ctx, const TAVHeader& header);

/// The lines that show where a node's data lie.
void descriptor(TAVPrintCtx& ctx, const TAVHeaderData& node);

} // namespace tav::inside::print
