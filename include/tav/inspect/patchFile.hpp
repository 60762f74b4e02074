/// @file patchFile.hpp
/// A file that is written from front to back, while bytes that were written before can still be set right.
#pragma once

#include <cstdint>
#include <span>
#include <string>
#include <string_view>

#include "tav/inspect/api.hpp"
#include "tav/kor.h"

namespace tav::inspect
{

/// Bytes that are appended and, when more is known, replaced. In memory is what was appended last, 256 KiB at most.
/// Throws Error when the system refuses. Used by one thread.
class PatchFile
{
public:
  /// Over an empty file that is open for reading and writing, which outlives this object.
  explicit PatchFile(KORHFile& file)
      : file_(file) {}
  PatchFile(const PatchFile&) = delete;
  PatchFile& operator=(const PatchFile&) = delete;

  TAV_INSPECT_API void append(std::span<const uint8_t> bytes);
  TAV_INSPECT_API void append(std::string_view bytes);
  TAV_INSPECT_API void appendZeros(uint64_t count);

  /// Replaces bytes that were appended.
  TAV_INSPECT_API void patch(uint64_t offset, std::span<const uint8_t> bytes);

  /// Copies bytes that were appended; fewer than asked only at the end.
  TAV_INSPECT_API size_t read(uint64_t offset, std::span<uint8_t> to);

  /// Bytes appended so far.
  uint64_t length() const { return flushed_ + buffer_.size(); }

  /// Hands everything to the system. Without it, bytes that were appended last are lost with the object.
  TAV_INSPECT_API void flush();

private:
  void seek(uint64_t offset);
  void writeAt(uint64_t offset, const void* bytes, uint64_t count);

  KORHFile& file_;
  std::string buffer_{};
  uint64_t flushed_ = 0; ///< bytes in the file
  uint64_t place_ = 0;   ///< where the file is positioned
};

} // namespace tav::inspect
