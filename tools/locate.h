/// @file locate.h
/// Finds a place in a stream, with the groups around it, without walking what lies beside the way.
#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>

#include "tools/path.h"
#include "tools/walker.h"

namespace tav::tool
{

/// Told of every event on the way, the last one included.
using Seen = std::function<void(const Event&)>;

/// Walks on to the piece of the file that the byte at `offset` belongs to. When a node begins there, `event` is its
/// nodeBegin, and nothing is returned; else `event` is the piece, and what is returned names the node before it, for a
/// hint. Throws Failure when the offset lies behind the end.
std::optional<std::string> findOffset(ByteSource& source, Walker& walker, Event& event, uint64_t offset,
                                      const Seen& seen);

/// Walks on to the node whose header begins at `offset`; `event` is then its nodeBegin. Throws Failure, with the nodes
/// that lie around the offset as a hint, when no node begins there.
void goToOffset(ByteSource& source, Walker& walker, Event& event, uint64_t offset, const Seen& seen);

/// Walks on to the next node that the path leads to; false when there is none any more. The matcher must have been
/// given every node of the walk so far.
bool goToMatch(Walker& walker, PathMatcher& matcher, Event& event, const Seen& seen);

} // namespace tav::tool
