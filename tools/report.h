/// @file report.h
/// What the program says on standard error, and with which exit status it ends.
#pragma once

#include <cstdint>
#include <cstdio>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>

#include "tav/kor.h"

namespace tav::tool
{

/// Exit statuses, the same for every command.
enum Status : int
{
  kFine = 0,
  kFindings = 1,  ///< findings, differences, or no match
  kTrouble = 2,   ///< wrong usage, or the system refused something
  kTooDamaged = 3 ///< the stream is too damaged to go on
};

/// One thing that is wrong, as it is printed:
/// `tav: x.tav: 0x1a40 /system/node[3]: ends 12 bytes past its parent (TAV_RC_OUTSIDE_PARENT)`
struct Problem
{
  std::string file;                 ///< empty: none is meant
  std::optional<uint64_t> offset{}; ///< in the file
  std::string path{};               ///< of the node; empty: none
  std::string sentence{};           ///< starts with a lower-case letter, no full stop
  uint32_t code = TAV_RC_OK;        ///< its name is printed when it is not TAV_RC_OK
  std::string hint{};               ///< what to do next; a line of its own
};

/// The lines of a problem, without a line end after the last one, as they are printed to a stream: see `shown`.
std::string problemText(const Problem& problem, std::FILE* where = stdout);

/// Prints a problem to standard error.
void report(const Problem& problem);

/// A text, a name of a file for instance, as it is printed to a stream: where that is a terminal, nothing in it steers
/// it; it is written as `get` writes values there.
std::string shown(std::string_view text, std::FILE* where = stdout);

/// Prints `tav: sentence` to standard error.
void report(std::string_view sentence);

/// Ends a command: thrown wherever it cannot go on, caught in main, which reports the problem and exits.
class Failure : public std::runtime_error
{
public:
  Failure(Status exitStatus, Problem what);
  /// Wrong usage and the like: a sentence, and what to do next.
  explicit Failure(std::string sentence, std::string hint = {});

  Status status;
  Problem problem;
};

/// Ends a command because the system refused something about a file.
[[noreturn]] void failAt(const std::string& file, uint32_t code, std::string hint = {});

/// Thrown when nobody reads standard output any more: the program ends quietly.
struct ClosedPipe
{
};

/// The sentence of a library code, as codes.h has it.
std::string_view codeSentence(uint32_t code);

/// "0x1a40"
std::string hexOffset(uint64_t offset);

/// "1 byte", "12 nodes"
std::string counted(uint64_t count, std::string_view singular);

/// "1.5 MiB", "312 bytes"
std::string byteText(uint64_t bytes);

} // namespace tav::tool
