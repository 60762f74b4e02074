/// @file bytes.hpp
/// The bytes that the fast way goes over: a block of memory, or what a ring caches next to each other.
///
/// Both kinds come with what is known of the stream's form. A form that is known when this is compiled costs nothing.
#pragma once

#include <cstdint>
#include <type_traits>

#include "tav/core/cachedRun.hpp"
#include "tav/core/node.hpp"
#include "tav/core/words.hpp"
#include "tav/layout.hpp"
#include "tav/tav.h"

namespace tav::core
{

inline bool isDirect(const TAVHandle& handle)
{
  return (handle.options & TAV_OPT_DIRECT) != 0;
}

inline bool isReadOnly(const TAVHandle& handle)
{
  return (handle.options & TAV_OPT_READ) != 0;
}

/// Host order, nothing padded; and a node with a pair, or one that ends a group, is not here.
struct HostForm
{
  explicit HostForm(const TAVHandle& /*handle*/) {}
  static constexpr bool swap = false;
  static constexpr bool alignAll = false;
  static constexpr bool bare = true;
};

/// Whatever the handle was opened with.
struct AnyForm
{
  explicit AnyForm(const TAVHandle& handle)
      : swap(handle.swapBytes != 0), alignAll(handle.alignMode == 1)
  {
  }
  bool swap;
  bool alignAll;
  static constexpr bool bare = false;
};

/// A node's place: its offset, its header in memory, and how many bytes of its data are at hand behind that.
struct Place
{
  uint64_t offset;
  uint8_t* header;
  uint64_t room;
};

/// A size far from where sums would pass 64 bits.
inline constexpr uint64_t kFarSize = ~uint64_t{0} / 4;

/// Whether a block of `size` bytes has room for `length` bytes at `position`, and for `more` behind them. Its last byte
/// is never used.
[[gnu::always_inline]] inline bool hasRoom(uint64_t size, uint64_t position, uint64_t length, uint64_t more = 0)
{
  if (!takeRoom(size, length) || !takeRoom(size, more)) [[unlikely]]
  {
    return false;
  }
  return size > position;
}

/// A handle's direct block. A walk keeps it in registers. `Step` is how steps over it are compiled.
template<class Form, class Step>
struct BlockOf
{
  using Way = Step;
  static constexpr bool bare = Form::bare;

  explicit BlockOf(const TAVHandle& handle)
      : form(handle), base(handle.pDirectData), size(handle.directDataSize)
  {
  }

  /// Whether the handle has such bytes to write.
  static bool canWrite(const TAVHandle& handle)
  {
    const bool direct = std::is_same_v<Form, HostForm> ? Way::isHostWith(handle, TAV_OPT_DIRECT) : isDirect(handle);
    return direct && handle.pDirectData != nullptr;
  }

  /// Whether it has them to read. A block that does not begin with the stream, which walks rarely see, is left to the
  /// operations.
  static bool canRead(const TAVHandle& handle)
  {
    return canWrite(handle) && handle.curOffset == 0;
  }

  /// What a place is before one is found; analysers do not follow a search that finds none.
  [[nodiscard]] Place nowhere() const
  {
    return {0, base, 0};
  }

  /// Finds the header at an offset; false when it does not lie in the block.
  [[gnu::always_inline]] bool find(uint64_t offset, uint64_t length, Place& place) const
  {
    uint64_t room = size;
    if (!takeRoom(room, offset) || !takeRoom(room, length)) [[unlikely]]
    {
      return false;
    }
    place = {offset, base + offset, room};
    return true;
  }

  /// Where `length` bytes at `position`, and `more` behind them, can be written; null where there is no room.
  [[gnu::always_inline]] uint8_t* placeFor(uint64_t position, uint64_t length, uint64_t more) const
  {
    if (!hasRoom(size, position, length, more)) [[unlikely]]
    {
      return nullptr;
    }
    return base + position;
  }

  static bool holds(uint64_t dataSize, const Place& place)
  {
    return dataSize <= place.room;
  }

  /// A 32-bit header of type 2 counts as a data element here.
  template<bool Wide>
  static bool hasData(uint16_t type)
  {
    return Wide ? !isGroupType(type) : type != TAV_TYPE_HEADER32;
  }

  /// Hands data out, all that follows, and returns how many bytes that are.
  static uint64_t take(TAVHandle& /*handle*/, const Place& place, uint64_t /*length*/, uint64_t /*dataSize*/)
  {
    return place.room;
  }

  [[no_unique_address]] Form form;
  uint8_t* base;
  uint64_t size;
};

/// What a handle's ring caches.
template<class Form, class Step>
struct RingOf
{
  using Way = Step;
  static constexpr bool bare = Form::bare;

  explicit RingOf(const TAVHandle& handle)
      : form(handle), ring(*handle.pCircularBuf)
  {
  }

  static bool canRead(const TAVHandle& handle)
  {
    const bool buffered = std::is_same_v<Form, HostForm> ? Way::isHostWith(handle, 0) : !isDirect(handle);
    return buffered && handle.pCircularBuf != nullptr;
  }

  static bool canWrite(const TAVHandle& handle)
  {
    return canRead(handle);
  }

  [[nodiscard]] Place nowhere() const
  {
    return {0, ring.pRing, 0};
  }

  /// Finds the header at an offset; false when it is not cached in one run.
  [[gnu::always_inline]] bool find(uint64_t offset, uint64_t length, Place& place) const
  {
    auto [index, room] = runAt(ring, offset);
    if (!takeRoom(room, length)) [[unlikely]]
    {
      return false;
    }
    place = {offset, ring.pRing + index, room};
    return true;
  }

  /// Where bytes can be written that the ring caches in one run; their pages are marked then.
  [[gnu::always_inline]] uint8_t* placeFor(uint64_t position, uint64_t length, uint64_t more) const
  {
    if (ring.storageWritable == 0 || more > kFarSize) [[unlikely]]
    {
      return nullptr;
    }
    if constexpr (bare)
    {
      return takeInPage(ring, position, length + more);
    }
    else
    {
      return Way::takeRun(ring, position, length + more);
    }
  }

  /// No data have a place only by the ring's own step.
  static bool holds(uint64_t dataSize, const Place& place)
  {
    return dataSize - 1 < place.room;
  }

  template<bool Wide>
  static bool hasData(uint16_t type)
  {
    return !isGroupType(type);
  }

  /// Hands data out: they are the chunk that the handle was given last.
  static uint64_t take(TAVHandle& handle, const Place& place, uint64_t length, uint64_t dataSize)
  {
    handle.curOffset = place.offset + length;
    handle.pDirectData = place.header + length;
    handle.directDataSize = dataSize;
    return dataSize;
  }

  [[no_unique_address]] Form form;
  TAVCircularBuf& ring;
};

} // namespace tav::core
