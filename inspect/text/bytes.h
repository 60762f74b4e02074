/// @file bytes.h
#pragma once

#include <cstddef>
#include <cstdint>
#include <span>
#include <string_view>
#include <vector>

#include "tav/inspect/source.hpp"

namespace tav::inspect
{

/// Bytes as characters.
inline std::string_view asText(std::span<const uint8_t> bytes)
{
  return {reinterpret_cast<const char*>(bytes.data()), bytes.size()};
}

/// Throws the Error of `lengthInMemory`.
[[noreturn]] void failAtLength(const ByteSource& source, uint64_t offset, uint64_t count);

/// The length of a buffer for bytes of a source. Throws Error where memory cannot have that many: where addresses have
/// 32 bits, a file can have payloads longer than that.
inline size_t lengthInMemory(const ByteSource& source, uint64_t offset, uint64_t count)
{
  if (count > static_cast<uint64_t>(PTRDIFF_MAX))
  {
    failAtLength(source, offset, count);
  }
  return static_cast<size_t>(count);
}

/// Bytes of a source: where they lie when they are at hand, else in `room`; fewer only at the end. Valid until the
/// source is asked again.
inline std::span<const uint8_t> bytesAt(ByteSource& source, uint64_t offset, size_t count, std::vector<uint8_t>& room)
{
  const std::span<const uint8_t> atHand = count == 0 ? std::span<const uint8_t>() : source.view(offset);
  if (atHand.size() >= count)
  {
    return atHand.first(count);
  }
  room.resize(count);
  return std::span<const uint8_t>(room).first(source.read(offset, room));
}

} // namespace tav::inspect
