/// The steps through a ring alone: elements of 40 bytes, header included, in pages that are in memory already.
#pragma once

#include <algorithm>
#include <cstdint>
#include <cstring>
#include <span>
#include <vector>

#include "tav/tav.hpp"

namespace library
{

/// Memory that a handle reaches through a ring.
class BufferedMemory : public TAVSideStorage
{
public:
  explicit BufferedMemory(size_t size)
      : bytes_(size)
  {
    attributes = TAV_ATTR_WRITABLE | TAV_ATTR_READ_FORWARD | TAV_ATTR_READ_BACKWARD | TAV_ATTR_SEEK;
    ioUnit = 0x100000;
  }

  uint32_t seek(uint64_t offset, uint64_t) override
  {
    position_ = offset;
    return TAV_RC_OK;
  }
  uint32_t getPosition(uint64_t* pPosition) override
  {
    *pPosition = position_;
    return TAV_RC_OK;
  }
  uint32_t getTotalSize(uint64_t* pSize) override
  {
    *pSize = bytes_.size();
    return TAV_RC_OK;
  }
  uint32_t read(uint64_t wanted, void** ppData, uint64_t bufSize, uint64_t* pRead, bool, bool) override
  {
    *pRead = std::min({wanted, bufSize, room()});
    copy(static_cast<char*>(*ppData), bytes_.data() + position_, *pRead);
    position_ += *pRead;
    return *pRead < wanted ? TAV_RC_END_OF_STORAGE : TAV_RC_OK;
  }
  uint32_t write(const void* pData, uint64_t size, uint64_t* pWritten) override
  {
    *pWritten = std::min(size, room());
    copy(bytes_.data() + position_, static_cast<const char*>(pData), *pWritten);
    position_ += *pWritten;
    return *pWritten < size ? TAV_RC_END_OF_STORAGE : TAV_RC_OK;
  }
  uint32_t getMemory(void**, uint64_t*) override { return TAV_RC_NOT_SUPPORTED; }
  uint32_t lock(uint32_t) override { return TAV_RC_NOT_SUPPORTED; }
  uint32_t unlock() override { return TAV_RC_NOT_SUPPORTED; }

private:
  /// In pieces: a long copy can be one instruction that repeats, which counters take for one a byte.
  static void copy(char* to, const char* from, uint64_t size)
  {
    constexpr uint64_t piece = 1024;
    for (uint64_t at = 0; at < size; at += piece)
    {
      std::memcpy(to + at, from + at, std::min(piece, size - at));
    }
  }

  [[nodiscard]] uint64_t room() const { return position_ < bytes_.size() ? bytes_.size() - position_ : 0; }

  std::vector<char> bytes_;
  uint64_t position_ = 0;
};

/// A handle over such memory; its ring of 10 MiB holds all of it.
class RingHandle
{
public:
  RingHandle(BufferedMemory& memory, uint64_t options)
  {
    TAVInitParam param(&memory, options);
    tavInitHandle(&handle_, &param);
  }
  ~RingHandle() { tavTermHandle(&handle_); }
  RingHandle(const RingHandle&) = delete;
  RingHandle& operator=(const RingHandle&) = delete;

  [[nodiscard]] TAVHandle* get() const { return handle_; }

private:
  TAVHandle* handle_ = nullptr;
};

inline constexpr uint64_t kRingPayload = 24;

/// The stream of so many elements.
constexpr uint64_t ringBytes(uint64_t elements)
{
  return sizeof(TAVHeader64) + elements * (sizeof(TAVHeader64) + kRingPayload);
}

/// Appends so many elements; the first word of each counts them.
inline bool addThroughRing(TAVHandle* handle, uint64_t elements)
{
  uint64_t words[kRingPayload / sizeof(uint64_t)] = {};
  TAVHeaderData node{};
  node.header.hdr64 = {TAV_SIZE_UNKNOWN, 0, TAV_TYPE_HEADER64, 1000};
  node.header.hdrType = TAV_HDR_64;
  uint32_t rc = tavAddElement(0, handle, &node);
  node.header.hdr64 = {kRingPayload, 0, TAV_TYPE_BINARY, 1000};
  node.pDataBuf = reinterpret_cast<uint8_t*>(words);
  node.dataBufSize = kRingPayload;
  for (uint64_t i = 0; i < elements; ++i)
  {
    words[0] = i;
    rc |= tavAddElement(0, handle, &node);
  }
  return rc == TAV_RC_OK && tavCloseHeader(0, handle) == TAV_RC_OK;
}

/// Steps over all of them; the sum of their first words.
inline uint64_t stepThroughRing(TAVHandle* handle)
{
  TAVHeaderData root;
  if (tavGetNextChild(0, handle, nullptr, nullptr, &root) != TAV_RC_OK)
  {
    return 0;
  }
  uint64_t sum = 0;
  TAVHeaderData node;
  for (TAVHeader* previous = nullptr; tavGetNextChild(0, handle, &root.header, previous, &node) == TAV_RC_OK;)
  {
    previous = &node.header;
    uint64_t word = 0;
    std::memcpy(&word, node.pDataBuf, sizeof word);
    sum += word;
  }
  return sum;
}

/// The same by the C++ layer.
inline bool addThroughRing(tav::Writer& writer, uint64_t elements)
{
  uint64_t words[kRingPayload / sizeof(uint64_t)] = {};
  tav::Group root = writer.group(1000);
  for (uint64_t i = 0; i < elements; ++i)
  {
    words[0] = i;
    root.add(1000, std::as_bytes(std::span(words)));
  }
  root.close();
  return true;
}

inline uint64_t stepThroughRing(const tav::Reader& reader)
{
  uint64_t sum = 0;
  for (const tav::Node& node : reader.root().children())
  {
    uint64_t word = 0;
    std::memcpy(&word, node.payload().data(), sizeof word);
    sum += word;
  }
  return sum;
}

} // namespace library
