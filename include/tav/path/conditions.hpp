/// @file conditions.hpp
/// What the brackets of a path ask of a node, answered by walks of their own from its position.
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <map>
#include <span>
#include <string>
#include <utility>
#include <vector>

#include "tav/path/compare.hpp"
#include "tav/path/compiled.hpp"

namespace tav::detail::paths
{

/// Where a condition is asked: at a node, the so-manieth of those that a step has found under their parent.
template<class Tree>
struct Asked
{
  using Place = typename Tree::Place;
  const Place& place;
  std::span<const Place> line; ///< the nodes above it, the nearest last; only of paths that keep places
  const Step* step = nullptr;
  size_t predicate = 0; ///< of the step
  uint64_t position = 0;
  uint64_t* last = nullptr; ///< how many there are, 0: not counted yet
};

/// What a walk calls at each node or value until it answers false; what it was made of lives longer than it. Walks
/// that are the same for all callers are compiled once.
template<class... Arguments>
class Visitor
{
public:
  template<class Visit>
  // NOLINTNEXTLINE(google-explicit-constructor): whatever can be called so is one
  Visitor(const Visit& visit) noexcept
      : visit_(&visit), call_([](const void* made, Arguments... arguments) -> bool {
          return (*static_cast<const Visit*>(made))(arguments...);
        })
  {
  }

  bool operator()(Arguments... arguments) const
  {
    return call_(visit_, arguments...);
  }

private:
  const void* visit_;
  bool (*call_)(const void*, Arguments...);
};

/// Answers what the expressions of one path ask.
template<class Tree>
class Conditions
{
public:
  using Place = typename Tree::Place;
  using At = Asked<Tree>;

  Conditions(Tree& tree, const Compiled& path) noexcept
      : tree_(tree), path_(path)
  {
  }

  [[nodiscard]] Tree& tree() const noexcept
  {
    return tree_;
  }
  [[nodiscard]] const Compiled& path() const noexcept
  {
    return path_;
  }

  /// Whether a node passes the step's name and conditions. `counters` are the step's, of this parent.
  bool accepts(const Step& step, const Place& place, std::span<const Place> line, uint64_t* counters)
  {
    if (!step.matches(tree_.elm(place)))
    {
      return false;
    }
    const size_t count = step.predicates.size();
    for (size_t i = 0; i < count; ++i)
    {
      if (!passes(At{place, line, &step, i, ++counters[i], &counters[count + i]}))
      {
        return false;
      }
    }
    return true;
  }

private:
  using Kind = Expression::Kind;
  using PlaceVisitor = Visitor<const Place&>;
  using NodeVisitor = Visitor<const Route&, const Place&>;
  using ValueVisitor = Visitor<const Value&>;

  [[nodiscard]] const Expression& expression(uint32_t index) const noexcept
  {
    return path_.expressions[index];
  }

  bool passes(const At& at)
  {
    const Expression& condition = expression(at.step->predicates[at.predicate]);
    if (condition.kind == Kind::number) // a number alone asks for a place
    {
      return sumOf(condition, at) == static_cast<int64_t>(at.position);
    }
    return isTrue(condition, at);
  }
  /// A condition within which others are asked, at a node where it may have been asked before: asked each time anew,
  /// those inside of each other would take a time that doubles with each.
  bool isKnownTrue(const Expression& condition, const At& at)
  {
    constexpr size_t most = size_t{1} << 17U;
    const std::pair<uint64_t, const Expression*> key{tree_.offset(at.place), &condition};
    if (const auto known = known_.find(key); known != known_.end())
    {
      return known->second;
    }
    const bool isSo = evaluate(condition, at);
    if (known_.size() >= most)
    {
      known_.clear();
    }
    known_.emplace(key, isSo);
    return isSo;
  }

  bool isTrue(const Expression& condition, const At& at)
  {
    return condition.nests ? isKnownTrue(condition, at) : evaluate(condition, at);
  }

  bool evaluate(const Expression& condition, const At& at)
  {
    const auto part = [&](uint32_t index) { return isTrue(expression(index), at); };
    switch (condition.kind)
    {
    case Kind::either: return std::any_of(condition.parts.begin(), condition.parts.end(), part);
    case Kind::both: return std::all_of(condition.parts.begin(), condition.parts.end(), part);
    case Kind::negation: return !part(condition.parts.front());
    case Kind::comparison: return compares(condition, at);
    case Kind::contains:
      return textOf(condition.parts[0], at).find(textOf(condition.parts[1], at)) != std::string::npos;
    case Kind::startsWith: return textOf(condition.parts[0], at).starts_with(textOf(condition.parts[1], at));
    case Kind::text: return !condition.text.empty();
    case Kind::offset: return tree_.offset(at.place) == condition.offset;
    case Kind::number: return compare(Operator::unequal, numberOf(condition, at), Value{Value::Kind::number, "0"});
    default: return leadsAnywhere(condition, at);
    }
  }

  Value numberOf(const Expression& number, const At& at)
  {
    if (!number.text.empty())
    {
      return {Value::Kind::number, number.text};
    }
    return {Value::Kind::number, std::to_string(sumOf(number, at))};
  }
  int64_t sumOf(const Expression& number, const At& at)
  {
    const int64_t sum = number.constant + number.positions * static_cast<int64_t>(at.position);
    return sum + (number.lasts == 0 ? 0 : number.lasts * static_cast<int64_t>(lastOf(at)));
  }

