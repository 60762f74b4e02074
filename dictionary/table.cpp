/// @file table.cpp
/// The entries and the range directory, made from elements.def at compile time.
#include "dictionary/dictionary.h"

#include "dictionary/elementTable.h"

namespace tav::inside
{
namespace
{

constexpr ElementTable kTable = [] {
  ElementTable table;
  for (const ListedElement& element : kListedElements)
  {
    table.put(element.id, element.enumName, element.tagName);
  }
  return table;
}();

static_assert(kTable.used == kElementStringBytes && kTable.filled == kElementCount);

constexpr ElementDirectory kDirectory = directoryOver(kTable.entries.data());

/// The lookup in a dense range is an index without a search, so a list that breaks the rule must not compile.
constexpr bool everyRangeIsDense()
{
  uint64_t total = 0;
  for (size_t i = 0; i < kElementRangeCount; ++i)
  {
    for (uint64_t k = 0; k < kDirectory[i].count; ++k)
    {
      if (kDirectory[i].pEntries[k].id != kDirectory[i].firstId + k)
      {
        return false;
      }
    }
    total += kDirectory[i].count;
  }
  return total == kElementCount;
}

static_assert(everyRangeIsDense());

} // namespace

const TAVElementRange* elementDirectory()
{
  return kDirectory.data();
}

const TAVElementEntry& elementAt(size_t place)
{
  return kTable.entries[place];
}

const char* enumNameOf(const TAVElementEntry& entry)
{
  return kTable.strings.data() + entry.enumNamePlace;
}

const char* tagNameOf(const TAVElementEntry& entry)
{
  return kTable.strings.data() + entry.tagNamePlace;
}

} // namespace tav::inside
