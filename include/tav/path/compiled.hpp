/// @file compiled.hpp
/// What a path is when it has been read: routes of steps, and the expressions in its brackets.
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

#include "tav/layout.hpp"
#include "tav/path/names.hpp"

namespace tav::detail::paths
{

enum class Axis : uint8_t
{
  child,
  descendantOrSelf,
  parent
};

/// One step of a route. The node itself (`.`) is no step: it leads nowhere else.
struct Step
{
  Axis axis = Axis::child;
  bool any = false;                   ///< of child: every element but those that only end a group
  uint16_t only = 0;                  ///< of child: the id, when there is one
  std::vector<uint16_t> ids{};        ///< of child: ascending, when there are several
  std::vector<uint32_t> predicates{}; ///< places of expressions
  size_t counters = 0;                ///< where its counters begin among those of the route

  [[nodiscard]] bool matches(uint16_t elm) const noexcept
  {
    return any           ? !layout::isEndElement(elm)
           : ids.empty() ? elm == only
                         : std::binary_search(ids.begin(), ids.end(), elm);
  }
};

/// A way from a node: so many levels up, then steps. What is between two `|`.
struct Route
{
  bool absolute = false;                 ///< from above the roots
  size_t ups = 0;                        ///< `..` in front
  std::vector<Step> steps{};             ///< no two descendantOrSelf follow each other
  Attribute attribute = Attribute::none; ///< of what the steps lead to
  bool hasParents = false;               ///< a step leads up
  size_t climb = 0;                      ///< how far above its start the steps can lead
  size_t counters = 0;                   ///< two a predicate: how many it has seen, and how many there are
};

enum class Operator : uint8_t
{
  equal,
  unequal,
  less,
  lessOrEqual,
  greater,
  greaterOrEqual
};

/// An expression in brackets. Parts and routes are places in the path's lists.
struct Expression
{
  enum class Kind : uint8_t
  {
    either,     ///< one of the parts holds
    both,       ///< all parts hold
    negation,   ///< the one part does not hold
    comparison, ///< of two values
    contains,   ///< a value in another one
    startsWith,
    nodes,  ///< what the routes lead to
    text,   ///< a text in quotation marks
    number, ///< positions * position() + lasts * last() + a constant
    offset  ///< the node at this offset
  };
  Kind kind = Kind::nodes;
  Operator comparison = Operator::equal;
  std::vector<uint32_t> parts{};
  std::vector<uint32_t> routes{};
  std::string text{};    ///< a text, or the digits of a number that is alone
  int64_t positions = 0; ///< how often position() is added
  int64_t lasts = 0;
  int64_t constant = 0;
  uint64_t offset = 0;
  bool usesPlace = false; ///< asks for position() or last(), itself or in a part
  bool nests = false;     ///< depends on the node alone, and asks conditions of other nodes
};

struct Compiled
{
  std::vector<Route> routes{};  ///< of the path and of the expressions
  std::vector<uint32_t> main{}; ///< those of the path
  std::vector<Expression> expressions{};
  /// Own elements with a tag, ascending, where an attribute shows which have none.
  std::vector<uint16_t> ownTags{};
  bool isStraight = false;  ///< one route, each step of which asks for children with one id, all of them or the first
  bool leavesStart = false; ///< something in it begins above the roots, or leads up from a node
  bool keepsPlaces =
      false; ///< the nodes on the way down have to be kept, to go back to them or to count their children
};

} // namespace tav::detail::paths
