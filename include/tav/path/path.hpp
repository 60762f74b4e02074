/// @file path.hpp
/// Paths: nodes by the names on the way, as in the abbreviated syntax of XPath 1.0.
///
/// @code{.unparsed}
///   /a/b   a/b            from the roots; from the node at hand
///   //b    a//b           any number of levels below
///   a  *  *_time  #60103  by tag, enum name or constant; any; by a pattern of the tag; by id
///   ..  .                 the parent; the node itself
///   [2]  [last()-1]  [position() <= 3]  [-1]
///                         the place among what the step finds under the same parent; -1 is the last
///   [b]  [b='x']  [b > 5]  [not(b)]  and  or
///                         by what is in it; numbers compare exactly
///   [@type='Uint64']  [.='x']  [contains(b,'x')]  [starts-with(b,'x')]
///                         by what the XML form shows as attributes, by its value, by parts of texts
///   [@0x1a40]             the one at this offset
///   a | b                 either
///   **                    any number of levels; at the end all that is below
///   /                     the roots
/// @endcode
///
/// Elements that only end a group are found by their names alone.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>
#include <system_error>
#include <utility>

#include "tav/cpp/error.hpp"
#include "tav/path/compiled.hpp"
#include "tav/path/parser.hpp"

namespace tav
{

/// A path, read once and usable for any number of searches, by any number of threads at a time.
class Path
{
public:
  /// @throws std::system_error TAV_RC_BAD_PARAM for a text that is no path, or has a name that no element has: with the
  ///         column, and the nearest name
  explicit Path(std::string_view text)
      : Path(text, "understanding the path")
  {
  }
  Path(std::string_view text, std::error_code& ec)
  {
    PathFault fault;
    read(text, fault);
    detail::report(codeOf(fault), ec);
  }
  /// The same with all that is known of a failure.
  Path(std::string_view text, PathFault& fault)
  {
    read(text, fault);
  }
  /// The same as the first; `doing` begins the message.
  Path(std::string_view text, const char* doing)
  {
    PathFault fault;
    read(text, fault);
    detail::demand(codeOf(fault), doing, [&] {
      return detail::Told{std::string(text), "column " + std::to_string(fault.column) + ": " + fault.sentence};
    });
  }

  [[nodiscard]] const std::string& text() const noexcept
  {
    return text_;
  }

  /// Whether it leads to nothing: after a failure.
  [[nodiscard]] bool empty() const noexcept
  {
    return compiled_.main.empty();
  }

  /// What the matcher works with; of the library's own use.
  [[nodiscard]] const detail::paths::Compiled& compiled() const noexcept
  {
    return compiled_;
  }

private:
  static uint32_t codeOf(const PathFault& fault) noexcept
  {
    return fault.kind == PathFault::Kind::none ? TAV_RC_OK : TAV_RC_BAD_PARAM;
  }

  void read(std::string_view text, PathFault& fault)
  {
    fault = {};
    text_ = text;
    detail::paths::Parser(text_, compiled_, fault).parse();
  }

  std::string text_;
  detail::paths::Compiled compiled_;
};

} // namespace tav
