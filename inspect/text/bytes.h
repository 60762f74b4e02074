/// @file bytes.h
#pragma once

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
