/// @file matcher.hpp
/// Follows a walk and says which nodes a path leads to.
///
/// A route is an automaton whose states are the places between its steps. The nodes of a walk come in stream order,
/// each with its level; a node's states follow from those of its parent. What only lies ahead (a condition, the number
/// of siblings, a step back up) is looked up by a walk of its own from where the main one is.
///
/// A `Tree` has the nodes of a stream:
///
/// @code{.unparsed}
///   Place                                a node, to be looked below again later; a default one is above the roots
///   isAbove(place)                       whether it is that one
///   elm(place), offset(place), isGroup(place)
///   hasText(place)                       whether its element in XML has one: a group has line ends
///   value(place, Value&)                 its value as text; false for a group
///   attribute(place, attribute, Value&)  false where it has none of this name
///   Walk(tree, place)                    next(), place(), depth() from 1, skip(): what is below, in stream order
/// @endcode
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <span>
#include <utility>
#include <vector>

#include "tav/layout.hpp"
#include "tav/path/compiled.hpp"
#include "tav/path/conditions.hpp"

namespace tav::detail::paths
{

/// One route over one walk.
template<class Tree>
class Run
{
public:
  using Place = typename Tree::Place;

  /// `start` is the route's node, and `above` the offsets of the nodes between the walk's top and it. `line`: what is
  /// above the top.
  Run(Conditions<Tree>& conditions, const Route& route, uint64_t start, std::vector<uint64_t> above,
      std::span<const Place> line)
      : conditions_(conditions), route_(route), start_(start), above_(std::move(above)),
        keeps_(conditions.path().keepsPlaces), lineAbove_(line.size())
  {
    if (keeps_)
    {
      line_.assign(line.begin(), line.end());
    }
  }

  static constexpr uint64_t kAboveRoots = ~uint64_t{0}; ///< the start of a route that begins above the roots

  /// Whether the route leads to this node. Every node of the walk is given, the top one first, at level 0; of a group
  /// below which nothing can be reached the children may be left out.
  bool give(const Place& place, size_t depth)
  {
    // The states of level d are those of the node there; its children are tried against them.
    if (depth < levels_.size())
    {
      states_.resize(levels_[depth].states);
      counters_.resize(levels_[depth].counters);
      levels_.resize(depth);
      line_.resize(keeps_ ? lineAbove_ + depth : 0);
    }
    levels_.push_back({states_.size(), counters_.size()});
    const bool isStart = startsAt(place);
    isAbove_ = !isStart && isAboveStart(place);
    route_.hasParents ? takeAll(place, isStart) : take(place, isStart);
    const size_t from = levels_.back().states;
    const bool matches = states_.size() > from && states_.back() == route_.steps.size();
    reachesBelow_ = isAbove_;
    for (size_t i = from; i < states_.size(); ++i)
    {
      openState(states_[i]);
    }
    if (keeps_)
    {
      line_.push_back(place);
    }
    return matches;
  }

  /// Whether something below the node given last can be reached.
  [[nodiscard]] bool reachesBelow() const noexcept
  {
    return reachesBelow_;
  }

private:
  struct Level
  {
    size_t states;   ///< where its states begin
    size_t counters; ///< where the counters of its children begin
  };

  [[nodiscard]] const Tree& tree() const noexcept
  {
    return conditions_.tree();
  }
  [[nodiscard]] bool startsAt(const Place& place) const
  {
    return tree().isAbove(place) ? start_ == kAboveRoots : start_ == tree().offset(place);
  }
  [[nodiscard]] bool isAboveStart(const Place& place) const
  {
    const uint64_t offset = tree().isAbove(place) ? kAboveRoots : tree().offset(place);
    return std::find(above_.begin(), above_.end(), offset) != above_.end();
  }
  [[nodiscard]] bool isStar(const Place& place) const
  {
    return tree().isAbove(place) || !layout::isEndElement(tree().elm(place));
  }

  /// Makes room for what the children of the node given last are counted by, and notes whether they are of interest.
  void openState(size_t state)
  {
    const bool passes = state > 0 && route_.steps[state - 1].axis == Axis::descendantOrSelf;
    reachesBelow_ = reachesBelow_ || passes;
    if (state < route_.steps.size() && route_.steps[state].axis == Axis::child)
    {
      reachesBelow_ = true;
      if (!route_.hasParents)
      {
        counters_.resize(counters_.size() + 2 * route_.steps[state].predicates.size());
      }
    }
    if (route_.hasParents && counters_.size() == levels_.back().counters)
    {
      counters_.resize(counters_.size() + route_.counters);
    }
  }

