// The table of tav::Index.
#include "tav/cpp/index.hpp"

#include <algorithm>
#include <cstdlib>
#include <vector>

#include "layer/countedPath.h"

namespace tav::detail
{

class NodeIndex final : public IndexTable
{
public:
  explicit NodeIndex(const Node& start)
      : start_(start), isEnd_(layout::isEndElement(start.elm()))
  {
  }

  uint32_t make()
  {
    std::vector<Seen> seen;
    const uint32_t rc = walk(seen);
    arrange(seen);
    fillTable();
    return rc;
  }

  [[nodiscard]] IndexTable* copy() const override
  {
    return new NodeIndex(*this);
  }
  [[nodiscard]] bool knows(const paths::Compiled& path) const noexcept override
  {
    return (paths::countedOf(path).idCount != 0 && !isEnd_) || routeOf(path) != nullptr;
  }
  uint32_t find(const paths::Compiled& path, const Taker& taker) const override
  {
    uint32_t rc = TAV_RC_OK;
    const auto visit = [&](uint32_t child, uint32_t parent) {
      Node node;
      rc = read(child, parent, node);
      return rc == TAV_RC_OK && taker.take(taker.to, node);
    };
    uint32_t first = kNone;
    uint32_t parent = 0;
    if (followIds(paths::countedOf(path), first, parent) && !visit(first, parent))
    {
      return rc;
    }
    const Route& route = path.routes[path.main.front()];
    eachMatch(path, route, [&](uint32_t child, uint32_t group) { return child == first || visit(child, group); });
    return rc;
  }
  [[nodiscard]] size_t size() const noexcept override
  {
    return entries_.empty() ? 0 : entries_.size() - 1;
  }
  [[nodiscard]] size_t memory() const noexcept override
  {
    return entries_.capacity() * sizeof(Entry) + table_.capacity() * sizeof(uint32_t);
  }

private:
  using Step = paths::Step;
  using Route = paths::Route;
  using Expression = paths::Expression;
  using Axis = paths::Axis;
  using Compiled = paths::Compiled;

  /// Children stand next to each other, those of one id in stream order. The first entry is the start.
  struct Entry
  {
    uint64_t offset;
    uint32_t firstChild;
    uint32_t childCount;
    uint16_t elm;
    bool isWide;
  };
  static_assert(sizeof(Entry) == 24);

  /// A node as the walk comes by.
  struct Seen
  {
    uint64_t offset;
    uint32_t parent;
    uint16_t elm;
    bool isWide;
  };

  /// A node that a step has led to.
  struct Spot
  {
    uint64_t offset;
    uint32_t entry;
    uint32_t parent;
  };

  static constexpr uint32_t kNone = ~uint32_t{0};
  static constexpr size_t kMostSteps = 64; ///< of a path that is looked up: one recursion a step

  uint32_t walk(std::vector<Seen>& seen)
  {
    std::error_code ec;
    std::vector<uint32_t> open(1, 0); // the node around each level
    seen.push_back({start_.offset(), kNone, start_.elm(), layout::is64(start_.header())});
    // What is below an element that only ends a group is below no node that a path leads through.
    DescendantRange nodes = start_.descendants(ec, EndElements::show);
    for (const Node& node : nodes)
    {
      if (layout::isEndElement(node.elm()))
      {
        nodes.skip();
        continue;
      }
      if (seen.size() >= kNone)
      {
        return TAV_RC_NO_MEMORY;
      }
      const size_t depth = nodes.depth();
      open.resize(depth);
      const auto at = static_cast<uint32_t>(seen.size());
      seen.push_back({node.offset(), open[depth - 1], node.elm(), layout::is64(node.header())});
      open.push_back(at);
    }
    return codeOf(ec);
  }

