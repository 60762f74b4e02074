/// The floor behind a library boundary: one out-of-line call per node, arguments
/// by pointer and checked, a stack of open groups, room checked, return codes.
/// What it costs over floor.hpp is what any such interface costs at the least.
#pragma once

#include "bench/floor.hpp"

namespace floorApi
{

struct Handle
{
  char* block;
  uint64_t capacity;
  uint64_t offset;
  uint64_t options;
  uint32_t depth;
  uint64_t open[64]; // offsets of the open groups' headers
};

struct Node
{
  floor0::Header header;
  uint64_t offset;
  const void* data;
};

uint32_t init(Handle* h, void* block, uint64_t capacity);
uint32_t add(uint64_t options, Handle* h, const Node* node);
/// The same with the header read field by field (a 16-byte load of a header that the
/// caller has just stored in parts cannot be forwarded from the store buffer) and with
/// fixed-size copies for the common payload sizes (no call of memcpy).
uint32_t addTuned(uint64_t options, Handle* h, const Node* node);
uint32_t closeGroup(uint64_t options, Handle* h);
/// The child of `parent` after `previous` (null: the first); 1 = no more.
uint32_t nextChild(uint64_t options, const Handle* h, const Node* parent, const Node* previous, Node* child);

} // namespace floorApi
