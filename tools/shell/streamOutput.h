/// @file streamOutput.h
/// A stream as a command's result: written with sizes set right as they become known, complete or not at all.
#pragma once

#include <optional>

#include "tav/inspect/patchFile.hpp"
#include "tools/shell/output.h"
#include "tools/shell/temporary.h"

namespace tav::tool
{

/// The OUT of -o, which must be given. Throws Failure when it is missing, or standard output is a terminal.
std::string requireStreamOutput(const Invocation& invocation);

/// What goes to a file is written into it directly; what goes to standard output, a device or a pipe is kept in a
/// temporary file until it is complete.
class StreamOutput
{
public:
  explicit StreamOutput(Output& out);

  inspect::PatchFile& bytes() { return *bytes_; }

  /// Hands everything over; commits the output.
  void finish();

private:
  void copyOut();

  Output& out_;
  std::optional<Temporary> own_{};
  KORHFile file_{}; ///< that of the output, unless there is one of our own
  std::optional<inspect::PatchFile> bytes_{};
};

} // namespace tav::tool