  /// Puts children next to each other, in the order of their parents.
  void arrange(const std::vector<Seen>& seen)
  {
    std::vector<uint32_t> next(seen.size() + 1, 0); // children of each node, then where the next of them goes
    for (size_t i = 1; i < seen.size(); ++i)
    {
      ++next[seen[i].parent];
    }
    std::vector<uint32_t> counts(next.begin(), next.end() - 1);
    uint32_t place = 1;
    for (uint32_t& each : next)
    {
      const uint32_t count = each;
      each = place;
      place += count;
    }
    const std::vector<uint32_t> first(next.begin(), next.end() - 1);
    entries_.resize(seen.size());
    for (size_t i = 0; i < seen.size(); ++i)
    {
      const size_t at = i == 0 ? 0 : next[seen[i].parent]++;
      entries_[at] = {seen[i].offset, first[i], counts[i], seen[i].elm, seen[i].isWide};
    }
    for (size_t i = 0; i < seen.size(); ++i)
    {
      sort<Entry, compareEntries>(entries_.data() + first[i], counts[i]);
    }
  }

  static int compareEntries(const void* one, const void* other) noexcept
  {
    const auto& a = *static_cast<const Entry*>(one);
    const auto& b = *static_cast<const Entry*>(other);
    return a.elm != b.elm ? (a.elm < b.elm ? -1 : 1) : compareOffsets(a.offset, b.offset);
  }
  static int compareSpots(const void* one, const void* other) noexcept
  {
    return compareOffsets(static_cast<const Spot*>(one)->offset, static_cast<const Spot*>(other)->offset);
  }
  static int compareOffsets(uint64_t one, uint64_t other) noexcept
  {
    return one < other ? -1 : one > other ? 1
                                          : 0;
  }
  /// As std::sort, whose header is larger than all of this; most lists are in order.
  template<class T, int (*Compare)(const void*, const void*)>
  static void sort(T* items, size_t count) noexcept
  {
    size_t ordered = 1;
    while (ordered < count && Compare(items + ordered - 1, items + ordered) <= 0) ++ordered;
    if (ordered < count)
    {
      std::qsort(items, count, sizeof(T), Compare);
    }
  }

  /// The places of the table in which a group's children are found: next to each other, and three for two children.
  struct Shelf
  {
    size_t first;
    uint32_t size;
  };
  static Shelf shelfOf(const Entry& group) noexcept
  {
    const auto before = [](uint64_t children) { return static_cast<size_t>(children + children / 2); };
    const size_t first = before(group.firstChild);
    return {first, static_cast<uint32_t>(before(uint64_t{group.firstChild} + group.childCount) - first)};
  }
  /// Where on its shelf an id is looked for first. Ids in a row, as most groups have them, do not meet there.
  static uint32_t placeOn(const Shelf& shelf, uint16_t elm) noexcept
  {
    const uint32_t mixed = elm * 0x9E3779B9U;
    const uint64_t scaled = uint64_t{mixed} * shelf.size;
    return static_cast<uint32_t>(scaled >> 32U);
  }

  /// The first child of each id below each node.
  void fillTable()
  {
    table_.assign(entries_.size() + entries_.size() / 2, kNone);
    for (const Entry& group : entries_)
    {
      const Shelf shelf = shelfOf(group);
      const uint32_t end = group.firstChild + group.childCount;
      for (uint32_t child = group.firstChild; child != end; ++child)
      {
        if (child != group.firstChild && entries_[child].elm == entries_[child - 1].elm)
        {
          continue;
        }
        uint32_t at = placeOn(shelf, entries_[child].elm);
        while (table_[shelf.first + at] != kNone)
        {
          at = at + 1 < shelf.size ? at + 1 : 0;
        }
        table_[shelf.first + at] = child;
      }
    }
  }

  /// The first child with an id; kNone where there is none.
  [[nodiscard]] uint32_t firstOf(const Entry& group, uint16_t elm) const noexcept
  {
    const Shelf shelf = shelfOf(group);
    uint32_t at = shelf.size != 0 ? placeOn(shelf, elm) : 0;
    for (uint32_t left = shelf.size; left != 0; --left)
    {
      const uint32_t child = table_[shelf.first + at];
      if (child == kNone || entries_[child].elm == elm)
      {
        return child;
      }
      at = at + 1 < shelf.size ? at + 1 : 0;
    }
    return kNone;
  }

