/// @file storage.hpp
/// What readers and writers sit on: options, handles, and a block that grows.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <utility>

#include "tav/core/bytes.hpp"
#include "tav/cpp/error.hpp"
#include "tav/cpp/file.hpp"
#include "tav/cpp/values.hpp"

namespace tav
{

/// How a Reader gets at the bytes of a file.
enum class Access : uint8_t
{
  /// Mapped, where the system can map the file; else through a ring.
  automatic,
  /// As memory: nothing is copied, nodes and payloads last as long as the reader, and it has the file as it was when it
  /// was opened, but for what is written into it since. TAV_RC_NOT_SUPPORTED for what has no size: devices, pipes,
  /// files in /proc, empty ones; TAV_RC_NO_MEMORY where there are no addresses for it. Not for a file that another
  /// process may make shorter: to read what is no longer there ends the program on POSIX systems. See docs/files.md.
  mapped,
  /// Read through a ring: any file, also one that is written, cut or grows meanwhile.
  ring
};

/// How a stream is laid out; reader and writer must agree, nothing in the stream says so.
struct StreamOptions
{
  ByteOrder byteOrder = ByteOrder::native;
  bool align8 = false;               ///< payloads are padded to multiples of 8
  Width root = Width::bits64;        ///< header of the stream's first node
  uint64_t ringBytes = 10ULL << 20U; ///< memory of the ring over a file; a data element can be as large, not larger
  Access access = Access::automatic; ///< how a Reader gets at a file; nobody else asks
};

namespace detail
{

/// Over which bytes the compiler puts steps into the caller's code. All others are calls of the operations.
enum class InPlace : uint8_t
{
  no,
  block, ///< over memory, in this machine's order, nothing padded
  ring   ///< likewise, over what a ring caches
};

using BlockInPlace = core::BlockOf<core::HostForm, core::PlainWay>;
using RingInPlace = core::RingOf<core::HostForm, core::PlainWay>;

/// Opens a handle over a storage.
inline uint32_t openHandle(TAVSideStorage* storage, uint64_t mode, const StreamOptions& options,
                           TAVHandle*& handle) noexcept
{
  const uint64_t root = options.root == Width::bits32 ? TAV_OPT_ROOT32 : 0;
  TAVInitParam param(storage, mode | root, options.ringBytes, 0,
                     options.byteOrder == ByteOrder::swapped ? TAV_BYTE_ORDER_SWAPPED : uint8_t{0},
                     options.align8 ? uint8_t{1} : uint8_t{0});
  return tavInitHandle(&handle, &param);
}

/// A block of memory that grows ahead of what is written. The handle addresses it directly, so it is told of each move.
/// Where nodes leave gaps, as paddings do, bytes that no node was written to are zero; else nothing is cleared that
/// will be written anyway.
class GrowingBlock
{
public:
  GrowingBlock() noexcept
      : storage_(nullptr, 0)
  {
  }
  ~GrowingBlock()
  {
    std::free(storage_.pBuffer);
  }
  GrowingBlock(const GrowingBlock&) = delete;
  GrowingBlock& operator=(const GrowingBlock&) = delete;

  TAVSideStorage& storage() noexcept
  {
    return storage_;
  }

  /// Makes room for `more` bytes behind `used`.
  uint32_t reserve(TAVHandle* handle, uint64_t used, uint64_t more) noexcept
  {
    if (more < storage_.bufferSize && used < storage_.bufferSize - more) [[likely]]
    {
      return TAV_RC_OK;
    }
    return grow(handle, used, more);
  }

  /// From here on gaps are zero.
  void clearGaps(uint64_t used) noexcept
  {
    clears_ = true;
    clear(used, storage_.bufferSize);
  }

  /// Bytes that were taken back are a gap.
  void takeBack(uint64_t from, uint64_t to) noexcept
  {
    if (clears_)
    {
      clear(from, to);
    }
  }

private:
  static constexpr uint64_t kFirstSize = 4096;

  uint32_t grow(TAVHandle* handle, uint64_t used, uint64_t more) noexcept
  {
    if (!layout::addChecked(more, used) || !layout::addChecked(more, kFirstSize))
    {
      return TAV_RC_NO_MEMORY;
    }
    // No block is larger than half of all addresses: up to there the next one is twice as large.
    constexpr auto largest = static_cast<uint64_t>(PTRDIFF_MAX);
    if (more > largest)
    {
      return TAV_RC_NO_MEMORY;
    }
    const uint64_t twice = storage_.bufferSize > largest / 2 ? largest : 2 * storage_.bufferSize;
    const uint64_t size = more > twice ? more : twice;
    auto* const block = static_cast<uint8_t*>(std::realloc(storage_.pBuffer, static_cast<size_t>(size)));
    if (block == nullptr)
    {
      return TAV_RC_NO_MEMORY;
    }
    const uint64_t former = std::exchange(storage_.bufferSize, size);
    storage_.pBuffer = block;
    if (clears_)
    {
      clear(former, size);
    }
    if (handle != nullptr)
    {
      handle->pDirectData = block;
      handle->directDataSize = size;
    }
    return TAV_RC_OK;
  }

  void clear(uint64_t from, uint64_t to) noexcept
  {
    std::memset(storage_.pBuffer + from, 0, static_cast<size_t>(to - from));
  }

  TAVSSMemory storage_;
  bool clears_ = false;
};

} // namespace detail

} // namespace tav
