/// @file path.hpp
/// Finding nodes by paths, as tav/path/path.hpp describes them. Always ends.
#pragma once

#include <cstdint>
#include <iterator>
#include <optional>
#include <string>
#include <string_view>
#include <system_error>
#include <utility>
#include <vector>

#include "tav/cpp/owner.hpp"
#include "tav/cpp/ranges.hpp"
#include "tav/path/path.hpp"

namespace tav
{

namespace detail
{

/// A walk over the nodes that a path leads to; the library has one.
class PathSearch
{
public:
  PathSearch() = default;
  PathSearch(const PathSearch&) = delete;
  PathSearch& operator=(const PathSearch&) = delete;
  virtual ~PathSearch() = default;

  /// To the first node, or to the next one. At the end, and after a failure, false.
  virtual bool advance(Node& found) = 0;
  [[nodiscard]] virtual uint32_t failure() const noexcept = 0;
};

/// From a node, or from the place above the roots.
TAV_API PathSearch* searchPath(ReaderState& state, const paths::Compiled& path, const Node* from);

/// The first match of a path of plain names, where the first match of every step leads there; else false, which says
/// nothing. Over memory the library looks through a level without handing out what it passes.
TAV_API bool findStraight(const paths::Compiled& path, const Node& start, Node& found) noexcept;
/// The same from the stream's first node, whose name comes first.
TAV_API bool findStraightFromRoot(const paths::Compiled& path, const Node& root, Node& found) noexcept;
/// The same by the text, which is not kept.
TAV_API bool findStraight(std::string_view path, const Node& start, Node& found) noexcept;
TAV_API bool findStraightFromRoot(std::string_view path, const Node& root, Node& found) noexcept;

} // namespace detail

/// The nodes that a path leads to, in stream order, each once. A single pass; the range holds the place of the walk, so
/// an iterator must not outlive it.
class FindRange
{
public:
  FindRange(FindRange&&) = default;
  FindRange& operator=(FindRange&&) = default;

  detail::WalkIterator<FindRange> begin() &
  {
    if (search_ == nullptr)
    {
      return {};
    }
    if (!begun_)
    {
      begun_ = true;
      advance();
    }
    return detail::WalkIterator<FindRange>(found_ ? this : nullptr);
  }
  static std::default_sentinel_t end() noexcept
  {
    return std::default_sentinel;
  }

private:
  friend class Node;
  friend class Reader;
  friend class detail::WalkIterator<FindRange>;

  /// Of nothing.
  FindRange() = default;
  /// `from` null: from the place above the roots.
  FindRange(detail::ReaderState& state, const Node* from, const Path& path, std::error_code* ec)
      : search_(detail::searchPath(state, path.compiled(), from)), text_(path.text()), ec_(ec)
  {
  }

  [[nodiscard]] const Node& current() const noexcept
  {
    return current_;
  }
  bool advance()
  {
    found_ = search_->advance(current_);
    if (!found_)
    {
      const uint32_t rc = search_->failure();
      ec_ != nullptr ? detail::report(rc, *ec_) : detail::demand(rc, "searching", [this] { return text_; });
    }
    return found_;
  }

  detail::Owner<detail::PathSearch> search_;
  std::string text_; ///< of the path
  std::error_code* ec_ = nullptr;
  Node current_{};
  bool begun_ = false;
  bool found_ = false;
};

namespace detail
{

/// All that a range gives.
inline std::vector<Node> collect(FindRange&& range)
{
  std::vector<Node> found;
  for (const Node& node : range)
  {
    found.push_back(node);
  }
  return found;
}

/// The first that it gives.
inline std::optional<Node> firstOf(FindRange&& range)
{
  const auto first = range.begin();
  return first == std::default_sentinel ? std::nullopt : std::optional(*first);
}

} // namespace detail

inline FindRange Node::find(const Path& path) const
{
  return state_ == nullptr ? FindRange() : FindRange(*state_, this, path, nullptr);
}

inline FindRange Node::find(const Path& path, std::error_code& ec) const
{
  ec.clear();
  return state_ == nullptr ? FindRange() : FindRange(*state_, this, path, &ec);
}

inline FindRange Node::find(std::string_view path) const
{
  return find(Path(path));
}

inline FindRange Node::find(std::string_view path, std::error_code& ec) const
{
  const Path parsed(path, ec);
  return ec ? FindRange() : find(parsed, ec);
}

inline std::vector<Node> Node::all(const Path& path, std::error_code& ec) const
{
  return detail::collect(find(path, ec));
}

inline std::vector<Node> Node::all(const Path& path) const
{
  return detail::collect(find(path));
}

inline std::vector<Node> Node::all(std::string_view path, std::error_code& ec) const
{
  const Path parsed(path, ec);
  return ec ? std::vector<Node>() : all(parsed, ec);
}

inline std::vector<Node> Node::all(std::string_view path) const
{
  return all(Path(path));
}

inline std::optional<Node> Node::path(const Path& path, std::error_code& ec) const
{
  Node found;
  if (detail::findStraight(path.compiled(), *this, found))
  {
    ec.clear();
    return found;
  }
  return detail::firstOf(find(path, ec));
}

inline std::optional<Node> Node::path(const Path& path) const
{
  Node found;
  if (detail::findStraight(path.compiled(), *this, found))
  {
    return found;
  }
  return detail::firstOf(find(path));
}

inline std::optional<Node> Node::path(std::string_view path, std::error_code& ec) const
{
  Node found;
  if (detail::findStraight(path, *this, found))
  {
    ec.clear();
    return found;
  }
  const Path parsed(path, ec);
  return ec ? std::nullopt : this->path(parsed, ec);
}

inline std::optional<Node> Node::path(std::string_view path) const
{
  Node found;
  return detail::findStraight(path, *this, found) ? std::optional(found) : this->path(Path(path));
}

} // namespace tav

/// @cond  A view, as those of ranges.hpp.
template<>
inline constexpr bool std::ranges::enable_view<tav::FindRange> = true;
/// @endcond
