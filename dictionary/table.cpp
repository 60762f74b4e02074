/// @file table.cpp
/// The entries and the range directory, made from elements.def at compile time.
#include "dictionary/dictionary.h"

#include <array>
#include <iterator>
#include <string_view>

namespace tav::inside
{
namespace
{

/// A line of elements.def, for the compiler only.
struct Listed
{
  uint16_t id;
  std::string_view enumName;
  std::string_view tagName;
};

constexpr Listed kListed[] = {
#define TAV_ELEMENT(id, constant, enumName, tagName) {id, enumName, tagName},
#define TAV_ELEMENT_PLACEHOLDER(id) {id, {}, {}},
#include "tav/elements.def"
};

constexpr std::string_view kPlaceholderEnumName = "INVALID_ELEMENT";
constexpr std::string_view kPlaceholderTagName = "invalid_element";

constexpr size_t kEntryCount = std::size(kListed);

/// A constant of its own: a compiler takes only so many steps to find the value of one.
constexpr size_t kStringBytes = [] {
  size_t bytes = kPlaceholderEnumName.size() + kPlaceholderTagName.size() + 2;
  for (const Listed& element : kListed)
  {
    bytes += element.tagName.empty() ? 0 : element.enumName.size() + element.tagName.size() + 2;
  }
  return bytes;
}();

/// The strings behind each other, each with its NUL, and the entries that point out their places.
struct Table
{
  std::array<char, kStringBytes> strings;
  std::array<TAVElementEntry, kEntryCount> entries;
  size_t used;

  constexpr size_t add(std::string_view text)
  {
    const size_t place = used;
    for (const char character : text)
    {
      strings[used++] = character;
    }
    ++used; // the NUL is there
    return place;
  }
};

constexpr Table makeTable()
{
  Table table{};
  const size_t placeholderEnumName = table.add(kPlaceholderEnumName);
  const size_t placeholderTagName = table.add(kPlaceholderTagName);
  for (size_t i = 0; i < kEntryCount; ++i)
  {
    const Listed& element = kListed[i];
    const bool placeholder = element.tagName.empty();
    const size_t enumName = placeholder ? placeholderEnumName : table.add(element.enumName);
    const size_t tagName = placeholder ? placeholderTagName : table.add(element.tagName);
    table.entries[i].id = element.id;
    table.entries[i].enumNamePlace = enumName & 0xFFFFFF;
    table.entries[i].tagNamePlace = tagName & 0xFFFFFF;
  }
  return table;
}

constexpr Table kTable = makeTable();

static_assert(kTable.used == kStringBytes && kStringBytes <= 0xFFFFFF);

struct Bounds
{
  uint16_t firstId;
  uint64_t count;
};

constexpr Bounds kBounds[] = {
#define TAV_ELEMENT_RANGE(firstId, count) {firstId, count},
#include "tav/elements.def"
};

static_assert(std::size(kBounds) == kElementRangeCount);

constexpr std::array<TAVElementRange, kElementRangeCount + 1> makeDirectory()
{
  std::array<TAVElementRange, kElementRangeCount + 1> directory{};
  uint64_t start = 0;
  for (size_t i = 0; i < kElementRangeCount; ++i)
  {
    directory[i] = {1, kBounds[i].firstId, kBounds[i].count, kTable.entries.data() + start};
    start += kBounds[i].count;
  }
  return directory;
}

constexpr auto kDirectory = makeDirectory();

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
  return total == kEntryCount;
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
