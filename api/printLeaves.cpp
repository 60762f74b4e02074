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
  const size_t length = lengthOfText(text, static_cast<size_t>(size));
  std::memcpy(to, text, length);
  return to + length;
}

/// Prints a data element with a common value.
template<bool swap>
[[gnu::always_inline]] inline void printLeaf(OutputBlock& block, const ReadyTag& tag, const HeaderFields& fields,
                                             const uint8_t* data)
{
  constexpr size_t room = sizeof tag.text + kLongestShort;
  const bool isText = fields.type == TAV_TYPE_ASCII_STRING;
  char* const line = block.reserve(isText ? room + kLongestText : room);
  std::memcpy(line, tag.text.data(), ReadyTag::kLongestOpening);
  char* const from = line + tag.openingLength;
  char* const to = isText ? writeText(from, data, fields.size)
                          : writeShort(from, fields.type, data, swap);
  std::memcpy(to, tag.text.data() + tag.openingLength, ReadyTag::kLongestClosing);
  block.endPieces({tag.openingLength, static_cast<size_t>(to - from), tag.closingLength});
  block.endNode();
}

/// Steps to the next data elements and prints them. The level's children have 64-bit headers if `wide`, and their
/// bytes are reversed if `swap`.
template<bool wide, bool swap>
bool print(TAVPrintCtx& ctx, const TAVHandle& handle, const core::Level& below,
           const TAVHeader* previous, WalkGuard& walk, TAVHeader& last)
{
  OutputBlock& block = *ctx.pBlock;
  core::BlockBytes<core::AnyForm> bytes(handle);
  bytes.form.swap = swap;
  const int64_t depth = ctx.depth;
  const core::Level level = below;
  WalkGuard guard = walk;
  bool first = previous == nullptr;
  core::Node node = first ? core::Node{} : core::nodeOf(*previous);
  core::Place place = bytes.nowhere();
  const uint8_t* printed = nullptr;
  while (!tracing() && !block.stopped() && core::step<wide>(bytes, level, first, node, place) == TAV_RC_OK &&
         !node.group())
  {
    const ReadyTag* const tag = isCommon(node.fields) ? findTag(block.tags, node.fields.elm, depth) : nullptr;
    if (tag == nullptr || !guard.visit(node.place))
    {
      break; // a visit that is refused is refused again
    }
    printLeaf<swap>(block, *tag, node.fields, place.header + core::lengthOfHeader(wide));
    printed = place.header;
    first = false;
  }
  walk = guard;
  if (printed != nullptr)
  {
    const auto offset = static_cast<uint64_t>(printed - bytes.base);
    core::toHeader({offset, decodeFields(printed, wide, swap), wide}, last);
  }
  return printed != nullptr;
}

} // namespace

bool printLeaves(TAVPrintCtx& ctx, const TAVHandle& handle, const TAVHeader& parent, const TAVHeader* previous,
                 WalkGuard& guard, TAVHeader& last)
{
  if (ctx.pBlock == nullptr || !isOneLine(ctx) || !core::isReadOnly(handle) ||
      !core::BlockBytes<core::AnyForm>::canRead(handle))
  {
    return false;
  }
  const core::Level level = core::levelBelow(core::nodeOf(parent));
  const bool swap = handle.swapBytes != 0;
  const auto run = level.wide ? (swap ? print<true, true> : print<true, false>)
                              : (swap ? print<false, true> : print<false, false>);
  return run(ctx, handle, level, previous, guard, last);
}

} // namespace tav::inside::print
