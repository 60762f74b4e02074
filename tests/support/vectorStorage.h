/// A storage in memory without direct access: what a file is to the circular buffer, but one that counts, can refuse,
/// and can be looked into.
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <vector>

#include "tav/tav.h"

namespace test
{

class VectorStorage : public TAVSideStorage
{
public:
  static constexpr uint64_t kReadWrite =
      TAV_ATTR_WRITABLE | TAV_ATTR_READ_FORWARD | TAV_ATTR_READ_BACKWARD | TAV_ATTR_SEEK;
  static constexpr uint64_t kReadOnly = TAV_ATTR_READ_FORWARD | TAV_ATTR_READ_BACKWARD | TAV_ATTR_SEEK;

  /// `pageBytes` becomes the ioUnit.
  explicit VectorStorage(uint64_t pageBytes = 0x1000, std::vector<uint8_t> content = {},
                         uint64_t attributeBits = kReadWrite)
      : TAVSideStorage(0, attributeBits), bytes(std::move(content))
  {
    ioUnit = pageBytes;
  }

  uint32_t seek(uint64_t offset, uint64_t) override
  {
    ++seeks;
    if (const uint32_t rc = refusal(); rc != TAV_RC_OK)
    {
      return rc;
    }
    position = offset + seekError;
    return TAV_RC_OK;
  }

  uint32_t getPosition(uint64_t* pPosition) override
  {
    *pPosition = position;
    return TAV_RC_OK;
  }

  uint32_t getTotalSize(uint64_t* pSize) override
  {
    *pSize = bytes.size();
    return TAV_RC_OK;
  }

  uint32_t read(uint64_t wanted, void** ppData, uint64_t bufSize, uint64_t* pRead, bool, bool) override
  {
    ++reads;
    *pRead = 0;
    if (const uint32_t rc = refusal(); rc != TAV_RC_OK)
    {
      return rc;
    }
    const uint64_t there = position < bytes.size() ? bytes.size() - position : 0;
    const uint64_t length = std::min({wanted, bufSize, there, longestTransfer});
    std::copy_n(bytes.begin() + static_cast<ptrdiff_t>(std::min<uint64_t>(position, bytes.size())), length,
                static_cast<uint8_t*>(*ppData));
    position += length;
    bytesRead += length;
    *pRead = length;
    return length < std::min(wanted, longestTransfer) ? endCode : TAV_RC_OK;
  }

  uint32_t write(const void* pData, uint64_t size, uint64_t* pWritten) override
  {
    ++writes;
    *pWritten = 0;
    if (const uint32_t rc = refusal(); rc != TAV_RC_OK)
    {
      return rc;
    }
    const uint64_t length = std::min(size, longestWrite);
    if (position + length > bytes.size())
    {
      bytes.resize(position + length);
    }
    std::copy_n(static_cast<const uint8_t*>(pData), length, bytes.begin() + static_cast<ptrdiff_t>(position));
    position += length;
    bytesWritten += length;
    *pWritten = length;
    return TAV_RC_OK;
  }

  uint32_t getMemory(void**, uint64_t*) override
  {
    return TAV_RC_NOT_SUPPORTED;
  }

  uint32_t lock(uint32_t) override
  {
    return TAV_RC_NOT_SUPPORTED;
  }

  uint32_t unlock() override
  {
    return TAV_RC_NOT_SUPPORTED;
  }

  /// Makes the nth seek, read or write from now on fail with a code, once.
  void failAt(uint64_t nth, uint32_t code)
  {
    failCountdown_ = nth;
    failCode_ = code;
  }

  [[nodiscard]] uint64_t calls() const
  {
    return seeks + reads + writes;
  }

  std::vector<uint8_t> bytes;
  uint64_t position = 0;
  uint64_t longestTransfer = ~uint64_t{0}; ///< longer reads come in pieces
  uint64_t longestWrite = ~uint64_t{0};    ///< longer writes come out short
  uint64_t seekError = 0;                  ///< how far seeks land from where they should
  uint32_t endCode = TAV_RC_END_OF_STORAGE;
  uint64_t seeks = 0;
  uint64_t reads = 0;
  uint64_t writes = 0;
  uint64_t bytesRead = 0;
  uint64_t bytesWritten = 0;

private:
  uint32_t refusal()
  {
    return failCountdown_ != 0 && --failCountdown_ == 0 ? failCode_ : TAV_RC_OK;
  }

  uint64_t failCountdown_ = 0;
  uint32_t failCode_ = TAV_RC_OK;
};

} // namespace test
