// Paths over the walker.
#include <algorithm>
#include <optional>
#include <span>
#include <utility>
#include <vector>

#include "tav/inspect/attributes.hpp"
#include "tav/inspect/locate.hpp"
#include "tav/inspect/path.hpp"
#include "tav/inspect/value.hpp"
#include "tav/path/matcher.hpp"
#include "tav/path/valueText.hpp"

namespace tav::inspect
{

namespace
{

namespace paths = detail::paths;

constexpr uint64_t kMostCompared = uint64_t{16} * 1024 * 1024; ///< bytes of a value; longer ones compare as none

/// The nodes of a stream as a walk finds them.
struct WalkedTree
{
  struct Place
  {
    Node node{};
    bool above = true;                   ///< above the roots
    std::optional<Walker::Mark> group{}; ///< to look below it
  };

  bool isAbove(const Place& place) const { return place.above; }
  uint16_t elm(const Place& place) const { return place.node.elm(); }
  uint64_t offset(const Place& place) const { return place.node.offset(); }
  bool isGroup(const Place& place) const { return place.node.isGroup(); }
  bool hasText(const Place& place) const
  {
    return place.node.isGroup() || paths::hasText(place.node.type(), place.node.size());
  }

  bool value(const Place& place, paths::Value& value) const
  {
    const uint16_t type = place.node.type();
    const auto text = place.node.isGroup() ? std::nullopt : plainText(*source, form, place.node, kMostCompared);
    const bool onlyText = type == TAV_TYPE_UTC_TIMESTAMP || type == TAV_TYPE_UINT64_ARRAY;
    value = {onlyText ? paths::Value::Kind::onlyText : paths::Value::Kind::text, text.value_or("")};
    return text.has_value();
  }
  bool attribute(const Place& place, paths::Attribute attribute, paths::Value& value) const
  {
    const auto text = attributeText(*source, form, place.node, attribute);
    value = {paths::Value::Kind::text, text.value_or("")};
    return text.has_value();
  }

  Place placeOf(const Walker& walker, const Event& event) const
  {
    Place place{event.node, false, std::nullopt};
    if (event.node.isGroup() && looks)
    {
      place.group = walker.mark();
    }
    return place;
  }

  class Walk
  {
  public:
    Walk(WalkedTree& tree, const Place& top)
        : tree_(tree), levels_(top.above ? 0 : top.node.depth + 1)
    {
      if (top.above)
      {
        walker_.emplace(*tree.source, tree.form);
      }
      else if (top.group)
      {
        walker_.emplace(Walker::through(*tree.source, tree.form, *top.group));
      }
    }

    bool next()
    {
      while (walker_ && walker_->next(event_))
      {
        if (event_.what == What::nodeEnd && event_.node.isGroup() && event_.depth + 1 == levels_)
        {
          walker_.reset(); // the top one
        }
        else if (event_.what == What::nodeBegin && event_.depth <= deepest_)
        {
          deepest_ = kNoOffset;
          place_ = tree_.placeOf(*walker_, event_);
          return true;
        }
      }
      return false;
    }
    const Place& place() const { return place_; }
    size_t depth() const { return static_cast<size_t>(event_.depth + 1 - levels_); }
    void skip()
    {
      if (!event_.node.isGroup() || !walker_->skip())
      {
        deepest_ = event_.depth;
      }
    }

  private:
    WalkedTree& tree_;
    uint64_t levels_; ///< the depth of what is directly below
    uint64_t deepest_ = kNoOffset;
    std::optional<Walker> walker_{};
    Event event_{};
    Place place_{};
  };

  ByteSource* source = nullptr;
  Form form{};
  bool looks = false; ///< something may have to be looked up below a node
};

} // namespace

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
