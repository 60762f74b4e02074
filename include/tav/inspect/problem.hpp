/// @file problem.hpp
/// What is wrong, where, and what to do about it.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "tav/cpp/error.hpp"
#include "tav/inspect/api.hpp"

namespace tav::inspect
{

/// What helps with a problem. A program says it in its own words: how it is asked for what helps is its business.
enum class Remedy : uint8_t
{
  none,
  readWide,    ///< reading the file as a stream with a 64-bit root header
  makeWide,    ///< making a stream with a 64-bit root header
  beginBefore, ///< beginning to read at a lower offset
  showBytes    ///< looking at the bytes at the problem's offset
};

/// One thing that is wrong. As a line: `x.tav: 0x1a40 /system/node[3]: ends 12 bytes past its parent
/// (TAV_RC_OUTSIDE_PARENT)`
struct Problem
{
  std::string file{};               ///< empty: none is meant
  std::optional<uint64_t> offset{}; ///< in the file
  std::string path{};               ///< of the node; empty: none
  std::string sentence{};           ///< starts with a lower-case letter, no full stop
  uint32_t code = TAV_RC_OK;        ///< TAV_RC_OK: no code says it
  std::string hint{};               ///< what to do next; a line of its own
  Remedy remedy = Remedy::none;     ///< and what helps
};

/// The problem as one line, without its hint.
TAV_INSPECT_API std::string problemLine(const Problem& problem);

/// Why a piece of work cannot go on.
enum class Trouble : uint8_t
{
  refused, ///< by the system, or what was asked for makes no sense
  notFound ///< what was asked for is not there
};

/// Thrown where work cannot go on. `code()` is the problem's, or TAV_RC_BAD_PARAM where no code says it.
class TAV_INSPECT_API Error : public std::system_error
{
public:
  explicit Error(Problem what, Trouble kind = Trouble::refused);
  /// A sentence, and what to do next.
  explicit Error(std::string sentence, std::string hint = {});

  const Problem& problem() const { return problem_; }
  Trouble trouble() const { return trouble_; }

private:
  Problem problem_;
  Trouble trouble_;
};

/// Throws an Error because the system refused something about a file.
[[noreturn]] TAV_INSPECT_API void failAt(const std::string& file, uint32_t code, std::string hint = {});

} // namespace tav::inspect
