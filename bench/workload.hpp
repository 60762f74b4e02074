/// The "monitor snapshot" that the library and every peer encodes, walks, searches, prints and validates;
/// docs/performance.md describes it in words.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <string>
#include <string_view>
#include <vector>

namespace snapshot
{

inline constexpr unsigned kDatabases = 8;
inline constexpr unsigned kApplications = 100;
inline constexpr unsigned kMetrics = 30;
inline constexpr size_t kLeaves = size_t{kDatabases} * kApplications * kMetrics;
inline constexpr size_t kGroups = 2 + kDatabases + kDatabases * kApplications;
inline constexpr size_t kStreamBytes = 632673; // encoded in our format

/// The bytes of a larger stream, which holds the host more than once.
constexpr size_t streamBytes(size_t hosts)
{
  constexpr size_t rootHeader = 16;
  return rootHeader + hosts * (kStreamBytes - rootHeader);
}

/// Element ids: metric m has 1000+m, application j 2000+j, database k 3000+k.
inline constexpr uint16_t kMetricId = 1000;
inline constexpr uint16_t kApplicationId = 2000;
inline constexpr uint16_t kDatabaseId = 3000;
inline constexpr uint16_t kHostId = 4000;
inline constexpr uint16_t kRootId = 5000;
inline constexpr uint16_t kIdLimit = 5001;

/// The type of metric m, the same in every application, as a real monitor has it:
/// u = 32-bit, U = 64-bit, t = 16-byte timestamp, s = ASCII string.
inline constexpr std::string_view kSchema = "uUusuUtuUsuUuUtuUsuUusUutuUUsu";

constexpr unsigned countOf(char type)
{
  unsigned n = 0;
  for (char c : kSchema)
  {
    n += c == type;
  }
  return n;
}
static_assert(kSchema.size() == kMetrics);
static_assert(countOf('u') == 12 && countOf('U') == 10 && countOf('t') == 3 && countOf('s') == 5);

struct Leaf
{
  uint64_t value; // the number, or the payload's offset in Model::pool
  uint32_t size;  // payload bytes
  uint16_t id;
  char type; // a letter of kSchema
};
static_assert(sizeof(Leaf) == 16);

struct Model
{
  std::vector<Leaf> leaves; // in document order
  std::string pool;         // strings and timestamps
  uint64_t checksum = 0;
  size_t payloadBytes = 0;

  const Leaf* application(unsigned k, unsigned j) const
  {
    return &leaves[(size_t{k} * kApplications + j) * kMetrics];
  }
  const char* bytes(const Leaf& leaf) const { return pool.data() + leaf.value; }
  const void* payload(const Leaf& leaf) const
  {
    return leaf.type == 'u' || leaf.type == 'U' ? static_cast<const void*>(&leaf.value) : bytes(leaf);
  }
};

const Model& model();

/// The names that text forms and string-keyed peers use for an element id:
/// "metric_1000", "application_2000", ...; and the bare decimal, "1000".
extern const std::vector<std::string> names, digits;
inline const std::string& nameOf(uint16_t id)
{
  return names[id];
}
inline const std::string& digitsOf(uint16_t id)
{
  return digits[id];
}

struct Path
{
  uint16_t k, j, m; // indices, not ids
};
const std::vector<Path>& randomPaths(); // 4096 of them, seeded

/// What a walk adds up for one payload. The same code for every peer.
inline uint64_t sumString(const char* p, size_t n)
{
  uint64_t sum = 0;
  for (size_t i = 0; i < n; ++i)
  {
    sum += static_cast<unsigned char>(p[i]);
  }
  return sum;
}
inline uint64_t sumTimestamp(const void* p)
{
  uint64_t w[2];
  std::memcpy(w, p, 16);
  return w[0] + w[1];
}
inline uint64_t sumLeaf(const Model& m, const Leaf& leaf)
{
  switch (leaf.type)
  {
  case 'u':
  case 'U': return leaf.value;
  case 't': return sumTimestamp(m.bytes(leaf));
  default: return sumString(m.bytes(leaf), leaf.size);
  }
}

/// Lower-case hexadecimal of a timestamp, for text forms without binary values.
inline void hex16(const void* p, char out[32])
{
  static constexpr char digit[] = "0123456789abcdef";
  auto b = static_cast<const unsigned char*>(p);
  for (int i = 0; i < 16; ++i)
  {
    out[2 * i] = digit[b[i] >> 4];
    out[2 * i + 1] = digit[b[i] & 15];
  }
}

std::FILE* devNull();

} // namespace snapshot
