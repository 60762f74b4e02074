#include "layer/indexParts.h"

namespace tav::detail
{

IndexParts::IndexParts(const Node& start, const IndexWork& work)
    : start_(start), work_(work), parts_(work.seams.size() + 1)
{
  for (size_t i = 0; i < work.seams.size(); ++i)
  {
    const IndexSeam& seam = work.seams[i];
    parts_[i + 1].walk = IndexWalk({{seam.around.begin(), seam.around.end()}, seam.offset});
    parts_[i].stop = seam.offset;
  }
}

IndexBytes IndexParts::bytesOf(const Node& start) noexcept
{
  const ReaderState* const state = start.state_;
  if (state == nullptr || state->isBuffered() || state->handle->pDirectData == nullptr || state->handle->curOffset != 0)
  {
    return {};
  }
  const TAVHandle& handle = *state->handle;
  return {{reinterpret_cast<const std::byte*>(handle.pDirectData), static_cast<size_t>(handle.directDataSize)},
          {.byteOrder = state->isSwapped() ? ByteOrder::swapped : ByteOrder::native, .align8 = handle.alignMode == 1}};
}

/// Calls `piece(i)` for each part. It does not throw.
template<class Piece>
void IndexParts::eachPart(const Piece& piece)
{
  struct Call
  {
    const Piece& piece;
  } call{piece};
  if (work_.run != nullptr && parts_.size() > 1)
  {
    const auto of = [](void* to, size_t i) { static_cast<Call*>(to)->piece(i); };
    work_.run(work_.to, parts_.size(), of, &call);
    return;
  }
  for (size_t i = 0; i < parts_.size(); ++i)
  {
    piece(i);
  }
}

uint32_t IndexParts::walk()
{
  if (parts_.size() == 1)
  {
    parts_[0].walk.run(start_, parts_[0].stop);
    return parts_[0].walk.code();
  }
  start_.beginWalk();
  bytes_ = bytesOf(start_);
  eachPart([this](size_t i) { walkAlone(i); });
  size_t nodes = 0;
  for (size_t i = 0;; ++i)
  {
    settle(i);
    if (isTooMuch(i, nodes))
    {
      parts_.resize(i);
      return TAV_RC_NO_MEMORY;
    }
    if (parts_[i].walk.isAtEnd())
    {
      parts_.resize(i + 1);
      return parts_[i].walk.code();
    }
  }
}

/// By a handle of its own, as each is used by one thread at a time.
void IndexParts::walkAlone(size_t part) noexcept
{
  try
  {
    auto* const block = const_cast<std::byte*>(bytes_.bytes.data()); // reading writes nothing
    TAVSSMemory storage(block, bytes_.bytes.size());
    ReaderState state;
    TAVHeaderData data{};
    uint32_t rc = openHandle(&storage, TAV_OPT_READ, bytes_.options, state.handle);
    state.settle();
    rc = rc == TAV_RC_OK ? tavReadNodeInt(0, state.handle, start_.offset(), layout::is64(start_.header()), &data) : rc;
    if (rc == TAV_RC_OK)
    {
      parts_[part].walk.run(Node(state, data), parts_[part].stop);
      parts_[part].isWalked = true;
    }
  }
  catch (...)
  {
    parts_[part].isWalked = false; // the caller's thread tries once more, and throws
  }
}

/// Makes sure that a part begins where the one before it stands, and was walked through from there.
void IndexParts::settle(size_t part)
{
  Part& one = parts_[part];
  if (part != 0 && one.walk.from() != parts_[part - 1].walk.behind())
  {
    one.walk = IndexWalk(parts_[part - 1].walk.behind());
    one.isWalked = false;
  }
  if (!one.isWalked)
  {
    one.walk.run(start_, one.stop);
    one.isWalked = true;
  }
}

bool IndexParts::isTooMuch(size_t part, size_t& nodes) const
{
  nodes += parts_[part].walk.seen.size();
  return nodes > IndexWalk::kMostNodes;
}

/// Adds the children that groups of the parts before have in this one.
void IndexParts::countAround(size_t part)
{
  Part& one = parts_[part];
  for (size_t level = 0; level < one.walk.from().around.size(); ++level)
  {
    Part& before = parts_[part - 1];
    const uint32_t known = before.walk.open()[level];
    IndexGroup& group = known < before.around.size() ? *before.around[known].group : before.walk.groups[known];
    one.around.push_back({&group, group.count});
    group.see(one.walk.groups[level]);
  }
}

/// Calls with each group that begins in a part.
template<class Take>
void IndexParts::eachGroup(size_t part, const Take& take)
{
  const std::vector<IndexGroup>& groups = parts_[part].walk.groups;
  for (size_t i = parts_[part].around.size(); i < groups.size(); ++i)
  {
    take(groups[i]);
  }
}

IndexEntries IndexParts::arrange()
{
  size_t nodes = 0;
  for (size_t i = 0; i < parts_.size(); ++i)
  {
    countAround(i);
    nodes += parts_[i].walk.seen.size();
  }
  uint32_t next = 1; // behind the start
  for (Part& part : parts_)
  {
    for (size_t i = part.around.size(); i < part.walk.groups.size(); ++i)
    {
      IndexGroup& group = part.walk.groups[i];
      group.first = next;
      group.next = next;
      next += group.count;
    }
  }
  IndexEntries entries(nodes);
  eachPart([&](size_t i) { place(i, entries); });
  eachPart([&](size_t i) {
    eachGroup(i, [&](const IndexGroup& group) {
      if (!group.rises)
      {
        entries.order(group.first, group.count);
      }
    });
  });
  // Ordering moves groups, which are found again as children.
  entries.finish(entries[0]);
  eachPart([&](size_t i) {
    eachGroup(i, [&](const IndexGroup& group) {
      for (uint32_t child = 0; group.holdsGroups && child < group.count; ++child)
      {
        entries.finish(entries[group.first + child]);
      }
    });
  });
  return entries;
}

/// Of a group, how its children are found.
void IndexParts::tell(const IndexGroup& group, IndexEntry& entry) noexcept
{
  entry.tell(group.first, group.count, group.firstId, group.lastId, group.idCount);
  if (!group.rises)
  {
    entry.children = IndexEntry::Children::unknown;
  }
}

void IndexParts::place(size_t part, IndexEntries& entries) noexcept
{
  std::vector<IndexGroup>& groups = parts_[part].walk.groups;
  size_t known = parts_[part].around.size();
  for (size_t level = 0; level < known; ++level)
  {
    const Around& around = parts_[part].around[level];
    groups[level].next = around.group->first + around.before;
  }
  bool isStart = known == 0;
  parts_[part].walk.seen.each([&](const IndexSeen& node) {
    const uint32_t at = isStart ? 0 : groups[node.parent].next++;
    entries[at] = {node.offset, 0, 0, node.elm, 0, 0, node.isWide, IndexEntry::Children::none};
    if (node.isGroup)
    {
      tell(groups[known++], entries[at]);
    }
    isStart = false;
  });
  parts_[part].walk.seen.clear();
}

} // namespace tav::detail
