/// @file table.cpp
/// The entries and the range directory, made from elements.def at compile time.
#include "dictionary/dictionary.h"

#include <array>
#include <iterator>

namespace tav
{
namespace
{

constexpr TAVElementEntry kEntries[] = {
#define TAV_ELEMENT(id, constant, enumName, tagName) {id, enumName, tagName},
#define TAV_ELEMENT_PLACEHOLDER(id) {id, "INVALID_ELEMENT", "invalid_element"},
#include "tav/elements.def"
};

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
    directory[i] = {1, kBounds[i].firstId, kBounds[i].count, kEntries + start};
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
  return total == std::size(kEntries);
}

static_assert(everyRangeIsDense());

} // namespace

const TAVElementRange* elementDirectory()
{
  return kDirectory.data();
}

} // namespace tav
