/// Walks by the straightforward way, for comparison: every scan looks at all bytes, and reads every node through the
/// handle.
#pragma once

#include <cstdint>
#include <vector>

#include "api/walkGuard.h"
#include "tav/layout.hpp"
#include "tav/tav.h"

namespace test
{

/// The first readable node behind the pair at an offset, or behind a later one.
inline uint32_t plainBehindPair(TAVHandle* handle, uint64_t position, TAVHeaderData* out)
{
  uint64_t eye = 0;
  uint64_t distance = 0;
  bool swapped = false;
  while (tavFindEyeSizeComboInt(handle, position, ~uint64_t{0} - position, true, &eye, &distance, &swapped) ==
         TAV_RC_OK)
  {
    if (tavReadNodeInt(0, handle, eye + 16, true, out) == TAV_RC_OK)
    {
      return TAV_RC_OK;
    }
    position = eye + 8;
  }
  return TAV_RC_NOT_FOUND;
}

/// What tavGetNextChild answers.
inline uint32_t plainNextChild(TAVHandle* handle, TAVHeader* parent, TAVHeader* reference, TAVHeaderData* out)
{
  namespace layout = tav::layout;
  if (parent == nullptr || reference == nullptr || !layout::isSizeUnknown(*reference) || !layout::isGroup(*reference))
  {
    return tavGetNextChild(0, handle, parent, reference, out);
  }
  const uint64_t group = reference->nodeOffset;
  const uint64_t size = layout::sizeOf(*reference);
  for (uint64_t position = group;;)
  {
    uint64_t eye = 0;
    uint64_t distance = 0;
    bool swapped = false;
    uint32_t rc = tavFindEyeSizeComboInt(handle, position, layout::sizeOf(*parent) - position, true, &eye, &distance,
                                         &swapped);
    rc = rc == TAV_RC_OK && distance > eye ? TAV_RC_NO_MEMORY : rc;
    TAVHeaderData node{};
    rc = rc == TAV_RC_OK ? tavReadNodeInt(0, handle, eye - distance, true, &node) : rc;
    if (rc != TAV_RC_OK)
    {
      return rc;
    }
    if (layout::isGroup(node.header) && layout::sizeOf(node.header) == size && node.header.nodeOffset == group)
    {
      return plainBehindPair(handle, eye, out);
    }
    position = eye + 16;
  }
}

/// What tavValidateSubtreeInt answers without containment, and what tavPrintSubtree ends with where each node can be
/// printed.
inline uint32_t plainValidate(TAVHandle* handle, const TAVHeader& start)
{
  std::vector<TAVHeader> stack{start};
  tav::inside::WalkGuard guard(start);
  TAVHeaderData node{};
  bool first = true;
  while (true)
  {
    TAVHeader parent = stack.back();
    TAVHeader previous = node.header;
    uint32_t rc = plainNextChild(handle, &parent, first ? nullptr : &previous, &node);
    first = false;
    if (rc == TAV_RC_NO_MORE_CHILDREN)
    {
      if (stack.size() < 2)
      {
        return TAV_RC_OK;
      }
      node.header = stack.back();
      stack.pop_back();
      continue;
    }
    if (rc == TAV_RC_OK && !guard.visit(node.header.nodeOffset))
    {
      rc = TAV_RC_OUTSIDE_PARENT;
    }
    if (rc == TAV_RC_OK && tav::layout::isGroup(node.header))
    {
      rc = stack.size() < 4000 ? TAV_RC_OK : TAV_RC_NO_MEMORY;
      stack.push_back(node.header);
      first = true;
    }
    if (rc != TAV_RC_OK)
    {
      return rc;
    }
  }
}

/// What tavFindLogicalGroup answers to a path whose first entry matches a group; no key is asked for. `found` is the
/// group's offset. TAV_RC_BAD_PARAM where the first entry matches none, which the operation does not return from.
inline uint32_t plainPath(TAVHandle* handle, const TAVHeader& start, const std::vector<uint16_t>& path, uint64_t& found)
{
  std::vector<TAVHeader> chain{start};
  tav::inside::WalkGuard guard(start);
  TAVHeaderData node{};
  bool first = true;
  bool any = false;
  while (chain.size() <= path.size())
  {
    TAVHeader parent = chain.back();
    TAVHeader previous = node.header;
    const uint32_t rc = plainNextChild(handle, &parent, first ? nullptr : &previous, &node);
    first = false;
    if (rc != TAV_RC_OK)
    {
      if (chain.size() == 1)
      {
        return any ? TAV_RC_NO_MEMORY : TAV_RC_BAD_PARAM;
      }
      node.header = chain.back();
      chain.pop_back();
    }
    else if (tav::layout::elmOf(node.header) == path[chain.size() - 1] && tav::layout::isGroup(node.header))
    {
      if (!guard.visit(node.header.nodeOffset))
      {
        return TAV_RC_OUTSIDE_PARENT;
      }
      any = true;
      chain.push_back(node.header);
      first = true;
    }
  }
  found = chain.back().nodeOffset;
  return TAV_RC_OK;
}

} // namespace test
