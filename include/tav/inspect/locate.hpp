/// @file locate.hpp
/// Finds a place in a stream, with the groups around it, without walking what lies beside the way.
#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>

#include "tav/inspect/api.hpp"
#include "tav/inspect/path.hpp"
#include "tav/inspect/streamWalk.hpp"
#include "tav/inspect/walker.hpp"

namespace tav::inspect
{

/// Told of every event on the way, the last one included.
using Seen = std::function<void(const Event&)>;

/// Walks on to the piece of the file that the byte at `offset` belongs to. When a node begins there, `event` is its
/// nodeBegin, and nothing is returned; else `event` is the piece, and what is returned names the node before it, for a
/// hint. Throws Error when the offset lies behind the end.
TAV_INSPECT_API std::optional<std::string> findOffset(ByteSource& source, Walker& walker, Event& event,
                                                      uint64_t offset, const Seen& seen);

/// Walks on to the node whose header begins at `offset`; `event` is then its nodeBegin. Throws Error, with the nodes
/// that lie around the offset as a hint, when no node begins there.
TAV_INSPECT_API void goToOffset(ByteSource& source, Walker& walker, Event& event, uint64_t offset,
                                const Seen& seen = {});

/// Walks on to the next node that the path leads to; false when there is none any more. The matcher must have been
/// given every node of the walk so far.
TAV_INSPECT_API bool goToMatch(Walker& walker, PathMatcher& matcher, Event& event, const Seen& seen = {});
TAV_INSPECT_API bool goToMatch(StreamWalk& walk, PathMatcher& matcher, Event& event, const Seen& seen = {});

} // namespace tav::inspect
