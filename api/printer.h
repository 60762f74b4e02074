/// The parts of the printer: the sink, one value, one node.
#pragma once

#include <array>
#include <cstdint>

#include "tav/tav.h"

/// One print call: where the output goes, how far it came, how deep it is.
struct TAVPrintCtx
{
  char* pBuffer;
  uint64_t bufferSize;
  FILE* pStream;
  uint64_t bytesWritten;
  std::array<char, 10> indentFormat; ///< applied to an empty string and a line
  int64_t depth;
  uint8_t swapBytes;
  uint64_t options;
  uint8_t attributeForm; ///< the node in hand is printed as an opening tag with attributes
  uint8_t further;       ///< not used
};

/// Formats one piece of output to the stream, the buffer or standard output and returns its characters. In a buffer
/// every piece begins at the first byte, so that the last one remains.
uint64_t tavPrintf(TAVPrintCtx* ctx, const char* format, ...) KOR_PRINTF_FORMAT(2, 3);

/// Prints a node's data. @retval TAV_RC_OUTSIDE_PARENT a size that does not fit the type
/// @retval TAV_RC_NOT_SUPPORTED a type without a printed form
uint32_t tavPrintValue(TAVPrintCtx* ctx, TAVHeaderData* node);

/// Prints the opening, the body and the closing of a node, as asked; `*count` receives the characters produced.
uint32_t tavPrintNode(TAVPrintCtx* ctx, TAVHeaderData* node, uint8_t open, uint8_t body, uint8_t close,
                      uint64_t* count);

namespace tav::print
{

inline bool has(const TAVPrintCtx& ctx, uint64_t option)
{
  return (ctx.options & option) != 0;
}

inline constexpr std::array<char, 10> kNoIndent{'%', 's', '%', 's'};

/// Sets the depth, and the indentation of three blanks a level.
void setDepth(TAVPrintCtx& ctx, int64_t depth);

/// One line of text, indented; in the text form behind the depth.
void line(TAVPrintCtx& ctx, const char* format, ...) KOR_PRINTF_FORMAT(2, 3);

} // namespace tav::print