  /// Of a short path by the first child of each step, which leads to the first match where it leads anywhere.
  bool followIds(const paths::Counted& path, uint32_t& found, uint32_t& parent) const noexcept
  {
    uint32_t at = path.idCount != 0 ? 0 : kNone;
    for (uint32_t i = 0; i < path.idCount && at != kNone; ++i)
    {
      parent = at;
      at = firstOf(entries_[parent], path.ids[i]);
    }
    found = at;
    return at != kNone;
  }

  /// The route of a path that is looked up; null for one that takes a walk.
  [[nodiscard]] const Route* routeOf(const Compiled& compiled) const noexcept
  {
    if (compiled.main.size() != 1 || compiled.leavesStart || isEnd_)
    {
      return nullptr;
    }
    const Route& route = compiled.routes[compiled.main.front()];
    const size_t count = route.steps.size();
    bool isKnown = count != 0 && count <= kMostSteps && route.steps.back().axis == Axis::child;
    for (size_t i = 0; isKnown && i < count; ++i)
    {
      isKnown = isLookedUp(compiled, route.steps[i]);
    }
    return isKnown ? &route : nullptr;
  }
  static bool isLookedUp(const Compiled& path, const Step& step) noexcept
  {
    if (step.axis != Axis::child)
    {
      return step.axis == Axis::descendantOrSelf;
    }
    if (step.matches(TAV_ELM_CMN_END_HDR_MARKER) || step.matches(TAV_ELM_CMN_END_HDR_EYE_SIZE))
    {
      return false;
    }
    if (step.predicates.empty())
    {
      return true;
    }
    const Expression& place = path.expressions[step.predicates.front()];
    return step.predicates.size() == 1 && place.kind == Expression::Kind::number && !place.usesPlace &&
           place.constant > 0;
  }
  /// The place that a step asks for among what it matches; 0: all of them.
  static uint64_t placeOf(const Compiled& path, const Step& step) noexcept
  {
    return step.predicates.empty()
               ? 0
               : static_cast<uint64_t>(path.expressions[step.predicates.front()].constant);
  }

  /// Calls `visit(child, parent)` for what the steps from `level` on find below a node, in stream order, until it is
  /// false. No step of them is `//`.
  template<class Visit>
  bool search(const Compiled& path, const Route& route, size_t level, uint32_t parent, const Visit& visit) const
  {
    const bool isLast = level + 1 == route.steps.size();
    return eachChild(path, route.steps[level], parent, [&](uint32_t child) {
      return isLast ? visit(child, parent) : search(path, route, level + 1, child, visit);
    });
  }

  /// The same for a path with `//`: step by step, as several ways lead to one node then, and not in stream order.
  template<class Visit>
  void searchLevels(const Compiled& path, const Route& route, const Visit& visit) const
  {
    std::vector<Spot> found(1, Spot{entries_[0].offset, 0, 0});
    for (const Step& step : route.steps)
    {
      found = step.axis == Axis::child ? childrenOf(path, step, found) : withAllBelow(std::move(found));
    }
    sort<Spot, compareSpots>(found.data(), found.size());
    for (const Spot& spot : found)
    {
      if (!visit(spot.entry, spot.parent))
      {
        return;
      }
    }
  }
  [[nodiscard]] std::vector<Spot> childrenOf(const Compiled& path, const Step& step,
                                             const std::vector<Spot>& groups) const
  {
    std::vector<Spot> children;
    for (const Spot& group : groups)
    {
      eachChild(path, step, group.entry, [&](uint32_t child) {
        children.push_back({entries_[child].offset, child, group.entry});
        return true;
      });
    }
    return children;
  }
  [[nodiscard]] std::vector<Spot> withAllBelow(std::vector<Spot>&& nodes) const
  {
    std::vector<bool> isThere(entries_.size());
    for (const Spot& node : nodes)
    {
      isThere[node.entry] = true;
    }
    for (size_t i = 0; i < nodes.size(); ++i)
    {
      const uint32_t parent = nodes[i].entry;
      const Entry& group = entries_[parent];
      for (uint32_t child = group.firstChild; child != group.firstChild + group.childCount; ++child)
      {
        if (!isThere[child])
        {
          isThere[child] = true;
          nodes.push_back({entries_[child].offset, child, parent});
        }
      }
    }
    return std::move(nodes);
  }

