// What a checker says of bytes that are no node.
#include <algorithm>
#include <array>
#include <utility>

#include "inspect/check/sentences.h"
#include "inspect/walk/prober.h"
#include "inspect/walk/sizeSuits.h"
#include "tav/inspect/checker.hpp"
#include "tav/inspect/form.hpp"

namespace tav::inspect
{

using namespace tav::layout;

namespace
{

constexpr uint64_t kMostZeros = uint64_t{2} * 1024 * 1024; ///< two of the largest pages that a file is written in

} // namespace

bool Checker::checkCutHeader()
{
  const Group& group = groups_.back();
  const uint64_t end = event_.offset + event_.length;
  const uint64_t needed = group.wide ? kHeaderSize64 : kHeaderSize32;
  if (event_.code != TAV_RC_NO_MEMORY)
  {
    return false;
  }
  if (groups_.size() > 1 && end < source_.size())
  {
    const Event here = std::exchange(event_, Event{});
    event_.node = group.node;
    event_.depth = group.node.depth;
    found(RuleId::groupSize, group.node.offset(), group.node.headerLength(),
          "its children end " + counted(here.length, "byte") + " before it does");
    event_ = here;
    return true;
  }
  found(RuleId::headerCut, event_.offset, event_.length,
        "the file ends after " + std::to_string(event_.length) + " of the " + std::to_string(needed) +
            " bytes of a header");
  return true;
}

void Checker::checkDamage()
{
  const Group& group = groups_.back();
  if (groups_.size() == 1 && rootEnded_)
  {
    const auto other = otherStreamAt(source_, form_, event_.offset);
    found(RuleId::behindStream, event_.offset, event_.length,
          counted(event_.length, "byte") + " behind the stream" +
              (other ? ": " + otherStreamText(*other) : " that are no node"),
          other.has_value());
    return;
  }
  if (checkCutHeader())
  {
    return;
  }
  const uint64_t limit = groups_.size() > 1 ? group.node.limit : source_.size();
  std::array<uint8_t, kHeaderSize64> bytes{};
  const size_t length = group.wide ? kHeaderSize64 : kHeaderSize32;
  TAVHeader header{};
  if (source_.read(event_.offset, std::span(bytes).first(length)) == length)
  {
    decodeHeader(bytes.data(), group.wide, form_.swapped, header);
  }
  const uint64_t claim = addSaturated(event_.offset + length, sizeOf(header));
  const bool named = sizeOf(header) + typeOf(header) != 0 && Prober::isNamed(elmOf(header));
  const bool known = isGroup(header) || isDataType(header);
  if (named && known && !isSizeUnknown(header) && claim > limit)
  {
    const bool cut =
        event_.offset + event_.length == source_.size() && group.cutClaim != kNoOffset && claim <= group.cutClaim;
    if (!cut)
    {
      const bool file = limit == source_.size();
      found(file ? RuleId::pastFile : RuleId::pastParent, event_.offset, event_.length,
            endsPast(claim - limit, file ? "the end of the file" : "its parent"));
    }
  }
  else if (named && !known)
  {
    found(RuleId::typeUnknown, event_.offset, event_.length, "type " + std::to_string(typeOf(header)) + " is unknown");
  }
  else if (named && isDataType(header) && !sizeSuits(typeOf(header), sizeOf(header)))
  {
    found(RuleId::sizeType, event_.offset, event_.length, sizeSentence(header));
  }
  else
  {
    found(RuleId::damaged, event_.offset, event_.length, counted(event_.length, "byte") + " damaged: " + event_.reason);
  }
}

void Checker::checkZeros()
{
  if (event_.offset + event_.length < source_.size())
  {
    found(RuleId::zerosBetween, event_.offset, event_.length,
          counted(event_.length, "byte") + " of zeros between streams");
  }
  else if (event_.length > kMostZeros)
  {
    found(RuleId::zerosLong, event_.offset, event_.length,
          byteText(event_.length) + " of zeros behind the stream; a writer leaves 2 MiB at most");
  }
}

} // namespace tav::inspect
