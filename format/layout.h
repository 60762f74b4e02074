/// The byte layout as the library's own code uses it.
#pragma once

#include "tav/layout.hpp"

namespace tav::inside
{
using namespace layout;

/// Sets the size that a header says, in the width of its form.
inline void setSize(TAVHeader& header, uint64_t size)
{
  if (is64(header))
  {
    header.hdr64.size = size;
    return;
  }
  header.hdr32.size = static_cast<uint32_t>(size);
}

} // namespace tav::inside
