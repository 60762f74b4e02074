/// The least code that writes and walks the stream: 16-byte headers {u64 size, u32 info, u16 type, u16 id} copied with
/// memcpy, nothing checked. It is the floor of W1, W2, W3 and W5, not an example of how to do it.
#pragma once

#include "bench/workload.hpp"

namespace floor0
{

struct Header
{
  uint64_t size;
  uint32_t info;
  uint16_t type;
  uint16_t id;
};
static_assert(sizeof(Header) == 16);

enum : uint16_t
{
  kGroup = 2,
  kString = 50,
  kU32 = 55,
  kU64 = 57,
  kTimestamp = 100
};

inline uint16_t typeOf(char schemaLetter)
{
  switch (schemaLetter)
  {
  case 'u': return kU32;
  case 'U': return kU64;
  case 't': return kTimestamp;
  default: return kString;
  }
}

inline char* open(char* at, uint16_t id)
{
  const Header h{~uint64_t{0}, 0, kGroup, id};
  std::memcpy(at, &h, sizeof h);
  return at + sizeof h;
}
inline void close(char* content, char* end)
{
  const uint64_t size = static_cast<uint64_t>(end - content);
  std::memcpy(content - sizeof(Header), &size, sizeof size);
}
inline char* add(char* at, uint16_t id, uint16_t type, const void* data, size_t size)
{
  const Header h{size, 0, type, id};
  std::memcpy(at, &h, sizeof h);
  std::memcpy(at + sizeof h, data, size);
  return at + sizeof h + size;
}

inline char* encodeHost(const snapshot::Model& m, char* at)
{
  using namespace snapshot;
  char* const host = at = open(at, kHostId);
  for (unsigned k = 0; k < kDatabases; ++k)
  {
    char* const db = at = open(at, static_cast<uint16_t>(kDatabaseId + k));
    for (unsigned j = 0; j < kApplications; ++j)
    {
      char* const app = at = open(at, static_cast<uint16_t>(kApplicationId + j));
      const Leaf* leaf = m.application(k, j);
      for (unsigned i = 0; i < kMetrics; ++i, ++leaf)
      {
        switch (leaf->type)
        { // known sizes become plain stores
        case 'u': at = add(at, leaf->id, kU32, &leaf->value, 4); break;
        case 'U': at = add(at, leaf->id, kU64, &leaf->value, 8); break;
        case 't': at = add(at, leaf->id, kTimestamp, m.bytes(*leaf), 16); break;
        default: at = add(at, leaf->id, kString, m.bytes(*leaf), leaf->size);
        }
      }
      close(app, at);
    }
    close(db, at);
  }
  close(host, at);
  return at;
}

/// The workload; larger streams hold its host more than once.
inline size_t encode(const snapshot::Model& m, char* block, size_t hosts = 1)
{
  char* const root = open(block, snapshot::kRootId);
  char* at = root;
  for (size_t i = 0; i < hosts; ++i)
  {
    at = encodeHost(m, at);
  }
  close(root, at);
  return static_cast<size_t>(at - block);
}

inline uint64_t sumPayload(uint16_t type, uint64_t size, const char* p)
{
  switch (type)
  {
  case kU32:
  {
    uint32_t v;
    std::memcpy(&v, p, 4);
    return v;
  }
  case kU64:
  {
    uint64_t v;
    std::memcpy(&v, p, 8);
    return v;
  }
  case kTimestamp: return snapshot::sumTimestamp(p);
  default: return snapshot::sumString(p, static_cast<size_t>(size));
  }
}
inline uint64_t sumPayload(const Header& h, const char* p)
{
  return sumPayload(h.type, h.size, p);
}

inline uint64_t walk(const char* at, const char* end)
{
  uint64_t sum = 0;
  while (at < end)
  {
    Header h;
    std::memcpy(&h, at, sizeof h);
    at += sizeof h;
    sum += h.type == kGroup ? walk(at, at + h.size) : sumPayload(h, at);
    at += h.size;
  }
  return sum;
}

/// The header of the first child with this id among the nodes at `at`.
inline const char* child(const char* at, uint16_t id)
{
  Header h;
  for (;; at += sizeof h + h.size)
  {
    std::memcpy(&h, at, sizeof h);
    if (h.id == id)
    {
      return at;
    }
  }
}
inline uint64_t find(const char* block, const snapshot::Path& p)
{
  using namespace snapshot;
  const char* host = child(block + sizeof(Header), kHostId);
  const char* db = child(host + sizeof(Header), static_cast<uint16_t>(kDatabaseId + p.k));
  const char* app = child(db + sizeof(Header), static_cast<uint16_t>(kApplicationId + p.j));
  const char* leaf = child(app + sizeof(Header), static_cast<uint16_t>(kMetricId + p.m));
  Header h;
  std::memcpy(&h, leaf, sizeof h);
  return sumPayload(h, leaf + sizeof h);
}

/// What W5 asks at the least: every node lies inside its parent, every type is known,
/// every fixed-size payload has its size. Returns the nodes seen, 0 if malformed.
inline size_t validate(const char* at, const char* end, unsigned depth = 0)
{
  size_t nodes = 0;
  while (at < end)
  {
    Header h;
    if (static_cast<size_t>(end - at) < sizeof h)
    {
      return 0;
    }
    std::memcpy(&h, at, sizeof h);
    at += sizeof h;
    if (h.size > static_cast<size_t>(end - at))
    {
      return 0;
    }
    switch (h.type)
    {
    case kGroup:
    {
      const size_t inner = depth < 1000 ? validate(at, at + h.size, depth + 1) : 0;
      if (inner == 0 && h.size != 0)
      {
        return 0;
      }
      nodes += inner;
      break;
    }
    case kU32:
      if (h.size != 4)
      {
        return 0;
      }
      break;
    case kU64:
      if (h.size != 8)
      {
        return 0;
      }
      break;
    case kTimestamp:
      if (h.size != 16)
      {
        return 0;
      }
      break;
    case kString: break;
    default: return 0;
    }
    ++nodes;
    at += h.size;
  }
  return nodes;
}

/// The encoded workload, made once.
const std::vector<char>& stream();

} // namespace floor0
