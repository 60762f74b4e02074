/// @file path.hpp
/// Finding nodes by paths, as tav/path/path.hpp describes them. Always ends.
#pragma once

#include <cstddef>
#include <cstdint>
#include <iterator>
#include <optional>
#include <string_view>
#include <system_error>
#include <utility>
#include <vector>

#include "tav/cpp/pathTree.hpp"
#include "tav/cpp/ranges.hpp"
#include "tav/path/matcher.hpp"
#include "tav/path/path.hpp"

namespace tav
{

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
    if (!search_->begun)
    {
      search_->begun = true;
      search_->found = search_->start() || search_->advance();
      settle();
    }
    return detail::WalkIterator<FindRange>(search_->found ? this : nullptr);
  }
  static std::default_sentinel_t end() noexcept
  {
    return std::default_sentinel;
  }

private:
  friend class Node;
  friend class Reader;
  friend class detail::WalkIterator<FindRange>;

  using Tree = detail::NodeTree;
  using Place = Tree::Place;

  /// Stays where it is: its parts know each other.
  struct Search
  {
    Search(detail::ReaderState& state, Path given)
        : path(std::move(given)), tree(state), matcher(tree, path.compiled())
    {
    }

    /// Gives the walk's top; whether the path leads there.
    bool start()
    {
      const bool matches = matcher.give(top, 0);
      current = top.node;
      if (matcher.reachesBelow())
      {
        walk.emplace(tree, top);
      }
      return matches && !tree.hasFailed();
    }
    bool advance()
    {
      while (walk && !tree.hasFailed() && walk->next())
      {
        const bool matches = matcher.give(walk->place(), walk->depth());
        if (!matcher.reachesBelow())
        {
          walk->skip();
        }
        if (matches && !tree.hasFailed())
        {
          current = walk->place().node;
          return true;
        }
      }
      return false;
    }

    Path path;
    Tree tree;
    detail::paths::Matcher<Tree> matcher;
    Place top{};
    std::optional<Tree::Walk> walk{};
    Node current{};
    bool begun = false;
    bool found = false;
  };

  /// Of nothing.
  FindRange() = default;
  /// From the place above the roots.
  FindRange(detail::ReaderState& state, const Path& path, std::error_code* ec)
      : search_(new Search(state, path)), ec_(ec)
  {
    search_->matcher.begin();
  }

  /// From a node. Where the path can lead out of what is below it, the walk begins above the roots.
  FindRange(detail::ReaderState& state, const Node& node, const Path& path, std::error_code* ec)
      : search_(new Search(state, path)), ec_(ec)
  {
    Search& search = *search_;
    std::vector<Place> line{Place{node, false}};
    if (path.compiled().leavesStart)
    {
      line = search.tree.lineTo(node, isAbsolute(path.compiled()));
    }
    search.top = line.front();
    search.matcher.begin(line);
  }

  [[nodiscard]] const Node& current() const noexcept
  {
    return search_->current;
  }
  bool advance()
  {
    search_->found = search_->advance();
    settle();
    return search_->found;
  }
  void settle()
  {
    if (!search_->found)
    {
      const uint32_t rc = search_->tree.failure();
      ec_ != nullptr ? detail::report(rc, *ec_)
                     : detail::demand(rc, "searching", [this] { return search_->path.text(); });
    }
  }

  static bool isAbsolute(const detail::paths::Compiled& path) noexcept
  {
    bool isOne = false;
    for (const uint32_t index : path.main)
    {
      isOne = isOne || path.routes[index].absolute;
    }
    return isOne;
  }

  detail::Owner<Search> search_;
  std::error_code* ec_ = nullptr;
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
  return first == range.end() ? std::nullopt : std::optional(*first);
}

} // namespace detail

inline FindRange Node::find(const Path& path) const
{
  return state_ == nullptr ? FindRange() : FindRange(*state_, *this, path, nullptr);
}

inline FindRange Node::find(const Path& path, std::error_code& ec) const
{
  ec.clear();
  return state_ == nullptr ? FindRange() : FindRange(*state_, *this, path, &ec);
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
  if (std::optional<Node> found = detail::NodeTree::findStraight(path, *this))
  {
    ec.clear();
    return found;
  }
  return detail::firstOf(find(path, ec));
}

inline std::optional<Node> Node::path(const Path& path) const
{
  if (std::optional<Node> found = detail::NodeTree::findStraight(path, *this))
  {
    return found;
  }
  return detail::firstOf(find(path));
}

inline std::optional<Node> Node::path(std::string_view path, std::error_code& ec) const
{
  const Path parsed(path, ec);
  return ec ? std::nullopt : this->path(parsed, ec);
}

inline std::optional<Node> Node::path(std::string_view path) const
{
  return this->path(Path(path));
}

} // namespace tav

/// @cond  A view, as those of ranges.hpp.
template<>
inline constexpr bool std::ranges::enable_view<tav::FindRange> = true;
/// @endcond
