#include "layer/indexWalk.h"

#include <algorithm>
#include <utility>

#include "tav/core/search.hpp"

namespace tav::detail
{

void IndexWalk::run(const Node& start, uint64_t stop)
{
  begin(start);
  std::error_code ec;
  uint32_t rc = TAV_RC_OK;
  DescendantRange nodes = from_.around.empty() ? start.descendants(ec, EndElements::show) : goOn(start, ec, rc);
  isAtEnd_ = rc != TAV_RC_OK || walk(nodes, stop, rc);
  rc_ = rc != TAV_RC_OK ? rc : codeOf(ec);
}

void IndexWalk::begin(const Node& start)
{
  seen.clear();
  groups.assign(from_.around.size(), {});
  open_.clear();
  places_ = from_.around;
  for (uint32_t level = 0; level < places_.size(); ++level)
  {
    open_.push_back(level);
  }
  if (from_.around.empty())
  {
    seen.push({start.offset(), 0, start.elm(), layout::is64(start.header()), true});
    groups.emplace_back();
    open_.push_back(0);
    places_.push_back(start.offset());
  }
}

/// The walk at the part's first node, as a walk from the start is when it has come there.
DescendantRange IndexWalk::goOn(const Node& start, std::error_code& ec, uint32_t& rc) const
{
  ReaderState& state = *start.state_;
  TAVHeaderData data = start.data_;
  Stack<TAVHeader> around;
  for (size_t level = 1; level <= from_.around.size() && rc == TAV_RC_OK; ++level)
  {
    around.push(data.header);
    const uint64_t offset = level < from_.around.size() ? from_.around[level] : from_.offset;
    rc = tavReadNodeInt(0, state.handle, offset, layout::hasChildren64(around.back()), &data);
  }
  Node node(state, data);
  node.parent_ = around.back();
  around.pop();
  return {DescendantRange::At{node}, std::move(around), EndElements::show, &ec};
}

/// Whether the walk is over. `rc` is not of the walk.
bool IndexWalk::walk(DescendantRange& nodes, uint64_t stop, uint32_t& rc)
{
  static_cast<void>(nodes.begin());
  for (bool isThere = !nodes.done_; isThere; isThere = nodes.advance())
  {
    const Node& node = nodes.current();
    const size_t depth = nodes.depth();
    if (node.offset() >= stop)
    {
      open_.resize(depth);
      behind_ = {{places_.begin(), places_.begin() + static_cast<std::ptrdiff_t>(depth)}, node.offset()};
      return false;
    }
    if (layout::isEndElement(node.elm()))
    {
      // What is below an element that only ends a group is below no node that a path leads through.
      nodes.skip();
      continue;
    }
    if (seen.size() >= kMostNodes)
    {
      rc = TAV_RC_NO_MEMORY;
      return true;
    }
    take(node, depth);
    takeElements(nodes, stop);
  }
  return true;
}

/// Takes the data elements that stand right behind the present node in a block, in no more steps than that needs.
void IndexWalk::takeElements(DescendantRange& nodes, uint64_t stop)
{
  Node& node = nodes.current_;
  ReaderState& state = *node.state_;
  if (node.isGroup() || state.inPlace != InPlace::block || !core::hasNeverTraced())
  {
    return;
  }
  const BlockInPlace block(*state.handle);
  const core::BlockLevel level(block, std::min(nodes.end_, stop));
  const uint32_t parent = open_[nodes.depth() - 1];
  const auto isNoEnd = [](const auto& found) { return found.elm() < TAV_ELM_CMN_END_HDR_MARKER; };
  IndexGroup group = groups[parent];
  size_t left = kMostNodes - seen.size();
  uint8_t* spot = level.at(node.behind());
  const uint8_t* const last = core::passNodes(level, spot, TAV_TYPE_HEADER64 + 1, isNoEnd, [&](const auto& found) {
    if (left == 0)
    {
      return false;
    }
    --left;
    group.see(found.elm());
    seen.push({found.offset(), parent, found.elm(), true, false});
    return true;
  });
  groups[parent] = group;
  if (last != nullptr)
  {
    static_cast<void>(
        core::readNode<true>(block, *state.handle, static_cast<uint64_t>(last - level.base), node.data_));
  }
}

void IndexWalk::take(const Node& node, size_t depth)
{
  const uint32_t parent = open_[depth - 1];
  groups[parent].see(node.elm());
  seen.push({node.offset(), parent, node.elm(), layout::is64(node.header()), node.isGroup()});
  if (node.isGroup())
  {
    groups[parent].holdsGroups = true;
    open_.resize(depth);
    places_.resize(depth);
    open_.push_back(static_cast<uint32_t>(groups.size()));
    places_.push_back(node.offset());
    groups.emplace_back();
  }
}

} // namespace tav::detail
