/// What the layer opens a stream under test with.
#pragma once

#include "support/streams.h"
#include "tav/tav.hpp"

namespace test
{

/// How the layer reads a stream of this form, and by how much memory where it is read through a ring.
inline tav::StreamOptions layerOptions(const Form& form, uint64_t ringBytes = tav::StreamOptions{}.ringBytes)
{
  return {.byteOrder = form.swap ? tav::ByteOrder::swapped : tav::ByteOrder::native,
          .align8 = form.align,
          .root = form.root32 ? tav::Width::bits32 : tav::Width::bits64,
          .ringBytes = ringBytes};
}

} // namespace test
