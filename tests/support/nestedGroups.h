/// Streams that are nested deeper than a writer nests.
#pragma once

#include <cstdint>

#include "support/elements.h"

namespace test
{

inline constexpr uint16_t kNestedElm = 77;

/// `count` groups with 64-bit headers in the host's byte order, each the only child of the one before it, encoded
/// here. The innermost is empty.
inline Bytes nestedGroups(uint64_t count)
{
  Bytes bytes;
  for (uint64_t left = count; left-- > 0;)
  {
    const Bytes size = bytesOfValue(16 * left);
    const Bytes info = bytesOfValue(uint32_t{0});
    const Bytes type = bytesOfValue(uint16_t{2});
    const Bytes elm = bytesOfValue(kNestedElm);
    for (const Bytes* part : {&size, &info, &type, &elm})
    {
      bytes.insert(bytes.end(), part->begin(), part->end());
    }
  }
  return bytes;
}

} // namespace test
