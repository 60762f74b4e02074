/// @file output.h
/// Where a command's result goes: standard output, or a file that appears under its name only when it is complete.
#pragma once

#include <cstdint>
#include <cstdio>
#include <span>
#include <string>
#include <string_view>

#include "tav/inspect/sink.hpp"
#include "tav/kor.h"
#include "tools/shell/options.h"
#include "tools/shell/report.h"

namespace tav::tool
{

/// An output file is written beside its final name, readable by its owner alone, and moved into place by `commit`:
/// there it has mode and owner of the file that it replaces. Without `commit` it is removed: when the object goes, and
/// when the program is interrupted. Throws Failure when the system refuses, and ClosedPipe when nobody reads standard
/// output any more.
class Output final : public inspect::Sink
{
public:
  /// "-" is standard output. An existing file is replaced only with `force`; where a symbolic link is named, it is the
  /// file behind it. Devices, pipes and the open files that names like /dev/fd/3 stand for are written to, never
  /// replaced.
  explicit Output(const std::string& path, bool force = false);
  ~Output() override;
  Output(const Output&) = delete;
  Output& operator=(const Output&) = delete;

  void write(std::string_view text) override;
  void write(std::span<const uint8_t> bytes);

  /// Hands over what is buffered.
  void flush();

  /// Everything is written: the file gets its name. Nothing may be written afterwards.
  void commit();

  /// Bytes written so far.
  uint64_t written() const { return written_; }

  /// Path of the file while it is written, for a library storage that writes it itself. Empty: standard output, a
  /// device or a pipe. Nothing may be written through this object then, but `commit` moves the file.
  const std::string& temporaryPath() const { return temporary_; }

private:
  void openInPlace();
  void openBeside();
  void writeOut(const char* bytes, size_t count);
  [[noreturn]] void failAtStream(int error);

  std::string path_;
  std::string target_{};    ///< the file that the path leads to
  std::string temporary_{}; ///< while the file has not got its name
  bool force_;
  KORHFile file_{};
  FILE* stream_ = nullptr; ///< standard output, or another file that is open already
  std::string buffer_{};
  uint64_t written_ = 0;
};

/// Writes a text to standard output, where it is a command's whole result: kFine.
Status printText(std::string_view text);

/// Throws what a failed write to standard output stands for, by its errno: ClosedPipe or Failure.
[[noreturn]] void failAtStandardOutput(int error);

/// Throws Failure when an output that the command line names must not be written: a file of this name is there and
/// --force is not given, or it is also a file that the command reads, or another output, by whatever names and links.
/// Called once, before anything is opened for writing.
void checkOutputs(const Invocation& invocation);

/// Whether a path stands for standard output: "-", and names as /dev/stdout.
bool isStandardOutput(const std::string& path);

/// Whether standard output is to be coloured: --color, else on a terminal that knows colours unless NO_COLOR is set.
bool wantsColour(const Invocation& invocation);

} // namespace tav::tool
