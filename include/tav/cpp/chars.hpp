/// @file chars.hpp
/// Texts that the library gives out, and the names of elements.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string_view>

#include "tav/tav.h"

namespace tav::detail
{

/// A text as libtav gives it to a program, whose standard library may have another std::string_view than its own.
struct Chars
{
  const char* begin;
  size_t length;

  // NOLINTNEXTLINE(google-explicit-constructor): it is a text, wherever one is wanted
  operator std::string_view() const noexcept
  {
    return {begin, length};
  }
};

/// As dictionary::tagOf and dictionary::nameOf, whose table no program has to compile for them.
TAV_API Chars tagOf(uint16_t id) noexcept;
TAV_API Chars nameOf(uint16_t id) noexcept;

} // namespace tav::detail
