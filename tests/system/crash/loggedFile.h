/// What the library asks of the system for one file: its writes, resizes and syncs. They are noted by functions that
/// stand in front of the system's.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

namespace crash
{

enum class Kind : uint8_t
{
  write,
  resize,
  sync,
  syncFolder
};

struct Operation
{
  Kind kind;
  uint64_t offset; ///< of a write; of a resize: the size
  std::vector<uint8_t> bytes;
};

/// Begins a new log, of the file at a path.
void watch(const std::string& path);

/// The next sync of that file fails with EIO; for the ones behind it the system says that all is well.
void failNextSync();

/// What has been done since.
const std::vector<Operation>& log();

} // namespace crash
