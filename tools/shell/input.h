/// @file input.h
/// What the command line names as input.
#pragma once

#include <cstdint>
#include <memory>
#include <string>

#include "tav/inspect/source.hpp"
#include "tav/inspect/textSource.hpp"

namespace tav::tool
{

inline constexpr uint64_t kDefaultSpool = uint64_t{16} * 1024 * 1024 * 1024;

/// How much may be taken for a file's bytes.
struct InputLimits
{
  uint64_t ring = inspect::kDefaultRing; ///< of memory, at least two pages
  uint64_t spool = kDefaultSpool;        ///< of a temporary file for a pipe; 0 is no limit
};

/// Opens a file, "-" for standard input. Standard input, pipes and files that tell a wrong size, as those of /proc do,
/// are copied to a temporary file first, so that everything works on them. What is before `from` is left out, and
/// all offsets count from there. Throws Error, also because a limit is reached.
std::unique_ptr<inspect::ByteSource> openSource(const std::string& path, const InputLimits& limits, uint64_t from = 0);

/// The text of a file, "-" for standard input, from front to back. Throws Error.
std::unique_ptr<inspect::TextSource> openText(const std::string& path);

} // namespace tav::tool