  /// Calls `take(child)` for the children that a step finds below a node, in stream order, until it is false.
  template<class Take>
  bool eachChild(const Compiled& path, const Step& step, uint32_t parent, const Take& take) const
  {
    const uint64_t place = placeOf(path, step);
    if (step.any || !step.ids.empty())
    {
      return eachOfSeveral(step, place, parent, take);
    }
    const uint32_t end = entries_[parent].firstChild + entries_[parent].childCount;
    const uint32_t first = firstOf(entries_[parent], step.only);
    if (first == kNone)
    {
      return true;
    }
    if (place != 0)
    {
      const bool isThere = place <= end - first && entries_[static_cast<uint32_t>(first + place - 1)].elm == step.only;
      return !isThere || take(static_cast<uint32_t>(first + place - 1));
    }
    for (uint32_t child = first; child != end && entries_[child].elm == step.only; ++child)
    {
      if (!take(child))
      {
        return false;
      }
    }
    return true;
  }

  /// The same for a step for any id, or for several.
  template<class Take>
  bool eachOfSeveral(const Step& step, uint64_t place, uint32_t parent, const Take& take) const
  {
    std::vector<Spot> children;
    const Entry& group = entries_[parent];
    for (uint32_t child = group.firstChild; child != group.firstChild + group.childCount; ++child)
    {
      if (step.matches(entries_[child].elm))
      {
        children.push_back({entries_[child].offset, child, parent});
      }
    }
    sort<Spot, compareSpots>(children.data(), children.size());
    if (place != 0)
    {
      return place > children.size() || take(children[static_cast<size_t>(place - 1)].entry);
    }
    return std::all_of(children.begin(), children.end(), [&take](const Spot& child) { return take(child.entry); });
  }

  template<class Visit>
  void eachMatch(const Compiled& path, const Route& route, const Visit& visit) const
  {
    bool hasLevels = false;
    for (const Step& step : route.steps)
    {
      hasLevels = hasLevels || step.axis != Axis::child;
    }
    hasLevels ? searchLevels(path, route, visit) : static_cast<void>(search(path, route, 0, 0, visit));
  }

  /// The node, which knows its group.
  uint32_t read(uint32_t child, uint32_t parent, Node& node) const noexcept
  {
    ReaderState& state = *start_.state_;
    TAVHeaderData around;
    around.header = start_.header();
    uint32_t rc = parent != 0 ? read(entries_[parent], around) : TAV_RC_OK;
    if (rc == TAV_RC_OK)
    {
      rc = read(entries_[child], node.data_);
    }
    node.state_ = &state;
    node.fetch_ = state.fetches;
    node.isFast_ = state.isFast;
    node.parent_ = around.header;
    return rc;
  }

  uint32_t read(const Entry& entry, TAVHeaderData& data) const noexcept
  {
    ReaderState& state = *start_.state_;
    TAVHandle& handle = *state.handle;
    ++state.fetches;
    const bool isInPlace = state.inPlace == InPlace::block && entry.isWide && core::hasNeverTraced();
    uint32_t rc = isInPlace ? core::readNode<true>(BlockInPlace(handle), handle, entry.offset, data)
                            : core::kNotHere;
    if (rc == core::kNotHere) [[unlikely]]
    {
      rc = tavReadNodeInt(0, &handle, entry.offset, entry.isWide, &data);
    }
    return rc == TAV_RC_OK && layout::elmOf(data.header) != entry.elm ? TAV_RC_OUTSIDE_PARENT : rc;
  }

  Node start_;
  bool isEnd_; ///< the start only ends a group
  std::vector<Entry> entries_;
  std::vector<uint32_t> table_; ///< of entries, by parent and id
};

IndexTable* makeIndex(const Node& start, uint32_t& rc)
{
  Owner<NodeIndex> index(new NodeIndex(start));
  rc = index->make();
  return index.release();
}

} // namespace tav::detail
