/// @file dictionary.h
/// The element dictionary: two names for an element id. Constant data, so any thread may look up at any time.
#pragma once

#include <cstddef>
#include <cstdint>
#include <span>
#include <string_view>

/// One element in a 64-bit slot of which only the 16 bits of the id are compared; the others say where its two strings
/// begin among those of the dictionary. Pointers in their place would cost 115 KB of relocations in the library, which
/// every process that loads it would have to apply.
struct TAVElementEntry
{
  uint64_t id : 16;
  uint64_t enumNamePlace : 24;
  uint64_t tagNamePlace : 24;
};

static_assert(sizeof(TAVElementEntry) == 8);

/// One range of entries, sorted by ascending id. In a dense range the entry at index k has id `firstId` + k.
struct TAVElementRange
{
  uint8_t dense;
  uint16_t firstId;
  uint64_t count;
  const TAVElementEntry* pEntries;
};

namespace tav::inside
{

/// Ranges in the directory, without the all-zero record that closes it.
inline constexpr size_t kElementRangeCount = 10;

/// Both names of an id without an entry.
inline constexpr const char* kUnknownElement = "Unknown Element";

/// The directory: kElementRangeCount ranges, then an all-zero record.
const TAVElementRange* elementDirectory();

/// The entry of an id within a range: by index when the range is dense, else by binary search.
///
/// @return the entry, or null when the range has none for `id`
const TAVElementEntry* findInRange(const TAVElementRange& range, uint16_t id);

/// The entry of an id, or null when no range has one. Cost: at most five comparisons and an index.
const TAVElementEntry* findElement(uint16_t id);

/// The places of the entries that may have this tag, by which elementAt has them, in the order of the directory; blanks
/// around a tag do not count, and placeholders have none. About two, so look whether one does have it.
std::span<const uint16_t> placesTagged(std::string_view tag);

/// An entry by its place among those of all ranges.
const TAVElementEntry& elementAt(size_t place);

/// The enum name of an entry of the directory. The string lives for ever.
const char* enumNameOf(const TAVElementEntry& entry);

/// The tag name of an entry of the directory. The string lives for ever.
const char* tagNameOf(const TAVElementEntry& entry);

/// The enum name of an id, kUnknownElement when it has no entry. The string lives for ever.
const char* elementEnumName(uint16_t id);

/// The tag name of an id, kUnknownElement when it has no entry. The string lives for ever.
const char* elementTagName(uint16_t id);

} // namespace tav::inside
