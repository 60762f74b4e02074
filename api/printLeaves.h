/// Printing runs of data elements.
#pragma once

#include "api/printer.h"
#include "api/walkGuard.h"

namespace tav::inside::print
{

/// Opening, with its indentation, and closing of a data element that stands on one line, ready to be copied.
struct ReadyTag
{
  static constexpr size_t kLongestOpening = 96;
  static constexpr size_t kLongestClosing = 64;

  uint32_t key = ~uint32_t{0}; ///< depth and element id
  uint32_t openingLength;
  uint32_t closingLength;
  std::array<char, kLongestOpening + kLongestClosing> text; ///< both, one behind the other
};

/// The tags that a walk has seen last. Siblings have ids close to each other, so the id's low bits choose the place.
using ReadyTags = std::array<ReadyTag, 64>;

/// Prints into the context's block the data elements that follow `*previous` in a group, or that begin it when
/// `previous` is null: for as long as each is one line of XML with a value of a common type, over direct memory, and
/// nothing is traced. What comes then, the end of the group and every failure among it, is left to the steps that take
/// anything.
///
/// @param[out] last  header of the last element printed
/// @return whether any was printed
bool printLeaves(TAVPrintCtx& ctx, ReadyTags& tags, const TAVHandle& handle, const TAVHeader& parent,
                 const TAVHeader* previous, WalkGuard& guard, TAVHeader& last);

} // namespace tav::inside::print
