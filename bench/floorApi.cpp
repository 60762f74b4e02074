#include "bench/floorApi.hpp"

namespace floorApi
{

uint32_t init(Handle* h, void* block, uint64_t capacity)
{
  if (!h)
  {
    return 10;
  }
  if (!block)
  {
    return 20;
  }
  h->block = static_cast<char*>(block);
  h->capacity = capacity;
  h->offset = 0;
  h->options = 2;
  h->depth = 0;
  return 0;
}

namespace
{

struct PlainCopy
{
  static void header(char* to, const floor0::Header& from) { std::memcpy(to, &from, sizeof from); }
  static void payload(char* to, const void* from, uint64_t n) { std::memcpy(to, from, n); }
};

/// Keeps the compiler from joining the loads of neighbouring fields into a wide one.
inline uint64_t alone(uint64_t v)
{
  __asm__(""
          : "+r"(v));
  return v;
}

struct TunedCopy
{
  static void header(char* to, const floor0::Header& from)
  {
    const uint64_t words[2] = {alone(from.size), alone(from.info) | alone(from.type) << 32 | alone(from.id) << 48};
    std::memcpy(to, words, 16);
  }
  static void payload(char* to, const void* from, uint64_t n)
  {
    switch (n)
    {
    case 4: std::memcpy(to, from, 4); break;
    case 8: std::memcpy(to, from, 8); break;
    case 16: std::memcpy(to, from, 16); break;
    default: std::memcpy(to, from, n);
    }
  }
};

template<class Copy>
inline uint32_t addWith(uint64_t options, Handle* h, const Node* node)
{
  if (!h)
  {
    return 10;
  }
  if (!node)
  {
    return 20;
  }
  if (options != 0)
  {
    return 30;
  }
  if ((h->options & 2) == 0)
  {
    return 40;
  }
  const bool group = node->header.type == floor0::kGroup;
  if (!group && (h->depth == 0 || !node->data))
  {
    return 50;
  }
  const uint64_t payload = group ? 0 : node->header.size;
  const uint64_t room = h->capacity - h->offset;
  if (room < sizeof(floor0::Header) || room - sizeof(floor0::Header) < payload)
  {
    return 60;
  }
  char* at = h->block + h->offset;
  Copy::header(at, node->header);
  if (group)
  {
    if (h->depth == 64)
    {
      return 70;
    }
    h->open[h->depth++] = h->offset;
  }
  else
  {
    Copy::payload(at + sizeof(floor0::Header), node->data, payload);
  }
  h->offset += sizeof(floor0::Header) + payload;
  return 0;
}

} // namespace

uint32_t add(uint64_t options, Handle* h, const Node* node)
{
  return addWith<PlainCopy>(options, h, node);
}
uint32_t addTuned(uint64_t options, Handle* h, const Node* node)
{
  return addWith<TunedCopy>(options, h, node);
}

uint32_t closeGroup(uint64_t options, Handle* h)
{
  if (!h)
  {
    return 10;
  }
  if (options != 0)
  {
    return 20;
  }
  if (h->depth == 0)
  {
    return 30;
  }
  const uint64_t at = h->open[--h->depth];
  const uint64_t size = h->offset - at - sizeof(floor0::Header);
  std::memcpy(h->block + at, &size, sizeof size);
  return 0;
}

uint32_t nextChild(uint64_t options, const Handle* h, const Node* parent, const Node* previous, Node* child)
{
  if (!h)
  {
    return 10;
  }
  if (!child)
  {
    return 20;
  }
  if (options != 0)
  {
    return 30;
  }
  const uint64_t begin = parent ? parent->offset + sizeof(floor0::Header) : 0;
  const uint64_t end = parent ? begin + parent->header.size : h->capacity;
  const uint64_t at = previous ? previous->offset + sizeof(floor0::Header) + previous->header.size : begin;
  if (at >= end)
  {
    return 1;
  }
  if (end > h->capacity || end - at < sizeof(floor0::Header))
  {
    return 50;
  }
  std::memcpy(&child->header, h->block + at, sizeof(floor0::Header));
  if (child->header.size > end - at - sizeof(floor0::Header))
  {
    return 60;
  }
  child->offset = at;
  child->data = h->block + at + sizeof(floor0::Header);
  return 0;
}

} // namespace floorApi
