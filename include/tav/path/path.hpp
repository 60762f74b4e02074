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
/// Elements that only end a group are found by their names alone. A program's own elements have the names that it
/// gives.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <system_error>
#include <utility>

#include "tav/cpp/chars.hpp"
#include "tav/cpp/error.hpp"
#include "tav/dictionary.hpp"

namespace tav
{

/// Why a text is no path.
struct PathFault
{
  enum class Kind : uint8_t
  {
    none,
    malformed,  ///< it cannot be read as a path
    unknownName ///< it can, but has a name that no element has
  };
  Kind kind = Kind::none;
  size_t column = 0;      ///< in characters, from 1
  std::string sentence{}; ///< starts with a lower-case letter, no full stop
  std::string nearest{};  ///< the tag that may have been meant; empty: none is near
};

namespace detail::paths
{

struct Compiled;

/// Takes what is wrong with a path.
struct FaultTaker
{
  PathFault& fault;
  void (*take)(PathFault& fault, uint32_t kind, size_t column, Chars sentence, Chars nearest);
};

/// Reads a path; one that cannot be read leads nowhere. It never changes, and lasts until as many have released it as
/// have it from here and have retained it. `own`: names of elements beside the dictionary's.
TAV_API const Compiled* readPath(const char* text, size_t length, const dictionary::OwnName* own, size_t owns,
                                 const FaultTaker& taker);
TAV_API void retainPath(const Compiled& path) noexcept;
TAV_API void releasePath(const Compiled& path) noexcept;
TAV_API bool leadsNowhere(const Compiled& path) noexcept;

/// A path that was read, and what all copies of it share.
class SharedPath
{
public:
  SharedPath(std::string_view text, dictionary::OwnNames own, PathFault& fault)
      : path_(readPath(text.data(), text.size(), own.data(), own.size(), FaultTaker{fault, take}))
  {
  }
  SharedPath(const SharedPath& other) noexcept
      : path_(other.path_)
  {
    retainPath(*path_);
  }
  SharedPath& operator=(SharedPath other) noexcept
  {
    std::swap(path_, other.path_);
    return *this;
  }
  ~SharedPath()
  {
    releasePath(*path_);
  }

  const Compiled& operator*() const noexcept
  {
    return *path_;
  }

private:
  static void take(PathFault& fault, uint32_t kind, size_t column, Chars sentence, Chars nearest)
  {
    fault = {static_cast<PathFault::Kind>(kind), column, std::string(std::string_view(sentence)),
             std::string(std::string_view(nearest))};
  }

  const Compiled* path_;
};

} // namespace detail::paths

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
      : Path(text, dictionary::OwnNames(), ec)
  {
  }
  /// The same with all that is known of a failure.
  Path(std::string_view text, PathFault& fault)
      : Path(text, dictionary::OwnNames(), fault)
  {
  }
  /// The same as the first; `doing` begins the message.
  Path(std::string_view text, const char* doing)
      : Path(text, dictionary::OwnNames(), doing)
  {
  }

  /// The same with names of elements that the dictionary does not have. They are looked up here and not kept.
  Path(std::string_view text, dictionary::OwnNames own)
      : Path(text, own, "understanding the path")
  {
  }
  Path(std::string_view text, dictionary::OwnNames own, std::error_code& ec)
      : Path(text, own, PathFault{}, ec)
  {
  }
  Path(std::string_view text, dictionary::OwnNames own, PathFault& fault)
      : text_(text), compiled_(text, own, fault = {})
  {
  }
  Path(std::string_view text, dictionary::OwnNames own, const char* doing)
      : Path(text, own, PathFault{}, doing)
  {
  }

  [[nodiscard]] const std::string& text() const noexcept
  {
    return text_;
  }

  /// Whether it leads to nothing: after a failure.
  [[nodiscard]] bool empty() const noexcept
  {
    return detail::paths::leadsNowhere(*compiled_);
  }

  /// What the matcher works with; of the library's own use.
  [[nodiscard]] const detail::paths::Compiled& compiled() const noexcept
  {
    return *compiled_;
  }

private:
  Path(std::string_view text, dictionary::OwnNames own, PathFault&& fault, std::error_code& ec)
      : Path(text, own, fault)
  {
    detail::report(codeOf(fault), ec);
  }
  Path(std::string_view text, dictionary::OwnNames own, PathFault&& fault, const char* doing)
      : Path(text, own, fault)
  {
    detail::demand(codeOf(fault), doing, [&] {
      return detail::Told{text_, "column " + std::to_string(fault.column) + ": " + fault.sentence};
    });
  }

  static uint32_t codeOf(const PathFault& fault) noexcept
  {
    return fault.kind == PathFault::Kind::none ? TAV_RC_OK : TAV_RC_BAD_PARAM;
  }

  std::string text_;
  detail::paths::SharedPath compiled_;
};

} // namespace tav
