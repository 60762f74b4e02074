/// @file bytes.h
#pragma once

#include <cstdint>
#include <span>
#include <string_view>

namespace tav::inspect
{

/// Bytes as characters.
inline std::string_view asText(std::span<const uint8_t> bytes)
{
  return {reinterpret_cast<const char*>(bytes.data()), bytes.size()};
}

} // namespace tav::inspect
