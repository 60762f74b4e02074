/// @file recover.hpp
/// A sound stream of what is whole in a damaged one.
#pragma once

#include <cstdint>
#include <functional>
#include <string>

#include "tav/inspect/api.hpp"
#include "tav/inspect/node.hpp"
#include "tav/inspect/patchFile.hpp"
#include "tav/inspect/source.hpp"

namespace tav::inspect
{

/// Bytes of the file that did not come back.
struct Loss
{
  uint64_t offset = 0;
  uint64_t length = 0;
  std::string reason{};
};

/// Where every byte of the file went, and what was done.
struct RecoveryTotals
{
  uint64_t kept = 0; ///< of nodes that came back, their paddings, pairs and end elements, and zeros behind the stream
  uint64_t lost = 0;
  uint64_t unread = 0; ///< behind the place where searching was given up
  uint64_t zeros = 0;  ///< of the kept: behind the stream
  uint64_t nodes = 0;  ///< that came back, end elements not counted
  uint64_t losses = 0; ///< runs of lost bytes
  uint64_t closed = 0; ///< groups that were open or whose size was wrong
  uint64_t made = 0;   ///< groups made for what has lost its own
  uint64_t pairs = 0;  ///< pairs and end elements that were missing or damaged
};

struct RecoverOptions
{
  uint64_t search = kNoOffset;              ///< bytes that may be searched for nodes; the rest is unread
  std::function<void(const Loss&)> lost{};  ///< is told of each run of lost bytes, in their order
  std::function<void(uint64_t)> progress{}; ///< is told by offset how far the work is
};

/// Appends a sound stream of all nodes that are whole: groups are closed, sizes, paddings and pairs made anew. A group
/// whose header is lost comes back by its end element, as `docRoot`; so do nodes that have lost all groups around them.
/// Memory grows with the depth, and with the groups whose headers are lost. Throws Error.
TAV_INSPECT_API RecoveryTotals recover(ByteSource& source, const Form& form, PatchFile& out,
                                       const RecoverOptions& options = {});

} // namespace tav::inspect
