/// Rings over a storage that writes down what it is asked for.
#pragma once

#include <cstdint>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <string>
#include <vector>

#include "support/traceLog.h"
#include "support/vectorStorage.h"
#include "tav/tav.h"

namespace test
{

/// Every byte gives its offset, as far as a byte can, and none is 0.
inline uint8_t byteAt(uint64_t offset)
{
  return static_cast<uint8_t>(1 + offset % 251);
}

inline std::vector<uint8_t> pattern(uint64_t from, uint64_t count)
{
  std::vector<uint8_t> bytes(count);
  for (uint64_t i = 0; i < count; ++i)
  {
    bytes[i] = byteAt(from + i);
  }
  return bytes;
}

/// Notes "seek 8", "read 8+4" and "write 8+4": offset and bytes asked for.
class RecordingStorage : public VectorStorage
{
public:
  using VectorStorage::VectorStorage;

  uint32_t seek(uint64_t offset, uint64_t hint) override
  {
    log.push_back("seek " + std::to_string(offset));
    lastHint = hint;
    return VectorStorage::seek(offset, hint);
  }
  uint32_t getPosition(uint64_t* pPosition) override
  {
    VectorStorage::getPosition(pPosition);
    return positionCode;
  }
  uint32_t read(uint64_t wanted, void** ppData, uint64_t bufSize, uint64_t* pRead, bool zeroCopy,
                bool backward) override
  {
    log.push_back("read " + std::to_string(position) + "+" + std::to_string(wanted));
    everBackward = everBackward || backward;
    everZeroCopy = everZeroCopy || zeroCopy;
    return VectorStorage::read(wanted, ppData, bufSize, pRead, zeroCopy, backward);
  }
  uint32_t write(const void* pData, uint64_t size, uint64_t* pWritten) override
  {
    log.push_back("write " + std::to_string(position) + "+" + std::to_string(size));
    return VectorStorage::write(pData, size, pWritten);
  }
  /// What was asked since the last call.
  std::vector<std::string> takeLog() { return std::exchange(log, {}); }

  std::vector<std::string> log;
  uint64_t lastHint = ~uint64_t{0};
  uint32_t positionCode = TAV_RC_OK;
  bool everBackward = false;
  bool everZeroCopy = false;
};

/// Pages of 8 bytes over a storage of `bytes` bytes.
struct SmallRing
{
  static constexpr uint64_t kPage = 8;

  explicit SmallRing(uint64_t bytes, uint64_t pages = 3, uint64_t attributes = VectorStorage::kReadWrite)
      : storage(kPage, pattern(0, bytes), attributes), ring(&storage, pages * kPage, nullptr)
  {}

  /// Caches `count` bytes from `offset` on, as if they lay at a ring index.
  void cache(uint64_t index, uint64_t offset, uint64_t count)
  {
    ring.head = index;
    ring.tail = (index + count - 1) % ring.ringSize;
    ring.headOffset = offset;
    ring.empty = 0;
    for (uint64_t i = 0; i < count; ++i)
    {
      ring.pRing[(index + i) % ring.ringSize] = byteAt(offset + i);
    }
  }

  uint32_t chunk(uint64_t offset, uint64_t length, bool backward = false)
  {
    area = {};
    return ring.getChunk(offset, length, &area, backward, false);
  }
  /// The bytes of the last chunk.
  [[nodiscard]] std::vector<uint8_t> bytes() const { return {area.pChunk, area.pChunk + area.chunkLength}; }
  uint32_t write(uint64_t offset, std::vector<uint8_t> data, bool direct = false)
  {
    return ring.write(offset, data.data(), data.size(), direct);
  }
  /// How many bytes are cached, by the fields.
  [[nodiscard]] uint64_t count() const
  {
    if (ring.empty != 0)
    {
      return 0;
    }
    return ring.head <= ring.tail ? ring.tail - ring.head + 1 : ring.tail + ring.ringSize - ring.head + 1;
  }
  /// Which pages are marked as pending.
  [[nodiscard]] std::vector<int> flags() const
  {
    std::vector<int> result;
    for (uint64_t page = 0; page < ring.pageCount; ++page)
    {
      result.push_back(ring.pPageFlags[2 * page]);
    }
    return result;
  }

  RecordingStorage storage;
  TAVCircularBuf ring;
  TAVCBUserArea area{};
};

} // namespace test
