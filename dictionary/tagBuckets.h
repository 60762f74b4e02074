/// @file tagBuckets.h
/// From a tag to the entries that may bear it: the places of the entries, bucket by bucket.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <span>
#include <string_view>

#include "dictionary/elementTable.h"

namespace tav::inside
{

/// About two tags a bucket: fewer would cost the library as much as they save.
inline constexpr size_t kTagBuckets = 1024;
inline constexpr size_t kTagBounds = kTagBuckets + 1; ///< where each begins, and where the last one ends

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
constexpr size_t tagBucketOf(std::string_view tag)
{
  uint32_t hash = 2166136261U;
  for (const char character : withoutBlanks(tag))
  {
    hash = (hash ^ static_cast<uint8_t>(character)) * 16777619U;
  }
  return (hash ^ hash >> 16) % kTagBuckets;
}

/// The places of the entries, bucket by bucket, and where each bucket begins.
struct TagBuckets
{
  std::array<uint16_t, kTagBounds> starts{};
  std::array<uint16_t, kElementCount> places{};

  /// `tagAt(place)`: the tag of an entry, empty for a placeholder.
  template<class TagAt>
  constexpr explicit TagBuckets(const TagAt& tagAt)
  {
    std::array<uint16_t, kElementCount> buckets{};
    for (size_t i = 0; i < kElementCount; ++i)
    {
      const std::string_view tag = tagAt(i);
      buckets[i] = static_cast<uint16_t>(tag.empty() ? kTagBuckets : tagBucketOf(tag));
      if (buckets[i] < kTagBuckets)
      {
        ++starts[buckets[i] + size_t{1}];
      }
    }
    for (size_t bucket = 0; bucket < kTagBuckets; ++bucket)
    {
      starts[bucket + 1] = static_cast<uint16_t>(starts[bucket + 1] + starts[bucket]);
    }
    std::array<uint16_t, kTagBuckets> used{};
    for (size_t i = 0; i < kElementCount; ++i)
    {
      if (const size_t bucket = buckets[i]; bucket < kTagBuckets)
      {
        places[static_cast<size_t>(starts[bucket]) + used[bucket]++] = static_cast<uint16_t>(i);
      }
    }
  }

  std::span<const uint16_t> placesTagged(std::string_view tag) const
  {
    const size_t bucket = tagBucketOf(tag);
    return std::span(places).subspan(starts[bucket], starts[bucket + 1] - starts[bucket]);
  }
};

} // namespace tav::inside
