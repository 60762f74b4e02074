#include "api/printLeaves.h"

#include "api/nodeStep.h"
#include "api/printValue.h"

namespace tav::inside::print
{
namespace
{

constexpr size_t kLongestText = 1000;

/// Whether a data element is a line of its own: XML with data and nothing else.
bool isOneLine(const TAVPrintCtx& ctx)
{
  constexpr uint64_t all = TAV_PRINT_XML | TAV_PRINT_DATA | TAV_PRINT_HEADERS | TAV_PRINT_DESCRIPTORS | TAV_PRINT_BARE;
  return (ctx.options & all) == (TAV_PRINT_XML | TAV_PRINT_DATA);
}

/// Whether a value is printed here: a text, or a short value of its type's size.
bool isCommon(const HeaderFields& fields)
{
  const uint8_t valueSize = typeInfo(fields.type).valueSize;
  return valueSize != 0 ? fields.size == valueSize
                        : fields.type == TAV_TYPE_ASCII_STRING && fields.size != 0 && fields.size <= kLongestText;
}

char* writeText(char* to, const uint8_t* data, uint64_t size)
{
  const auto* text = reinterpret_cast<const char*>(data);
  const uint64_t length = lengthOfText(text, size);
  std::memcpy(to, text, length);
  return to + length;
}

/// Prints a data element with a common value.
template<bool swap>
[[gnu::always_inline]] inline void printLeaf(OutputBlock& block, const ReadyTag& tag, const HeaderFields& fields,
                                             const uint8_t* data)
{
  constexpr size_t room = ReadyTag::kLongestOpening + kLongestShort + ReadyTag::kLongestClosing;
  const bool isText = fields.type == TAV_TYPE_ASCII_STRING;
  char* const line = block.reserve(isText ? room + kLongestText : room);
  std::memcpy(line, tag.opening.data(), tag.opening.size());
  char* const from = line + tag.openingLength;
  char* const to = isText ? writeText(from, data, fields.size)
                          : writeShort(from, fields.type, Value(fields.type, data, fields.size, swap));
  std::memcpy(to, tag.closing.data(), tag.closing.size());
  block.endNodeOfThree(tag.openingLength, static_cast<size_t>(to - from), tag.closingLength);
}

/// Where a run goes on, and where it has come to.
struct Run
{
  const Block& bytes;
  const Level& level;
  const TAVHeader* previous; ///< null: the level's first child is next
  WalkGuard& guard;
  uint64_t count = 0;
  uint64_t lastOffset = 0;
};

/// Steps to the next data elements and prints them. The level's children have 64-bit headers if `wide`, and their
/// bytes are reversed if `swap`.
template<bool wide, bool swap>
void print(OutputBlock& output, int64_t depth, Run& run)
{
  const Block bytes{run.bytes.base, run.bytes.size, swap, run.bytes.alignAll};
  const Level level = run.level;
  WalkGuard guard = run.guard;
  bool first = run.previous == nullptr;
  Node node = first ? Node{} : nodeOf(*run.previous);
  uint64_t count = 0;
  uint64_t lastOffset = 0;
  while (!tracing() && !output.stopped() && stepInBlock<wide>(bytes, level, first, node) == TAV_RC_OK && !node.group())
  {
    const ReadyTag* const tag = isCommon(node.fields) ? output.tags.find(node.fields.elm, depth) : nullptr;
    if (tag == nullptr || !guard.visit(node.offset))
    {
      break; // a visit that is refused is refused again
    }
    printLeaf<swap>(output, *tag, node.fields, bytes.base + node.offset + node.length());
    lastOffset = node.offset;
    ++count;
    first = false;
  }
  run.guard = guard;
  run.count = count;
  run.lastOffset = lastOffset;
}

} // namespace

bool printLeaves(TAVPrintCtx& ctx, const TAVHandle& handle, const TAVHeader& parent, const TAVHeader* previous,
                 WalkGuard& guard, TAVHeader& last)
{
  Block bytes{};
  if (!isOneLine(ctx) || !isReadOnly(handle) || !blockOf(handle, bytes))
  {
    return false;
  }
  const Level level = levelBelow(nodeOf(parent));
  Run run{bytes, level, previous, guard};
  if (level.wide)
  {
    bytes.swap ? print<true, true>(*ctx.pBlock, ctx.depth, run) : print<true, false>(*ctx.pBlock, ctx.depth, run);
  }
  else
  {
    bytes.swap ? print<false, true>(*ctx.pBlock, ctx.depth, run) : print<false, false>(*ctx.pBlock, ctx.depth, run);
  }
  if (run.count != 0)
  {
    const HeaderFields fields = decodeFields(bytes.base + run.lastOffset, level.wide, bytes.swap);
    toHeader({run.lastOffset, fields, level.wide}, last);
  }
  return run.count != 0;
}

} // namespace tav::inside::print
