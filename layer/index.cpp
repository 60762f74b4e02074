// The table of tav::Index.
#include "tav/cpp/index.hpp"

#include <algorithm>
#include <vector>

#include "layer/countedPath.h"
#include "layer/indexEntries.h"
#include "layer/indexParts.h"

namespace tav::detail
{

class NodeIndex final : public IndexTable
{
public:
  explicit NodeIndex(const Node& start)
      : start_(start), isEnd_(layout::isEndElement(start.elm()))
  {
  }

  uint32_t make(const IndexWork& work)
  {
    IndexParts parts(start_, work);
    const uint32_t rc = parts.walk();
    entries_ = parts.arrange();
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
    const Route& route = path.routes[path.main.front()];
    eachMatch(path, route, [&](uint32_t child, uint32_t parent) {
      Node node;
      rc = read(child, parent, node);
      return rc == TAV_RC_OK && taker.take(taker.to, node);
    });
    return rc;
  }
  bool findFirst(const paths::Compiled& path, std::optional<Node>& found, uint32_t& rc) const
  {
    uint32_t child = kNone;
    uint32_t parent = 0;
    if (!isEnd_ && followIds(paths::countedOf(path), child, parent)) [[likely]]
    {
      rc = read(child, parent, found.emplace());
    }
    else if (!knows(path))
    {
      return false;
    }
    else
    {
      const auto take = [](void* to, const Node& node) {
        *static_cast<std::optional<Node>*>(to) = node;
        return false;
      };
      rc = find(path, {&found, take});
    }
    if (rc != TAV_RC_OK)
    {
      found.reset();
    }
    return true;
  }
  [[nodiscard]] size_t size() const noexcept override
  {
    return entries_.size() - 1;
  }
  [[nodiscard]] size_t memory() const noexcept override
  {
    return entries_.memory();
  }

private:
  using Step = paths::Step;
  using Route = paths::Route;
  using Expression = paths::Expression;
  using Axis = paths::Axis;
  using Compiled = paths::Compiled;
  using Entry = IndexEntry;

  /// A node that a step has led to.
  struct Spot
  {
    uint64_t offset;
    uint32_t entry;
    uint32_t parent;
  };

  static constexpr uint32_t kNone = IndexEntries::kNone;
  static constexpr size_t kMostSteps = 64; ///< of a path that is looked up: one recursion a step

  static int compareSpots(const void* one, const void* other) noexcept
  {
    return compareOffsets(static_cast<const Spot*>(one)->offset, static_cast<const Spot*>(other)->offset);
  }
  /// Of a short path by the first child of each step, which leads to the first match where it leads anywhere.
  bool followIds(const paths::Counted& path, uint32_t& found, uint32_t& parent) const noexcept
  {
    uint32_t at = path.idCount != 0 ? 0 : kNone;
    for (uint32_t i = 0; i < path.idCount && at != kNone; ++i)
    {
      parent = at;
      at = entries_.firstOf(parent, path.ids[i]);
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
    sortItems<Spot, compareSpots>(found.data(), found.size());
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
    const uint32_t first = entries_.firstOf(parent, step.only);
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
    sortItems<Spot, compareSpots>(children.data(), children.size());
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
    node.state_ = &state;
    node.isFast_ = state.isFast;
    node.parent_ = start_.header();
    uint32_t rc = TAV_RC_OK;
    if (!readInPlace(entries_[child], parent, node)) [[unlikely]]
    {
      TAVHeaderData around;
      rc = parent != 0 ? read(entries_[parent], around) : TAV_RC_OK;
      node.parent_ = parent != 0 ? around.header : node.parent_;
      rc = rc == TAV_RC_OK ? read(entries_[child], node.data_) : rc;
    }
    node.fetch_ = state.fetches;
    return rc;
  }

  /// Both of them in one go, as most are.
  bool readInPlace(const Entry& entry, uint32_t parent, Node& node) const noexcept
  {
    const Entry& group = entries_[parent];
    ReaderState& state = *start_.state_;
    if (state.inPlace != InPlace::block || !entry.isWide || !group.isWide || !core::hasNeverTraced()) [[unlikely]]
    {
      return false;
    }
    const BlockInPlace block(*state.handle);
    core::Place around = block.nowhere();
    core::Place place = block.nowhere();
    if (!core::findNode<true>(block, group.offset, around) || !core::findNode<true>(block, entry.offset, place) ||
        core::NodeFound<true>{{around.header, false}, group.offset}.elm() != group.elm ||
        core::NodeFound<true>{{place.header, false}, entry.offset}.elm() != entry.elm) [[unlikely]]
    {
      return false;
    }
    if (parent != 0)
    {
      TAVHeaderData data;
      core::describe<true, BlockInPlace::Way>(around.header, false, group.offset, nullptr, 0, data);
      node.parent_ = data.header;
    }
    return core::handOut<true>(block, *state.handle, place, node.data_) == TAV_RC_OK;
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
  IndexEntries entries_;
};

IndexTable* makeIndex(const Node& start, const IndexWork& work, uint32_t& rc)
{
  Owner<NodeIndex> index(new NodeIndex(start));
  rc = index->make(work);
  return index.release();
}

IndexTable* makeIndex(const Node& start, uint32_t& rc)
{
  return makeIndex(start, {}, rc);
}

/// All tables are made here.
bool findFirst(const IndexTable& table, const paths::Compiled& path, std::optional<Node>& found, uint32_t& rc)
{
  return static_cast<const NodeIndex&>(table).findFirst(path, found, rc);
}

IndexBytes indexBytesOf(const Node& start) noexcept
{
  return IndexParts::bytesOf(start);
}

} // namespace tav::detail