  /// How many nodes of the parent reach this condition.
  uint64_t lastOf(const At& at)
  {
    if (*at.last != 0)
    {
      return *at.last;
    }
    const size_t count = at.step->predicates.size();
    std::vector<uint64_t> counters(2 * count);
    uint64_t found = 0;
    for (typename Tree::Walk walk(tree_, at.line.back()); walk.next();)
    {
      const Place& place = walk.place();
      bool reached = at.step->matches(tree_.elm(place));
      for (size_t i = 0; reached && i < at.predicate; ++i)
      {
        reached = passes(At{place, at.line, at.step, i, ++counters[i], &counters[count + i]});
      }
      found += reached ? 1 : 0;
      walk.skip();
    }
    *at.last = found;
    return found;
  }

  bool leadsAnywhere(const Expression& nodes, const At& at)
  {
    Value value;
    const auto found = [&](const Route& route, const Place& place) {
      return route.attribute != Attribute::none && !tree_.attribute(place, route.attribute, value);
    };
    return !visitAll(nodes, at, found);
  }

  /// Calls `visit` for every node that the routes lead to until it returns false; whether it never did.
  bool visitAll(const Expression& nodes, const At& at, const NodeVisitor& visit)
  {
    return std::all_of(nodes.routes.begin(), nodes.routes.end(), [&](uint32_t index) {
      const Route& route = path_.routes[index];
      return visitRoute(route, at, [&](const Place& place) { return visit(route, place); });
    });
  }
  bool visitRoute(const Route& route, const At& at, const PlaceVisitor& visit);

  /// What a route asks of the node that it leads to.
  bool valueOf(const Route& route, const Place& place, Value& value)
  {
    return route.attribute != Attribute::none ? tree_.attribute(place, route.attribute, value)
                                              : tree_.value(place, value);
  }

  /// As visitAll, for values.
  bool visitValues(uint32_t index, const At& at, const ValueVisitor& visit)
  {
    const Expression& operand = expression(index);
    if (operand.kind == Kind::text)
    {
      return visit(Value{Value::Kind::text, operand.text});
    }
    if (operand.kind == Kind::number)
    {
      return visit(numberOf(operand, at));
    }
    return visitAll(operand, at, [&](const Route& route, const Place& place) {
      Value value;
      return !valueOf(route, place, value) || visit(value);
    });
  }

  /// The first of the values; empty without one.
  std::string textOf(uint32_t index, const At& at)
  {
    const Expression& operand = expression(index);
    std::string text;
    if (operand.kind != Kind::nodes)
    {
      text = operand.kind == Kind::text ? operand.text : numberOf(operand, at).text;
      return text;
    }
    uint64_t first = ~uint64_t{0}; // of several routes the one that leads to the first node
    const auto take = [&](const Route& route, const Place& place) {
      Value value;
      const bool isThere = valueOf(route, place, value);
      if (route.attribute != Attribute::none && !isThere)
      {
        return true;
      }
      if (tree_.offset(place) < first)
      {
        first = tree_.offset(place);
        text = isThere ? std::move(value.text) : std::string();
      }
      return false;
    };
    for (const uint32_t route : operand.routes)
    {
      visitRoute(path_.routes[route], at, [&](const Place& place) { return take(path_.routes[route], place); });
    }
    return text;
  }

  [[nodiscard]] bool isOne(uint32_t index) const noexcept
  {
    return expression(index).kind != Kind::nodes;
  }

  /// Whether one of the left values is so to one of the right ones. The left ones are kept in pieces: two lists
  /// that do not fit together cost a walk over the right one for each of these.
  bool compares(const Expression& comparison, const At& at)
  {
    if (isOne(comparison.parts[0]) || isOne(comparison.parts[1]))
    {
      return !visitValues(comparison.parts[0], at, [&](const Value& value) {
        return visitValues(comparison.parts[1], at,
                           [&](const Value& right) { return !compare(comparison.comparison, value, right); });
      });
    }
    constexpr size_t mostValues = 4096;
    constexpr size_t mostBytes = size_t{1024} * 1024;
    std::vector<Value> left;
    size_t bytes = 0;
    const auto fits = [&](const Value& right) {
      return std::any_of(left.begin(), left.end(),
                         [&](const Value& value) { return compare(comparison.comparison, value, right); });
    };
    const auto search = [&] {
      return left.empty() ||
             visitValues(comparison.parts[1], at, [&](const Value& right) { return !fits(right); });
    };
    const bool none = visitValues(comparison.parts[0], at, [&](const Value& value) {
      bytes += value.text.size();
      left.push_back(value);
      if (left.size() < mostValues && bytes < mostBytes)
      {
        return true;
      }
      const bool missed = search();
      left.clear();
      bytes = 0;
      return missed;
    });
    return !none || !search();
  }

  Tree& tree_;
  const Compiled& path_;
  std::map<std::pair<uint64_t, const Expression*>, bool> known_{}; ///< by offset and condition
};

} // namespace tav::detail::paths
