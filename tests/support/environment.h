/// @file environment.h
/// Numbers that the environment may set for a run of the tests.
#pragma once

#include <cstdint>
#include <cstdlib>

namespace test
{

/// What a variable of the environment says, or `otherwise` when it is not set or empty.
inline uint64_t fromEnvironment(const char* name, uint64_t otherwise)
{
  const char* const text = std::getenv(name);
  return text != nullptr && *text != '\0' ? std::strtoull(text, nullptr, 0) : otherwise;
}

} // namespace test
