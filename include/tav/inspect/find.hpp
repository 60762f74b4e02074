/// @file find.hpp
/// Finds the nodes that several paths lead to, by several threads.
#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <span>
#include <string>
#include <vector>

#include "tav/inspect/api.hpp"
#include "tav/inspect/damageWatch.hpp"
#include "tav/inspect/form.hpp"
#include "tav/inspect/path.hpp"
#include "tav/inspect/source.hpp"
#include "tav/inspect/walker.hpp"

namespace tav::inspect
{

/// A node that one of the paths leads to. All of it is valid during the call.
struct PathMatch
{
  size_t path; ///< which of them
  const Node& node;
  ByteSource& source; ///< to read it from while it is told; dictionaries go with it
  const Form& form;
  std::function<std::string(PathStyle)> text; ///< a path that leads back to the node, as Walker::path
};

/// What is done with what paths lead to.
struct PathWork
{
  std::function<void(const PathMatch&)> found{};
  std::function<void(const PassedOver&)> passed{};
  std::function<void(uint64_t)> progress{}; ///< all before this offset was walked
  bool all = true;                          ///< false: for each path the first node, and no more when all have one
  unsigned threads = 1;                     ///< that work on it; the caller's is one of them
  uint64_t partBytes = 0;                   ///< how long the parts are that threads take; 0: by the file's size
};

/// Finds the nodes that paths lead to, in one walk, through damage as a Walker goes. All callbacks are called by the
/// caller's thread, in the order of the stream, for one node in the order of the paths; the same for any number of
/// threads. Groups below which there can be none are skipped by their sizes. Returns how many each path led to.
///
/// Threads share a file inside of its roots where no path looks ahead (PathMatcher::looksAhead), else root by root
/// where what a path leads to in one root does not depend on the others, as that of `/system[2]` does. Else, for the
/// first nodes of several paths, in a file of less than 4 MiB, and where nodes are so many that handing them over is
/// most of the work, one thread does it all.
///
/// @throws Error where the file cannot be read, and what the callbacks throw
TAV_INSPECT_API std::vector<uint64_t> findPaths(ByteSource& source, const Form& form, std::span<const Path> paths,
                                                const PathWork& work);

} // namespace tav::inspect
