/// One walk over all nodes below a root, at the speed of the layer where it can be.
#pragma once

#include "python/src/reader.h"
#include "tav/inspect/damageWatch.hpp"
#include "tav/inspect/problem.hpp"

namespace tav::python
{

/// The root of a walk.
struct WalkRoot
{
  tav::Node node;
  inspect::Form form;
};

/// Hands what a walk from a root has passed over to the account, or throws Error.
void passOver(Opened& opened, const WalkRoot& root, const inspect::PassedOver& passed);

/// The payload of a data element where it is whole, else null.
inline const uint8_t* payloadIn(std::span<const uint8_t> bytes, const TAVHeader& header)
{
  const uint64_t from = header.nodeOffset + layout::headerLength(header.hdrType); // of a header that was read
  const uint64_t size = layout::sizeOf(header);
  return from <= bytes.size() && size <= bytes.size() - from ? bytes.data() + from : nullptr;
}

/// A walk that begins at a node, and goes no further than the groups around it do.
inline inspect::Walker walkerAt(const Opened& opened, inspect::ByteSource& source, const WalkRoot& root)
{
  const inspect::WalkStart start{.offset = root.node.offset(), .wide = root.node.width() == Width::bits64};
  const uint64_t bound = opened.document.boundOf(root.node);
  inspect::Walker walker(source, root.form, start);
  if (bound >= source.size())
  {
    return walker;
  }
  inspect::Walker::State state = walker.state();
  state.frames.front().limit = bound;
  return inspect::Walker::from(source, root.form, state);
}

/// Through damage, with paths where they are asked for.
template<class Visit>
void walkCarefully(Opened& opened, inspect::ByteSource& source, const WalkRoot& root, bool withPaths, Visit&& visit)
{
  inspect::DamageWatch watch(source, root.form,
                             [&](const inspect::PassedOver& passed) { passOver(opened, root, passed); });
  inspect::Walker walker = walkerAt(opened, source, root);
  std::string path;
  inspect::Event event;
  while (walker.next(event) && !(event.what == inspect::What::nodeEnd && event.depth == 0))
  {
    watch.see(walker, event);
    const bool isShown = event.what == inspect::What::nodeBegin && event.depth != 0 && !inspect::isEndPiece(event);
    if (!isShown)
    {
      continue;
    }
    if (withPaths)
    {
      path = walker.path(event);
    }
    const bool isGroup = event.node.isGroup();
    visit(Step{event.node.header, isGroup ? nullptr : payloadIn(opened.bytes, event.node.header), event.depth, isGroup,
               withPaths ? &path : nullptr});
  }
}

/// By the exact rules. Where they do not lead on, the careful walk does: it knows where groups end that were never
/// closed, and says what is damaged.
template<class Visit>
void walkExactly(Opened& opened, inspect::ByteSource& source, const tav::Reader& reader, const WalkRoot& root,
                 Visit&& visit)
{
  const tav::Node node = reader.at(root.node.offset(), root.node.width());
  std::error_code ec;
  DescendantRange nodes = node.descendants(ec);
  uint64_t last = root.node.offset();
  bool isOpen = false;
  for (const tav::Node& each : nodes)
  {
    const bool isGroup = each.isGroup();
    if (isGroup && layout::isSizeUnknown(each.header()))
    {
      isOpen = true;
      break;
    }
    last = each.offset();
    visit(Step{each.header(), isGroup ? nullptr : payloadIn(opened.bytes, each.header()), nodes.depth(), isGroup,
               nullptr});
  }
  if (ec || isOpen)
  {
    walkCarefully(opened, source, root, false, [&](const Step& step) {
      if (step.header.nodeOffset > last)
      {
        visit(step);
      }
    });
  }
}

template<class Visit>
void walkBelow(Opened& opened, inspect::ByteSource& source, const tav::Reader& reader, const WalkRoot& root,
               bool withPaths, Visit&& visit)
{
  if (!root.node.isGroup())
  {
    return;
  }
  if (withPaths || opened.onDamage == inspect::OnDamage::skip || root.node.isOpen() ||
      root.node.size() == 0 || opened.document.boundOf(root.node) < source.size())
  {
    walkCarefully(opened, source, root, withPaths, visit);
  }
  else
  {
    walkExactly(opened, source, reader, root, visit);
  }
}

/// All roots, by the document.
std::vector<WalkRoot> rootsOf(Opened& opened);

} // namespace tav::python
