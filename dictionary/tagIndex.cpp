/// @file tagIndex.cpp
/// From a tag to the entries that may bear it, made from elements.def at compile time.
#include "dictionary/dictionary.h"

#include "dictionary/tagBuckets.h"

namespace tav::inside
{
namespace
{

constexpr TagBuckets kIndex([](size_t place) { return kListedElements[place].tagName; });

} // namespace

std::span<const uint16_t> placesTagged(std::string_view tag)
{
  return kIndex.placesTagged(tag);
}

} // namespace tav::inside
