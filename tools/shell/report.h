/// @file report.h
/// What the program says on standard error, and with which exit status it ends.
#pragma once

#include <cstdint>
#include <cstdio>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>

#include "tav/inspect/phrases.hpp"
#include "tav/inspect/problem.hpp"
#include "tav/kor.h"
#include "tools/shell/names.h"

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

/// The lines of a problem, without a line end after the last one, as they are printed to a stream: see `shown`.
std::string problemText(const Problem& problem, std::FILE* where = stdout);

/// Prints a problem to standard error.
void report(const Problem& problem);

/// A text, a name of a file for instance, as it is printed to a stream: where that is a terminal, nothing in it steers
/// it; it is written as `get` writes values there.
std::string shown(std::string_view text, std::FILE* where = stdout);

/// Prints `tav: sentence` to standard error.
void report(std::string_view sentence);

/// The exit status when the library cannot go on.
Status statusOf(const Error& error);

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

/// Thrown when nobody reads standard output any more: the program ends quietly.
struct ClosedPipe
{
};

} // namespace tav::tool
