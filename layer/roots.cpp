// The roots of the streams that a reader has.
#include "tav/cpp/roots.hpp"

#include <algorithm>
#include <cstring>

#include "layer/rootSearch.h"

namespace tav::detail
{

namespace
{

/// The bytes under a handle that reads, by offset.
class HandleBytes
{
public:
  /// `file`: what is read, when it is known, for its holes.
  HandleBytes(TAVHandle& handle, KORHFile* file) noexcept
      : handle_(handle), file_(file)
  {
  }

  /// Behind the zeros at an offset that are known without a look at them.
  [[nodiscard]] uint64_t zerosUntil(uint64_t offset) const noexcept
  {
    uint64_t found = 0;
    return file_ != nullptr && file_->findData(offset, &found) == TAV_RC_OK ? std::max(found, offset) : offset;
  }

  /// Bytes that are at hand from an offset on: at least one, but at the end.
  uint32_t view(uint64_t offset, const uint8_t*& bytes, uint64_t& length) noexcept
  {
    constexpr uint64_t piece = 4096;
    length = 0;
    if (handle_.pCircularBuf == nullptr)
    {
      length = offset < handle_.directDataSize ? handle_.directDataSize - offset : 0;
      bytes = handle_.pDirectData + (length != 0 ? offset : 0);
      return TAV_RC_OK;
    }
    TAVCBUserArea area{};
    const uint32_t rc = handle_.pCircularBuf->getChunk(offset, piece, &area, false, false);
    bytes = area.pChunk;
    length = rc == TAV_RC_OK ? area.chunkLength : 0;
    return isEnd(rc) ? TAV_RC_OK : rc;
  }

  /// Up to `length` bytes; fewer at the end alone.
  uint32_t read(uint64_t offset, uint8_t* to, uint64_t length, uint64_t& got) noexcept
  {
    uint32_t rc = TAV_RC_OK;
    uint64_t there = 1;
    for (got = 0; rc == TAV_RC_OK && there != 0 && got < length; got += there)
    {
      const uint8_t* bytes = nullptr;
      rc = view(offset + got, bytes, there);
      there = std::min(there, length - got);
      if (there != 0) // at the end the bytes are nowhere, which memcpy does not take
      {
        std::memcpy(to + got, bytes, static_cast<size_t>(there));
      }
    }
    return rc;
  }

private:
  static bool isEnd(uint32_t rc) noexcept
  {
    return rc == TAV_RC_END_OF_STORAGE || rc == TAV_RC_END_OF_DATA;
  }

  TAVHandle& handle_;
  KORHFile* file_;
};

} // namespace

uint32_t findRoot(TAVHandle& handle, KORHFile* file, const StreamForm& form, uint64_t from, uint64_t& root,
                  uint64_t& end) noexcept
{
  HandleBytes bytes(handle, file);
  TAVHeader header;
  const uint32_t rc = RootSearch<HandleBytes>(bytes, form).next(from, header);
  root = header.nodeOffset;
  end = rc == TAV_RC_OK ? endOfGroup(header) : from;
  return rc;
}

} // namespace tav::detail