  /// The states of a node of a route that leads down alone: each follows from one of the parent's or from the one
  /// before it, so that they come out in order.
  void take(const Place& place, bool isStart)
  {
    const size_t from = levels_.back().states;
    const std::vector<Step>& steps = route_.steps;
    const bool star = isStar(place);
    const auto add = [&](size_t state) {
      if (states_.size() == from || states_.back() < state)
      {
        states_.push_back(state);
        if (state < steps.size() && steps[state].axis == Axis::descendantOrSelf && star)
        {
          states_.push_back(state + 1);
        }
      }
    };
    if (isStart)
    {
      add(0);
    }
    if (levels_.size() < 2)
    {
      return;
    }
    const Level parent = levels_[levels_.size() - 2];
    size_t counter = parent.counters;
    for (size_t i = parent.states; i < from; ++i)
    {
      const size_t state = states_[i];
      if (state > 0 && steps[state - 1].axis == Axis::descendantOrSelf && star)
      {
        add(state);
      }
      if (state < steps.size() && steps[state].axis == Axis::child)
      {
        if (conditions_.accepts(steps[state], place, line_, counters_.data() + counter))
        {
          add(state + 1);
        }
        counter += 2 * steps[state].predicates.size();
      }
    }
  }

  // Routes that lead up, too. `..` leads to a node from each of its children, which lie ahead: they are looked at.

  using States = std::vector<uint8_t>; ///< one for each place between steps: whether the node has it

  void takeAll(const Place& place, bool isStart)
  {
    States parent(route_.steps.size() + 1);
    uint64_t* counters = nullptr;
    if (levels_.size() > 1)
    {
      const Level level = levels_[levels_.size() - 2];
      for (size_t i = level.states; i < levels_.back().states; ++i)
      {
        parent[states_[i]] = 1;
      }
      counters_.resize(std::max<size_t>(counters_.size(), level.counters + route_.counters));
      levels_.back().counters = counters_.size();
      counters = counters_.data() + level.counters;
    }
    States states(route_.steps.size() + 1);
    states[0] = isStart ? 1 : 0;
    fill(place, parent, counters, states, route_.steps.size());
    for (size_t i = 0; i < states.size(); ++i)
    {
      if (states[i] != 0)
      {
        states_.push_back(i);
      }
    }
  }

  /// The states of a node up to the `most`th.
  void fill(const Place& place, const States& parent, uint64_t* counters, States& states, size_t most)
  {
    for (size_t i = 1; i <= most; ++i)
    {
      const Step& step = route_.steps[i - 1];
      switch (step.axis)
      {
      case Axis::child:
        states[i] = parent[i - 1] != 0 && conditions_.accepts(step, place, line_, counters + step.counters) ? 1 : 0;
        break;
      case Axis::descendantOrSelf:
        states[i] = (states[i - 1] != 0 || parent[i] != 0) && isStar(place) ? 1 : 0;
        break;
      default:
        states[i] =
            holdsText(place, states, i) || (mayBeParent(place, states, i) && isParent(place, states, i)) ? 1 : 0;
      }
    }
  }

  /// Behind any number of levels `..` leads to what holds a text, too: in XPath texts are nodes, whose parents that
  /// are.
  bool holdsText(const Place& place, const States& states, size_t i) const
  {
    return i >= 2 && route_.steps[i - 2].axis == Axis::descendantOrSelf && states[i - 1] != 0 &&
           !tree().isAbove(place) && tree().hasText(place);
  }

  /// Whether it is worth looking for a child from which the `i`th step leads to this node.
  bool mayBeParent(const Place& place, const States& states, size_t i) const
  {
    if (tree().isAbove(place) || !tree().isGroup(place))
    {
      return false;
    }
    const bool fromChild = i >= 2 && route_.steps[i - 2].axis == Axis::child;
    const auto ends = states.begin() + static_cast<ptrdiff_t>(i);
    return fromChild ? states[i - 2] != 0
                     : isAboveStart(place) || std::find(states.begin(), ends, uint8_t{1}) != ends;
  }

  bool isParent(const Place& place, const States& states, size_t i)
  {
    std::vector<uint64_t> counters(route_.counters);
    line_.push_back(place);
    bool found = false;
    for (typename Tree::Walk walk(conditions_.tree(), place); !found && walk.next();)
    {
      States below(i);
      below[0] = startsAt(walk.place()) ? 1 : 0;
      fill(walk.place(), states, counters.data(), below, i - 1);
      found = below[i - 1] != 0;
      walk.skip();
    }
    line_.pop_back();
    return found;
  }

