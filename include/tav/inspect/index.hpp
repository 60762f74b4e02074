/// @file index.hpp
/// An index of a long stream, made by several threads.
#pragma once

#include <cstdint>
#include <system_error>

#include "tav/cpp/index.hpp"
#include "tav/inspect/api.hpp"

namespace tav::inspect
{

struct IndexOptions
{
  unsigned threads = 1;   ///< that work on it; the caller's is one of them
  uint64_t partBytes = 0; ///< how long the parts are that threads take; 0: by the length of what is below the node
};

/// The index that `tav::Index(start)` is, with the same answers, damage included: threads walk through parts of what is
/// below the node, each by exact steps, and a part counts if the walk before it ended just where it begins. The reader
/// has to be one of memory or of a mapped file (Access::automatic, Access::mapped); of less than 4 MiB, and of all else
/// that is read, one thread makes it. What is found is looked up through the reader, by one thread at a time.
///
/// @throws std::system_error as tav::Index
TAV_INSPECT_API tav::Index indexOf(const tav::Node& start, const IndexOptions& options = {});
/// With an error the index holds what comes before the damage.
TAV_INSPECT_API tav::Index indexOf(const tav::Node& start, const IndexOptions& options, std::error_code& ec);

} // namespace tav::inspect
