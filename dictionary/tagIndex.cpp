/// @file tagIndex.cpp
/// From a tag to the entries that may bear it, made from elements.def at compile time.
#include "dictionary/dictionary.h"

#include <array>
#include <cstddef>
#include <cstdint>
#include <iterator>
#include <string_view>

namespace tav::inside
{
namespace
{

constexpr std::string_view kTags[] = {
#define TAV_ELEMENT(id, constant, enumName, tagName) tagName,
#define TAV_ELEMENT_PLACEHOLDER(id) {},
#include "tav/elements.def"
};

constexpr size_t kEntryCount = std::size(kTags);

/// About two tags a bucket: fewer would cost the library as much as they save.
constexpr size_t kBucketCount = 1024;

constexpr std::string_view withoutBlanks(std::string_view text)
{
  while (text.starts_with(' '))
  {
    text.remove_prefix(1);
  }
  while (text.ends_with(' '))
  {
    text.remove_suffix(1);
  }
  return text;
}

/// FNV-1a, folded.
constexpr size_t bucketOf(std::string_view tag)
{
  uint32_t hash = 2166136261U;
  for (const char character : withoutBlanks(tag))
  {
    hash = (hash ^ static_cast<uint8_t>(character)) * 16777619U;
  }
  return (hash ^ hash >> 16) % kBucketCount;
}

/// The places of the entries, bucket by bucket, and where each bucket begins.
struct Index
{
  std::array<uint16_t, kBucketCount + 1> starts;
  std::array<uint16_t, kEntryCount> places;
};

constexpr Index makeIndex()
{
  std::array<uint16_t, kEntryCount> buckets{};
  Index index{};
  for (size_t i = 0; i < kEntryCount; ++i)
  {
    buckets[i] = static_cast<uint16_t>(kTags[i].empty() ? kBucketCount : bucketOf(kTags[i]));
    if (buckets[i] < kBucketCount)
    {
      ++index.starts[buckets[i] + size_t{1}];
    }
  }
  for (size_t bucket = 0; bucket < kBucketCount; ++bucket)
  {
    index.starts[bucket + 1] = static_cast<uint16_t>(index.starts[bucket + 1] + index.starts[bucket]);
  }
  std::array<uint16_t, kBucketCount> used{};
  for (size_t i = 0; i < kEntryCount; ++i)
  {
    if (const size_t bucket = buckets[i]; bucket < kBucketCount)
    {
      index.places[static_cast<size_t>(index.starts[bucket]) + used[bucket]++] = static_cast<uint16_t>(i);
    }
  }
  return index;
}

constexpr Index kIndex = makeIndex();

} // namespace

std::span<const uint16_t> placesTagged(std::string_view tag)
{
  const size_t bucket = bucketOf(tag);
  return std::span(kIndex.places).subspan(kIndex.starts[bucket], kIndex.starts[bucket + 1] - kIndex.starts[bucket]);
}

} // namespace tav::inside
