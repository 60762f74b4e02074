/// Printing runs of data elements.
#pragma once

#include "api/printer.h"
#include "api/walkGuard.h"

namespace tav::inside::print
{

/// Prints into the context's block the data elements that follow `*previous` in a group, or that begin it when
/// `previous` is null: for as long as each is one line of XML with a value of a common type, over direct memory, and
/// nothing is traced. What comes then, the end of the group and every failure among it, is left to the steps that take
/// anything.
///
/// @param[out] last  header of the last element printed
/// @return whether any was printed
bool printLeaves(TAVPrintCtx& ctx, const TAVHandle& handle, const TAVHeader& parent, const TAVHeader* previous,
                 WalkGuard& guard, TAVHeader& last);

} // namespace tav::inside::print
