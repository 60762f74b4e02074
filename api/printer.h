/// The parts of the printer: the sink, one value, one node.
#pragma once

#include <array>
#include <cstdint>
#include <initializer_list>
#include <string_view>

#include "api/digits.h"
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

/// Formats one piece of output to the stream, the buffer or standard output and returns its characters. In a buffer
/// every piece begins at the first byte, so that the last one remains.
uint64_t tavPrintf(TAVPrintCtx* ctx, const char* format, ...) KOR_PRINTF_FORMAT(2, 3);

/// Prints a node's data. @retval TAV_RC_OUTSIDE_PARENT a size that does not fit the type
/// @retval TAV_RC_NOT_SUPPORTED a type without a printed form
uint32_t tavPrintValue(TAVPrintCtx* ctx, TAVHeaderData* node);

/// Prints the opening, the body and the closing of a node, as asked; `*count` receives the characters produced.
uint32_t tavPrintNode(TAVPrintCtx* ctx, TAVHeaderData* node, uint8_t open, uint8_t body, uint8_t close,
                      uint64_t* count);

namespace tav::inside::print
{

inline bool has(const TAVPrintCtx& ctx, uint64_t option)
{
  return (ctx.options & option) != 0;
}

/// The stream that a context without a buffer prints to.
FILE* streamOf(const TAVPrintCtx& ctx);

/// Gives a stream one piece: blanks, then a text. Returns the characters that count, none when it refuses any.
uint64_t putInStream(FILE* stream, size_t blanks, std::string_view text);

/// The sink: takes one piece to where the context's output goes, the block, the buffer or the stream. Returns the
/// characters that count.
uint64_t put(TAVPrintCtx& ctx, size_t blanks, std::string_view text);

/// The sink's other verb: a line of parts that stand side by side, indented by the depth; in the text form behind it.
void line(TAVPrintCtx& ctx, std::initializer_list<std::string_view> parts);

/// The lines that show a header.
void header(TAVPrintCtx& ctx, const TAVHeader& header);

/// The lines that show where a node's data lie.
void descriptor(TAVPrintCtx& ctx, const TAVHeaderData& node);

/// A piece of output that is ready.
inline uint64_t piece(TAVPrintCtx& ctx, std::string_view text)
{
  return put(ctx, 0, text);
}

inline constexpr size_t kLongestShort = 64;

/// A short piece that `write` puts at the place it is given, of kLongestShort characters at most; it returns the
/// piece's end.
template<class Write>
void shortPiece(TAVPrintCtx& ctx, const Write& write)
{
  std::array<char, kLongestShort> place;
  piece(ctx, {place.data(), static_cast<size_t>(write(place.data()) - place.data())});
}

} // namespace tav::inside::print
