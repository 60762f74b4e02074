/// The nodes of an index, and how a child is found by its id.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <type_traits>
#include <utility>

namespace tav::detail
{

inline int compareOffsets(uint64_t one, uint64_t other) noexcept
{
  return one < other ? -1 : one > other ? 1
                                        : 0;
}

/// As std::sort, whose header is larger than all of this; most lists are in order.
template<class T, int (*Compare)(const void*, const void*)>
void sortItems(T* items, size_t count) noexcept
{
  constexpr size_t kFew = 32;
  size_t ordered = 1;
  while (ordered < count && Compare(items + ordered - 1, items + ordered) <= 0) ++ordered;
  if (count > kFew && ordered < count)
  {
    std::qsort(items, count, sizeof(T), Compare);
    return;
  }
  for (; ordered < count; ++ordered) // few are moved sooner than a call compares them
  {
    const T item = items[ordered];
    size_t at = ordered;
    for (; at != 0 && Compare(items + at - 1, &item) > 0; --at)
    {
      items[at] = items[at - 1];
    }
    items[at] = item;
  }
}

/// Memory that whoever writes to it first gets from the system, and not cleared.
template<class T>
class RawArray
{
  static_assert(std::is_trivially_copyable_v<T> && std::is_trivially_default_constructible_v<T>);

public:
  RawArray() = default;
  explicit RawArray(size_t count)
      : items_(count != 0 ? new T[count] : nullptr), count_(count)
  {
  }
  RawArray(const RawArray& other)
      : RawArray(other.count_)
  {
    if (count_ != 0)
    {
      std::memcpy(items_.get(), other.items_.get(), count_ * sizeof(T));
    }
  }
  RawArray(RawArray&& other) noexcept
      : items_(std::move(other.items_)), count_(std::exchange(other.count_, 0))
  {
  }
  RawArray& operator=(RawArray other) noexcept
  {
    std::swap(items_, other.items_);
    std::swap(count_, other.count_);
    return *this;
  }
  ~RawArray() = default;

  T& operator[](size_t at) noexcept
  {
    return items_[at];
  }
  const T& operator[](size_t at) const noexcept
  {
    return items_[at];
  }
  [[nodiscard]] size_t size() const noexcept
  {
    return count_;
  }

private:
  std::unique_ptr<T[]> items_;
  size_t count_ = 0;
};

struct IndexEntry
{
  /// How a child is found by its id.
  enum class Children : uint8_t
  {
    none,
    row,    ///< the ids are all those from the first on, each once: no table is needed
    shelf,  ///< by the table
    unknown ///< they are not in order yet
  };

  uint64_t offset;
  uint32_t firstChild;
  uint32_t childCount;
  uint16_t elm;
  uint16_t firstId; ///< of the children
  uint16_t idCount; ///< of different ids among them, but for one
  bool isWide;
  Children children;

  /// Of children that are in order.
  void tell(uint32_t first, uint32_t count, uint16_t smallest, uint16_t largest, uint32_t ids) noexcept
  {
    firstChild = first;
    childCount = count;
    firstId = smallest;
    idCount = static_cast<uint16_t>(ids - 1); // 65,536 at the most
    const bool isRow = ids == count && uint32_t{largest} - smallest == count - 1;
    children = count == 0 ? Children::none : isRow ? Children::row
                                                   : Children::shelf;
  }
};
static_assert(sizeof(IndexEntry) == 24);

/// Children stand next to each other, those of one id in stream order. The first entry is the start. Children are put
/// in order, then groups are finished; several threads may do so for different groups.
class IndexEntries
{
public:
  static constexpr uint32_t kNone = ~uint32_t{0};

  IndexEntries() = default;
  explicit IndexEntries(size_t count)
      : entries_(count), table_(count + count / 2)
  {
  }

  IndexEntry& operator[](size_t at) noexcept
  {
    return entries_[at];
  }
  const IndexEntry& operator[](size_t at) const noexcept
  {
    return entries_[at];
  }
  [[nodiscard]] size_t size() const noexcept
  {
    return entries_.size();
  }
  [[nodiscard]] size_t memory() const noexcept
  {
    return entries_.size() * sizeof(IndexEntry) + table_.size() * sizeof(uint32_t);
  }

  /// Puts children in the order in which they are looked up.
  void order(uint32_t first, uint32_t count) noexcept
  {
    sortItems<IndexEntry, compareEntries>(&entries_[first], count);
  }
  /// Makes the children of a group, which are in order, be found.
  void finish(IndexEntry& group) noexcept
  {
    if (group.children == IndexEntry::Children::unknown)
    {
      tellOrdered(group);
    }
    if (group.children == IndexEntry::Children::shelf)
    {
      fillShelf(group);
    }
  }

  /// The first child with an id; kNone where there is none.
  [[nodiscard]] uint32_t firstOf(uint32_t parent, uint16_t elm) const noexcept
  {
    const IndexEntry& group = entries_[parent];
    if (group.children != IndexEntry::Children::shelf)
    {
      const uint32_t place = uint32_t{elm} - group.firstId;
      return place < group.childCount ? group.firstChild + place : kNone;
    }
    const Shelf shelf = shelfOf(group);
    uint32_t at = placeOn(shelf, elm);
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

private:
  static int compareEntries(const void* one, const void* other) noexcept
  {
    const auto& a = *static_cast<const IndexEntry*>(one);
    const auto& b = *static_cast<const IndexEntry*>(other);
    return a.elm != b.elm ? (a.elm < b.elm ? -1 : 1) : compareOffsets(a.offset, b.offset);
  }

  /// The places of the table in which a group's children are found: next to each other, and three for two ids.
  struct Shelf
  {
    size_t first;
    uint32_t size;
  };
  static Shelf shelfOf(const IndexEntry& group) noexcept
  {
    const auto withSpare = [](uint64_t items) { return items + items / 2; };
    const uint64_t first = withSpare(group.firstChild);
    const uint64_t room = withSpare(uint64_t{group.firstChild} + group.childCount) - first;
    const uint64_t wanted = withSpare(uint64_t{group.idCount} + 1);
    return {static_cast<size_t>(first), static_cast<uint32_t>(wanted < room ? wanted : room)};
  }
  /// Where on its shelf an id is looked for first. Ids in a row, as most groups have them, do not meet there.
  static uint32_t placeOn(const Shelf& shelf, uint16_t elm) noexcept
  {
    const uint32_t mixed = elm * 0x9E3779B9U;
    const uint64_t scaled = uint64_t{mixed} * shelf.size;
    return static_cast<uint32_t>(scaled >> 32U);
  }

  void tellOrdered(IndexEntry& group) noexcept
  {
    const uint32_t last = group.firstChild + group.childCount - 1;
    uint32_t ids = 1;
    for (uint32_t child = group.firstChild; child != last; ++child)
    {
      ids += entries_[child].elm != entries_[child + 1].elm ? 1 : 0;
    }
    group.tell(group.firstChild, group.childCount, entries_[group.firstChild].elm, entries_[last].elm, ids);
  }

  /// The first child of each id.
  void fillShelf(const IndexEntry& group) noexcept
  {
    const Shelf shelf = shelfOf(group);
    for (uint32_t at = 0; at < shelf.size; ++at)
    {
      table_[shelf.first + at] = kNone;
    }
    uint32_t left = group.idCount + uint32_t{1};
    for (uint32_t child = group.firstChild; left != 0; ++child)
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
      --left;
    }
  }

  RawArray<IndexEntry> entries_;
  RawArray<uint32_t> table_; ///< of entries, by parent and id; of a group whose ids are in a row nothing
};

} // namespace tav::detail