  Conditions<Tree>& conditions_;
  const Route& route_;
  uint64_t start_;
  std::vector<uint64_t> above_;
  bool keeps_;
  size_t lineAbove_;
  bool isAbove_ = false;
  bool reachesBelow_ = false;
  std::vector<Level> levels_{};
  std::vector<size_t> states_{};     ///< level by level, ascending in each
  std::vector<uint64_t> counters_{}; ///< level by level
  std::vector<Place> line_{};        ///< what is above the node at hand, the nearest last
};

template<class Tree>
bool Conditions<Tree>::visitRoute(const Route& route, const At& at, const PlaceVisitor& visit)
{
  const auto isNode = [&](size_t levels) {
    return levels <= at.line.size() && !tree_.isAbove(at.line[at.line.size() - levels]);
  };
  if (route.ups != 0 && !isNode(route.ups))
  {
    return true; // the parent of a root is nothing
  }
  const size_t start = at.line.size() - route.ups;
  const Place& from = route.ups == 0 ? at.place : at.line[start];
  if (route.steps.empty())
  {
    return visit(from);
  }
  size_t climb = 0;
  while (climb < route.climb && isNode(route.ups + climb + 1))
  {
    ++climb;
  }
  const size_t top = start - climb;
  const Place& highest = climb == 0 ? from : at.line[top];
  std::vector<uint64_t> above;
  for (size_t i = top; i < start; ++i)
  {
    above.push_back(tree_.offset(at.line[i]));
  }
  Run<Tree> run(*this, route, tree_.offset(from), std::move(above), at.line.first(top));
  bool more = !run.give(highest, 0) || visit(highest);
  if (!more || !run.reachesBelow())
  {
    return more;
  }
  for (typename Tree::Walk walk(tree_, highest); more && walk.next();)
  {
    more = !run.give(walk.place(), walk.depth()) || visit(walk.place());
    if (!run.reachesBelow())
    {
      walk.skip();
    }
  }
  return more;
}

/// All routes of a path over one walk.
template<class Tree>
class Matcher
{
public:
  using Place = typename Tree::Place;

  Matcher(Tree& tree, const Compiled& path)
      : conditions_(tree, path)
  {
  }
  Matcher(const Matcher&) = delete;
  Matcher& operator=(const Matcher&) = delete;

  /// Begins at the place above the roots, which is then given first. Only routes without a start of their own.
  void begin()
  {
    for (const uint32_t index : conditions_.path().main)
    {
      const Route& route = conditions_.path().routes[index];
      if (route.ups == 0) // nothing is above the roots
      {
        runs_.emplace_back(conditions_, route, Run<Tree>::kAboveRoots, std::vector<uint64_t>(),
                           std::span<const Place>());
      }
    }
  }

  /// Begins at a node, `line.back()`, for a walk from the first of the line on.
  void begin(std::span<const Place> line)
  {
    const Tree& tree = conditions_.tree();
    for (const uint32_t index : conditions_.path().main)
    {
      const Route& route = conditions_.path().routes[index];
      const size_t up = route.absolute ? line.size() - 1 : route.ups;
      if (up >= line.size() || (!route.absolute && tree.isAbove(line[line.size() - 1 - up])))
      {
        continue;
      }
      const Place& start = line[line.size() - 1 - up];
      std::vector<uint64_t> above;
      for (size_t i = 0; i + 1 + up < line.size(); ++i)
      {
        above.push_back(tree.isAbove(line[i]) ? Run<Tree>::kAboveRoots : tree.offset(line[i]));
      }
      const uint64_t offset = tree.isAbove(start) ? Run<Tree>::kAboveRoots : tree.offset(start);
      runs_.emplace_back(conditions_, route, offset, std::move(above), std::span<const Place>());
    }
  }

  /// As Run::give. Nothing leads to the place above the roots.
  bool give(const Place& place, size_t depth)
  {
    bool matches = false;
    reachesBelow_ = false;
    for (Run<Tree>& run : runs_)
    {
      matches = run.give(place, depth) || matches;
      reachesBelow_ = reachesBelow_ || run.reachesBelow();
    }
    return matches && !conditions_.tree().isAbove(place);
  }

  [[nodiscard]] bool reachesBelow() const noexcept
  {
    return reachesBelow_;
  }

private:
  Conditions<Tree> conditions_;
  std::vector<Run<Tree>> runs_{};
  bool reachesBelow_ = false;
};

} // namespace tav::detail::paths
