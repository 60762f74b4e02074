// Paths over the walker.
#include <algorithm>
#include <optional>
#include <span>
#include <utility>
#include <vector>

#include "inspect/path/walkedTree.h"
#include "tav/inspect/locate.hpp"
#include "tav/inspect/path.hpp"

namespace tav::inspect
{

struct PathMatcher::State
{
  explicit State(const Path& given)
      : path(given), matcher(tree, path.compiled())
  {
    tree.looks = path.compiled().keepsPlaces || !path.compiled().expressions.empty();
  }

  void see(const Walker& walker)
  {
    tree.source = &walker.source();
    tree.form = walker.form();
  }

  /// The place above the roots, the groups around a node, and the node.
  std::vector<WalkedTree::Place> lineTo(Walker& walker, uint64_t offset)
  {
    see(walker);
    std::vector<WalkedTree::Place> line(1);
    for (Event event; walker.next(event) && event.offset <= offset;)
    {
      if (event.what != What::nodeBegin)
      {
        continue;
      }
      line.resize(static_cast<size_t>(event.depth) + 1);
      line.push_back(tree.placeOf(walker, event));
      if (event.offset == offset)
      {
        return line;
      }
      if (event.node.isGroup() && event.node.limit <= offset)
      {
        walker.skip();
      }
    }
    return {};
  }

  Path path;
  WalkedTree tree{};
  paths::Matcher<WalkedTree> matcher;
  uint64_t levels = 1;  ///< the depth in the matcher of a node of depth 0
  bool hasBegun = true; ///< else it begins at the first node that it is given
};

PathMatcher::PathMatcher(std::unique_ptr<State> state)
    : state_(std::move(state))
{
}

PathMatcher::PathMatcher(const Path& path)
    : state_(std::make_unique<State>(path))
{
  state_->matcher.begin();
  state_->matcher.give({}, 0);
}

PathMatcher::PathMatcher(const Path& path, ByteSource& source, const Form& form, uint64_t offset)
    : state_(std::make_unique<State>(path))
{
  Walker walker(source, form);
  const std::vector<WalkedTree::Place> line = state_->lineTo(walker, offset);
  state_->matcher.begin(line);
  state_->matcher.give({}, 0);
}

PathMatcher PathMatcher::below(const Path& path)
{
  auto state = std::make_unique<State>(path);
  state->hasBegun = false;
  state->levels = 0;
  return PathMatcher(std::move(state));
}

bool PathMatcher::looksAhead(const Path& path)
{
  const paths::Compiled& compiled = path.compiled();
  const auto hasParents = [&compiled](uint32_t route) { return compiled.routes[route].hasParents; };
  return compiled.keepsPlaces || !compiled.expressions.empty() ||
         std::any_of(compiled.main.begin(), compiled.main.end(), hasParents);
}

bool PathMatcher::leavesStart(const Path& path)
{
  return path.compiled().leavesStart;
}

PathMatcher::~PathMatcher() = default;

PathMatcher::PathMatcher(PathMatcher&&) noexcept = default;

bool PathMatcher::matches(const Walker& walker, const Event& event)
{
  State& state = *state_;
  state.see(walker);
  const WalkedTree::Place place = state.tree.placeOf(walker, event);
  if (!std::exchange(state.hasBegun, true))
  {
    state.matcher.begin(std::span(&place, 1));
  }
  return state.matcher.give(place, static_cast<size_t>(event.depth + state.levels));
}

bool PathMatcher::matches(const Node& node)
{
  return state_->matcher.give({node, false, std::nullopt}, static_cast<size_t>(node.depth + state_->levels));
}

bool PathMatcher::reachesBelow() const
{
  return state_->matcher.reachesBelow();
}

Problem noMatch(const Path& path, const std::string& file)
{
  return {.file = file, .path = path.text(), .sentence = "no match"};
}

PathSearch::PathSearch(ByteSource& source, const Form& form, const Path& path)
    : walker_(source, form), matcher_(path)
{
}

bool PathSearch::next(Event& event)
{
  return goToMatch(walker_, matcher_, event);
}

} // namespace tav::inspect
