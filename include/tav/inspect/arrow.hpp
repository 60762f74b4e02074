/// @file arrow.hpp
/// Tables by the Arrow C data and stream interfaces, which need no library on either side.
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

#include "tav/inspect/api.hpp"
#include "tav/inspect/table.hpp"

/// @name The structures of the interfaces, as every program that knows them declares them
/// @{
#ifndef ARROW_C_DATA_INTERFACE
#define ARROW_C_DATA_INTERFACE

#define ARROW_FLAG_DICTIONARY_ORDERED 1
#define ARROW_FLAG_NULLABLE 2
#define ARROW_FLAG_MAP_KEYS_SORTED 4

extern "C" {
struct ArrowSchema
{
  const char* format;
  const char* name;
  const char* metadata;
  int64_t flags;
  int64_t n_children;
  struct ArrowSchema** children;
  struct ArrowSchema* dictionary;
  void (*release)(struct ArrowSchema*);
  void* private_data;
};

struct ArrowArray
{
  int64_t length;
  int64_t null_count;
  int64_t offset;
  int64_t n_buffers;
  int64_t n_children;
  const void** buffers;
  struct ArrowArray** children;
  struct ArrowArray* dictionary;
  void (*release)(struct ArrowArray*);
  void* private_data;
};
}

#endif // ARROW_C_DATA_INTERFACE

#ifndef ARROW_C_STREAM_INTERFACE
#define ARROW_C_STREAM_INTERFACE

extern "C" {
struct ArrowArrayStream
{
  int (*get_schema)(struct ArrowArrayStream*, struct ArrowSchema* out);
  int (*get_next)(struct ArrowArrayStream*, struct ArrowArray* out);
  const char* (*get_last_error)(struct ArrowArrayStream*);
  void (*release)(struct ArrowArrayStream*);
  void* private_data;
};
}

#endif // ARROW_C_STREAM_INTERFACE
/// @}

namespace tav::inspect
{

struct ArrowOptions
{
  std::vector<size_t> columns{}; ///< which, in this order; empty: all
  uint64_t batchRows = 65536;    ///< rows of a batch at the most
  bool dictionaries = true;      ///< texts that repeat are numbers in a dictionary where that takes less bytes
};

/// Hands a table out as a stream of batches: structures of nullable columns.
///
/// | column | Arrow | format |
/// | --- | --- | --- |
/// | unsigned64, signed64 | uint64, int64 | `L`, `l` |
/// | unsigned128, signed128 | decimal128 without a fraction; utf8 where a number has more than 38 digits | `d:38,0` |
/// | time | timestamp in nanoseconds, UTC | `tsn:UTC` |
/// | text | utf8, or a dictionary of it with indices of 32 bits | `u`, `i` |
/// | bytes | binary | `z` |
///
/// Texts and bytes have 64-bit offsets (`U`, `Z`) where a batch may have more than 2 GiB of them. What is no UTF-8 in a
/// text is written as escapes, `\xff`. The types are the same in every batch, and so is the dictionary.
///
/// @param table     its cells are shared, not copied; batches are made as they are asked for
/// @param[out] out  to be released by its `release`; schemas and batches outlive it. Used by one thread at a time.
TAV_INSPECT_API void toArrow(const Table& table, ArrowArrayStream* out, const ArrowOptions& options = {});

} // namespace tav::inspect
