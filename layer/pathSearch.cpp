// Searches by a path, over the nodes of a reader.
#include <algorithm>
#include <optional>
#include <span>
#include <string_view>
#include <vector>

#include "layer/pathTree.h"
#include "layer/plainPath.h"
#include "tav/cpp/path.hpp"
#include "tav/path/matcher.hpp"

namespace tav::detail
{

namespace
{

bool isAbsolute(const paths::Compiled& path) noexcept
{
  return std::any_of(path.main.begin(), path.main.end(),
                     [&path](uint32_t index) { return path.routes[index].absolute; });
}

/// Whether the path leads to any level, and with that past every node.
bool looksEverywhere(const paths::Compiled& path) noexcept
{
  return std::any_of(path.routes.begin(), path.routes.end(), [](const paths::Route& route) {
    return std::any_of(route.steps.begin(), route.steps.end(),
                       [](const paths::Step& step) { return step.axis == paths::Axis::descendantOrSelf; });
  });
}

/// Of a path with one route.
std::span<const paths::Step> stepsOf(const paths::Compiled& path) noexcept
{
  return path.routes[path.main.front()].steps;
}

class NodeSearch final : public PathSearch
{
public:
  NodeSearch(ReaderState& state, const paths::Compiled& path)
      : path_(path), tree_(state), matcher_(tree_, path)
  {
    paths::retainPath(path_);
    tree_.ownTags = path.ownTags;
    if (looksEverywhere(path_))
    {
      state.walk();
    }
  }
  ~NodeSearch() override
  {
    paths::releasePath(path_);
  }

  void beginAboveRoots()
  {
    matcher_.begin();
  }
  /// Where the path can lead out of what is below the node, the walk begins above the roots.
  void beginAt(const Node& node)
  {
    std::vector<NodeTree::Place> line{NodeTree::Place{node, false}};
    if (path_.leavesStart)
    {
      line = tree_.lineTo(node, isAbsolute(path_));
    }
    top_ = line.front();
    matcher_.begin(line);
  }

  bool advance(Node& found) override
  {
    if (!hasBegun_)
    {
      hasBegun_ = true;
      const bool matches = matcher_.give(top_, 0);
      if (matcher_.reachesBelow())
      {
        walk_.emplace(tree_, top_);
      }
      if (matches && !tree_.hasFailed())
      {
        found = top_.node;
        return true;
      }
    }
    while (walk_ && !tree_.hasFailed() && walk_->next())
    {
      const bool matches = matcher_.give(walk_->place(), walk_->depth());
      if (!matcher_.reachesBelow())
      {
        walk_->skip();
      }
      if (matches && !tree_.hasFailed())
      {
        found = walk_->place().node;
        return true;
      }
    }
    return false;
  }
  [[nodiscard]] uint32_t failure() const noexcept override
  {
    return tree_.failure();
  }

private:
  const paths::Compiled& path_;
  NodeTree tree_;
  paths::Matcher<NodeTree> matcher_;
  NodeTree::Place top_{};
  std::optional<NodeTree::Walk> walk_{};
  bool hasBegun_ = false;
};

} // namespace

PathSearch* searchPath(ReaderState& state, const paths::Compiled& path, const Node* from)
{
  Owner<NodeSearch> search(new NodeSearch(state, path));
  from != nullptr ? search->beginAt(*from) : search->beginAboveRoots();
  return search.release();
}

bool findStraight(const paths::Compiled& path, const Node& start, Node& found) noexcept
{
  return path.isStraight && !path.leavesStart &&
         NodeTree::findStraight(stepsOf(path), start, found);
}

bool findStraightFromRoot(const paths::Compiled& path, const Node& root, Node& found) noexcept
{
  if (!path.isStraight)
  {
    return false;
  }
  const std::span<const paths::Step> steps = stepsOf(path);
  return steps.size() > 1 && steps.front().matches(root.elm()) &&
         NodeTree::findStraight(steps.subspan(1), root, found);
}

bool findStraight(std::string_view path, const Node& start, Node& found) noexcept
{
  const paths::PlainPath plain(path);
  return !plain.steps().empty() && NodeTree::findStraight(plain.steps(), start, found);
}

bool findStraightFromRoot(std::string_view path, const Node& root, Node& found) noexcept
{
  const paths::PlainPath plain(path.substr(path.starts_with('/') ? 1 : 0));
  return plain.steps().size() > 1 && plain.steps().front().only == root.elm() &&
         NodeTree::findStraight(plain.steps().subspan(1), root, found);
}

} // namespace tav::detail
