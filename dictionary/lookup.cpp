/// @file lookup.cpp
/// From an element id to its entry: the range by comparisons, then the entry within the range.
#include "dictionary/dictionary.h"

namespace tav::inside
{
namespace
{

/// The ranges by their place in the directory.
enum RangeNumber : size_t
{
  kStreamFormat,
  kDocumentRoot,
  kDocument,
  kSystem,
  kMonitorGroups,
  kEvents,
  kMonitorData,
  kHealth,
  kInternals,
  kBlocks
};

struct Bounds
{
  uint16_t firstId;
  uint16_t count;

  constexpr bool cover(uint16_t id) const { return static_cast<uint16_t>(id - firstId) < count; }
};

/// The directory's bounds as compile-time constants, so that choosing a range loads nothing.
constexpr Bounds kBounds[] = {
#define TAV_ELEMENT_RANGE(firstId, count) {firstId, count},
#include "tav/elements.def"
};

/// The common elements' range that may have `id`, which is not below the lowest of them but the document root.
RangeNumber commonRangeFor(uint16_t id)
{
  if (id >= kBounds[kStreamFormat].firstId)
  {
    return kStreamFormat;
  }
  return kBounds[kDocument].cover(id) ? kDocument : kSystem;
}

/// The only range that may have `id`; it may still end below `id`, or begin above.
RangeNumber rangeFor(uint16_t id)
{
  if (id >= kBounds[kDocument].firstId)
  {
    return commonRangeFor(id);
  }
  if (id >= kBounds[kHealth].firstId)
  {
    return id >= kBounds[kBlocks].firstId ? kBlocks : kHealth;
  }
  if (id >= kBounds[kMonitorData].firstId)
  {
    return id >= kBounds[kInternals].firstId ? kInternals : kMonitorData;
  }
  if (id >= kBounds[kEvents].firstId)
  {
    return kEvents;
  }
  // The monitor groups have an entry for this id too, but the document root comes first.
  return kBounds[kDocumentRoot].cover(id) ? kDocumentRoot : kMonitorGroups;
}

} // namespace

const TAVElementEntry* findInRange(const TAVElementRange& range, uint16_t id)
{
  if (range.dense != 0)
  {
    // An id below the first wraps to an index far beyond the count.
    const uint64_t index = static_cast<uint64_t>(id) - range.firstId;
    return index < range.count ? range.pEntries + index : nullptr;
  }
  int64_t low = 0;
  int64_t high = static_cast<int64_t>(range.count) - 1;
  while (low <= high)
  {
    const int64_t mid = low + (high - low) / 2;
    const auto midId = static_cast<uint16_t>(range.pEntries[mid].id);
    if (id == midId)
    {
      return range.pEntries + mid;
    }
    if (id < midId)
    {
      high = mid - 1;
    }
    else
    {
      low = mid + 1;
    }
  }
  return nullptr;
}

const TAVElementEntry* findElement(uint16_t id)
{
  return findInRange(elementDirectory()[rangeFor(id)], id);
}

const char* elementEnumName(uint16_t id)
{
  const TAVElementEntry* entry = findElement(id);
  return entry != nullptr ? enumNameOf(*entry) : kUnknownElement;
}

const char* elementTagName(uint16_t id)
{
  const TAVElementEntry* entry = findElement(id);
  return entry != nullptr ? tagNameOf(*entry) : kUnknownElement;
}

} // namespace tav::inside
