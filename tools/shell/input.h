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

/// Opens a file, "-" for standard input. What is no regular file is copied to a temporary one first, so that everything
/// works on it. Throws Error.
std::unique_ptr<inspect::ByteSource> openSource(const std::string& path, uint64_t ringBytes);

/// The text of a file, "-" for standard input, from front to back. Throws Error.
std::unique_ptr<inspect::TextSource> openText(const std::string& path);

} // namespace tav::tool
