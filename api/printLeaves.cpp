#include "api/printLeaves.h"

#include "api/printValue.h"
#include "core/step.h"

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
  const core::Level& level;
  const TAVHeader* previous; ///< null: the level's first child is next
  WalkGuard& guard;
  uint64_t count = 0;
  uint64_t lastOffset = 0;
};

/// Steps to the next data elements and prints them. The level's children have 64-bit headers if `wide`, and their
/// bytes are reversed if `swap`.
template<bool wide, bool swap>
void print(OutputBlock& output, int64_t depth, const TAVHandle& handle, Run& run)
{
  core::BlockBytes<core::AnyForm> bytes(handle);
  bytes.form.swap = swap;
  const core::Level level = run.level;
  WalkGuard guard = run.guard;
  bool first = run.previous == nullptr;
  core::Node node = first ? core::Node{} : core::nodeOf(*run.previous);
  core::Place place = bytes.nowhere();
  uint64_t count = 0;
  uint64_t lastOffset = 0;
  while (!tracing() && !output.stopped() && core::step<wide>(bytes, level, first, node, place) == TAV_RC_OK &&
         !node.group())
  {
    const ReadyTag* const tag = isCommon(node.fields) ? output.tags.find(node.fields.elm, depth) : nullptr;
    if (tag == nullptr || !guard.visit(node.place))
    {
      break; // a visit that is refused is refused again
    }
    printLeaf<swap>(output, *tag, node.fields, place.header + core::lengthOfHeader(wide));
    lastOffset = node.place;
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
  using Bytes = core::BlockBytes<core::AnyForm>;
  if (!isOneLine(ctx) || !core::isReadOnly(handle) || !Bytes::canRead(handle))
  {
    return false;
  }
  const Bytes bytes(handle);
  const core::Level level = core::levelBelow(core::nodeOf(parent));
  Run run{level, previous, guard};
  if (level.wide)
  {
    bytes.form.swap ? print<true, true>(*ctx.pBlock, ctx.depth, handle, run)
                    : print<true, false>(*ctx.pBlock, ctx.depth, handle, run);
  }
  else
  {
    bytes.form.swap ? print<false, true>(*ctx.pBlock, ctx.depth, handle, run)
                    : print<false, false>(*ctx.pBlock, ctx.depth, handle, run);
  }
  if (run.count != 0)
  {
    const HeaderFields fields = decodeFields(bytes.base + run.lastOffset, level.wide, bytes.form.swap);
    core::toHeader({run.lastOffset, fields, level.wide}, last);
  }
  return run.count != 0;
}

} // namespace tav::inside::print
