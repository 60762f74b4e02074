/// @file scratch.hpp
/// A file for bytes that are needed for a while.
#pragma once

#include <functional>
#include <memory>
#include <string>

#include "tav/inspect/api.hpp"
#include "tav/kor.h"

namespace tav::inspect
{

/// An empty file that is open for reading and writing, and gone with the object.
class TAV_INSPECT_API Scratch
{
public:
  virtual ~Scratch() = default;
  virtual KORHFile& file() = 0;
};

/// How a piece of work gets its scratch files. Throws Error when there can be none.
using ScratchMaker = std::function<std::unique_ptr<Scratch>()>;

/// Makes a file in the folder for temporary files that only its owner can read. Where an open file can be removed it
/// has no name any more when this returns.
TAV_INSPECT_API std::unique_ptr<Scratch> makeScratch();

/// Opens a new file in the folder for temporary files and returns its path, UTF-8. `number` begins its name: the names
/// are tried until nobody else has one. Throws Error.
TAV_INSPECT_API std::string openTemporary(KORHFile& file, uint64_t number);

} // namespace tav::inspect
