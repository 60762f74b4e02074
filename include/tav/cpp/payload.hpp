/// @file payload.hpp
/// What a reader and its nodes share, and payloads as they stand in the stream.
#pragma once

#include <cstddef>
#include <cstdint>
#include <span>
#include <stdexcept>

#include "tav/cpp/storage.hpp"

/// Whether payloads that were kept too long are found out. The same in every source file of a program.
#if !defined(TAV_CHECK_PAYLOADS)
#if defined(NDEBUG)
#define TAV_CHECK_PAYLOADS 0
#else
#define TAV_CHECK_PAYLOADS 1
#endif
#endif

namespace tav
{

namespace detail
{

struct ReaderState
{
  Owner<TAVSideStorage> owned;
  TAVHandle* handle = nullptr;
  uint64_t fetches = 0; ///< payload pointers into a ring last until the next one
  bool isFast = false;  ///< over memory, in this machine's order; unknown once the handle was given away
  InPlace inPlace = InPlace::no;
  /// What comes later stands here: nodes that an older library handed out know the places of what is above.
  bool readsAhead = true; ///< false: the system was told that a few places of a mapping are looked at
  KORFileMapping mapping{};
  Owner<TAVSSFile> mapped{}; ///< the file of a mapping
  KORHFile* file = nullptr;  ///< that is read, when it was opened by its path

  ReaderState() = default;
  ReaderState(const ReaderState&) = delete;
  ReaderState& operator=(const ReaderState&) = delete;
  ~ReaderState()
  {
    if (handle != nullptr)
    {
      tavTermHandle(&handle);
    }
  }

  /// After opening: payloads of a fast stream stay where they are and are used as they stand.
  void settle() noexcept
  {
    isFast = handle != nullptr && !isBuffered() && !isSwapped();
    const bool reads = handle != nullptr && core::isReadOnly(*handle);
    inPlace = reads && BlockInPlace::canRead(*handle)  ? InPlace::block
              : reads && RingInPlace::canRead(*handle) ? InPlace::ring
                                                       : InPlace::no;
  }

  /// A walk begins: what it comes to stands one behind another.
  void walk() noexcept
  {
    if (!readsAhead) [[unlikely]]
    {
      readsAhead = true;
      mapping.readAhead();
    }
  }

  /// Before a look at a place that a ring may not cache. One that is far from what it does is read by a page: the ring
  /// by itself would read all that is between, or as much as it holds.
  uint32_t goTo(uint64_t offset) noexcept
  {
    if (!isBuffered())
    {
      return TAV_RC_OK;
    }
    TAVCircularBuf& ring = *handle->pCircularBuf;
    if (core::runAt(ring, offset).length != 0)
    {
      return TAV_RC_OK;
    }
    const uint64_t end = ring.headOffset + core::cachedBytes(ring);
    if (ring.empty != 0 || offset < end || offset - end >= ring.pageSize)
    {
      const uint32_t rc = ring.reposition(offset, 0, 0);
      return rc == TAV_RC_END_OF_STORAGE || rc == TAV_RC_END_OF_DATA ? TAV_RC_OK : rc; // the look itself says so
    }
    return TAV_RC_OK;
  }

  /// The handle is given away: a plain operation can give it another storage.
  void share() noexcept
  {
    walk();
    isFast = false;
    inPlace = InPlace::no;
  }

  [[nodiscard]] bool isBuffered() const noexcept
  {
    return handle->pCircularBuf != nullptr;
  }
  [[nodiscard]] bool isSwapped() const noexcept
  {
    return handle->swapBytes != 0;
  }
};

} // namespace detail

/// A node's payload as stored in the stream. Over memory it lives as long as the memory, over a mapped file as long as
/// the reader, over a file that is read through a ring or another storage until anything else is read through the
/// reader: then, in debug builds, using it throws std::logic_error. It converts to std::span<const std::byte>, which is
/// not checked. It must not outlive the reader.
class PayloadView
{
public:
  PayloadView() = default;
  PayloadView(const uint8_t* bytes, uint64_t size, const detail::ReaderState* state) noexcept
      : bytes_(bytes), size_(static_cast<size_t>(size)),
        state_(state != nullptr && state->isBuffered() ? state : nullptr), fetch_(state != nullptr ? state->fetches : 0)
  {
  }

  [[nodiscard]] const std::byte* data() const
  {
    checkAlive();
    return reinterpret_cast<const std::byte*>(bytes_);
  }
  [[nodiscard]] size_t size() const noexcept
  {
    return size_;
  }
  [[nodiscard]] bool empty() const noexcept
  {
    return size_ == 0;
  }
  [[nodiscard]] const std::byte* begin() const
  {
    return data();
  }
  [[nodiscard]] const std::byte* end() const
  {
    return data() + size_;
  }
  /// The byte at a place below size().
  [[nodiscard]] std::byte operator[](size_t at) const
  {
    return data()[at];
  }

private:
  void checkAlive() const
  {
    if constexpr (TAV_CHECK_PAYLOADS != 0)
    {
      if (state_ != nullptr && state_->fetches != fetch_)
      {
        throw std::logic_error("a payload was used after another node was read through the same ring");
      }
    }
  }

  const uint8_t* bytes_ = nullptr;
  size_t size_ = 0;
  const detail::ReaderState* state_ = nullptr; ///< null over memory; here in all builds, which so fit together
  uint64_t fetch_ = 0;
};

} // namespace tav

/// @cond  A payload's iterators do not need the view.
template<>
inline constexpr bool std::ranges::enable_borrowed_range<tav::PayloadView> = true;
/// @endcond
