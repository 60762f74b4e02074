/// @file build_file.h
/// A file that is written from front to back, while bytes that were written before can still be set right.
#pragma once

#include <cstdint>
#include <span>
#include <string>
#include <string_view>

#include "tav/kor.h"
#include "tools/shell/output.h"

namespace tav::tool
{

/// What goes to a file is written into it directly; what goes to standard output, a device or a pipe is kept in a
/// temporary file until it is complete.
class PatchFile
{
public:
  /// A temporary file that is gone with the object.
  PatchFile();
  explicit PatchFile(Output& out);
  ~PatchFile();
  PatchFile(const PatchFile&) = delete;
  PatchFile& operator=(const PatchFile&) = delete;

  void append(std::span<const uint8_t> bytes);
  void append(std::string_view bytes);
  void appendZeros(uint64_t count);

  /// Replaces bytes that were appended.
  void patch(uint64_t offset, std::span<const uint8_t> bytes);

  /// Copies bytes that were appended; fewer than asked only at the end.
  size_t read(uint64_t offset, std::span<uint8_t> to);

  /// Bytes appended so far.
  uint64_t length() const { return flushed_ + buffer_.size(); }

  /// Hands everything over; commits the output.
  void finish();

private:
  void flush();
  void writeAt(uint64_t offset, const void* bytes, uint64_t count);
  void copyOut();
  void openOwn();

  Output* out_ = nullptr;
  bool own_ = false;        ///< the file is a temporary one, not that of the output
  std::string temporary_{}; ///< to be removed
  KORHFile file_{};
  std::string buffer_{};
  uint64_t flushed_ = 0; ///< bytes in the file
  uint64_t place_ = 0;   ///< where the file is positioned
};

} // namespace tav::tool
