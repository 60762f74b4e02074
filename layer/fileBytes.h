/// @file fileBytes.h
/// An open file as searches look into it.
#pragma once

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <new>

#include "tav/cpp/owner.hpp"
#include "tav/kor.h"

namespace tav::detail
{

/// The bytes of an open file by offset, through a window: headers that stand near each other cost one read.
class FileBytes
{
public:
  explicit FileBytes(KORHFile& file) noexcept
      : file_(file)
  {
  }

  uint32_t open() noexcept
  {
    window_.reset(new (std::nothrow) Window);
    return window_ != nullptr ? file_.getSize(&size_) : TAV_RC_NO_MEMORY;
  }
  [[nodiscard]] uint64_t size() const noexcept
  {
    return size_;
  }

  /// Bytes that are at hand from an offset on: at least one, but at the end of the file.
  uint32_t view(uint64_t offset, const uint8_t*& bytes, uint64_t& length) noexcept
  {
    length = 0;
    if (offset >= size_)
    {
      return TAV_RC_OK;
    }
    if (offset < from_ || offset - from_ >= filled_)
    {
      if (const uint32_t rc = fill(offset); rc != TAV_RC_OK)
      {
        return rc;
      }
    }
    bytes = window_->data() + (offset - from_);
    length = filled_ - (offset - from_);
    return TAV_RC_OK;
  }

  /// Up to `length` bytes; fewer at the end of the file alone.
  uint32_t read(uint64_t offset, uint8_t* to, uint64_t length, uint64_t& got) noexcept
  {
    got = 0;
    uint32_t rc = TAV_RC_OK;
    while (rc == TAV_RC_OK && got < length)
    {
      const uint8_t* bytes = nullptr;
      uint64_t there = 0;
      rc = view(offset + got, bytes, there);
      if (rc != TAV_RC_OK || there == 0)
      {
        break;
      }
      there = std::min(there, length - got);
      std::memcpy(to + got, bytes, static_cast<size_t>(there));
      got += there;
    }
    return rc;
  }

  /// Behind the zeros at an offset that are known without a look at them.
  [[nodiscard]] uint64_t zerosUntil(uint64_t offset) const noexcept
  {
    uint64_t found = 0;
    return file_.findData(offset, &found) == TAV_RC_OK ? std::min(std::max(found, offset), size_) : offset;
  }

private:
  static constexpr size_t kWindow = size_t{16} * 1024;
  using Window = std::array<uint8_t, kWindow>;

  uint32_t fill(uint64_t offset) noexcept
  {
    from_ = offset;
    filled_ = 0;
    KORFileSeekParam seek;
    seek.offset = offset;
    KORFileReadParam read;
    read.length = kWindow;
    uint32_t rc = file_.seek(&seek, nullptr);
    rc = rc == TAV_RC_OK ? file_.read(&read, window_->data(), &filled_) : rc;
    size_ = rc == TAV_RC_END_OF_STORAGE ? std::min(size_, offset + filled_) : size_;
    return rc == TAV_RC_END_OF_STORAGE ? TAV_RC_OK : rc;
  }

  KORHFile& file_;
  Owner<Window> window_;
  uint64_t size_ = 0;
  uint64_t from_ = 0;
  uint64_t filled_ = 0;
};

} // namespace tav::detail
